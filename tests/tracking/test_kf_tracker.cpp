#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "support/TrackSupport.h"
#include "image/IntegralImage.h"
#include "tracking/KFTracker.h"

namespace {

std::vector<DetectionWindow> predictStep(KFTracker& t)
{
    IN_IMAGE image;
    std::vector<DetectionWindow> out;
    t.predict(image, &out);
    return out;
}

void step(KFTracker& t, const std::vector<DetectionWindow>& detections)
{
    IN_IMAGE image;
    t.update(image, detections);
}

std::vector<DetectionWindow> previous(KFTracker& t)
{
    std::vector<DetectionWindow> out;
    t.getPreviousFaces(&out);
    return out;
}

} // namespace

TEST(KalmanTrack, NewTrackPredictsItsDetection)
{
    KFTracker t;
    step(t, {makeWindow(100, 100, 200, 200)});
    auto p = predictStep(t);
    ASSERT_EQ(p.size(), 1u);
    EXPECT_TRUE(sameWindow(p[0], makeWindow(100, 100, 200, 200)));
}

TEST(KalmanTrack, CorrectionFollowsKnownNumbers)
{
    KFTracker t;
    step(t, {makeWindow(100, 100, 200, 200)});
    predictStep(t);
    step(t, {makeWindow(110, 100, 210, 200)});
    const KFTracker::TrackFace& f = t.kfFaces.items[0];
    EXPECT_NEAR(f.state[0], 109.986f, 0.002f);
    EXPECT_NEAR(f.state[2], 209.986f, 0.002f);
    EXPECT_NEAR(f.state[4], 6.6576f, 0.001f);
    EXPECT_NEAR(f.state[1], 100.0f, 1e-4f);
    EXPECT_NEAR(f.state[5], 0.0f, 1e-4f);

    auto p = predictStep(t);
    EXPECT_TRUE(sameWindow(p[0], makeWindow(117, 100, 217, 200))) << "116.64 rounds up";
    step(t, {makeWindow(120, 100, 220, 200)});
    EXPECT_NEAR(t.kfFaces.items[0].state[4], 9.959f, 0.002f);
    EXPECT_NEAR(t.kfFaces.items[0].state[0], 119.979f, 0.002f);
}

TEST(KalmanTrack, PreviousFacesGiveTheMeasurementNotTheEstimate)
{
    KFTracker t;
    step(t, {makeWindow(100, 100, 200, 200)});
    predictStep(t);
    step(t, {makeWindow(110, 100, 210, 200)});
    predictStep(t);
    auto prev = previous(t);
    ASSERT_EQ(prev.size(), 1u);
    EXPECT_TRUE(sameWindow(prev[0], makeWindow(110, 100, 210, 200)));
}

TEST(KalmanTrack, MatchScoresUseTheTruncatedState)
{
    // A bottom edge of 9.6 is 10 in predict and 9 for association.
    KFTracker t;
    step(t, {makeWindow(0, 0, 10, 10)});
    t.kfFaces.items[0].state[3] = 9.6f;
    auto p = predictStep(t);
    EXPECT_EQ(p[0].bottom, 10);

    // Against 0..9 the detection overlaps 20 / 100 = 0.2: a new face, although
    // the rounded window 0..10 would give 30 / 100 = 0.3 and a match.
    step(t, {makeWindow(0, 7, 10, 10)});
    EXPECT_EQ(t.kfFaces.items.size(), 2u);
    EXPECT_FALSE(t.kfFaces.alive[0]);
}

TEST(KalmanTrack, EmptyFrameFreesEachLiveSlotOnce)
{
    KFTracker t;
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(100, 0, 140, 40), makeWindow(200, 0, 240, 40)});
    step(t, {});
    EXPECT_EQ(t.kfFaces.freeSlots, (std::vector<uint32_t>{0, 1, 2}));
    step(t, {});
    EXPECT_EQ(t.kfFaces.freeSlots.size(), 3u) << "dead slots are not stacked again";
    EXPECT_TRUE(previous(t).empty());
    EXPECT_EQ(t.frameCounter, 3u);
    step(t, {makeWindow(5, 5, 45, 45)});
    EXPECT_TRUE(t.kfFaces.alive[2]) << "last freed, first reused";
}

TEST(KalmanTrack, ReusedSlotStartsAFreshFilter)
{
    KFTracker t;
    step(t, {makeWindow(0, 0, 40, 40)});
    predictStep(t);
    step(t, {makeWindow(8, 0, 48, 40)});
    step(t, {});
    step(t, {makeWindow(300, 300, 340, 340)});
    const KFTracker::TrackFace& f = t.kfFaces.items[0];
    EXPECT_FLOAT_EQ(f.state[4], 0.0f);
    EXPECT_FLOAT_EQ(f.covariance(0, 0), 10000.0f);
    EXPECT_FLOAT_EQ(f.state[0], 300.0f);
}

TEST(KalmanTrack, DivergedStateDoesNotBreakTheIntConversions)
{
    KFTracker t;
    step(t, {makeWindow(0, 0, 40, 40)});
    t.kfFaces.items[0].state[0] = 1e30f;
    t.kfFaces.items[0].state[2] = -1e30f;
    t.kfFaces.items[0].state[1] = std::numeric_limits<float>::quiet_NaN();
    auto p = predictStep(t);
    ASSERT_EQ(p.size(), 1u);
    step(t, {makeWindow(0, 0, 40, 40)});
    EXPECT_EQ(t.frameCounter, 2u);
}
