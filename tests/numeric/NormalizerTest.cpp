// Normalizers against the numpy fixtures, and the edges those don't reach:
// empty and zero vectors, clipping, negative input, rounding.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>

#include "core/Errors.h"
#include "numeric/Fixtures.h"
#include "quorin/NormalizerFactory.h"
#include "quorin/Normalizers.h"
#include "support/ExpectThrow.h"

namespace {

std::vector<float> run(const QVNormalizer& n, std::vector<float> v) {
    std::vector<float> out(v.size(), -99.0f);
    n.normalize(v.data(), static_cast<unsigned int>(v.size()), out.data());
    return out;
}

}  // namespace

TEST(Normalizers, MatchNumpyInPlaceOrNot) {
    struct Case {
        std::string name, param, input, reference;
    };
    for (const Case& c : {Case{"QV_NORMALIZER_L1", "{}", "norm_mixed", "norm_l1_mixed"},
                          Case{"QV_NORMALIZER_L2", "{}", "norm_mixed", "norm_l2_mixed"},
                          Case{"QV_NORMALIZER_L1SQRT", "{}", "norm_hist", "norm_l1sqrt_hist"},
                          Case{"QV_NORMALIZER_L2HYS", "{\"clipThreshold\":0.2,\"alpha\":0.01}", "norm_mixed",
                               "norm_l2hys_mixed_0_2_0_01"}}) {
        SCOPED_TRACE(c.reference);
        std::unique_ptr<QVNormalizer> n(
            QVNormalizerFactory::instance().createInstance("{\"name\":\"" + c.name + "\",\"param\":" + c.param + "}"));
        ASSERT_NE(n, nullptr);
        const std::vector<float> input = fixtures::floats(c.input);
        const std::vector<float> out = run(*n, input);
        fixtures::expectAgrees(out, c.reference, 1e-6);
        std::vector<float> inPlace = input;
        n->normalize(inPlace.data(), static_cast<unsigned int>(inPlace.size()), inPlace.data());
        EXPECT_EQ(inPlace, out);
    }
}

TEST(Normalizers, EmptyZeroClippedAndNegativeInput) {
    const QVL1Normalizer l1;
    const QVL2Normalizer l2;
    const QVL1SqrtNormalizer l1Sqrt;
    const QVL2HysNormalizer l2Hys;
    for (const QVNormalizer* n : std::vector<const QVNormalizer*>{&l1, &l2, &l1Sqrt, &l2Hys}) {
        float sentinel = 7.0f;
        n->normalize(nullptr, 0, &sentinel);
        EXPECT_EQ(sentinel, 7.0f) << n->name();
        EXPECT_EQ(run(*n, {0, 0, 0}), (std::vector<float>{0, 0, 0})) << n->name();
    }
    // Default L2Hys clips at 0: positives vanish, negatives survive and are renormalized.
    const std::vector<float> hys = run(QVL2HysNormalizer(), {3, -1, -1});
    EXPECT_EQ(hys[0], 0.0f);
    EXPECT_NEAR(hys[1], -std::sqrt(0.5f), 1e-6);
    // L1Sqrt refuses a negative value before writing anything; NaN and -0 pass.
    std::vector<float> out = {9, 9};
    const std::vector<float> bad = {0, -0.5f};
    expectThrowWith<qv_domain_error>([&] { QVL1SqrtNormalizer().normalize(bad.data(), 2, out.data()); },
                                     "Negative value is not allowed in qvL1SqrtNormalize");
    EXPECT_EQ(out, (std::vector<float>{9, 9}));
    EXPECT_NO_THROW(run(QVL1SqrtNormalizer(), {-0.0f, std::nanf("")}));
}

TEST(Normalizers, RoundHalvesUpNotSymmetric) {
    const std::vector<std::pair<float, float>> cases = {
        {0.5f, 1}, {1.49f, 1}, {2.5f, 3}, {-1.2f, 0}, {-1.5f, -1}, {-1.6f, -1}, {-2.5f, -2}, {0.0f, 0}, {1e20f, 1e20f}};
    for (const auto& c : cases) EXPECT_EQ(qvRound(c.first), c.second) << c.first;
    EXPECT_TRUE(std::isnan(qvRound(std::nanf(""))));
}
