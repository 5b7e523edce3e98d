// Point transformations: exact recovery of known transforms from clean pairs,
// agreement with numpy's lstsq on noisy ones, and the degenerate inputs.

#include <gtest/gtest.h>

#include <cmath>
#include <stdexcept>
#include <string>
#include <vector>

#include "core/Point2.h"
#include "numeric/Fixtures.h"
#include "quorin/PointTransformations.h"

namespace {

typedef Point2<float> P;

std::string messageOf(const PointPairs& pairs, int which) {
    try {
        if (which == 0) QVTranslateScaleTransformation::calc(pairs);
        if (which == 1) SimilarityTransformation::calc(pairs);
        if (which == 2) AffineTransformation::calc(pairs);
    } catch (const std::invalid_argument& e) {
        return e.what();
    }
    return "";
}

TEST(PointTransformations, PairCountsAreChecked) {
    const PointPairs none, two(2, {P(1, 2), P(3, 4)}), three(3, {P(1, 2), P(3, 4)});
    EXPECT_EQ(messageOf(none, 0), "Only accept 2 point pairs to calc QV translate-scale transformation");
    EXPECT_EQ(messageOf(three, 0), "Only accept 2 point pairs to calc QV translate-scale transformation");
    EXPECT_NE(messageOf(three, 1).find("2 point pairs"), std::string::npos);
    EXPECT_NE(messageOf(none, 1), "");
    EXPECT_NE(messageOf(two, 2).find("3 point pairs"), std::string::npos);
}

TEST(PointTransformations, TranslateScaleRecoversItsExample) {
    const QVTranslateScaleTransformation t =
        QVTranslateScaleTransformation::calc({{P(1, 2), P(0, 0)}, {P(3, 5), P(1, 1)}});
    EXPECT_EQ(t.scaleX(), 2.0f);
    EXPECT_EQ(t.scaleY(), 3.0f);
    EXPECT_EQ(t.offsetX(), 1.0f);
    EXPECT_EQ(t.offsetY(), 2.0f);
    EXPECT_EQ(t.transform(P(10, -1)), P(21, -1));
    // Equal coordinates on one axis: that axis is not a number, no failure.
    const QVTranslateScaleTransformation flat =
        QVTranslateScaleTransformation::calc({{P(1, 2), P(4, 0)}, {P(3, 5), P(4, 1)}});
    EXPECT_FALSE(std::isfinite(flat.scaleX()));
    EXPECT_EQ(flat.scaleY(), 3.0f);
}

TEST(PointTransformations, SimilarityRecoversScaleAngleAndOffset) {
    // The applied matrix is (c, n; -n, c): a clockwise turn by `angle` in y-up axes.
    for (float angle : {0.0f, 0.4f, -1.3f, 2.9f}) {
        SCOPED_TRACE(angle);
        const float scale = 1.75f, ox = -12.0f, oy = 30.5f;
        const float c = std::cos(angle), n = std::sin(angle);
        auto apply = [&](P p) { return P(ox + scale * (c * p.x + n * p.y), oy + scale * (c * p.y - n * p.x)); };
        const P s0(10, 20), s1(-40, 65);
        const SimilarityTransformation t = SimilarityTransformation::calc({{apply(s0), s0}, {apply(s1), s1}});
        EXPECT_NEAR(t.scale(), scale, 1e-5);
        EXPECT_NEAR(t.angle(), angle, 1e-5);
        EXPECT_NEAR(t.offsetX(), ox, 1e-3);
        EXPECT_NEAR(t.offsetY(), oy, 1e-3);
        const P probe = t.transform(P(3, -8)), expected = apply(P(3, -8));
        EXPECT_NEAR(probe.x, expected.x, 1e-3);
        EXPECT_NEAR(probe.y, expected.y, 1e-3);
    }
    // Identity pairs: scale just under 1 because of the constant in the divisor.
    const SimilarityTransformation id = SimilarityTransformation::calc({{P(0, 0), P(0, 0)}, {P(1, 0), P(1, 0)}});
    EXPECT_LT(id.scale(), 1.0f);
    EXPECT_GT(id.scale(), 0.999999f);
    EXPECT_EQ(id.angle(), 0.0f);
    EXPECT_NEAR(id.offsetX(), 0.0f, 1e-6);
    EXPECT_NEAR(id.offsetY(), 0.0f, 1e-6);
    // Coincident second points: a huge but finite scale.
    const SimilarityTransformation huge = SimilarityTransformation::calc({{P(0, 0), P(5, 5)}, {P(10, 0), P(5, 5)}});
    EXPECT_GT(huge.scale(), 1000.0f);
    EXPECT_TRUE(std::isfinite(huge.scale()));
}

TEST(PointTransformations, AffineRecoversExactlyAndAgreesWithLstsq) {
    // Clean pairs from a known map: exact recovery on three and on five pairs.
    auto apply = [](P p) { return P(0.8f * p.x - 1.5f * p.y + 4.0f, 0.3f * p.x + 1.2f * p.y - 7.0f); };
    for (std::vector<P> sources : {std::vector<P>{P(0, 0), P(10, 0), P(0, 10)},
                                   std::vector<P>{P(3, -2), P(40, 7), P(-5, 22), P(17, 17), P(0, 1)}}) {
        PointPairs pairs;
        for (const P& s : sources) pairs.push_back({apply(s), s});
        const AffineTransformation t = AffineTransformation::calc(pairs);
        for (const auto& pair : pairs) {
            EXPECT_NEAR(t.transform(pair.second).x, pair.first.x, 1e-3);
            EXPECT_NEAR(t.transform(pair.second).y, pair.first.y, 1e-3);
        }
        EXPECT_NEAR(t.t00(), 0.8f, 1e-4);
        EXPECT_NEAR(t.t01(), -1.5f, 1e-4);
        EXPECT_NEAR(t.t10(), 0.3f, 1e-4);
        EXPECT_NEAR(t.t11(), 1.2f, 1e-4);
    }
    // Noisy pairs: the fitted map sends probes where numpy's lstsq does.
    const std::vector<float> source = fixtures::floats("affine_source"), target = fixtures::floats("affine_target");
    const std::vector<double> probes = fixtures::values("affine_probes"), mapped = fixtures::values("affine_probes_mapped");
    ASSERT_EQ(source.size(), 24u);
    ASSERT_EQ(target.size(), 24u);
    ASSERT_EQ(mapped.size(), probes.size());
    PointPairs pairs;
    for (std::size_t i = 0; i < 12; ++i) pairs.push_back({P(target[2 * i], target[2 * i + 1]), P(source[2 * i], source[2 * i + 1])});
    const AffineTransformation t = AffineTransformation::calc(pairs);
    for (std::size_t i = 0; i + 1 < probes.size(); i += 2) {
        const P q = t.transform(P(static_cast<float>(probes[i]), static_cast<float>(probes[i + 1])));
        EXPECT_NEAR(q.x, mapped[i], 2e-3);
        EXPECT_NEAR(q.y, mapped[i + 1], 2e-3);
    }
}

TEST(PointTransformations, AffineOfDegenerateSourcesIsNotANumber) {
    const std::vector<std::vector<P>> degenerate = {
        {P(2, 3), P(2, 3), P(2, 3)},             // coincident
        {P(0, 0), P(1, 1), P(2, 2), P(5, 5)},    // on a line
        {P(1, 0), P(1, 4), P(1, -3)},            // on a vertical line
    };
    for (const std::vector<P>& sources : degenerate) {
        PointPairs pairs;
        for (std::size_t i = 0; i < sources.size(); ++i) pairs.push_back({P(float(i), float(2 * i)), sources[i]});
        const AffineTransformation t = AffineTransformation::calc(pairs);
        const P q = t.transform(P(7, 7));
        EXPECT_FALSE(std::isfinite(q.x) && std::isfinite(q.y)) << sources.size();
    }
}

}  // namespace
