#include "postfilter/ModelInput.h"

#include <cstring>

#include "container/ModelReader.h"
#include "core/Errors.h"

namespace postfilter_model {

namespace {

// Reads count values of valueSize bytes as one block (the reader stops at the
// payload's end) and returns the bytes.
std::vector<uint8_t> readBlock(ModelReader& reader, long long count, std::size_t valueSize)
{
    requireBytes(reader, count, valueSize);
    std::vector<uint8_t> bytes(static_cast<std::size_t>(count) * valueSize);
    if (!bytes.empty())
        reader.read(bytes.data(), static_cast<unsigned>(valueSize), static_cast<unsigned>(count));
    return bytes;
}

uint32_t le32(const uint8_t* p)
{
    return uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16 | uint32_t(p[3]) << 24;
}

float floatOf(uint32_t bits)
{
    float value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

} // namespace

void requireBytes(ModelReader& reader, long long count, std::size_t valueSize)
{
    if (count < 0)
        throw qv_data_error("PostFilter model holds a negative count");
    if (static_cast<unsigned long long>(count) > reader.rawSize() / valueSize)
        throw qv_data_error("PostFilter model count exceeds its data");
}

int32_t readInt32(ModelReader& reader)
{
    return static_cast<int32_t>(le32(readBlock(reader, 1, 4).data()));
}

float readFloat(ModelReader& reader)
{
    return floatOf(le32(readBlock(reader, 1, 4).data()));
}

std::vector<int32_t> readInt32s(ModelReader& reader, long long count)
{
    std::vector<uint8_t> bytes = readBlock(reader, count, 4);
    std::vector<int32_t> values(static_cast<std::size_t>(count));
    for (std::size_t i = 0; i < values.size(); ++i)
        values[i] = static_cast<int32_t>(le32(&bytes[4 * i]));
    return values;
}

std::vector<float> readFloats(ModelReader& reader, long long count)
{
    std::vector<uint8_t> bytes = readBlock(reader, count, 4);
    std::vector<float> values(static_cast<std::size_t>(count));
    for (std::size_t i = 0; i < values.size(); ++i)
        values[i] = floatOf(le32(&bytes[4 * i]));
    return values;
}

std::vector<int16_t> readInt16s(ModelReader& reader, long long count)
{
    std::vector<uint8_t> bytes = readBlock(reader, count, 2);
    std::vector<int16_t> values(static_cast<std::size_t>(count));
    for (std::size_t i = 0; i < values.size(); ++i)
        values[i] = static_cast<int16_t>(uint16_t(bytes[2 * i]) | uint16_t(bytes[2 * i + 1]) << 8);
    return values;
}

} // namespace postfilter_model
