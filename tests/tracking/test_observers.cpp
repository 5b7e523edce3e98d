// The on-line observers and their discriminant, and the cascade filter that
// carries them: training, bounds, the ring of training sets, and filters that
// keep pointing at their own observers when a CascadePF is copied or moved.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "core/Errors.h"
#include "support/FaceSequence.h"
#include "support/TrackSupport.h"
#include "tracking/CPFTracker.h"
#include "tracking/CascadePF.h"
#include "tracking/LDAClassifier.h"
#include "tracking/Observer.h"
#include "tracking/ParticleRandom.h"
#include "tracking/QVArrayList.h"

namespace {

// The built-in cascade and a frame with the face at (120, 80), 64 pixels.
struct FaceScene {
    facesequence::Gray face = facesequence::faceCrop(64);
    std::unique_ptr<CascadeDetector> cascade = facesequence::builtInCascade();
    IN_IMAGE image;
    DetectionWindow truth = makeWindow(120, 80, 184, 144);

    bool ready()
    {
        if (face.pixels.empty()) return false;
        const std::vector<uint8_t> px = facesequence::frameWithFace(face, 320, 240, 120, 80);
        return image.Init(320, 240, 320, px.data());
    }
};

// The lattice of shifts around a window, labelled by an overlap of 0.9.
void latticeAround(const DetectionWindow& w, std::vector<DetectionWindow>& windows, std::vector<bool>& labels)
{
    for (int dx = -5; dx <= 5; ++dx)
        for (int dy = -5; dy <= 5; ++dy) {
            windows.push_back(makeWindow(w.left + dx, w.top + dy, w.right + dx, w.bottom + dy));
            labels.push_back(w.Overlap(windows.back()) >= 0.9f);
        }
}

} // namespace

TEST(LDAClassifierTrain, SeparatesTwoCloudsWithAUnitDirection)
{
    // Positives around (3, 1), negatives around (-1, 2), spread on both axes.
    std::vector<std::vector<float>> rows;
    std::vector<bool> labels;
    const float spread[][2] = {{0.3f, -0.2f}, {-0.4f, 0.1f}, {0.1f, 0.5f}, {-0.2f, -0.3f}};
    for (const auto& s : spread) {
        rows.push_back({3.0f + s[0], 1.0f + s[1]});
        labels.push_back(true);
        rows.push_back({-1.0f + s[1], 2.0f + s[0]});
        labels.push_back(false);
    }
    LDAClassifier lda;
    lda.train(rows, labels);
    ASSERT_EQ(lda.weights.size(), 2);
    EXPECT_NEAR(lda.weights.norm(), 1.0f, 1e-5f);
    for (size_t i = 0; i < rows.size(); ++i) EXPECT_EQ(lda.getScore(rows[i]) > 0.0f, bool(labels[i])) << i;
    EXPECT_GT(lda.getScore({3.0f, 1.0f}), 0.0f);
    EXPECT_LT(lda.getScore({-1.0f, 2.0f}), 0.0f);
}

TEST(LDAClassifierTrain, RefusesWhatItCannotReadAndToleratesOneClass)
{
    LDAClassifier lda;
    try {
        lda.train({}, {});
        FAIL() << "no rows";
    } catch (const qv_operation_error& e) {
        EXPECT_STREQ(e.what(), "Train LDA classifier with no features");
    }
    EXPECT_THROW(lda.train({{1.0f, 2.0f}, {1.0f}}, {true, false}), qv_invalid_argument);
    EXPECT_THROW(lda.train({{1.0f}}, {true, false}), qv_invalid_argument);
    // All labels true: the empty class has no mean; training goes on.
    EXPECT_NO_THROW(lda.train({{1.0f, 2.0f}, {2.0f, 1.0f}}, {true, true}));
    EXPECT_THROW(lda.getScore({1.0f}), qv_invalid_argument) << "a vector of another length";
    LDAClassifier untrained;
    EXPECT_EQ(untrained.getScore({}), 0.0f);
}

TEST(HaarObservers, BoundsAndMissingDetector)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    std::vector<DetectionWindow> windows;
    std::vector<bool> labels;
    latticeAround(scene.truth, windows, labels);

    HaarLDAObserver lda;
    HaarBoostingLDAObserver boost;
    EXPECT_THROW(lda.getLikelihood(scene.image, scene.truth), qv_operation_error);
    EXPECT_THROW(boost.trainClassifier(scene.image, windows, labels), qv_operation_error);
    lda.init(*scene.cascade);
    boost.init(*scene.cascade);
    lda.trainClassifier(scene.image, windows, labels);
    boost.trainClassifier(scene.image, windows, labels);

    struct Case {
        DetectionWindow window;
        bool inside;
    };
    const Case cases[] = {
        {makeWindow(0, 50, 64, 114), true},     // left 0 passes
        {makeWindow(-1, 50, 63, 114), false},   // left below 0
        {makeWindow(254, 50, 318, 114), true},  // right at width - 2
        {makeWindow(255, 50, 319, 114), false}, // right at width - 1
        {makeWindow(100, 0, 164, 64), true},
        {makeWindow(100, 175, 164, 239), false}, // bottom at height - 1
        {makeWindow(100, 100, 110, 110), false}, // smaller than the cascade's window
    };
    for (const Case& c : cases) {
        const float a = lda.getLikelihood(scene.image, c.window);
        const float b = boost.getLikelihood(scene.image, c.window);
        if (c.inside) {
            EXPECT_GT(a, 0.0f) << c.window.left << "," << c.window.top;
            EXPECT_TRUE(std::isnan(b) || (b >= 0.0f && b <= 1.0f)) << "the vote runs inside the image";
        } else {
            EXPECT_EQ(a, 0.0f) << c.window.left << "," << c.window.top;
            EXPECT_EQ(b, 0.0f);
        }
    }
    // On its own training windows the discriminant puts the classes on the
    // two sides of 0.5, on average.
    double positive = 0.0, negative = 0.0;
    int positives = 0;
    for (size_t i = 0; i < windows.size(); ++i) {
        const double v = lda.getLikelihood(scene.image, windows[i]);
        (labels[i] ? positive : negative) += v;
        positives += labels[i] ? 1 : 0;
    }
    ASSERT_GT(positives, 0);
    EXPECT_GT(positive / positives, 0.5);
    EXPECT_LT(negative / double(int(windows.size()) - positives), 0.5);
}

TEST(HaarObservers, TrainingLeavesOutUnreadableWindowsAndRefusesWhenNoneIsLeft)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    HaarBoostingLDAObserver boost;
    boost.init(*scene.cascade);
    std::vector<DetectionWindow> windows;
    std::vector<bool> labels;
    latticeAround(scene.truth, windows, labels);
    windows.push_back(makeWindow(-30, -30, 34, 34));
    labels.push_back(true);
    boost.trainClassifier(scene.image, windows, labels);
    EXPECT_EQ(boost.trainingSets[0].size(), 121u);

    HaarLDAObserver lda;
    lda.init(*scene.cascade);
    try {
        lda.trainClassifier(scene.image, {makeWindow(-30, -30, 34, 34), makeWindow(300, 200, 364, 264)}, {true, false});
        FAIL() << "nothing readable";
    } catch (const qv_operation_error& e) {
        EXPECT_STREQ(e.what(), "Train LDA classifier with no features");
    }
}

TEST(HaarBoostingObserver, TrainingSetsFormARingOfFive)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    HaarBoostingLDAObserver boost;
    boost.init(*scene.cascade);
    // Round r trains on 100 + r windows, so each set tells its round.
    for (int round = 0; round < 12; ++round) {
        std::vector<DetectionWindow> windows;
        std::vector<bool> labels;
        latticeAround(scene.truth, windows, labels);
        windows.resize(size_t(100 + round));
        labels.resize(windows.size());
        boost.trainClassifier(scene.image, windows, labels);
        ASSERT_EQ(boost.trainingSets.size(), 5u);
    }
    EXPECT_EQ(boost.trainingRound, 12u);
    const size_t expected[5] = {110, 111, 107, 108, 109}; // rounds 10, 11, 7, 8, 9
    for (size_t s = 0; s < 5; ++s) EXPECT_EQ(boost.trainingSets[s].size(), expected[s]) << s;
    std::vector<std::vector<float>> rows;
    std::vector<bool> labels;
    boost.expandTrainData(rows, labels);
    EXPECT_EQ(rows.size(), 545u);
    for (const auto& row : rows) ASSERT_EQ(row.size(), 10u);
}

TEST(CascadeFilter, CopiesAndMovesPointAtTheirOwnObservers)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    particle_random::fixSeed(5);
    particle_random::reseed();
    auto pointsHome = [](const CascadePF& c) {
        return c.filters.size() == 2 && c.filters[0].getObserver() == &c.ldaObserver &&
               c.filters[1].getObserver() == &c.boostObserver;
    };
    QVArrayList<CascadePF> list;
    {
        CascadePF local;
        local.init(*scene.cascade);
        EXPECT_EQ(local.predict(scene.image, nullptr), 0) << "not trained yet";
        local.update(scene.image, scene.truth);
        // Enough inserts to make the vector move its elements more than once.
        for (int i = 0; i < 9; ++i) list.insert(local);
    } // the original is gone: any filter still pointing into it would be caught here
    for (const CascadePF& c : list.items) EXPECT_TRUE(pointsHome(c));

    CascadePF moved(std::move(list.items[3]));
    CascadePF assigned;
    assigned = list.items[4];
    CascadePF moveAssigned;
    moveAssigned = std::move(list.items[5]);
    for (CascadePF* c : {&moved, &assigned, &moveAssigned}) {
        EXPECT_TRUE(pointsHome(*c));
        DetectionWindow w{};
        ASSERT_EQ(c->predict(scene.image, &w), 1);
        EXPECT_GE(w.Overlap(scene.truth), 0.5f);
        EXPECT_EQ(c->filters[0].getParticles().size(), 3000u);
        EXPECT_EQ(c->filters[1].getParticles().size(), 600u);
    }
    particle_random::clearFixedSeed();
}

TEST(CascadeFilter, SeedsKeepOnlyShiftsInsideTheImage)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    struct Case {
        DetectionWindow detection;
        size_t seeds;
    };
    const Case cases[] = {
        {makeWindow(120, 80, 184, 144), 121},
        {makeWindow(2, 80, 66, 144), 8 * 11},   // dx of -2 and below leave on the left
        {makeWindow(253, 2, 317, 66), 7 * 8},   // right must stay below width - 1
    };
    for (const Case& c : cases) {
        CascadePF f;
        f.init(*scene.cascade);
        f.update(scene.image, c.detection);
        EXPECT_EQ(f.initialized, 1u);
        ASSERT_EQ(f.filters[0].getParticles().size(), c.seeds) << c.detection.left;
        EXPECT_FLOAT_EQ(f.filters[0].getWeights()[0], 1.0f / float(c.seeds));
    }
    CascadePF outside;
    outside.init(*scene.cascade);
    EXPECT_THROW(outside.update(scene.image, makeWindow(400, 300, 464, 364)), qv_operation_error);
    EXPECT_EQ(outside.initialized, 0u);
    EXPECT_EQ(outside.predict(scene.image, nullptr), 0);
}

TEST(CPFTrackerUpdate, MatchesAnyOverlapWithTheLastPredictionAndOpensTheRest)
{
    FaceScene scene;
    if (!scene.ready()) GTEST_SKIP() << devdata::missingNote();
    particle_random::fixSeed(7);
    CPFTracker t;
    t.setDetector(*scene.cascade);
    // No predict yet: every detection opens a face.
    t.update(scene.image, {scene.truth, makeWindow(20, 150, 84, 214)});
    ASSERT_EQ(t.cascades.size(), 2u);
    std::vector<DetectionWindow> predicted;
    t.predict(scene.image, &predicted);
    ASSERT_EQ(predicted.size(), 2u);
    ASSERT_EQ(t.lastPredicted.size(), 2u);

    // A sliver of overlap keeps face 0; of two detections on face 1's window
    // the larger overlap takes it and the other opens face 2.
    const DetectionWindow p0 = t.lastPredicted[0], p1 = t.lastPredicted[1];
    const DetectionWindow sliver = makeWindow(p0.right - 1, p0.bottom - 1, p0.right + 63, p0.bottom + 63);
    ASSERT_GT(sliver.Overlap(p0), 0.0f);
    ASSERT_LT(sliver.Overlap(p0), 0.3f);
    const DetectionWindow close = makeWindow(p1.left + 1, p1.top, p1.right + 1, p1.bottom);
    const DetectionWindow farther = makeWindow(p1.left + 20, p1.top, p1.right + 20, p1.bottom);
    t.update(scene.image, {farther, sliver, close});
    ASSERT_EQ(t.cascades.size(), 3u);
    EXPECT_TRUE(t.cascades.alive[0] && t.cascades.alive[1] && t.cascades.alive[2]);
    EXPECT_EQ(t.frameCounter, 2u);

    // Faces live in the tracker's own list: the front end gets no previous
    // faces from it.
    std::vector<DetectionWindow> previous;
    t.getPreviousFaces(&previous);
    EXPECT_TRUE(previous.empty());

    // No detection: every face dies, and the slots come back on the next face.
    t.update(scene.image, {});
    EXPECT_FALSE(t.cascades.alive[0] || t.cascades.alive[1] || t.cascades.alive[2]);
    t.update(scene.image, {scene.truth});
    EXPECT_EQ(t.cascades.size(), 3u);
    particle_random::clearFixedSeed();
}
