#ifndef QUORIN_PROJECTIONTRANSFORMS_H
#define QUORIN_PROJECTIONTRANSFORMS_H

// Two small models of stored vectors: the nearest of a set of centroids under
// a named metric, and a PCA projection (subtract a mean, apply a matrix).
// Both only read when used: one object may serve several threads.

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
    //           are made per call. Nothing is written for pcaDim() 0.
    // throws:   qv_invalid_argument when length < rawDim() (nothing is read
    //           beyond what the caller says the input holds).
    void transform(const float* input, unsigned int length, float* output) const;

private:
    unsigned int rawDim_;
    unsigned int pcaDim_;
    Eigen::VectorXf mean_;
    Eigen::MatrixXf projection_;
};

#endif
