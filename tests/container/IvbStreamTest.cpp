#include <gtest/gtest.h>

#include "container/IvbBytes.h"
#include "core/Errors.h"
#include "quorin/QVIVBStream.h"
#include "support/ExpectThrow.h"
#include "support/IvbGolden.h"
#include "support/SourceTree.h"

namespace {

using Bytes = std::vector<uint8_t>;
using ivbgolden::withByte;

std::string scratchFile(const std::string& name) {
    static const std::string dir = sourcetree::scratchDir("ivb_stream");
    return dir + "/" + name;
}

// Three distinct objects "one", "two" (tag 9) and a nameless one; with
// `tail`, a terminal record and an object behind it follow.
Bytes writeThreeObjects(const std::string& file, bool tail) {
    {
        QVIVBFileWriter writer(file, "label!");
        writer.writeObject("one", ivbgolden::emptyComposite());
        writer.writeObject("two", 9, ivbgolden::compositeWithFloats());
        writer.writeObject(ivbgolden::faceModel());
        if (tail) {
            writer.writeTerminal();
            writer.writeObject("b", ivbgolden::emptyComposite());
        }
    }
    return sourcetree::readBytes(file);
}

// True when walking `bytes` (in order, or searching a name) ends in a clear error.
bool failsToWalk(const Bytes& bytes, bool byName) {
    try {
        QVIVBMemoryReader reader(bytes.data(), bytes.data() + bytes.size());
        for (int i = 0; i < 5; ++i) byName ? reader.readNamedObject("missing") : reader.readNextObject();
    } catch (const qv_data_error&) {
        return true;
    } catch (const std::ios_base::failure&) {
        return true;
    }
    return false;
}

}  // namespace

TEST(IvbStreamGolden, WrittenAndReadBytesBothWays) {
    const std::string file = scratchFile("golden");
    for (bool withObject : {false, true}) {
        const Bytes golden = withObject ? ivbgolden::streamWithOneObject() : ivbgolden::smallestStream();
        const Bytes object = withObject ? ivbgolden::emptyComposite() : Bytes();
        {
            QVIVBFileWriter writer(file);
            if (withObject) writer.writeObject("ab", 7, ivbgolden::emptyComposite());
        }
        EXPECT_EQ(sourcetree::readBytes(file), golden);
        QVIVBMemoryReader memory(golden.data(), golden.data() + golden.size());
        EXPECT_EQ(memory.readNextObject(), object);
        EXPECT_TRUE(memory.readNextObject().empty());
        EXPECT_EQ(QVIVBFileReader(file).readNamedObject("ab"), object);
    }
}

TEST(IvbStream, NamedSequentialAndTerminalReads) {
    const std::string file = scratchFile("three");
    const Bytes bytes = writeThreeObjects(file, true);
    QVIVBMemoryReader memory(bytes.data(), bytes.data() + bytes.size());
    EXPECT_EQ(memory.label(), "label!");
    EXPECT_EQ(memory.readNamedObject("two"), ivbgolden::compositeWithFloats());
    EXPECT_EQ(memory.readNextObject(), ivbgolden::faceModel());  // the lookahead stands behind "two"
    EXPECT_TRUE(memory.readNextObject().empty());               // the terminal ends the stream
    EXPECT_TRUE(memory.readNamedObject("b").empty());
    EXPECT_EQ(memory.readNamedObject(""), ivbgolden::faceModel());  // first nameless record
}

// Broken headers over memory are left to FuzzIvbMemoryReader.
TEST(IvbStreamDamage, EveryTruncationFailsOverMemoryAndFile) {
    const Bytes good = writeThreeObjects(scratchFile("truncated"), false);
    for (std::size_t n = 0; n < good.size(); ++n) {
        const Bytes cut(good.begin(), good.begin() + n);
        EXPECT_TRUE(failsToWalk(cut, false)) << n << " sequential";
        EXPECT_TRUE(failsToWalk(cut, true)) << n << " by name";
    }
    // Over a file the stream's own exceptions come first.
    const std::string cutFile = scratchFile("truncated_file");
    sourcetree::writeText(cutFile, std::string(good.begin(), good.end() - 1));
    EXPECT_THROW(
        {
            QVIVBFileReader reader(cutFile);
            for (int i = 0; i < 5; ++i) reader.readNextObject();
        },
        std::ios_base::failure);
    EXPECT_THROW(QVIVBFileReader("/nonexistent/dir/x.ivb"), std::ios_base::failure);
    EXPECT_THROW(QVIVBFileWriter("/nonexistent/dir/x.ivb"), std::ios_base::failure);
}

TEST(IvbStreamDamage, LengthFieldsThatLie) {
    const Bytes good = ivbgolden::streamWithOneObject();  // main part at offset 22
    auto withSize = [&](uint64_t size) {
        Bytes b = good;
        ivb::putU64(b.data() + 22, size);
        return b;
    };
    // A claimed 4 GiB main part: found as a short read, without allocating it.
    const Bytes huge = withSize(0xFFFFFFF0ull);
    QVIVBMemoryReader reader(huge.data(), huge.data() + huge.size());
    expectThrowWith<qv_data_error>([&] { reader.readNextObject(); }, "Not a valid QV IVB file");
    QVIVBMemoryReader searching(huge.data(), huge.data() + huge.size());
    expectThrowWith<std::ios_base::failure>([&] { searching.readNamedObject("zz"); }, "Stream position out of range");
    // A length that would be a negative offset must not send the search back.
    const Bytes negative = withSize(0xFFFFFFFFFFFFFFF0ull);
    QVIVBMemoryReader backwards(negative.data(), negative.data() + negative.size());
    expectThrowWith<qv_data_error>([&] { backwards.readNamedObject("zz"); }, "Not a valid QV IVB file");
    // A length below 16 is taken as it is; the stream then reads on from
    // there: a nameless record whose length (bytes 26..33 for 0) is 2^33, or
    // (for 4 and 15) whose main part the 42 bytes no longer hold.
    const std::pair<uint64_t, const char*> shortSizes[] = {
        {0, "Stream position out of range"}, {4, "Not a valid QV IVB file"}, {15, "Not a valid QV IVB file"}};
    for (const auto& [size, error] : shortSizes) {
        const Bytes shortSize = withSize(size);
        QVIVBMemoryReader r(shortSize.data(), shortSize.data() + shortSize.size());
        EXPECT_EQ(r.readNextObject().size(), size);
        expectThrowWith<std::exception>([&] { r.readNamedObject("zz"); }, error, std::to_string(size));
    }
}
