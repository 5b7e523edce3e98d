#include "quorin/ProjectionTransforms.h"

#include <cmath>
#include <cstddef>
#include <limits>

#include "container/IvbMembers.h"
#include "core/Descramble.h"
#include "core/Errors.h"
#include "numeric/NumericTexts.h"
#include "quorin/QVIVBObject.h"

namespace {

enum Tag : uint32_t {
    kTagDimension = 64,  // also the PCA's rawDim
    kTagPcaDim = 128,
    kTagMean = 129,
    kTagProjection = 130,
    kTagCentroidNum = 192,
    kTagCentroids = 193,
    kTagMetric = 194
};

}  // namespace

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

std::vector<uint8_t> NearestCentroidClassifier::toIvb() const {
    std::vector<float> rows;
    rows.reserve(static_cast<std::size_t>(centroidNum_) * dimension_);
    for (const std::vector<float>& row : centroids_) rows.insert(rows.end(), row.begin(), row.end());
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<unsigned int>(std::string(), kTagDimension, &dimension_, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagCentroidNum, &centroidNum_, 1);
    packer.packBasicObject<float>(std::string(), kTagCentroids, rows.data(), ivbmember::storableCount(rows.size()));
    packer.packBasicObject<char>(std::string(), kTagMetric, metric_.data(), ivbmember::storableCount(metric_.size()));
    return packer.data();
}

void NearestCentroidClassifier::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    unsigned int dimension = dimension_, centroidNum = centroidNum_;
    ivbmember::scalar(unpacker, kTagDimension, dimension);
    ivbmember::scalar(unpacker, kTagCentroidNum, centroidNum);
    // Empty rows store nothing, so their number would be the one count whose
    // memory no stored byte bounds.
    if (dimension == 0 && centroidNum > 0) throw qv_ivb_conversion_error(ivbmember::conversionError());
    const unsigned long long count = static_cast<unsigned long long>(centroidNum) * dimension;
    ivbmember::checkedId(unpacker, kTagCentroids, count);
    std::vector<float> flat(static_cast<std::size_t>(count));
    ivbmember::array(unpacker, kTagCentroids, flat.data(), count);
    std::string metric;
    unpacker.unpackBasicObjectImpl(unpacker.getObjId(std::string(), kTagMetric), metric);

    std::vector<std::vector<float>> centroids(centroidNum);
    for (std::size_t r = 0; r < centroidNum; ++r)
        centroids[r].assign(flat.begin() + static_cast<std::ptrdiff_t>(r * dimension),
                            flat.begin() + static_cast<std::ptrdiff_t>((r + 1) * dimension));
    dimension_ = dimension;
    centroidNum_ = centroidNum;
    centroids_.swap(centroids);
    metric_.swap(metric);
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
    // The length is no factor of the result, but it is the caller's word on
    // the input's size: copying rawDim floats from a shorter input would read
    // past it, so that is refused instead.
    if (length < rawDim_) throw qv_invalid_argument(descrambleText(scrambled::kPcaInputTooShort));
    Eigen::VectorXf centred = Eigen::Map<const Eigen::VectorXf>(input, rawDim_);
    centred -= mean_;
    const Eigen::VectorXf result = projection_ * centred;
    for (unsigned int i = 0; i < pcaDim_; ++i) output[i] = result[i];
}

std::vector<uint8_t> PcaTransform::toIvb() const {
    // Stored row by row; Eigen keeps the matrix column by column.
    std::vector<float> rows(static_cast<std::size_t>(pcaDim_) * rawDim_);
    for (unsigned int r = 0; r < pcaDim_; ++r)
        for (unsigned int c = 0; c < rawDim_; ++c)
            rows[static_cast<std::size_t>(r) * rawDim_ + c] = projection_(static_cast<Eigen::Index>(r), static_cast<Eigen::Index>(c));
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<unsigned int>(std::string(), kTagDimension, &rawDim_, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagPcaDim, &pcaDim_, 1);
    packer.packBasicObject<float>(std::string(), kTagMean, mean_.data(), rawDim_);
    packer.packBasicObject<float>(std::string(), kTagProjection, rows.data(), ivbmember::storableCount(rows.size()));
    return packer.data();
}

void PcaTransform::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    unsigned int rawDim = rawDim_, pcaDim = pcaDim_;
    ivbmember::scalar(unpacker, kTagDimension, rawDim);
    ivbmember::scalar(unpacker, kTagPcaDim, pcaDim);
    // A projection of nothing stores no element, so its output length would be
    // bounded by no stored byte.
    if (rawDim == 0 && pcaDim > 0) throw qv_ivb_conversion_error(ivbmember::conversionError());
    const unsigned long long count = static_cast<unsigned long long>(pcaDim) * rawDim;
    ivbmember::checkedId(unpacker, kTagMean, rawDim);
    ivbmember::checkedId(unpacker, kTagProjection, count);
    Eigen::VectorXf mean(static_cast<Eigen::Index>(rawDim));
    ivbmember::array(unpacker, kTagMean, mean.data(), rawDim);
    std::vector<float> rows(static_cast<std::size_t>(count));
    ivbmember::array(unpacker, kTagProjection, rows.data(), count);

    Eigen::MatrixXf projection(static_cast<Eigen::Index>(pcaDim), static_cast<Eigen::Index>(rawDim));
    for (unsigned int r = 0; r < pcaDim; ++r)
        for (unsigned int c = 0; c < rawDim; ++c)
            projection(static_cast<Eigen::Index>(r), static_cast<Eigen::Index>(c)) = rows[static_cast<std::size_t>(r) * rawDim + c];
    rawDim_ = rawDim;
    pcaDim_ = pcaDim;
    mean_.swap(mean);
    projection_.swap(projection);
}
