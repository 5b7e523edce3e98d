// The simple tracker's greedy association and the Kalman tracker's filter,
// with the slots both keep their faces in.

#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "image/IntegralImage.h"
#include "support/TrackSupport.h"
#include "tracking/KFTracker.h"
#include "tracking/Tracker.h"

namespace {

using Windows = std::vector<DetectionWindow>;

Windows predicted(Tracker& t)
{
    IN_IMAGE image;
    Windows out;
    t.predict(image, &out);
    return out;
}

Windows previous(Tracker& t)
{
    Windows out;
    t.getPreviousFaces(&out);
    return out;
}

void step(Tracker& t, const Windows& detections)
{
    IN_IMAGE image;
    t.update(image, detections);
}

} // namespace

TEST(TrackerMatch, GreedyBestFirstWithRowMajorTies)
{
    struct Case {
        std::vector<std::vector<float>> scores;
        std::vector<int> expected;
        const char* why;
    };
    const Case cases[] = {
        {{{0.9f, 0.8f}, {0.85f, 0.0f}}, {0, -1}, "greedy, not the best total"},
        {{{0.0f, 0.5f}, {0.5f, 0.5f}}, {1, 0}, "a tie goes to the first in row-major order"},
        {{{0.0f, -1.0f}, {0.0f, 0.0f}}, {-1, -1}, "zero and below are never chosen"},
        {{{0.2f, 0.3f}, {0.9f}, {0.1f, 0.1f, 0.99f}}, {1, 0, -1}, "ragged rows: the first row's width counts"},
        {{{}, {}}, {-1, -1}, "rows but no columns: all unassigned"},
    };
    for (const Case& c : cases) {
        std::vector<int> a;
        Tracker::match(c.scores, &a);
        EXPECT_EQ(a, c.expected) << c.why;
    }
    Tracker::match({{1.0f}}, nullptr); // must not crash
}

TEST(TrackerUpdate, SecondFrameMatchesByOverlapAndMovesWithTheCentre)
{
    // Frame 1 holds one face; after frame 2 the list holds `rects`, and the
    // first of them moves with (vx, vy).
    struct Case {
        DetectionWindow first;
        Windows second, rects;
        double vx, vy;
        const char* why;
    };
    const Case cases[] = {
        {makeWindow(100, 100, 140, 140), {makeWindow(98, 103, 139, 140)}, {makeWindow(98, 103, 139, 140)}, -1, 1,
         "follows its detection; an odd shift truncates toward zero"},
        {makeWindow(0, 0, 100, 100), {makeWindow(20, 0, 100, 80), makeWindow(10, 0, 100, 90)},
         {makeWindow(10, 0, 100, 90), makeWindow(20, 0, 100, 80)}, 5, -5, "0.81 beats 0.64, the other is new"},
        {makeWindow(0, 0, 100, 100), {makeWindow(0, 10, 100, 100), makeWindow(10, 0, 100, 100)},
         {makeWindow(0, 10, 100, 100), makeWindow(10, 0, 100, 100)}, 0, 5, "a tie goes to the lower index"},
        {makeWindow(0, 0, 10, 10), {makeWindow(0, 0, 5, 6)}, {makeWindow(0, 0, 5, 6)}, -2, -2,
         "an overlap of exactly 0.3 still matches"},
        {makeWindow(0, 0, 10, 10), {makeWindow(0, 0, 29, 1)}, {makeWindow(0, 0, 10, 10), makeWindow(0, 0, 29, 1)}, 0, 0,
         "10 / 119 opens a face"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.why);
        Tracker t;
        step(t, {c.first});
        EXPECT_TRUE(sameWindow(predicted(t)[0], c.first)) << "a new track predicts its own rect";
        step(t, c.second);
        ASSERT_EQ(t.faces.items.size(), c.rects.size());
        for (size_t i = 0; i < c.rects.size(); ++i) EXPECT_TRUE(sameWindow(t.faces.items[i].rect, c.rects[i])) << i;
        EXPECT_DOUBLE_EQ(t.faces.items[0].velocityX, c.vx);
        EXPECT_DOUBLE_EQ(t.faces.items[0].velocityY, c.vy);
    }
    // The prediction moves by the velocity; the track itself stays put.
    Tracker t;
    step(t, {makeWindow(100, 50, 140, 90)});
    step(t, {makeWindow(110, 46, 150, 86)});
    predicted(t);
    EXPECT_TRUE(sameWindow(predicted(t)[0], makeWindow(120, 42, 160, 82)));
}

TEST(TrackerUpdate, UnconfirmedFacesDieAndDeadSlotsAreStackedEveryFrame)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(200, 0, 240, 40)});
    step(t, {makeWindow(202, 0, 242, 40)});
    EXPECT_FALSE(t.faces.alive[0]);
    EXPECT_EQ(previous(t).size(), 1u);

    Tracker u;
    step(u, {makeWindow(0, 0, 40, 40)});
    step(u, {});
    step(u, {});
    EXPECT_EQ(u.faces.freeSlots, (std::vector<uint32_t>{0, 0}));
    // Two unrelated new faces in one frame both pop slot 0: the later wins.
    step(u, {makeWindow(0, 0, 40, 40), makeWindow(300, 300, 340, 340)});
    ASSERT_EQ(u.faces.items.size(), 1u);
    EXPECT_TRUE(sameWindow(u.faces.items[0].rect, makeWindow(300, 300, 340, 340)));
    EXPECT_TRUE(u.faces.alive[0]);
}

TEST(TrackerUpdate, AbsurdCoordinatesDoNotOverflow)
{
    Tracker t;
    step(t, {makeWindow(2147483000, 2147483000, 2147483600, 2147483600)});
    step(t, {makeWindow(2147483100, 2147483100, 2147483647, 2147483647)});
    auto p = predicted(t);
    ASSERT_EQ(p.size(), 1u);
    EXPECT_EQ(p[0].right, 2147483647) << "held at the int range, not wrapped";
}

TEST(KalmanTrack, CorrectionAndPredictionFollowKnownNumbers)
{
    KFTracker t;
    step(t, {makeWindow(100, 100, 200, 200)});
    EXPECT_TRUE(sameWindow(predicted(t)[0], makeWindow(100, 100, 200, 200)));
    step(t, {makeWindow(110, 100, 210, 200)});
    const auto& state = t.kfFaces.items[0].state;
    // Left and right edges follow the measurement; the velocity picks up 2/3 of the step.
    const float expected[] = {109.986f, 100.0f, 209.986f, 200.0f, 6.6576f, 0.0f};
    for (int i = 0; i < 6; ++i) EXPECT_NEAR(state[i], expected[i], 0.002f) << i;
    EXPECT_TRUE(sameWindow(predicted(t)[0], makeWindow(117, 100, 217, 200))) << "116.64 rounds up";
    EXPECT_TRUE(sameWindow(previous(t)[0], makeWindow(110, 100, 210, 200))) << "the measurement, not the estimate";
    step(t, {makeWindow(120, 100, 220, 200)});
    EXPECT_NEAR(t.kfFaces.items[0].state[4], 9.959f, 0.002f);
    EXPECT_NEAR(t.kfFaces.items[0].state[0], 119.979f, 0.002f);
}

TEST(KalmanTrack, EmptyFrameFreesEachSlotOnceAndAReusedSlotStartsFresh)
{
    KFTracker t;
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(100, 0, 140, 40), makeWindow(200, 0, 240, 40)});
    predicted(t);
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(100, 0, 140, 40), makeWindow(208, 0, 248, 40)});
    step(t, {});
    step(t, {});
    EXPECT_EQ(t.kfFaces.freeSlots, (std::vector<uint32_t>{0, 1, 2})) << "dead slots are not stacked again";
    EXPECT_TRUE(previous(t).empty());
    step(t, {makeWindow(300, 300, 340, 340)});
    EXPECT_TRUE(t.kfFaces.alive[2]) << "last freed, first reused";
    EXPECT_EQ(t.frameCounter, 5u);
    // Slot 2 moved before it died; reused, it starts at rest with the initial covariance.
    const KFTracker::TrackFace& f = t.kfFaces.items[2];
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
    EXPECT_EQ(predicted(t).size(), 1u);
    step(t, {makeWindow(0, 0, 40, 40)});
    EXPECT_EQ(t.frameCounter, 2u);
}
