#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "detector/MultiframeOptimizer.h"
#include "detector/WindowMerger.h"
#include "support/TrackSupport.h"

namespace {

ScoredWindow hit(int left, int top, int right, int bottom, float score, int category = 0)
{
    ScoredWindow w;
    w.score = score;
    w.category = category;
    w.window = makeWindow(left, top, right, bottom);
    return w;
}

std::vector<ScoredWindow> merge(std::vector<ScoredWindow> const& input)
{
    WindowMerger merger;
    std::vector<ScoredWindow> out;
    merger.mergeWindows(input, out);
    return out;
}

float logistic(float v)
{
    return static_cast<float>(1.0 / (std::exp(-double(v)) + 1.0));
}

} // namespace

TEST(WindowMergerGroups, EmptyInputLeavesTheOutputAlone)
{
    WindowMerger merger;
    std::vector<ScoredWindow> out{hit(1, 1, 5, 5, 2.0f)};
    merger.mergeWindows({}, out);
    ASSERT_EQ(out.size(), 1u);
    EXPECT_EQ(out[0].score, 2.0f);
}

TEST(WindowMergerGroups, LoneHitKeepsItsRectangleAndNormalisedLogisticCategories)
{
    ScoredWindow w = hit(10, 20, 40, 50, 1.5f, 2);
    w.categoryScores[0] = 0.5f;
    w.categoryScores[2] = 2.0f;
    const auto out = merge({w});
    ASSERT_EQ(out.size(), 1u);
    EXPECT_TRUE(sameWindow(out[0].window, w.window));
    EXPECT_EQ(out[0].score, 1.5f);
    EXPECT_EQ(out[0].category, 2);
    // One member: each category is the logistic of its score, then all are
    // scaled to sum 1 (13 categories at logistic(0) = 0.5).
    const float total = logistic(0.5f) + logistic(2.0f) + 13 * 0.5f;
    EXPECT_NEAR(out[0].categoryScores[0], logistic(0.5f) / total, 1e-6);
    EXPECT_NEAR(out[0].categoryScores[2], logistic(2.0f) / total, 1e-6);
    EXPECT_NEAR(out[0].categoryScores[7], 0.5f / total, 1e-6);
}

// Grouping (Dice above 0.4 joins), the mean rectangle rounded half up, and
// suppression (overlap over the smaller area above 0.4: the lower score goes).
TEST(WindowMergerGroups, RectanglesAndScoresOfTheSurvivors)
{
    struct Case {
        const char* what;
        std::vector<ScoredWindow> input;
        std::vector<DetectionWindow> windows; // in output order
        std::vector<float> scores;
    };
    const std::vector<Case> cases = {
        {"overlapping hits: mean rectangle, best score",
         {hit(10, 10, 40, 40, 1.0f, 0), hit(12, 10, 42, 40, 3.0f, 1), hit(14, 13, 44, 43, 2.0f, 0)},
         {makeWindow(12, 11, 42, 41)},
         {3.0f}},
        {"identical windows", {hit(0, 0, 24, 24, 1.0f), hit(0, 0, 24, 24, 4.0f)}, {makeWindow(0, 0, 24, 24)}, {4.0f}},
        {"mean rounds half up", {hit(10, 10, 40, 40, 1.0f), hit(11, 11, 41, 41, 1.0f)}, {makeWindow(11, 11, 41, 41)},
         {1.0f}},
        {"touching and distant stay apart",
         {hit(0, 0, 20, 20, 1.0f), hit(20, 0, 40, 20, 2.0f), hit(100, 100, 120, 120, 3.0f)},
         {makeWindow(100, 100, 120, 120), makeWindow(20, 0, 40, 20), makeWindow(0, 0, 20, 20)},
         {3.0f, 2.0f, 1.0f}},
        // Dice 2 * 576 / (576 + 10000) is below 0.4: two groups, then the
        // overlap over the smaller area is 1.
        {"small inside large, small better", {hit(0, 0, 100, 100, 1.0f), hit(30, 30, 54, 54, 2.0f)},
         {makeWindow(30, 30, 54, 54)}, {2.0f}},
        {"small inside large, large better", {hit(0, 0, 100, 100, 3.0f), hit(30, 30, 54, 54, 2.0f)},
         {makeWindow(0, 0, 100, 100)}, {3.0f}},
        // Sorted by descending left, the window starting at 30 comes first.
        {"equal scores keep the earlier", {hit(0, 0, 100, 100, 2.0f), hit(30, 30, 54, 54, 2.0f)},
         {makeWindow(30, 30, 54, 54)}, {2.0f}},
        {"zero area dropped uncompared", {hit(50, 50, 50, 80, 9.0f), hit(0, 0, 20, 20, 1.0f)},
         {makeWindow(0, 0, 20, 20)}, {1.0f}},
        // A(60..) beats its neighbour B(55..), erasing the entry right behind
        // it, so the walk ends after A's pass: C and D, which overlap each other
        // but not A, both survive.
        {"walk ends early after an erase",
         {hit(60, 0, 90, 30, 5.0f), hit(55, 5, 70, 20, 1.0f), hit(0, 100, 30, 130, 2.0f), hit(5, 105, 20, 120, 1.0f)},
         {makeWindow(60, 0, 90, 30), makeWindow(5, 105, 20, 120), makeWindow(0, 100, 30, 130)},
         {5.0f, 1.0f, 2.0f}},
    };
    for (const Case& c : cases) {
        const auto out = merge(c.input);
        ASSERT_EQ(out.size(), c.windows.size()) << c.what;
        for (size_t i = 0; i < out.size(); ++i) {
            EXPECT_TRUE(sameWindow(out[i].window, c.windows[i])) << c.what << " #" << i;
            EXPECT_EQ(out[i].score, c.scores[i]) << c.what << " #" << i;
        }
    }
    EXPECT_EQ(merge({hit(10, 10, 40, 40, 1.0f, 0), hit(12, 10, 42, 40, 3.0f, 1)})[0].category, 1)
        << "the category of the member that set the best score";
}

TEST(WindowMergerGroups, CategoryBlendFollowsRecordSettersWeightedByTheirOwnScore)
{
    // Members are visited by descending left edge (a, b, c). Scores rise 1, 2
    // then fall: a and b set records, c doesn't and plays no part in the blend.
    ScoredWindow a = hit(12, 10, 42, 40, 1.0f, 0), b = hit(11, 10, 41, 40, 2.0f, 1),
                 c = hit(10, 10, 40, 40, 0.5f, 0);
    a.categoryScores[0] = 1.0f;
    b.categoryScores[1] = 3.0f;
    c.categoryScores[0] = 50.0f;
    c.categoryScores[1] = -50.0f;
    const auto out = merge({a, b, c});
    ASSERT_EQ(out.size(), 1u);
    const float wa = logistic(1.0f), wb = logistic(3.0f);
    const float c0 = (wa * logistic(1.0f) + wb * logistic(0.0f)) / (wa + wb);
    const float c1 = (wa * logistic(0.0f) + wb * logistic(3.0f)) / (wa + wb);
    const float rest = 0.5f;
    const float total = c0 + c1 + 13 * rest;
    EXPECT_NEAR(out[0].categoryScores[0], c0 / total, 1e-5);
    EXPECT_NEAR(out[0].categoryScores[1], c1 / total, 1e-5);
}

TEST(WindowMergerReuse, CallsDoNotLeakIntoEachOther)
{
    WindowMerger merger;
    std::vector<ScoredWindow> first, second;
    merger.mergeWindows({hit(0, 0, 30, 30, 1.0f), hit(1, 1, 31, 31, 1.0f), hit(200, 0, 230, 30, 1.0f)}, first);
    merger.mergeWindows({hit(50, 50, 80, 80, 2.0f)}, second);
    EXPECT_EQ(first.size(), 2u);
    ASSERT_EQ(second.size(), 1u);
    EXPECT_TRUE(sameWindow(second[0].window, makeWindow(50, 50, 80, 80)));
}

TEST(WindowMergerHelpers, IntersectionReportsHowWindowsLie)
{
    DetectionWindow r;
    EXPECT_EQ(WindowMerger::intersectWindows(makeWindow(0, 0, 10, 10), makeWindow(20, 0, 30, 10), r), 0);
    EXPECT_EQ(WindowMerger::intersectWindows(makeWindow(0, 0, 10, 10), makeWindow(5, 20, 15, 30), r), 1);
    EXPECT_EQ(WindowMerger::intersectWindows(makeWindow(0, 0, 10, 10), makeWindow(10, 10, 20, 20), r), 2);
    EXPECT_TRUE(sameWindow(r, makeWindow(10, 10, 10, 10)));
    int p = 5;
    WindowMerger::UpdatePosForEarlyRemove(p, 3);
    EXPECT_EQ(p, 4);
    WindowMerger::UpdatePosForEarlyRemove(p, 4);
    EXPECT_EQ(p, -1);
    p = 2;
    WindowMerger::UpdatePosForEarlyRemove(p, 3);
    EXPECT_EQ(p, 2);
    WindowMerger::UpdatePosForEarlyRemove(p, -1);
    EXPECT_EQ(p, 2);
}

TEST(MultiframeOptimizerMotion, PredictsFromTheLastStepBetweenValidPositions)
{
    MultiframeOptimizer m;
    int x = 0, y = 0, size = 0;
    m.lastPosition(x, y, size);
    EXPECT_EQ(x, -1);
    EXPECT_EQ(size, -1);
    m.updatePosition(true, 10, 20, 30);
    m.predictedPosition(x, y, size);
    EXPECT_EQ(x, 10);
    EXPECT_EQ(y, 20);
    m.updatePosition(true, 14, 17, 31);
    m.predictedPosition(x, y, size);
    EXPECT_EQ(x, 18);
    EXPECT_EQ(y, 14);
    EXPECT_EQ(size, 31);
    m.updatePosition(false, 50, 50, 50); // an invalid position resets the motion
    m.predictedPosition(x, y, size);
    EXPECT_EQ(x, 50);
    m.updatePosition(true, 60, 60, 50); // the old one was invalid: still no motion
    m.predictedPosition(x, y, size);
    EXPECT_EQ(x, 60);
}
