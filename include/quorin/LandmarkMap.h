#ifndef QUORIN_LANDMARKMAP_H
#define QUORIN_LANDMARKMAP_H

#include <cstddef>
#include <map>
#include <string>

#include "quorin/Point2.h"
#include "quorin/export.h"

// Named points of a face. The engine fills "leftEye", "rightEye", "nose",
// "leftMouthCorner" and "rightMouthCorner", named from the image's point of
// view. Ordered by name, so the text form is stable.
class QUORIN_EXPORT LandmarkMap {
public:
    using Points = std::map<std::string, Point2<float>>;

    // ensures: size() == 0.
    LandmarkMap() = default;

    std::size_t size() const { return points_.size(); }

    // ensures: the point stored under `name`.
    // throws: std::invalid_argument "No value available for the input landmark"
    // when there is none.
    Point2<float> landmark(const std::string& name) const;
    // ensures: landmark(name) == point (inserted or overwritten).
    void setLandmark(const std::string& name, const Point2<float>& point);

    // ensures: {"name":[x,y],...} in name order; "{}" when empty.
    std::string toJson() const;
    // requires: an object of points, as toJson writes it.
    // ensures: the map holds exactly those points.
    // throws: JsonError "Json deserialization error" on a bad text.
    void fromJson(const std::string& text);

    const Points& points() const { return points_; }

private:
    Points points_;
};

#endif
