#ifndef QUORIN_CORE_MODELREGISTRY_H
#define QUORIN_CORE_MODELREGISTRY_H

#include <cstdint>
#include <map>
#include <string>
#include <utility>

// The built-in models by name: byte ranges of constant data inside the library
// ("mdcb", "mdnb", "mdpb"). Pointers are handed out, the bytes are never copied.
class ModelRegistry {
public:
    typedef std::pair<const uint8_t*, const uint8_t*> Range;

    // The process-wide registry, made at first use.
    static ModelRegistry& instance();

    static char dot2Underscore(char c);

    // A path reduces to its last component with dots turned into underscores:
    // "models/mdcb" -> "mdcb", "mdcb.bin" -> "mdcb_bin".
    static std::string translateModelPath(std::string name);

    // Ensures: true and [begin, end) set when the translated name is known;
    // false with both out-parameters untouched otherwise.
    bool findModel(const std::string& name, const uint8_t*& begin, const uint8_t*& end) const;

    // Test and tool hook: serve [begin, end) under `name` (which must be a
    // plain registry name of [A-Za-z0-9_]) until unregisterModel. The bytes
    // must outlive the registration. Replacing a built-in name is allowed;
    // unregistering it brings the built-in range back.
    // Throws qv_invalid_argument for a bad name or range.
    void registerModel(const std::string& name, const uint8_t* begin, const uint8_t* end);
    void unregisterModel(const std::string& name);

    ModelRegistry(const ModelRegistry&) = delete;
    ModelRegistry& operator=(const ModelRegistry&) = delete;

private:
    ModelRegistry();
    static std::map<std::string, Range> builtIns();

    std::map<std::string, Range> models;
};

#endif
