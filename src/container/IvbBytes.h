#ifndef QUORIN_CONTAINER_IVBBYTES_H
#define QUORIN_CONTAINER_IVBBYTES_H

#include <cstdint>

// Little-endian field access for the IVB formats, byte by byte so that it holds
// on any host and at any alignment.
namespace ivb {

constexpr uint64_t kObjectHeaderSize = 16;
constexpr uint8_t kBasic = 1;
constexpr uint8_t kComposite = 2;
constexpr uint16_t kTerminalTag = 0xFFFF;

inline uint16_t getU16(const uint8_t* p) { return static_cast<uint16_t>(p[0] | (p[1] << 8)); }

inline uint64_t getU64(const uint8_t* p) {
    uint64_t v = 0;
    for (int i = 7; i >= 0; --i) v = (v << 8) | p[i];
    return v;
}

inline void putU16(uint8_t* p, uint16_t v) {
    p[0] = static_cast<uint8_t>(v);
    p[1] = static_cast<uint8_t>(v >> 8);
}

inline void putU64(uint8_t* p, uint64_t v) {
    for (int i = 0; i < 8; ++i) p[i] = static_cast<uint8_t>(v >> (8 * i));
}

// size, kind, subType and six reserved zero bytes.
inline void putObjectHeader(uint8_t* p, uint64_t size, uint8_t kind, uint8_t subType) {
    putU64(p, size);
    p[8] = kind;
    p[9] = subType;
    for (int i = 10; i < 16; ++i) p[i] = 0;
}

}  // namespace ivb

#endif
