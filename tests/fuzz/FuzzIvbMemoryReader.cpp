// libFuzzer target: arbitrary bytes as an IVB stream in memory, walked in order
// and searched by name. Any exception is a clean refusal.
#include <cstdint>
#include <exception>
#include <vector>

#include "quorin/QVIVBStream.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    try {
        QVIVBMemoryReader reader(data, data + size);
        // Each record takes at least 4 bytes, so this many reads reach the end.
        for (size_t i = 0; i <= size / 4 + 1 && !reader.atEnd(); ++i) reader.readNextObject();
    } catch (const std::exception&) {
    }
    try {
        QVIVBMemoryReader reader(data, data + size);
        reader.readNamedObject("ab");
        reader.readNextObject();
        reader.readNamedObject(std::string());
    } catch (const std::exception&) {
    }
    return 0;
}
