// The particle machine shared by PF_TRACKER and the cascade filters: lattice
// seeding, weighted mean, jitter, resampling, clouds without evidence, and the
// PF tracker's association.

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "support/TrackSupport.h"
#include "tracking/Observer.h"
#include "tracking/PFTracker.h"
#include "tracking/ParticleCloud.h"
#include "tracking/ParticleFilter.h"
#include "tracking/ParticleRandom.h"

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
    // is drawn one place up (on the first: the first two), and NaN weights
    // land at the top.
    struct Weighted {
        std::vector<float> weights;
        int lowest, highest;
    };
    for (const Weighted& c : {Weighted{{0, 0, 1, 0}, 3, 3}, Weighted{{kNaN, kNaN, kNaN, kNaN}, 3, 3},
                              Weighted{{1, 0, 0, 0}, 0, 1}}) {
        std::vector<DetectionWindow> p;
        for (int i = 0; i < 4; ++i) p.push_back(makeWindow(i, 0, i + 30, 30));
        std::vector<float> w = c.weights;
        particle_cloud::resample(p, w, 200);
        for (const DetectionWindow& d : p) EXPECT_TRUE(d.left >= c.lowest && d.left <= c.highest) << d.left;
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
    ASSERT_EQ(t.pfFaces.size(), 2u);
    // Overlap 0.28 with face 0 opens a new face; a small shift of face 1 keeps
    // it, with the velocity of its mean's centre: (3 + 6) / 2, toward zero.
    t.update(image, {makeWindow(38, 10, 88, 60), makeWindow(203, 100, 256, 150)});
    ASSERT_EQ(t.pfFaces.size(), 3u);
    EXPECT_FALSE(t.pfFaces.alive[0]);
    EXPECT_TRUE(t.pfFaces.alive[1] && t.pfFaces.alive[2]);
    EXPECT_EQ(t.pfFaces.items[1].velocityX, 4);
    // The faces live in the tracker's own list: the front end gets no previous
    // faces to follow and finds this tracker's faces by its search cells alone.
    std::vector<DetectionWindow> out;
    t.getPreviousFaces(&out);
    EXPECT_TRUE(out.empty());
    try {
        t.predict(image, &out);
        FAIL() << "no detector";
    } catch (const qv_operation_error& e) {
        EXPECT_STREQ(e.what(), "Face estimator doesn't have a detector yet");
    }
    // Dead slots stack again every frame, but the stack stays bounded.
    for (int i = 0; i < 3000; ++i) t.update(image, {});
    EXPECT_LE(t.pfFaces.freeSlots.size(), 1024u);
    EXPECT_EQ(t.pfFaces.size(), 3u);
}
