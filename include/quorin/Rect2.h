#ifndef QUORIN_RECT2_H
#define QUORIN_RECT2_H

#include <cstdint>
#include <string>

#include "quorin/export.h"

// A rectangle of the face records. Field order left, top, right, bottom;
// right and bottom are coordinates, not sizes. Text form [left,top,right,bottom].
template <typename T>
class QUORIN_EXPORT Rect2 {
public:
    // ensures: all four fields are T() (0 for numbers).
    Rect2() : left(), top(), right(), bottom() {}
    Rect2(T l, T t, T r, T b) : left(l), top(t), right(r), bottom(b) {}
    virtual ~Rect2() = default;
    Rect2(const Rect2&) = default;
    Rect2& operator=(const Rect2&) = default;

    // ensures: "[left,top,right,bottom]" without blanks.
    // throws: JsonError "Json serialization error" if a field can't be written.
    std::string toJson() const;
    // requires: an array of exactly four integers, e.g. "[1, 2, 3, 4]".
    // ensures: the fields, in order. throws: JsonError "Json deserialization
    // error" otherwise; fields read before the failure keep their new values.
    void fromJson(const std::string& text);

    bool operator==(const Rect2& o) const {
        return left == o.left && top == o.top && right == o.right && bottom == o.bottom;
    }
    bool operator!=(const Rect2& o) const { return !(*this == o); }

    T left;
    T top;
    T right;
    T bottom;
};

// The text members exist, in the library, for this instantiation only.
extern template class QUORIN_EXPORT Rect2<int32_t>;

#endif
