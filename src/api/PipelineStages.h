#ifndef QUORIN_API_PIPELINESTAGES_H
#define QUORIN_API_PIPELINESTAGES_H

#include <string>
#include <vector>

#include "core/FaceData.h"
#include "engine/FaceTrackingMode.h"

// A stand-in for the detector and the part locator of every pipeline. While
// one is installed, FaceDetectionPipeline builds no engines and sends init,
// the setters, detect and locateParts to it instead, so that the road from a
// list of faces to the host's result blocks can be driven with chosen faces,
// whatever models the library carries. Internal: never exported.
class PipelineStages {
public:
    virtual ~PipelineStages() = default;
    // Receives the two configuration texts; by default requires each to be a
    // JSON object, as the engines do.
    virtual void init(const std::string& faceRects, const std::string& faceParts);
    virtual void setTrackingMode(QVFaceTrackingMode) {}
    virtual void setSearchStep(float, float) {}
    virtual void setFaceSizeRange(int, int) {}
    virtual void detect(const unsigned char* pixels, int width, int height, std::vector<FaceData>& faces) = 0;
    virtual void locateParts(const unsigned char*, int, int, std::vector<FaceData>&) {}
};

// Installs `stages` (not owned) for all pipelines; null restores the engines.
void setPipelineStagesOverride(PipelineStages* stages);

#endif
