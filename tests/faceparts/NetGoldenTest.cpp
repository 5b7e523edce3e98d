// The built-in landmark net's integer outputs for fixed inputs, against a file
// written on x86-64: the 16.16 arithmetic must give the same integers on every
// target (armhf under qemu included). Inputs are patches of a deterministic
// generator, in the range the locator feeds (pixels times a gain around 1..3).
//   QUORIN_WRITE_GOLDEN=1 test_net_golden   rewrites the file (x86-64 only)

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/GoldenFile.h"
#include "faceparts/NeuralClassifier.h"
#include "faceparts/NeuralNet.h"
#include "support/SourceTree.h"

namespace {

constexpr int kPatches = 40;

std::string goldenPath() { return sourcetree::root() + "/tests/faceparts/golden/net_outputs.txt"; }

// A smooth face-like patch with noise: a bright oval, dark eye and mouth
// spots moved by the patch index, and xorshift noise; then a gain.
std::vector<int32_t> patch(uint32_t n, int index) {
    const int side = static_cast<int>(n > 0 ? std::lround(std::sqrt(double(n))) : 0);
    std::vector<int32_t> values(n);
    uint32_t state = 2463534242u + 977u * uint32_t(index);
    const int shift = index % 7 - 3;
    for (uint32_t i = 0; i < n; ++i) {
        state ^= state << 13;
        state ^= state >> 17;
        state ^= state << 5;
        const int x = side ? int(i % side) : 0, y = side ? int(i / side) : 0;
        const int cx = x - side / 2 - shift, cy = y - side / 2;
        int v = 40 + int(state % 30);
        if (4 * cx * cx + 3 * cy * cy < side * side) v += 120;
        if (std::abs(cy + side / 6) < 2 && (std::abs(cx - side / 5) < 2 || std::abs(cx + side / 5) < 2)) v -= 90;
        if (std::abs(cy - side / 4) < 2 && std::abs(cx) < side / 5) v -= 70;
        values[i] = v * (1 + index % 3);
    }
    return values;
}

}  // namespace

TEST(NetGolden, BuiltInNetGivesTheRecordedIntegers) {
    NeuralClassifier classifier;
    classifier.loadFromPath("mdnb");
    NeuralNet* net = classifier.net();
    ASSERT_NE(net, nullptr);
    const uint32_t inputs = net->inputSize(), outputs = net->outputSize();
    ASSERT_GT(inputs, 0u);
    std::vector<std::string> lines;
    for (int k = 0; k < kPatches; ++k) {
        const std::vector<int32_t> in = patch(inputs, k);
        uint32_t best = 0;
        const int32_t* out = net->Run(in.data(), &best);
        ASSERT_NE(out, nullptr);
        std::ostringstream line;
        line << "patch " << k << " best=" << best << " :";
        for (uint32_t i = 0; i < outputs; ++i) line << " " << out[i];
        lines.push_back(line.str());
    }
    expectGoldenLines(goldenPath(), "landmark net outputs for generated patches, written on x86-64; see NetGoldenTest.cpp", lines);
}
