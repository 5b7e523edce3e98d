#ifndef QUORIN_CORE_POINT2_H
#define QUORIN_CORE_POINT2_H

#include <exception>
#include <string>
#include <vector>

#include "core/Json.h"

// A plain point of the face records. Text form: [x,y].
template <typename T>
class Point2 {
public:
    Point2() : x(), y() {}
    Point2(T px, T py) : x(px), y(py) {}

    // "[x,y]" with no blanks; a failing conversion gives "Json serialization error".
    std::string toJson() const {
        try {
            return "[" + JsonValue<T>::toText(x) + "," + JsonValue<T>::toText(y) + "]";
        } catch (const std::exception&) {
            throw JsonError(kJsonSerializationError);
        }
    }

    // Requires an array of exactly two numbers; anything else gives
    // "Json deserialization error". Fields already read stay on failure.
    void fromJson(const std::string& text) {
        try {
            std::vector<std::string> items = parseJsonArray(text);
            if (items.size() != 2) throw JsonError(kJsonDeserializationError);
            JsonValue<T>::fromText(items[0], x);
            JsonValue<T>::fromText(items[1], y);
        } catch (const std::exception&) {
            throw JsonError(kJsonDeserializationError);
        }
    }

    bool operator==(const Point2& other) const { return x == other.x && y == other.y; }
    bool operator!=(const Point2& other) const { return !(*this == other); }

    T x;
    T y;
};

#endif
