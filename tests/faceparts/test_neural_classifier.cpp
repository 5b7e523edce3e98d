#include <cmath>
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "NetWriter.h"
#include "support/ScopedModel.h"
#include "support/SourceTree.h"
#include "core/Errors.h"
#include "faceparts/NeuralClassifier.h"

using netwriter::NetDescription;

namespace {

NetDescription smallNet() {
    return netwriter::denseNet({4, 3, 2}, {0, TXF_SIGMOID, TXF_SOFTMAX}, {1, 16, 64}, 21);
}

std::vector<uint8_t> smallContainer() { return netwriter::writeContainer({netwriter::writeBlob(smallNet())}); }

void put32(std::vector<uint8_t>& img, size_t off, uint32_t v) {
    for (int i = 0; i < 4; ++i) img[off + i] = uint8_t(v >> (8 * i));
}

bool verify(const std::vector<uint8_t>& img) { return NeuralClassifier::Verify(img.data(), uint32_t(img.size())); }

std::string messageOf(const std::function<void()>& f) {
    try {
        f();
    } catch (const std::exception& e) {
        return e.what();
    }
    return "";
}

}  // namespace

// ---- checksum ------------------------------------------------------------------------

TEST(ContainerChecksum, RefusesEightyEightBytesAndBadArguments) {
    std::vector<uint8_t> img(88, 1);
    uint8_t out[16];
    std::memset(out, 0xAA, sizeof out);
    EXPECT_EQ(NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(img.data()), 88, out, 16), 0);
    for (uint8_t b : out) EXPECT_EQ(b, 0);  // zeroed even on failure
    img.resize(89);
    EXPECT_EQ(NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(img.data()), 89, out, 15), 0);
    EXPECT_EQ(NeuralClassifier::CheckSum(nullptr, 89, out, 16), 0);
    EXPECT_EQ(NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(img.data()), 89, nullptr, 16), 0);
    EXPECT_EQ(NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(img.data()), 89, out, 16), 1);
}

TEST(ContainerChecksum, CoversWholeWordsFromOffsetSixteenOnly) {
    std::vector<uint8_t> img(97);
    for (size_t i = 0; i < img.size(); ++i) img[i] = uint8_t(i * 7 + 3);
    auto sum = [&](const std::vector<uint8_t>& v) {
        std::vector<uint8_t> out(16);
        EXPECT_EQ(NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(v.data()), 97, out.data(), 16), 1);
        return out;
    };
    const auto base = sum(img);
    // Ten words: the first word is bytes 16..23; XOR and sum by hand.
    uint64_t x = 0, s = 0;
    for (int w = 0; w < 10; ++w) {
        uint64_t word = 0;
        for (int k = 0; k < 8; ++k) word |= uint64_t(img[16 + 8 * w + k]) << (8 * k);
        x ^= word;
        s += word;
    }
    uint64_t gotX = 0, gotS = 0;
    for (int k = 0; k < 8; ++k) {
        gotX |= uint64_t(base[k]) << (8 * k);
        gotS |= uint64_t(base[8 + k]) << (8 * k);
    }
    EXPECT_EQ(gotX, x);
    EXPECT_EQ(gotS, s);
    auto changed = img;
    changed[96] ^= 0xFF;  // behind the last whole word
    EXPECT_EQ(sum(changed), base);
    changed = img;
    changed[3] ^= 0xFF;  // inside the checksum itself
    EXPECT_EQ(sum(changed), base);
}

TEST(ContainerChecksum, BitFlipsChangeBothPartsButWordSwapsGoUnseen) {
    const auto img = smallContainer();
    const size_t covered = 16 + (img.size() - 16) / 8 * 8;
    for (size_t at = 16; at < covered; at += 5) {
        auto flipped = img;
        flipped[at] ^= 0x10;
        uint8_t out[16];
        NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(flipped.data()), uint32_t(flipped.size()), out, 16);
        EXPECT_NE(std::memcmp(out, img.data(), 8), 0) << at;
        EXPECT_NE(std::memcmp(out + 8, img.data() + 8, 8), 0) << at;
        EXPECT_FALSE(verify(flipped)) << at;
    }
    auto swapped = img;
    std::swap_ranges(swapped.begin() + 16, swapped.begin() + 24, swapped.begin() + 24);
    uint8_t out[16];
    NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(swapped.data()), uint32_t(swapped.size()), out, 16);
    EXPECT_EQ(std::memcmp(out, img.data(), 16), 0);
}

// ---- verify ----------------------------------------------------------------------------

TEST(ContainerVerify, AcceptsAWholeImageAndRefusesEachBrokenField) {
    const auto good = smallContainer();
    EXPECT_TRUE(verify(good));
    EXPECT_FALSE(NeuralClassifier::Verify(nullptr, 100));
    EXPECT_FALSE(NeuralClassifier::Verify(good.data(), uint32_t(good.size() - 1)));

    auto reseal = [](std::vector<uint8_t> img) {
        netwriter::containerChecksum(img);
        return img;
    };
    auto img = good;
    put32(img, 16, 101);
    EXPECT_FALSE(verify(reseal(img)));
    img = good;
    put32(img, 20, uint32_t(good.size() + 8));
    EXPECT_FALSE(verify(reseal(img)));
    img = good;
    put32(img, 36, 0);
    EXPECT_FALSE(verify(reseal(img)));
    img = good;
    put32(img, 72 + 12, uint32_t(good.size()));  // first item larger than the total
    EXPECT_FALSE(verify(reseal(img)));
    img = good;
    img.insert(img.end(), 8, 0);  // a payload that doesn't fill the image
    put32(img, 20, uint32_t(img.size()));
    EXPECT_FALSE(verify(reseal(img)));
    img = good;
    put32(img, 36, 0x10000000);  // a table far larger than the image
    EXPECT_FALSE(verify(reseal(img)));
}

TEST(ContainerVerify, RefusesPayloadsPlacedOutsideTheImage) {
    auto img = smallContainer();
    put32(img, 72, uint32_t(img.size()) - 8);  // sizes add up, offset runs past the end
    netwriter::containerChecksum(img);
    EXPECT_FALSE(verify(img));
    put32(img, 72, 8);  // offset into the head
    netwriter::containerChecksum(img);
    EXPECT_FALSE(verify(img));
}

TEST(ContainerVerify, SmallestImageThatPassesHasEightyNineBytes) {
    // One item of 1 byte: 72 + 16 + 1.
    const auto img = netwriter::writeContainer({{0x42}}, 5);
    EXPECT_EQ(img.size(), 89u);
    EXPECT_TRUE(verify(img));
}

// ---- loading ------------------------------------------------------------------------------

TEST(ClassifierLoad, RefusesOversizedAndUnverifiedImagesWithTheirMessages) {
    NeuralClassifier c;
    const auto img = smallContainer();
    EXPECT_EQ(messageOf([&] { c.LoadClassifierData(img.data(), uint64_t(1) << 32); }),
              "Invalid argument cDatabuf in Classifier::LoadClassifierData");
    auto bad = img;
    bad.back() ^= 1;
    EXPECT_EQ(messageOf([&] { c.LoadClassifierData(bad.data(), bad.size()); }),
              "Argument pDataBuf, cDatabuf not compatible in Classifier::LoadClassifierData");
    EXPECT_THROW(c.LoadClassifierData(bad.data(), bad.size()), qv_invalid_argument);
    EXPECT_EQ(c.net(), nullptr);
}

// Loads that leave no net to run: the load's own outcome, then what a
// Classify call says.
TEST(ClassifierLoad, LoadsThatLeaveNoRunnableNet) {
    const auto blob = netwriter::writeBlob(smallNet());
    auto badKind = blob;
    badKind[2] = 7;
    auto broken = smallContainer();
    broken[40] ^= 1;
    ScopedModel empty("fpemptynet", std::vector<uint8_t>{});
    ScopedModel good("fpgoodnet", smallContainer());
    ScopedModel bad("fpbadnet", broken);
    auto loadBuffer = [](std::vector<uint8_t> img) {
        return [img](NeuralClassifier& c) { c.LoadClassifierData(img.data(), img.size()); };
    };
    struct Case {
        const char* what;
        std::function<void(NeuralClassifier&)> load;
        std::string loadMessage, classifyMessage;
    };
    const std::vector<Case> cases = {
        {"another kind", loadBuffer(netwriter::writeContainer({blob}, 1)), "", "Neural Net is not constructed"},
        {"two items", loadBuffer(netwriter::writeContainer({blob, blob}, 0)), "", "Neural Net is not constructed"},
        {"a bad net in a good container", loadBuffer(netwriter::writeContainer({badKind})),
         "Failed to set algorithm in CNeuralNet", "Neural Net input number error"},
        {"an empty model", [](NeuralClassifier& c) { c.loadFromPath("fpemptynet"); }, "",
         "Neural Net is not constructed"},
        // The old net pointed into the dropped image: it must not run.
        {"a refused reload",
         [](NeuralClassifier& c) {
             c.loadFromPath("fpgoodnet");
             c.loadFromPath("fpbadnet");
         },
         "Argument pDataBuf, cDatabuf not compatible in Classifier::LoadClassifierData",
         "Neural Net is not constructed"},
    };
    for (const Case& k : cases) {
        NeuralClassifier c;
        EXPECT_EQ(messageOf([&] { k.load(c); }), k.loadMessage) << k.what;
        float in[4] = {1, 2, 3, 4};
        uint32_t best = 0;
        EXPECT_EQ(messageOf([&] { c.Classify(in, 4, &best, nullptr, 0); }), k.classifyMessage) << k.what;
    }
}

TEST(ClassifierLoad, ReadsThroughTheModelReader) {
    ScopedModel model("fptestnet", smallContainer());
    NeuralClassifier c;
    c.loadFromPath("fptestnet");
    EXPECT_EQ(c.dataSize(), smallContainer().size());
    uint32_t n = 0;
    EXPECT_TRUE(c.inputCount(&n));
    EXPECT_EQ(n, 4u);
    EXPECT_TRUE(c.outputCount(&n));
    EXPECT_EQ(n, 2u);
    EXPECT_THROW(c.loadFromPath("fpnosuchmodel"), qv_data_error);
    EXPECT_THROW(c.loadFromPath(""), qv_data_error);
}

TEST(ClassifierLoad, RandomCorruptionIsRefusedOrRunsInsideTheImage) {
    const auto good = smallContainer();
    std::mt19937 rng(77);
    int loaded = 0;
    for (int trial = 0; trial < 3000; ++trial) {
        std::vector<uint8_t> img = good;
        const int flips = 1 + int(rng() % 3);
        for (int f = 0; f < flips; ++f) img[rng() % img.size()] ^= uint8_t(1u << (rng() % 8));
        if (trial % 3 == 0) netwriter::containerChecksum(img);  // reach the table and the blob too
        if (trial % 7 == 0) img.resize(rng() % img.size());
        std::vector<uint8_t> exact(img);
        NeuralClassifier c;
        try {
            c.LoadClassifierData(exact.empty() ? nullptr : exact.data(), exact.size());
        } catch (const std::exception&) {
            continue;
        }
        float in[4] = {10, -20, 30, 40};
        float out[8];
        uint32_t best = 0;
        try {
            c.Classify(in, 4, &best, out, 8);
            ++loaded;
        } catch (const std::exception&) {
        }
    }
    EXPECT_GT(loaded, 0);
}

// ---- classify -----------------------------------------------------------------------------

TEST(ClassifierClassify, ChecksArgumentsInOrder) {
    NeuralClassifier c;
    uint32_t best = 5;
    float in[4] = {0, 0, 0, 0};
    float out[3] = {1, 1, 1};
    EXPECT_EQ(messageOf([&] { c.Classify(nullptr, 4, nullptr, out, 3); }), "Invalid argument pInput in Classifier::Classify");
    EXPECT_EQ(messageOf([&] { c.Classify(in, 4, nullptr, out, 3); }), "Invalid argument pulBestClass in Classifier::Classify");
    EXPECT_EQ(messageOf([&] { c.Classify(in, 4, &best, out, 3); }), "Neural Net is not constructed");
    EXPECT_EQ(best, 0u);
    for (float v : out) EXPECT_EQ(v, 0.0f);
    EXPECT_THROW(c.Classify(in, 4, &best, out, 3), qv_operation_error);
}

TEST(ClassifierClassify, TruncatesInputsAndMatchesTheReference) {
    const auto img = smallContainer();
    NeuralClassifier c;
    c.LoadClassifierData(img.data(), img.size());
    const float in[4] = {2.9f, -2.9f, 70000.5f, -1.0f};
    float out[5] = {9, 9, 9, 9, 9};
    uint32_t best = 7;
    c.Classify(in, 4, &best, out, 5);
    uint32_t refBest = 0;
    const auto expected = netwriter::referenceRun(smallNet(), {2, -2, 70000, -1}, &refBest);
    EXPECT_EQ(best, refBest);
    EXPECT_FLOAT_EQ(out[0], float(expected[0]) / 10000.0f);
    EXPECT_FLOAT_EQ(out[1], float(expected[1]) / 10000.0f);
    EXPECT_EQ(out[2], 0.0f);  // behind the net's two outputs
    EXPECT_EQ(out[4], 0.0f);
}

TEST(ClassifierClassify, RefusesMoreInputsThanTheNetHas) {
    const auto img = smallContainer();
    NeuralClassifier c;
    c.LoadClassifierData(img.data(), img.size());
    std::vector<float> in(5, 1.0f);
    uint32_t best = 0;
    EXPECT_THROW(c.Classify(in.data(), 5, &best, nullptr, 0), qv_invalid_argument);
    EXPECT_NO_THROW(c.Classify(in.data(), 3, &best, nullptr, 0));  // fewer is the caller's business
}

TEST(ClassifierClassify, ANetThatCannotRunReportsAnOutputError) {
    const auto img = netwriter::writeContainer({netwriter::writeBlob(
        netwriter::denseNet({4, 3, 2}, {0, 1, 4}, {1, 16, 64}, 21, 300, true, 2))});
    NeuralClassifier c;
    c.LoadClassifierData(img.data(), img.size());
    float in[4] = {0, 0, 0, 0};
    uint32_t best = 0;
    EXPECT_EQ(messageOf([&] { c.Classify(in, 4, &best, nullptr, 0); }), "Neural Net output error");
}

// ---- the Python writer -----------------------------------------------------------------

TEST(ClassifierPythonWriter, ReadsTheToolsContainerAndAgreesWithItsReferenceRun) {
    const std::string dir = sourcetree::scratchDir("netwriter_demo");
    const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/netwriter.py") +
                                "' demo --seed 3 --out-dir '" + dir + "'";
    if (std::system(command.c_str()) != 0) GTEST_SKIP() << "python writer unavailable";
    const std::vector<uint8_t> image = sourcetree::readBytes(dir + "/demo_net.bin");
    NeuralClassifier c;
    ASSERT_NO_THROW(c.LoadClassifierData(image.data(), image.size()));
    ASSERT_NE(c.net(), nullptr);
    std::istringstream cases(sourcetree::readText(dir + "/demo_cases.txt"));
    std::string line;
    int checked = 0;
    while (std::getline(cases, line)) {
        std::istringstream in(line);
        std::vector<int32_t> inputs, expected;
        std::string token;
        int part = 0;
        uint32_t expectedBest = 0;
        while (in >> token) {
            if (token == "|") ++part;
            else if (part == 0) inputs.push_back(int32_t(std::stoll(token)));
            else if (part == 1) expected.push_back(int32_t(std::stoll(token)));
            else expectedBest = uint32_t(std::stoul(token));
        }
        uint32_t best = 99;
        const int32_t* out = c.net()->Run(inputs.data(), &best);
        ASSERT_NE(out, nullptr);
        EXPECT_EQ(std::vector<int32_t>(out, out + expected.size()), expected) << line;
        EXPECT_EQ(best, expectedBest) << line;
        ++checked;
    }
    EXPECT_EQ(checked, 25);
}

TEST(ClassifierPythonWriter, ShippedLandmarkNetKeepsItsPointsInTheBoxAndInOrder) {
    // Whatever the patch, the shipped net's quantised weights must not wrap a
    // sum into points outside the box or out of their anatomical order.
    const std::vector<uint8_t> image = sourcetree::readBytes(sourcetree::path("models/mdnb.bin"));
    NeuralClassifier c;
    ASSERT_NO_THROW(c.LoadClassifierData(image.data(), image.size()));
    uint32_t n = 0;
    ASSERT_TRUE(c.inputCount(&n));
    const uint32_t side = uint32_t(std::sqrt(double(n)));
    ASSERT_EQ(side * side, n) << "the locator needs a square patch";
    const float flat = 211676.0f / float(n);
    std::vector<std::vector<float>> patches = {std::vector<float>(n, flat), std::vector<float>(n, 0.0f)};
    std::vector<float> lit(n);  // lit from the left: half the face twice as bright
    for (uint32_t i = 0; i < n; ++i) lit[i] = (i % side < side / 2 ? 2.0f : 1.0f) * flat / 1.5f;
    patches.push_back(lit);
    for (const auto& patch : patches) {
        float v[10];
        uint32_t best = 0;
        c.Classify(patch.data(), n, &best, v, 10);
        for (float& x : v) x = x * 10000.0f / 65535.0f;
        for (int i = 0; i < 10; ++i) {
            EXPECT_GT(v[i], 0.0f) << i;
            EXPECT_LT(v[i], 1.0f) << i;
        }
        EXPECT_LT(v[0], v[2]);                      // left eye left of the right eye
        EXPECT_LT(v[6], v[8]);                      // mouth corners likewise
        EXPECT_LT(std::max(v[1], v[3]), v[5]);      // eyes above the nose
        EXPECT_LT(v[5], std::min(v[7], v[9]));      // nose above the mouth
    }
}
