#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "core/Errors.h"
#include "detector/FaceDetector.h"
#include "support/ExpectThrow.h"
#include "support/FaceDetectorRig.h"
#include "support/TrackSupport.h"
#include "tracking/CPFTracker.h"
#include "tracking/KFTracker.h"
#include "tracking/PFTracker.h"
#include "tracking/Tracker.h"

namespace {

// 160 x 120 frames: a 4 x 3 grid of 40 x 40 cells.
constexpr int kWidth = 160;
constexpr int kHeight = 120;

// A frame with one square that the cascade accepts in the window at (x, y).
TestFrame frameWithFace(int x, int y, int size = 24, int width = kWidth, int height = kHeight)
{
    TestFrame frame(width, height);
    frame.squareForWindow(x, y, size);
    return frame;
}

bool sameRect(const Rect2<int32_t>& r, int left, int top, int right, int bottom)
{
    return r.left == left && r.top == top && r.right == right && r.bottom == bottom;
}

// The models and a detector on them, tracking in `mode` (0: off).
struct Rig {
    FaceDetectorModels models;
    FaceDetector fd;
    explicit Rig(int mode = 0, float bonus = 1.0f, float passAbove = 0.0f, int imageMaxSize = 1024)
        : models(bonus, passAbove)
    {
        fd.init(FaceDetectorModels::config(imageMaxSize));
        if (mode != 0)
            fd.setTrackingMode(QVFaceTrackingMode(mode));
    }
    std::vector<FaceData> run(TestFrame& frame)
    {
        std::vector<FaceData> faces;
        fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
        return faces;
    }
    // The frame in which a face standing still in `frame` is first found, or -1.
    int framesUntilFound(TestFrame& frame)
    {
        for (int k = 0; k < 12; ++k)
            if (!run(frame).empty())
                return k;
        return -1;
    }
    int liveTracks() const
    {
        const Tracker* t = fd.currentTracker();
        std::vector<bool> alive = t->faces.alive;
        if (auto kf = dynamic_cast<const KFTracker*>(t))
            alive = kf->kfFaces.alive;
        if (auto pf = dynamic_cast<const PFTracker*>(t))
            alive = pf->pfFaces.alive;
        if (auto cpf = dynamic_cast<const CPFTracker*>(t))
            alive = cpf->cascades.alive;
        return static_cast<int>(std::count(alive.begin(), alive.end(), true));
    }
};

} // namespace

TEST(FaceDetectorConfig, EveryFailedInitLeavesNothingHalfMade)
{
    FaceDetectorModels models;
    FaceDetector fd;
    const std::string detector = "{\"detector\":" + detectorConfig("fdtest_cascade");
    expectThrowWith<qv_operation_error>(
        [&] { fd.init(detector + ",\"postfilter\":{\"name\":\"NO_SUCH_FILTER\",\"param\":{}}}"); },
        "Failed to create PostFilter");
    // A post filter whose model is missing, a malformed or absent description:
    // all the same failure as an unknown name.
    for (const std::string& text :
         {detector + ",\"postfilter\":{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"fdtest_absent\"}}}",
          detector + ",\"postfilter\":[not an object]}", detector + "}"})
        EXPECT_THROW(fd.init(text), qv_operation_error) << text;
    // Text and cascade failures pass through as they are.
    EXPECT_ANY_THROW(fd.init("not json"));
    std::string badModel = FaceDetectorModels::config();
    badModel.replace(badModel.find("fdtest_cascade"), 14, "fdtest_nothere");
    EXPECT_ANY_THROW(fd.init(badModel));
    std::vector<FaceData> faces;
    EXPECT_THROW(fd.detect(&kDark, 1, 1, faces), qv_operation_error);
    EXPECT_THROW(fd.setSearchStep(0.1f, 0.1f), qv_operation_error);
}

TEST(FaceDetectorFrame, BadOrTooLargeFramesAreRefusedAndLoseNothing)
{
    Rig rig(2, 1.0f, 0.0f, 160);
    TestFrame first = frameWithFace(40, 40);
    ASSERT_GE(rig.framesUntilFound(first), 0);
    const auto* kf = dynamic_cast<const KFTracker*>(rig.fd.currentTracker());
    ASSERT_EQ(rig.liveTracks(), 1);
    const uint32_t counter = kf->frameCounter;
    const Eigen::MatrixXf covarianceBefore = kf->kfFaces.items[0].covariance;

    TestFrame wide = frameWithFace(40, 40, 24, 161, 120), tall(120, 161);
    std::vector<FaceData> faces(3);
    faces[0].setFaceScore(42.0f);
    expectThrowWith<qv_data_error>([&] { rig.fd.detect(wide.pixels.data(), 161, 120, faces); },
                                   "Image is larger than the maximum supported size");
    EXPECT_THROW(rig.fd.detect(tall.pixels.data(), 120, 161, faces), qv_data_error);
    EXPECT_THROW(rig.fd.detect(nullptr, 10, 10, faces), qv_invalid_argument);
    EXPECT_THROW(rig.fd.detect(&kDark, 0, 10, faces), qv_invalid_argument);
    EXPECT_THROW(rig.fd.detect(&kDark, 10, -3, faces), qv_invalid_argument);
    EXPECT_EQ(faces.size(), 3u);
    EXPECT_EQ(faces[0].faceScore(), 42.0f);
    EXPECT_EQ(kf->frameCounter, counter);
    EXPECT_TRUE(kf->kfFaces.items[0].covariance == covarianceBefore) << "the refused frame must not advance the filter";
    EXPECT_EQ(rig.run(first).size(), 1u) << "a side equal to imageMaxSize is accepted";
}

TEST(FaceDetectorWholeFrame, FindsEveryFaceWithRectAndScoreAndResizesTheList)
{
    Rig rig(0, 1.5f);
    TestFrame frame = frameWithFace(10, 20);
    frame.squareForWindow(100, 60, 38);
    std::vector<FaceData> faces(5);
    rig.fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
    ASSERT_EQ(faces.size(), 2u);
    if (faces[0].faceRect().left != 10)
        std::swap(faces[0], faces[1]);
    EXPECT_TRUE(sameRect(faces[0].faceRect(), 10, 20, 34, 44));
    EXPECT_FLOAT_EQ(faces[0].faceScore(), 1.5f);
    EXPECT_EQ(faces[1].faceRect().right - faces[1].faceRect().left, 38);
    EXPECT_NEAR(faces[1].faceRect().left, 100, 2);
    TestFrame empty(kWidth, kHeight), tiny(24, 24, kBright); // no window fits strictly inside the tiny one
    EXPECT_TRUE(rig.run(empty).empty());
    EXPECT_TRUE(rig.run(tiny).empty());
}

TEST(FaceDetectorWholeFrame, PostFilterJudgesNewHits)
{
    // {cascade score, pass above, faces}: 6 or more passes without a look.
    using Case = std::tuple<float, float, size_t>;
    for (auto const& [bonus, passAbove, found] : {Case{1, 0, 1}, Case{1, 2, 0}, Case{6, 100, 1}}) {
        Rig rig(0, bonus, passAbove);
        TestFrame frame = frameWithFace(60, 50);
        EXPECT_EQ(rig.run(frame).size(), found) << bonus << " against " << passAbove;
    }
}

TEST(FaceDetectorGrid, CellsRotateWithTheFrameCounterEvenWithoutFaces)
{
    Rig rig;
    auto cell = [&](int w, int h) { return rig.fd.exhaustiveDetectSubRegion(w, h); };
    EXPECT_TRUE(sameWindow(cell(160, 120), makeWindow(0, 0, 40, 40))) << "cell 0 without a tracker";
    rig.fd.setTrackingMode(QVFaceTrackingMode(2));
    EXPECT_TRUE(sameWindow(cell(120, 120), makeWindow(0, 0, 30, 40))) << "square frames have four columns";
    EXPECT_TRUE(sameWindow(cell(163, 122), makeWindow(0, 0, 40, 40))) << "leftover pixels are never an origin";
    TestFrame empty(120, 160); // portrait: 3 columns of 40, 4 rows of 40
    std::vector<DetectionWindow> cells;
    for (int k = 0; k < 13; ++k) {
        cells.push_back(cell(120, 160));
        EXPECT_TRUE(rig.run(empty).empty());
    }
    EXPECT_EQ(rig.fd.currentTracker()->frameCounter, 13u);
    EXPECT_TRUE(sameWindow(cells[1], makeWindow(40, 0, 80, 40)));
    EXPECT_TRUE(sameWindow(cells[3], makeWindow(0, 40, 40, 80)));
    EXPECT_TRUE(sameWindow(cells[11], makeWindow(80, 120, 120, 160))) << "last row and column at 11";
    EXPECT_TRUE(sameWindow(cells[12], makeWindow(0, 0, 40, 40))) << "and round again at 12";
}

// Every tracker finds a face when its cell comes round. The Kalman and plain
// trackers then keep it through the spread search; the particle trackers keep
// their faces in lists of their own, so the spread search has no known face to
// follow and the track dies in the next frame.
TEST(FaceDetectorTracking, FaceEnteringACellIsFoundWhenItsCellComesRound)
{
    for (int mode : {1, 2, 3, 4}) {
        SCOPED_TRACE(mode);
        Rig rig(mode);
        // Origin (90, 46): column 2, row 1 of the 4 x 3 grid, so cell 6.
        TestFrame frame = frameWithFace(90, 46);
        EXPECT_EQ(rig.framesUntilFound(frame), 6);
        EXPECT_EQ(rig.liveTracks(), 1);
        if (mode >= 3) {
            EXPECT_TRUE(rig.fd.currentTracker()->faces.items.empty()) << "the base list stays empty";
            EXPECT_TRUE(rig.run(frame).empty());
            EXPECT_EQ(rig.liveTracks(), 0);
            continue;
        }
        for (int k = 0; k < 14; ++k) {
            std::vector<FaceData> faces = rig.run(frame);
            ASSERT_EQ(faces.size(), 1u) << "frame " << k;
            EXPECT_TRUE(sameRect(faces[0].faceRect(), 90, 46, 114, 70));
        }
        EXPECT_EQ(rig.liveTracks(), 1);
    }
}

TEST(FaceDetectorTracking, SpreadHitsAreTrustedWithoutThePostFilter)
{
    // A half-contrast square scores 1 and fails the filter (above 5) as a new
    // face; a full-contrast one scores 7 and passes. Once tracked, the face
    // stays found at half contrast, with the spread hit's score.
    FaceDetectorModels models(FaceDetectorModels::ContrastScored{}, 5.0f);
    TestFrame faint(kWidth, kHeight), strong = frameWithFace(10, 10);
    faint.fill(10 + 4, 10 + 4, 10 + 20, 10 + 20, kHalfBright);
    std::vector<FaceData> faces;
    FaceDetector plain, fd;
    plain.init(FaceDetectorModels::config());
    plain.detect(faint.pixels.data(), faint.width, faint.height, faces);
    EXPECT_TRUE(faces.empty()) << "the filter rejects the faint square as new";

    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(2));
    fd.detect(strong.pixels.data(), strong.width, strong.height, faces);
    ASSERT_EQ(faces.size(), 1u);
    EXPECT_FLOAT_EQ(faces[0].faceScore(), 7.0f);
    for (int k = 1; k <= 13; ++k) {
        fd.detect(faint.pixels.data(), faint.width, faint.height, faces);
        ASSERT_EQ(faces.size(), 1u) << "frame " << k << " (cell 0 again at 12)";
        EXPECT_FLOAT_EQ(faces[0].faceScore(), 1.0f);
        EXPECT_TRUE(sameRect(faces[0].faceRect(), 10, 10, 34, 34));
    }
}

TEST(FaceDetectorTracking, VanishedFacesModeChangesAndInitDropTheTracks)
{
    Rig rig(1);
    TestFrame frame = frameWithFace(10, 10), empty(kWidth, kHeight), elsewhere = frameWithFace(90, 46);
    ASSERT_EQ(rig.run(frame).size(), 1u);
    EXPECT_TRUE(rig.run(empty).empty());
    EXPECT_EQ(rig.liveTracks(), 0) << "dropped at once";

    rig.fd.setTrackingMode(QVFaceTrackingMode(2));
    for (int k = 0; k < 8; ++k)
        rig.run(elsewhere);
    ASSERT_EQ(rig.liveTracks(), 1);
    rig.fd.setTrackingMode(QVFaceTrackingMode(2));
    EXPECT_EQ(rig.fd.currentTracker()->frameCounter, 0u);
    EXPECT_EQ(rig.liveTracks(), 0);
    EXPECT_TRUE(rig.run(elsewhere).empty()) << "back to searching cell 0";

    rig.fd.init(FaceDetectorModels::config());
    EXPECT_EQ(rig.fd.currentTracker(), nullptr) << "a new init drops tracking";
    // Modes outside 1..4 mean tracking off: the whole frame is searched.
    for (int mode : {0, 5, -1}) {
        rig.fd.setTrackingMode(QVFaceTrackingMode(1));
        rig.fd.setTrackingMode(QVFaceTrackingMode(mode));
        EXPECT_EQ(rig.fd.currentTracker(), nullptr) << "mode " << mode;
        EXPECT_EQ(rig.run(elsewhere).size(), 1u) << "mode " << mode;
    }
}
