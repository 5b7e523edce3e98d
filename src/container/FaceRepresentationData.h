#ifndef QUORIN_CONTAINER_FACEREPRESENTATIONDATA_H
#define QUORIN_CONTAINER_FACEREPRESENTATIONDATA_H

#include <cstdint>
#include <string>
#include <vector>

#include "quorin/DataBlob.h"

// The value behind QVFaceRepresentation: one named feature blob.
class FaceRepresentationData {
public:
    FaceRepresentationData() {}
    explicit FaceRepresentationData(const DataBlob& blob) : blob(blob) {}

    std::string name() const { return blob.name(); }
    // Both raise ApiError with their own stored text in place of any standard
    // exception of the blob's conversion.
    std::vector<uint8_t> toIvb() const;
    void fromIvb(const std::vector<uint8_t>& bytes);

    DataBlob blob;
};

#endif
