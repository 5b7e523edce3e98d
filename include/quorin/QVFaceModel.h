#ifndef QUORIN_QVFACEMODEL_H
#define QUORIN_QVFACEMODEL_H

#include <cstdint>
#include <vector>

#include "quorin/export.h"

class FaceModelData;

// The public handle of a face model: a linear discriminant (a projection vector
// and two scalars), stored and exchanged as IVB bytes. Copies are deep. Every
// operation first checks the handle's value and raises ApiError
// "QVFaceModel not initialized properly" without one.
class QUORIN_EXPORT QVFaceModel {
public:
    // ensures: dimension 0, an empty projection, both scalars 0.
    // throws:  std::bad_alloc.
    QVFaceModel();
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
    std::vector<uint8_t> toIvb() const;
    // ensures: the model read from bytes, all or nothing.
    // throws:  qv_ivb_conversion_error, qv_data_error or std::invalid_argument
    //          (the IVB unpacker's errors) for damaged bytes, among them a
    //          projection whose length differs from the stored dimension.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    FaceModelData& checked() const;

    FaceModelData* data_;
};

#endif
