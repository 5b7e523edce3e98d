// Writes the hand-written IVB layouts of the golden tests as fuzzing seeds:
//   ivb_fuzz_seeds OBJECT_DIR STREAM_DIR
#include <cstdio>
#include <fstream>
#include <string>
#include <vector>

#include "support/IvbGolden.h"

namespace {
void put(const std::string& path, const std::vector<uint8_t>& bytes) {
    std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()),
                                                static_cast<std::streamsize>(bytes.size()));
}
}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) {
        std::fprintf(stderr, "usage: ivb_fuzz_seeds OBJECT_DIR STREAM_DIR\n");
        return 2;
    }
    const std::string objects = argv[1], streams = argv[2];
    put(objects + "/floats", ivbgolden::compositeWithFloats());
    put(objects + "/empty", ivbgolden::emptyComposite());
    put(objects + "/property", ivbgolden::uint32Property());
    put(objects + "/blob", ivbgolden::byteBlob());
    put(objects + "/facemodel", ivbgolden::faceModel());
    put(objects + "/quantizer", ivbgolden::vectorQuantizer());
    put(objects + "/centroids", ivbgolden::nearestCentroids());
    put(objects + "/pca", ivbgolden::pcaTransform());
    put(streams + "/one_object", ivbgolden::streamWithOneObject());
    put(streams + "/smallest", ivbgolden::smallestStream());
    return 0;
}
