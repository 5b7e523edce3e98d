#include "core/Json.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <sstream>

const char* const kJsonSerializationError = "Json serialization error";
const char* const kJsonDeserializationError = "Json deserialization error";

namespace {

typedef std::string::size_type Pos;
const Pos kNone = std::string::npos;

[[noreturn]] void failRead() { throw JsonError(kJsonDeserializationError); }

Pos firstNonWhite(const std::string& text, Pos from) {
    for (Pos i = from; i < text.size(); ++i)
        if (!isJsonWhiteSpace(text[i])) return i;
    return kNone;
}

// Reads one value starting at v (first character known to exist). Stores its
// raw text in `value` and returns the position of the next token or kNone.
Pos readValue(const std::string& body, Pos v, std::string& value) {
    const char first = body[v];
    if (first == '"') {
        const Pos end = body.find('"', v + 1);
        if (end == kNone) failRead();
        value.assign(body, v, end - v + 1);
        return moveToNextToken(body, end + 1);
    }
    if (first == '{' || first == '[') {
        const Pos end = findPairedChar(body, v, first == '{' ? '}' : ']');
        value.assign(body, v, end - v + 1);
        return moveToNextToken(body, end + 1);
    }
    // Bare value: the comma search starts behind the first character, so a
    // value may itself begin with a comma.
    const Pos comma = body.find(',', v + 1);
    Pos next = kNone;
    Pos stop = body.size();
    if (comma != kNone) {
        stop = comma;
        next = firstNonWhite(body, comma + 1);
    }
    while (stop > v && isJsonWhiteSpace(body[stop - 1])) --stop;
    value.assign(body, v, stop - v);
    return next;
}

bool enclosed(const std::string& text, char open, char close) {
    return text.size() >= 2 && text.front() == open && text.back() == close;
}

}  // namespace

bool isJsonWhiteSpace(char c) { return c == '\n' || c == '\t' || c == '\f' || c == '\v' || c == ' '; }

Pos moveToNextToken(const std::string& text, Pos pos) {
    if (pos >= text.size()) return kNone;
    const Pos q = firstNonWhite(text, pos);
    if (q == kNone) return kNone;
    if (text[q] != ',') failRead();
    return firstNonWhite(text, q + 1);
}

Pos findPairedChar(const std::string& text, Pos pos, char close) {
    if (pos >= text.size()) failRead();
    const char open = text[pos];
    const char pair[3] = {open, close, '\0'};
    std::deque<char> stack;
    stack.push_back(open);
    for (Pos i = text.find_first_of(pair, pos + 1); i != kNone; i = text.find_first_of(pair, i + 1)) {
        if (text[i] != stack.back()) {
            stack.pop_back();
            if (stack.empty()) return i;
        } else {
            stack.push_back(text[i]);
        }
    }
    failRead();
}

std::map<std::string, std::string> parseJsonObject(const std::string& text) {
    if (!enclosed(text, '{', '}')) failRead();
    const std::string body = text.substr(1, text.size() - 2);
    std::map<std::string, std::string> items;
    Pos pos = firstNonWhite(body, 0);
    while (pos != kNone) {
        if (body[pos] != '"') failRead();
        const Pos keyEnd = body.find('"', pos + 1);
        if (keyEnd == kNone || keyEnd == pos + 1) failRead();
        std::string key = body.substr(pos + 1, keyEnd - pos - 1);
        const Pos colon = firstNonWhite(body, keyEnd + 1);
        if (colon == kNone || body[colon] != ':') failRead();
        const Pos v = firstNonWhite(body, colon + 1);
        if (v == kNone) failRead();
        std::string value;
        pos = readValue(body, v, value);
        items[key] = std::move(value);
    }
    return items;
}

std::vector<std::string> parseJsonArray(const std::string& text) {
    if (!enclosed(text, '[', ']')) failRead();
    const std::string body = text.substr(1, text.size() - 2);
    std::vector<std::string> items;
    Pos pos = firstNonWhite(body, 0);
    while (pos != kNone) {
        std::string value;
        pos = readValue(body, pos, value);
        items.push_back(std::move(value));
    }
    return items;
}

bool jsonTextToBool(const std::string& text) {
    if (text == "true") return true;
    if (text == "false") return false;
    failRead();
}

std::string JsonValue<int>::toText(const int& value) {
    try {
        std::ostringstream out;
        out << value;
        return out.str();
    } catch (const std::exception&) {
        throw JsonError(kJsonSerializationError);
    }
}

void JsonValue<int>::fromText(const std::string& text, int& value) {
    // The stream's state is not looked at: "12abc" reads as 12.
    try {
        std::istringstream in(text);
        in >> value;
    } catch (const std::exception&) {
        failRead();
    }
}

std::string JsonValue<float>::toText(const float& value) {
    try {
        std::ostringstream out;
        out << static_cast<double>(value);
        return out.str();
    } catch (const std::exception&) {
        throw JsonError(kJsonSerializationError);
    }
}

void JsonValue<float>::fromText(const std::string& text, float& value) {
    try {
        std::istringstream in(text);
        in >> value;
    } catch (const std::exception&) {
        failRead();
    }
}

float roundToSixDigits(float value) {
    if (!std::isfinite(value)) return 0.0f;
    // "%g" is the stream's default form, and both read back through strtof.
    char text[32];
    std::snprintf(text, sizeof text, "%g", static_cast<double>(value));
    return std::strtof(text, nullptr);
}

std::string JsonValue<std::string>::toText(const std::string& value) { return "\"" + value + "\""; }

void JsonValue<std::string>::fromText(const std::string& text, std::string& value) {
    if (!enclosed(text, '"', '"')) failRead();
    value = text.substr(1, text.size() - 2);
}
