#ifndef QUORIN_API_APIERRORS_H
#define QUORIN_API_APIERRORS_H

#include <exception>

#include "core/ApiError.h"

// The fixed texts of the detection layer's ApiError, shared by the exported
// FaceDetectionApi and the session behind the entry points.
inline constexpr const char* kApiNotInitialized = "QVFace Detection API not initialized properly";
inline constexpr const char* kApiInitError = "QVFace Detection API initialization error";
inline constexpr const char* kApiSetModeError = "QVFace Detection API set mode error";
inline constexpr const char* kApiSetSearchStepError = "QVFace Detection API set search step error";
inline constexpr const char* kApiSetFaceSizeRangeError = "QVFace Detection API set face size range error";
inline constexpr const char* kApiDetectError = "QVFace Detection API detect error";

// Runs `op`, replacing any standard exception (ApiError included) by an
// ApiError with `message`; anything else passes unchanged.
template <typename Op>
auto translatedToApiError(const char* message, Op op) -> decltype(op()) {
    try {
        return op();
    } catch (const std::exception&) {
        throw ApiError(message);
    }
}

#endif
