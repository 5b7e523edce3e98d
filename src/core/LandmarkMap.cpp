#include "core/LandmarkMap.h"

#include <stdexcept>

const char* const kNoLandmarkValue = "No value available for the input landmark";

std::string JsonValue<std::map<std::string, Point2<float>>>::toText(
    const std::map<std::string, Point2<float>>& value) {
    std::string text = "{";
    bool first = true;
    for (const auto& entry : value) {
        if (!first) text += ",";
        first = false;
        text += jsonNamedValue(entry.first, entry.second);
    }
    return text + "}";
}

void JsonValue<std::map<std::string, Point2<float>>>::fromText(const std::string& text,
                                                                 std::map<std::string, Point2<float>>& value) {
    std::map<std::string, std::string> items = parseJsonObject(text);
    value.clear();
    for (const auto& item : items) {
        try {
            Point2<float> point;
            point.fromJson(item.second);
            value[item.first] = point;
        } catch (const std::exception&) {
            throw JsonError(kJsonDeserializationError);
        }
    }
}

Point2<float> LandmarkMap::landmark(const std::string& name) const {
    auto it = points_.find(name);
    if (it == points_.end()) throw std::invalid_argument(kNoLandmarkValue);
    return it->second;
}

void LandmarkMap::setLandmark(const std::string& name, const Point2<float>& point) { points_[name] = point; }

std::string LandmarkMap::toJson() const { return JsonValue<Points>::toText(points_); }

void LandmarkMap::fromJson(const std::string& text) { JsonValue<Points>::fromText(text, points_); }
