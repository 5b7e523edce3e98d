// The SVM classifier (one-against-one vote, sparse model file) and the LBP
// SVM post filter that judges every hit on its transposed patch.

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/LbpSvmPostFilter.h"
#include "postfilter/SvmClassifier.h"
#include "support/ExpectThrow.h"
#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"

using postfilterwriters::SvmModelParams;
using pftest::hit;
using pftest::svmThresholdModel;

namespace {

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

ScopedModel serveSvms(const char* name, const SvmModelParams& primary, const SvmModelParams& secondary)
{
    return ScopedModel(name, postfilterwriters::svmModelPayload(primary, secondary));
}

std::vector<uint8_t> svmBytes(const SvmModelParams& s)
{
    postfilterwriters::ByteWriter w;
    postfilterwriters::writeSvmModel(w, s);
    return w.bytes();
}

void loadInto(SvmClassifier& c, const std::vector<uint8_t>& bytes)
{
    ScopedModel model("pf_svm_one", bytes);
    ModelReader reader("pf_svm_one", ModelReader::RAW);
    c.init(reader);
}

} // namespace

TEST(SvmDecision, VotesStrictlyAboveTheThresholdAndTiesGoLow)
{
    SvmModelParams otherKernel = twoClassParams(-1.0f);
    otherKernel.kernelType = 0; // only the polynomial kernel is known: the others give 0
    SvmModelParams single;
    single.classCount = 1;
    single.labels = {4};
    single.svCounts = {0};
    single.featureLength = 2;
    struct Case {
        SvmModelParams model;
        std::vector<float> feature;
        int32_t label;
        const char* why;
    };
    const Case cases[] = {
        {twoClassParams(-4.0f), {2, 4}, 7, "-3.5 > -4: class 0"},
        {twoClassParams(-3.5f), {2, 4}, 9, "equal is not above"},
        {threeClassParams({0, 0, 0}), {1, 2, 3}, 10, "1:1:1, tie to class 0"},
        {threeClassParams({0, 2, 0}), {1, 2, 3}, 30, "pair (0,2) now -1"},
        {threeClassParams({0, 0, -0.5f}), {1, 2, 3}, 20, "pair (1,2) now 0.5"},
        {otherKernel, {2, 4}, 7, "kernel 0, so -rho: -0.5 > -1"},
        {single, {1, 1}, 4, "one class"},
    };
    for (const Case& c : cases) {
        SvmClassifier svm;
        loadInto(svm, svmBytes(c.model));
        EXPECT_EQ(svm.classify(c.feature.data(), static_cast<int>(c.feature.size())), c.label) << c.why;
    }
    // powi's own edges: a negative exponent gives 1, not a reciprocal.
    EXPECT_EQ(SvmClassifier::powi(-2.0f, 3), -8.0f);
    EXPECT_EQ(SvmClassifier::powi(5.0f, -2), 1.0f);
}

// Cut models are left to FuzzPostFilterModel and its replayed regressions.
TEST(SvmModelLoad, RejectsInconsistentModels)
{
    using Edit = void (*)(SvmModelParams&);
    const Edit edits[] = {
        [](SvmModelParams& s) { s.classCount = 0; },
        [](SvmModelParams& s) { s.classCount = -3; },
        [](SvmModelParams& s) { s.classCount = 100000; }, // pair tables
        [](SvmModelParams& s) { s.svCounts = {2, 2}; },   // 4 of 3
        [](SvmModelParams& s) { s.svCounts = {4, -1}; },
        [](SvmModelParams& s) { s.supportVectors[2] = {1, 1, 1}; }, // an entry in column 3
    };
    for (std::size_t i = 0; i < std::size(edits); ++i) {
        SvmModelParams s = twoClassParams(0);
        edits[i](s);
        SvmClassifier c;
        EXPECT_THROW(loadInto(c, svmBytes(s)), qv_data_error) << "edit " << i;
    }
    // Counts claiming two vectors while an entry sits in row 3.
    std::vector<uint8_t> bytes = svmBytes(twoClassParams(0));
    for (int at : {40, 44, 48}) // svCounts {1, 1}, svTotal 2
        bytes[at] = at == 48 ? 2 : 1;
    SvmClassifier c;
    EXPECT_THROW(loadInto(c, bytes), qv_data_error);

    // A sparse table whose dense form would be 10^10 values, and a negative entry count.
    for (int32_t entries : {0, -1}) {
        const int32_t side = entries == 0 ? 100000 : 0;
        postfilterwriters::ByteWriter t;
        for (int32_t v : {0, 1, 1})
            t.int32(v);
        t.float32(1);
        t.float32(0);
        for (int32_t v : {1, 5, side, side, side == 0 ? 4 : side, entries})
            t.int32(v); // one class, label, svCounts, svTotal, featureLength, entries
        EXPECT_THROW(loadInto(c, t.bytes()), qv_data_error) << entries;
    }
}

TEST(LbpSvmJudgement, EveryHitIsJudgedAndOnlyLabelOneOfTheRightModelPasses)
{
    // Passes when the cascade score is above 50: even a score of 9 is judged.
    ScopedModel m = serveSvms("pf_svm_score", svmThresholdModel(0, 50.0f), svmThresholdModel(0, 50.0f));
    std::vector<ScoredWindow> in = {hit(9.0f, 0), hit(60.0f, 0), hit(51.0f, 4)};
    std::vector<ScoredWindow> out = pftest::filterOnHalfRamp(LbpSvmPostFilter("pf_svm_score"), in);
    ASSERT_EQ(out.size(), 2u);
    EXPECT_TRUE(pftest::sameHit(out[0], in[1]));
    EXPECT_TRUE(pftest::sameHit(out[1], in[2]));
    // Class 0 always wins, but its label is 2.
    ScopedModel two = serveSvms("pf_svm_label", svmThresholdModel(0, -1000.0f, 2, 1),
                                svmThresholdModel(0, -1000.0f, 2, 1));
    EXPECT_TRUE(pftest::filterOnHalfRamp(LbpSvmPostFilter("pf_svm_label"), {hit(1.0f, 0), hit(1.0f, 1)}).empty());
    EXPECT_THROW(pftest::filterOnHalfRamp(LbpSvmPostFilter(), {hit(10.0f, 0)}), qv_unsupported_error);
    // Only category 0 goes to the primary model.
    ScopedModel route = serveSvms("pf_svm_route", svmThresholdModel(0, -1000.0f), svmThresholdModel(0, 1000.0f));
    out = pftest::filterOnHalfRamp(LbpSvmPostFilter("pf_svm_route"),
                                   {hit(1.0f, 0), hit(1.0f, 3), hit(1.0f, -1), hit(2.0f, 0)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].score, 1.0f);
    EXPECT_EQ(out[1].score, 2.0f);
}

TEST(LbpSvmJudgement, HistogramIsTakenOnTheTransposedPatch)
{
    // Transposed, the flat right half of the frame becomes the bottom half:
    // cell (3, 0) counts 25 pixels of code 0 and cell (0, 3) none.
    const int flat = pftest::binIndex(3, 0, 0), ramp = pftest::binIndex(0, 3, 0);
    ScopedModel a = serveSvms("pf_svm_t30", svmThresholdModel(flat, 24.5f), svmThresholdModel(flat, 24.5f));
    ScopedModel b = serveSvms("pf_svm_t03", svmThresholdModel(ramp, 0.0f), svmThresholdModel(ramp, 0.0f));
    EXPECT_EQ(pftest::filterOnHalfRamp(LbpSvmPostFilter("pf_svm_t30"), {hit(1.0f, 0)}).size(), 1u);
    EXPECT_EQ(pftest::filterOnHalfRamp(LbpSvmPostFilter("pf_svm_t03"), {hit(1.0f, 0)}).size(), 0u);
}

