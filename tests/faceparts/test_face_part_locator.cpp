#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "NetWriter.h"
#include "core/Errors.h"
#include "faceparts/FacePartLocator.h"
#include "faceparts/NeuralNet.h"
#include "support/ScopedModel.h"

using netwriter::NetDescription;
using netwriter::Span;

namespace {

// A linear landmark net on a side x side patch. Output o is bias[o] plus the
// inputs listed for it (weight 1 each); version 10 without means leaves the
// inputs as the locator gives them.
NetDescription landmarkNet(int side, int outputs, const std::vector<int32_t>& biases,
                           const std::vector<std::vector<int>>& taps = {}) {
    const uint16_t n = uint16_t(side * side);
    NetDescription d = netwriter::denseNet({n, uint16_t(outputs)}, {0, TXF_LINEAR}, {1, 1}, 1, 0, true, 10);
    d.biases[1] = biases;
    d.biases[1].resize(outputs, 0);
    for (int o = 0; o < int(taps.size()); ++o)
        for (int input : taps[o]) d.spans[1][input][0].weights[o] = 1;
    return d;
}

// Relative position r of the rectangle as the net's output (r * 65535).
int32_t rel(double r) { return int32_t(std::lround(r * 65535)); }

struct Frame {
    int width, height;
    std::vector<unsigned char> pixels;
    Frame(int w, int h, unsigned char v = 100) : width(w), height(h), pixels(size_t(w) * h, v) {}
};

FaceData faceAt(int left, int top, int right, int bottom) {
    FaceData f;
    f.setFaceRect(Rect2<int32_t>(left, top, right, bottom));
    return f;
}

class LocatorTest : public testing::Test {
protected:
    void load(const NetDescription& d) {
        model_.reset();  // unregister the old one first: the name is shared
        model_.reset(new ScopedModel("fplocnet", netwriter::writeContainer({netwriter::writeBlob(d)})));
        locator_.init("{\"neuralNetModelPath\":\"fplocnet\"}");
    }
    std::unique_ptr<ScopedModel> model_;
    FacePartLocator locator_;
};

const std::vector<int32_t> kShape = {rel(0.3), rel(0.4), rel(0.7), rel(0.4), rel(0.5), rel(0.6),
                                     rel(0.35), rel(0.8), rel(0.65), rel(0.8)};

}  // namespace

// ---- initialisation ---------------------------------------------------------------------

TEST_F(LocatorTest, PatchSideComesFromAPerfectSquareInputCount) {
    load(landmarkNet(32, 10, kShape));
    EXPECT_TRUE(locator_.ready());
    EXPECT_EQ(locator_.patchWidth(), 32);
    EXPECT_EQ(locator_.patchHeight(), 32);
}

TEST_F(LocatorTest, NonSquareInputCountLeavesTheLocatorUnusable) {
    load(landmarkNet(8, 10, kShape));  // the earlier patch must not feed the new net
    NetDescription d = netwriter::denseNet({1000, 10}, {0, TXF_LINEAR}, {1, 1}, 1, 0, true, 10);
    load(d);
    EXPECT_FALSE(locator_.ready());
    Frame frame(100, 100);
    std::vector<FaceData> faces = {faceAt(10, 10, 60, 60)};
    try {
        locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces);
        FAIL() << "expected a failure";
    } catch (const qv_operation_error& e) {
        EXPECT_STREQ(e.what(), "Failed to detect face parts");
    }
    for (const char* name : FacePartLocator::kPartNames) EXPECT_EQ(faces[0].landmark(name), Point2<float>(-1, -1));
}

TEST(LocatorInit, MissingPathKeyTriesTheEmptyPathAndBadTextIsRefused) {
    FacePartLocator locator;
    EXPECT_THROW(locator.init("{}"), qv_data_error);
    EXPECT_THROW(locator.init("{\"neuralNetModelPath\":\"fpnosuchnet\"}"), qv_data_error);
    EXPECT_THROW(locator.init("not json"), std::exception);
}

TEST(LocatorInit, BuiltInModelLoads) {
    FacePartLocator locator;
    EXPECT_NO_THROW(locator.init("{\"neuralNetModelPath\":\"mdnb\"}"));
    EXPECT_TRUE(locator.ready());
}

// ---- locating -----------------------------------------------------------------------------

TEST_F(LocatorTest, PlacesTheOutputsRelativeToEachRectangle) {
    load(landmarkNet(8, 10, kShape));
    Frame frame(200, 120);
    std::vector<FaceData> faces = {faceAt(0, 0, 100, 100), faceAt(120, 20, 200, 120)};
    locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces);
    // outputs/10000 * 10000/65535 of the rectangle, in single precision.
    auto at = [](float left, float size, int32_t out) { return left + size * (float(out) / 10000.0f * 10000.0f / 65535.0f); };
    EXPECT_FLOAT_EQ(faces[0].landmark("leftEye").x, at(0, 100, kShape[0]));
    EXPECT_FLOAT_EQ(faces[0].landmark("rightMouthCorner").y, at(0, 100, kShape[9]));
    EXPECT_FLOAT_EQ(faces[1].landmark("nose").x, at(120, 80, kShape[4]));
    EXPECT_FLOAT_EQ(faces[1].landmark("nose").y, at(20, 100, kShape[5]));
    EXPECT_NEAR(faces[1].landmark("rightEye").x, 120 + 0.7 * 80, 0.01);
}

TEST_F(LocatorTest, BrightnessIsNormalisedAway) {
    // Output 0 sums all inputs: for a flat patch every input is 211676 / n.
    std::vector<int> all(64);
    for (int i = 0; i < 64; ++i) all[i] = i;
    load(landmarkNet(8, 10, {}, {all}));
    for (unsigned char level : {20, 90, 250}) {
        Frame frame(64, 64, level);
        std::vector<FaceData> faces = {faceAt(0, 0, 64, 64)};
        locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces);
        const float expected = 64.0f * (64 * (211676 / 64)) / 65535.0f;
        EXPECT_NEAR(faces[0].landmark("leftEye").x, expected, 64.0f * 64 / 65535.0f) << int(level);
    }
}

TEST_F(LocatorTest, SamplesTheRectangleByNearestNeighbour) {
    // Output 2k reads patch column k of row 0; the face's right half is bright.
    std::vector<std::vector<int>> taps(10);
    for (int k = 0; k < 4; ++k) taps[2 * k] = {2 * k};  // columns 0, 2, 4, 6
    load(landmarkNet(8, 10, {}, taps));
    Frame frame(100, 50, 0);
    // Face 30..70 wide: columns 30+5c; bright from x = 50 on (patch columns 4..7).
    for (int y = 0; y < 50; ++y)
        for (int x = 50; x < 100; ++x) frame.pixels[size_t(y) * 100 + x] = 200;
    std::vector<FaceData> faces = {faceAt(30, 5, 70, 45)};
    locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces);
    EXPECT_FLOAT_EQ(faces[0].landmark("leftEye").x, 30.0f);   // column 0: dark
    EXPECT_FLOAT_EQ(faces[0].landmark("rightEye").x, 30.0f);  // column 2: dark
    EXPECT_GT(faces[0].landmark("nose").x, 30.0f);            // column 4: bright
    EXPECT_EQ(faces[0].landmark("nose").x, faces[0].landmark("leftMouthCorner").x);
}

TEST_F(LocatorTest, AFaceTouchingTheRightEdgeIsProcessedOnePastStopsTheCall) {
    load(landmarkNet(8, 10, kShape));
    Frame frame(100, 100);
    std::vector<FaceData> faces = {faceAt(50, 0, 100, 50), faceAt(51, 0, 101, 50), faceAt(0, 0, 50, 50)};
    EXPECT_NO_THROW(locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces));
    EXPECT_EQ(faces[0].landmarks().size(), 5u);
    EXPECT_EQ(faces[1].landmarks().size(), 0u);
    EXPECT_EQ(faces[2].landmarks().size(), 0u);  // never reached
    std::vector<FaceData> low = {faceAt(0, 60, 40, 101)};
    EXPECT_NO_THROW(locator_.locateParts(frame.pixels.data(), frame.width, frame.height, low));
    EXPECT_EQ(low[0].landmarks().size(), 0u);
}

TEST_F(LocatorTest, RectanglesStartingOutsideOrEmptyAreSkipped) {
    load(landmarkNet(8, 10, kShape));
    Frame frame(100, 100);
    std::vector<FaceData> faces = {faceAt(-10, 0, 40, 50), faceAt(0, -1, 40, 50), faceAt(20, 20, 20, 40),
                                   faceAt(10, 10, 60, 60)};
    EXPECT_NO_THROW(locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces));
    EXPECT_EQ(faces[0].landmarks().size(), 0u);
    EXPECT_EQ(faces[1].landmarks().size(), 0u);
    EXPECT_EQ(faces[2].landmarks().size(), 0u);
    EXPECT_EQ(faces[3].landmarks().size(), 5u);
}

TEST_F(LocatorTest, EightOutputsFillFourPartsAndTwelveGiveTen) {
    load(landmarkNet(8, 8, kShape));
    Frame frame(100, 100);
    std::vector<FaceData> faces = {faceAt(0, 0, 100, 100)};
    faces[0].setLandmark("rightMouthCorner", Point2<float>(7, 7));
    locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces);
    EXPECT_NEAR(faces[0].landmark("leftMouthCorner").y, 80.0f, 0.01);
    EXPECT_EQ(faces[0].landmark("rightMouthCorner"), Point2<float>(7, 7));

    std::vector<int32_t> twelve = kShape;
    twelve.push_back(rel(0.9));
    twelve.push_back(rel(0.9));
    load(landmarkNet(8, 12, twelve));
    std::vector<FaceData> more = {faceAt(0, 0, 100, 100)};
    locator_.locateParts(frame.pixels.data(), frame.width, frame.height, more);
    EXPECT_EQ(more[0].landmarks().size(), 5u);
    EXPECT_NEAR(more[0].landmark("rightMouthCorner").x, 65.0f, 0.01);
}

TEST_F(LocatorTest, AFailingNetMarksTheFaceAndKeepsEarlierOnes) {
    // An all-dark face gives a patch sum of 0; the run itself still works, so
    // the failure here comes from a net that can't run (old layout).
    load(landmarkNet(8, 10, kShape));
    Frame frame(100, 100, 0);
    std::vector<FaceData> faces = {faceAt(0, 0, 50, 50)};
    EXPECT_NO_THROW(locator_.locateParts(frame.pixels.data(), frame.width, frame.height, faces));

    NetDescription old = landmarkNet(8, 10, kShape);
    old.version = 2;
    load(old);
    ASSERT_TRUE(locator_.ready());
    std::vector<FaceData> two = {faceAt(0, 0, 50, 50), faceAt(50, 50, 100, 100)};
    EXPECT_THROW(locator_.locateParts(frame.pixels.data(), frame.width, frame.height, two), qv_operation_error);
    EXPECT_EQ(two[0].landmark("nose"), Point2<float>(-1, -1));
    EXPECT_EQ(two[1].landmarks().size(), 0u);
}

TEST_F(LocatorTest, NoFacesNeedNoFrame) {
    load(landmarkNet(8, 10, kShape));
    std::vector<FaceData> none;
    EXPECT_NO_THROW(locator_.locateParts(nullptr, 0, 0, none));
    std::vector<FaceData> one = {faceAt(0, 0, 10, 10)};
    EXPECT_THROW(locator_.locateParts(nullptr, 10, 10, one), qv_invalid_argument);
}

// ---- points to square --------------------------------------------------------------------

namespace {
FacePointSet pointSet(int layout, std::vector<std::pair<float, float>> p) {
    FacePointSet s{};
    s.layout = layout;
    for (int i = 0; i < 5; ++i) {
        s.points[i][0] = p[i].first;
        s.points[i][1] = p[i].second;
    }
    return s;
}
}  // namespace

TEST(PointsToSquare, FrontalSquareSitsOnTheMeanOfEyesAndMouth) {
    FacePointSet s = pointSet(0, {{40, 50}, {60, 50}, {50, 60}, {42, 70}, {58, 70}});
    FaceSquare q{};
    MapFPts2GTRc(&s, &q, false);
    // c = (50, 60); spread sqrt(728) * 1.62 = 43.71.
    EXPECT_EQ(q.left, 28);
    EXPECT_EQ(q.top, 38);
    EXPECT_EQ(q.right, 72);
    EXPECT_EQ(q.bottom, 82);
    EXPECT_FLOAT_EQ(q.angle, 0.0f);
}

TEST(PointsToSquare, RollFollowsTheEyeLine) {
    const float t = std::tan(float(M_PI) / 6);
    FacePointSet s = pointSet(0, {{0, 0}, {10, 10 * t}, {3, 10}, {-3, 15}, {8, 20}});
    FaceSquare q{};
    MapFPts2GTRc(&s, &q, false);
    EXPECT_NEAR(q.angle, M_PI / 6, 1e-5);
}

TEST(PointsToSquare, ReorderRestoresHandednessForFrontalAndTurnedOnly) {
    // Eyes and mouth corners given the other way round.
    const std::vector<std::pair<float, float>> swapped = {{60, 50}, {40, 50}, {50, 60}, {58, 70}, {42, 70}};
    FacePointSet s = pointSet(0, swapped);
    FaceSquare q{};
    MapFPts2GTRc(&s, &q, true);
    EXPECT_EQ(s.points[0][0], 40);
    EXPECT_EQ(s.points[3][0], 42);
    EXPECT_FLOAT_EQ(q.angle, 0.0f);
    FacePointSet same = pointSet(0, swapped);
    MapFPts2GTRc(&same, &q, false);
    EXPECT_EQ(same.points[0][0], 60);
    EXPECT_NEAR(std::fabs(q.angle), M_PI, 1e-6);
    for (int layout : {2, 3}) {
        FacePointSet p = pointSet(layout, swapped);
        MapFPts2GTRc(&p, &q, true);
        EXPECT_EQ(p.points[0][0], 60) << layout;
    }
}

TEST(PointsToSquare, TurnedFaceShiftsTheCentreAwayFromTheNose) {
    // Nose near the right eye: the centre moves by half the eye vector toward the left eye.
    FacePointSet s = pointSet(1, {{40, 50}, {60, 50}, {58, 60}, {42, 70}, {58, 70}});
    FaceSquare q{};
    MapFPts2GTRc(&s, &q, false);
    FacePointSet f = pointSet(0, {{40, 50}, {60, 50}, {58, 60}, {42, 70}, {58, 70}});
    FaceSquare r{};
    MapFPts2GTRc(&f, &r, false);
    EXPECT_EQ(q.left, r.left - 10);
    EXPECT_EQ(q.right, r.right - 10);
    EXPECT_EQ(q.top, r.top);
}

TEST(PointsToSquare, ProfileAndTwoPointForms) {
    // Profile: eye (50,40), mouth corner (50,60); nose to the right.
    FacePointSet p = pointSet(2, {{50, 40}, {0, 0}, {60, 50}, {50, 60}, {0, 0}});
    FaceSquare q{};
    MapFPts2GTRc(&p, &q, false);
    // m = (50,50), v = (0,-10), side 40.5; t = -100 is not above 0, so the
    // centre is (m.x + v.y, m.y - v.x) = (40, 50): away from the nose.
    EXPECT_EQ(q.left, 20);
    EXPECT_EQ(q.top, 30);
    EXPECT_EQ(q.right, 61);
    EXPECT_EQ(q.bottom, 71);
    EXPECT_NEAR(q.angle, std::atan2(0.0, 20.0), 1e-6);
    FacePointSet two = pointSet(7, {{40, 50}, {60, 50}, {0, 0}, {0, 0}, {0, 0}});
    MapFPts2GTRc(&two, &q, false);
    EXPECT_EQ(q.left, 40);
    EXPECT_EQ(q.top, 40);
    EXPECT_EQ(q.right, 60);
    EXPECT_EQ(q.bottom, 60);
    EXPECT_NEAR(q.angle, std::atan2(-20.0, 0.0), 1e-6);
}

TEST(PointsToSquare, WildPointsNeverOverflow) {
    FacePointSet s = pointSet(0, {{1e30f, 0}, {-1e30f, 0}, {0, 0}, {NAN, 0}, {0, INFINITY}});
    FaceSquare q{};
    MapFPts2GTRc(&s, &q, true);
    MapFPts2GTRc(nullptr, &q, true);
    SUCCEED();
}
