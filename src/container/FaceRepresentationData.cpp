#include "container/FaceRepresentationData.h"

#include <exception>

#include "core/ApiError.h"
#include "core/Descramble.h"
#include "core/ScrambledTexts.h"

std::vector<uint8_t> FaceRepresentationData::toIvb() const {
    try {
        return blob.toIvb();
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kRepresentationWriteFailed));
    }
}

void FaceRepresentationData::fromIvb(const std::vector<uint8_t>& bytes) {
    try {
        blob.fromIvb(bytes);
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kRepresentationReadFailed));
    }
}
