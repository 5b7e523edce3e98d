// The cascade trainer's core on synthetic windows: boosting separates a
// separable set, the written model decides in the engine as the trainer
// decided, and a restart from the saved state continues exactly as an
// uninterrupted run.

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "CascadeTrainer.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"
#include "support/ScopedModel.h"

using namespace cascadetrain;

namespace {

constexpr int kFrame = kPatch + 2; // the window sits at (1, 1), strictly inside

// Windows of a textured frame: "faces" are darker in the upper band and
// brighter in the middle; the rest is noise of the same contrast.
struct Synthetic {
    std::vector<std::vector<uint8_t>> frames;
    std::vector<bool> face;
};

Synthetic makeWindows(int count, uint32_t seed)
{
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int> noise(-40, 40);
    Synthetic s;
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
        s.frames.push_back(std::move(f));
        s.face.push_back(face);
    }
    return s;
}

DetectionWindow windowAt1()
{
    DetectionWindow w;
    w.left = 1;
    w.top = 1;
    w.right = 1 + kPatch;
    w.bottom = 1 + kPatch;
    return w;
}

// Samples as the trainer cuts them: the patch and the engine's inverse deviation.
void toSamples(Synthetic const& s, SampleSet& positives, SampleSet& negatives)
{
    for (size_t i = 0; i < s.frames.size(); ++i) {
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, s.frames[i].data()));
        uint8_t patch[kPatch * kPatch];
        ASSERT_TRUE(cutPatch(image.data, kFrame, kFrame, 1, 1, kPatch, false, patch));
        (s.face[i] ? positives : negatives).add(patch, image.ComputeNorm(windowAt1()));
    }
}

StageOptions smallOptions(uint64_t seed, int threads)
{
    StageOptions o;
    o.seed = seed;
    o.threads = threads;
    o.featureFraction = 0.2;
    o.maxStumps = 8;
    return o;
}

FeaturePool const& smallPool()
{
    static const FeaturePool pool(4, 4, 0.5f, 1.5f);
    return pool;
}

TEST(CascadeTrainer, CutPatchCopiesABaseWindowAndMirrors)
{
    std::vector<uint8_t> frame(kFrame * kFrame);
    for (size_t i = 0; i < frame.size(); ++i)
        frame[i] = static_cast<uint8_t>(i * 7);
    IN_IMAGE image;
    ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, frame.data()));
    uint8_t plain[kPatch * kPatch], mirrored[kPatch * kPatch];
    ASSERT_TRUE(cutPatch(image.data, kFrame, kFrame, 1, 1, kPatch, false, plain));
    ASSERT_TRUE(cutPatch(image.data, kFrame, kFrame, 1, 1, kPatch, true, mirrored));
    for (int y = 0; y < kPatch; ++y)
        for (int x = 0; x < kPatch; ++x) {
            EXPECT_EQ(plain[y * kPatch + x], frame[(y + 1) * kFrame + x + 1]);
            EXPECT_EQ(mirrored[y * kPatch + x], plain[y * kPatch + kPatch - 1 - x]);
        }
    EXPECT_FALSE(cutPatch(image.data, kFrame, kFrame, 3, 1, kPatch, false, plain)) << "window leaves the frame";
}

TEST(CascadeTrainer, BoostingSeparatesASeparableSetWhateverTheThreads)
{
    SampleSet pos, neg;
    toSamples(makeWindows(400, 1), pos, neg);
    StageReport one, two;
    const Stage a = trainStage(smallPool(), pos, neg, smallOptions(5, 1), &one);
    const Stage b = trainStage(smallPool(), pos, neg, smallOptions(5, 2), &two);
    EXPECT_GE(one.hitRate, 0.997);
    EXPECT_LE(one.falseRate, 0.01);
    ASSERT_EQ(a.stumps.size(), b.stumps.size());
    for (size_t i = 0; i < a.stumps.size(); ++i) {
        EXPECT_EQ(a.stumps[i].threshold, b.stumps[i].threshold);
        EXPECT_EQ(a.stumps[i].above, b.stumps[i].above);
    }
    EXPECT_EQ(a.threshold, b.threshold);
}

Cascade trainCascade(SampleSet const& pos, SampleSet const& neg, int stages, Cascade start = {})
{
    while (static_cast<int>(start.stages.size()) < stages) {
        SampleSet p, n;
        for (size_t i = 0; i < pos.size(); ++i)
            if (start.passes(pos.integral(i), pos.inverseDeviation(i)))
                p.addFrom(pos, i);
        for (size_t i = 0; i < neg.size(); ++i)
            if (start.passes(neg.integral(i), neg.inverseDeviation(i)))
                n.addFrom(neg, i);
        if (n.size() == 0)
            n = neg; // separable: later stages are trained on all negatives
        StageOptions o = smallOptions(100 + start.stages.size(), 2);
        o.maxFalseRate = 0.0;
        o.maxStumps = 3;
        start.stages.push_back(trainStage(smallPool(), p, n, o, nullptr));
    }
    return start;
}

TEST(CascadeTrainer, WrittenModelDecidesInTheEngineAsTrained)
{
    const Synthetic s = makeWindows(300, 2);
    SampleSet pos, neg;
    toSamples(s, pos, neg);
    const Cascade c = trainCascade(pos, neg, 2);
    const ScopedModel model("trainedcascade", CascadeWriter::toBytes(c.toModel()));
    CascadeDetector engine(R"({"model":"trainedcascade","imageMaxSize":64,"faceMinSize":24,"faceMaxSize":24})");
    engine.prepareForFastComputing(kFrame + 1);
    const float gain = c.scoreGain();
    int accepted = 0;
    size_t p = 0, n = 0;
    for (size_t i = 0; i < s.frames.size(); ++i) {
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(kFrame, kFrame, kFrame, s.frames[i].data()));
        SampleSet const& set = s.face[i] ? pos : neg;
        const size_t k = s.face[i] ? p++ : n++;
        const bool trained = c.passes(set.integral(k), set.inverseDeviation(k));
        float score = 0, categories[15];
        int stage = 0;
        const bool ok = engine.classify(image, windowAt1(), 0, 0.0f, CascadeDetector::CLASSIFY_PLAIN, &score,
                                        categories, &stage);
        ASSERT_EQ(ok, trained) << "window " << i;
        if (ok) {
            ++accepted;
            const float margin = c.stages.back().sum(set.integral(k), set.inverseDeviation(k)) * gain -
                                 c.stages.back().threshold * gain;
            EXPECT_FLOAT_EQ(score, margin) << "window " << i;
            EXPECT_GE(score, 0.0f);
        }
    }
    EXPECT_GT(accepted, 100);
}

TEST(CascadeTrainer, RestartFromSavedStateContinuesIdentically)
{
    SampleSet pos, neg;
    toSamples(makeWindows(300, 3), pos, neg);
    const Cascade straight = trainCascade(pos, neg, 2);
    const std::string path = ::testing::TempDir() + "cascade_trainer_state.txt";
    ASSERT_TRUE(trainCascade(pos, neg, 1).save(path));
    Cascade restored;
    ASSERT_TRUE(restored.load(path));
    const Cascade resumed = trainCascade(pos, neg, 2, restored);
    EXPECT_EQ(CascadeWriter::toBytes(resumed.toModel()), CascadeWriter::toBytes(straight.toModel()));
    Cascade broken;
    EXPECT_FALSE(broken.load(path + ".missing"));
    std::remove(path.c_str());
}

} // namespace
