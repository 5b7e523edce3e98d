#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <tuple>
#include <vector>

#include "core/Errors.h"
#include "engine/FaceDetector.h"
#include "support/ExpectThrow.h"
#include "support/FaceDetectorRig.h"
#include "support/TrackSupport.h"
#include "tracking/KFTracker.h"
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
        auto kf = dynamic_cast<const KFTracker*>(t);
        const std::vector<bool>& alive = kf ? kf->kfFaces.alive : t->faces.alive;
        return static_cast<int>(std::count(alive.begin(), alive.end(), true));
    }
};

} // namespace

// Failed inits (unknown filter, missing model, bad text) are left to FuzzConfig.
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

TEST(FaceDetectorWholeFrame, PostFilterJudgesNewHitsAndTheListHoldsJustTheFaces)
{
    // {cascade score, pass above, faces}: 6 or more passes without a look.
    using Case = std::tuple<float, float, size_t>;
    for (auto const& [bonus, passAbove, found] : {Case{1, 0, 1}, Case{1, 2, 0}, Case{6, 100, 1}}) {
        Rig rig(0, bonus, passAbove);
        TestFrame frame = frameWithFace(60, 50);
        std::vector<FaceData> faces(5);
        rig.fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
        ASSERT_EQ(faces.size(), found) << bonus << " against " << passAbove;
        if (found == 1) {
            EXPECT_TRUE(sameRect(faces[0].faceRect(), 60, 50, 84, 74));
            EXPECT_FLOAT_EQ(faces[0].faceScore(), bonus);
        }
    }
    Rig rig;
    TestFrame empty(kWidth, kHeight), tiny(24, 24, kBright); // no window fits strictly inside the tiny one
    EXPECT_TRUE(rig.run(empty).empty());
    EXPECT_TRUE(rig.run(tiny).empty());
}

TEST(FaceDetectorGrid, CellsRotateWithTheFrameCounterEvenWithoutFaces)
{
    Rig rig;
    auto cell = [&](int w, int h) { return rig.fd.exhaustiveDetectSubRegion(w, h); };
    EXPECT_TRUE(sameWindow(cell(160, 120), makeWindow(0, 0, 40, 40))) << "cell 0 without a tracker";
    rig.fd.setTrackingMode(QVFaceTrackingMode(2));
    EXPECT_TRUE(sameWindow(cell(120, 120), makeWindow(0, 0, 30, 40))) << "square frames have four columns";
    EXPECT_TRUE(sameWindow(cell(163, 122), makeWindow(0, 0, 40, 40))) << "leftover pixels are never an origin";
    // Portrait 120 x 160: 3 columns and 4 rows of 40, in row order, round again after the last.
    TestFrame empty(120, 160);
    for (int k = 0; k < 13; ++k) {
        const int n = k % 12, x = 40 * (n % 3), y = 40 * (n / 3);
        EXPECT_TRUE(sameWindow(cell(120, 160), makeWindow(x, y, x + 40, y + 40))) << "frame " << k;
        EXPECT_TRUE(rig.run(empty).empty());
    }
}

TEST(FaceDetectorTracking, FaceEnteringACellIsFoundWhenItsCellComesRoundAndThenKept)
{
    for (int mode : {1, 2}) {
        SCOPED_TRACE(mode);
        Rig rig(mode);
        // Origin (90, 46): column 2, row 1 of the 4 x 3 grid, so cell 6.
        TestFrame frame = frameWithFace(90, 46);
        EXPECT_EQ(rig.framesUntilFound(frame), 6);
        for (int k = 0; k < 14; ++k) {
            std::vector<FaceData> faces = rig.run(frame);
            ASSERT_EQ(faces.size(), 1u) << "frame " << k;
            EXPECT_TRUE(sameRect(faces[0].faceRect(), 90, 46, 114, 70));
        }
        EXPECT_EQ(rig.liveTracks(), 1);
        rig.fd.init(FaceDetectorModels::config());
        EXPECT_EQ(rig.fd.currentTracker(), nullptr) << "a new init drops tracking";
    }
}
