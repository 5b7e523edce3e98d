#ifndef QUORIN_JSONERROR_H
#define QUORIN_JSONERROR_H

#include <exception>
#include <string>

#include "quorin/export.h"

// Raised by the text form of the records (toJson / fromJson of FaceData,
// Rect2, Point2, LandmarkMap and the enumeration classes). The texts are
// "Json serialization error", "Json deserialization error" and, for
// FacePose::flip, "Invalid pose".
class QUORIN_EXPORT JsonError : public std::exception {
public:
    // ensures: what() returns `message`, or "" for a null pointer.
    explicit JsonError(const char* message) : message_(message ? message : "") {}
    const char* what() const noexcept override { return message_.c_str(); }

private:
    std::string message_;
};

#endif
