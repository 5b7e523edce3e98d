#ifndef QUORIN_POINT2_H
#define QUORIN_POINT2_H

#include <string>

#include "quorin/export.h"

// A plain point of the face records (a landmark). Text form [x,y].
template <typename T>
class QUORIN_EXPORT Point2 {
public:
    // ensures: x and y are T() (0 for numbers).
    Point2() : x(), y() {}
    Point2(T px, T py) : x(px), y(py) {}

    // ensures: "[x,y]" without blanks, floats with six significant digits.
    // throws: JsonError "Json serialization error" if a field can't be written.
    std::string toJson() const;
    // requires: an array of exactly two numbers; blanks around them are fine.
    // ensures: x, y. throws: JsonError "Json deserialization error" otherwise;
    // a field read before the failure keeps its new value.
    void fromJson(const std::string& text);

    bool operator==(const Point2& other) const { return x == other.x && y == other.y; }
    bool operator!=(const Point2& other) const { return !(*this == other); }

    T x;
    T y;
};

// The text members exist, in the library, for this instantiation only.
extern template class QUORIN_EXPORT Point2<float>;

#endif
