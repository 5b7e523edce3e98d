#include "faceparts/FacePartLocator.h"

#include <algorithm>
#include <cmath>
#include <exception>
#include <map>

#include "core/Errors.h"
#include "core/Json.h"
#include "core/Point2.h"
#include "faceparts/NeuralClassifier.h"
#include "image/Image.h"

namespace {

// The patch is scaled so that its pixels sum to this, whatever the lighting.
const float kPatchSum = 211676.0f;
const int kMaxOutputs = 10;

}  // namespace

const char* const FacePartLocator::kPartNames[5] = {"leftEye", "rightEye", "nose", "leftMouthCorner",
                                                    "rightMouthCorner"};

FacePartLocator::FacePartLocator() = default;
FacePartLocator::~FacePartLocator() = default;

void FacePartLocator::init(const std::string& parameters) {
    const std::map<std::string, std::string> items = parseJsonObject(parameters);
    std::string path;
    jsonObjectItemToNamedValue(items, "neuralNetModelPath", path);
    Init(path.c_str());
}

void FacePartLocator::Init(const char* path) {
    classifier_.reset();
    // A patch of the old net must not feed the new one.
    ready_ = 0;
    patch_.reset();
    netInput_.reset();
    patchWidth_ = patchHeight_ = 0;
    classifier_.reset(new NeuralClassifier());
    classifier_->loadFromPath(path);
    preparePatch();
}

void FacePartLocator::preparePatch() {
    uint32_t n = 0;
    if (classifier_) classifier_->inputCount(&n);
    const int side = static_cast<int>(std::sqrt(static_cast<double>(n)));
    if (side <= 0 || static_cast<int>(n / side) != side) return;
    std::unique_ptr<IMAGE> patch(new IMAGE(side, side, side, nullptr));
    if (patch->data == nullptr) return;  // no memory: stays unusable
    patch_ = std::move(patch);
    patchWidth_ = side;
    patchHeight_ = side;
    ready_ = 1;
    netInput_.reset(new float[size_t(side) * side]());
}

void FacePartLocator::locateParts(const unsigned char* image, int width, int height, std::vector<FaceData>& faces) {
    if (faces.empty()) return;
    if (image == nullptr || width <= 0 || height <= 0)
        throw qv_invalid_argument("Invalid argument image in FacePartLocator::locateParts");
    const uint32_t n = static_cast<uint32_t>(patchWidth_) * static_cast<uint32_t>(patchHeight_);
    for (FaceData& face : faces) {
        const Rect2<int32_t>& r = face.faceRect();
        if (r.right > width || r.bottom > height) return;
        // Outside pixels would be read before the frame: such faces get no parts.
        if (r.left < 0 || r.top < 0 || r.right <= r.left || r.bottom <= r.top) continue;
        const int32_t w = r.right - r.left;
        const int32_t h = r.bottom - r.top;
        try {
            if (ready_) {
                IMAGE faceImage(w, h, width, const_cast<unsigned char*>(image) + int64_t(r.top) * width + r.left);
                const float sum = resizeImage(faceImage, *patch_);
                const float gain = kPatchSum / sum;
                for (int y = 0; y < patchHeight_; ++y) {
                    const unsigned char* row = patch_->data + int64_t(y) * patch_->stride;
                    for (int x = 0; x < patchWidth_; ++x)
                        netInput_[size_t(y) * patchWidth_ + x] = static_cast<float>(row[x]) * gain;
                }
            }
            uint32_t best = 0;
            float values[kMaxOutputs];
            if (!classifier_) throw qv_operation_error("Neural Net is not constructed");
            classifier_->Classify(netInput_.get(), n, &best, values, kMaxOutputs);
            uint32_t outputs = 0;
            classifier_->outputCount(&outputs);
            const uint32_t m = std::min<uint32_t>(outputs, kMaxOutputs);
            for (uint32_t i = 0; i < m; ++i) values[i] = values[i] * 10000.0f / 65535.0f;
            for (uint32_t k = 0; k + 1 < m; k += 2) {
                const float x = static_cast<float>(r.left) + static_cast<float>(w) * values[k];
                const float y = static_cast<float>(r.top) + static_cast<float>(h) * values[k + 1];
                face.setLandmark(kPartNames[k / 2], Point2<float>(x, y));
            }
        } catch (const std::exception&) {
            for (const char* name : kPartNames) face.setLandmark(name, Point2<float>(-1.0f, -1.0f));
            throw qv_operation_error("Failed to detect face parts");
        }
    }
}

namespace {

// v + 0.5 truncated toward zero; saturating, so that wild points can't overflow.
inline int32_t RoundHalfUp(float v) { return SaturatingTrunc(static_cast<double>(v + 0.5f)); }

void SquareAround(float cx, float cy, float side, FaceSquare* square) {
    square->left = RoundHalfUp(cx - side / 2);
    square->top = RoundHalfUp(cy - side / 2);
    square->right = RoundHalfUp(side + static_cast<float>(square->left));
    square->bottom = RoundHalfUp(side + static_cast<float>(square->top));
}

// Side of the square around c from the spread of the eyes and mouth corners.
float SpreadSide(const float (*p)[2], float cx, float cy) {
    float spread = 0.0f;
    for (int i : {0, 1, 3, 4}) {
        const float dx = p[i][0] - cx, dy = p[i][1] - cy;
        spread += dx * dx + dy * dy;
    }
    return static_cast<float>(std::sqrt(static_cast<double>(spread)) * static_cast<double>(1.62f));
}

}  // namespace

void MapFPts2GTRc(FacePointSet* points, FaceSquare* square, bool reorder) {
    if (points == nullptr || square == nullptr) return;
    float (*p)[2] = points->points;
    const int32_t layout = points->layout;
    if (reorder && (layout == 0 || layout == 1)) {
        const float ex = (p[0][0] + p[1][0]) * 0.5f, ey = (p[0][1] + p[1][1]) * 0.5f;
        const float mx = (p[3][0] + p[4][0]) * 0.5f, my = (p[3][1] + p[4][1]) * 0.5f;
        const float dx = ex - mx, dy = ey - my;
        if ((p[1][0] - p[0][0]) * dy - (p[1][1] - p[0][1]) * dx > 0.0f) {
            std::swap(p[0][0], p[1][0]);
            std::swap(p[0][1], p[1][1]);
        }
        if ((p[4][0] - p[3][0]) * dy - (p[4][1] - p[3][1]) * dx > 0.0f) {
            std::swap(p[3][0], p[4][0]);
            std::swap(p[3][1], p[4][1]);
        }
    }
    if (layout == 0 || layout == 1) {
        float cx = (p[0][0] + p[1][0] + p[3][0] + p[4][0]) * 0.25f;
        float cy = (p[0][1] + p[1][1] + p[3][1] + p[4][1]) * 0.25f;
        const float side = SpreadSide(p, cx, cy);
        if (layout == 1) {
            const float ux = (p[0][0] - p[1][0]) * 0.5f, uy = (p[0][1] - p[1][1]) * 0.5f;
            const float d0x = p[2][0] - p[0][0], d0y = p[2][1] - p[0][1];
            const float d1x = p[2][0] - p[1][0], d1y = p[2][1] - p[1][1];
            if (d0x * d0x + d0y * d0y >= d1x * d1x + d1y * d1y) {
                cx += ux;
                cy += uy;
            } else {
                cx -= ux;
                cy -= uy;
            }
        }
        SquareAround(cx, cy, side, square);
        square->angle = -std::atan2(p[0][1] - p[1][1], p[1][0] - p[0][0]);
    } else if (layout == 2) {
        const float mx = (p[0][0] + p[3][0]) * 0.5f, my = (p[0][1] + p[3][1]) * 0.5f;
        const float vx = p[0][0] - mx, vy = p[0][1] - my;
        const float side =
            static_cast<float>(std::sqrt(static_cast<double>(vx * vx + vy * vy)) * static_cast<double>(4.05f));
        const float t = vy * (p[2][0] - mx) - vx * (p[2][1] - my);
        if (t > 0.0f) SquareAround(mx - vy, my + vx, side, square);
        else SquareAround(mx + vy, my - vx, side, square);
        square->angle = std::atan2(p[0][0] - p[3][0], p[3][1] - p[0][1]);
    } else {
        const float dx = p[0][0] - p[1][0], dy = p[0][1] - p[1][1];
        const float side = static_cast<float>(std::sqrt(static_cast<double>(dx * dx + dy * dy)));
        SquareAround((p[0][0] + p[1][0]) * 0.5f, (p[0][1] + p[1][1]) * 0.5f, side, square);
        square->angle = std::atan2(p[0][0] - p[1][0], p[1][1] - p[0][1]);
    }
}
