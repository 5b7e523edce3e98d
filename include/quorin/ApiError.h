#ifndef QUORIN_APIERROR_H
#define QUORIN_APIERROR_H

#include <exception>
#include <string>

#include "quorin/export.h"

// The exception of the public layer: FaceDetectionApi, QVFace and the
// configuration handle raise it with a fixed text and drop the inner one.
// Exported so that a host catching it by type sees the library's own typeinfo.
class QUORIN_EXPORT ApiError : public std::exception {
public:
    // ensures: what() returns `message`.
    explicit ApiError(const std::string& message) : message_(message) {}
    ~ApiError() override = default;
    const char* what() const noexcept override { return message_.c_str(); }

private:
    std::string message_;
};

#endif
