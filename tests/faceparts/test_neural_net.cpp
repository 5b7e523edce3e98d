#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <functional>
#include <random>
#include <string>
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
};

bool loads(const NetDescription& d) { return LoadedNet(d).ok; }

std::vector<int32_t> runLibrary(NeuralNet& net, const std::vector<int32_t>& in, uint32_t* best) {
    const int32_t* out = net.Run(in.data(), best);
    if (out == nullptr) return {};
    return std::vector<int32_t>(out, out + net.outputSize());
}

// Loads d and checks the library against the reference on random inputs.
void expectMatchesReference(const NetDescription& d, uint32_t seed, int trials = 20) {
    LoadedNet loaded(d);
    ASSERT_TRUE(loaded.ok);
    NeuralNet& net = loaded.net;
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int32_t> small(-70000, 70000);
    std::uniform_int_distribution<int32_t> any(INT32_MIN, INT32_MAX);
    for (int t = 0; t < trials; ++t) {
        std::vector<int32_t> in(d.layerSizes[0]);
        for (auto& v : in) v = (t % 4 == 3) ? any(rng) : small(rng);
        if (t == 0) in.assign(in.size(), 0);
        uint32_t bestLib = 99, bestRef = 99;
        const std::vector<int32_t> expected = netwriter::referenceRun(d, in, &bestRef);
        ASSERT_EQ(runLibrary(net, in, &bestLib), expected) << "trial " << t;
        ASSERT_EQ(bestLib, bestRef) << "trial " << t;
    }
}

}  // namespace

// ---- fixed-point functions ---------------------------------------------------

TEST(FixedPoint, SigmoidFollowsItsTableAndSaturatesAtNine) {
    EXPECT_EQ(Sigmoid16(INT32_MIN), 0);
    EXPECT_EQ(Sigmoid16(INT32_MAX), 0x10000);
    EXPECT_LE(Sigmoid16(0x8FFFF), 0xFFFF);  // the last interval leans on the 0xFFFF entry
    for (int32_t x = -0x98000; x <= 0x98000; x += 37) {
        ASSERT_EQ(Sigmoid16(x), netwriter::ref::sigmoid16(x)) << x;
        ASSERT_EQ(Sigmoid16(x) + Sigmoid16(-x), 0x10000) << x;
    }
    for (int32_t x = -0x90000; x <= 0x90000; x += 4099)
        EXPECT_NEAR(Sigmoid16(x), 65536.0 / (1.0 + std::exp(-x / 65536.0)), 40.0) << x;
}

TEST(FixedPoint, DivisionSaturatesOnZeroAndIsExactWhereOnlyZeroBitsAreDropped) {
    EXPECT_EQ(Div16(0, 0), 0);
    EXPECT_EQ(Div16(5, 0), INT32_MAX);
    EXPECT_EQ(Div16(-5, 0), INT32_MIN);
    EXPECT_EQ(Div16(-3, 2), -0x18000);
    EXPECT_EQ(Div16(3, -2), -0x18000);
    EXPECT_EQ(Div16(-3, -2), 0x18000);
    std::mt19937 rng(3);
    for (int i = 0; i < 3000; ++i) {
        const int64_t small = int64_t(rng() % 0x10000);
        const int64_t b = 1 + int64_t(rng() % 0x7FFFFFFF);
        ASSERT_EQ(Div16(int32_t(small), int32_t(b)), (small << 16) / b) << small << "/" << b;

        const int64_t mid = 0x10000 + int64_t(rng() % 0xFF0000);
        const int64_t b8 = int64_t(1 + rng() % 0x7FFF) << 8;
        if (((mid << 16) / b8) <= INT32_MAX) {
            ASSERT_EQ(Div16(int32_t(mid), int32_t(b8)), (mid << 16) / b8) << mid << "/" << b8;
        }
        // A tiny denominator with a mid-size numerator loses only the low 8 bits.
        const int64_t tiny = 1 + int64_t(rng() % 0xFF);
        if (mid * 65536 / tiny <= INT32_MAX) {
            const int64_t exact = (mid << 16) / tiny;
            const int64_t got = Div16(int32_t(mid), int32_t(tiny));
            ASSERT_LE(got, exact);
            ASSERT_GT(got, exact - 256);
        }
        const int64_t big = 0x1000000 + int64_t(rng() % 0x7EFFFFFF);
        const int64_t b16 = int64_t(0x100 + rng() % 0x7E00) << 16;
        ASSERT_EQ(Div16(int32_t(big), int32_t(b16)), (big << 16) / b16) << big << "/" << b16;
        ASSERT_EQ(Div16(int32_t(-big), int32_t(b16)), -((big << 16) / b16));
    }
}

TEST(FixedPoint, ExpIsOneForNonNegativeAndFadesToZero) {
    EXPECT_EQ(NeuralNet::Exp(123456), 65536);
    EXPECT_NEAR(NeuralNet::Exp(-65536), 65536.0 * std::exp(-1.0), 60.0);
    EXPECT_NEAR(NeuralNet::Exp(-3 * 65536), 65536.0 * std::exp(-3.0), 30.0);
    EXPECT_EQ(NeuralNet::Exp(-0x90000), 0);
}

TEST(FixedPoint, SoftMaxTiesGoToTheFirstAndShareEqually) {
    int32_t v[4] = {500, 500, 500, 500};
    uint32_t best = 9;
    NeuralNet::SoftMax(v, 4, 1, &best);
    EXPECT_EQ(best, 0u);
    for (int32_t x : v) EXPECT_EQ(x, 2500);
}

TEST(FixedPoint, CarefulLoopOverwritesSaturatesAndWalksTheActivation) {
    const int16_t w[3] = {2, 32767, -32768};
    uint8_t bytes[6];
    std::memcpy(bytes, w, sizeof bytes);
    const int32_t acts[3] = {5, 100000, 100000};
    int32_t targets[3] = {1000, 1000, 1000};
    NeuralNet::CentralLoopUseCaution(targets, 3, bytes, acts);
    EXPECT_EQ(targets[0], 10);
    EXPECT_EQ(targets[1], INT32_MAX);
    EXPECT_EQ(targets[2], INT32_MIN);
}

// ---- reading the blob --------------------------------------------------------------

TEST(NetReader, LoadsEveryLayoutVersionAndTheOldOneDoesNotRun) {
    for (uint16_t version : {10, 11, 12, 13}) {
        LoadedNet loaded(smallNet(version));
        ASSERT_TRUE(loaded.ok) << version;
        NeuralNet& net = loaded.net;
        EXPECT_EQ(net.Version(), version);
        EXPECT_EQ(net.inputSize(), 3u);
        EXPECT_EQ(net.outputSize(), 2u);
        EXPECT_EQ(net.workBufferLength(), 9);
    }
    LoadedNet old(smallNet(2));
    ASSERT_TRUE(old.ok);
    uint32_t best = 0;
    const std::vector<int32_t> in(3, 1);
    EXPECT_EQ(old.net.Run(in.data(), &best), nullptr);  // no transfer types in this layout
    EXPECT_FALSE(loads(smallNet(3)));
}

TEST(NetReader, ReadersWithoutASizeKeepTheValueAndRunChecks) {
    const auto good = netwriter::writeBlob(smallNet());
    NeuralNet net;
    EXPECT_EQ(net.RestoreLocalConnectNet(good.data(), 0), 1);
    EXPECT_EQ(net.RestoreLocalConnectNet(good.data(), 1), 0);  // expected marker
    EXPECT_EQ(net.RestoreLocalConnectNetSafe(good.data(), uint32_t(good.size()), 0), 1);
    uint32_t best = 0;
    EXPECT_EQ(net.Run(&best), nullptr);  // tables alone don't size a work buffer
    NetDescription d = smallNet();
    d.spans[2][0][0].firstTarget = 8;
    const auto wild = netwriter::writeBlob(d);
    EXPECT_EQ(net.RestoreLocalConnectNet(wild.data(), 0), 0);
}

TEST(NetReader, RefusesWrongValueFieldsWithItsMessage) {
    const std::vector<std::function<void(NetDescription&)>> breakers = {
        [](NetDescription& d) { d.kind = 3; },
        [](NetDescription& d) { d.marker = 1; },
        [](NetDescription& d) { d.wideSize = 4; },
        [](NetDescription& d) { d.narrowSize = 8; },
        [](NetDescription& d) { d.weightSize = 4; },
        [](NetDescription& d) { d.inputDivisors[1] = 0; },
        [](NetDescription& d) { d.inputDivisors[2] = -4; },
        [](NetDescription& d) {
            d.layerSizes = {3, 4, 0};
            d.spans[2].assign(4, std::vector<Span>(1, Span{7, {1}, -1}));
            d.biases[2].clear();
        },
    };
    for (size_t i = 0; i < breakers.size(); ++i) {
        NetDescription d = smallNet();
        breakers[i](d);
        const auto blob = netwriter::writeBlob(d);
        NeuralNet net;
        try {
            net.loadBuffer(blob.data(), blob.size());
            ADD_FAILURE() << "case " << i << " loaded";
        } catch (const qv_operation_error& e) {
            EXPECT_STREQ(e.what(), "Failed to set algorithm in CNeuralNet") << i;
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
            const int flips = 1 + int(rng() % 4);
            for (int f = 0; f < flips; ++f) {
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

// ---- run-consistency checks beyond the format's own -----------------------------

TEST(NetRunChecks, RefusesSpansAndTotalsThatWouldLeaveTheWorkBuffer) {
    NetDescription d = smallNet();
    d.spans[2][1][0].firstTarget = 8;  // 9 neurons: 8 is the last, two weights reach 9
    EXPECT_FALSE(loads(d));

    d = smallNet();
    Span& s = d.spans[2][3][0];
    s.lastTarget = int32_t(s.firstTarget + s.weights.size() - 1);
    s.weights.pop_back();  // the span claims one weight more than the stream holds
    EXPECT_FALSE(loads(d));

    // Input neurons sharing one marker: the first swallows all of layer 1's
    // spans and layer 2's neurons would run short.
    d = smallNet();
    for (auto& n : d.spans[1]) n[0].marker = 5;
    EXPECT_FALSE(loads(d));

    for (int32_t total : {2, 10}) {
        d = smallNet();
        d.neuronTotal = total;
        EXPECT_FALSE(loads(d)) << total;
    }
}

TEST(NetRunChecks, CarefulLayerCannotWalkTheActivationPastTheBuffer) {
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

TEST(NetRunChecks, FailedLoadKeepsThePreviousNetRunning) {
    LoadedNet loaded(smallNet());
    NeuralNet& net = loaded.net;
    const std::vector<int32_t> in = {100, -200, 300};
    uint32_t best = 0;
    const auto before = runLibrary(net, in, &best);
    NetDescription d = netwriter::denseNet({5, 6}, {0, 0}, {1, 1}, 1);
    d.kind = 9;
    const auto bad = netwriter::writeBlob(d);
    EXPECT_THROW(net.loadBuffer(bad.data(), bad.size()), qv_operation_error);
    EXPECT_EQ(runLibrary(net, in, &best), before);
    EXPECT_EQ(net.inputSize(), 3u);
}

// ---- the forward pass ---------------------------------------------------------------

TEST(NetRun, MatchesTheReferenceForEveryTransferType) {
    for (uint32_t hidden : {uint32_t(TXF_LINEAR), uint32_t(TXF_SIGMOID), uint32_t(TXF_ABS), 77u})
        for (uint32_t last : {uint32_t(TXF_LINEAR), uint32_t(TXF_SOFTMAX), uint32_t(TXF_ABS), uint32_t(TXF_SOFTMAX_PAIR), 2u}) {
            SCOPED_TRACE(testing::Message() << hidden << "/" << last);
            expectMatchesReference(netwriter::denseNet({6, 5, 4}, {0, hidden, last}, {1, 32, 256}, hidden * 31 + last), last);
        }
}

TEST(NetRun, MatchesTheReferenceAcrossVersionsDivisorsAndShapes) {
    expectMatchesReference(netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 0, 0}, 1), 1);          // careful layers
    expectMatchesReference(netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 8, 8}, 2, 300, true, 10), 2);
    expectMatchesReference(netwriter::denseNet({6, 5, 4}, {0, 1, 4}, {1, 8, 8}, 3, 300, true, 11), 3);
    expectMatchesReference(netwriter::denseNet({5, 3, 1}, {0, 1, 4}, {1, 8, 64}, 4), 4);          // one-neuron soft-max
    expectMatchesReference(netwriter::denseNet({4, 2}, {0, 11}, {1, 1}, 5), 5);                   // pair of one each
    expectMatchesReference(netwriter::denseNet({3, 7, 5, 3, 10}, {0, 1, 10, 1, 0}, {1, 64, 4, 128, 1024}, 6, 32767), 6);
    expectMatchesReference(netwriter::denseNet({7, 3, 2}, {0, 1, 4}, {1, 2, 2}, 7, 300, false), 7);  // no biases
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
                const int runs = 1 + int(rng() % 3);
                for (int r = 0; r < runs; ++r) {
                    Span s;
                    s.firstTarget = start + rng() % d.layerSizes[l];
                    const uint32_t room = start + d.layerSizes[l] - s.firstTarget;
                    s.weights.resize(1 + rng() % room);
                    for (auto& w : s.weights) w = int16_t(int(rng() % 2001) - 1000);
                    neuron.push_back(s);
                }
            }
        }
        expectMatchesReference(d, trial, 8);
    }
}

TEST(NetRun, RunsTheSameFromAnOddlyPlacedBlob) {
    const auto blob = netwriter::writeBlob(smallNet());
    std::vector<uint8_t> shifted(blob.size() + 3);
    std::memcpy(shifted.data() + 3, blob.data(), blob.size());
    NeuralNet a, b;
    a.loadBuffer(blob.data(), blob.size());
    b.loadBuffer(shifted.data() + 3, blob.size());
    const std::vector<int32_t> in = {40000, -3, 9000};
    uint32_t ba = 0, bb = 0;
    EXPECT_EQ(runLibrary(a, in, &ba), runLibrary(b, in, &bb));
    EXPECT_EQ(ba, bb);
}

TEST(NetRun, InputScalingSaturatesAtBothEndsToPositiveFullScale) {
    NetDescription d = identityNet(3);
    d.inputMeans = {100, 100, 100};
    d.inputDivisors = {65535, 65535, 1};
    d.inputOffsets = {0, 0, 65535 * 2};
    LoadedNet loaded(d);
    ASSERT_TRUE(loaded.ok);
    NeuralNet& net = loaded.net;
    uint32_t best = 0;
    // Largest input: 65535 - mean, no division. Smallest: -mean.
    EXPECT_EQ(runLibrary(net, {INT32_MAX, INT32_MIN, 3}, &best), (std::vector<int32_t>{65435, -100, 65535}));
    // (x*65535 - offset)/divisor, no mean; far below the range gives +65535.
    EXPECT_EQ(runLibrary(net, {7, -1, 2}, &best), (std::vector<int32_t>{7, -1, 0}));
    EXPECT_EQ(runLibrary(net, {7, -1, -1}, &best)[2], 65535);
    EXPECT_EQ(runLibrary(net, {1, 0, 1}, &best)[2], 65535);  // q = -65535 saturates to +65535
}

TEST(NetRun, SingleSoftMaxOutputReportsTwoValuesAndRoomForThem) {
    LoadedNet loaded(netwriter::denseNet({3, 1}, {0, TXF_SOFTMAX}, {1, 1}, 2));
    ASSERT_TRUE(loaded.ok);
    EXPECT_EQ(loaded.net.workBufferLength(), 5);
    uint32_t n = 0;
    EXPECT_TRUE(loaded.net.outputCount(&n));
    EXPECT_EQ(n, 2u);
}

// ---- the outer interface ---------------------------------------------------------

TEST(NetInterface, EmptyNetAnswersNothing) {
    NeuralNet net;
    uint32_t n = 7;
    EXPECT_FALSE(net.inputCount(&n));
    EXPECT_EQ(n, 0u);
    EXPECT_FALSE(net.outputCount(&n));
    EXPECT_EQ(net.workBufferLength(), -1);
    uint32_t best = 0;
    EXPECT_EQ(net.Run(&best), nullptr);
    EXPECT_FALSE(net.classifyInts(nullptr, 0, nullptr, nullptr, 0));
}

TEST(NetInterface, ClassifyIntsChecksLengthAndScalesOutputs) {
    const NetDescription d = smallNet();
    const auto blob = netwriter::writeBlob(d);
    NeuralNet net;
    net.LoadFromBuffer(blob.data(), uint32_t(blob.size()));
    const std::vector<int32_t> in = {1, 2, 3};
    uint32_t best = 0;
    float out[3] = {-1, -1, -1};
    EXPECT_FALSE(net.classifyInts(in.data(), 2, &best, out, 3));
    EXPECT_FALSE(net.classifyInts(in.data(), 3, nullptr, out, 3));
    ASSERT_TRUE(net.classifyInts(in.data(), 3, &best, out, 3));
    uint32_t refBest = 0;
    const auto expected = netwriter::referenceRun(d, in, &refBest);
    EXPECT_EQ(best, refBest);
    EXPECT_FLOAT_EQ(out[0], float(expected[0]) / 10000.0f);
    EXPECT_FLOAT_EQ(out[1], float(expected[1]) / 10000.0f);
    EXPECT_EQ(out[2], -1.0f);  // only outputSize() values
}

TEST(NetInterface, DoubleInputsTruncateTowardZeroAndSaturate) {
    LoadedNet loaded(identityNet(3, 10));
    ASSERT_TRUE(loaded.ok);
    const double in[3] = {-2.9, 1e12, std::nan("")};
    uint32_t best = 0;
    const int32_t* out = loaded.net.Run(in, &best);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(out[0], -2);
    EXPECT_EQ(out[1], INT32_MAX);
    EXPECT_EQ(out[2], 0);
}

TEST(NetInterface, LoadsFromAFileAndFailsQuietly) {
    const auto blob = netwriter::writeBlob(smallNet());
    const std::string path = testing::TempDir() + "net_blob_test.bin";
    auto write = [&](size_t n) {
        FILE* f = std::fopen(path.c_str(), "wb");
        ASSERT_NE(f, nullptr);
        std::fwrite(blob.data(), 1, n, f);
        std::fclose(f);
    };
    write(blob.size());
    NeuralNet net;
    EXPECT_EQ(net.LoadFromFile(path.c_str()), 1);
    EXPECT_EQ(net.LoadFromFile((path + ".missing").c_str()), 0);
    EXPECT_EQ(net.LoadFromFile(static_cast<const char*>(nullptr)), 0);
    write(blob.size() / 2);
    EXPECT_EQ(net.LoadFromFile(path.c_str()), 0);
    // The earlier net, whose image the net owns, still runs.
    uint32_t best = 0;
    const std::vector<int32_t> in = {5, 6, 7};
    EXPECT_NE(net.Run(in.data(), &best), nullptr);
    std::remove(path.c_str());
}
