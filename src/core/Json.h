#ifndef QUORIN_CORE_JSON_H
#define QUORIN_CORE_JSON_H

#include <exception>
#include <map>
#include <string>
#include <type_traits>
#include <vector>

#include "quorin/JsonError.h"

// The engine's own small text codec. It is deliberately not a general JSON
// library: a read gives one level only (key -> raw value text), nested values
// stay text until their owner reads them, there are no escapes, brackets are
// matched by counting, and anything up to the next comma is a bare value.
// Texts written by the engine and the built-in configuration rely on exactly
// this dialect, so its quirks are behaviour, not bugs.

extern const char* const kJsonSerializationError;    // "Json serialization error"
extern const char* const kJsonDeserializationError;  // "Json deserialization error"

// True for the five white-space characters of the dialect (LF, TAB, FF, VT,
// blank). Carriage return is an ordinary character.
bool isJsonWhiteSpace(char c);

// Object text -> map key -> raw value text (strings keep their quotes, groups
// their brackets). The text must start with '{' and end with '}' exactly:
// callers trim padded texts first. Throws JsonError on malformed text.
std::map<std::string, std::string> parseJsonObject(const std::string& text);

// Array text -> raw item texts in order. Same rules as parseJsonObject.
std::vector<std::string> parseJsonArray(const std::string& text);

// Skips white space and one separating comma behind a finished value.
// Returns the next token's position or std::string::npos; anything other than
// a comma there throws JsonError.
std::string::size_type moveToNextToken(const std::string& text, std::string::size_type pos);

// Position of the partner `close` of the bracket at `pos`, counting only that
// one kind of bracket (quotes are not looked at). Throws JsonError when there
// is no partner or `pos` is outside the text.
std::string::size_type findPairedChar(const std::string& text, std::string::size_type pos, char close);

// Reads "true" / "false"; anything else throws JsonError.
bool jsonTextToBool(const std::string& text);

// Value <-> text, one specialisation per value type. The primary template
// serves records: any type with `std::string toJson() const` and
// `void fromJson(const std::string&)`.
template <typename T>
struct JsonValue {
    static std::string toText(const T& value) {
        try {
            return value.toJson();
        } catch (const std::exception&) {
            throw JsonError(kJsonSerializationError);
        }
    }
    static void fromText(const std::string& text, T& value) { value.fromJson(text); }
};

template <>
struct JsonValue<int> {
    static std::string toText(const int& value);
    static void fromText(const std::string& text, int& value);
};

template <>
struct JsonValue<float> {
    static std::string toText(const float& value);
    static void fromText(const std::string& text, float& value);
};

template <>
struct JsonValue<std::string> {
    static std::string toText(const std::string& value);
    static void fromText(const std::string& text, std::string& value);
};

// The float that `value` becomes through its text form (six significant
// digits, read back), without making the text on the heap. Infinities and NaN
// read back as 0, as the codec reads them.
float roundToSixDigits(float value);

// Landmark maps: declared here, defined next to Point2 by the records.
template <typename T>
class Point2;
template <>
struct JsonValue<std::map<std::string, Point2<float>>> {
    static std::string toText(const std::map<std::string, Point2<float>>& value);
    static void fromText(const std::string& text, std::map<std::string, Point2<float>>& value);
};

// "\"key\":" + value text, no blank after the colon.
template <typename T>
std::string jsonNamedValue(const std::string& key, const T& value) {
    return "\"" + key + "\":" + JsonValue<T>::toText(value);
}

inline std::string jsonNamedValue(const std::string& key, bool value) {
    return "\"" + key + "\":" + (value ? "true" : "false");
}

inline std::string jsonNamedValue(const std::string& key, const char* value) {
    return jsonNamedValue(key, std::string(value ? value : ""));
}

// Reads map[key] into target if the key is present (returns true); an absent
// key leaves target alone, which is how records keep their defaults.
template <typename T>
bool jsonObjectItemToNamedValue(const std::map<std::string, std::string>& items, const std::string& key,
                                T& target) {
    auto it = items.find(key);
    if (it == items.end()) return false;
    JsonValue<T>::fromText(it->second, target);
    return true;
}

inline bool jsonObjectItemToNamedValue(const std::map<std::string, std::string>& items, const std::string& key,
                                       bool& target) {
    auto it = items.find(key);
    if (it == items.end()) return false;
    target = jsonTextToBool(it->second);
    return true;
}

#endif
