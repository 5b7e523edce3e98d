#ifndef QUORIN_TESTS_SCOPEDMODEL_H
#define QUORIN_TESTS_SCOPEDMODEL_H

#include <cstdint>
#include <string>
#include <vector>

#include "ModelPacking.h"
#include "core/ModelRegistry.h"

// Serves a payload as a raw model under `name` for the lifetime of the object:
//     ScopedModel model("testcascade", bytes);
//     ModelReader reader("testcascade", ModelReader::RAW);
// Registering a built-in name ("mdcb") overrides it; the built-in comes back
// on destruction.
class ScopedModel {
public:
    ScopedModel(const std::string& name, const std::vector<uint8_t>& payload, uint32_t seed = 0x5A3C9E17u)
        : name_(name), packed_(packRawModel(payload, seed)) {
        ModelRegistry::instance().registerModel(name_, packed_.data(), packed_.data() + packed_.size());
    }
    // Serves bytes exactly as given (no seed, no scrambling): for malformed ranges.
    static ScopedModel raw(const std::string& name, const std::vector<uint8_t>& bytes) {
        return ScopedModel(name, bytes, RawTag());
    }
    ScopedModel(ScopedModel&& other) : name_(std::move(other.name_)), packed_(std::move(other.packed_)) {
        other.name_.clear();
    }
    ~ScopedModel() {
        if (!name_.empty()) ModelRegistry::instance().unregisterModel(name_);
    }
    ScopedModel(const ScopedModel&) = delete;
    ScopedModel& operator=(const ScopedModel&) = delete;

    const std::vector<uint8_t>& packed() const { return packed_; }

private:
    struct RawTag {};
    ScopedModel(const std::string& name, const std::vector<uint8_t>& bytes, RawTag) : name_(name), packed_(bytes) {
        if (packed_.empty()) packed_.reserve(1);  // a valid pointer even for an empty range
        ModelRegistry::instance().registerModel(name_, packed_.data(), packed_.data() + packed_.size());
    }

    std::string name_;
    std::vector<uint8_t> packed_;
};

#endif
