// Point transformations: recovery of known transforms from clean pairs,
// agreement with numpy's lstsq on noisy ones, and the degenerate inputs.

#include <gtest/gtest.h>

#include <cmath>
#include <stdexcept>

#include "core/Point2.h"
#include "numeric/Fixtures.h"
#include "quorin/PointTransformations.h"

namespace {
typedef Point2<float> P;
}  // namespace

TEST(PointTransformations, TranslateScaleAndSimilarityRecoverTheirMaps) {
    const PointPairs three(3, {P(1, 2), P(3, 4)});
    EXPECT_THROW(QVTranslateScaleTransformation::calc(three), std::invalid_argument);
    EXPECT_THROW(SimilarityTransformation::calc(three), std::invalid_argument);
    EXPECT_THROW(AffineTransformation::calc(PointPairs(2, {P(1, 2), P(3, 4)})), std::invalid_argument);

    const auto t = QVTranslateScaleTransformation::calc({{P(1, 2), P(0, 0)}, {P(3, 5), P(1, 1)}});
    EXPECT_EQ(t.transform(P(10, -1)), P(21, -1));
    // Equal coordinates on one axis: that axis is not a number, no failure.
    const auto flat = QVTranslateScaleTransformation::calc({{P(1, 2), P(4, 0)}, {P(3, 5), P(4, 1)}});
    EXPECT_FALSE(std::isfinite(flat.scaleX()));

    // The applied matrix is (c, n; -n, c): a clockwise turn by `angle` in y-up axes.
    for (float angle : {0.0f, 0.4f, -1.3f, 2.9f}) {
        SCOPED_TRACE(angle);
        const float scale = 1.75f, ox = -12.0f, oy = 30.5f, c = std::cos(angle), n = std::sin(angle);
        auto apply = [&](P p) { return P(ox + scale * (c * p.x + n * p.y), oy + scale * (c * p.y - n * p.x)); };
        const P s0(10, 20), s1(-40, 65);
        const SimilarityTransformation s = SimilarityTransformation::calc({{apply(s0), s0}, {apply(s1), s1}});
        EXPECT_NEAR(s.scale(), scale, 1e-5);
        EXPECT_NEAR(s.angle(), angle, 1e-5);
        const P probe = s.transform(P(3, -8)), expected = apply(P(3, -8));
        EXPECT_NEAR(probe.x, expected.x, 1e-3);
        EXPECT_NEAR(probe.y, expected.y, 1e-3);
    }
    // Coincident second points: a huge but finite scale.
    const float huge = SimilarityTransformation::calc({{P(0, 0), P(5, 5)}, {P(10, 0), P(5, 5)}}).scale();
    EXPECT_TRUE(huge > 1000.0f && std::isfinite(huge)) << huge;
}

TEST(PointTransformations, AffineAgreesWithLstsqAndDegenerateSourcesAreNotANumber) {
    const std::vector<float> source = fixtures::floats("affine_source"), target = fixtures::floats("affine_target"),
                             probes = fixtures::floats("affine_probes");
    ASSERT_EQ(source.size(), 24u);
    ASSERT_EQ(target.size(), 24u);
    PointPairs pairs;
    for (std::size_t i = 0; i < 24; i += 2) pairs.push_back({P(target[i], target[i + 1]), P(source[i], source[i + 1])});
    const AffineTransformation t = AffineTransformation::calc(pairs);
    std::vector<float> mapped;
    for (std::size_t i = 0; i + 1 < probes.size(); i += 2) {
        const P q = t.transform(P(probes[i], probes[i + 1]));
        mapped.insert(mapped.end(), {q.x, q.y});
    }
    fixtures::expectAgrees(mapped, "affine_probes_mapped", 2e-3);
    // Three pairs off a line are met exactly: x' = 3 + 2x - y / 2, y' = x + 2y - 1.
    const PointPairs exact = {{P(3, -1), P(0, 0)}, {P(5, 0), P(1, 0)}, {P(2, 3), P(0, 2)}};
    for (const auto& pair : exact) {
        const P q = AffineTransformation::calc(exact).transform(pair.second);
        EXPECT_NEAR(q.x, pair.first.x, 1e-5);
        EXPECT_NEAR(q.y, pair.first.y, 1e-5);
    }

    const std::vector<std::vector<P>> degenerate = {
        {P(2, 3), P(2, 3), P(2, 3)},           // coincident
        {P(0, 0), P(1, 1), P(2, 2), P(5, 5)},  // on a line
        {P(1, 0), P(1, 4), P(1, -3)},          // on a vertical line
    };
    for (const std::vector<P>& sources : degenerate) {
        PointPairs flat;
        for (std::size_t i = 0; i < sources.size(); ++i) flat.push_back({P(float(i), float(2 * i)), sources[i]});
        const P q = AffineTransformation::calc(flat).transform(P(7, 7));
        EXPECT_FALSE(std::isfinite(q.x) && std::isfinite(q.y)) << sources.size();
    }
}
