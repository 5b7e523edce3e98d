#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/Errors.h"
#include "detector/FaceDetector.h"
#include "support/FaceDetectorRig.h"
#include "tracking/CPFTracker.h"
#include "tracking/KFTracker.h"
#include "tracking/PFTracker.h"
#include "tracking/Tracker.h"

namespace {

// 160 x 120 frames: a 4 x 3 grid of 40 x 40 cells.
constexpr int kWidth = 160;
constexpr int kHeight = 120;

std::string postFilterConfig(const std::string& postfilter)
{
    return "{\"detector\":" + detectorConfig("fdtest_cascade") + ",\"postfilter\":" + postfilter + "}";
}

std::vector<FaceData> run(FaceDetector& fd, TestFrame& frame)
{
    std::vector<FaceData> faces;
    fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
    return faces;
}

// A frame with one square that the cascade accepts in the window at (x, y).
TestFrame frameWithFace(int x, int y, int size = 24, int width = kWidth, int height = kHeight)
{
    TestFrame frame(width, height);
    frame.squareForWindow(x, y, size);
    return frame;
}

bool hasRect(const FaceData& f, int left, int top, int right, int bottom)
{
    const Rect2<int32_t>& r = f.faceRect();
    return r.left == left && r.top == top && r.right == right && r.bottom == bottom;
}

int liveTracks(const Tracker* t)
{
    if (const KFTracker* kf = dynamic_cast<const KFTracker*>(t)) {
        int n = 0;
        for (bool a : kf->kfFaces.alive) n += a ? 1 : 0;
        return n;
    }
    std::vector<bool> alive = t->faces.alive;
    if (const PFTracker* pf = dynamic_cast<const PFTracker*>(t)) alive = pf->pfFaces.alive;
    if (const CPFTracker* cpf = dynamic_cast<const CPFTracker*>(t)) alive = cpf->cascades.alive;
    int n = 0;
    for (bool a : alive) n += a ? 1 : 0;
    return n;
}

bool sameCell(const DetectionWindow& w, int left, int top, int right, int bottom)
{
    return w.left == left && w.top == top && w.right == right && w.bottom == bottom;
}

} // namespace

TEST(FaceDetectorConfig, EveryFailedInitLeavesNothingHalfMade)
{
    FaceDetectorModels models;
    FaceDetector fd;
    try {
        fd.init(postFilterConfig("{\"name\":\"NO_SUCH_FILTER\",\"param\":{}}"));
        FAIL() << "init accepted an unknown post filter";
    } catch (const qv_operation_error& e) {
        EXPECT_STREQ(e.what(), "Failed to create PostFilter");
    }
    // A post filter whose model is missing, a malformed or absent description:
    // all the same failure as an unknown name.
    for (const std::string& text :
         {postFilterConfig("{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"fdtest_absent\"}}"),
          postFilterConfig("[not an object]"), "{\"detector\":" + detectorConfig("fdtest_cascade") + "}"})
        EXPECT_THROW(fd.init(text), qv_operation_error) << text;
    // Text and cascade failures pass through as they are.
    EXPECT_ANY_THROW(fd.init("not json"));
    std::string badModel = FaceDetectorModels::config();
    badModel.replace(badModel.find("fdtest_cascade"), 14, "fdtest_nothere");
    EXPECT_ANY_THROW(fd.init(badModel));
    TestFrame frame = frameWithFace(40, 40);
    EXPECT_THROW(run(fd, frame), qv_operation_error);
    EXPECT_THROW(fd.setSearchStep(0.1f, 0.1f), qv_operation_error);
}

TEST(FaceDetectorConfig, ReinitReplacesTheEnginesAndDropsTracking)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(1));
    ASSERT_NE(fd.currentTracker(), nullptr);
    fd.init(FaceDetectorModels::config());
    EXPECT_EQ(fd.currentTracker(), nullptr);
    TestFrame frame = frameWithFace(100, 60);
    EXPECT_EQ(run(fd, frame).size(), 1u);
}

TEST(FaceDetectorFrame, LargerThanImageMaxSizeIsRefusedAndLosesNothing)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config(160));
    fd.setTrackingMode(QVFaceTrackingMode(2));
    TestFrame first = frameWithFace(40, 40);
    // Let the cell with the face come round.
    for (int i = 0; i < 12 && run(fd, first).empty(); ++i) {}
    const Tracker* t = fd.currentTracker();
    ASSERT_EQ(liveTracks(t), 1);
    const uint32_t counter = t->frameCounter;
    const Eigen::MatrixXf covarianceBefore = dynamic_cast<const KFTracker*>(t)->kfFaces.items[0].covariance;

    TestFrame wide(161, 120);
    wide.squareForWindow(40, 40, 24);
    std::vector<FaceData> faces(3);
    faces[0].setFaceScore(42.0f);
    try {
        fd.detect(wide.pixels.data(), wide.width, wide.height, faces);
        FAIL() << "a frame wider than imageMaxSize was searched";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Image is larger than the maximum supported size");
    }
    EXPECT_EQ(faces.size(), 3u);
    EXPECT_EQ(faces[0].faceScore(), 42.0f);
    EXPECT_EQ(t->frameCounter, counter);
    EXPECT_TRUE(dynamic_cast<const KFTracker*>(t)->kfFaces.items[0].covariance == covarianceBefore)
        << "the refused frame must not advance the filter";
    TestFrame tall(120, 161);
    EXPECT_THROW(fd.detect(tall.pixels.data(), tall.width, tall.height, faces), qv_data_error);

    TestFrame exact = frameWithFace(40, 40, 24, 160, 120);
    EXPECT_EQ(run(fd, exact).size(), 1u) << "a side equal to imageMaxSize is accepted";
}

TEST(FaceDetectorFrame, BadFramesRaiseCleanly)
{
    FaceDetector uninitialised;
    std::vector<FaceData> faces;
    unsigned char pixel = 0;
    EXPECT_THROW(uninitialised.detect(&pixel, 1, 1, faces), qv_operation_error);

    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    EXPECT_THROW(fd.detect(nullptr, 10, 10, faces), qv_invalid_argument);
    EXPECT_THROW(fd.detect(&pixel, 0, 10, faces), qv_invalid_argument);
    EXPECT_THROW(fd.detect(&pixel, 10, -3, faces), qv_invalid_argument);
}

TEST(FaceDetectorWholeFrame, FindsEveryFaceWithRectAndScore)
{
    FaceDetectorModels models(1.5f);
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    TestFrame frame(kWidth, kHeight);
    frame.squareForWindow(10, 20, 24);
    frame.squareForWindow(100, 60, 38);
    std::vector<FaceData> faces = run(fd, frame);
    ASSERT_EQ(faces.size(), 2u);
    const bool firstIsSmall = faces[0].faceRect().left == 10;
    const FaceData& small = faces[firstIsSmall ? 0 : 1];
    const FaceData& big = faces[firstIsSmall ? 1 : 0];
    EXPECT_TRUE(hasRect(small, 10, 20, 34, 44));
    EXPECT_EQ(big.faceRect().right - big.faceRect().left, 38);
    EXPECT_NEAR(big.faceRect().left, 100, 2);
    EXPECT_FLOAT_EQ(small.faceScore(), 1.5f);
}

TEST(FaceDetectorWholeFrame, ResultListIsResizedToTheFaces)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    TestFrame frame = frameWithFace(60, 50);
    std::vector<FaceData> faces(5);
    fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
    EXPECT_EQ(faces.size(), 1u);
    TestFrame empty(kWidth, kHeight);
    fd.detect(empty.pixels.data(), empty.width, empty.height, faces);
    EXPECT_TRUE(faces.empty());
    faces.resize(2);
    TestFrame tiny(24, 24, kBright); // no window fits strictly inside
    fd.detect(tiny.pixels.data(), tiny.width, tiny.height, faces);
    EXPECT_TRUE(faces.empty());
}

TEST(FaceDetectorWholeFrame, PostFilterJudgesNewHits)
{
    {
        FaceDetectorModels models(1.0f, 2.0f); // score 1 is not above 2
        FaceDetector fd;
        fd.init(FaceDetectorModels::config());
        TestFrame frame = frameWithFace(60, 50);
        EXPECT_TRUE(run(fd, frame).empty());
    }
    {
        FaceDetectorModels models(6.0f, 100.0f); // 6 passes without a look
        FaceDetector fd;
        fd.init(FaceDetectorModels::config());
        TestFrame frame = frameWithFace(60, 50);
        EXPECT_EQ(run(fd, frame).size(), 1u);
    }
}

TEST(FaceDetectorGrid, LandscapeAndSquareFramesHaveFourColumns)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    EXPECT_TRUE(sameCell(fd.exhaustiveDetectSubRegion(160, 120), 0, 0, 40, 40)) << "cell 0 without a tracker";
    fd.setTrackingMode(QVFaceTrackingMode(1));
    EXPECT_TRUE(sameCell(fd.exhaustiveDetectSubRegion(120, 120), 0, 0, 30, 40));
    EXPECT_TRUE(sameCell(fd.exhaustiveDetectSubRegion(163, 122), 0, 0, 40, 40)) << "leftover pixels are never an origin";
}

TEST(FaceDetectorGrid, CellsRotateWithTheFrameCounterEvenWithoutFaces)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(2));
    TestFrame empty(120, 160); // portrait: 3 columns of 40, 4 rows of 40
    std::vector<DetectionWindow> cells;
    for (int k = 0; k < 13; ++k) {
        cells.push_back(fd.exhaustiveDetectSubRegion(120, 160));
        EXPECT_TRUE(run(fd, empty).empty());
    }
    EXPECT_EQ(fd.currentTracker()->frameCounter, 13u);
    EXPECT_TRUE(sameCell(cells[1], 40, 0, 80, 40));
    EXPECT_TRUE(sameCell(cells[3], 0, 40, 40, 80));
    EXPECT_TRUE(sameCell(cells[11], 80, 120, 120, 160)) << "last row and column at 11";
    EXPECT_TRUE(sameCell(cells[12], 0, 0, 40, 40)) << "and round again at 12";
}

TEST(FaceDetectorTracking, FaceEnteringACellIsFoundWhenItsCellComesRound)
{
    for (int mode : {1, 2}) {
        FaceDetectorModels models;
        FaceDetector fd;
        fd.init(FaceDetectorModels::config());
        fd.setTrackingMode(QVFaceTrackingMode(mode));
        // Origin (90, 46): column 2, row 1 of the 4 x 3 grid, so cell 6.
        TestFrame frame = frameWithFace(90, 46);
        int foundAt = -1;
        for (int k = 0; k < 12 && foundAt < 0; ++k)
            if (!run(fd, frame).empty()) foundAt = k;
        EXPECT_EQ(foundAt, 6) << "mode " << mode;
        // From then on the spread search keeps it in every frame.
        for (int k = 0; k < 14; ++k) {
            std::vector<FaceData> faces = run(fd, frame);
            ASSERT_EQ(faces.size(), 1u) << "mode " << mode << " frame " << k;
            EXPECT_TRUE(hasRect(faces[0], 90, 46, 114, 70));
        }
        EXPECT_EQ(liveTracks(fd.currentTracker()), 1);
    }
}

// The particle trackers come wired to the cascade. They keep their faces in
// lists of their own, so the spread search has no known face to follow: a
// face is reported only in the frames whose cell finds it, and its track dies
// in the next frame.
TEST(FaceDetectorTracking, ParticleTrackersAreWiredAndFollowOnlyTheCellSearch)
{
    for (int mode : {3, 4}) {
        FaceDetectorModels models;
        FaceDetector fd;
        fd.init(FaceDetectorModels::config());
        fd.setTrackingMode(QVFaceTrackingMode(mode));
        const Tracker* t = fd.currentTracker();
        ASSERT_NE(t, nullptr) << "mode " << mode;
        if (const PFTracker* pf = dynamic_cast<const PFTracker*>(t))
            EXPECT_NE(pf->estimator.detector, nullptr);
        else if (const CPFTracker* cpf = dynamic_cast<const CPFTracker*>(t))
            EXPECT_NE(cpf->detector, nullptr);
        else
            ADD_FAILURE() << "mode " << mode << " made " << t->name();

        TestFrame frame = frameWithFace(90, 46);
        int foundAt = -1;
        for (int k = 0; k < 12 && foundAt < 0; ++k)
            if (!run(fd, frame).empty()) foundAt = k;
        EXPECT_EQ(foundAt, 6) << "mode " << mode;
        EXPECT_EQ(liveTracks(fd.currentTracker()), 1) << "mode " << mode;
        EXPECT_TRUE(fd.currentTracker()->faces.items.empty()) << "the base list stays empty";
        EXPECT_TRUE(run(fd, frame).empty()) << "mode " << mode;
        EXPECT_EQ(liveTracks(fd.currentTracker()), 0) << "mode " << mode;
    }
}

TEST(FaceDetectorTracking, FaceStartingAnywhereIsFoundWithinTwelveFrames)
{
    for (int x = 2; x < kWidth - 26; x += 22)
        for (int y = 2; y < kHeight - 26; y += 14) {
            FaceDetectorModels models;
            FaceDetector fd;
            fd.init(FaceDetectorModels::config());
            fd.setTrackingMode(QVFaceTrackingMode(1));
            TestFrame frame = frameWithFace(x, y);
            bool found = false;
            for (int k = 0; k < 12 && !found; ++k) found = !run(fd, frame).empty();
            EXPECT_TRUE(found) << "face at " << x << "," << y;
        }
}

TEST(FaceDetectorTracking, MovingFaceKeepsOneTrackThatLearnsItsVelocity)
{
    for (int mode : {1, 2}) {
        FaceDetectorModels models;
        FaceDetector fd;
        fd.init(FaceDetectorModels::config());
        fd.setTrackingMode(QVFaceTrackingMode(mode));
        // Start in cell 0 so the first frame finds it; then move 4 right and 2
        // down per frame, a step of the spread pattern.
        int x = 10, y = 10;
        TestFrame start = frameWithFace(x, y);
        ASSERT_EQ(run(fd, start).size(), 1u);
        const Tracker* t = fd.currentTracker();
        for (int frameNo = 1; frameNo <= 25; ++frameNo) {
            x += 4;
            y += 2;
            TestFrame frame = frameWithFace(x, y);
            std::vector<FaceData> faces = run(fd, frame);
            ASSERT_EQ(faces.size(), 1u) << "mode " << mode << " frame " << frameNo;
            EXPECT_TRUE(hasRect(faces[0], x, y, x + 24, y + 24)) << "mode " << mode << " frame " << frameNo;
            ASSERT_EQ(liveTracks(t), 1);
        }
        EXPECT_EQ(t->frameCounter, 26u);
        if (const KFTracker* kf = dynamic_cast<const KFTracker*>(t)) {
            ASSERT_TRUE(kf->kfFaces.alive[0]);
            EXPECT_NEAR(kf->kfFaces.items[0].state[4], 4.0f, 0.2f);
            EXPECT_NEAR(kf->kfFaces.items[0].state[5], 2.0f, 0.2f);
            EXPECT_NEAR(kf->kfFaces.items[0].state[0], float(x), 1.0f);
        } else {
            EXPECT_TRUE(t->faces.alive[0]) << "the face keeps its slot";
            EXPECT_DOUBLE_EQ(t->faces.items[0].velocityX, 4.0);
            EXPECT_DOUBLE_EQ(t->faces.items[0].velocityY, 2.0);
        }
    }
}

TEST(FaceDetectorTracking, SpreadHitsAreTrustedWithoutThePostFilter)
{
    // A half-contrast square scores 1 and fails the filter (above 5) as a new
    // face; a full-contrast one scores 7 and passes. Once tracked, the face
    // stays found at half contrast, with the spread hit's score.
    FaceDetectorModels models(FaceDetectorModels::ContrastScored{}, 5.0f);
    TestFrame faint(kWidth, kHeight);
    faint.fill(10 + 4, 10 + 4, 10 + 20, 10 + 20, kHalfBright);

    FaceDetector plain;
    plain.init(FaceDetectorModels::config());
    EXPECT_TRUE(run(plain, faint).empty()) << "the filter rejects the faint square as new";

    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(2));
    TestFrame strong = frameWithFace(10, 10);
    std::vector<FaceData> faces = run(fd, strong);
    ASSERT_EQ(faces.size(), 1u);
    EXPECT_FLOAT_EQ(faces[0].faceScore(), 7.0f);
    for (int k = 1; k <= 13; ++k) {
        faces = run(fd, faint);
        ASSERT_EQ(faces.size(), 1u) << "frame " << k << " (cell 0 again at 12)";
        EXPECT_FLOAT_EQ(faces[0].faceScore(), 1.0f);
        EXPECT_TRUE(hasRect(faces[0], 10, 10, 34, 34));
    }
}

TEST(FaceDetectorTracking, VanishedFacesAndModeChangesDropTheTracks)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(1));
    TestFrame frame = frameWithFace(10, 10);
    ASSERT_EQ(run(fd, frame).size(), 1u);
    TestFrame empty(kWidth, kHeight);
    EXPECT_TRUE(run(fd, empty).empty());
    EXPECT_EQ(liveTracks(fd.currentTracker()), 0) << "dropped at once";
    EXPECT_EQ(fd.currentTracker()->frameCounter, 2u);

    fd.setTrackingMode(QVFaceTrackingMode(2));
    TestFrame elsewhere = frameWithFace(90, 46);
    for (int k = 0; k < 8; ++k) run(fd, elsewhere);
    ASSERT_EQ(liveTracks(fd.currentTracker()), 1);
    fd.setTrackingMode(QVFaceTrackingMode(2));
    ASSERT_NE(fd.currentTracker(), nullptr);
    EXPECT_EQ(fd.currentTracker()->frameCounter, 0u);
    EXPECT_EQ(liveTracks(fd.currentTracker()), 0);
    EXPECT_TRUE(run(fd, elsewhere).empty()) << "back to searching cell 0";
}

TEST(FaceDetectorTracking, ModesOutsideOneToFourMeanTrackingOff)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    for (int mode : {0, 5, -1}) {
        fd.setTrackingMode(QVFaceTrackingMode(1));
        fd.setTrackingMode(QVFaceTrackingMode(mode));
        EXPECT_EQ(fd.currentTracker(), nullptr) << "mode " << mode;
        TestFrame frame = frameWithFace(90, 46);
        EXPECT_EQ(run(fd, frame).size(), 1u) << "whole frame searched in mode " << mode;
    }
}

TEST(FaceDetectorTracking, WiderNewHitGrowsTheTrackedWindowAroundItsCentre)
{
    // A corner cascade (left and top edges only) accepts a bright block's
    // corner at every window size, so a large block gives new hits wider than
    // the tracked window, while the spread search still stops at the tracked
    // size.
    ScopedModel corner("fdtest_corner", CascadeWriter::toBytes(cornerCascade()));
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init("{\"detector\":" + detectorConfig("fdtest_corner") +
            ",\"postfilter\":{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"fdtest_ilabs\"}}}");
    fd.setTrackingMode(QVFaceTrackingMode(1));
    TestFrame small = frameWithFace(30, 30);
    TestFrame big(kWidth, kHeight);
    big.fill(34, 34, 94, 94, kBright);

    std::vector<FaceData> faces;
    for (int k = 0; k < 12; ++k) faces = run(fd, small); // frame 0 finds it in cell 0
    ASSERT_EQ(faces.size(), 1u);
    const Rect2<int32_t> tracked = faces[0].faceRect();
    const int trackedWidth = tracked.right - tracked.left;
    const int trackedHeight = tracked.bottom - tracked.top;

    faces = run(fd, big); // cell 0 again: the wide hits come in
    ASSERT_EQ(faces.size(), 1u);
    const Rect2<int32_t> grown = faces[0].faceRect();
    const int width = grown.right - grown.left;
    const int height = grown.bottom - grown.top;
    ASSERT_GT(width, trackedWidth);
    EXPECT_EQ(grown.left, tracked.left - (width - trackedWidth) / 2) << "kept around the tracked centre";
    EXPECT_EQ(grown.top, tracked.top - (height - trackedHeight) / 2);
    EXPECT_FLOAT_EQ(faces[0].faceScore(), 1.0f);
}
