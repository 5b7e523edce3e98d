#include "tracking/LDAClassifier.h"

#include <cmath>

#include "core/Errors.h"

float LDAClassifier::getScore(const std::vector<float>& features) const
{
    if (Eigen::Index(features.size()) > weights.size())
        throw qv_invalid_argument("Feature vector is longer than the LDA classifier's");
    float sum = 0.0f;
    for (size_t i = 0; i < features.size(); ++i) sum += weights[Eigen::Index(i)] * features[i];
    return sum - threshold;
}

void LDAClassifier::train(const std::vector<std::vector<float>>& features, const std::vector<bool>& labels)
{
    if (features.empty()) throw qv_operation_error("Train LDA classifier with no features");
    if (labels.size() != features.size())
        throw qv_invalid_argument("LDA training needs one label per feature row");
    const Eigen::Index d = Eigen::Index(features[0].size());
    for (const std::vector<float>& row : features)
        if (Eigen::Index(row.size()) != d) throw qv_invalid_argument("LDA training rows differ in length");

    Eigen::Index a = 0;
    for (const bool l : labels) a += l ? 1 : 0;
    const Eigen::Index b = Eigen::Index(labels.size()) - a;
    Eigen::MatrixXf A(a, d), B(b, d);
    Eigen::Index ia = 0, ib = 0;
    for (size_t r = 0; r < features.size(); ++r) {
        Eigen::MatrixXf& M = labels[r] ? A : B;
        const Eigen::Index row = labels[r] ? ia++ : ib++;
        for (Eigen::Index c = 0; c < d; ++c) M(row, c) = features[r][size_t(c)];
    }

    // Means by hand: an empty class gives 0 / 0, not a failed assertion.
    Eigen::VectorXf mA = Eigen::VectorXf::Zero(d), mB = Eigen::VectorXf::Zero(d);
    for (Eigen::Index c = 0; c < d; ++c) {
        float sa = 0.0f, sb = 0.0f;
        for (Eigen::Index r = 0; r < a; ++r) sa += A(r, c);
        for (Eigen::Index r = 0; r < b; ++r) sb += B(r, c);
        mA[c] = sa / float(a);
        mB[c] = sb / float(b);
    }
    for (Eigen::Index r = 0; r < a; ++r) A.row(r) -= mA.transpose();
    for (Eigen::Index r = 0; r < b; ++r) B.row(r) -= mB.transpose();

    const Eigen::MatrixXf S = A.transpose() * A + B.transpose() * B;
    Eigen::VectorXf w = S.llt().solve(mA - mB);

    float norm2 = 0.0f;
    for (Eigen::Index c = 0; c < d; ++c) norm2 += w[c] * w[c];
    w /= std::sqrt(norm2);
    weights = w;

    float dot = 0.0f;
    for (Eigen::Index c = 0; c < d; ++c) dot += w[c] * (mA[c] + mB[c]);
    threshold = d == 0 ? 0.0f : 0.5f * dot;
}
