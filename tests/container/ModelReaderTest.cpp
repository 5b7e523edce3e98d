#include <gtest/gtest.h>

#include <random>

#include "container/ModelReader.h"
#include "core/Descramble.h"
#include "core/Errors.h"
#include "core/ScrambledTexts.h"
#include "support/ExpectThrow.h"
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

const char* const kTruncated = "Model data truncated";

}  // namespace

TEST(ModelReaderBounds, ReadingPastTheEndRaisesAndConsumesNothing) {
    const std::vector<uint8_t> payload = patternPayload(10);
    ScopedModel model("short", payload);
    ModelReader reader("short", ModelReader::RAW);
    std::vector<uint8_t> out(16, 0xEE);
    reader.read(out.data(), 1, 4);
    expectThrowWith<qv_data_error>([&] { reader.read(out.data(), 1, 7); }, kTruncated);
    expectThrowWith<qv_data_error>([&] { reader.read(out.data(), 0x10000u, 0x10000u); }, kTruncated);  // 2^32
    EXPECT_EQ(out[4], 0xEE) << "nothing written by a refused read";
    // Cursor and unscrambling counter stayed where they were.
    reader.read(out.data() + 4, 2, 3);
    EXPECT_TRUE(std::equal(payload.begin(), payload.end(), out.begin()));
    expectThrowWith<qv_data_error>([&] { reader.read(out.data(), 1, 1); }, kTruncated);
    // A seed alone is an empty model; fewer bytes are no model.
    ScopedModel seedOnly("seedonly", {});
    EXPECT_EQ(ModelReader("seedonly", ModelReader::RAW).rawSize(), 0u);
    for (std::size_t size : {0u, 3u}) {
        ScopedModel tiny = ScopedModel::raw("tiny", std::vector<uint8_t>(size, 1));
        expectThrowWith<qv_data_error>([] { ModelReader r("tiny", ModelReader::RAW); }, kTruncated);
    }
}

TEST(ModelReaderPaths, ModelPathObjectNameModesAndFailures) {
    typedef std::pair<std::string, std::string> P;
    for (const auto& c : std::vector<std::pair<std::string, P>>{
             {"m::", {"m", ""}}, {"::n", {"", "n"}}, {"a/m::b::c", {"a/m", "b::c"}}, {"m:x", {"m:x", ""}}})
        EXPECT_EQ(ModelReader::parseObjectPathAndName(c.first), c.second) << c.first;
    for (const char* path : {"", "::", "::name"})
        expectThrowWith<std::exception>([&] { ModelReader r(path, ModelReader::RAW); }, "Invalid model path");
    for (const char* path : {"nosuchmodel", "mdcb.bin", "MDCB"})
        expectThrowWith<qv_data_error>([&] { ModelReader r(path, ModelReader::RAW); },
                                       descrambleText(scrambled::kModelNotFound));
    // Each mode reads only its own way.
    ScopedModel model("moded", patternPayload(4));
    expectThrowWith<qv_data_error>([&] { ModelReader r("moded", ModelReader::IVB); }, "Not a valid QV IVB file");
    expectThrowWith<std::exception>([&] { ModelReader("moded", ModelReader::RAW).readObject(); },
                                    "The reader does not support ivb mode loading");
    expectThrowWith<std::exception>([&] { ModelReader("moded", 5).rawSize(); },
                                    "The reader does not support raw mode loading");
}

// The IVB stream itself is read by QVIVBMemoryReader (IvbStreamTest).
TEST(ModelReaderIvb, ServesObjectsByNameOrInOrder) {
    ScopedModel model = ScopedModel::raw("ivbmodel", ivbgolden::streamWithOneObject());
    ModelReader walk("dir/ivbmodel", ModelReader::IVB);
    EXPECT_EQ(walk.readObject(), ivbgolden::emptyComposite());
    EXPECT_TRUE(walk.readObject().empty());
    ModelReader named("ivbmodel::ab", ModelReader::IVB);
    EXPECT_EQ(named.readObject(), ivbgolden::emptyComposite());
    EXPECT_EQ(named.readObject(), ivbgolden::emptyComposite());  // every call searches from the top
    EXPECT_TRUE(ModelReader("ivbmodel::nothing", ModelReader::IVB).readObject().empty());
}

// The built-in models must read back as the files of the source tree however
// the reads cut the unscrambling blocks.
TEST(ModelReaderRaw, BuiltInModelsReadBackAsTheirSources) {
    for (const char* name : {"mdcb", "mdnb", "mdpb"}) {
        ModelReader reader(name, ModelReader::RAW);
        const std::string source = sourcetree::path(std::string("models/") + name + ".bin");
        EXPECT_EQ(readInChunks(reader, {5, 1, 256, 257, 3, 511}), sourcetree::readBytes(source)) << name;
    }
}
