#include "core/ModelRegistry.h"

#include <algorithm>

#include "core/Errors.h"

// Packed model ranges embedded by the build (models/CMakeLists.txt).
extern "C" {
#define QUORIN_MODEL_RANGE(n)                                          \
    extern const uint8_t n##b[] __attribute__((visibility("hidden"))); \
    extern const uint8_t n##e[] __attribute__((visibility("hidden")));
QUORIN_MODEL_RANGE(mdcb)
QUORIN_MODEL_RANGE(mdnb)
QUORIN_MODEL_RANGE(mdpb)
#undef QUORIN_MODEL_RANGE
}

namespace {

bool isNameChar(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

}  // namespace

ModelRegistry& ModelRegistry::instance() {
    static ModelRegistry registry;
    return registry;
}

ModelRegistry::ModelRegistry() : models(builtIns()) {}

std::map<std::string, ModelRegistry::Range> ModelRegistry::builtIns() {
    return {{"mdcb", Range(mdcbb, mdcbe)}, {"mdnb", Range(mdnbb, mdnbe)}, {"mdpb", Range(mdpbb, mdpbe)}};
}

char ModelRegistry::dot2Underscore(char c) { return c == '.' ? '_' : c; }

std::string ModelRegistry::translateModelPath(std::string name) {
    std::transform(name.begin(), name.end(), name.begin(), dot2Underscore);
    for (std::string::size_type i = name.size(); i > 0; --i) {
        if (!isNameChar(name[i - 1])) {
            name.erase(0, i);
            break;
        }
    }
    return name;
}

bool ModelRegistry::findModel(const std::string& name, const uint8_t*& begin, const uint8_t*& end) const {
    auto it = models.find(translateModelPath(name));
    if (it == models.end()) return false;
    begin = it->second.first;
    end = it->second.second;
    return true;
}

void ModelRegistry::registerModel(const std::string& name, const uint8_t* begin, const uint8_t* end) {
    if (name.empty() || !std::all_of(name.begin(), name.end(), isNameChar))
        throw qv_invalid_argument("Model name must be made of letters, digits and '_': \"" + name + "\"");
    if (begin == nullptr || end == nullptr || end < begin)
        throw qv_invalid_argument("Invalid model byte range for \"" + name + "\"");
    models[name] = Range(begin, end);
}

void ModelRegistry::unregisterModel(const std::string& name) {
    const std::map<std::string, Range> fixed = builtIns();
    auto builtIn = fixed.find(name);
    if (builtIn != fixed.end())
        models[name] = builtIn->second;
    else
        models.erase(name);
}
