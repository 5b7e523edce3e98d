#ifndef QUORIN_CONTAINER_FACEMODELDATA_H
#define QUORIN_CONTAINER_FACEMODELDATA_H

#include <Eigen/Dense>
#include <cstdint>
#include <vector>

#include "quorin/LDAModel.h"

// The value behind QVFaceModel, with its IVB form: dimension (tag 64, int),
// firstValue (160, float), secondValue (162, float), projection (161, floats).
class FaceModelData {
public:
    FaceModelData() {}
    explicit FaceModelData(const LDAModel& model)
        : dimension(model.dimension),
          projection(model.projection),
          firstValue(model.firstValue),
          secondValue(model.secondValue) {}

    // Throws qv_ivb_conversion_error when projection's length is not dimension.
    std::vector<uint8_t> toIvb() const;
    // Reads dimension, firstValue, secondValue, then projection, each straight
    // into its member: a failure keeps what was read before it. Throws the
    // unpacker's errors, and qv_ivb_conversion_error for a negative dimension
    // or a projection whose stored length is not the dimension.
    void fromIvb(const std::vector<uint8_t>& bytes);

    int32_t dimension = 0;
    Eigen::VectorXf projection;
    float firstValue = 0.0f;
    float secondValue = 0.0f;
};

#endif
