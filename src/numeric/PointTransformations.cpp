#include "quorin/PointTransformations.h"

#include <cmath>
#include <stdexcept>

#include <Eigen/Dense>

#include "core/Descramble.h"
#include "core/Point2.h"
#include "numeric/NumericTexts.h"

PointTransformation::~PointTransformation() = default;

QVTranslateScaleTransformation::QVTranslateScaleTransformation()
    : scaleX_(0.0f), scaleY_(0.0f), offsetX_(0.0f), offsetY_(0.0f) {}

Point2<float> QVTranslateScaleTransformation::transform(const Point2<float>& p) const {
    return Point2<float>(offsetX_ + scaleX_ * p.x, offsetY_ + scaleY_ * p.y);
}

QVTranslateScaleTransformation QVTranslateScaleTransformation::calc(const PointPairs& pairs) {
    if (pairs.size() != 2)
        throw std::invalid_argument("Only accept 2 point pairs to calc QV translate-scale transformation");
    const Point2<float>& f0 = pairs[0].first;
    const Point2<float>& s0 = pairs[0].second;
    const Point2<float>& f1 = pairs[1].first;
    const Point2<float>& s1 = pairs[1].second;
    QVTranslateScaleTransformation t;
    t.scaleX_ = (f0.x - f1.x) / (s0.x - s1.x);
    t.offsetX_ = (s0.x * f1.x - s1.x * f0.x) / (s0.x - s1.x);
    t.scaleY_ = (f0.y - f1.y) / (s0.y - s1.y);
    t.offsetY_ = (s0.y * f1.y - s1.y * f0.y) / (s0.y - s1.y);
    return t;
}

// ---------------------------------------------------------------------------
SimilarityTransformation::SimilarityTransformation() : scale_(0.0f), angle_(0.0f), offsetX_(0.0f), offsetY_(0.0f) {}

Point2<float> SimilarityTransformation::transform(const Point2<float>& p) const {
    const float c = std::cos(angle_), n = std::sin(angle_);
    return Point2<float>(offsetX_ + scale_ * (n * p.y + c * p.x), offsetY_ + scale_ * (c * p.y - n * p.x));
}

SimilarityTransformation SimilarityTransformation::calc(const PointPairs& pairs) {
    if (pairs.size() != 2) throw std::invalid_argument(descrambleText(scrambled::kSimilarityNeedsTwoPairs));
    const Point2<float>& f0 = pairs[0].first;
    const Point2<float>& s0 = pairs[0].second;
    const Point2<float>& f1 = pairs[1].first;
    const Point2<float>& s1 = pairs[1].second;
    const float dfx = f0.x - f1.x, dfy = f0.y - f1.y, dsx = s0.x - s1.x, dsy = s0.y - s1.y;
    SimilarityTransformation t;
    // The constant keeps identical second points from dividing by 0.
    t.scale_ = std::sqrt((dfy * dfy + dfx * dfx) / (dsy * dsy + dsx * dsx + 1e-6f));
    t.angle_ = std::atan2(t.scale_ * (dsy * dfx - dsx * dfy), t.scale_ * (dfy * dsy + dfx * dsx));
    const float c = std::cos(t.angle_), n = std::sin(t.angle_);
    t.offsetX_ = 0.5f * ((f1.x - t.scale_ * (n * s1.y + c * s1.x)) + (f0.x - t.scale_ * (n * s0.y + c * s0.x)));
    t.offsetY_ = 0.5f * ((f1.y - t.scale_ * (c * s1.y - n * s1.x)) + (f0.y - t.scale_ * (c * s0.y - n * s0.x)));
    return t;
}

// ---------------------------------------------------------------------------
AffineTransformation::AffineTransformation()
    : t00_(0.0f),
      t10_(0.0f),
      t01_(0.0f),
      t11_(0.0f),
      sourceMeanX_(0.0f),
      sourceMeanY_(0.0f),
      targetMeanX_(0.0f),
      targetMeanY_(0.0f) {}

Point2<float> AffineTransformation::transform(const Point2<float>& p) const {
    const float dx = p.x - sourceMeanX_, dy = p.y - sourceMeanY_;
    return Point2<float>(dy * t01_ + dx * t00_ + targetMeanX_, dy * t11_ + dx * t10_ + targetMeanY_);
}

AffineTransformation AffineTransformation::calc(const PointPairs& pairs) {
    if (pairs.size() < 3) throw std::invalid_argument(descrambleText(scrambled::kAffineNeedsThreePairs));
    const Eigen::Index m = static_cast<Eigen::Index>(pairs.size());
    Eigen::MatrixXf a(2, m), b(2, m);
    for (Eigen::Index i = 0; i < m; ++i) {
        const auto& pair = pairs[static_cast<std::size_t>(i)];
        a(0, i) = pair.second.x;
        a(1, i) = pair.second.y;
        b(0, i) = pair.first.x;
        b(1, i) = pair.first.y;
    }
    AffineTransformation t;
    float sums[4] = {0.0f, 0.0f, 0.0f, 0.0f};
    for (Eigen::Index i = 0; i < m; ++i) {
        sums[0] += a(0, i);
        sums[1] += a(1, i);
        sums[2] += b(0, i);
        sums[3] += b(1, i);
    }
    const float count = static_cast<float>(m);
    t.sourceMeanX_ = sums[0] / count;
    t.sourceMeanY_ = sums[1] / count;
    t.targetMeanX_ = sums[2] / count;
    t.targetMeanY_ = sums[3] / count;
    a.row(0).array() -= t.sourceMeanX_;
    a.row(1).array() -= t.sourceMeanY_;
    b.row(0).array() -= t.targetMeanX_;
    b.row(1).array() -= t.targetMeanY_;
    const Eigen::Matrix2f mm = a * a.transpose();
    const Eigen::Matrix2f q = b * a.transpose();
    const float d = 1.0f / (mm(0, 0) * mm(1, 1) - mm(1, 0) * mm(0, 1));
    t.t00_ = (-mm(1, 0) * d) * q(0, 1) + (mm(1, 1) * d) * q(0, 0);
    t.t10_ = (-mm(1, 0) * d) * q(1, 1) + (mm(1, 1) * d) * q(1, 0);
    t.t01_ = (mm(0, 0) * d) * q(0, 1) + (-mm(0, 1) * d) * q(0, 0);
    t.t11_ = (mm(0, 0) * d) * q(1, 1) + (-mm(0, 1) * d) * q(1, 0);
    return t;
}
