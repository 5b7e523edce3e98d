#include <gtest/gtest.h>

#include <tuple>
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

// One merger for every call: what a call leaves behind must not leak into the next.
std::vector<ScoredWindow> merge(std::vector<ScoredWindow> const& input)
{
    static WindowMerger merger;
    std::vector<ScoredWindow> out;
    merger.mergeWindows(input, out);
    return out;
}

} // namespace

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
        {"mean rounds half up", {hit(10, 10, 40, 40, 1.0f), hit(11, 11, 41, 41, 1.0f)}, {makeWindow(11, 11, 41, 41)},
         {1.0f}},
        // Dice 2 * 180 / 800 = 0.45 joins: the mean rectangle, not the better
        // one alone (which suppression would keep).
        {"Dice 0.45 joins", {hit(0, 0, 20, 20, 1.0f), hit(11, 0, 31, 20, 2.0f)}, {makeWindow(6, 0, 26, 20)}, {2.0f}},
        // Dice 0.35 stays apart, and overlap 0.35 of the smaller is too little to suppress.
        {"Dice 0.35 stays apart", {hit(0, 0, 20, 20, 1.0f), hit(13, 0, 33, 20, 2.0f)},
         {makeWindow(13, 0, 33, 20), makeWindow(0, 0, 20, 20)}, {2.0f, 1.0f}},
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
        SCOPED_TRACE(c.what);
        const auto out = merge(c.input);
        ASSERT_EQ(out.size(), c.windows.size());
        for (size_t i = 0; i < out.size(); ++i) {
            EXPECT_TRUE(sameWindow(out[i].window, c.windows[i])) << "#" << i;
            EXPECT_EQ(out[i].score, c.scores[i]) << "#" << i;
        }
    }
    // The category of the member that set the best score picks the post filter's classifier.
    EXPECT_EQ(merge({hit(10, 10, 40, 40, 1.0f, 0), hit(12, 10, 42, 40, 3.0f, 1)})[0].category, 1);

}

// The exported motion predictor: motion comes only from two valid positions
// in a row; an invalid one resets it.
TEST(MultiframeOptimizerMotion, PredictsFromTheLastStepBetweenValidPositions)
{
    MultiframeOptimizer m;
    int x = 0, y = 0, size = 0;
    m.lastPosition(x, y, size);
    EXPECT_EQ(std::make_tuple(x, y, size), std::make_tuple(-1, -1, -1));
    m.updatePosition(true, 10, 20, 30);
    m.updatePosition(true, 14, 17, 31);
    m.predictedPosition(x, y, size);
    EXPECT_EQ(std::make_tuple(x, y, size), std::make_tuple(18, 14, 31));
    m.updatePosition(false, 50, 50, 50);
    m.updatePosition(true, 60, 60, 50);
    m.predictedPosition(x, y, size);
    EXPECT_EQ(std::make_tuple(x, y, size), std::make_tuple(60, 60, 50));
}
