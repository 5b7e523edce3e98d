#include "api/Session.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

#include "api/ApiErrors.h"
#include "api/FrameOps.h"
#include "core/Errors.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"

namespace {

// Long side of the work frame, by detection mode.
constexpr float kInputSizes[3] = {240.0f, 320.0f, 640.0f};

// Hold of the orientation after a successful search, in frames.
constexpr uint32_t kOrientationHoldFrames = 5;

struct ModeSetting {
    float stepX;
    float stepY;
    QVFaceTrackingMode tracking;
};
constexpr ModeSetting kModes[3] = {
    {0.15f, 0.15f, QV_TRACKING_NONE},
    {0.15f, 0.15f, QV_TRACKING_KF},
    {0.1f, 0.1f, QV_TRACKING_NONE},
};

// The host's arguments are checked before anything is touched, so that a bad
// call changes no session state. Frames above INT32_MAX bytes are refused
// because every size inside is a 32-bit int.
std::size_t checkedFrameBytes(const unsigned char* image, int width, int height, const int* results,
                              int maxFaces) {
    if (image == nullptr) throw qv_invalid_argument("quorin: frame pointer is null");
    if (width <= 0 || height <= 0) throw qv_invalid_argument("quorin: frame width and height must be positive");
    const int64_t bytes = static_cast<int64_t>(width) * height;
    if (bytes > std::numeric_limits<int32_t>::max()) throw qv_invalid_argument("quorin: frame too large");
    if (results == nullptr && maxFaces != 0) throw qv_invalid_argument("quorin: result pointer is null");
    return static_cast<std::size_t>(bytes);
}

// Writes one face as a block in host coordinates, mixed with `old` by `a`.
void writeBlock(int32_t* block, const ReportedFace& face, float a, const int32_t* old, float scaleX, float scaleY) {
    const Rect2<int32_t>& r = face.rect;
    const Point2<float>& leftEye = face.point(ReportedFace::kLeftEye);
    const Point2<float>& rightEye = face.point(ReportedFace::kRightEye);
    const Point2<float>& nose = face.point(ReportedFace::kNose);
    const Point2<float>& leftMouth = face.point(ReportedFace::kLeftMouthCorner);
    const Point2<float>& rightMouth = face.point(ReportedFace::kRightMouthCorner);

    auto mix = [&](int index, float value, float scale) {
        const float previous = old != nullptr ? static_cast<float>(old[index]) : 0.0f;
        block[index] = truncateToInt(((1.0f - a) * value + a * previous) * scale);
    };
    mix(3, static_cast<float>(r.top), scaleY);
    mix(4, static_cast<float>(r.bottom), scaleY);
    mix(5, static_cast<float>(r.left), scaleX);
    mix(6, static_cast<float>(r.right), scaleX);
    mix(7, leftEye.x, scaleX);
    mix(8, leftEye.y, scaleY);
    mix(9, rightEye.x, scaleX);
    mix(10, rightEye.y, scaleY);
    mix(11, leftMouth.x, scaleX);
    mix(12, leftMouth.y, scaleY);
    mix(13, rightMouth.x, scaleX);
    mix(14, rightMouth.y, scaleY);
    mix(15, nose.x, scaleX);
    mix(16, nose.y, scaleY);

    const double dx = static_cast<double>(block[9]) - block[7];
    const double dy = static_cast<double>(block[10]) - block[8];
    block[0] = static_cast<int32_t>(std::atan2(dy, dx) * 180.0 / 3.14159265);
}

// Size of the host frame after the turn, as the results are scaled to it:
// only exactly 90 and 270 swap.
void hostFrameSize(int width, int height, int rotation, int32_t& W, int32_t& H) {
    W = width;
    H = height;
    if (rotation == 90 || rotation == 270) std::swap(W, H);
}

int32_t mapToUnitSpace(int32_t v, int32_t size) {
    const int64_t mapped = static_cast<int64_t>(2000) * v / size - 1000;
    return static_cast<int32_t>(static_cast<uint32_t>(static_cast<uint64_t>(mapped)));
}

int32_t negated(int32_t v) { return static_cast<int32_t>(0u - static_cast<uint32_t>(v)); }

// The -1000..1000 mapping of n blocks, turned back to the unturned frame.
void mapToHostAxes(int* results, int n, int width, int height, int rotation) {
    int32_t W, H;
    hostFrameSize(width, height, rotation, W, H);
    for (int k = 0; k < n; ++k) {
        int32_t* block = results + kResultInts * k;
        for (int i = 3; i <= 16; ++i) {
            const bool horizontal = i == 5 || i == 6 || i == 7 || i == 9 || i == 11 || i == 13 || i == 15;
            block[i] = mapToUnitSpace(block[i], horizontal ? W : H);
        }
        const int32_t T = block[3], B = block[4], L = block[5], R = block[6];
        switch (rotation % 360) {
            case 180: block[3] = negated(B); block[4] = negated(T); block[5] = negated(R); block[6] = negated(L); break;
            case 270: block[3] = L; block[4] = R; block[5] = negated(B); block[6] = negated(T); break;
            case 90: block[3] = negated(R); block[4] = negated(L); block[5] = T; block[6] = B; break;
            default: break;
        }
        for (int i = 7; i <= 15; i += 2) rotatePoint(block + i, rotation);
    }
}

}  // namespace

DetectionSession& processSession() {
    // Never destroyed: a host thread that still calls while the process exits
    // must not find the lock gone.
    static DetectionSession* const session = new DetectionSession();
    return *session;
}

void DetectionSession::init() {
    std::lock_guard<std::mutex> guard(lock_);
    // A second init without release drops the old session.
    pipeline_.reset();
    frameBuffer_.reset();
    orientationFrame_.reset();
    orientationFrameBytes_ = 0;
    // The session is open from here on: a failed init leaves it open without
    // buffers, refusing every frame.
    pipeline_.reset(new FaceDetectionPipeline());
    {
        FaceModelPathsHandle handle(nullptr);
        translatedToApiError(kApiInitError, [&] { pipeline_->init(pathsOf(handle)); });
    }
    frameBuffer_.reset(new unsigned char[kFrameBufferBytes]);
    orientationFrame_.reset(new unsigned char[kOrientationFrameBytes]);
    orientationFrameBytes_ = kOrientationFrameBytes;
    detectionMode_ = 0;
    faceHistory_.fill(0);
    historyPresent_.fill(0);
    orientationHold_ = 0;
    lastFrameHeight_ = -1;
    lastFrameWidth_ = -1;
    orientation_ = -1;
    // The stored mode is 0, so this takes effect: every session starts in
    // mode 2 (search step 0.1, no tracker).
    changeMode(2);
}

void DetectionSession::release() {
    std::lock_guard<std::mutex> guard(lock_);
    // The mode and the orientation stay until the next init.
    pipeline_.reset();
    frameBuffer_.reset();
    orientationFrame_.reset();
    orientationFrameBytes_ = 0;
}

void DetectionSession::setDetectionMode(unsigned int mode) {
    std::lock_guard<std::mutex> guard(lock_);
    changeMode(mode);
}

void DetectionSession::changeMode(unsigned int mode) {
    if (mode == static_cast<unsigned int>(detectionMode_)) return;
    if (mode <= 2) {
        if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
        const ModeSetting& setting = kModes[mode];
        translatedToApiError(kApiSetSearchStepError, [&] { pipeline_->setSearchStep(setting.stepX, setting.stepY); });
        translatedToApiError(kApiSetModeError, [&] { pipeline_->setTrackingMode(setting.tracking); });
        detectionMode_ = static_cast<int32_t>(mode);
    }
    forgetHistory();
}

void DetectionSession::forgetHistory() {
    historyPresent_.fill(0);
    lastFrameHeight_ = -1;
    lastFrameWidth_ = -1;
}

// After a failed init the pipeline exists but the buffers don't.
void DetectionSession::requireBuffers() const {
    if (frameBuffer_ == nullptr) throw ApiError(kApiNotInitialized);
}

void DetectionSession::reserveOrientationFrame(std::size_t bytes) {
    if (bytes <= orientationFrameBytes_) return;
    // The old copy stays if the larger one can't be had.
    orientationFrame_.reset(new unsigned char[bytes]);
    orientationFrameBytes_ = bytes;
}

int DetectionSession::detect(unsigned char* image, int width, int height, int* results, int maxFaces,
                             int rotation, bool scaled) {
    std::lock_guard<std::mutex> guard(lock_);
    return detectFrame(image, width, height, results, maxFaces, rotation, scaled);
}

int DetectionSession::detectFrame(unsigned char* image, int width, int height, int* results, int maxFaces,
                                  int rotation, bool scaled) {
    const int n = detectPixels(image, width, height, results, maxFaces, rotation);
    if (scaled && n > 0) mapToHostAxes(results, n, width, height, rotation);
    return n;
}

int DetectionSession::detect360Tracking(unsigned char* image, int width, int height, int* results, int maxFaces,
                                        bool scaled, int* orientation) {
    std::lock_guard<std::mutex> guard(lock_);
    int result = 0;
    if (pipeline_ != nullptr) {
        const std::size_t bytes = checkedFrameBytes(image, width, height, results, maxFaces);
        requireBuffers();
        if (orientation_ == -1) {
            reserveOrientationFrame(bytes);
            changeMode(0);
            for (orientation_ = 0;; orientation_ += 90) {
                // A fresh copy for every attempt: the pipeline may write the
                // turned frame over the memory it is given.
                std::memcpy(orientationFrame_.get(), image, bytes);
                result = detectFrame(orientationFrame_.get(), width, height, results, maxFaces, orientation_, scaled);
                if (result != 0) {
                    orientationHold_ = kOrientationHoldFrames;
                    break;
                }
                if (orientation_ + 90 > 359) {
                    orientation_ = -1;
                    break;
                }
            }
        } else {
            changeMode(1);
            result = detectFrame(image, width, height, results, maxFaces, orientation_, scaled);
            if (orientationHold_ != 0)
                --orientationHold_;
            else if (result == 0)
                orientation_ = -1;
        }
    }
    if (orientation != nullptr) *orientation = orientation_;
    return result;
}

int DetectionSession::detect360High(unsigned char* image, int width, int height, int* results, int maxFaces,
                                    bool scaled) {
    std::lock_guard<std::mutex> guard(lock_);
    if (pipeline_ == nullptr) return 0;
    checkedFrameBytes(image, width, height, results, maxFaces);
    requireBuffers();
    changeMode(2);
    if (orientation_ == -1) orientation_ = 0;
    int result = 0;
    for (int attempt = 0; attempt < 4; ++attempt) {
        result = detectFrame(image, width, height, results, maxFaces, orientation_, scaled);
        if (result != 0) return result;
        orientation_ = (orientation_ + 90) % 360;
    }
    orientation_ = -1;
    return result;
}

SessionSnapshot DetectionSession::snapshot() {
    std::lock_guard<std::mutex> guard(lock_);
    SessionSnapshot s{};
    s.open = pipeline_ != nullptr;
    s.buffersAllocated = frameBuffer_ != nullptr;
    s.detectionMode = detectionMode_;
    s.orientation = orientation_;
    s.orientationHold = orientationHold_;
    s.lastFrameWidth = lastFrameWidth_;
    s.lastFrameHeight = lastFrameHeight_;
    s.historyPresentCount = 0;
    for (unsigned char present : historyPresent_) s.historyPresentCount += present != 0;
    s.orientationFrameBytes = orientationFrameBytes_;
    return s;
}

// Blend weight of a new rectangle against the slot's old block. The gate that leads here never opens (see detectPixels), so this
// always yields 0; it stays so that the behaviour is the designed one.
float DetectionSession::blendWeight(bool gateOpen, int32_t slot, const Rect2<int32_t>& r,
                                    const int32_t*& old) const {
    old = nullptr;
    if (!gateOpen || historyPresent_[slot] == 0) return 0.0f;
    old = faceHistory_.data() + slot * kResultInts;
    const int64_t top = std::max<int64_t>(r.top, old[3]);
    const int64_t bottom = std::min<int64_t>(r.bottom, old[4]);
    const int64_t left = std::max<int64_t>(r.left, old[5]);
    const int64_t right = std::min<int64_t>(r.right, old[6]);
    if (bottom - top <= 0 || right - left <= 0) return 0.0f;
    const float overlap = static_cast<float>((bottom - top) * (right - left));
    const float areaNew = static_cast<float>((static_cast<int64_t>(r.bottom) - r.top) *
                                             (static_cast<int64_t>(r.right) - r.left));
    const float areaOld = static_cast<float>((static_cast<int64_t>(old[4]) - old[3]) *
                                             (static_cast<int64_t>(old[6]) - old[5]));
    return overlap > 0.3f * std::min(areaNew, areaOld) ? 0.4f : 0.0f;
}

// The engines on the work frame; the first 100 faces become reported records.
void DetectionSession::collectFaces(const unsigned char* work, int32_t w, int32_t h) {
    translatedToApiError(kApiDetectError, [&] {
        pipeline_->detectFaces(work, w, h, found_);
        const std::size_t count = std::min<std::size_t>(found_.size(), kMaxFacesPerFrame);
        for (std::size_t i = 0; i < count; ++i) reported_[i] = reportFace(found_[i]);
    });
}

int DetectionSession::detectPixels(unsigned char* image, int width, int height, int* results, int maxFaces,
                                   int rotation) {
    if (pipeline_ == nullptr) return 0;
    checkedFrameBytes(image, width, height, results, maxFaces);
    requireBuffers();

    const int32_t target = static_cast<int32_t>(kInputSizes[detectionMode_]);
    const int64_t longSide = static_cast<int64_t>(width) + height - std::min(width, height);
    const float scale = static_cast<float>(target) / static_cast<float>(longSide);

    int32_t w = width;
    int32_t h = height;
    unsigned char* const buffer = frameBuffer_.get();
    const unsigned char* work = image;
    if (scale < 1.0f) {
        w = static_cast<int32_t>(scale * static_cast<float>(width));
        h = static_cast<int32_t>(scale * static_cast<float>(height));
        // So elongated that a side shrinks to nothing: no face can be in it.
        // The buffer test can't fail for the three targets; it keeps the
        // resize inside its memory whatever the table holds.
        if (w < 1 || h < 1 || static_cast<std::size_t>(w) * static_cast<std::size_t>(h) > kFrameBufferBytes ||
            !resizeNearest(image, width, height, buffer, w, h)) {
            forgetHistory();
            return 0;
        }
        work = buffer;
        // The turned frame goes back into the host's memory, which is at least
        // as large as the shrunk one.
        if (rotation != 0 && rotateFrame(image, buffer, w, h, rotation)) work = image;
    } else if (rotation != 0) {
        work = rotateFrame(buffer, image, w, h, rotation) ? buffer : image;
    }

    const int32_t minSide = std::min(w, h);
    const float eighth = static_cast<float>(minSide) / 8.0f;
    translatedToApiError(kApiSetFaceSizeRangeError, [&] {
        pipeline_->setFaceSizeRange(eighth > 32.0f ? static_cast<int32_t>(eighth) : 32, minSide);
    });

    collectFaces(work, w, h);
    if (found_.empty()) {
        forgetHistory();
        return 0;
    }

    const int32_t count = static_cast<int32_t>(std::min<std::size_t>(found_.size(), kMaxFacesPerFrame));
    for (int32_t i = 0; i < count; ++i) faceOrder_[i] = i;
    // Exchange sort, best score first; only a strictly lower score moves, so
    // equal scores keep their order.
    for (int32_t i = 0; i < count; ++i)
        for (int32_t j = i + 1; j < count; ++j)
            if (reported_[faceOrder_[i]].score < reported_[faceOrder_[j]].score) std::swap(faceOrder_[i], faceOrder_[j]);

    int32_t W, H;
    hostFrameSize(width, height, rotation, W, H);
    const float scaleX = W == w ? 1.0f : static_cast<float>(W) / static_cast<float>(w);
    const float scaleY = H == h ? 1.0f : static_cast<float>(H) / static_cast<float>(h);

    // The blending gate needs the size recorded by an earlier open gate, and
    // only an open gate records it: it stays shut, and the blocks are never
    // smoothed. Recording the size outside the gate would change the results.
    const bool gateOpen = detectionMode_ == 1 && lastFrameWidth_ == W && lastFrameHeight_ == H;

    // Blocks for k below min(faces, 100, maxFaces as unsigned).
    const std::size_t written = maxFaces == 0 ? 0
                                              : std::min<std::size_t>({found_.size(), std::size_t(kMaxFacesPerFrame),
                                                                       static_cast<uint32_t>(maxFaces)});
    for (std::size_t k = 0; k < written; ++k) {
        const int32_t slot = faceOrder_[k];
        const int32_t* old = nullptr;
        const float a = blendWeight(gateOpen, slot, reported_[slot].rect, old);
        writeBlock(results + kResultInts * k, reported_[slot], a, old, scaleX, scaleY);
    }

    if (gateOpen) {
        historyPresent_.fill(0);
        for (std::size_t k = 0; k < written; ++k) {
            const int32_t slot = faceOrder_[k];
            historyPresent_[slot] = 1;
            std::memcpy(faceHistory_.data() + kResultInts * slot, results + kResultInts * k,
                        sizeof(int32_t) * kResultInts);
        }
        lastFrameWidth_ = W;
        lastFrameHeight_ = H;
    }

    const int64_t found = static_cast<int64_t>(found_.size());
    return static_cast<int>(std::min<int64_t>(found, maxFaces));
}
