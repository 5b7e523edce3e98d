#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "CascadeWriter.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "detector/CascadeStage.h"
#include "detector/HaarFeature.h"
#include "detector/ScaleFeatures.h"
#include "detector/StageTables.h"
#include "detector/WindowFeature.h"
#include "support/ScopedModel.h"

namespace {

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

// Loads one stage record written by CascadeWriter.
void loadStage(CascadeModelStage const& written, CascadeStage& stage, WindowFeature& feature)
{
    std::vector<uint8_t> bytes;
    CascadeWriter::putStage(bytes, written);
    ScopedModel model("classifierstage", bytes);
    ModelReader reader("classifierstage", ModelReader::RAW);
    stage.Init(reader, &feature);
}

// A feature of `kind`; for HAAR, `count` random rectangles inside a
// size x size window with random weights (fractions included, so that the
// accumulation order shows in the last bit).
WindowFeature randomFeature(int kind, int count, int size, int stride, std::mt19937& rng)
{
    WindowFeature f;
    f.kind = kind;
    if (kind != WindowFeature::HAAR)
        return f;
    f.haar = new HaarFeature();
    f.haar->Init(count);
    std::uniform_real_distribution<float> weight(-9.0f, 9.0f);
    for (int i = 0; i < count; ++i) {
        HaarRect& r = f.haar->rects[i];
        r = HaarRect();
        r.left = static_cast<int>(rng() % (size - 1));
        r.top = static_cast<int>(rng() % (size - 1));
        r.right = r.left + 1 + static_cast<int>(rng() % (size - r.left - 1));
        r.bottom = r.top + 1 + static_cast<int>(rng() % (size - r.top - 1));
        r.weight = weight(rng) / 7.0f;
    }
    f.prepareOffsets(stride);
    return f;
}

bool sameBits(float a, float b)
{
    return std::memcmp(&a, &b, sizeof a) == 0;
}

// A HAAR feature's weighted pixel sums at (x, y), counted pixel by pixel.
double bruteForce(RandomIntegral const& img, HaarFeature const& f, int x, int y)
{
    double total = 0.0;
    for (int i = 0; i < f.count; ++i) {
        HaarRect const& r = f.rects[i];
        for (int yy = y + r.top; yy < y + r.bottom; ++yy)
            for (int xx = x + r.left; xx < x + r.right; ++xx)
                total += r.weight * double(img.px[size_t(yy) * (img.image.stride - 1) + xx]);
    }
    return total;
}

struct Pool {
    WindowFeature* features = nullptr;
    int count = -1;
    Pool(int w, int h, int minW, int minH, float shift, float grow)
    {
        features = WindowFeature::generateFeaturePool(w, h, minW, minH, shift, grow, &count);
    }
    ~Pool() { WindowFeature::destroyFeaturePool(features); }
};


} // namespace

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

TEST(HaarScaling, RoundedAreasCorrectTheWeightAndOnlyKnownKindsCopy)
{
    CascadeStage stage;
    WindowFeature base;
    loadStage(CascadeWriter::stump(CascadeWriter::haar({{2, 1, 1, 4, 4}, {-1, 0, 0, 24, 24}}), 0, 0, 0, 0), stage,
              base);
    HaarFeature scaled(base.haar, 1.25f);
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

TEST(ScaleFeatures, WalkGivesTheFeaturesOwnValuesBitForBit)
{
    // Rectangle counts around the straight-line cases 2 and 4, the
    // deviation feature, an empty one and a kind no model should carry.
    struct Case {
        int kind;
        int count;
    };
    const Case chain[] = {{1, 2}, {1, 4}, {1, 1}, {2, 0}, {1, 3}, {0, 0}, {1, 5}, {7, 0}, {1, 0}, {1, 2}};
    for (const int width : {40, 97, 320}) {
        SCOPED_TRACE(width);
        std::mt19937 rng(static_cast<unsigned>(width));
        RandomIntegral img(width, 60, rng());
        IN_IMAGE const& image = img.image;

        // The chain as common stages, and again split into two branches.
        std::vector<WindowFeature> common;
        std::vector<std::vector<WindowFeature>> branches(2);
        for (const Case& c : chain)
            common.push_back(randomFeature(c.kind, c.count, 36, image.stride, rng));
        for (const Case& c : chain)
            branches[branches[0].size() < 4 ? 0 : 1].push_back(randomFeature(c.kind, c.count, 36, image.stride, rng));

        ScaleFeatures laidOut;
        ASSERT_TRUE(laidOut.build(common, branches, image.stride));
        EXPECT_EQ(laidOut.stride(), image.stride);
        for (const int x : {0, 1, width - 37})
            for (const int y : {0, 3, 60 - 37}) {
                const int offset = x + image.stride * y;
                const float deviation = 1.0f / 3.0f;
                ScaleFeatures::Cursor cursor = laidOut.common();
                for (size_t i = 0; i < common.size(); ++i, cursor.next()) {
                    const float value = common[i].Eval(image, deviation, offset);
                    EXPECT_TRUE(sameBits(cursor.value(image.data + offset, deviation), value))
                        << "common feature " << i << " at " << x << "," << y;
                    if (common[i].kind == WindowFeature::HAAR) {
                        const double expected = bruteForce(img, *common[i].haar, x, y) * deviation;
                        EXPECT_NEAR(value, expected, 1e-5 * std::fabs(expected) + 1e-3) << i;
                    }
                }
                for (size_t b = 0; b < branches.size(); ++b) {
                    ScaleFeatures::Cursor walk = laidOut.branch(static_cast<int>(b));
                    for (size_t j = 0; j < branches[b].size(); ++j, walk.next())
                        EXPECT_TRUE(sameBits(walk.value(image.data + offset, deviation),
                                             branches[b][j].Eval(image, deviation, offset)))
                            << "branch " << b << " feature " << j;
                }
            }
    }
}

TEST(StageTables, RunGivesTheStagesOwnScoresAndVerdictBitForBit)
{
    // Chains mixing one-score stages, stages of the loop's width, wider and
    // narrower ones, remaps and scoreless stages (which always reject), with
    // thresholds that kill scores along the way, some below the dead score;
    // every third chain one-score stages and remaps only, as a branch.
    std::mt19937 rng(11);
    std::uniform_real_distribution<float> unit(-1.0f, 1.0f);
    RandomIntegral img(80, 60, 3);
    IN_IMAGE const& image = img.image;
    const int kinds[] = {1, 1, 3, 5, 5, 2, 7, 15, 4};
    int rejectedSomewhere = 0, passed = 0;
    for (int trial = 0; trial < 300; ++trial) {
        std::vector<WindowFeature> features;
        std::vector<CascadeStage> stages(static_cast<size_t>(4 + rng() % 20));
        const bool branch = trial % 3 == 0;
        for (CascadeStage& s : stages) {
            features.push_back(randomFeature(WindowFeature::HAAR, 1 + int(rng() % 3), 36, image.stride, rng));
            s.scoreCount = rng() % 40 == 0 ? 0 : branch ? 1 : kinds[rng() % 9];
            s.remapFlag = rng() % 8 == 0 ? 1 : 0;
            for (int c = 0; c < s.scoreCount; ++c) {
                s.remap[c] = static_cast<int32_t>(rng() % static_cast<unsigned>(s.scoreCount));
                s.rejectThreshold[c] = rng() % 10 == 0 ? -25.0f : -2.0f + unit(rng);
                for (float& b : s.binScores[c])
                    b = unit(rng);
            }
            float* t = s.binThresholds;
            for (int i = 0; i < CascadeStage::kBinThresholds; ++i)
                t[i] = 3.0f * unit(rng);
            std::sort(t, t + CascadeStage::kBinThresholds);
        }
        ScaleFeatures laidOut;
        ASSERT_TRUE(laidOut.build(features, {}, image.stride));
        StageTables tables;
        tables.build(stages);
        for (const int width : {3, 5}) {
            const int offset = int(rng() % 40) + image.stride * int(rng() % 20);
            const float deviation = 2e-5f;
            float expected[kMaxCategories] = {}, got[kMaxCategories] = {};
            int expectedAt = -1;
            for (size_t i = 0; i < stages.size() && expectedAt < 0; ++i)
                if (stages[i].UpdateScoreAndThreshold(features[i].Eval(image, deviation, offset), expected))
                    expectedAt = static_cast<int>(i);
            const int at = width == 3 ? tables.run<3>(laidOut.common(), image.data + offset, deviation, got)
                                      : tables.run<5>(laidOut.common(), image.data + offset, deviation, got);
            ASSERT_EQ(at, expectedAt) << "trial " << trial << ", width " << width;
            for (int c = 0; c < kMaxCategories; ++c)
                ASSERT_TRUE(sameBits(got[c], expected[c])) << "trial " << trial << ", score " << c;
            (at < 0 ? passed : rejectedSomewhere) += 1;
        }
    }
    EXPECT_GT(passed, 30);
    EXPECT_GT(rejectedSomewhere, 30);
}
