#include "quorin/VectorQuantizer.h"

#include <cstddef>

#include "container/IvbMembers.h"
#include "core/Descramble.h"
#include "core/Errors.h"
#include "numeric/NumericTexts.h"
#include "quorin/QVIVBObject.h"

namespace {

enum Tag : uint32_t { kTagDimension = 64, kTagInnerNodeNum = 96, kTagWeights = 97, kTagThresholds = 98 };

// Heap indices up to 2n + 2 must stay within int.
constexpr unsigned int kMaxInnerNodes = 0x3FFFFFFEu;

}  // namespace

QuantizerNode::QuantizerNode() : index_(-1), code_(0), leftChild_(-1), rightChild_(-1), threshold_(0.0f) {}

QuantizerNode::QuantizerNode(int index, unsigned int code, int leftChild, int rightChild,
                             const std::vector<float>& weights, float threshold)
    : index_(index), code_(code), leftChild_(leftChild), rightChild_(rightChild), weights_(weights), threshold_(threshold) {}

int QuantizerNode::nextNode(const float* vector) const {
    if (weights_.empty()) throw qv_unsupported_error(descrambleText(scrambled::kQuantizerNodeWithoutWeights));
    float dot = 0.0f;
    for (std::size_t k = 0; k < weights_.size(); ++k) dot += weights_[k] * vector[k];
    return threshold_ > dot ? leftChild_ : rightChild_;
}

VectorQuantizer::VectorQuantizer() : innerNodeNum_(0), dimension_(0) {}

void VectorQuantizer::setTree(unsigned int innerNodeNum, unsigned int dimension, const std::vector<float>& weights,
                              const std::vector<float>& thresholds) {
    const std::size_t n = innerNodeNum;
    if (n > kMaxInnerNodes || thresholds.size() != n || weights.size() / (dimension ? dimension : 1) != n ||
        weights.size() != n * dimension || (n > 0 && dimension == 0))
        throw qv_invalid_argument(descrambleText(scrambled::kQuantizerTreeSizes));
    build(innerNodeNum, dimension, weights, thresholds);
}

void VectorQuantizer::build(unsigned int innerNodeNum, unsigned int dimension, const std::vector<float>& weights,
                            const std::vector<float>& thresholds) {
    const std::size_t n = innerNodeNum;
    std::vector<QuantizerNode> nodes;
    nodes.reserve(2 * n + 1);
    for (std::size_t i = 0; i < n; ++i) {
        const std::vector<float> row(weights.begin() + static_cast<std::ptrdiff_t>(i * dimension),
                                     weights.begin() + static_cast<std::ptrdiff_t>((i + 1) * dimension));
        nodes.emplace_back(static_cast<int>(i), 0u, static_cast<int>(2 * i + 1), static_cast<int>(2 * i + 2), row,
                           thresholds[i]);
    }
    for (std::size_t i = n; i <= 2 * n; ++i)
        nodes.emplace_back(static_cast<int>(i), static_cast<unsigned int>(i - n), -1, -1, std::vector<float>(), 0.0f);
    nodes_.swap(nodes);
    innerNodeNum_ = innerNodeNum;
    dimension_ = dimension;
}

unsigned int VectorQuantizer::quantize(const float* vector) const {
    if (nodes_.empty()) throw qv_operation_error(descrambleText(scrambled::kQuantizerNotLoaded));
    std::size_t at = 0;
    while (!nodes_[at].isLeafNode()) at = static_cast<std::size_t>(nodes_[at].nextNode(vector));
    return nodes_[at].code();
}

std::vector<uint8_t> VectorQuantizer::toIvb() const {
    std::vector<float> weights;
    std::vector<float> thresholds;
    for (unsigned int i = 0; i < innerNodeNum_ && i < nodes_.size(); ++i) {
        const QuantizerNode& node = nodes_[i];
        if (node.weightCount() > 0) weights.insert(weights.end(), node.weights(), node.weights() + node.weightCount());
        thresholds.push_back(node.threshold());
    }
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<unsigned int>(std::string(), kTagInnerNodeNum, &innerNodeNum_, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagDimension, &dimension_, 1);
    packer.packBasicObject<float>(std::string(), kTagWeights, weights.data(), ivbmember::storableCount(weights.size()));
    packer.packBasicObject<float>(std::string(), kTagThresholds, thresholds.data(),
                                  ivbmember::storableCount(thresholds.size()));
    return packer.data();
}

void VectorQuantizer::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    unsigned int n = innerNodeNum_, dimension = dimension_;
    ivbmember::scalar(unpacker, kTagInnerNodeNum, n);
    ivbmember::scalar(unpacker, kTagDimension, dimension);
    if (n > kMaxInnerNodes) throw qv_ivb_conversion_error(ivbmember::conversionError());
    // The arrays' stored lengths are checked against the counts before any room
    // is made, so memory follows the bytes present, not what the counts claim.
    const unsigned long long weightCount = static_cast<unsigned long long>(n) * dimension;
    ivbmember::checkedId(unpacker, kTagWeights, weightCount);
    ivbmember::checkedId(unpacker, kTagThresholds, n);
    std::vector<float> weights(static_cast<std::size_t>(weightCount));
    std::vector<float> thresholds(n);
    ivbmember::array(unpacker, kTagWeights, weights.data(), weightCount);
    ivbmember::array(unpacker, kTagThresholds, thresholds.data(), n);
    build(n, dimension, weights, thresholds);
}
