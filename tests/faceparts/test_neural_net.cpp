// The fixed-point net: its 16.16 helpers, the blob reader with its bounds, and
// the forward pass against the reference in tools/lib/NetWriter.h.

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <functional>
#include <random>
#include <vector>

#include "NetWriter.h"
#include "core/Errors.h"
#include "faceparts/NeuralNet.h"

using netwriter::NetDescription;
using netwriter::Span;

namespace {

// A 3-4-2 net of the given version and last-layer type with fixed weights.
NetDescription smallNet(uint16_t version = 12, uint32_t lastType = TXF_SOFTMAX) {
    return netwriter::denseNet({3, 4, 2}, {0, TXF_SIGMOID, lastType}, {1, 16, 64}, 7, 300, true, version);
}

// An n-to-n linear net copying input i to output i (no biases).
NetDescription identityNet(uint16_t n, uint16_t version = 12) {
    NetDescription d = netwriter::denseNet({n, n}, {0, TXF_LINEAR}, {1, 1}, 1, 0, false, version);
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

TEST(FixedPoint, DivisionSaturatesOnZeroAndIsExactWhereOnlyZeroBitsAreDropped) {
    const int32_t cases[][3] = {{0, 0, 0},           {5, 0, INT32_MAX},  {-5, 0, INT32_MIN},
                                {-3, 2, -0x18000},   {3, -2, -0x18000},  {-3, -2, 0x18000}};
    for (const auto& c : cases) EXPECT_EQ(Div16(c[0], c[1]), c[2]) << c[0] << "/" << c[1];
    std::mt19937 rng(3);
    for (int i = 0; i < 3000; ++i) {
        // Small, mid-size (denominator a multiple of 256) and large
        // numerators (denominator a multiple of 65536) divide exactly.
        const int64_t small = int64_t(rng() % 0x10000), b = 1 + int64_t(rng() % 0x7FFFFFFF);
        ASSERT_EQ(Div16(int32_t(small), int32_t(b)), (small << 16) / b) << small << "/" << b;
        const int64_t mid = 0x10000 + int64_t(rng() % 0xFF0000), b8 = int64_t(1 + rng() % 0x7FFF) << 8;
        if (((mid << 16) / b8) <= INT32_MAX) {
            ASSERT_EQ(Div16(int32_t(mid), int32_t(b8)), (mid << 16) / b8) << mid << "/" << b8;
        }
        const int64_t big = 0x1000000 + int64_t(rng() % 0x7EFFFFFF), b16 = int64_t(0x100 + rng() % 0x7E00) << 16;
        ASSERT_EQ(Div16(int32_t(big), int32_t(b16)), (big << 16) / b16) << big << "/" << b16;
        ASSERT_EQ(Div16(int32_t(-big), int32_t(b16)), -((big << 16) / b16));
        // A tiny denominator with a mid-size numerator loses only the low 8 bits.
        const int64_t tiny = 1 + int64_t(rng() % 0xFF);
        if (mid * 65536 / tiny <= INT32_MAX) {
            const int64_t exact = (mid << 16) / tiny, got = Div16(int32_t(mid), int32_t(tiny));
            ASSERT_TRUE(got <= exact && got > exact - 256) << mid << "/" << tiny;
        }
    }
}

TEST(NetReader, LoadsEveryLayoutVersionAndTheOldOneDoesNotRun) {
    for (uint16_t version : {10, 11, 12, 13}) {
        LoadedNet loaded(smallNet(version));
        ASSERT_TRUE(loaded.ok) << version;
        EXPECT_EQ(loaded.net.inputSize(), 3u);
        EXPECT_EQ(loaded.net.outputSize(), 2u);
        EXPECT_EQ(loaded.net.workBufferLength(), 9);
    }
    LoadedNet old(smallNet(2));
    ASSERT_TRUE(old.ok);
    EXPECT_TRUE(old.run({1, 1, 1}).empty());  // no transfer types in this layout
    EXPECT_FALSE(loads(smallNet(3)));
    // A single soft-max output reports two values and has room for them.
    LoadedNet single(netwriter::denseNet({3, 1}, {0, TXF_SOFTMAX}, {1, 1}, 2));
    EXPECT_EQ(single.net.workBufferLength(), 5);
    uint32_t n = 0;
    EXPECT_TRUE(single.net.outputCount(&n));
    EXPECT_EQ(n, 2u);
}

// Wrong value fields, and (our own checks beyond the format's) spans and
// totals that would take a run outside the work buffer.
TEST(NetReader, RefusesBrokenFieldsWithItsMessage) {
    const std::vector<std::pair<const char*, std::function<void(NetDescription&)>>> breakers = {
        {"kind", [](NetDescription& d) { d.kind = 3; }},
        {"marker", [](NetDescription& d) { d.marker = 1; }},
        {"wide size", [](NetDescription& d) { d.wideSize = 4; }},
        {"narrow size", [](NetDescription& d) { d.narrowSize = 8; }},
        {"weight size", [](NetDescription& d) { d.weightSize = 4; }},
        {"zero input divisor", [](NetDescription& d) { d.inputDivisors[1] = 0; }},
        {"negative input divisor", [](NetDescription& d) { d.inputDivisors[2] = -4; }},
        {"empty last layer",
         [](NetDescription& d) {
             d.layerSizes = {3, 4, 0};
             d.spans[2].assign(4, std::vector<Span>(1, Span{7, {1}, -1}));
             d.biases[2].clear();
         }},
        {"9 neurons: 8 is the last, two weights reach 9", [](NetDescription& d) { d.spans[2][1][0].firstTarget = 8; }},
        {"a span claiming one weight more than the stream holds",
         [](NetDescription& d) {
             Span& s = d.spans[2][3][0];
             s.lastTarget = int32_t(s.firstTarget + s.weights.size() - 1);
             s.weights.pop_back();
         }},
        {"input neurons sharing one marker: layer 2 runs short",
         [](NetDescription& d) {
             for (auto& n : d.spans[1]) n[0].marker = 5;
         }},
        {"neuron total 2", [](NetDescription& d) { d.neuronTotal = 2; }},
        {"neuron total 10", [](NetDescription& d) { d.neuronTotal = 10; }},
    };
    for (const auto& b : breakers) {
        NetDescription d = smallNet();
        b.second(d);
        const auto blob = netwriter::writeBlob(d);
        NeuralNet net;
        try {
            net.loadBuffer(blob.data(), blob.size());
            ADD_FAILURE() << b.first << " loaded";
        } catch (const qv_operation_error& e) {
            EXPECT_STREQ(e.what(), "Failed to set algorithm in CNeuralNet") << b.first;
        }
    }
}

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
    for (size_t n = 0; n < good.size(); ++n) {
        // A copy of exactly n bytes, so that ASan sees any read past it.
        std::vector<uint8_t> cut(good.begin(), good.begin() + n);
        EXPECT_THROW(net.loadBuffer(cut.empty() ? nullptr : cut.data(), n), qv_operation_error) << n;
    }
}

TEST(NetReader, RandomCorruptionNeverEscapesTheBlob) {
    // Nets that still pass must run without touching memory outside the blob
    // and the work buffer; ASan and UBSan watch the runs.
    const NetDescription shapes[] = {
        smallNet(12, TXF_SOFTMAX),
        netwriter::denseNet({4, 3, 1}, {0, TXF_ABS, TXF_SOFTMAX}, {1, 0, 8}, 11),
        netwriter::denseNet({2, 2, 2}, {0, TXF_LINEAR, TXF_SOFTMAX_PAIR}, {1, 4, 1}, 12, 300, true, 10),
    };
    std::mt19937 rng(20240611);
    int passed = 0;
    for (const NetDescription& d : shapes) {
        const auto good = netwriter::writeBlob(d);
        for (int trial = 0; trial < 3000; ++trial) {
            std::vector<uint8_t> b = good;
            for (int f = 1 + int(rng() % 4); f > 0; --f) {
                const size_t at = rng() % b.size();
                b[at] = (rng() % 3 == 0) ? uint8_t(rng()) : uint8_t(b[at] ^ (1u << (rng() % 8)));
            }
            if (rng() % 4 == 0) b.resize(rng() % b.size());
            std::vector<uint8_t> exact(b);  // exact-size heap copy for ASan
            NeuralNet net;
            try {
                net.loadBuffer(exact.empty() ? nullptr : exact.data(), exact.size());
            } catch (const qv_operation_error&) {
                continue;
            }
            ++passed;
            std::vector<int32_t> in(net.inputSize());
            for (auto& v : in) v = int32_t(rng());
            uint32_t best = 0;
            net.Run(in.data(), &best);
            std::vector<float> out(4);
            net.classifyInts(in.data(), uint32_t(in.size()), &best, out.data(), 4);
        }
    }
    EXPECT_GT(passed, 0);  // some corruptions hit weights only and must still load
}

TEST(NetReader, CarefulLayerCannotWalkTheActivationPastTheBuffer) {
    // 2-3-2 with the last layer careful: 7 entries, layer 1 at 2..4. The careful
    // loop reads the activation from the source index on, one per target.
    NetDescription d = netwriter::denseNet({2, 3, 2}, {0, TXF_SIGMOID, TXF_LINEAR}, {1, 1, 0}, 5);
    d.spans[2][2][0] = Span{4, {1, 1, 1}, -1};  // walks 4..6: inside
    EXPECT_TRUE(loads(d));
    d.spans[2][2][0] = Span{3, {1, 1, 1, 1}, -1};  // targets 3..6 inside, but walks 4..7
    EXPECT_FALSE(loads(d));
    d.divisors[2] = 1;  // the fast loop holds the activation still: accepted
    EXPECT_TRUE(loads(d));
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

TEST(NetRun, MatchesTheReferenceOnSparseNetsWithManySpansPerNeuron) {
    std::mt19937 rng(99);
    for (int trial = 0; trial < 30; ++trial) {
        NetDescription d = netwriter::denseNet({5, 9, 6}, {0, 1, 4}, {1, uint16_t(rng() % 3 ? 16 : 0), 32}, trial);
        if (trial % 2) d.biases[1].clear();  // odd bias placement in the stream
        for (size_t l = 1; l < 3; ++l) {
            const uint32_t start = netwriter::layerStart(d, l);
            for (auto& neuron : d.spans[l]) {
                neuron.clear();
                for (int r = 1 + int(rng() % 3); r > 0; --r) {
                    Span s;
                    s.firstTarget = start + rng() % d.layerSizes[l];
                    s.weights.resize(1 + rng() % (start + d.layerSizes[l] - s.firstTarget));
                    for (auto& w : s.weights) w = int16_t(int(rng() % 2001) - 1000);
                    neuron.push_back(s);
                }
            }
        }
        expectMatchesReference(d, trial, 8);
    }
}

TEST(NetRun, RunsTheSameFromAnOddlyPlacedBlob) {
    LoadedNet aligned(smallNet());
    std::vector<uint8_t> shifted(aligned.blob.size() + 3);
    std::memcpy(shifted.data() + 3, aligned.blob.data(), aligned.blob.size());
    NeuralNet odd;
    odd.loadBuffer(shifted.data() + 3, aligned.blob.size());
    const std::vector<int32_t> in = {40000, -3, 9000};
    uint32_t best = 0;
    EXPECT_EQ(std::vector<int32_t>(odd.Run(in.data(), &best), odd.Run(in.data(), &best) + 2), aligned.run(in));
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

TEST(NetInterface, EmptyNetAnswersNothing) {
    NeuralNet empty;
    uint32_t n = 7, best = 0;
    EXPECT_FALSE(empty.inputCount(&n));
    EXPECT_EQ(empty.Run(&best), nullptr);
    EXPECT_FALSE(empty.classifyInts(nullptr, 0, nullptr, nullptr, 0));
}

TEST(NetInterface, DoubleInputsTruncateTowardZeroAndSaturate) {
    LoadedNet loaded(identityNet(3, 10));
    ASSERT_TRUE(loaded.ok);
    const double in[3] = {-2.9, 1e12, std::nan("")};
    uint32_t best = 0;
    const int32_t* out = loaded.net.Run(in, &best);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(std::vector<int32_t>(out, out + 3), (std::vector<int32_t>{-2, INT32_MAX, 0}));
}

