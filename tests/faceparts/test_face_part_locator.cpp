// The face part locator: which faces it reads, and points placed in each
// face rectangle.

#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "NetWriter.h"
#include "core/Errors.h"
#include "faceparts/FacePartLocator.h"
#include "faceparts/NeuralNet.h"
#include "support/ExpectThrow.h"
#include "support/ScopedModel.h"

using netwriter::NetDescription;

namespace {

// A landmark net on a side x side patch whose outputs are its biases (all
// weights 0), so the points do not depend on the pixels.
NetDescription landmarkNet(int side, int outputs, std::vector<int32_t> biases) {
    const uint16_t n = uint16_t(side * side);
    NetDescription d = netwriter::denseNet({n, uint16_t(outputs)}, {0, TXF_LINEAR}, {1, 1}, 1, 0, true, 10);
    biases.resize(outputs, 0);
    d.biases[1] = biases;
    return d;
}

// Relative position r of the rectangle as the net's output (r * 65535).
int32_t rel(double r) { return int32_t(std::lround(r * 65535)); }

const std::vector<int32_t> kShape = {rel(0.3), rel(0.4), rel(0.7), rel(0.4), rel(0.5), rel(0.6),
                                     rel(0.35), rel(0.8), rel(0.65), rel(0.8)};

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
    // Locates parts on a width x height frame of one grey level.
    void locate(std::vector<FaceData>& faces, int width = 100, int height = 100, unsigned char level = 100) {
        frame_.assign(size_t(width) * height, level);
        locator_.locateParts(frame_.data(), width, height, faces);
    }
    std::unique_ptr<ScopedModel> model_;
    FacePartLocator locator_;
    std::vector<unsigned char> frame_;
};

}  // namespace

TEST_F(LocatorTest, NonSquareInputCountLeavesTheLocatorUnusable) {
    load(landmarkNet(8, 10, kShape));  // the earlier patch must not feed the new net
    EXPECT_EQ(locator_.patchWidth(), 8);
    load(netwriter::denseNet({1000, 10}, {0, TXF_LINEAR}, {1, 1}, 1, 0, true, 10));
    EXPECT_FALSE(locator_.ready());
    std::vector<FaceData> faces = {faceAt(10, 10, 60, 60)};
    expectThrowWith<qv_operation_error>([&] { locate(faces); }, "Failed to detect face parts");
    for (const char* name : FacePartLocator::kPartNames) EXPECT_EQ(faces[0].landmark(name), Point2<float>(-1, -1));
}

TEST(LocatorInit, BuiltInModelLoadsAndMissingOrBadModelsAreRefused) {
    FacePartLocator locator;
    EXPECT_THROW(locator.init("{}"), qv_data_error);  // tries the empty path
    EXPECT_THROW(locator.init("{\"neuralNetModelPath\":\"fpnosuchnet\"}"), qv_data_error);
    EXPECT_THROW(locator.init("not json"), std::exception);
    EXPECT_NO_THROW(locator.init("{\"neuralNetModelPath\":\"mdnb\"}"));
    EXPECT_TRUE(locator.ready());
}

TEST_F(LocatorTest, PlacesTheOutputsRelativeToEachRectangle) {
    load(landmarkNet(8, 10, kShape));
    std::vector<FaceData> faces = {faceAt(0, 0, 100, 100), faceAt(120, 20, 200, 120)};
    locate(faces, 200, 120);
    // outputs/10000 * 10000/65535 of the rectangle, in single precision.
    auto at = [](float left, float size, int32_t out) { return left + size * (float(out) / 10000.0f * 10000.0f / 65535.0f); };
    EXPECT_FLOAT_EQ(faces[0].landmark("leftEye").x, at(0, 100, kShape[0]));
    EXPECT_FLOAT_EQ(faces[0].landmark("rightMouthCorner").y, at(0, 100, kShape[9]));
    EXPECT_FLOAT_EQ(faces[1].landmark("nose").x, at(120, 80, kShape[4]));
    EXPECT_FLOAT_EQ(faces[1].landmark("nose").y, at(20, 100, kShape[5]));  // 80 wide, 100 high
    EXPECT_NEAR(faces[1].landmark("rightEye").x, 120 + 0.7 * 80, 0.01);
}

TEST_F(LocatorTest, RectanglesOutsideTheFrameAreSkippedAndOnePastTheEdgeStopsTheCall) {
    load(landmarkNet(8, 10, kShape));
    // Starting outside or empty: skipped; touching the right edge: processed.
    std::vector<FaceData> faces = {faceAt(-10, 0, 40, 50), faceAt(0, -1, 40, 50), faceAt(20, 20, 20, 40),
                                   faceAt(50, 0, 100, 50), faceAt(0, 60, 40, 101)};
    EXPECT_NO_THROW(locate(faces));
    const size_t found[] = {0, 0, 0, 5, 0};
    for (size_t i = 0; i < faces.size(); ++i) EXPECT_EQ(faces[i].landmarks().size(), found[i]) << i;
    // One past the right edge ends the call: the face after it is never reached.
    std::vector<FaceData> past = {faceAt(51, 0, 101, 50), faceAt(0, 0, 50, 50)};
    EXPECT_NO_THROW(locate(past));
    EXPECT_EQ(past[0].landmarks().size() + past[1].landmarks().size(), 0u);
    // No faces need no frame; a face does.
    std::vector<FaceData> none, one = {faceAt(0, 0, 10, 10)};
    EXPECT_NO_THROW(locator_.locateParts(nullptr, 0, 0, none));
    EXPECT_THROW(locator_.locateParts(nullptr, 10, 10, one), qv_invalid_argument);
}

TEST_F(LocatorTest, EightOutputsFillFourPartsAndTwelveGiveTen) {
    std::vector<int32_t> twelve = kShape;
    twelve.insert(twelve.end(), {rel(0.9), rel(0.9)});
    for (int outputs : {8, 12}) {
        load(landmarkNet(8, outputs, twelve));
        std::vector<FaceData> faces = {faceAt(0, 0, 100, 100)};
        faces[0].setLandmark("rightMouthCorner", Point2<float>(7, 7));
        locate(faces);
        EXPECT_NEAR(faces[0].landmark("leftMouthCorner").y, 80.0f, 0.01) << outputs;
        EXPECT_NEAR(faces[0].landmark("rightMouthCorner").x, outputs == 8 ? 7.0f : 65.0f, 0.01) << outputs;
    }
}

TEST_F(LocatorTest, AFailingNetMarksTheFaceAndStops) {
    // An all-dark face gives a patch sum of 0, and the run still works.
    load(landmarkNet(8, 10, kShape));
    std::vector<FaceData> dark = {faceAt(0, 0, 50, 50)};
    EXPECT_NO_THROW(locate(dark, 100, 100, 0));
    // A net of the old layout loads but cannot run.
    NetDescription old = landmarkNet(8, 10, kShape);
    old.version = 2;
    load(old);
    ASSERT_TRUE(locator_.ready());
    std::vector<FaceData> two = {faceAt(0, 0, 50, 50), faceAt(50, 50, 100, 100)};
    EXPECT_THROW(locate(two, 100, 100, 0), qv_operation_error);
    EXPECT_EQ(two[0].landmark("nose"), Point2<float>(-1, -1));
    EXPECT_EQ(two[1].landmarks().size(), 0u);
}

