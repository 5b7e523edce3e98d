#include "quorin/ProjectionTransforms.h"

#include <cmath>
#include <cstddef>
#include <limits>

#include "core/Descramble.h"
#include "core/Errors.h"
#include "numeric/NumericTexts.h"

NearestCentroidClassifier::NearestCentroidClassifier() : dimension_(0), centroidNum_(0) {}

NearestCentroidClassifier::NearestCentroidClassifier(unsigned int dimension,
                                                     const std::vector<std::vector<float>>& centroids,
                                                     const std::string& metric)
    : dimension_(dimension), centroidNum_(static_cast<unsigned int>(centroids.size())), centroids_(centroids), metric_(metric) {
    for (const std::vector<float>& row : centroids_)
        if (row.size() != dimension_) throw qv_invalid_argument(descrambleText(scrambled::kCentroidRowLength));
}

void NearestCentroidClassifier::release() {
    dimension_ = 0;
    centroidNum_ = 0;
    centroids_.clear();
    metric_.clear();
}

unsigned int NearestCentroidClassifier::classify(const std::vector<float>& vector) const {
    if (vector.size() != dimension_) throw qv_data_error(descrambleText(scrambled::kCentroidVectorLengthWrong));
    if (metric_ != "L1") throw qv_operation_error(descrambleText(scrambled::kCentroidMetricUnsupported));
    float best = std::numeric_limits<float>::max();
    unsigned int result = 0;
    for (std::size_t r = 0; r < centroids_.size(); ++r) {
        const std::vector<float>& row = centroids_[r];
        float distance = 0.0f;
        for (std::size_t k = 0; k < row.size(); ++k) distance += std::fabs(row[k] - vector[k]);
        if (distance < best) {
            best = distance;
            result = static_cast<unsigned int>(r);
        }
    }
    return result;
}

PcaTransform::PcaTransform() : rawDim_(0), pcaDim_(0) {}

PcaTransform::PcaTransform(const Eigen::VectorXf& mean, const Eigen::MatrixXf& projection)
    : rawDim_(static_cast<unsigned int>(mean.size())),
      pcaDim_(static_cast<unsigned int>(projection.rows())),
      mean_(mean),
      projection_(projection) {
    if (projection.cols() != mean.size()) throw qv_invalid_argument(descrambleText(scrambled::kPcaShapesDiffer));
}

void PcaTransform::transform(const float* input, unsigned int length, float* output) const {
    if (length < rawDim_) throw qv_invalid_argument(descrambleText(scrambled::kPcaInputTooShort));
    Eigen::VectorXf centred = Eigen::Map<const Eigen::VectorXf>(input, rawDim_);
    centred -= mean_;
    const Eigen::VectorXf result = projection_ * centred;
    for (unsigned int i = 0; i < pcaDim_; ++i) output[i] = result[i];
}
