// libFuzzer target: arbitrary bytes as a JVW record file. The reader works on
// paths, so the input goes to a private temporary file first; a body without
// the right first line is also tried behind it, to reach the records.
#include <cstdio>
#include <fstream>
#include <string>
#include <unistd.h>
#include <vector>

#include "FuzzSupport.h"
#include "quorin/FaceData.h"
#include "quorin/JvwFile.h"

namespace {

const std::string& scratchPath() {
    static const std::string path = "/tmp/quorin-fuzz-jvw-" + std::to_string(::getpid());
    return path;
}

void readAll(const std::string& text) {
    {
        std::ofstream out(scratchPath(), std::ios::binary | std::ios::trunc);
        out << text;
    }
    fuzz::refusalIsFine([&] {
        JvwReader reader(scratchPath());
        for (const FaceData& face : reader.readFaces()) (void)face.toJson();
    });
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string text(data, data + size);
    readAll(text);
    if (text.compare(0, 16, "JVW@QV\tVERSION=1") != 0) readAll("JVW@QV\tVERSION=1\n" + text);
    std::remove(scratchPath().c_str());
    return 0;
}
