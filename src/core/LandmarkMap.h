#ifndef QUORIN_CORE_LANDMARKMAP_H
#define QUORIN_CORE_LANDMARKMAP_H

#include <map>
#include <string>

#include "core/Point2.h"

// Named points of a face ("leftEye", "rightEye", "nose", "leftMouthCorner",
// "rightMouthCorner" are the ones the engine fills). Ordered by name, so the
// text form is stable.
class LandmarkMap {
public:
    using Points = std::map<std::string, Point2<float>>;

    LandmarkMap() = default;

    std::size_t size() const { return points_.size(); }

    // Throws std::invalid_argument "No value available for the input landmark"
    // when the name is absent.
    Point2<float> landmark(const std::string& name) const;
    // Inserts or overwrites.
    void setLandmark(const std::string& name, const Point2<float>& point);

    // {"name":[x,y],...} in name order; "{}" when empty.
    std::string toJson() const;
    // Replaces all points; JsonError "Json deserialization error" on bad text.
    void fromJson(const std::string& text);

    const Points& points() const { return points_; }

private:
    Points points_;
};

#endif
