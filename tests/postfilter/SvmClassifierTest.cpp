#include <gtest/gtest.h>

#include <vector>

#include "PostFilterWriters.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/SvmClassifier.h"
#include "support/ScopedModel.h"

using postfilterwriters::SvmModelParams;

namespace {

SvmClassifier::SvmModel toModel(const SvmModelParams& s)
{
    SvmClassifier::SvmModel m;
    m.svmType = s.svmType;
    m.kernelType = s.kernelType;
    m.degree = s.degree;
    m.gamma = s.gamma;
    m.coef0 = s.coef0;
    m.classCount = s.classCount;
    m.rho = s.rho;
    m.decisionThresholds = s.decisionThresholds;
    m.labels = s.labels;
    m.svCounts = s.svCounts;
    m.svTotal = static_cast<int32_t>(s.supportVectors.size());
    m.featureLength = s.featureLength;
    m.supportVectors = s.supportVectors;
    m.coefficients = s.coefficients;
    return m;
}

// Two classes, kernel (0.5 x.s + 1)^2; class 0 owns (1,0) and (0,1), class 1
// owns (1,1). For the feature (2, 4) the kernel values are 4, 9, 16 and
//   sum = 0.5 * 4 - 1 * 9 + 0.25 * 16 - rho(0.5) = -3.5.
SvmModelParams twoClassParams(float threshold)
{
    SvmModelParams s;
    s.degree = 2;
    s.gamma = 0.5f;
    s.coef0 = 1.0f;
    s.rho = {0.5f};
    s.decisionThresholds = {threshold};
    s.labels = {7, 9};
    s.svCounts = {2, 1};
    s.featureLength = 2;
    s.supportVectors = {{1, 0}, {0, 1}, {1, 1}};
    s.coefficients = {{0.5f, -1.0f, 0.25f}};
    return s;
}

// Three classes, one unit support vector each, linear kernel; for the feature
// (1, 2, 3) the kernel values are 1, 2, 3. With rho and thresholds 0:
//   pair (0,1): c[0][0]*1 + c[0][1]*2 = 1 - 2  = -1 -> class 1
//   pair (0,2): c[1][0]*1 + c[0][2]*3 = -5 + 6 = 1  -> class 0
//   pair (1,2): c[1][1]*2 + c[1][2]*3 = 6 - 6  = 0  -> class 2 (not strictly above)
SvmModelParams threeClassParams(std::vector<float> rho)
{
    SvmModelParams s;
    s.classCount = 3;
    s.rho = rho;
    s.decisionThresholds = {0, 0, 0};
    s.labels = {10, 20, 30};
    s.svCounts = {1, 1, 1};
    s.featureLength = 3;
    s.supportVectors = {{1, 0, 0}, {0, 1, 0}, {0, 0, 1}};
    s.coefficients = {{1, -1, 2}, {-5, 3, -2}};
    return s;
}

int32_t classifyWith(const SvmModelParams& params, std::vector<float> feature)
{
    SvmClassifier c;
    c.setModel(toModel(params));
    return c.classify(feature.data(), static_cast<int>(feature.size()));
}

} // namespace

TEST(SvmArithmetic, PowiDotAndKernel)
{
    EXPECT_EQ(SvmClassifier::powi(3.0f, 5), 243.0f);
    EXPECT_EQ(SvmClassifier::powi(1.5f, 3), 3.375f);
    EXPECT_EQ(SvmClassifier::powi(-2.0f, 3), -8.0f);
    EXPECT_EQ(SvmClassifier::powi(0.0f, 0), 1.0f);
    EXPECT_EQ(SvmClassifier::powi(5.0f, -2), 1.0f);
    const float a[2] = {1, 2};
    EXPECT_EQ(SvmClassifier::dot(a, a, 0), 0.0f);
    EXPECT_EQ(SvmClassifier::dot(a, a, 2), 5.0f);
    SvmClassifier::SvmModel m = toModel(twoClassParams(0));
    const float f[2] = {2, 4};
    EXPECT_EQ(SvmClassifier::kernelFunction(f, {1, 1}, m), 16.0f);
    m.kernelType = 2;
    EXPECT_EQ(SvmClassifier::kernelFunction(f, {1, 1}, m), 0.0f);
}

TEST(SvmDecision, TwoClassesHangOnTheOneThresholdStrictly)
{
    EXPECT_EQ(classifyWith(twoClassParams(-4.0f), {2, 4}), 7); // -3.5 > -4: class 0
    EXPECT_EQ(classifyWith(twoClassParams(-3.5f), {2, 4}), 9); // equal is not above
    SvmModelParams other = twoClassParams(-1.0f);
    other.kernelType = 0; // kernel values 0: only rho and the threshold decide
    EXPECT_EQ(classifyWith(other, {2, 4}), 7);                // -0.5 > -1
}

TEST(SvmDecision, PairSumsTakeTheCoefficientRowsCrosswiseAndTiesGoLow)
{
    EXPECT_EQ(classifyWith(threeClassParams({0, 0, 0}), {1, 2, 3}), 10);     // 1:1:1, tie to class 0
    EXPECT_EQ(classifyWith(threeClassParams({0, 2, 0}), {1, 2, 3}), 30);     // pair (0,2) now -1
    EXPECT_EQ(classifyWith(threeClassParams({0, 0, -0.5f}), {1, 2, 3}), 20); // pair (1,2) now 0.5
    SvmModelParams single;
    single.classCount = 1;
    single.labels = {4};
    single.svCounts = {0};
    single.featureLength = 2;
    EXPECT_EQ(classifyWith(single, {1, 1}), 4);
}

TEST(SvmDecision, WrongFeatureLengthOrNoModelIsRefused)
{
    SvmClassifier c;
    const float f[3] = {1, 2, 3};
    EXPECT_THROW(c.classify(f, 2), qv_unsupported_error);
    c.setModel(toModel(twoClassParams(0)));
    try {
        c.classify(f, 3);
        FAIL() << "no exception";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Incorrect PostFilter's feature length");
    }
}

TEST(SvmModelLoad, ExpandsSparseVectorsAndReadsTwoModelsInSequence)
{
    SvmModelParams second = threeClassParams({0, 2, 0});
    second.supportVectors[1] = {0, 0.75f, -2.5f};
    ScopedModel model("pf_svm_pair", postfilterwriters::svmModelPayload(twoClassParams(-4.0f), second));
    ModelReader reader("pf_svm_pair", ModelReader::RAW);
    SvmClassifier a(reader);
    SvmClassifier b(reader);
    const SvmClassifier::SvmModel& m = b.getModel();
    EXPECT_EQ(m.svTotal, 3);
    EXPECT_EQ(m.labels, (std::vector<int32_t>{10, 20, 30}));
    EXPECT_EQ(m.rho, (std::vector<float>{0, 2, 0}));
    EXPECT_EQ(m.supportVectors[1], (std::vector<float>{0, 0.75f, -2.5f}));
    EXPECT_EQ(m.coefficients, second.coefficients);
    const float f2[2] = {2, 4};
    EXPECT_EQ(a.classify(f2, 2), 7);
}

TEST(SvmModelLoad, EveryTruncationIsADataError)
{
    std::vector<uint8_t> full = postfilterwriters::svmModelPayload(twoClassParams(0), threeClassParams({0, 0, 0}));
    for (std::size_t n = 0; n < full.size(); ++n) {
        ScopedModel model("pf_svm_cut", std::vector<uint8_t>(full.begin(), full.begin() + n));
        ModelReader reader("pf_svm_cut", ModelReader::RAW);
        SvmClassifier a, b;
        EXPECT_THROW({
            a.init(reader);
            b.init(reader);
        }, qv_data_error) << "cut at " << n;
    }
}

TEST(SvmModelLoad, RejectsInconsistentModels)
{
    auto load = [](const std::vector<uint8_t>& bytes) {
        ScopedModel model("pf_svm_bad", bytes);
        ModelReader reader("pf_svm_bad", ModelReader::RAW);
        SvmClassifier c(reader);
    };
    auto broken = [&](void (*edit)(SvmModelParams&)) {
        SvmModelParams s = twoClassParams(0);
        edit(s);
        postfilterwriters::ByteWriter w;
        postfilterwriters::writeSvmModel(w, s);
        load(w.bytes());
    };
    EXPECT_THROW(broken([](SvmModelParams& s) { s.classCount = 0; }), qv_data_error);
    EXPECT_THROW(broken([](SvmModelParams& s) { s.classCount = -3; }), qv_data_error);
    EXPECT_THROW(broken([](SvmModelParams& s) { s.classCount = 100000; }), qv_data_error); // pair tables
    EXPECT_THROW(broken([](SvmModelParams& s) { s.svCounts = {2, 2}; }), qv_data_error);   // 4 of 3
    EXPECT_THROW(broken([](SvmModelParams& s) { s.svCounts = {4, -1}; }), qv_data_error);
    EXPECT_THROW(broken([](SvmModelParams& s) { s.supportVectors[2] = {1, 1, 1}; }), qv_data_error); // column 3
    {   // Counts claiming two vectors while an entry sits in row 3.
        postfilterwriters::ByteWriter w;
        postfilterwriters::writeSvmModel(w, twoClassParams(0));
        std::vector<uint8_t> bytes = w.bytes();
        for (int at : {40, 44, 48}) // svCounts {1, 1}, svTotal 2
            bytes[at] = at == 48 ? 2 : 1;
        EXPECT_THROW(load(bytes), qv_data_error);
    }

    // A sparse table whose dense form would be 10^10 values, and a negative entry count.
    for (int32_t entries : {0, -1}) {
        const int32_t side = entries == 0 ? 100000 : 0;
        postfilterwriters::ByteWriter w;
        for (int32_t v : {0, 1, 1})
            w.int32(v);
        w.float32(1);
        w.float32(0);
        for (int32_t v : {1, 5, side, side, side == 0 ? 4 : side, entries})
            w.int32(v); // one class, label, svCounts, svTotal, featureLength, entries
        EXPECT_THROW(load(w.bytes()), qv_data_error) << entries;
    }
}
