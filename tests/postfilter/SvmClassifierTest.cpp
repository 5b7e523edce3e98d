#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "PostFilterWriters.h"
#include "support/ScopedModel.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/SvmClassifier.h"

using postfilterwriters::SvmModelSpec;

namespace {

SvmClassifier::SvmModel toModel(const SvmModelSpec& s)
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

// Two classes, quadratic kernel (0.5 x.s + 1)^2. Class 0 owns (1,0) and (0,1),
// class 1 owns (1,1). For the feature (2, 4) the kernel values are 4, 9, 16 and
//   sum = 0.5 * 4 - 1 * 9 + 0.25 * 16 - rho(0.5) = -3.5.
SvmModelSpec twoClassSpec(float threshold)
{
    SvmModelSpec s;
    s.svmType = 0;
    s.kernelType = 1;
    s.degree = 2;
    s.gamma = 0.5f;
    s.coef0 = 1.0f;
    s.classCount = 2;
    s.rho = {0.5f};
    s.decisionThresholds = {threshold};
    s.labels = {7, 9};
    s.svCounts = {2, 1};
    s.featureLength = 2;
    s.supportVectors = {{1, 0}, {0, 1}, {1, 1}};
    s.coefficients = {{0.5f, -1.0f, 0.25f}};
    return s;
}

// Three classes with one unit support vector each, linear kernel; for the
// feature (1, 2, 3) the kernel values are 1, 2, 3. With rho and thresholds 0:
//   pair (0,1): c[0][0]*1 + c[0][1]*2 = 1 - 2  = -1 -> class 1
//   pair (0,2): c[1][0]*1 + c[0][2]*3 = -5 + 6 = 1  -> class 0
//   pair (1,2): c[1][1]*2 + c[1][2]*3 = 6 - 6  = 0  -> class 2 (not strictly above)
SvmModelSpec threeClassSpec(std::vector<float> rho)
{
    SvmModelSpec s;
    s.kernelType = 1;
    s.degree = 1;
    s.gamma = 1.0f;
    s.coef0 = 0.0f;
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

int32_t classifyWith(const SvmModelSpec& spec, std::vector<float> feature)
{
    SvmClassifier c;
    c.setModel(toModel(spec));
    return c.classify(feature.data(), static_cast<int>(feature.size()));
}

} // namespace

TEST(SvmArithmetic, PowiIsBinaryExponentiation)
{
    EXPECT_FLOAT_EQ(SvmClassifier::powi(3.0f, 5), 243.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::powi(1.5f, 3), 3.375f);
    EXPECT_FLOAT_EQ(SvmClassifier::powi(-2.0f, 3), -8.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::powi(0.0f, 0), 1.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::powi(5.0f, -2), 1.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::powi(2.0f, 1), 2.0f);
}

TEST(SvmArithmetic, DotOfNothingIsZero)
{
    const float a[2] = {1, 2};
    EXPECT_FLOAT_EQ(SvmClassifier::dot(a, a, 0), 0.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::dot(a, a, -3), 0.0f);
    EXPECT_FLOAT_EQ(SvmClassifier::dot(a, a, 2), 5.0f);
}

TEST(SvmArithmetic, KernelIsPolynomialOnlyForTypeOne)
{
    SvmClassifier::SvmModel m = toModel(twoClassSpec(0));
    const float f[2] = {2, 4};
    EXPECT_FLOAT_EQ(SvmClassifier::kernelFunction(f, {1, 1}, m), 16.0f);
    m.kernelType = 2;
    EXPECT_FLOAT_EQ(SvmClassifier::kernelFunction(f, {1, 1}, m), 0.0f);
}

TEST(SvmDecision, TwoClassesHangOnTheOneThreshold)
{
    EXPECT_EQ(classifyWith(twoClassSpec(-4.0f), {2, 4}), 7); // -3.5 > -4: class 0
    EXPECT_EQ(classifyWith(twoClassSpec(-3.5f), {2, 4}), 9); // equal is not above
    EXPECT_EQ(classifyWith(twoClassSpec(0.0f), {2, 4}), 9);
}

TEST(SvmDecision, PairSumsTakeTheCoefficientRowsCrosswise)
{
    EXPECT_EQ(classifyWith(threeClassSpec({0, 0, 0}), {1, 2, 3}), 10);     // 1:1:1, tie to class 0
    EXPECT_EQ(classifyWith(threeClassSpec({0, 2, 0}), {1, 2, 3}), 30);     // pair (0,2) now -1
    EXPECT_EQ(classifyWith(threeClassSpec({0, 0, -0.5f}), {1, 2, 3}), 20); // pair (1,2) now 0.5
}

TEST(SvmDecision, OtherKernelLeavesOnlyRhoAndThresholds)
{
    SvmModelSpec s = twoClassSpec(-1.0f);
    s.kernelType = 0;
    EXPECT_EQ(classifyWith(s, {2, 4}), 7); // -0.5 > -1
    s.rho = {1.0f};
    EXPECT_EQ(classifyWith(s, {2, 4}), 9); // -1 is not above -1
}

TEST(SvmDecision, SingleClassAlwaysAnswersItsLabel)
{
    SvmModelSpec s;
    s.classCount = 1;
    s.labels = {4};
    s.svCounts = {0};
    s.featureLength = 2;
    EXPECT_EQ(classifyWith(s, {1, 1}), 4);
}

TEST(SvmDecision, WrongFeatureLengthOrNoModelIsRefused)
{
    SvmClassifier c;
    const float f[3] = {1, 2, 3};
    EXPECT_THROW(c.classify(f, 2), qv_unsupported_error);
    c.setModel(toModel(twoClassSpec(0)));
    try {
        c.classify(f, 3);
        FAIL() << "no exception";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Incorrect PostFilter's feature length");
    }
}

TEST(SvmModelLoad, ExpandsSparseVectorsAndReadsTwoModelsInSequence)
{
    SvmModelSpec first = twoClassSpec(-4.0f);
    SvmModelSpec second = threeClassSpec({0, 2, 0});
    second.supportVectors[1] = {0, 0.75f, -2.5f};
    ScopedModel model("pf_svm_pair", postfilterwriters::svmModelPayload(first, second));
    ModelReader reader("pf_svm_pair", ModelReader::RAW);
    SvmClassifier a(reader);
    SvmClassifier b(reader);

    const SvmClassifier::SvmModel& m = b.getModel();
    EXPECT_EQ(m.classCount, 3);
    EXPECT_EQ(m.svTotal, 3);
    EXPECT_EQ(m.featureLength, 3);
    EXPECT_EQ(m.labels, (std::vector<int32_t>{10, 20, 30}));
    EXPECT_EQ(m.rho, (std::vector<float>{0, 2, 0}));
    EXPECT_EQ(m.supportVectors[1], (std::vector<float>{0, 0.75f, -2.5f}));
    EXPECT_EQ(m.coefficients, second.coefficients);

    const float f2[2] = {2, 4};
    EXPECT_EQ(a.classify(f2, 2), 7);
    EXPECT_EQ(a.getModel().gamma, 0.5f);
    EXPECT_EQ(a.getModel().degree, 2);
}

TEST(SvmModelLoad, EveryTruncationIsADataError)
{
    std::vector<uint8_t> full = postfilterwriters::svmModelPayload(twoClassSpec(0), threeClassSpec({0, 0, 0}));
    for (std::size_t n = 0; n < full.size(); ++n) {
        std::vector<uint8_t> cut(full.begin(), full.begin() + n);
        ScopedModel model("pf_svm_cut", cut);
        ModelReader reader("pf_svm_cut", ModelReader::RAW);
        SvmClassifier a;
        SvmClassifier b;
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
    auto payload = [](const SvmModelSpec& s) {
        postfilterwriters::ByteWriter w;
        postfilterwriters::writeSvmModel(w, s);
        return w.bytes();
    };
    SvmModelSpec noClass = twoClassSpec(0);
    noClass.classCount = 0;
    EXPECT_THROW(load(payload(noClass)), qv_data_error);

    SvmModelSpec negative = twoClassSpec(0);
    negative.classCount = -3;
    EXPECT_THROW(load(payload(negative)), qv_data_error);

    SvmModelSpec countsOff = twoClassSpec(0);
    countsOff.svCounts = {2, 2}; // four claimed, three stored
    EXPECT_THROW(load(payload(countsOff)), qv_data_error);

    SvmModelSpec countNegative = twoClassSpec(0);
    countNegative.svCounts = {4, -1};
    EXPECT_THROW(load(payload(countNegative)), qv_data_error);

    SvmModelSpec wideEntry = twoClassSpec(0);
    wideEntry.supportVectors[2] = {1, 1, 1}; // column 3 of a 2-long vector
    EXPECT_THROW(load(payload(wideEntry)), qv_data_error);

    SvmModelSpec manyClasses = twoClassSpec(0);
    manyClasses.classCount = 100000; // pair tables far beyond the data
    EXPECT_THROW(load(payload(manyClasses)), qv_data_error);

    // A sparse table whose dense form would be 10^10 values.
    postfilterwriters::ByteWriter w;
    for (int32_t v : {0, 1, 1})
        w.int32(v);
    w.float32(1);
    w.float32(0);
    w.int32(1);               // one class: no pairs
    w.int32(5);               // label
    w.int32(100000);          // svCounts
    w.int32(100000);          // svTotal
    w.int32(100000);          // featureLength
    w.int32(0);               // no entries
    EXPECT_THROW(load(w.bytes()), qv_data_error);

    postfilterwriters::ByteWriter neg;
    for (int32_t v : {0, 1, 1})
        neg.int32(v);
    neg.float32(1);
    neg.float32(0);
    neg.int32(1);
    neg.int32(5);
    neg.int32(0);
    neg.int32(0);
    neg.int32(4);
    neg.int32(-1); // negative entry count
    EXPECT_THROW(load(neg.bytes()), qv_data_error);
}
