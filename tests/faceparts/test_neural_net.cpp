// The fixed-point net: its 16.16 helpers, the blob reader with its bounds, and
// the forward pass against the reference in tools/lib/NetWriter.h.

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "NetWriter.h"
#include "core/Errors.h"
#include "faceparts/NeuralNet.h"
#include "support/ExpectThrow.h"

using netwriter::NetDescription;
using netwriter::Span;

namespace {

// A 3-4-2 soft-max net of the given version with fixed weights.
NetDescription smallNet(uint16_t version = 12) {
    return netwriter::denseNet({3, 4, 2}, {0, TXF_SIGMOID, TXF_SOFTMAX}, {1, 16, 64}, 7, 300, true, version);
}

// An n-to-n linear net copying input i to output i (no biases).
NetDescription identityNet(uint16_t n) {
    NetDescription d = netwriter::denseNet({n, n}, {0, TXF_LINEAR}, {1, 1}, 1, 0, false);
    for (uint16_t i = 0; i < n; ++i) {
        std::vector<int16_t> w(n, 0);
        w[i] = 1;
        d.spans[1][i] = {Span{n, w, -1}};
    }
    return d;
}

// The net reads from the blob it was loaded from, so the two live together.
struct LoadedNet {
    std::vector<uint8_t> blob;
    NeuralNet net;
    bool ok = false;
    explicit LoadedNet(const NetDescription& d) : blob(netwriter::writeBlob(d)) {
        try {
            net.loadBuffer(blob.data(), blob.size());
            ok = true;
        } catch (const qv_operation_error&) {
        }
    }
    std::vector<int32_t> run(const std::vector<int32_t>& in, uint32_t* best = nullptr) {
        uint32_t ignored = 0;
        const int32_t* out = net.Run(in.data(), best ? best : &ignored);
        return out ? std::vector<int32_t>(out, out + net.outputSize()) : std::vector<int32_t>();
    }
};

bool loads(const NetDescription& d) { return LoadedNet(d).ok; }

// Loads d and checks the library against the reference on random inputs,
// full-range ones among them.
void expectMatchesReference(const NetDescription& d, uint32_t seed, int trials = 20) {
    LoadedNet loaded(d);
    ASSERT_TRUE(loaded.ok);
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int32_t> small(-70000, 70000);
    std::uniform_int_distribution<int32_t> any(INT32_MIN, INT32_MAX);
    for (int t = 0; t < trials; ++t) {
        std::vector<int32_t> in(d.layerSizes[0], 0);
        if (t > 0)
            for (auto& v : in) v = (t % 4 == 3) ? any(rng) : small(rng);
        uint32_t bestLib = 99, bestRef = 99;
        const std::vector<int32_t> expected = netwriter::referenceRun(d, in, &bestRef);
        ASSERT_EQ(loaded.run(in, &bestLib), expected) << "trial " << t;
        ASSERT_EQ(bestLib, bestRef) << "trial " << t;
    }
}

}  // namespace

TEST(FixedPoint, SigmoidFollowsItsTableAndSaturatesAtNine) {
    EXPECT_EQ(Sigmoid16(INT32_MIN), 0);
    EXPECT_EQ(Sigmoid16(INT32_MAX), 0x10000);
    EXPECT_LE(Sigmoid16(0x8FFFF), 0xFFFF);  // the last interval leans on the 0xFFFF entry
    for (int32_t x = -0x98000; x <= 0x98000; x += 37) {
        ASSERT_EQ(Sigmoid16(x), netwriter::ref::sigmoid16(x)) << x;
        ASSERT_EQ(Sigmoid16(x) + Sigmoid16(-x), 0x10000) << x;
    }
}

TEST(NetReader, LoadsEveryLayoutVersionAndTheOldOneDoesNotRun) {
    for (uint16_t version : {10, 11, 12, 13}) EXPECT_TRUE(loads(smallNet(version))) << version;
    LoadedNet old(smallNet(2));
    EXPECT_TRUE(old.ok && old.run({1, 1, 1}).empty());  // no transfer types in this layout
    EXPECT_FALSE(loads(smallNet(3)));
    // A single soft-max output reports two values and has room for them.
    LoadedNet single(netwriter::denseNet({3, 1}, {0, TXF_SOFTMAX}, {1, 1}, 2));
    EXPECT_EQ(single.net.workBufferLength(), 5);
    uint32_t n = 0;
    EXPECT_TRUE(single.net.outputCount(&n));
    EXPECT_EQ(n, 2u);
}

// Broken value fields are left to FuzzNetBlob (run under the sanitizers);
// sizes and truncations keep their cases here.
TEST(NetReader, RefusesBadSizesAndEveryTruncation) {
    const auto good = netwriter::writeBlob(smallNet());
    NeuralNet net;
    EXPECT_THROW(net.loadBuffer(nullptr, good.size()), qv_operation_error);
    EXPECT_THROW(net.loadBuffer(good.data(), uint64_t(1) << 33), qv_operation_error);
    std::vector<uint8_t> b = good;
    b[b.size() - 4] ^= 4;  // the size word must name the end of itself
    EXPECT_THROW(net.loadBuffer(b.data(), b.size()), qv_operation_error);
    b = good;
    b.insert(b.end(), {0, 0});  // trailing bytes behind the size word are allowed
    EXPECT_NO_THROW(net.loadBuffer(b.data(), b.size()));
    expectEveryCutThrows<qv_operation_error>(
        good, [&](const auto& cut) { net.loadBuffer(cut.empty() ? nullptr : cut.data(), cut.size()); });
}

TEST(NetReader, FailedLoadKeepsThePreviousNetRunning) {
    LoadedNet loaded(smallNet());
    const std::vector<int32_t> in = {100, -200, 300};
    const auto before = loaded.run(in);
    NetDescription d = netwriter::denseNet({5, 6}, {0, 0}, {1, 1}, 1);
    d.kind = 9;
    const auto bad = netwriter::writeBlob(d);
    EXPECT_THROW(loaded.net.loadBuffer(bad.data(), bad.size()), qv_operation_error);
    EXPECT_EQ(loaded.run(in), before);
    EXPECT_EQ(loaded.net.inputSize(), 3u);
}

TEST(NetRun, MatchesTheReferenceForEveryTransferTypeVersionAndShape) {
    for (uint32_t hidden : {uint32_t(TXF_LINEAR), uint32_t(TXF_SIGMOID), uint32_t(TXF_ABS), 77u})
        for (uint32_t last : {uint32_t(TXF_LINEAR), uint32_t(TXF_SOFTMAX), uint32_t(TXF_ABS), uint32_t(TXF_SOFTMAX_PAIR), 2u}) {
            SCOPED_TRACE(testing::Message() << hidden << "/" << last);
            expectMatchesReference(netwriter::denseNet({6, 5, 4}, {0, hidden, last}, {1, 32, 256}, hidden * 31 + last), last);
        }
    const NetDescription nets[] = {
        netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 0, 0}, 1),  // careful layers
        netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 8, 8}, 2, 300, true, 10),
        netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 8, 8}, 3, 300, true, 11),
        netwriter::denseNet({5, 3, 1}, {0, 1, 4}, {1, 8, 64}, 4),  // one-neuron soft-max
        netwriter::denseNet({4, 2}, {0, 11}, {1, 1}, 5),           // pair of one each
        netwriter::denseNet({3, 7, 5, 3, 10}, {0, 1, 10, 1, 0}, {1, 64, 4, 128, 1024}, 6, 32767),
        netwriter::denseNet({7, 3, 2}, {0, 1, 4}, {1, 2, 2}, 7, 300, false),  // no biases
    };
    for (size_t i = 0; i < std::size(nets); ++i) {
        SCOPED_TRACE(i);
        expectMatchesReference(nets[i], uint32_t(i));
    }
}

TEST(NetRun, InputScalingSaturatesAtBothEndsToPositiveFullScale) {
    NetDescription d = identityNet(3);
    d.inputMeans = {100, 100, 100};
    d.inputDivisors = {65535, 65535, 1};
    d.inputOffsets = {0, 0, 65535 * 2};
    LoadedNet loaded(d);
    ASSERT_TRUE(loaded.ok);
    // Largest input: 65535 - mean, no division. Smallest: -mean.
    EXPECT_EQ(loaded.run({INT32_MAX, INT32_MIN, 3}), (std::vector<int32_t>{65435, -100, 65535}));
    // (x*65535 - offset)/divisor, no mean; far below the range gives +65535.
    EXPECT_EQ(loaded.run({7, -1, 2}), (std::vector<int32_t>{7, -1, 0}));
    EXPECT_EQ(loaded.run({7, -1, -1})[2], 65535);
    EXPECT_EQ(loaded.run({1, 0, 1})[2], 65535);  // q = -65535 saturates to +65535
}

