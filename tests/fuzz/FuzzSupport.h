#ifndef QUORIN_TESTS_FUZZ_FUZZSUPPORT_H
#define QUORIN_TESTS_FUZZ_FUZZSUPPORT_H

// Shared pieces of the libFuzzer targets. A target passes when the library
// either works or refuses with one of the failures it documents: an exception
// derived from std::exception, or one of the three C strings it throws. A
// crash, overrun, leak, other thrown type or runaway allocation is a finding.

#include <cstdint>
#include <exception>
#include <string>
#include <vector>

#include "ModelPacking.h"
#include "core/ModelRegistry.h"

namespace fuzz {

// Runs `body`, swallowing the documented failures.
template <typename F>
void refusalIsFine(F&& body) {
    try {
        body();
    } catch (const std::exception&) {
    } catch (const char*) {
    }
}

// Consumes the input front to back: small choices first, the rest as payload.
class Input {
public:
    Input(const uint8_t* data, size_t size) : data_(data), size_(size) {}
    uint8_t byte() { return pos_ < size_ ? data_[pos_++] : 0; }
    uint16_t u16() { return uint16_t(byte() | (uint16_t(byte()) << 8)); }
    std::vector<uint8_t> rest() {
        std::vector<uint8_t> r(data_ + pos_, data_ + size_);
        pos_ = size_;
        return r;
    }

private:
    const uint8_t* data_;
    size_t size_;
    size_t pos_ = 0;
};

// Serves `payload` as a raw built-in model under `name` while in scope, packed
// as the registry stores models (seed bytes, scrambled payload).
class ServedModel {
public:
    ServedModel(const std::string& name, const std::vector<uint8_t>& payload)
        : name_(name), packed_(packRawModel(payload)) {
        ModelRegistry::instance().registerModel(name_, packed_.data(), packed_.data() + packed_.size());
    }
    ~ServedModel() { ModelRegistry::instance().unregisterModel(name_); }
    ServedModel(const ServedModel&) = delete;
    ServedModel& operator=(const ServedModel&) = delete;

private:
    std::string name_;
    std::vector<uint8_t> packed_;
};

// A deterministic gray frame: a bright square on a gradient, so that a model
// that works at all gets past its first stages somewhere.
inline std::vector<unsigned char> testFrame(int width, int height) {
    std::vector<unsigned char> pixels(size_t(width) * height);
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x) {
            const bool inside = x > width / 4 && x < 3 * width / 4 && y > height / 4 && y < 3 * height / 4;
            pixels[size_t(y) * width + x] = inside ? 220 : static_cast<unsigned char>((x + 2 * y) & 0x7F);
        }
    return pixels;
}

}  // namespace fuzz

#endif
