#ifndef QUORIN_FACEPARTS_FACEPARTLOCATOR_H
#define QUORIN_FACEPARTS_FACEPARTLOCATOR_H

#include <string>
#include <vector>

#include "core/FaceData.h"

// Placeholder landmark locator with the interface the pipeline calls: it
// accepts any configuration and leaves the faces as they are. The net-based
// locator replaces it.
class FacePartLocator {
public:
    FacePartLocator() = default;
    void init(const std::string& parameters);
    void locateParts(const unsigned char* image, int width, int height, std::vector<FaceData>& faces);
};

#endif
