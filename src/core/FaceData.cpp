#include "core/FaceData.h"

#include <exception>
#include <limits>
#include <map>

#include "core/Json.h"

namespace {

// Reads one record-valued field; any failure inside becomes the codec's error.
template <typename T>
void readField(const std::map<std::string, std::string>& items, const char* key, T& field) {
    auto it = items.find(key);
    if (it == items.end()) return;
    try {
        field.fromJson(it->second);
    } catch (const std::exception&) {
        throw JsonError(kJsonDeserializationError);
    }
}

}  // namespace

FaceData::FaceData()
    : faceScore_(std::numeric_limits<float>::lowest()), goodFace_(true), personID_(-1), age_(-1.0f) {}

Point2<float> FaceData::landmark(const std::string& name) const { return landmarks_.landmark(name); }

void FaceData::setLandmark(const std::string& name, const Point2<float>& p) { landmarks_.setLandmark(name, p); }

int32_t FaceData::faceWidth() const {
    return static_cast<int32_t>(static_cast<uint32_t>(faceRect_.right) - static_cast<uint32_t>(faceRect_.left));
}

int32_t FaceData::faceHeight() const {
    return static_cast<int32_t>(static_cast<uint32_t>(faceRect_.bottom) - static_cast<uint32_t>(faceRect_.top));
}

std::string FaceData::toJson() const {
    const char* sep = ", ";
    std::string text = "{";
    text += jsonNamedValue("dataSet", dataSet_) + sep;
    text += jsonNamedValue("filePath", filePath_) + sep;
    text += jsonNamedValue("faceRect", faceRect_) + sep;
    text += jsonNamedValue("faceScore", faceScore_) + sep;
    text += jsonNamedValue("landmarks", landmarks_) + sep;
    text += jsonNamedValue("goodFace", goodFace_) + sep;
    text += jsonNamedValue("personID", personID_) + sep;
    text += jsonNamedValue("personName", personName_) + sep;
    text += jsonNamedValue("age", age_) + sep;
    text += jsonNamedValue("ageInterval", ageInterval_) + sep;
    text += jsonNamedValue("race", race_) + sep;
    text += jsonNamedValue("gender", gender_) + sep;
    text += jsonNamedValue("facePose", facePose_);
    return text + "}";
}

void FaceData::fromJson(const std::string& text) {
    std::map<std::string, std::string> items = parseJsonObject(text);
    jsonObjectItemToNamedValue(items, "dataSet", dataSet_);
    jsonObjectItemToNamedValue(items, "filePath", filePath_);
    readField(items, "faceRect", faceRect_);
    jsonObjectItemToNamedValue(items, "faceScore", faceScore_);
    readField(items, "landmarks", landmarks_);
    jsonObjectItemToNamedValue(items, "goodFace", goodFace_);
    jsonObjectItemToNamedValue(items, "personID", personID_);
    jsonObjectItemToNamedValue(items, "personName", personName_);
    jsonObjectItemToNamedValue(items, "age", age_);
    readField(items, "ageInterval", ageInterval_);
    readField(items, "race", race_);
    readField(items, "gender", gender_);
    readField(items, "facePose", facePose_);
}
