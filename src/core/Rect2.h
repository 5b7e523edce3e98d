#ifndef QUORIN_CORE_RECT2_H
#define QUORIN_CORE_RECT2_H

#include <exception>
#include <string>
#include <vector>

#include "core/Json.h"

// A rectangle of the face records: right and bottom are coordinates, not sizes.
// Field order left, top, right, bottom; text form [left,top,right,bottom].
template <typename T>
class Rect2 {
public:
    Rect2() : left(), top(), right(), bottom() {}
    Rect2(T l, T t, T r, T b) : left(l), top(t), right(r), bottom(b) {}
    virtual ~Rect2() = default;
    Rect2(const Rect2&) = default;
    Rect2& operator=(const Rect2&) = default;

    std::string toJson() const {
        try {
            return "[" + JsonValue<T>::toText(left) + "," + JsonValue<T>::toText(top) + "," +
                   JsonValue<T>::toText(right) + "," + JsonValue<T>::toText(bottom) + "]";
        } catch (const std::exception&) {
            throw JsonError(kJsonSerializationError);
        }
    }

    // Requires an array of exactly four numbers, else "Json deserialization error".
    void fromJson(const std::string& text) {
        try {
            std::vector<std::string> items = parseJsonArray(text);
            if (items.size() != 4) throw JsonError(kJsonDeserializationError);
            JsonValue<T>::fromText(items[0], left);
            JsonValue<T>::fromText(items[1], top);
            JsonValue<T>::fromText(items[2], right);
            JsonValue<T>::fromText(items[3], bottom);
        } catch (const std::exception&) {
            throw JsonError(kJsonDeserializationError);
        }
    }

    bool operator==(const Rect2& o) const {
        return left == o.left && top == o.top && right == o.right && bottom == o.bottom;
    }
    bool operator!=(const Rect2& o) const { return !(*this == o); }

    T left;
    T top;
    T right;
    T bottom;
};

#endif
