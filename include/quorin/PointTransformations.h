#ifndef QUORIN_POINTTRANSFORMATIONS_H
#define QUORIN_POINTTRANSFORMATIONS_H

// 2-D point transformations computed from point correspondences, in float.
// Each calc maps the second point of every pair onto its first:
// transform(pair.second) == pair.first, exactly for the two-pair forms and in
// the least-squares sense for the affine form. Plain values; transform may run
// on one object from any number of threads.

#include <utility>
#include <vector>

#include "quorin/export.h"

template <typename T>
class Point2;  // the record point; include its header to call these

typedef std::vector<std::pair<Point2<float>, Point2<float>>> PointPairs;

class QUORIN_EXPORT PointTransformation {
public:
    virtual Point2<float> transform(const Point2<float>& point) const = 0;

protected:
    PointTransformation() = default;
    PointTransformation(const PointTransformation&) = default;
    PointTransformation& operator=(const PointTransformation&) = default;
    // Out of line, so that the base's vtable lives in the library alone in every build.
    virtual ~PointTransformation();
};

// x' = offsetX + scaleX * x, y' = offsetY + scaleY * y.
class QUORIN_EXPORT QVTranslateScaleTransformation : public PointTransformation {
public:
    QVTranslateScaleTransformation();
    Point2<float> transform(const Point2<float>& point) const override;

    // requires: exactly 2 pairs.
    // ensures:  per axis, the scale and offset that take both second points
    //           onto their first points. Equal second-point coordinates on an
    //           axis give an infinite or NaN scale there (not checked).
    // throws:   std::invalid_argument "Only accept 2 point pairs to calc QV
    //           translate-scale transformation" for any other count.
    static QVTranslateScaleTransformation calc(const PointPairs& pairs);

    float scaleX() const { return scaleX_; }
    float scaleY() const { return scaleY_; }
    float offsetX() const { return offsetX_; }
    float offsetY() const { return offsetY_; }

private:
    float scaleX_, scaleY_, offsetX_, offsetY_;
};

// One scale, one rotation, a translation: x' = offsetX + scale * (c*x + n*y),
// y' = offsetY + scale * (c*y - n*x) with c = cos(angle), n = sin(angle).
class QUORIN_EXPORT SimilarityTransformation : public PointTransformation {
public:
    SimilarityTransformation();
    Point2<float> transform(const Point2<float>& point) const override;

    // requires: exactly 2 pairs.
    // ensures:  scale = sqrt(|f0 - f1|^2 / (|s0 - s1|^2 + 1e-6)), so identical
    //           second points give a huge scale, no failure; the angle and the
    //           offsets map both pairs (the offset is the mean of the two).
    // throws:   std::invalid_argument for any other count.
    static SimilarityTransformation calc(const PointPairs& pairs);

    float scale() const { return scale_; }
    float angle() const { return angle_; }
    float offsetX() const { return offsetX_; }
    float offsetY() const { return offsetY_; }

private:
    float scale_, angle_, offsetX_, offsetY_;
};

// x' = T (x - sourceMean) + targetMean, T a 2x2 matrix.
class QUORIN_EXPORT AffineTransformation : public PointTransformation {
public:
    AffineTransformation();
    Point2<float> transform(const Point2<float>& point) const override;

    // requires: 3 or more pairs.
    // ensures:  the least-squares affine map of the centred second points onto
    //           the centred first points. Source points on a line make the
    //           normal matrix singular (not checked): T is then infinite or NaN.
    // throws:   std::invalid_argument for fewer than 3 pairs.
    static AffineTransformation calc(const PointPairs& pairs);

    // Column order, as stored: t00, t10, t01, t11.
    float t00() const { return t00_; }
    float t10() const { return t10_; }
    float t01() const { return t01_; }
    float t11() const { return t11_; }
    float sourceMeanX() const { return sourceMeanX_; }
    float sourceMeanY() const { return sourceMeanY_; }
    float targetMeanX() const { return targetMeanX_; }
    float targetMeanY() const { return targetMeanY_; }

private:
    float t00_, t10_, t01_, t11_;
    float sourceMeanX_, sourceMeanY_, targetMeanX_, targetMeanY_;
};

#endif
