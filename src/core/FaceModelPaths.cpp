#include "core/FaceModelPaths.h"

#include <fstream>
#include <iterator>
#include <map>

#include <boost/algorithm/string/classification.hpp>
#include <boost/algorithm/string/trim.hpp>

#include "core/ApiError.h"
#include "core/Descramble.h"
#include "core/Json.h"
#include "core/ScrambledTexts.h"

// Generated from models/config/default.json at build time (stored form).
extern const std::string g_defaultConfigurationText;

namespace {

std::string restoreDefaultText() {
    std::string text = g_defaultConfigurationText;
    for (std::string::size_type i = 0; i < text.size(); ++i) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        text[i] = static_cast<char>((i & 127) ^ (c >> 1));
    }
    return text;
}

std::string readFile(const char* path) {
    std::ifstream in;
    in.exceptions(std::ifstream::badbit | std::ifstream::failbit);
    in.open(path, std::ios::in | std::ios::binary);
    std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    in.close();
    return text;
}

std::string fieldOf(const std::map<std::string, std::string>& items, const char* key) {
    auto it = items.find(key);
    return it == items.end() ? std::string() : it->second;
}

}  // namespace

FaceModelPaths::FaceModelPaths() {}

FaceModelPaths::FaceModelPaths(const char* path) { init(path); }

FaceModelPaths::~FaceModelPaths() { release(); }

void FaceModelPaths::init(const char* path) {
    try {
        std::string text = path == nullptr ? restoreDefaultText() : readFile(path);
        boost::algorithm::trim_if(text, boost::algorithm::is_any_of("\n\t\f\v "));
        fromJson(text);
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kConfigurationLoadFailed));
    }
}

void FaceModelPaths::release() {
    detection_.clear();
    representation_.clear();
    recognition_.clear();
    attribute_.clear();
}

std::string FaceModelPaths::toJson() const {
    std::string text = "{";
    const std::pair<const char*, const std::string*> fields[] = {
        {"detection", &detection_},
        {"representation", &representation_},
        {"recognition", &recognition_},
        {"attribute", &attribute_}};
    bool first = true;
    for (const auto& field : fields) {
        if (field.second->empty()) continue;
        if (!first) text += ",";
        text += "\"" + std::string(field.first) + "\":" + *field.second;
        first = false;
    }
    return text + "}";
}

void FaceModelPaths::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    detection_ = fieldOf(items, "detection");
    representation_ = fieldOf(items, "representation");
    recognition_ = fieldOf(items, "recognition");
    attribute_ = fieldOf(items, "attribute");
}
