#ifndef QUORIN_API_SESSION_H
#define QUORIN_API_SESSION_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include "api/FaceDetectionPipeline.h"
#include "api/ReportedFace.h"
#include "core/FaceData.h"

// Buffer sizes of the session.
constexpr int32_t kMaxFacesPerFrame = 100;
constexpr int32_t kResultInts = 17;
// Mode 2 shrinks a frame to a long side of 640, so its work frame can reach
// 640 x 640: the frame buffer is sized for that, while rotateFrame keeps its
// own 102400-pixel bound (kRotateFrameLimit).
constexpr std::size_t kFrameBufferBytes = 640 * 640;
// Initial orientation copy; a larger frame grows it to the frame's size.
constexpr std::size_t kOrientationFrameBytes = 0x100000;

// A read-only view of the session variables, for tests. Internal.
struct SessionSnapshot {
    bool open;                 // a pipeline exists
    bool buffersAllocated;     // init got past the engines
    int32_t detectionMode;
    int32_t orientation;
    uint32_t orientationHold;
    int32_t lastFrameWidth;
    int32_t lastFrameHeight;
    int32_t historyPresentCount;  // slots flagged in the history
    std::size_t orientationFrameBytes;
};

// The one detection session of the process, behind the ten entry points: the
// pipeline, the work buffers, the detection mode, the orientation search and
// the (idle) result history. Every public member takes the session's lock for
// its whole run, so that a host breaking the one-thread rule gets its calls one
// after the other instead of a corrupted session; inside, nothing locks again.
class DetectionSession {
public:
    DetectionSession() = default;
    DetectionSession(const DetectionSession&) = delete;
    DetectionSession& operator=(const DetectionSession&) = delete;

    void init();
    void release();
    void setDetectionMode(unsigned int mode);
    // `scaled` selects the -1000..1000 mapping of quorin_detectScaled.
    int detect(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation, bool scaled);
    // `orientation`, when given, receives the orientation in use afterwards.
    int detect360Tracking(unsigned char* image, int width, int height, int* results, int maxFaces, bool scaled,
                          int* orientation);
    int detect360High(unsigned char* image, int width, int height, int* results, int maxFaces, bool scaled);

    SessionSnapshot snapshot();

private:
    void changeMode(unsigned int mode);
    void forgetHistory();
    void requireBuffers() const;
    void reserveOrientationFrame(std::size_t bytes);
    int detectFrame(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation,
                    bool scaled);
    int detectPixels(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation);
    void collectFaces(const unsigned char* work, int32_t w, int32_t h);
    float blendWeight(bool gateOpen, int32_t slot, const Rect2<int32_t>& r, const int32_t*& old) const;

    std::mutex lock_;
    // Open while the pipeline exists; after a failed init it does, without buffers.
    std::unique_ptr<FaceDetectionPipeline> pipeline_;
    std::unique_ptr<unsigned char[]> frameBuffer_;
    std::unique_ptr<unsigned char[]> orientationFrame_;
    std::size_t orientationFrameBytes_ = 0;
    int32_t detectionMode_ = 0;
    int32_t orientation_ = 0;
    uint32_t orientationHold_ = 0;
    // The history of the blending gate (see detectPixels): recorded size and
    // one block per slot.
    int32_t lastFrameWidth_ = 0;
    int32_t lastFrameHeight_ = 0;
    std::array<unsigned char, kMaxFacesPerFrame> historyPresent_{};
    std::array<int32_t, kMaxFacesPerFrame * kResultInts> faceHistory_{};
    // Per frame: the pipeline's list (kept for its capacity), its first 100
    // faces as reported, and their order by score.
    std::vector<FaceData> found_;
    std::array<ReportedFace, kMaxFacesPerFrame> reported_{};
    std::array<int32_t, kMaxFacesPerFrame> faceOrder_{};
};

// The session of the entry points.
DetectionSession& processSession();

inline SessionSnapshot sessionSnapshot() { return processSession().snapshot(); }

#endif
