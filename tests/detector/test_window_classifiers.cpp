#include <gtest/gtest.h>

#include <algorithm>
#include <array>
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

// A stage whose bin scores (of the first score) are the bin numbers.
CascadeStage binnedStage(std::array<float, 7> thresholds, int scoreCount = 1)
{
    CascadeStage s;
    std::copy(thresholds.begin(), thresholds.end(), s.binThresholds);
    s.scoreCount = scoreCount;
    for (int b = 0; b < 8; ++b)
        s.binScores[0][b] = static_cast<float>(b);
    s.rejectThreshold[0] = -1e30f;
    return s;
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
    const CascadeStage s = binnedStage({60, 50, 40, 30, 20, 10, 0});
    const std::pair<float, int> cases[] = {{100, 0}, {60, 0},   {59.9f, 1}, {50, 1}, {45, 2}, {30, 3},
                                           {29.9f, 4}, {10, 5}, {0, 6},     {-1, 7}};
    for (auto const& [value, bin] : cases) {
        float score[15] = {};
        s.UpdateScoreAndThreshold(value, score);
        EXPECT_EQ(score[0], bin) << value;
    }
}

TEST(StageScores, ScoresAtTheirThresholdSurviveAndRejectionNeedsAllDead)
{
    CascadeStage one = binnedStage({2, 1, 0, 0, 0, 0, 0});
    one.rejectThreshold[0] = -18.0f;
    float single[15] = {-20.0f};
    EXPECT_FALSE(one.UpdateScoreAndThreshold(0.0f, single)); // bin 2: the dead mark is a plain score, -18 survives
    one.rejectThreshold[0] = -15.0f;
    EXPECT_TRUE(one.UpdateScoreAndThreshold(0.0f, single));

    CascadeStage s = binnedStage({0, 0, 0, 0, 0, 0, 0}, 3);
    for (int i = 0; i < 3; ++i)
        s.binScores[i][0] = 1.0f;
    s.rejectThreshold[0] = 0.5f;
    s.rejectThreshold[1] = 5.0f; // will die
    s.rejectThreshold[2] = 1.0f; // equal survives
    float scores[15] = {0.0f, 0.0f, 0.0f};
    EXPECT_FALSE(s.UpdateScoreAndThreshold(0.0f, scores));
    EXPECT_EQ(scores[0], 1.0f);
    EXPECT_EQ(scores[1], -20.0f);
    EXPECT_FALSE(s.UpdateScoreAndThreshold(0.0f, scores));
    EXPECT_EQ(scores[1], -20.0f) << "a dead score gets no bin score";
    s.rejectThreshold[0] = s.rejectThreshold[2] = 100.0f;
    EXPECT_TRUE(s.UpdateScoreAndThreshold(0.0f, scores));
    s.scoreCount = 0;
    EXPECT_TRUE(s.UpdateScoreAndThreshold(0.0f, scores)) << "no scores rejects at once";
}

TEST(StageLoading, RecordRoundTripsThroughTheWriterAndUnknownKindsReadNoFeature)
{
    CascadeModelStage w = CascadeWriter::stump(
        CascadeWriter::haar({{2.5f, 1, 2, 5, 9}, {-1.0f, 0, 0, 24, 24}}), 0.75f, 1.0f, -1.0f, -3.0f);
    w.binThresholds = {{7, 6, 5, 4, 3, 2, 1}};
    CascadeStage stage;
    WindowFeature feature;
    loadStage(w, stage, feature);
    EXPECT_EQ(std::vector<float>({stage.binThresholds[6], stage.binScores[0][3], stage.binScores[0][4]}),
              std::vector<float>({1, 1, -1}));
    ASSERT_EQ(feature.haar->count, 2);
    // Stored left, top, right, bottom; held left, right, top, bottom.
    const HaarRect& r = feature.haar->rects[0];
    EXPECT_EQ(std::vector<float>({r.weight, float(r.left), float(r.top), float(r.right), float(r.bottom)}),
              std::vector<float>({2.5f, 1, 2, 5, 9}));

    // A kind no model should carry reads no feature bytes: the stage goes on.
    w.feature = CascadeWriter::deviation();
    w.feature.kind = 7;
    CascadeStage next;
    WindowFeature odd;
    loadStage(w, next, odd);
    EXPECT_EQ(odd.kind, 7);
    EXPECT_EQ(next.rejectThreshold[0], -3.0f);
    RandomIntegral img(30, 30, 1);
    EXPECT_EQ(odd.Eval(img.image, 0.5f, 0), 0.0f);
}

TEST(StageLoading, RejectsMalformedRecordsWithADataError)
{
    auto scores = [](int count, std::vector<int32_t> remap) {
        CascadeModelStage s = CascadeWriter::stump(CascadeWriter::deviation(), 0, 0, 0, 0);
        s.scoreCount = count;
        s.binScores.resize(size_t(std::max(count, 0)));
        s.rejectThresholds.resize(size_t(std::max(count, 0)));
        s.remapFlag = remap.empty() ? 0 : 1;
        s.remap = remap;
        return s;
    };
    auto rects = [](std::vector<CascadeModelRect> r) {
        return CascadeWriter::stump(CascadeWriter::haar(std::move(r)), 0, 0, 0, 0);
    };
    const struct {
        const char* what;
        CascadeModelStage stage;
        bool loads;
    } cases[] = {
        {"scoreCount 16", scores(16, {}), false},
        {"scoreCount -1", scores(-1, {}), false},
        {"remap entry 2 of 2 scores", scores(2, {0, 2}), false},
        {"remap entry -1", scores(2, {-1, 0}), false},
        {"15 scores, remap in range", scores(15, std::vector<int32_t>(15, 14)), true},
        {"right 25", rects({{1, 0, 0, 25, 24}}), false},
        {"left -1", rects({{1, -1, 0, 4, 4}}), false},
        {"empty rect", rects({{1, 4, 4, 4, 8}}), false},
        {"65 rectangles", rects(std::vector<CascadeModelRect>(65, CascadeModelRect{1, 0, 0, 1, 1})), false},
        {"the whole window", rects({{1, 0, 0, 24, 24}}), true},
    };
    for (auto const& c : cases) {
        CascadeStage stage;
        WindowFeature feature;
        if (c.loads)
            EXPECT_NO_THROW(loadStage(c.stage, stage, feature)) << c.what;
        else
            EXPECT_THROW(loadStage(c.stage, stage, feature), qv_data_error) << c.what;
    }
}

TEST(HaarEvaluation, PreparedOffsetsAgreeWithCoordinatesAndBruteForceAtAnyStride)
{
    for (int width : {40, 53}) {
        RandomIntegral img(width, 30, 2);
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
                        sum += img.px[size_t(yy) * width + xx];
                expected += float(sum) * r.weight;
            }
            expected *= 0.125f;
            EXPECT_FLOAT_EQ(f.Eval(img.image, 0.125f, y * img.image.stride + x), expected) << width << " " << n;
            EXPECT_FLOAT_EQ(f.Eval(img.image, 0.125f, x, y), expected) << width << " " << n;
        }
    }
}

TEST(HaarScaling, RoundedAreasCorrectTheWeightAndOnlyKnownKindsCopy)
{
    HaarFeature base = makeFeature({rect(2.0f, 1, 1, 4, 4), rect(-1.0f, 0, 0, 24, 24)});
    HaarFeature same(&base, 1.0f);
    EXPECT_EQ(same.rects[0].right, 4);
    EXPECT_EQ(same.rects[0].weight, 2.0f);
    HaarFeature scaled(&base, 1.25f);
    // 1 -> 1.75 -> 1 (trunc of 1.75), 4 -> 5.5 -> 5: 4 x 4 pixels for 3 x 3.
    EXPECT_EQ(std::vector<int>({scaled.rects[0].left, scaled.rects[0].top, scaled.rects[0].right,
                                scaled.rects[0].bottom}),
              std::vector<int>({1, 1, 5, 5}));
    EXPECT_FLOAT_EQ(scaled.rects[0].weight, 2.0f * 9.0f / 16.0f);
    EXPECT_EQ(scaled.rects[1].right, 30);
    EXPECT_FLOAT_EQ(scaled.rects[1].weight, -576.0f / 900.0f);
    HaarFeature none;
    EXPECT_FALSE(none.Init(nullptr, 2.0f));

    WindowFeature dev, copy, odd, empty;
    dev.kind = WindowFeature::DEVIATION;
    EXPECT_TRUE(copy.Init(&dev, 3.7f));
    RandomIntegral img(30, 30, 4);
    EXPECT_EQ(copy.Eval(img.image, 0.25f, 0), 0.25f) << "the deviation feature stays itself";
    odd.kind = 5;
    EXPECT_FALSE(copy.Init(&odd, 1.0f));
    EXPECT_EQ(empty.Eval(img.image, 0.25f, 0), 0.0f);
}
