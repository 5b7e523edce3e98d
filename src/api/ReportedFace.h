#ifndef QUORIN_API_REPORTEDFACE_H
#define QUORIN_API_REPORTEDFACE_H

#include <cstdint>

#include "core/FaceData.h"

// One face as the entry points report it: everything a result block is made
// of, a fixed record with no heap behind it. The floats are those that the
// face's text form keeps (six significant digits), since that is what hosts
// have always been given; the order by score is made from the rounded scores.
struct ReportedFace {
    // The five points in the order of their names in kReportedLandmarks.
    enum Point { kLeftEye, kRightEye, kNose, kLeftMouthCorner, kRightMouthCorner, kPointCount };

    float score;
    Rect2<int32_t> rect;
    Point2<float> points[kPointCount];
    // Bit i set: point i was not placed (the locator left it out).
    uint32_t missing;

    // requires: point p was placed.
    // throws: std::invalid_argument "No value available for the input
    // landmark" otherwise, as the name lookup of a face does.
    const Point2<float>& point(Point p) const;
};

extern const char* const kReportedLandmarks[ReportedFace::kPointCount];

// The record of `face`, its floats cut to six significant digits.
ReportedFace reportFace(const FaceData& face);

#endif
