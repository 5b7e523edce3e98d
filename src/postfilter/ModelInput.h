#ifndef QUORIN_POSTFILTER_MODELINPUT_H
#define QUORIN_POSTFILTER_MODELINPUT_H

#include <cstddef>
#include <cstdint>
#include <vector>

class ModelReader;

// Little-endian value reads for the post filter model loaders. The reader
// itself refuses to read past its payload; on top of that every count taken
// from a model is checked against the payload's size before anything is
// allocated, so that a miscounted model raises qv_data_error instead of
// asking for gigabytes.
namespace postfilter_model {

int32_t readInt32(ModelReader& reader);
float readFloat(ModelReader& reader);

// count values of 4 bytes (int32, float32) or 2 bytes (int16).
std::vector<int32_t> readInt32s(ModelReader& reader, long long count);
std::vector<float> readFloats(ModelReader& reader, long long count);
std::vector<int16_t> readInt16s(ModelReader& reader, long long count);

// Throws qv_data_error when count is negative or count values of valueSize
// bytes cannot fit in the payload.
void requireBytes(ModelReader& reader, long long count, std::size_t valueSize);

} // namespace postfilter_model

#endif
