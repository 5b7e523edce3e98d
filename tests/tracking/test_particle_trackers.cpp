// The particle machine of PF_TRACKER and CPF_TRACKER, the on-line observers,
// and the cascade filter that carries them.

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <memory>
#include <vector>

#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "support/ExpectThrow.h"
#include "support/FaceSequence.h"
#include "support/TrackSupport.h"
#include "tracking/CPFTracker.h"
#include "tracking/CascadePF.h"
#include "tracking/LDAClassifier.h"
#include "tracking/Observer.h"
#include "tracking/PFTracker.h"
#include "tracking/ParticleCloud.h"
#include "tracking/ParticleFilter.h"
#include "tracking/ParticleRandom.h"
#include "tracking/QVArrayList.h"

namespace {

const float kNaN = std::numeric_limits<float>::quiet_NaN();

// An observer with one fixed answer for every window.
class ConstantObserver : public Observer {
public:
    explicit ConstantObserver(float v) : value(v) {}
    float getLikelihood(const IN_IMAGE&, const DetectionWindow&) const override { return value; }
    void trainClassifier(const IN_IMAGE&, const std::vector<DetectionWindow>&, const std::vector<bool>&) override {}
    float value;
};

class Particles : public testing::Test {
protected:
    void SetUp() override
    {
        particle_random::fixSeed(11);
        particle_random::reseed();
    }
    void TearDown() override { particle_random::clearFixedSeed(); }
};

// The built-in cascade, a frame with the face at (120, 80), 64 pixels, and
// the lattice of shifts around it labelled by an overlap of 0.9; skips
// without the data cache.
class FaceScene : public testing::Test {
protected:
    void SetUp() override
    {
        const facesequence::Gray face = facesequence::faceCrop(64);
        if (face.pixels.empty()) GTEST_SKIP() << devdata::missingNote();
        pixels = facesequence::frameWithFace(face, 320, 240, 120, 80);
        ASSERT_TRUE(image.Init(320, 240, 320, pixels.data()));
        for (int dx = -5; dx <= 5; ++dx)
            for (int dy = -5; dy <= 5; ++dy) {
                windows.push_back(makeWindow(truth.left + dx, truth.top + dy, truth.right + dx, truth.bottom + dy));
                labels.push_back(truth.Overlap(windows.back()) >= 0.9f);
            }
        particle_random::fixSeed(5);
        particle_random::reseed();
    }
    void TearDown() override { particle_random::clearFixedSeed(); }

    std::unique_ptr<CascadeDetector> cascade = facesequence::builtInCascade();
    std::vector<uint8_t> pixels;
    IN_IMAGE image;
    const DetectionWindow truth = makeWindow(120, 80, 184, 144);
    std::vector<DetectionWindow> windows;
    std::vector<bool> labels;
};

} // namespace

TEST_F(Particles, ResampleDrawsTheRequestedNumberFollowingTheWeight)
{
    // {particles present, particles wanted}: an empty cloud stays empty.
    for (const auto& [present, number] : {std::pair<int, int>{121, 600}, {600, 121}, {1, 5}, {3, 0}, {0, 10}}) {
        ParticleFilter f;
        f.setParticleNumber(number);
        std::vector<DetectionWindow> cloud;
        for (int i = 0; i < present; ++i) cloud.push_back(makeWindow(i, 0, i + 30, 30));
        f.setParticles(cloud);
        f.setWeights(std::vector<float>(size_t(present), present ? 1.0f / float(present) : 0.0f));
        f.resample();
        const size_t expected = present == 0 ? 0 : size_t(number);
        ASSERT_EQ(f.getWeights(), std::vector<float>(expected, 1.0f / float(number))) << present << " -> " << number;
        ASSERT_EQ(f.getParticles().size(), expected);
        for (const DetectionWindow& p : f.getParticles()) EXPECT_LT(p.left, present) << "drawn from the cloud";
    }
    // The cumulative table leaves the last weight out, so mass on one particle
    // is drawn one place up, and NaN weights land at the top: still in the cloud.
    for (const std::vector<float>& weights : {std::vector<float>{0, 0, 1, 0}, std::vector<float>(4, kNaN)}) {
        std::vector<DetectionWindow> p;
        for (int i = 0; i < 4; ++i) p.push_back(makeWindow(i, 0, i + 30, 30));
        std::vector<float> w = weights;
        particle_cloud::resample(p, w, 200);
        for (const DetectionWindow& d : p) EXPECT_EQ(d.left, 3);
    }
}

TEST_F(Particles, LatticeSeedsWithoutEvidenceKeepUniformWeightsAndItsMean)
{
    PFTracker::TrackFace seeds(makeWindow(10, 10, 30, 30));
    ASSERT_EQ(seeds.particles.size(), 121u);
    EXPECT_TRUE(sameWindow(seeds.particles[1], makeWindow(5, 6, 25, 26))) << "shifts of -5..5, dy the inner loop";
    EXPECT_TRUE(sameWindow(particle_cloud::mean({}, {}), makeWindow(0, 0, 0, 0)));
    EXPECT_TRUE(sameWindow(particle_cloud::mean({makeWindow(10, 10, 30, 30)}, {kNaN}), makeWindow(0, 0, 0, 0)));
    IN_IMAGE image(40, 40);
    for (float likelihood : {0.0f, kNaN, 0.25f}) {
        ConstantObserver observer(likelihood);
        ParticleFilter f;
        f.setObserver(observer);
        f.setParticles(seeds.particles);
        f.estimate(image);
        EXPECT_EQ(f.getWeights(), std::vector<float>(121, 1.0f / 121.0f)) << likelihood;
        EXPECT_TRUE(sameWindow(f.getMean(), makeWindow(10, 10, 30, 30)));
    }
    ParticleFilter none;
    none.setParticles({makeWindow(1, 1, 5, 5)});
    EXPECT_THROW(none.estimate(image), qv_operation_error);
}

TEST(PFTracker, MatchesOnTheMeanDropsUnconfirmedFacesAndNeedsADetector)
{
    PFTracker t;
    IN_IMAGE image(320, 240);
    t.update(image, {makeWindow(10, 10, 60, 60), makeWindow(200, 100, 250, 150)});
    // Overlap 0.28 with face 0 opens a new face; a small shift of face 1 keeps
    // it, with the velocity of its mean's centre: (3 + 6) / 2, toward zero.
    t.update(image, {makeWindow(38, 10, 88, 60), makeWindow(203, 100, 256, 150)});
    ASSERT_EQ(t.pfFaces.size(), 3u);
    EXPECT_EQ(t.pfFaces.alive, std::vector<bool>({false, true, true}));
    EXPECT_EQ(t.pfFaces.items[1].velocityX, 4);
    // The faces live in the tracker's own list: the front end gets no previous
    // faces to follow and finds this tracker's faces by its search cells alone.
    std::vector<DetectionWindow> out;
    t.getPreviousFaces(&out);
    EXPECT_TRUE(out.empty());
    expectThrowWith<qv_operation_error>([&] { t.predict(image, &out); }, "Face estimator doesn't have a detector yet");
    // Dead slots stack again every frame, but the stack stays bounded.
    for (int i = 0; i < 3000; ++i) t.update(image, {});
    EXPECT_LE(t.pfFaces.freeSlots.size(), 1024u);
    EXPECT_EQ(t.pfFaces.size(), 3u);
}

TEST(LDAClassifierTrain, RefusesWhatItCannotRead)
{
    LDAClassifier lda;
    lda.train({{3.0f, 1.0f}, {3.5f, 1.2f}, {-1.0f, 2.0f}, {-1.2f, 2.5f}}, {true, true, false, false});
    // Shorter features give a partial sum, none -threshold; longer ones would
    // read past the weights.
    EXPECT_EQ(lda.getScore({2.0f}), lda.weights[0] * 2.0f - lda.threshold);
    EXPECT_EQ(lda.getScore({}), -lda.threshold);
    EXPECT_NE(lda.threshold, 0.0f);
    EXPECT_THROW(lda.getScore({1.0f, 2.0f, 3.0f}), qv_invalid_argument);

    expectThrowWith<qv_operation_error>([&] { lda.train({}, {}); }, "Train LDA classifier with no features");
    EXPECT_THROW(lda.train({{1.0f, 2.0f}, {1.0f}}, {true, false}), qv_invalid_argument);
    EXPECT_THROW(lda.train({{1.0f}}, {true, false}), qv_invalid_argument);
    // All labels true: the empty class has no mean; training goes on.
    EXPECT_NO_THROW(lda.train({{1.0f, 2.0f}, {2.0f, 1.0f}}, {true, true}));
}

TEST_F(FaceScene, HaarObserversReadOnlyWindowsInsideTheImage)
{
    HaarLDAObserver lda;
    HaarBoostingLDAObserver boost;
    EXPECT_THROW(lda.getLikelihood(image, truth), qv_operation_error) << "no detector";
    EXPECT_THROW(boost.trainClassifier(image, windows, labels), qv_operation_error);
    lda.init(*cascade);
    boost.init(*cascade);
    lda.trainClassifier(image, windows, labels);
    boost.trainClassifier(image, windows, labels);
    struct Case {
        DetectionWindow window;
        bool inside;
    };
    // Right and bottom must stay below width - 1 and height - 1; 10 pixels is
    // smaller than the cascade's window.
    const Case cases[] = {{makeWindow(0, 50, 64, 114), true},    {makeWindow(-1, 50, 63, 114), false},
                          {makeWindow(254, 50, 318, 114), true}, {makeWindow(255, 50, 319, 114), false},
                          {makeWindow(100, 175, 164, 239), false}, {makeWindow(100, 100, 110, 110), false}};
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << c.window.left << "," << c.window.top);
        const float a = lda.getLikelihood(image, c.window), b = boost.getLikelihood(image, c.window);
        if (c.inside) {
            EXPECT_GT(a, 0.0f);
            EXPECT_TRUE(b >= 0.0f && b <= 1.0f) << "the vote runs inside the image: " << b;
        } else {
            EXPECT_EQ(std::vector<float>({a, b}), std::vector<float>({0.0f, 0.0f}));
        }
    }
    // On its own training window the discriminant sides with the face.
    EXPECT_GT(lda.getLikelihood(image, truth), 0.5f);
}

TEST_F(FaceScene, TrainingLeavesOutUnreadableWindowsAndKeepsARingOfFiveSets)
{
    HaarLDAObserver lda;
    lda.init(*cascade);
    expectThrowWith<qv_operation_error>(
        [&] { lda.trainClassifier(image, {makeWindow(-30, -30, 34, 34), makeWindow(300, 200, 364, 264)}, {true, false}); },
        "Train LDA classifier with no features");
    HaarBoostingLDAObserver boost;
    boost.init(*cascade);
    // Round r trains on 100 + r windows, so each set tells its round; an
    // unreadable window in the last round is left out.
    for (int round = 0; round < 12; ++round) {
        std::vector<DetectionWindow> w(windows.begin(), windows.begin() + 100 + round);
        std::vector<bool> l(labels.begin(), labels.begin() + 100 + round);
        if (round == 11) {
            w.push_back(makeWindow(-30, -30, 34, 34));
            l.push_back(true);
        }
        boost.trainClassifier(image, w, l);
        ASSERT_EQ(boost.trainingSets.size(), 5u);
    }
    const size_t expected[5] = {110, 111, 107, 108, 109}; // rounds 10, 11, 7, 8, 9
    for (size_t s = 0; s < 5; ++s) EXPECT_EQ(boost.trainingSets[s].size(), expected[s]) << s;
}

TEST_F(FaceScene, CascadeTrackerOpensAFacePerUnmatchedDetection)
{
    CPFTracker t;
    t.setDetector(*cascade);
    // Without a predict since the last update nothing matches: every detection
    // opens a face, in a slot beyond the earlier ones, and those die.
    t.update(image, {truth, makeWindow(20, 20, 84, 84)});
    t.update(image, {truth});
    EXPECT_EQ(t.cascades.alive, std::vector<bool>({false, false, true}));
    // Two detections on the one predicted window: the larger overlap keeps the
    // trained face (its first filter holds the last one's 600 particles), the
    // other opens a face seeded around it in the last freed slot.
    std::vector<DetectionWindow> out;
    t.predict(image, &out);
    ASSERT_EQ(out.size(), 1u);
    const DetectionWindow near = makeWindow(out[0].left + 2, out[0].top, out[0].right + 2, out[0].bottom);
    const DetectionWindow far = makeWindow(out[0].left + 12, out[0].top, out[0].right + 12, out[0].bottom);
    t.update(image, {far, near});
    EXPECT_EQ(t.cascades.alive, std::vector<bool>({false, true, true}));
    EXPECT_EQ(t.cascades.items[2].filters[0].getParticles().size(), 600u);
    EXPECT_TRUE(sameWindow(t.cascades.items[1].filters[0].getParticles().at(60), far)) << "the lattice's centre";
    // The predicted windows answered that update: the next one starts over in slot 0.
    t.update(image, {near});
    EXPECT_EQ(t.cascades.alive, std::vector<bool>({true, false, false}));
}

TEST_F(FaceScene, CascadeFilterSeedsKeepOnlyShiftsInsideTheImage)
{
    struct Case {
        DetectionWindow detection;
        size_t seeds;
    };
    const Case cases[] = {
        {truth, 121},
        {makeWindow(2, 80, 66, 144), 8 * 11}, // dx of -2 and below leave on the left
        {makeWindow(253, 2, 317, 66), 7 * 8}, // right must stay below width - 1
    };
    for (const Case& c : cases) {
        CascadePF f;
        f.init(*cascade);
        f.update(image, c.detection);
        ASSERT_EQ(f.filters[0].getParticles().size(), c.seeds) << c.detection.left;
        EXPECT_FLOAT_EQ(f.filters[0].getWeights()[0], 1.0f / float(c.seeds));
    }
    CascadePF outside;
    outside.init(*cascade);
    EXPECT_THROW(outside.update(image, makeWindow(400, 300, 464, 364)), qv_operation_error);
    EXPECT_EQ(outside.initialized, 0u);
    EXPECT_EQ(outside.predict(image, nullptr), 0);
}

