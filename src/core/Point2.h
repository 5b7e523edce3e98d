#ifndef QUORIN_CORE_POINT2_H
#define QUORIN_CORE_POINT2_H

#include <exception>
#include <string>
#include <vector>

#include "core/Json.h"
#include "quorin/Point2.h"

// The text members of Point2, for the library's own instantiations.

template <typename T>
std::string Point2<T>::toJson() const {
    try {
        return "[" + JsonValue<T>::toText(x) + "," + JsonValue<T>::toText(y) + "]";
    } catch (const std::exception&) {
        throw JsonError(kJsonSerializationError);
    }
}

template <typename T>
void Point2<T>::fromJson(const std::string& text) {
    try {
        std::vector<std::string> items = parseJsonArray(text);
        if (items.size() != 2) throw JsonError(kJsonDeserializationError);
        JsonValue<T>::fromText(items[0], x);
        JsonValue<T>::fromText(items[1], y);
    } catch (const std::exception&) {
        throw JsonError(kJsonDeserializationError);
    }
}

#endif
