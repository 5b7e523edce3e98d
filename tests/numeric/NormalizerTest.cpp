// Normalizers against numpy references and closed forms (norms after
// normalizing), the hand cases of their edges, JSON forms and the factory.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "core/Errors.h"
#include "core/Json.h"
#include "numeric/Fixtures.h"
#include "numeric/NormalizerFactory.h"
#include "quorin/Normalizers.h"

namespace {

std::vector<float> run(const QVNormalizer& n, std::vector<float> v) {
    std::vector<float> out(v.size(), -99.0f);
    n.normalize(v.data(), static_cast<unsigned int>(v.size()), out.data());
    return out;
}

TEST(Normalizers, MatchNumpyInPlaceOrNot) {
    struct Case {
        std::shared_ptr<QVNormalizer> normalizer;
        const char* input;
        const char* reference;
    };
    const std::vector<Case> cases = {
        {std::make_shared<QVL1Normalizer>(), "norm_mixed", "norm_l1_mixed"},
        {std::make_shared<QVL2Normalizer>(), "norm_mixed", "norm_l2_mixed"},
        {std::make_shared<QVL1SqrtNormalizer>(), "norm_hist", "norm_l1sqrt_hist"},
        {std::make_shared<QVL2HysNormalizer>(0.2f, 0.01f), "norm_mixed", "norm_l2hys_mixed_0_2_0_01"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.normalizer->name());
        const std::vector<float> input = fixtures::floats(c.input);
        const std::vector<double> reference = fixtures::values(c.reference);
        ASSERT_EQ(input.size(), reference.size());
        const std::vector<float> out = run(*c.normalizer, input);
        for (std::size_t i = 0; i < out.size(); ++i) EXPECT_NEAR(out[i], reference[i], 1e-6);
        std::vector<float> inPlace = input;
        c.normalizer->normalize(inPlace.data(), static_cast<unsigned int>(inPlace.size()), inPlace.data());
        EXPECT_EQ(inPlace, out);
    }
}

TEST(Normalizers, NormsAfterNormalizing) {
    const std::vector<float> v = {3, -4, 0, 12, 0.5f};
    double l1 = 0, l2 = 0, sqrtSquares = 0;
    for (float x : run(QVL1Normalizer(), v)) l1 += std::fabs(x);
    for (float x : run(QVL2Normalizer(), v)) l2 += double(x) * x;
    const std::vector<float> hist = {1, 4, 0, 9, 2};
    for (float x : run(QVL1SqrtNormalizer(), hist)) sqrtSquares += double(x) * x;
    EXPECT_NEAR(l1, 1.0, 1e-6);
    EXPECT_NEAR(l2, 1.0, 1e-6);
    EXPECT_NEAR(sqrtSquares, 1.0, 1e-6);
    // With a clip that never bites and no alpha, L2Hys is L2 twice over.
    const std::vector<float> hys = run(QVL2HysNormalizer(10.0f, 0.0f), v);
    const std::vector<float> l2v = run(QVL2Normalizer(), v);
    for (std::size_t i = 0; i < v.size(); ++i) EXPECT_NEAR(hys[i], l2v[i], 1e-6);
}

TEST(Normalizers, EdgeCases) {
    // Length 0 writes nothing.
    for (const QVNormalizer* n : std::vector<const QVNormalizer*>{new QVL1Normalizer, new QVL2Normalizer,
                                                                  new QVL1SqrtNormalizer, new QVL2HysNormalizer}) {
        float sentinel = 7.0f;
        n->normalize(nullptr, 0, &sentinel);
        EXPECT_EQ(sentinel, 7.0f) << n->name();
        // A zero vector gives zeros.
        EXPECT_EQ(run(*n, {0, 0, 0}), (std::vector<float>{0, 0, 0})) << n->name();
        delete n;
    }
    const std::vector<float> l1 = run(QVL1Normalizer(), {1, -3});
    EXPECT_NEAR(l1[0], 0.25f, 1e-6);
    EXPECT_NEAR(l1[1], -0.75f, 1e-6);
    // Default L2Hys clips at 0: positives vanish, negatives survive and are renormalized.
    const std::vector<float> hys = run(QVL2HysNormalizer(), {3, -1, -1});
    EXPECT_EQ(hys[0], 0.0f);
    EXPECT_NEAR(hys[1], -std::sqrt(0.5f), 1e-6);
    EXPECT_NEAR(hys[2], -std::sqrt(0.5f), 1e-6);
    // Clipped from above only.
    const std::vector<float> clipped = run(QVL2HysNormalizer(0.1f, 0.0f), {-5, 5});
    EXPECT_LT(clipped[0], -0.9f);
    // L1Sqrt refuses a negative value before writing anything; NaN and -0 pass.
    std::vector<float> out = {9, 9};
    const std::vector<float> bad = {0, -0.5f};
    try {
        QVL1SqrtNormalizer().normalize(bad.data(), 2, out.data());
        ADD_FAILURE() << "negative input accepted";
    } catch (const qv_domain_error& e) {
        EXPECT_STREQ(e.what(), "Negative value is not allowed in qvL1SqrtNormalize");
    }
    EXPECT_EQ(out, (std::vector<float>{9, 9}));
    EXPECT_NO_THROW(run(QVL1SqrtNormalizer(), {-0.0f, 1}));
    EXPECT_NO_THROW(run(QVL1SqrtNormalizer(), {std::nanf(""), 1}));
    // epsilon shows only where the sum's spacing is finer than it: 4 + 2^-23
    // is 4 in float, 0.25 + 2^-23 is not.
    EXPECT_EQ(run(QVL1SqrtNormalizer(), {4, 0})[0], 1.0f);
    const float first = run(QVL1SqrtNormalizer(), {0.25f, 0})[0];
    EXPECT_LT(first, 1.0f);
    EXPECT_GT(first, 0.9999f);
    // The templates return the end of what they wrote.
    std::vector<float> target(3);
    const std::vector<float> src = {1, 2, 3};
    EXPECT_EQ(qvL1SqrtNormalize(src.begin(), src.end(), target.begin()), target.end());
    EXPECT_EQ(qvL2HysNormalize(src.begin(), src.end(), 1.0f, 0.0f, target.begin()), target.end());
    EXPECT_EQ(qvL1SqrtNormalize(src.begin(), src.begin(), target.begin()), target.begin());
}

TEST(Normalizers, RoundHalvesUpNotSymmetric) {
    const std::vector<std::pair<float, float>> cases = {
        {0.5f, 1}, {1.49f, 1}, {2.5f, 3}, {-1.2f, 0}, {-1.5f, -1}, {-1.6f, -1}, {-2.5f, -2}, {0.0f, 0}, {1e20f, 1e20f}};
    for (const auto& c : cases) EXPECT_EQ(qvRound(c.first), c.second) << c.first;
    EXPECT_TRUE(std::isnan(qvRound(std::nanf(""))));
    EXPECT_EQ(qvRound(-INFINITY), -INFINITY);
    EXPECT_EQ(QVNormalizer::epsilon, std::ldexp(1.0f, -23));
}

TEST(Normalizers, JsonFormsAndFactory) {
    struct Case {
        std::string description;
        std::string name;  // empty: null
        std::string json;
    };
    const std::vector<Case> cases = {
        {"{\"name\":\"QV_NORMALIZER_L1\",\"param\":{}}", "QV_NORMALIZER_L1", "{}"},
        {"{\"name\":\"QV_NORMALIZER_L2\",\"param\":{}}", "QV_NORMALIZER_L2", "{}"},
        {"{\"name\":\"QV_NORMALIZER_L1SQRT\",\"param\":{}}", "QV_NORMALIZER_L1SQRT", "{}"},
        {"{\"name\":\"QV_NORMALIZER_L2HYS\",\"param\":{\"clipThreshold\":0.2,\"alpha\":0.5}}", "QV_NORMALIZER_L2HYS",
         "{\"clipThreshold\":0.2,\"alpha\":0.5}"},
        {"{\"name\":\"QV_NORMALIZER_L2HYS\",\"param\":{\"alpha\":3}}", "QV_NORMALIZER_L2HYS",
         "{\"clipThreshold\":0,\"alpha\":3}"},
        {"{\"name\":\"QV_NORMALIZER_L1\",\"param\":{\"x\":1}}", "", ""},
        {"{\"name\":\"QV_NORMALIZER_L2\",\"param\":[]}", "", ""},
        {"{\"name\":\"QV_NORMALIZER_L1SQRT\"}", "", ""},
        {"{\"name\":\"QV_NORMALIZER_L3\",\"param\":{}}", "", ""},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.description);
        std::unique_ptr<QVNormalizer> n(QVNormalizerFactory::instance().createInstance(c.description));
        ASSERT_EQ(n == nullptr, c.name.empty());
        if (!n) continue;
        EXPECT_EQ(n->name(), c.name);
        EXPECT_EQ(n->toJson(), c.json);
    }
    try {
        QVL2Normalizer().fromJson("{\"a\":1}");
        ADD_FAILURE();
    } catch (const JsonError& e) {
        EXPECT_STREQ(e.what(), "Json deserialization error");
    }
    QVL2HysNormalizer hys(0.3f, 0.1f);
    hys.fromJson("{\"clipThreshold\":0.25}");
    EXPECT_EQ(hys.clipThreshold(), 0.25f);
    EXPECT_EQ(hys.alpha(), 0.1f);
}

}  // namespace
