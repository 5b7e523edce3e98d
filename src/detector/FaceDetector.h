#ifndef QUORIN_DETECTOR_FACEDETECTOR_H
#define QUORIN_DETECTOR_FACEDETECTOR_H

#include <string>
#include <vector>

#include "core/FaceData.h"
#include "detector/FaceTrackingMode.h"
#include "image/DetectionWindow.h"
#include "image/ScoredWindow.h"
#include "quorin/export.h"

class CascadeDetector;
class WindowMerger;
class PostFilter;
class Tracker;

// Turns one gray frame into face rectangles with scores. Without a tracker
// every frame is searched whole. With one, known faces are looked for near
// their last and predicted places (spread search), and the exhaustive search
// covers one of 12 grid cells per frame, in rotation, to catch new faces. Only
// exhaustive hits go through the post filter; hits near a known face are
// trusted. Memory of faces lives in the tracker alone.
class QUORIN_EXPORT FaceDetector {
public:
    FaceDetector();
    ~FaceDetector();
    FaceDetector(const FaceDetector&) = delete;
    FaceDetector& operator=(const FaceDetector&) = delete;

    // Requires a JSON object with "detector" (cascade configuration) and
    // "postfilter" ({"name", "param"}). Ensures a ready detector with tracking
    // off. Cascade failures pass through (nothing is kept); an unknown or
    // failing post filter releases everything and raises qv_operation_error
    // "Failed to create PostFilter".
    void init(const std::string& configurationText);
    // Destroys cascade, merger, post filter and tracker, in this order.
    void release();

    // 1 simple, 2 Kalman, 3 and 4 particle trackers; anything else is off.
    // Always discards the known faces. A tracker name that is not available
    // leaves tracking off.
    void setTrackingMode(QVFaceTrackingMode mode);
    // Passed on to the cascade. Require a successful init (qv_operation_error).
    void setSearchStep(float stepX, float stepY);
    void setFaceSizeRange(int minSize, int maxSize);

    // The search cell of this frame: one of 12 (3 x 4 for portrait frames,
    // 4 x 3 otherwise), chosen by the tracker's frame counter (cell 0 without
    // a tracker).
    DetectionWindow exhaustiveDetectSubRegion(int width, int height) const;

    // Requires `gray` with width * height bytes, rows adjacent. Ensures `faces`
    // holds one record per face (rectangle and score). A frame with a side
    // above the configured imageMaxSize raises qv_data_error "Image is larger
    // than the maximum supported size"; a null or empty frame raises
    // qv_invalid_argument; calling before init raises qv_operation_error. On
    // any of these `faces` and the tracker are untouched.
    void detect(const unsigned char* gray, int width, int height, std::vector<FaceData>& faces);

    // The tracker in use, or null when tracking is off. For inspection only.
    const Tracker* currentTracker() const { return tracker; }

private:
    CascadeDetector* detector = nullptr;
    WindowMerger* merger = nullptr;
    PostFilter* postFilter = nullptr;
    Tracker* tracker = nullptr;
    std::vector<ScoredWindow> trackedHits;
    std::vector<ScoredWindow> rawHits;
    std::vector<ScoredWindow> mergedHits;
    std::vector<ScoredWindow> finalHits;
};

#endif
