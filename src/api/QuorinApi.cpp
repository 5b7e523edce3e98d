// The exported entry points and the one process-wide session they share.
// No locks: the host drives the library from one thread at a time. Exceptions
// are not caught here; they leave through the entry to the host.

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "api/DetectionRequest.h"
#include "api/FaceDetectionApi.h"
#include "api/FrameOps.h"
#include "api/Session.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "quorin/quorinapi.h"

namespace {

FaceDetectionApi* g_detectionApi = nullptr;
unsigned char* g_frameBuffer = nullptr;
float* g_inputSizeTable = nullptr;
int32_t g_detectionMode = 0;
unsigned char* g_historyPresent = nullptr;
int32_t g_lastFrameHeight = 0;
int32_t g_lastFrameWidth = 0;
int32_t* g_faceOrder = nullptr;
int32_t* g_faceHistory = nullptr;
unsigned char* g_orientationFrame = nullptr;
std::size_t g_orientationFrameBytes = 0;
int32_t g_orientation = 0;
uint32_t g_orientationHold = 0;

const char* const kNotInitialized = "QVFace Detection API not initialized properly";

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

void freeBuffers() {
    delete[] g_inputSizeTable;
    g_inputSizeTable = nullptr;
    delete[] g_frameBuffer;
    g_frameBuffer = nullptr;
    delete[] g_orientationFrame;
    g_orientationFrame = nullptr;
    g_orientationFrameBytes = 0;
    delete[] g_faceOrder;
    g_faceOrder = nullptr;
    delete[] g_faceHistory;
    g_faceHistory = nullptr;
    delete[] g_historyPresent;
    g_historyPresent = nullptr;
}

void forgetHistory() {
    if (g_historyPresent != nullptr) std::memset(g_historyPresent, 0, kMaxFacesPerFrame);
    g_lastFrameHeight = -1;
    g_lastFrameWidth = -1;
}

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

// After a failed quorin_init the handle exists but the buffers don't.
void requireBuffers() {
    if (g_frameBuffer == nullptr) throw ApiError(kNotInitialized);
}

// Step 12 of a frame: blend weight of a new rectangle against the slot's old
// block. The gate that leads here never opens (see quorin_detect), so this
// always yields 0; it stays so that the behaviour is the designed one.
float blendWeight(bool gateOpen, int32_t slot, const QVFaceRect& r, const int32_t*& old) {
    old = nullptr;
    if (!gateOpen || g_historyPresent[slot] == 0) return 0.0f;
    old = g_faceHistory + slot * kResultInts;
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

// Writes one face as a block in host coordinates.
void writeBlock(int32_t* block, const QVFace& face, float a, const int32_t* old, float scaleX, float scaleY) {
    const QVFaceRect r = face.faceRect();
    const QVFacePoint leftEye = face.landmark("leftEye");
    const QVFacePoint rightEye = face.landmark("rightEye");
    const QVFacePoint nose = face.landmark("nose");
    const QVFacePoint leftMouth = face.landmark("leftMouthCorner");
    const QVFacePoint rightMouth = face.landmark("rightMouthCorner");

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

using DetectEntry = int (*)(unsigned char*, int, int, int*, int, int);

// Makes room for a copy of a frame of `bytes` bytes.
void reserveOrientationFrame(std::size_t bytes) {
    if (bytes <= g_orientationFrameBytes) return;
    unsigned char* larger = new unsigned char[bytes];
    delete[] g_orientationFrame;
    g_orientationFrame = larger;
    g_orientationFrameBytes = bytes;
}

int detect360Tracking(DetectEntry detect, unsigned char* image, int width, int height, int* results,
                      int maxFaces) {
    if (g_detectionApi == nullptr) return 0;
    const std::size_t bytes = checkedFrameBytes(image, width, height, results, maxFaces);
    requireBuffers();
    if (g_orientation == -1) {
        reserveOrientationFrame(bytes);
        quorin_setDetectionMode(0);
        g_orientation = 0;
        for (;;) {
            // A fresh copy for every attempt: the pipeline may write the turned
            // frame over the memory it is given.
            std::memcpy(g_orientationFrame, image, bytes);
            const int result = detect(g_orientationFrame, width, height, results, maxFaces, g_orientation);
            if (result != 0) {
                g_orientationHold = kOrientationHoldFrames;
                return result;
            }
            g_orientation += 90;
            if (g_orientation > 359) {
                g_orientation = -1;
                return result;
            }
        }
    }
    quorin_setDetectionMode(1);
    const int result = detect(image, width, height, results, maxFaces, g_orientation);
    if (g_orientationHold != 0) {
        --g_orientationHold;
        return result;
    }
    if (result == 0) g_orientation = -1;
    return result;
}

int detect360High(DetectEntry detect, unsigned char* image, int width, int height, int* results, int maxFaces) {
    if (g_detectionApi == nullptr) return 0;
    checkedFrameBytes(image, width, height, results, maxFaces);
    requireBuffers();
    quorin_setDetectionMode(2);
    if (g_orientation == -1) g_orientation = 0;
    int result = 0;
    for (int attempt = 0; attempt < 4; ++attempt) {
        result = detect(image, width, height, results, maxFaces, g_orientation);
        if (result != 0) return result;
        g_orientation = (g_orientation + 90) % 360;
    }
    g_orientation = -1;
    return result;
}

}  // namespace

SessionSnapshot sessionSnapshot() {
    SessionSnapshot s{};
    s.open = g_detectionApi != nullptr;
    s.buffersAllocated = g_frameBuffer != nullptr;
    s.detectionMode = g_detectionMode;
    s.orientation = g_orientation;
    s.orientationHold = g_orientationHold;
    s.lastFrameWidth = g_lastFrameWidth;
    s.lastFrameHeight = g_lastFrameHeight;
    s.historyPresentCount = 0;
    if (g_historyPresent != nullptr)
        for (int i = 0; i < kMaxFacesPerFrame; ++i) s.historyPresentCount += g_historyPresent[i] != 0;
    s.orientationFrameBytes = g_orientationFrameBytes;
    return s;
}

extern "C" {

void quorin_init(void) {
    // A second init without release: drop the old session instead of leaking it.
    quorin_release();
    g_detectionApi = new FaceDetectionApi();
    {
        FaceModelPathsHandle handle(nullptr);
        g_detectionApi->init(handle);
    }
    g_frameBuffer = new unsigned char[kFrameBufferBytes];
    g_orientationFrame = new unsigned char[kOrientationFrameBytes];
    g_orientationFrameBytes = kOrientationFrameBytes;
    g_faceOrder = new int32_t[kMaxFacesPerFrame];
    g_faceHistory = new int32_t[kMaxFacesPerFrame * kResultInts];
    g_historyPresent = new unsigned char[kMaxFacesPerFrame];
    g_inputSizeTable = new float[3];
    g_detectionMode = 0;
    g_inputSizeTable[0] = 240.0f;
    g_inputSizeTable[1] = 320.0f;
    g_inputSizeTable[2] = 640.0f;
    std::memset(g_faceHistory, 0, sizeof(int32_t) * kMaxFacesPerFrame * kResultInts);
    std::memset(g_historyPresent, 0, kMaxFacesPerFrame);
    g_orientationHold = 0;
    g_lastFrameHeight = -1;
    g_lastFrameWidth = -1;
    g_orientation = -1;
    // The stored mode is 0, so this call takes effect: every session starts in
    // mode 2 (search step 0.1, no tracker).
    quorin_setDetectionMode(2);
}

void quorin_release(void) {
    if (g_detectionApi == nullptr) return;
    delete g_detectionApi;
    g_detectionApi = nullptr;
    freeBuffers();
}

void quorin_setDetectionMode(unsigned int mode) {
    if (mode == static_cast<unsigned int>(g_detectionMode)) return;
    if (mode <= 2) {
        if (g_detectionApi == nullptr) throw ApiError(kNotInitialized);
        const ModeSetting& setting = kModes[mode];
        g_detectionApi->setSearchStep(setting.stepX, setting.stepY);
        g_detectionApi->setTrackingMode(setting.tracking);
        g_detectionMode = static_cast<int32_t>(mode);
    }
    forgetHistory();
}

int quorin_detect(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation) {
    if (g_detectionApi == nullptr) return 0;
    checkedFrameBytes(image, width, height, results, maxFaces);
    requireBuffers();

    const int32_t target = static_cast<int32_t>(g_inputSizeTable[g_detectionMode]);
    const int64_t longSide = static_cast<int64_t>(width) + height - std::min(width, height);
    const float scale = static_cast<float>(target) / static_cast<float>(longSide);

    int32_t w = width;
    int32_t h = height;
    const unsigned char* work = image;
    if (scale < 1.0f) {
        w = static_cast<int32_t>(scale * static_cast<float>(width));
        h = static_cast<int32_t>(scale * static_cast<float>(height));
        // So elongated that a side shrinks to nothing: no face can be in it.
        // The buffer test can't fail for the three targets; it keeps the
        // resize inside its memory whatever the table holds.
        if (w < 1 || h < 1 || static_cast<std::size_t>(w) * static_cast<std::size_t>(h) > kFrameBufferBytes ||
            !resizeNearest(image, width, height, g_frameBuffer, w, h)) {
            forgetHistory();
            return 0;
        }
        work = g_frameBuffer;
        // The turned frame goes back into the host's memory, which is at least
        // as large as the shrunk one.
        if (rotation != 0 && rotateFrame(image, g_frameBuffer, w, h, rotation)) work = image;
    } else if (rotation != 0) {
        work = rotateFrame(g_frameBuffer, image, w, h, rotation) ? g_frameBuffer : image;
    }

    const int32_t minSide = std::min(w, h);
    const float eighth = static_cast<float>(minSide) / 8.0f;
    g_detectionApi->setFaceSizeRange(eighth > 32.0f ? static_cast<int32_t>(eighth) : 32, minSide);

    DetectionRequest request;
    request.pixels = work;
    request.width = w;
    request.height = h;
    const std::vector<QVFace> faces = g_detectionApi->detect(request);
    if (faces.empty()) {
        forgetHistory();
        return 0;
    }

    const int32_t count = static_cast<int32_t>(std::min<std::size_t>(faces.size(), kMaxFacesPerFrame));
    for (int32_t i = 0; i < count; ++i) g_faceOrder[i] = i;
    // Exchange sort, best score first; only a strictly lower score moves, so
    // equal scores keep their order.
    std::vector<float> scores(count);
    for (int32_t i = 0; i < count; ++i) scores[i] = faces[i].faceScore();
    for (int32_t i = 0; i < count; ++i)
        for (int32_t j = i + 1; j < count; ++j)
            if (scores[g_faceOrder[i]] < scores[g_faceOrder[j]]) std::swap(g_faceOrder[i], g_faceOrder[j]);

    int32_t W, H;
    hostFrameSize(width, height, rotation, W, H);
    const float scaleX = W == w ? 1.0f : static_cast<float>(W) / static_cast<float>(w);
    const float scaleY = H == h ? 1.0f : static_cast<float>(H) / static_cast<float>(h);

    // The blending gate needs the size recorded by an earlier open gate, and
    // only an open gate records it: it stays shut, and the blocks are never
    // smoothed. Recording the size outside the gate would change the results.
    const bool gateOpen = g_detectionMode == 1 && g_lastFrameWidth == W && g_lastFrameHeight == H;

    const uint32_t wanted = static_cast<uint32_t>(maxFaces);
    if (maxFaces != 0) {
        for (int32_t k = 0;; ++k) {
            const int32_t slot = g_faceOrder[k];
            const QVFace& face = faces[slot];
            const int32_t* old = nullptr;
            const float a = blendWeight(gateOpen, slot, face.faceRect(), old);
            writeBlock(results + kResultInts * k, face, a, old, scaleX, scaleY);
            const int32_t next = k + 1;
            if (static_cast<std::size_t>(next) >= faces.size() || next > 99 || static_cast<uint32_t>(next) >= wanted)
                break;
        }
    }

    if (gateOpen) {
        std::memset(g_historyPresent, 0, kMaxFacesPerFrame);
        if (maxFaces != 0) {
            for (int32_t k = 0;; ++k) {
                const int32_t slot = g_faceOrder[k];
                g_historyPresent[slot] = 1;
                std::memcpy(g_faceHistory + kResultInts * slot, results + kResultInts * k,
                            sizeof(int32_t) * kResultInts);
                const int32_t next = k + 1;
                if (static_cast<std::size_t>(next) >= faces.size() || next > 99 ||
                    static_cast<uint32_t>(next) >= wanted)
                    break;
            }
        }
        g_lastFrameWidth = W;
        g_lastFrameHeight = H;
    }

    const int64_t found = static_cast<int64_t>(faces.size());
    return static_cast<int>(std::min<int64_t>(found, maxFaces));
}

int quorin_detectScaled(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation) {
    const int n = quorin_detect(image, width, height, results, maxFaces, rotation);
    int32_t W, H;
    hostFrameSize(width, height, rotation, W, H);
    if (n < 1) return n;
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
    return n;
}

int quorin_detect360Tracking(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return detect360Tracking(quorin_detect, image, width, height, results, maxFaces);
}

int quorin_detect360TrackingScaled(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return detect360Tracking(quorin_detectScaled, image, width, height, results, maxFaces);
}

int quorin_detect360High(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return detect360High(quorin_detect, image, width, height, results, maxFaces);
}

int quorin_detect360HighScaled(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return detect360High(quorin_detectScaled, image, width, height, results, maxFaces);
}

int quorin_detect360TrackingScaled_ornt(unsigned char* image, int width, int height, int* results, int maxFaces,
                                        int* orientation) {
    if (orientation == nullptr) throw qv_invalid_argument("quorin: orientation pointer is null");
    const int result = quorin_detect360TrackingScaled(image, width, height, results, maxFaces);
    *orientation = g_orientation;
    return result;
}

}  // extern "C"
