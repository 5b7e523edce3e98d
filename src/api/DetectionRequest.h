#ifndef QUORIN_API_DETECTIONREQUEST_H
#define QUORIN_API_DETECTIONREQUEST_H

#include <cstdint>
#include <string>

// One frame for the pipeline: 8-bit gray, rows contiguous, pixels not owned.
// dataSet and filePath are copied into every face found.
struct DetectionRequest {
    const unsigned char* pixels = nullptr;
    int32_t width = 0;
    int32_t height = 0;
    std::string dataSet;
    std::string filePath;
};

#endif
