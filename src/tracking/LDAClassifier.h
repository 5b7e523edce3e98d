#ifndef QUORIN_TRACKING_LDACLASSIFIER_H
#define QUORIN_TRACKING_LDACLASSIFIER_H

#include <vector>

#include <Eigen/Dense>

// Two-class Fisher discriminant: a unit direction and a threshold halfway
// between the projected class means, so that a positive score lies on the
// side of the positive class.
class LDAClassifier {
public:
    // sum(weights[i] * features[i]) over the length of features, less
    // threshold, in single precision: empty features give -threshold, shorter
    // ones a partial sum. Raises qv_invalid_argument for features longer than
    // weights, whose sum would read past the weights.
    float getScore(const std::vector<float>& features) const;

    // Raises qv_operation_error "Train LDA classifier with no features" with
    // no rows, qv_invalid_argument for rows of unequal length or a label count
    // that isn't the row count. An empty class gives weights that are not
    // numbers; nothing guards against that here.
    void train(const std::vector<std::vector<float>>& features, const std::vector<bool>& labels);

    Eigen::VectorXf weights;
    float threshold = 0.0f;
};

#endif
