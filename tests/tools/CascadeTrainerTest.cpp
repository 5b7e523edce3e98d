// The cascade trainer's core on synthetic windows: the written model decides
// in the engine as the trainer decided.

#include <cstdint>
#include <cstdio>
#include <random>
#include <vector>

#include <gtest/gtest.h>

#include "BranchTrainer.h"
#include "CascadeTrainer.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"
#include "support/ScopedModel.h"

using namespace cascadetrain;

namespace {

constexpr int kFrame = kPatch + 2; // the window sits at (1, 1), strictly inside

// The window at (1, 1), as left, right, top, bottom.
const DetectionWindow kWindow{1, 1 + kPatch, 1, 1 + kPatch};

// Windows of a textured frame: "faces" are darker in the upper band and
// brighter in the middle; the rest is noise of the same contrast. Each is
// also cut as the trainer cuts it: the patch and the engine's inverse deviation.
struct Synthetic {
    std::vector<std::vector<uint8_t>> frames;
    std::vector<bool> face;
    SampleSet pos, neg;
};

void makeWindows(int count, uint32_t seed, Synthetic& s)
{
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int> noise(-40, 40);
    for (int i = 0; i < count; ++i) {
        const bool face = i % 2 == 0;
        std::vector<uint8_t> f(kFrame * kFrame);
        for (int y = 0; y < kFrame; ++y)
            for (int x = 0; x < kFrame; ++x) {
                int v = 128 + noise(rng);
                if (face)
                    v += (y >= 6 && y < 11) ? -50 : (y >= 12 && y < 18 ? 40 : 0);
                f[y * kFrame + x] = static_cast<uint8_t>(std::clamp(v, 0, 255));
            }
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, f.data()));
        uint8_t patch[kPatch * kPatch];
        ASSERT_TRUE(cutPatch(image.data, kFrame, kFrame, 1, 1, kPatch, false, patch));
        (face ? s.pos : s.neg).add(patch, image.ComputeNorm(kWindow));
        s.frames.push_back(std::move(f));
        s.face.push_back(face);
    }
}

// Two stages, each on all samples, with a fixed seed per stage.
Cascade trainCascade(SampleSet const& pos, SampleSet const& neg)
{
    static const FeaturePool pool(4, 4, 0.5f, 1.5f);
    Cascade cascade;
    for (int stage = 0; stage < 2; ++stage) {
        StageOptions o;
        o.seed = 100 + stage;
        o.threads = 2;
        o.featureFraction = 0.2;
        o.maxFalseRate = 0.0;
        o.maxStumps = 3;
        cascade.stages.push_back(trainStage(pool, pos, neg, o, nullptr));
    }
    return cascade;
}

TEST(CascadeTrainer, WrittenModelDecidesInTheEngineAsTrained)
{
    Synthetic s;
    makeWindows(300, 2, s);
    const Cascade c = trainCascade(s.pos, s.neg);
    const ScopedModel model("trainedcascade", CascadeWriter::toBytes(c.toModel()));
    CascadeDetector engine(R"({"model":"trainedcascade","imageMaxSize":64,"faceMinSize":24,"faceMaxSize":24})");
    engine.prepareForFastComputing(kFrame + 1);
    int accepted = 0;
    for (size_t i = 0; i < s.frames.size(); ++i) {
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, s.frames[i].data()));
        SampleSet const& set = s.face[i] ? s.pos : s.neg;
        const size_t k = i / 2; // faces and non-faces alternate
        float score = 0, categories[16];
        int stage = 0;
        const bool ok = engine.classify(image, kWindow, 0, 0.0f, CascadeDetector::CLASSIFY_PLAIN, &score,
                                        categories, &stage);
        ASSERT_EQ(ok, c.passes(set.integral(k), set.inverseDeviation(k))) << "window " << i;
        accepted += ok;
    }
    EXPECT_GT(accepted, 100);
}

// Windows of five kinds for the branched cascade: background, and a dark bar
// that lies across the top (upright), down the left or the right side (the
// two roll categories), or in the lower left or right corner (the side band).
void makeKinds(int count, uint32_t seed, std::vector<std::vector<uint8_t>>& frames, std::vector<SampleSet>& sets)
{
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int> noise(-40, 40);
    sets.assign(6, SampleSet());
    for (int i = 0; i < count; ++i) {
        const int kind = i % 6; // 5: background
        std::vector<uint8_t> f(kFrame * kFrame);
        for (int y = 0; y < kFrame; ++y)
            for (int x = 0; x < kFrame; ++x) {
                const bool bar = (kind == 0 && y >= 5 && y < 11) || (kind == 1 && x >= 3 && x < 9) ||
                                 (kind == 2 && x >= 17 && x < 23) || (kind == 3 && x < 12 && y >= 14) ||
                                 (kind == 4 && x >= 14 && y >= 14);
                f[y * kFrame + x] = static_cast<uint8_t>(std::clamp(128 + noise(rng) - (bar ? 60 : 0), 0, 255));
            }
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, f.data()));
        uint8_t patch[kPatch * kPatch];
        ASSERT_TRUE(cutPatch(image.data, kFrame, kFrame, 1, 1, kPatch, false, patch));
        sets[static_cast<size_t>(kind)].add(patch, image.ComputeNorm(kWindow));
        frames.push_back(std::move(f));
    }
}

// A roll band trained with its common stage, then the side band's tables
// added on the same stumps: the engine (five scores in registers) passes and
// routes every window as the trainer does, and the saved state reads back
// to the same payload.
TEST(BranchTrainer, SideBandOnTrainedStumpsDecidesInTheEngineAsTrained)
{
    std::vector<std::vector<uint8_t>> frames;
    std::vector<SampleSet> sets;
    makeKinds(600, 5, frames, sets);
    static const FeaturePool pool(4, 4, 0.5f, 1.5f);
    StageOptions o;
    o.seed = 7;
    o.threads = 2;
    o.featureFraction = 0.2;
    o.maxStumps = 4;
    o.minHitRate = 0.99;
    JointCascade jc;
    jc.common.push_back(trainSoftStage(pool, {&sets[0], &sets[1], &sets[2]}, sets[5], nullptr, {}, o, nullptr));
    JointReport side;
    extendSoftStage(jc.common[0], {&sets[3], &sets[4]}, sets[5], nullptr, {}, 0.99, &side);
    jc.bands = 2;
    jc.sideBias = 0.25f;
    EXPECT_GE(side.hitRate[0], 0.99);

    const std::vector<uint8_t> payload = CascadeWriter::toBytes(jc.toModel());
    const std::string state = ::testing::TempDir() + "side-joint.txt";
    ASSERT_TRUE(jc.save(state));
    JointCascade back;
    ASSERT_TRUE(back.load(state));
    std::remove(state.c_str());
    EXPECT_EQ(CascadeWriter::toBytes(back.toModel()), payload);

    const ScopedModel model("sidecascade", payload);
    CascadeDetector engine(R"({"model":"sidecascade","imageMaxSize":64,"faceMinSize":24,"faceMaxSize":24})");
    engine.prepareForFastComputing(kFrame + 1);
    int routedSide = 0;
    for (size_t i = 0; i < frames.size(); ++i) {
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, frames[i].data()));
        SampleSet const& set = sets[i % 6];
        const size_t k = i / 6;
        bool passes = false;
        const int route = jc.route(set.integral(k), set.inverseDeviation(k), &passes);
        float score = 0, categories[16];
        int stage = 0;
        const bool ok = engine.classify(image, kWindow, 0, 0.0f, CascadeDetector::CLASSIFY_PLAIN, &score,
                                        categories, &stage);
        ASSERT_EQ(ok, passes) << "window " << i;
        if (ok) {
            ASSERT_EQ(stage, route) << "window " << i;
            routedSide += route >= 3 && i % 6 >= 3;
        }
    }
    EXPECT_GT(routedSide, 120);
}

} // namespace
