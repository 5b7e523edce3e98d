#include "api/ReportedFace.h"

#include <stdexcept>

#include "core/Json.h"

const char* const kReportedLandmarks[ReportedFace::kPointCount] = {"leftEye", "rightEye", "nose",
                                                                   "leftMouthCorner", "rightMouthCorner"};

const Point2<float>& ReportedFace::point(Point p) const {
    if ((missing >> p) & 1u) throw std::invalid_argument(kNoLandmarkValue);
    return points[p];
}

ReportedFace reportFace(const FaceData& face) {
    ReportedFace r{};
    r.score = roundToSixDigits(face.faceScore());
    r.rect = face.faceRect();
    const LandmarkMap::Points& points = face.landmarks().points();
    for (int p = 0; p < ReportedFace::kPointCount; ++p) {
        const auto it = points.find(kReportedLandmarks[p]);
        if (it == points.end()) {
            r.missing |= 1u << p;
            continue;
        }
        r.points[p] = Point2<float>(roundToSixDigits(it->second.x), roundToSixDigits(it->second.y));
    }
    return r;
}
