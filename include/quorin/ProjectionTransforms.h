#ifndef QUORIN_PROJECTIONTRANSFORMS_H
#define QUORIN_PROJECTIONTRANSFORMS_H

// Two small models of stored vectors: the nearest of a set of centroids under
// a named metric, and a PCA projection (subtract a mean, apply a matrix).
// Both only read when used: one object may serve several threads.

#include <cstdint>
#include <string>
#include <vector>

#include <Eigen/Dense>

#include "quorin/export.h"

class QUORIN_EXPORT NearestCentroidClassifier {
public:
    // ensures: dimension 0, no centroids, empty metric.
    NearestCentroidClassifier();
    // requires: every row holds `dimension` floats.
    // ensures:  the rows as centroids, in order, under `metric` ("L1" is the
    //           one classify supports).
    // throws:   qv_invalid_argument for a row of another length.
    NearestCentroidClassifier(unsigned int dimension, const std::vector<std::vector<float>>& centroids,
                              const std::string& metric);

    // ensures: all four members emptied.
    void release();

    // ensures: the index of the centroid of least L1 distance (float sums);
    //          the earlier row wins a tie; 0 when there are no centroids.
    // throws:  qv_data_error when vector.size() != dimension(); then
    //          qv_operation_error when the metric isn't "L1".
    unsigned int classify(const std::vector<float>& vector) const;

    unsigned int dimension() const { return dimension_; }
    unsigned int centroidNum() const { return centroidNum_; }
    const std::vector<std::vector<float>>& centroids() const { return centroids_; }
    const std::string& metric() const { return metric_; }

    // ensures: the binary form, a composite IVB object of four nameless
    //          entries: tag 64 dimension and tag 192 centroidNum (unsigned
    //          int, 1 element each), tag 193 the rows end to end (float,
    //          centroidNum * dimension), tag 194 metric (char, its bytes).
    // throws:  qv_ivb_conversion_error "QV IVB object conversion error" for
    //          rows beyond an object's 32-bit element count.
    std::vector<uint8_t> toIvb() const;
    // ensures: the four members of the binary form.
    // throws:  qv_data_error "Could not find corresponding object id" for a
    //          missing member; qv_ivb_conversion_error "QV IVB object
    //          conversion error" for damaged bytes, a number member that isn't
    //          a basic object of its type, rows whose length differs from
    //          centroidNum * dimension, or centroids of dimension 0 (their
    //          number is not backed by any stored byte); std::invalid_argument
    //          from the unpacker for a metric that isn't a basic object. A
    //          count stored with no element keeps the present value. On any
    //          failure the classifier is unchanged.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    unsigned int dimension_;
    unsigned int centroidNum_;
    std::vector<std::vector<float>> centroids_;
    std::string metric_;
};

class QUORIN_EXPORT PcaTransform {
public:
    // ensures: rawDim 0, pcaDim 0, empty matrices.
    PcaTransform();
    // requires: projection.cols() == mean.size().
    // ensures:  rawDim() == mean.size(), pcaDim() == projection.rows().
    // throws:   qv_invalid_argument when the shapes differ.
    PcaTransform(const Eigen::VectorXf& mean, const Eigen::MatrixXf& projection);

    unsigned int rawDim() const { return rawDim_; }
    unsigned int pcaDim() const { return pcaDim_; }
    const Eigen::VectorXf& mean() const { return mean_; }
    const Eigen::MatrixXf& projection() const { return projection_; }

    // requires: input holds `length` floats, output has room for pcaDim().
    // ensures:  output = projection * (input[0..rawDim) - mean); temporaries
    //           are made per call. Nothing is written for pcaDim() 0. length
    //           takes no part in the result: elements beyond rawDim are not read.
    // throws:   qv_invalid_argument when length < rawDim(): reading rawDim
    //           floats would run past what the caller says the input holds.
    void transform(const float* input, unsigned int length, float* output) const;

    // ensures: the binary form, a composite IVB object of four nameless
    //          entries: tag 64 rawDim and tag 128 pcaDim (unsigned int, 1
    //          element each), tag 129 mean (float, rawDim), tag 130 the
    //          projection row by row (float, pcaDim * rawDim: element (r, c)
    //          at r * rawDim + c, although memory holds it column-major).
    // throws:  qv_ivb_conversion_error "QV IVB object conversion error" for a
    //          projection beyond an object's 32-bit element count.
    std::vector<uint8_t> toIvb() const;
    // ensures: the four members of the binary form.
    // throws:  qv_data_error "Could not find corresponding object id" for a
    //          missing member; qv_ivb_conversion_error "QV IVB object
    //          conversion error" for damaged bytes, a member that isn't a
    //          basic object of its type, a mean or projection whose length
    //          differs from what rawDim and pcaDim say, or pcaDim above 0 with
    //          rawDim 0 (an output length not backed by any stored byte). A
    //          count stored with no element keeps the present value. On any
    //          failure the transform is unchanged.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    unsigned int rawDim_;
    unsigned int pcaDim_;
    Eigen::VectorXf mean_;
    Eigen::MatrixXf projection_;
};

#endif
