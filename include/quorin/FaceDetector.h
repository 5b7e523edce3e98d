#ifndef QUORIN_FACEDETECTOR_H
#define QUORIN_FACEDETECTOR_H

#include <string>
#include <vector>

#include "quorin/Errors.h"
#include "quorin/FaceData.h"
#include "quorin/QVFaceTrackingMode.h"
#include "quorin/export.h"

class CascadeDetector;
class WindowMerger;
class PostFilter;
class Tracker;
struct DetectionWindow;
struct ScoredWindow;

// Turns one gray frame into face rectangles with scores. Without a tracker
// every frame is searched whole. With one, known faces are looked for near
// their last and predicted places, and the full search covers one of 12 grid
// cells per frame, in rotation, to catch new faces. Only new hits go through
// the post filter. Memory of faces lives in the tracker alone. One thread at a
// time; not copyable.
class QUORIN_EXPORT FaceDetector {
public:
    // ensures: an empty detector; init must run before detect.
    FaceDetector();
    ~FaceDetector();
    FaceDetector(const FaceDetector&) = delete;
    FaceDetector& operator=(const FaceDetector&) = delete;

    // requires: a JSON object with
    //   "detector":   {"model": name of a built-in cascade ("mdcb"),
    //                  "imageMaxSize": largest frame side accepted by detect,
    //                  "faceMinSize", "faceMaxSize": face sides in pixels}
    //   "postfilter": {"name": "ILABS_POSTFILTER", "param": {"model": "mdpb"}}
    // ensures: a ready detector, tracking off; a repeated init replaces it.
    // throws: JsonError on a malformed text; qv_invalid_argument for sizes out
    // of range; qv_data_error for an unknown or damaged model (nothing is
    // kept); qv_operation_error "Failed to create PostFilter" for an unknown or
    // failing post filter (everything is released).
    void init(const std::string& configurationText);
    // ensures: the cascade, merger, post filter, tracker and frame buffers
    // are gone.
    void release();

    // ensures: the known faces are discarded; 1 simple, 2 Kalman, 3 and 4
    // particle trackers; anything else, or a tracker this build lacks, leaves
    // tracking off. Never throws for a mode.
    void setTrackingMode(QVFaceTrackingMode mode);
    // requires: a successful init; steps as fractions of the window side.
    // throws: qv_operation_error "FaceDetector is not initialized".
    void setSearchStep(float stepX, float stepY);
    // requires: a successful init; sides in pixels, 0 or less keeps a bound.
    // throws: qv_operation_error "FaceDetector is not initialized";
    // qv_invalid_argument "Face size range exceeds the initial bounds" for a
    // range wider than the one init configured.
    void setFaceSizeRange(int minSize, int maxSize);

    // The search cell of this frame: one of 12 (3 x 4 for portrait frames,
    // 4 x 3 otherwise), chosen by the tracker's frame counter (cell 0 without
    // a tracker). Used by the engine; its window type is not public.
    DetectionWindow exhaustiveDetectSubRegion(int width, int height) const;

    // requires: a successful init; `gray` holds width * height bytes, rows
    // adjacent. ensures: `faces` holds one record per face, with rectangle
    // (pixels of this frame) and score; landmarks are not set here.
    // throws: qv_operation_error "FaceDetector is not initialized";
    // qv_invalid_argument for a null frame or a side <= 0; qv_data_error
    // "Image is larger than the maximum supported size" for a side above
    // imageMaxSize. On any of these `faces` and the tracker are untouched.
    void detect(const unsigned char* gray, int width, int height, std::vector<FaceData>& faces);

    // The tracker in use, or null when tracking is off. For the engine's tests.
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
    // The frame's integral image and the smaller per-frame lists, kept
    // between frames for their capacity so that a frame allocates nothing
    // once the largest frame has been seen.
    struct FrameScratch;
    FrameScratch* scratch = nullptr;
};

#endif
