#ifndef QUORIN_VECTORQUANTIZER_H
#define QUORIN_VECTORQUANTIZER_H

// A vector quantizer: a full binary tree of hyperplanes in heap order. Inner
// node i has the children 2i+1 and 2i+2; with n inner nodes, nodes n..2n are
// the leaves with the codes 0..n. A loaded quantizer only reads: it may
// quantize from several threads.

#include <cstdint>
#include <vector>

#include "quorin/export.h"

class QUORIN_EXPORT QuantizerNode {
public:
    // ensures: index -1, code 0, no children, no weights, threshold 0 (a leaf).
    QuantizerNode();
    QuantizerNode(int index, unsigned int code, int leftChild, int rightChild, const std::vector<float>& weights,
                  float threshold);

    // ensures: true when both child indices are negative.
    bool isLeafNode() const { return leftChild_ < 0 && rightChild_ < 0; }
    // requires: vector holds weights().size() floats.
    // ensures:  leftChild when threshold > dot(weights, vector) (summed in
    //           float, in order), else rightChild (ties go right).
    // throws:   qv_unsupported_error when the node has no weights.
    int nextNode(const float* vector) const;
    unsigned int code() const { return code_; }
    // ensures: the hyperplane's normal, or null when there is none.
    const float* weights() const { return weights_.empty() ? nullptr : weights_.data(); }

    int index() const { return index_; }
    int leftChild() const { return leftChild_; }
    int rightChild() const { return rightChild_; }
    float threshold() const { return threshold_; }
    unsigned int weightCount() const { return static_cast<unsigned int>(weights_.size()); }

private:
    int index_;
    unsigned int code_;
    int leftChild_;
    int rightChild_;
    std::vector<float> weights_;
    float threshold_;
};

class QUORIN_EXPORT VectorQuantizer {
public:
    // ensures: no tree (quantize raises until one is set).
    VectorQuantizer();

    // requires: weights holds innerNodeNum rows of `dimension` floats end to
    //           end, thresholds innerNodeNum floats.
    // ensures:  2 * innerNodeNum + 1 nodes in heap order, the leaves after the
    //           inner nodes with codes 0..innerNodeNum.
    // throws:   qv_invalid_argument when the array sizes don't fit; the
    //           quantizer is unchanged then.
    void setTree(unsigned int innerNodeNum, unsigned int dimension, const std::vector<float>& weights,
                 const std::vector<float>& thresholds);

    // requires: vector holds dimension() floats.
    // ensures:  the code of the leaf reached from node 0; 0 without reading
    //           the vector for a tree of no inner node.
    // throws:   qv_operation_error when no tree was set.
    unsigned int quantize(const float* vector) const;

    unsigned int dimension() const { return dimension_; }
    // ensures: innerNodeNum + 1.
    unsigned int codeNum() const { return innerNodeNum_ + 1; }
    const std::vector<QuantizerNode>& nodes() const { return nodes_; }

    // ensures: the binary form, a composite IVB object of four nameless
    //          entries: tag 96 innerNodeNum and tag 64 dimension (unsigned int,
    //          1 element each), tag 97 the inner nodes' weights end to end
    //          (float, innerNodeNum * dimension), tag 98 their thresholds
    //          (float, innerNodeNum).
    // throws:  qv_ivb_conversion_error "QV IVB object conversion error" for a
    //          weight array beyond an object's 32-bit element count.
    std::vector<uint8_t> toIvb() const;
    // ensures: the tree of the binary form, as setTree builds it. A loaded
    //          tree with dimension 0 has inner nodes without weights, on which
    //          quantize throws qv_unsupported_error.
    // throws:  qv_data_error "Could not find corresponding object id" for a
    //          missing member; qv_ivb_conversion_error "QV IVB object
    //          conversion error" for damaged bytes, a member that isn't a basic
    //          object of its type, or an array whose length differs from what
    //          the counts say. A count stored with no element keeps the present
    //          value. On any failure the quantizer is unchanged.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    void build(unsigned int innerNodeNum, unsigned int dimension, const std::vector<float>& weights,
               const std::vector<float>& thresholds);

    unsigned int innerNodeNum_;
    unsigned int dimension_;
    std::vector<QuantizerNode> nodes_;
};

#endif
