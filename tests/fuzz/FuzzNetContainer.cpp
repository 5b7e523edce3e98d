// libFuzzer target: arbitrary bytes as a net container. Odd first byte: the
// checksum is made right first, so that the fuzzer gets past it to the item
// table and the net; even: the image is checked as it comes. An accepted
// container is then asked to classify.
#include <cstring>
#include <vector>

#include "FuzzSupport.h"
#include "faceparts/NeuralClassifier.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    fuzz::Input in(data, size);
    const bool fixChecksum = in.byte() & 1;
    std::vector<uint8_t> image = in.rest();
    if (fixChecksum && image.size() > 88) {
        uint8_t sum[16];
        if (NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(image.data()),
                                       uint32_t(image.size()), sum, 16))
            std::memcpy(image.data(), sum, 16);
    }
    (void)NeuralClassifier::Verify(image.data(), uint32_t(image.size()));
    NeuralClassifier classifier;
    fuzz::refusalIsFine([&] {
        classifier.LoadClassifierData(image.data(), image.size());
        uint32_t inputs = 0, outputs = 0;
        if (!classifier.inputCount(&inputs) || !classifier.outputCount(&outputs)) return;
        if (inputs > (1u << 20) || outputs > (1u << 20)) return;
        std::vector<float> values(inputs);
        for (uint32_t i = 0; i < inputs; ++i) values[i] = float(int32_t(i * 2654435761u) >> 8);
        std::vector<float> results(outputs);
        uint32_t best = 0;
        classifier.Classify(values.data(), inputs, &best, results.data(), outputs);
    });
    return 0;
}
