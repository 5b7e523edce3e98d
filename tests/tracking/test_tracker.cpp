#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/TrackSupport.h"
#include "image/IntegralImage.h"
#include "tracking/Tracker.h"

namespace {

std::vector<DetectionWindow> predicted(Tracker& t)
{
    IN_IMAGE image;
    std::vector<DetectionWindow> out;
    t.predict(image, &out);
    return out;
}

std::vector<DetectionWindow> previous(Tracker& t)
{
    std::vector<DetectionWindow> out;
    t.getPreviousFaces(&out);
    return out;
}

void step(Tracker& t, const std::vector<DetectionWindow>& detections)
{
    IN_IMAGE image;
    t.update(image, detections);
}

int liveCount(const Tracker& t)
{
    int n = 0;
    for (bool a : t.faces.alive) n += a ? 1 : 0;
    return n;
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
        {{{0.4f, 0.9f}, {0.8f, 0.5f}}, {1, 0}, "largest first, then the rest"},
        {{{0.9f, 0.8f}, {0.85f, 0.0f}}, {0, -1}, "greedy, not the best total"},
        {{{0.0f, 0.5f}, {0.5f, 0.5f}}, {1, 0}, "a tie goes to the first in row-major order"},
        {{{0.0f, -1.0f}, {0.0f, 0.0f}}, {-1, -1}, "zero and below are never chosen"},
        {{{0.2f, 0.3f}, {0.9f}, {0.1f, 0.1f, 0.99f}}, {1, 0, -1}, "ragged rows: the first row's width counts"},
    };
    for (const Case& c : cases) {
        std::vector<int> a;
        Tracker::match(c.scores, &a);
        EXPECT_EQ(a, c.expected) << c.why;
    }
}

TEST(TrackerMatch, EmptyInputsLeaveAssignmentAlone)
{
    std::vector<int> a;
    Tracker::match({}, &a);
    EXPECT_TRUE(a.empty());
    Tracker::match({{}, {}}, &a);
    EXPECT_EQ(a, (std::vector<int>{-1, -1})) << "rows but no columns: all unassigned";
    Tracker::match({{1.0f}}, nullptr); // must not crash
}

TEST(TrackerUpdate, EmptyFrameOnEmptyTrackerOnlyCounts)
{
    Tracker t;
    step(t, {});
    EXPECT_EQ(t.frameCounter, 1u);
    EXPECT_TRUE(t.faces.items.empty());
    EXPECT_TRUE(t.faces.freeSlots.empty());
}

TEST(TrackerUpdate, MatchedFaceFollowsWithVelocityOfItsCentre)
{
    Tracker t;
    step(t, {makeWindow(100, 50, 140, 90)});
    step(t, {makeWindow(110, 46, 150, 86)});
    ASSERT_EQ(liveCount(t), 1);
    const Tracker::TrackFace& f = t.faces.items[0];
    EXPECT_TRUE(sameWindow(f.rect, makeWindow(110, 46, 150, 86)));
    EXPECT_DOUBLE_EQ(f.velocityX, 10.0);
    EXPECT_DOUBLE_EQ(f.velocityY, -4.0);
    auto p = predicted(t);
    ASSERT_EQ(p.size(), 1u);
    EXPECT_TRUE(sameWindow(p[0], makeWindow(120, 42, 160, 82)));
    EXPECT_TRUE(sameWindow(previous(t)[0], makeWindow(110, 46, 150, 86))) << "predict must not move the track";
}

TEST(TrackerUpdate, OddShiftTruncatesTowardZero)
{
    Tracker t;
    step(t, {makeWindow(100, 100, 140, 140)});
    step(t, {makeWindow(98, 103, 139, 140)}); // left+right -3, top+bottom +3
    EXPECT_DOUBLE_EQ(t.faces.items[0].velocityX, -1.0);
    EXPECT_DOUBLE_EQ(t.faces.items[0].velocityY, 1.0);
}

TEST(TrackerUpdate, NewTrackPredictsItsOwnRect)
{
    Tracker t;
    step(t, {makeWindow(10, 20, 50, 60)});
    auto p = predicted(t);
    ASSERT_EQ(p.size(), 1u);
    EXPECT_TRUE(sameWindow(p[0], makeWindow(10, 20, 50, 60)));
}

TEST(TrackerUpdate, HigherOverlapTakesTheTrackAndTheOtherOpensAFace)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 100, 100)});
    // Detection 0 overlaps 0.64, detection 1 overlaps 0.81.
    step(t, {makeWindow(20, 0, 100, 80), makeWindow(10, 0, 100, 90)});
    ASSERT_EQ(liveCount(t), 2);
    EXPECT_TRUE(sameWindow(t.faces.items[0].rect, makeWindow(10, 0, 100, 90)));
    EXPECT_TRUE(sameWindow(t.faces.items[1].rect, makeWindow(20, 0, 100, 80)));
    EXPECT_DOUBLE_EQ(t.faces.items[1].velocityX, 0.0);
}

TEST(TrackerUpdate, TieGoesToLowerDetectionIndex)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 100, 100)});
    step(t, {makeWindow(0, 10, 100, 100), makeWindow(10, 0, 100, 100)});
    EXPECT_TRUE(sameWindow(t.faces.items[0].rect, makeWindow(0, 10, 100, 100)));
    EXPECT_TRUE(sameWindow(t.faces.items[1].rect, makeWindow(10, 0, 100, 100)));
}

TEST(TrackerUpdate, OverlapOfExactlyPointThreeStillMatches)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 10, 10)});
    step(t, {makeWindow(0, 0, 5, 6)}); // 30 / 100
    EXPECT_EQ(t.faces.items.size(), 1u) << "matched, not a new face";
    EXPECT_DOUBLE_EQ(t.faces.items[0].velocityX, -2.0);

    Tracker u;
    step(u, {makeWindow(0, 0, 10, 10)});
    step(u, {makeWindow(0, 0, 29, 1)}); // 10 / 119, well below
    EXPECT_EQ(u.faces.items.size(), 2u);
}

TEST(TrackerUpdate, UnconfirmedFaceDiesAtOnce)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(200, 0, 240, 40)});
    step(t, {makeWindow(202, 0, 242, 40)});
    EXPECT_EQ(liveCount(t), 1);
    EXPECT_FALSE(t.faces.alive[0]);
    EXPECT_EQ(previous(t).size(), 1u);
    step(t, {});
    EXPECT_EQ(liveCount(t), 0);
    EXPECT_EQ(t.frameCounter, 3u);
}

TEST(TrackerUpdate, DeadSlotIsStackedEveryFrameAndCanHoldTwoNewFaces)
{
    Tracker t;
    step(t, {makeWindow(0, 0, 40, 40)});
    step(t, {});
    step(t, {});
    EXPECT_EQ(t.faces.freeSlots, (std::vector<uint32_t>{0, 0}));
    // Two unrelated new faces in one frame both pop index 0: the later wins.
    step(t, {makeWindow(0, 0, 40, 40), makeWindow(300, 300, 340, 340)});
    EXPECT_EQ(t.faces.items.size(), 1u);
    EXPECT_TRUE(sameWindow(t.faces.items[0].rect, makeWindow(300, 300, 340, 340)));
    EXPECT_EQ(liveCount(t), 1);
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

TEST(TrackerConfig, HasNoParametersAndKnowsItsName)
{
    Tracker* t = Tracker::create("{\"anything\": 1}");
    ASSERT_NE(t, nullptr);
    EXPECT_EQ(t->toJson(), "{}");
    EXPECT_EQ(t->name(), "SIMPLE_TRACKER");
    delete t;
}
