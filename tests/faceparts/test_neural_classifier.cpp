// The net container (checksum, item table) and the classifier that loads a
// net from it and runs float inputs through it.

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "NetWriter.h"
#include "core/Errors.h"
#include "faceparts/NeuralClassifier.h"
#include "support/ScopedModel.h"

using netwriter::NetDescription;

namespace {

NetDescription smallNet(uint16_t version = 12) {
    return netwriter::denseNet({4, 3, 2}, {0, TXF_SIGMOID, TXF_SOFTMAX}, {1, 16, 64}, 21, 300, true, version);
}

std::vector<uint8_t> smallContainer() { return netwriter::writeContainer({netwriter::writeBlob(smallNet())}); }

void put32(std::vector<uint8_t>& img, size_t off, uint32_t v) {
    for (int i = 0; i < 4; ++i) img[off + i] = uint8_t(v >> (8 * i));
}

bool verify(const std::vector<uint8_t>& img) { return NeuralClassifier::Verify(img.data(), uint32_t(img.size())); }

int checkSum(const uint8_t* img, uint32_t size, uint8_t* out, uint32_t outSize) {
    return NeuralClassifier::CheckSum(reinterpret_cast<const NetContainerHeader*>(img), size, out, outSize);
}

std::string messageOf(const std::function<void()>& f) {
    try {
        f();
    } catch (const std::exception& e) {
        return e.what();
    }
    return "";
}

}  // namespace

TEST(ContainerChecksum, XorAndSumOfWholeWordsFromOffsetSixteen) {
    std::vector<uint8_t> img(97);
    for (size_t i = 0; i < img.size(); ++i) img[i] = uint8_t(i * 7 + 3);
    auto sum = [](const std::vector<uint8_t>& v) {
        std::vector<uint8_t> out(16);
        EXPECT_EQ(checkSum(v.data(), 97, out.data(), 16), 1);
        return out;
    };
    // Ten words from byte 16 on, as the writer in tools/lib seals them.
    const auto base = sum(img);
    auto sealed = img;
    netwriter::containerChecksum(sealed);
    EXPECT_EQ(base, std::vector<uint8_t>(sealed.begin(), sealed.begin() + 16));
    for (size_t at : {size_t(96), size_t(3)}) {  // behind the last whole word; inside the checksum
        auto changed = img;
        changed[at] ^= 0xFF;
        EXPECT_EQ(sum(changed), base) << at;
    }
    // 88 bytes hold no word: refused, the output zeroed even so.
    uint8_t out[16];
    std::memset(out, 0xAA, sizeof out);
    EXPECT_EQ(checkSum(img.data(), 88, out, 16), 0);
    EXPECT_EQ(std::vector<uint8_t>(out, out + 16), std::vector<uint8_t>(16, 0));
}

TEST(ContainerVerify, RefusesEachBrokenFieldEvenWhenResealed) {
    const auto good = smallContainer();
    EXPECT_TRUE(verify(good));
    EXPECT_TRUE(verify(netwriter::writeContainer({{0x42}}, 5)));  // the smallest: 72 + 16 + 1 bytes
    EXPECT_FALSE(NeuralClassifier::Verify(nullptr, 100));
    EXPECT_FALSE(NeuralClassifier::Verify(good.data(), uint32_t(good.size() - 1)));
    const uint32_t size = uint32_t(good.size());
    struct Case {
        const char* what;
        size_t at;
        uint32_t value;
        size_t padding;
    };
    const Case cases[] = {
        {"version", 16, 101, 0},
        {"total beyond the image", 20, size + 8, 0},
        {"no items", 36, 0, 0},
        {"a table far larger than the image", 36, 0x10000000, 0},
        {"first item larger than the total", 72 + 12, size, 0},
        {"payload that doesn't fill the image", 20, size + 8, 8},
        {"item offset running past the end", 72, size - 8, 0},
        {"item offset into the head", 72, 8, 0},
    };
    for (const Case& c : cases) {
        auto img = good;
        img.insert(img.end(), c.padding, 0);
        put32(img, c.at, c.value);
        netwriter::containerChecksum(img);
        EXPECT_FALSE(verify(img)) << c.what;
    }
}

TEST(ClassifierLoad, LoadsThatLeaveNoRunnableNet) {
    // The load's own outcome, then what a Classify call says.
    const auto blob = netwriter::writeBlob(smallNet());
    auto badKind = blob;
    badKind[2] = 7;
    auto broken = smallContainer();
    broken[40] ^= 1;
    ScopedModel empty("fpemptynet", std::vector<uint8_t>{});
    ScopedModel good("fpgoodnet", smallContainer());
    ScopedModel bad("fpbadnet", broken);
    auto loadBuffer = [](std::vector<uint8_t> img, uint64_t size = 0) {
        return [img, size](NeuralClassifier& c) { c.LoadClassifierData(img.data(), size ? size : img.size()); };
    };
    const char* notConstructed = "Neural Net is not constructed";
    const char* incompatible = "Argument pDataBuf, cDatabuf not compatible in Classifier::LoadClassifierData";
    struct Case {
        const char* what;
        std::function<void(NeuralClassifier&)> load;
        std::string loadMessage, classifyMessage;
    };
    const std::vector<Case> cases = {
        {"4 GiB", loadBuffer(smallContainer(), uint64_t(1) << 32),
         "Invalid argument cDatabuf in Classifier::LoadClassifierData", notConstructed},
        {"a bad checksum", loadBuffer(broken), incompatible, notConstructed},
        {"another kind", loadBuffer(netwriter::writeContainer({blob}, 1)), "", notConstructed},
        {"two items", loadBuffer(netwriter::writeContainer({blob, blob}, 0)), "", notConstructed},
        {"a bad net in a good container", loadBuffer(netwriter::writeContainer({badKind})),
         "Failed to set algorithm in CNeuralNet", "Neural Net input number error"},
        {"a net of the old layout", loadBuffer(netwriter::writeContainer({netwriter::writeBlob(smallNet(2))})), "",
         "Neural Net output error"},
        {"an empty model", [](NeuralClassifier& c) { c.loadFromPath("fpemptynet"); }, "", notConstructed},
        // The old net pointed into the dropped image: it must not run.
        {"a refused reload",
         [](NeuralClassifier& c) {
             c.loadFromPath("fpgoodnet");
             c.loadFromPath("fpbadnet");
         },
         incompatible, notConstructed},
    };
    for (const Case& k : cases) {
        NeuralClassifier c;
        EXPECT_EQ(messageOf([&] { k.load(c); }), k.loadMessage) << k.what;
        float in[4] = {1, 2, 3, 4};
        uint32_t best = 0;
        EXPECT_EQ(messageOf([&] { c.Classify(in, 4, &best, nullptr, 0); }), k.classifyMessage) << k.what;
    }
}

TEST(ClassifierClassify, TruncatesInputsAndMatchesTheReference) {
    const auto img = smallContainer();
    NeuralClassifier c;
    c.LoadClassifierData(img.data(), img.size());
    const float in[4] = {2.9f, -2.9f, 70000.5f, -1.0f};
    float out[4] = {9, 9, 9, 9};
    uint32_t best = 7, refBest = 0;
    c.Classify(in, 4, &best, out, 4);
    const auto expected = netwriter::referenceRun(smallNet(), {2, -2, 70000, -1}, &refBest);
    EXPECT_EQ(best, refBest);
    // Outputs scaled by 1/10000; zeros behind the net's two.
    EXPECT_EQ(std::vector<float>(out, out + 4), (std::vector<float>{expected[0] / 10000.0f, expected[1] / 10000.0f, 0, 0}));
    // More inputs than the net has are refused; fewer are the caller's business.
    std::vector<float> five(5, 1.0f);
    EXPECT_THROW(c.Classify(five.data(), 5, &best, nullptr, 0), qv_invalid_argument);
    EXPECT_NO_THROW(c.Classify(five.data(), 3, &best, nullptr, 0));
}

