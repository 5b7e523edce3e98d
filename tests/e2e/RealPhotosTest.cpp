// Real photos from the development data through the public C API, as a host
// calls it: every expected face must be found, in place and size, and the
// extra boxes stay within what each photo is known to give. Skips when the
// data cache has not been fetched.

#include <algorithm>
#include <cmath>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "ImageIo.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"

namespace {

constexpr int kBlockInts = 17;
constexpr int kMaxFaces = 100;
constexpr double kPi = 3.14159265358979;

struct Box {
    int left, top, right, bottom;
    double size() const { return 0.5 * ((right - left) + (bottom - top)); }
    double centreX() const { return 0.5 * (left + right); }
    double centreY() const { return 0.5 * (top + bottom); }
};

struct Photo {
    const char* name;
    std::vector<Box> faces;
    int allowedExtras;
};

// Expected boxes are the teacher's (dlib's HOG detector) moved into the
// framing of our cascade, which takes in more forehead: centre 9% of the size
// higher, 12% larger (medians over the 31 faces both find in the photos).
// Extras: audrey.jpg keeps one box low on the left after the post filter.
const std::vector<Photo> kPhotos = {
    {"tracking_faces.jpg", {{40, 83, 141, 184}, {216, 124, 337, 245}, {448, 52, 550, 154}}, 0},
    {"tracking_faces_test.png", {{40, 83, 141, 184}, {216, 124, 337, 245}, {448, 62, 550, 164}}, 0},
    {"SeanConnery.jpg", {{88, 75, 263, 249}}, 0},
    {"cage.jpg", {{44, 122, 403, 482}}, 0},
    {"audrey.jpg", {{125, 161, 425, 461}}, 1},
    {"clmtrackr01.jpg", {{71, 58, 246, 232}}, 0},
    {"franck_02045.jpg", {{274, 161, 574, 461}}, 0},
    {"ironman.jpg", {}, 0},
};

// Centre within 15% of the expected size on each axis, size within 25%.
bool fits(const Box& expected, const Box& found) {
    const double s = expected.size();
    return std::fabs(found.centreX() - expected.centreX()) <= 0.15 * s &&
           std::fabs(found.centreY() - expected.centreY()) <= 0.15 * s &&
           std::fabs(found.size() / s - 1.0) <= 0.25;
}

// For each expected face the index of the block that found it, or -1; a block
// serves one face at most.
std::vector<int> matchFaces(const std::vector<Box>& expected, const std::vector<Box>& found) {
    std::vector<int> match(expected.size(), -1);
    std::vector<bool> used(found.size(), false);
    for (size_t e = 0; e < expected.size(); ++e)
        for (size_t k = 0; k < found.size(); ++k)
            if (!used[k] && fits(expected[e], found[k])) {
                used[k] = true;
                match[e] = static_cast<int>(k);
                break;
            }
    return match;
}

struct Detection {
    std::vector<int> blocks;
    std::vector<Box> boxes;
};

// The blocks and boxes found in a gray frame (the frame's pixels are a copy:
// the engine may work in them).
Detection detectGray(qcli::Image gray) {
    std::vector<unsigned char> frame(gray.pixels.begin(), gray.pixels.end());
    Detection d;
    d.blocks.assign(static_cast<size_t>(kMaxFaces) * kBlockInts, 0);
    const int n = quorin_detect(frame.data(), gray.width, gray.height, d.blocks.data(), kMaxFaces, 0);
    for (int k = 0; k < std::clamp(n, 0, kMaxFaces); ++k) {
        const int* b = &d.blocks[static_cast<size_t>(k) * kBlockInts];
        d.boxes.push_back({b[5], b[3], b[6], b[4]});
    }
    return d;
}

Detection detectPhoto(const std::string& path) { return detectGray(qcli::toGray(qcli::loadImage(path))); }

class RealPhotos : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        quorin_init();
        quorin_setDetectionMode(2);
    }
    static void TearDownTestSuite() { quorin_release(); }
    void SetUp() override {
        if (!devdata::exists(devdata::photo(kPhotos[0].name)))
            GTEST_SKIP() << devdata::missingNote();
    }
};

TEST_F(RealPhotos, FindEveryExpectedFaceWithFewExtras) {
    for (const Photo& photo : kPhotos) {
        SCOPED_TRACE(photo.name);
        const Detection d = detectPhoto(devdata::photo(photo.name));
        const std::vector<int> match = matchFaces(photo.faces, d.boxes);
        for (size_t e = 0; e < match.size(); ++e) {
            const Box& x = photo.faces[e];
            EXPECT_GE(match[e], 0) << "face " << e << " (" << x.left << "," << x.top << "," << x.right << ","
                                   << x.bottom << ") not found";
        }
        const auto found = std::count_if(match.begin(), match.end(), [](int m) { return m >= 0; });
        EXPECT_LE(static_cast<int>(d.boxes.size()) - static_cast<int>(found), photo.allowedExtras) << "extra boxes";
    }
}

TEST_F(RealPhotos, RepeatedCallsGiveTheSameFaces) {
    // The thorough mode keeps no state between frames: the same photo twice,
    // with another in between, must give identical blocks.
    const std::string path = devdata::photo(kPhotos[0].name);
    const Detection first = detectPhoto(path);
    detectPhoto(devdata::photo(kPhotos[2].name));
    const Detection again = detectPhoto(path);
    EXPECT_EQ(first.blocks, again.blocks);
    EXPECT_FALSE(first.boxes.empty());
}

struct Points {
    const char* photo;
    int face;           // index into that photo's expected faces
    int xy[5][2];       // leftEye, rightEye, nose, leftMouthCorner, rightMouthCorner
};

// The teacher's five points (dlib's 68-point model reduced: eye contour means,
// nose tip, outer mouth corners; "left" on the image's left).
const std::vector<Points> kPoints = {
    {"tracking_faces.jpg", 0, {{73, 121}, {112, 121}, {96, 135}, {76, 163}, {109, 163}}},
    {"tracking_faces.jpg", 1, {{252, 173}, {294, 169}, {274, 198}, {259, 217}, {295, 212}}},
    {"tracking_faces.jpg", 2, {{482, 95}, {520, 97}, {500, 117}, {482, 135}, {515, 136}}},
    {"SeanConnery.jpg", 0, {{146, 148}, {211, 141}, {181, 184}, {155, 218}, {215, 213}}},
    {"cage.jpg", 0, {{168, 267}, {297, 252}, {238, 354}, {194, 428}, {304, 414}}},
    {"clmtrackr01.jpg", 0, {{130, 132}, {188, 123}, {166, 157}, {132, 193}, {194, 185}}},
    {"franck_02045.jpg", 0, {{363, 276}, {475, 260}, {431, 325}, {387, 414}, {477, 402}}},
};

TEST_F(RealPhotos, LandmarksLieNearTheTeacherPoints) {
    // Block offsets of the five points, in the teacher's order.
    const int offsets[5] = {7, 9, 15, 11, 13};
    double sum = 0.0;
    for (const Points& p : kPoints) {
        SCOPED_TRACE(p.photo);
        const auto photo = std::find_if(kPhotos.begin(), kPhotos.end(),
                                        [&](const Photo& x) { return std::string(x.name) == p.photo; });
        ASSERT_NE(photo, kPhotos.end());
        const Detection d = detectPhoto(devdata::photo(p.photo));
        const int k = matchFaces(photo->faces, d.boxes)[static_cast<size_t>(p.face)];
        ASSERT_GE(k, 0);
        const int* b = &d.blocks[static_cast<size_t>(k) * kBlockInts];
        const double iod = std::hypot(p.xy[1][0] - p.xy[0][0], p.xy[1][1] - p.xy[0][1]);
        double err = 0.0;
        for (int i = 0; i < 5; ++i) {
            const double e = std::hypot(b[offsets[i]] - p.xy[i][0], b[offsets[i] + 1] - p.xy[i][1]) / iod;
            EXPECT_LT(e, 0.35) << "point " << i;
            err += e / 5.0;
        }
        // The learnt mean shape is off by 0.19 on these faces; a net that looks
        // at the face stays well under it.
        EXPECT_LT(err, 0.15);
        sum += err;
    }
    RecordProperty("mean_normalised_point_error", std::to_string(sum / kPoints.size()));
    EXPECT_LT(sum / kPoints.size(), 0.10);
}

// A face turned 30 degrees either way in the plane is still found, with a roll
// of the turn's sign and within 5 degrees of it (the cascade's turned branches
// and the roll-trained net): the photo is turned about the face centre
// (nearest neighbour) and the teacher's eyes are turned with it.
TEST_F(RealPhotos, RollFollowsAFaceTurnedInThePlane) {
    const qcli::Image gray = qcli::toGray(qcli::loadImage(devdata::photo("SeanConnery.jpg")));
    const Points& p = kPoints[3];
    const double cx = (p.xy[0][0] + p.xy[1][0]) / 2.0, cy = (p.xy[0][1] + p.xy[3][1]) / 2.0;
    const double eyeLine = std::atan2(p.xy[1][1] - p.xy[0][1], p.xy[1][0] - p.xy[0][0]) * 180.0 / kPi;
    for (double degrees : {-30.0, 30.0}) {
        SCOPED_TRACE(degrees);
        const double a = degrees * kPi / 180.0, c = std::cos(a), s = std::sin(a);
        qcli::Image turned = gray;
        for (int y = 0; y < gray.height; ++y)
            for (int x = 0; x < gray.width; ++x) {
                // Source of target pixel (x, y) under a turn by +a (image axes, y down).
                const int sx = static_cast<int>(std::lround(cx + c * (x - cx) + s * (y - cy)));
                const int sy = static_cast<int>(std::lround(cy - s * (x - cx) + c * (y - cy)));
                const bool in = sx >= 0 && sy >= 0 && sx < gray.width && sy < gray.height;
                turned.pixels[static_cast<size_t>(y) * gray.width + x] =
                    in ? gray.pixels[static_cast<size_t>(sy) * gray.width + sx] : 128;
            }
        // The teacher's eye line turns with the photo.
        const double expected = eyeLine + degrees;
        const Detection d = detectGray(turned);
        ASSERT_FALSE(d.boxes.empty());
        EXPECT_GT(d.blocks[0] * expected, 0.0) << "roll " << d.blocks[0] << ", expected about " << expected;
        EXPECT_NEAR(d.blocks[0], expected, 5.0);
    }
}

// Heads turned sideways, of people the models never saw (the head-pose
// photos' report people, read from the shared data where it is present): each
// is found where its labelled box (brows to chin) is, with the five points
// inside the reported box and a roll near 0, since the head is upright.
TEST_F(RealPhotos, FindsHeadsTurnedSideways) {
    const std::string dir = std::string(QUORIN_TEST_SOURCE_DIR) + "/../shared/data/faces/pointing04/images/";
    if (!devdata::exists(dir))
        GTEST_SKIP() << "head-pose photos not found in " << dir;
    struct Case {
        const char* file;
        Box face; // left, top, right, bottom of the labelled box
    };
    const Case cases[] = {{"person09140+0-90.jpg", {218, 105, 286, 215}},
                          {"person09250+0+60.jpg", {72, 94, 142, 194}},
                          {"person12141+0-75.jpg", {224, 65, 303, 170}}};
    for (const Case& c : cases) {
        SCOPED_TRACE(c.file);
        const Detection d = detectPhoto(dir + c.file);
        int hit = -1;
        for (size_t k = 0; k < d.boxes.size() && hit < 0; ++k)
            if (d.boxes[k].centreX() > c.face.left && d.boxes[k].centreX() < c.face.right &&
                d.boxes[k].centreY() > c.face.top && d.boxes[k].centreY() < c.face.bottom)
                hit = static_cast<int>(k);
        ASSERT_GE(hit, 0) << d.boxes.size() << " boxes, none on the face";
        const int* b = &d.blocks[static_cast<size_t>(hit) * kBlockInts];
        EXPECT_LE(std::abs(b[0]), 15) << "roll";
        for (int p = 0; p < 5; ++p) {
            EXPECT_GE(b[7 + 2 * p], b[5]) << "point " << p;
            EXPECT_LE(b[7 + 2 * p], b[6]) << "point " << p;
            EXPECT_GE(b[8 + 2 * p], b[3]) << "point " << p;
            EXPECT_LE(b[8 + 2 * p], b[4]) << "point " << p;
        }
    }
}

}  // namespace
