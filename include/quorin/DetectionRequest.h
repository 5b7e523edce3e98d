#ifndef QUORIN_DETECTIONREQUEST_H
#define QUORIN_DETECTIONREQUEST_H

#include <cstdint>
#include <string>

// One frame for FaceDetectionApi::detect: 8-bit gray, `width` * `height`
// bytes, rows adjacent, not owned. dataSet and filePath are copied into every
// face found.
struct DetectionRequest {
    const unsigned char* pixels = nullptr;
    int32_t width = 0;
    int32_t height = 0;
    std::string dataSet;
    std::string filePath;
};

#endif
