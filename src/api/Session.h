#ifndef QUORIN_API_SESSION_H
#define QUORIN_API_SESSION_H

#include <cstddef>
#include <cstdint>

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
    bool open;                 // a FaceDetectionApi exists
    bool buffersAllocated;     // init got past the engines
    int32_t detectionMode;
    int32_t orientation;
    uint32_t orientationHold;
    int32_t lastFrameWidth;
    int32_t lastFrameHeight;
    int32_t historyPresentCount;  // slots flagged in the history
    std::size_t orientationFrameBytes;
};

SessionSnapshot sessionSnapshot();

#endif
