// libFuzzer target: arbitrary bytes as a net blob, loaded and, when the net is
// accepted, run on inputs that sweep the 16.16 range.
#include <vector>

#include "FuzzSupport.h"
#include "faceparts/NeuralNet.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    // A private copy of exactly the input's size, so that ASan sees any read
    // past the blob, and at an odd address, so that UBSan sees unaligned reads.
    std::vector<uint8_t> room(size + 1);
    std::copy(data, data + size, room.begin() + 1);
    const uint8_t* blob = room.data() + 1;
    NeuralNet net;
    fuzz::refusalIsFine([&] {
        net.loadBuffer(blob, size);
        uint32_t inputs = 0, outputs = 0;
        if (!net.inputCount(&inputs) || !net.outputCount(&outputs)) return;
        if (inputs > (1u << 20) || outputs > (1u << 20)) return;
        std::vector<int32_t> values(inputs);
        for (uint32_t i = 0; i < inputs; ++i) values[i] = int32_t(i * 2654435761u) >> 8;
        std::vector<float> results(outputs);
        uint32_t best = 0;
        net.classifyInts(values.data(), inputs, &best, results.data(), outputs);
    });
    return 0;
}
