#ifndef QUORIN_TESTS_SCRIPTEDSTAGES_H
#define QUORIN_TESTS_SCRIPTEDSTAGES_H

// A test double for the detector and the part locator of the detection
// pipeline: it hands out scripted face lists frame by frame and records what
// the pipeline asked of it (the work frames, the size ranges, the tracking modes).

#include <deque>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "api/PipelineStages.h"
#include "core/FaceData.h"

namespace qtest {

// A face in work frame coordinates with the five landmarks set.
inline FaceData makeFace(int left, int top, int right, int bottom, float score) {
    FaceData face;
    face.setFaceRect(Rect2<int32_t>(left, top, right, bottom));
    face.setFaceScore(score);
    const float w = static_cast<float>(right - left);
    const float h = static_cast<float>(bottom - top);
    face.setLandmark("leftEye", Point2<float>(left + 0.3f * w, top + 0.4f * h));
    face.setLandmark("rightEye", Point2<float>(left + 0.7f * w, top + 0.4f * h));
    face.setLandmark("nose", Point2<float>(left + 0.5f * w, top + 0.6f * h));
    face.setLandmark("leftMouthCorner", Point2<float>(left + 0.35f * w, top + 0.8f * h));
    face.setLandmark("rightMouthCorner", Point2<float>(left + 0.65f * w, top + 0.8f * h));
    return face;
}

struct WorkFrame {
    const unsigned char* pointer;
    int width;
    int height;
    std::vector<unsigned char> pixels;
};

class ScriptedStages : public PipelineStages {
public:
    // Frames without a script entry of their own get `fallback` (empty by default).
    std::deque<std::vector<FaceData>> script;
    std::vector<FaceData> fallback;
    // Set to have the locator leave the landmarks out.
    bool dropLandmarks = false;

    std::vector<WorkFrame> frames;
    std::vector<std::pair<int, int>> sizeRanges;
    std::vector<QVFaceTrackingMode> trackingModes;
    int locateCalls = 0;

    void setTrackingMode(QVFaceTrackingMode mode) override { trackingModes.push_back(mode); }
    void setSearchStep(float, float) override {}
    void setFaceSizeRange(int lo, int hi) override { sizeRanges.emplace_back(lo, hi); }

    void detect(const unsigned char* pixels, int width, int height, std::vector<FaceData>& faces) override {
        frames.push_back(WorkFrame{pixels, width, height,
                                   std::vector<unsigned char>(pixels, pixels + static_cast<size_t>(width) * height)});
        if (!script.empty()) {
            faces = script.front();
            script.pop_front();
        } else {
            faces = fallback;
        }
        if (dropLandmarks) {
            for (FaceData& f : faces) f = withoutLandmarks(f);
        }
    }

    void locateParts(const unsigned char*, int, int, std::vector<FaceData>&) override { ++locateCalls; }

private:
    static FaceData withoutLandmarks(const FaceData& f) {
        FaceData g;
        g.setFaceRect(f.faceRect());
        g.setFaceScore(f.faceScore());
        return g;
    }
};

// Installs a ScriptedStages for the lifetime of the guard.
class ScopedStages {
public:
    explicit ScopedStages(ScriptedStages& stages) { setPipelineStagesOverride(&stages); }
    ~ScopedStages() { setPipelineStagesOverride(nullptr); }
    ScopedStages(const ScopedStages&) = delete;
    ScopedStages& operator=(const ScopedStages&) = delete;
};

// A gray frame whose pixels all differ (modulo 251), so that turns and
// resizes can be told apart by content.
inline std::vector<unsigned char> patternFrame(int width, int height) {
    std::vector<unsigned char> frame(static_cast<size_t>(width) * height);
    for (size_t i = 0; i < frame.size(); ++i) frame[i] = static_cast<unsigned char>((i * 7 + 3) % 251);
    return frame;
}

}  // namespace qtest

#endif
