#ifndef QUORIN_CORE_RECT2_H
#define QUORIN_CORE_RECT2_H

#include <exception>
#include <string>
#include <vector>

#include "core/Json.h"
#include "quorin/Rect2.h"

// The text members of Rect2, for the library's own instantiations.

template <typename T>
std::string Rect2<T>::toJson() const {
    try {
        return "[" + JsonValue<T>::toText(left) + "," + JsonValue<T>::toText(top) + "," +
               JsonValue<T>::toText(right) + "," + JsonValue<T>::toText(bottom) + "]";
    } catch (const std::exception&) {
        throw JsonError(kJsonSerializationError);
    }
}

template <typename T>
void Rect2<T>::fromJson(const std::string& text) {
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

#endif
