#include <gtest/gtest.h>

#include <random>
#include <vector>

#include "CascadeWriter.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "detector/CascadeStage.h"
#include "detector/HaarFeature.h"
#include "detector/WindowFeature.h"
#include "support/ScopedModel.h"

namespace {

CascadeStage stageWithThresholds(float t0, float t1, float t2, float t3, float t4, float t5, float t6)
{
    CascadeStage s;
    const float t[7] = {t0, t1, t2, t3, t4, t5, t6};
    for (int i = 0; i < 7; ++i)
        s.binThresholds[i] = t[i];
    s.scoreCount = 1;
    for (int b = 0; b < 8; ++b)
        s.binScores[0][b] = static_cast<float>(b); // the score added is the bin
    s.rejectThreshold[0] = -1e30f;
    return s;
}

int binOf(CascadeStage const& s, float value)
{
    float scores[15] = {};
    s.UpdateScoreAndThreshold(value, scores);
    return static_cast<int>(scores[0]);
}

struct RandomIntegral {
    std::vector<unsigned char> px;
    IN_IMAGE image;
    RandomIntegral(int w, int h, unsigned seed) : px(size_t(w) * h)
    {
        std::mt19937 rng(seed);
        for (auto& p : px)
            p = static_cast<unsigned char>(rng() & 0xFF);
        image.Init(w, h, w, px.data());
    }
};

HaarFeature makeFeature(std::vector<HaarRect> rects)
{
    HaarFeature f;
    f.Init(static_cast<int>(rects.size()));
    for (size_t i = 0; i < rects.size(); ++i)
        f.rects[i] = rects[i];
    return f;
}

HaarRect rect(float weight, int left, int top, int right, int bottom)
{
    HaarRect r;
    r.weight = weight;
    r.left = left;
    r.top = top;
    r.right = right;
    r.bottom = bottom;
    return r;
}

// Loads one stage record written by CascadeWriter.
void loadStage(CascadeModelStage const& written, CascadeStage& stage, WindowFeature& feature)
{
    std::vector<uint8_t> bytes;
    CascadeWriter::putStage(bytes, written);
    ScopedModel model("classifierstage", bytes);
    ModelReader reader("classifierstage", ModelReader::RAW);
    stage.Init(reader, &feature);
}

} // namespace

TEST(StageBins, HigherValuesFallInLowerBinsAndTiesGoUp)
{
    const CascadeStage s = stageWithThresholds(60, 50, 40, 30, 20, 10, 0);
    EXPECT_EQ(binOf(s, 100), 0);
    EXPECT_EQ(binOf(s, 60), 0);
    EXPECT_EQ(binOf(s, 59.9f), 1);
    EXPECT_EQ(binOf(s, 50), 1);
    EXPECT_EQ(binOf(s, 45), 2);
    EXPECT_EQ(binOf(s, 35), 3);
    EXPECT_EQ(binOf(s, 30), 3);
    EXPECT_EQ(binOf(s, 29.9f), 4);
    EXPECT_EQ(binOf(s, 10), 5);
    EXPECT_EQ(binOf(s, 5), 6);
    EXPECT_EQ(binOf(s, 0), 6);
    EXPECT_EQ(binOf(s, -1), 7);
}

TEST(StageScores, SingleScoreIgnoresTheSentinelAndSurvivesAtItsThreshold)
{
    CascadeStage s = stageWithThresholds(0, 0, 0, 0, 0, 0, 0);
    for (int b = 0; b < 8; ++b)
        s.binScores[0][b] = 2.0f;
    s.rejectThreshold[0] = -18.0f;
    float scores[15] = {-20.0f};
    EXPECT_FALSE(s.UpdateScoreAndThreshold(1.0f, scores)); // -20 + 2 = -18: equal survives
    EXPECT_EQ(scores[0], -18.0f);
    s.rejectThreshold[0] = -15.0f;
    EXPECT_TRUE(s.UpdateScoreAndThreshold(1.0f, scores));
}

TEST(StageScores, DeadScoresStayDeadAndRejectionNeedsAllDead)
{
    CascadeStage s = stageWithThresholds(0, 0, 0, 0, 0, 0, 0);
    s.scoreCount = 3;
    for (int i = 0; i < 3; ++i)
        for (int b = 0; b < 8; ++b)
            s.binScores[i][b] = 1.0f;
    s.rejectThreshold[0] = 0.5f;
    s.rejectThreshold[1] = 5.0f; // will die
    s.rejectThreshold[2] = 1.0f; // equal survives
    float scores[15] = {0.0f, 0.0f, 0.0f};
    EXPECT_FALSE(s.UpdateScoreAndThreshold(0.0f, scores));
    EXPECT_EQ(scores[0], 1.0f);
    EXPECT_EQ(scores[1], -20.0f);
    EXPECT_EQ(scores[2], 1.0f);
    // A dead score gets no bin score.
    EXPECT_FALSE(s.UpdateScoreAndThreshold(0.0f, scores));
    EXPECT_EQ(scores[1], -20.0f);
    s.rejectThreshold[0] = s.rejectThreshold[2] = 100.0f;
    EXPECT_TRUE(s.UpdateScoreAndThreshold(0.0f, scores));
}

TEST(StageScores, NoScoresRejectsAtOnce)
{
    CascadeStage s = stageWithThresholds(0, 0, 0, 0, 0, 0, 0);
    s.scoreCount = 0;
    float scores[15] = {};
    EXPECT_TRUE(s.UpdateScoreAndThreshold(3.0f, scores));
}

TEST(StageScores, RemapBranchesOneScoreIntoSeveral)
{
    CascadeStage s = stageWithThresholds(0, 0, 0, 0, 0, 0, 0);
    s.scoreCount = 3;
    s.remapFlag = 1;
    s.remap[0] = 0;
    s.remap[1] = 0;
    s.remap[2] = 2; // a slot never written reads 0
    for (int i = 0; i < 3; ++i) {
        for (int b = 0; b < 8; ++b)
            s.binScores[i][b] = float(i + 1);
        s.rejectThreshold[i] = -100.0f;
    }
    float scores[15] = {4.0f, 9.0f, 0.0f};
    EXPECT_FALSE(s.UpdateScoreAndThreshold(1.0f, scores));
    EXPECT_EQ(scores[0], 5.0f);
    EXPECT_EQ(scores[1], 6.0f);
    EXPECT_EQ(scores[2], 3.0f);
}

TEST(StageLoading, RecordRoundTripsThroughTheWriter)
{
    CascadeModelStage w = CascadeWriter::stump(
        CascadeWriter::haar({{2.5f, 1, 2, 5, 9}, {-1.0f, 0, 0, 24, 24}}), 0.75f, 1.0f, -1.0f, -3.0f);
    w.binThresholds = {{7, 6, 5, 4, 3, 2, 1}};
    CascadeStage stage;
    WindowFeature feature;
    loadStage(w, stage, feature);
    EXPECT_EQ(stage.scoreCount, 1);
    EXPECT_EQ(stage.remapFlag, 0);
    EXPECT_EQ(stage.binThresholds[0], 7.0f);
    EXPECT_EQ(stage.binThresholds[6], 1.0f);
    EXPECT_EQ(stage.binScores[0][3], 1.0f);
    EXPECT_EQ(stage.binScores[0][4], -1.0f);
    EXPECT_EQ(stage.rejectThreshold[0], -3.0f);
    EXPECT_EQ(stage.feature, &feature);
    ASSERT_EQ(feature.kind, 1);
    ASSERT_EQ(feature.haar->count, 2);
    // Stored left, top, right, bottom; held left, right, top, bottom.
    const HaarRect& r = feature.haar->rects[0];
    EXPECT_EQ(r.weight, 2.5f);
    EXPECT_EQ(r.left, 1);
    EXPECT_EQ(r.top, 2);
    EXPECT_EQ(r.right, 5);
    EXPECT_EQ(r.bottom, 9);
}

TEST(StageLoading, UnknownFeatureKindReadsNoFeatureBytesAndTheStageGoesOn)
{
    CascadeModelStage w = CascadeWriter::stump(CascadeWriter::deviation(), 0.5f, 1.0f, -1.0f, -3.0f);
    w.feature.kind = 7;
    CascadeStage stage;
    WindowFeature feature;
    loadStage(w, stage, feature);
    EXPECT_EQ(feature.kind, 7);
    EXPECT_EQ(stage.binThresholds[3], 0.5f);
    EXPECT_EQ(stage.rejectThreshold[0], -3.0f);
    RandomIntegral img(30, 30, 1);
    EXPECT_EQ(feature.Eval(img.image, 0.5f, 0), 0.0f);
}

TEST(StageLoading, RejectsMalformedRecordsWithADataError)
{
    auto expectRejected = [](CascadeModelStage const& w, const char* what) {
        CascadeStage stage;
        WindowFeature feature;
        EXPECT_THROW(loadStage(w, stage, feature), qv_data_error) << what;
    };
    CascadeModelStage many = CascadeWriter::stump(CascadeWriter::deviation(), 0, 0, 0, 0);
    many.scoreCount = 16;
    expectRejected(many, "scoreCount 16");
    CascadeModelStage negative = many;
    negative.scoreCount = -1;
    expectRejected(negative, "scoreCount -1");
    CascadeModelStage remap = CascadeWriter::stump(CascadeWriter::deviation(), 0, 0, 0, 0);
    remap.scoreCount = 2;
    remap.binScores.resize(2);
    remap.rejectThresholds.resize(2);
    remap.remapFlag = 1;
    remap.remap = {0, 2};
    expectRejected(remap, "remap entry 2 of 2 scores");
    remap.remap = {-1, 0};
    expectRejected(remap, "remap entry -1");
    expectRejected(CascadeWriter::stump(CascadeWriter::haar({{1, 0, 0, 25, 24}}), 0, 0, 0, 0), "right 25");
    expectRejected(CascadeWriter::stump(CascadeWriter::haar({{1, -1, 0, 4, 4}}), 0, 0, 0, 0), "left -1");
    expectRejected(CascadeWriter::stump(CascadeWriter::haar({{1, 4, 4, 4, 8}}), 0, 0, 0, 0), "empty rect");
    CascadeModelStage rects = CascadeWriter::stump(CascadeWriter::haar({}), 0, 0, 0, 0);
    rects.feature.rects.assign(65, CascadeModelRect{1, 0, 0, 1, 1});
    expectRejected(rects, "65 rectangles");

    // Valid edge: 15 scores with an in-range remap loads.
    CascadeModelStage full = CascadeWriter::stump(CascadeWriter::deviation(), 0, 0, 0, 0);
    full.scoreCount = 15;
    full.binScores.resize(15);
    full.rejectThresholds.resize(15);
    full.remapFlag = 1;
    full.remap.assign(15, 14);
    CascadeStage stage;
    WindowFeature feature;
    EXPECT_NO_THROW(loadStage(full, stage, feature));
    EXPECT_EQ(stage.remap[0], 14);
}

TEST(StageLoading, HeaderCheckOnlyReports)
{
    std::vector<uint8_t> bytes;
    for (int v : {24, 24, 7, 24, 20, 7})
        CascadeWriter::putInt(bytes, v);
    ScopedModel model("classifierheader", bytes);
    ModelReader reader("classifierheader", ModelReader::RAW);
    EXPECT_TRUE(CascadeStage::checkHeader(reader));
    EXPECT_FALSE(CascadeStage::checkHeader(reader));
}

TEST(HaarEvaluation, PreparedOffsetsAgreeWithCoordinatesAndBruteForce)
{
    RandomIntegral img(40, 30, 2);
    for (int n : {1, 2, 3, 4}) {
        std::vector<HaarRect> rects;
        for (int i = 0; i < n; ++i)
            rects.push_back(rect(0.5f * (i + 1) * (i % 2 ? -1 : 1), i, 2 * i, 10 + i, 12 + i));
        HaarFeature f = makeFeature(rects);
        f.prepareOffsets(img.image.stride);
        const int x = 7, y = 5;
        float expected = 0.0f;
        for (auto const& r : rects) {
            unsigned sum = 0;
            for (int yy = y + r.top; yy < y + r.bottom; ++yy)
                for (int xx = x + r.left; xx < x + r.right; ++xx)
                    sum += img.px[size_t(yy) * 40 + xx];
            expected += float(sum) * r.weight;
        }
        expected *= 0.125f;
        EXPECT_FLOAT_EQ(f.Eval(img.image, 0.125f, y * img.image.stride + x), expected) << n;
        EXPECT_FLOAT_EQ(f.Eval(img.image, 0.125f, x, y), expected) << n;
    }
}

TEST(HaarEvaluation, OffsetsFollowTheStride)
{
    RandomIntegral narrow(30, 30, 3), wide(50, 30, 3);
    HaarFeature f = makeFeature({rect(1.0f, 2, 3, 8, 9), rect(-1.0f, 0, 0, 4, 4)});
    f.prepareOffsets(wide.image.stride);
    EXPECT_FLOAT_EQ(f.Eval(wide.image, 1.0f, 4 * wide.image.stride + 6), f.Eval(wide.image, 1.0f, 6, 4));
    f.prepareOffsets(narrow.image.stride);
    EXPECT_FLOAT_EQ(f.Eval(narrow.image, 1.0f, 4 * narrow.image.stride + 6), f.Eval(narrow.image, 1.0f, 6, 4));
}

TEST(HaarScaling, UnitScaleCopiesAndRoundedAreasCorrectTheWeight)
{
    HaarFeature base = makeFeature({rect(2.0f, 1, 1, 4, 4), rect(-1.0f, 0, 0, 24, 24)});
    HaarFeature same(&base, 1.0f);
    ASSERT_EQ(same.count, 2);
    EXPECT_EQ(same.rects[0].left, 1);
    EXPECT_EQ(same.rects[0].right, 4);
    EXPECT_EQ(same.rects[0].weight, 2.0f);

    HaarFeature scaled(&base, 1.25f);
    // 1 -> 1.75 -> 1 (trunc of 1.75), 4 -> 5.5 -> 5: 4 x 4 pixels for 3 x 3.
    EXPECT_EQ(scaled.rects[0].left, 1);
    EXPECT_EQ(scaled.rects[0].right, 5);
    EXPECT_EQ(scaled.rects[0].top, 1);
    EXPECT_EQ(scaled.rects[0].bottom, 5);
    EXPECT_FLOAT_EQ(scaled.rects[0].weight, 2.0f * 9.0f / 16.0f);
    EXPECT_EQ(scaled.rects[1].right, 30);
    EXPECT_FLOAT_EQ(scaled.rects[1].weight, -576.0f / 900.0f);

    HaarFeature none;
    EXPECT_FALSE(none.Init(nullptr, 2.0f));
}

TEST(HaarScaling, DeviationFeatureStaysItselfAndUnknownKindsDoNotCopy)
{
    WindowFeature dev;
    dev.kind = WindowFeature::DEVIATION;
    WindowFeature copy;
    EXPECT_TRUE(copy.Init(&dev, 3.7f));
    EXPECT_EQ(copy.kind, WindowFeature::DEVIATION);
    RandomIntegral img(30, 30, 4);
    EXPECT_EQ(copy.Eval(img.image, 0.25f, 0), 0.25f);

    WindowFeature odd;
    odd.kind = 5;
    EXPECT_FALSE(copy.Init(&odd, 1.0f));
    WindowFeature empty;
    EXPECT_EQ(empty.Eval(img.image, 0.25f, 0), 0.0f);
}
