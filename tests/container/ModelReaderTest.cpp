#include <gtest/gtest.h>

#include <cstring>
#include <random>

#include "ModelPacking.h"
#include "container/ModelReader.h"
#include "core/Descramble.h"
#include "core/Errors.h"
#include "core/ScrambledTexts.h"
#include "support/IvbGolden.h"
#include "support/ScopedModel.h"
#include "support/SourceTree.h"

namespace {

std::vector<uint8_t> patternPayload(std::size_t size, uint32_t seed = 7) {
    std::mt19937 rng(seed);
    std::vector<uint8_t> payload(size);
    for (auto& b : payload) b = static_cast<uint8_t>(rng());
    return payload;
}

// Reads the whole payload in chunks of the given sizes, cycling through them.
std::vector<uint8_t> readInChunks(ModelReader& reader, const std::vector<unsigned>& chunks) {
    std::vector<uint8_t> out(reader.rawSize());
    std::size_t done = 0;
    for (std::size_t k = 0; done < out.size(); ++k) {
        const unsigned n = std::min<std::size_t>(chunks[k % chunks.size()], out.size() - done);
        EXPECT_EQ(reader.read(out.data() + done, 1, n), n);
        done += n;
    }
    return out;
}

template <typename F>
void expectMessage(F f, const std::string& message) {
    try {
        f();
        ADD_FAILURE() << "no exception, expected: " << message;
    } catch (const std::exception& e) {
        EXPECT_EQ(std::string(e.what()), message);
    }
}

}  // namespace

TEST(ModelReaderRaw, AnyCuttingOfReadsGivesThePayload) {
    const std::vector<uint8_t> payload = patternPayload(1000);
    ScopedModel model("chunked", payload, 0x01020304u);
    for (const std::vector<unsigned>& chunks : std::vector<std::vector<unsigned>>{
             {1000}, {1}, {3}, {255}, {256}, {257}, {1, 2, 3, 511, 7}}) {
        ModelReader reader("chunked", ModelReader::RAW);
        EXPECT_EQ(readInChunks(reader, chunks), payload) << "first chunk " << chunks[0];
    }
}

TEST(ModelReaderRaw, EmptyReadsMoveNothingAndReadersAreIndependent) {
    const std::vector<uint8_t> payload = patternPayload(300);
    ScopedModel model("shared", payload);
    ModelReader a("shared", ModelReader::RAW);
    ModelReader b("dir/shared::object", ModelReader::RAW);
    uint32_t words[4];
    EXPECT_EQ(a.read(words, 4, 4), 4u);
    EXPECT_EQ(std::memcmp(words, payload.data(), 16), 0);
    EXPECT_EQ(a.read(words, 0, 9), 9u);
    EXPECT_EQ(a.read(nullptr, 9, 0), 0u);
    EXPECT_EQ(readInChunks(b, {300}), payload);
    uint8_t next = 0;
    a.read(&next, 1, 1);
    EXPECT_EQ(next, payload[16]);
}

TEST(ModelReaderBounds, ReadingPastTheEndRaisesAndConsumesNothing) {
    const std::vector<uint8_t> payload = patternPayload(10);
    ScopedModel model("short", payload);
    ModelReader reader("short", ModelReader::RAW);
    std::vector<uint8_t> out(16, 0xEE);
    reader.read(out.data(), 1, 4);
    expectMessage([&] { reader.read(out.data(), 1, 7); }, "Model data truncated");
    expectMessage([&] { reader.read(out.data(), 0x10000u, 0x10000u); }, "Model data truncated");  // wraps to 0
    EXPECT_EQ(out[4], 0xEE) << "nothing written by a refused read";
    // Cursor and unscrambling counter stayed where they were.
    reader.read(out.data() + 4, 2, 3);
    EXPECT_TRUE(std::equal(payload.begin(), payload.end(), out.begin()));
    EXPECT_THROW(reader.read(out.data(), 1, 1), qv_data_error);
}

TEST(ModelReaderBounds, SeedOnlyModelsAreEmptyAndShorterOnesRefused) {
    ScopedModel seedOnly("seedonly", {});
    ModelReader reader("seedonly", ModelReader::RAW);
    EXPECT_EQ(reader.rawSize(), 0u);
    for (std::size_t size : {0u, 3u}) {
        ScopedModel model = ScopedModel::raw("tiny", std::vector<uint8_t>(size, 1));
        expectMessage([] { ModelReader r("tiny", ModelReader::RAW); }, "Model data truncated");
    }
}

TEST(ModelReaderPaths, ModelPathObjectNameAndFailures) {
    typedef std::pair<std::string, std::string> P;
    EXPECT_EQ(ModelReader::parseObjectPathAndName("m::"), P("m", ""));
    EXPECT_EQ(ModelReader::parseObjectPathAndName("::n"), P("", "n"));
    EXPECT_EQ(ModelReader::parseObjectPathAndName("a/m::b::c"), P("a/m", "b::c"));
    EXPECT_EQ(ModelReader::parseObjectPathAndName("m:x"), P("m:x", ""));
    ScopedModel model("pathed", {5});
    EXPECT_EQ(ModelReader("pathed::", ModelReader::RAW).rawSize(), 1u);

    for (const char* path : {"", "::", "::name"})
        expectMessage([&] { ModelReader r(path, ModelReader::RAW); }, "Invalid model path");
    const std::string notFound = descrambleText(scrambled::kModelNotFound);
    for (const char* path : {"nosuchmodel", "mdcb.bin", "MDCB"}) {
        EXPECT_THROW(ModelReader(path, ModelReader::RAW), qv_data_error) << path;
        expectMessage([&] { ModelReader r(path, ModelReader::RAW); }, notFound);
    }
}

TEST(ModelReaderModes, OnlyRawModeReads) {
    ScopedModel model("moded", patternPayload(4));
    // A raw model is no IVB stream.
    expectMessage([&] { ModelReader r("moded", ModelReader::IVB); }, "Not a valid QV IVB file");
    expectMessage([&] { ModelReader("moded", ModelReader::RAW).readObject(); },
                  "The reader does not support ivb mode loading");
    // Other modes are kept as given but cannot read.
    ModelReader odd("moded", 5);
    uint8_t out[4];
    expectMessage([&] { odd.read(out, 1, 1); }, "The reader does not support raw mode loading");
    expectMessage([&] { odd.rawSize(); }, "The reader does not support raw mode loading");
}

TEST(ModelReaderIvb, ServesObjectsByNameOrInOrder) {
    const std::vector<uint8_t> first = ivbgolden::compositeWithFloats();
    const std::vector<uint8_t> second = ivbgolden::emptyComposite();
    std::vector<uint8_t> stream = ivbgolden::hex("49 56 42 40 51 56 01 00 00 00 00 00 49 49 00 00");
    for (const auto& object : {std::make_pair(std::string("floats"), first), std::make_pair(std::string("x"), second)}) {
        stream.push_back(static_cast<uint8_t>(object.first.size()));
        stream.insert(stream.end(), {0, 0, 0});
        stream.insert(stream.end(), object.first.begin(), object.first.end());
        stream.insert(stream.end(), object.second.begin(), object.second.end());
    }
    stream.insert(stream.end(), {0, 0, 0xFF, 0xFF});
    ScopedModel model = ScopedModel::raw("ivbmodel", stream);

    ModelReader walk("dir/ivbmodel", ModelReader::IVB);
    EXPECT_EQ(walk.readObject(), first);
    EXPECT_EQ(walk.readObject(), second);
    EXPECT_TRUE(walk.readObject().empty());
    EXPECT_TRUE(walk.readObject().empty());
    expectMessage([&] { walk.rawSize(); }, "The reader does not support raw mode loading");
    uint8_t out[1];
    expectMessage([&] { walk.read(out, 1, 1); }, "The reader does not support raw mode loading");

    ModelReader named("ivbmodel::x", ModelReader::IVB);
    EXPECT_EQ(named.readObject(), second);
    EXPECT_EQ(named.readObject(), second);  // every call searches from the top
    EXPECT_TRUE(ModelReader("ivbmodel::nothing", ModelReader::IVB).readObject().empty());

    // Every cut of the stream: a clear error at construction or at a read.
    for (std::size_t n = 0; n + 1 < stream.size(); ++n) {
        ScopedModel cut = ScopedModel::raw("ivbcut", std::vector<uint8_t>(stream.begin(), stream.begin() + n));
        try {
            ModelReader reader("ivbcut", ModelReader::IVB);
            for (int i = 0; i < 3; ++i) reader.readObject();
            ADD_FAILURE() << n;
        } catch (const qv_data_error&) {
        } catch (const std::ios_base::failure&) {
        }
    }
}

TEST(ModelPackingTool, PackerOutputReadsBackAndMatchesTheHeaderPacker) {
    // Runs tools/pack_models.py on a payload, serves its output and reads it
    // through the reader in awkward pieces.
    const std::string dir = sourcetree::scratchDir("pack_models");
    const std::vector<uint8_t> payload = patternPayload(777, 99);
    sourcetree::writeText(dir + "/mdzz.bin", std::string(payload.begin(), payload.end()));
    const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/pack_models.py") +
                                "' --out-dir '" + dir + "' --asm '" + dir + "/m.S' '" + dir + "/mdzz.bin'";
    ASSERT_EQ(std::system(command.c_str()), 0);
    const std::vector<uint8_t> packed = sourcetree::readBytes(dir + "/mdzz.packed");
    ASSERT_EQ(packed.size(), payload.size() + 4);
    const uint32_t seed = packed[0] | packed[1] << 8 | packed[2] << 16 | static_cast<uint32_t>(packed[3]) << 24;
    EXPECT_EQ(packRawModel(payload, seed), packed);

    ScopedModel served = ScopedModel::raw("mdzz", packed);
    ModelReader reader("mdzz", ModelReader::RAW);
    EXPECT_EQ(readInChunks(reader, {13, 1, 256, 2}), payload);
    EXPECT_NE(sourcetree::readText(dir + "/m.S").find("mdzzb:"), std::string::npos);
}

TEST(ModelPackingTool, BuiltInRangesHoldTheModelsOfTheSourceTree) {
    for (const char* name : {"mdcb", "mdnb", "mdpb"}) {
        const std::vector<uint8_t> source = sourcetree::readBytes(sourcetree::path(std::string("models/") + name + ".bin"));
        ModelReader reader(name, ModelReader::RAW);
        ASSERT_EQ(reader.rawSize(), source.size()) << name;
        EXPECT_EQ(readInChunks(reader, {5, 1}), source) << name;
    }
}
