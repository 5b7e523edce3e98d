#ifndef QUORIN_QVFACEMODEL_H
#define QUORIN_QVFACEMODEL_H

#include <cstdint>
#include <vector>

#include "quorin/export.h"

class FaceModelData;
struct LDAModel;  // quorin/LDAModel.h (with Eigen), needed only to build from one

// The public handle of a face model: a linear discriminant (a projection vector
// and two scalars), stored and exchanged as IVB bytes. Copies are deep. Every
// operation first checks the handle's value and raises ApiError
// "QVFaceModel not initialized properly" without one.
class QUORIN_EXPORT QVFaceModel {
public:
    // ensures: dimension 0, an empty projection, both scalars 0.
    // throws:  std::bad_alloc.
    QVFaceModel();
    // ensures: the model's four fields, field by field (toIvb then requires
    //          the projection to have `dimension` elements).
    // throws:  std::bad_alloc.
    explicit QVFaceModel(const LDAModel& model);
    // ensures: a deep copy with its own vector.
    // throws:  std::bad_alloc.
    QVFaceModel(const QVFaceModel& other);
    // ensures: a deep copy; assignment to itself does nothing.
    // throws:  ApiError when either side has no value.
    QVFaceModel& operator=(const QVFaceModel& other);
    ~QVFaceModel();

    // ensures: a composite object of dimension (tag 64, one int), the first
    //          scalar (tag 160, float), the second (tag 162, float) and the
    //          projection (tag 161, dimension floats).
    // throws:  qv_ivb_conversion_error when the projection's length is not
    //          the dimension.
    std::vector<uint8_t> toIvb() const;
    // ensures: the model read from bytes: dimension, the first scalar, the
    //          second, then the projection. A failure keeps the fields read
    //          before it (the model may then be unfit for toIvb until a
    //          fromIvb succeeds).
    // throws:  qv_ivb_conversion_error for damaged bytes, among them a member
    //          that isn't a basic object of its type and a projection whose
    //          length differs from the stored dimension; qv_data_error for a
    //          missing member.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    FaceModelData& checked() const;

    FaceModelData* data_;
};

#endif
