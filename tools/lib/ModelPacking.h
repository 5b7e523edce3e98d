#ifndef QUORIN_TOOLS_MODELPACKING_H
#define QUORIN_TOOLS_MODELPACKING_H

// Builds raw model images in memory, byte for byte as tools/pack_models.py
// writes them: 4 seed bytes whose XOR is the key, then the payload with byte p
// XORed with the key and with low8((p % 256)^2). Tests and tools use this to
// serve their own models through ModelRegistry::registerModel.

#include <cstdint>
#include <vector>

namespace modelpacking {

inline uint8_t seedKey(uint32_t seed) {
    return static_cast<uint8_t>((seed & 0xFF) ^ ((seed >> 8) & 0xFF) ^ ((seed >> 16) & 0xFF) ^ (seed >> 24));
}

// The scrambling is its own inverse, so this also unscrambles.
inline void scramblePayload(uint8_t* bytes, std::size_t size, uint8_t key) {
    for (std::size_t p = 0; p < size; ++p) {
        const unsigned c = static_cast<unsigned>(p & 0xFF);
        bytes[p] = static_cast<uint8_t>(bytes[p] ^ key ^ ((c * c) & 0xFF));
    }
}

}  // namespace modelpacking

// `seed` supplies the 4 seed bytes, lowest byte first.
inline std::vector<uint8_t> packRawModel(const std::vector<uint8_t>& payload, uint32_t seed = 0x5A3C9E17u) {
    std::vector<uint8_t> packed;
    packed.reserve(payload.size() + 4);
    for (int i = 0; i < 4; ++i) packed.push_back(static_cast<uint8_t>(seed >> (8 * i)));
    packed.insert(packed.end(), payload.begin(), payload.end());
    modelpacking::scramblePayload(packed.data() + 4, payload.size(), modelpacking::seedKey(seed));
    return packed;
}

#endif
