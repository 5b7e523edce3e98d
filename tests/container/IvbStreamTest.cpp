#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <unistd.h>

#include "support/ExpectThrow.h"
#include "container/IvbBytes.h"
#include "core/Errors.h"
#include "quorin/QVIVBObject.h"
#include "quorin/QVIVBStream.h"
#include "support/IvbGolden.h"
#include "support/SourceTree.h"

namespace {

using Bytes = std::vector<uint8_t>;

// A file path under the build's temporary area, removed on destruction.
struct TempFile {
    std::string path;
    explicit TempFile(const std::string& name)
        : path((std::getenv("TMPDIR") ? std::string(std::getenv("TMPDIR")) : std::string("/tmp")) + "/quorin_ivb_" +
               std::to_string(::getpid()) + "_" + name) {}
    ~TempFile() { std::remove(path.c_str()); }
};

Bytes basicInts(std::initializer_list<int> values) {
    QVIVBCompositeObjectPacker packer;
    const std::vector<int> v(values);
    packer.packBasicObject<int>("", 1, v.data(), static_cast<unsigned>(v.size()));
    return packer.data();
}

// A stream of three objects "one", "two" (tag 9), and a nameless one.
Bytes threeObjectStream(const TempFile& file) {
    {
        QVIVBFileWriter writer(file.path, "label!");
        writer.writeObject("one", basicInts({1}));
        writer.writeObject("two", 9, basicInts({2, 2}));
        writer.writeObject(basicInts({3, 3, 3}));
    }
    return sourcetree::readBytes(file.path);
}

}  // namespace

TEST(IvbStreamGolden, FortyTwoByteStreamBothWays) {
    TempFile file("golden42");
    {
        QVIVBFileWriter writer(file.path);
        writer.writeObject("ab", 7, ivbgolden::emptyComposite());
        EXPECT_TRUE(writer.good());
    }
    EXPECT_EQ(sourcetree::readBytes(file.path), ivbgolden::streamWithOneObject());

    const Bytes bytes = ivbgolden::streamWithOneObject();
    QVIVBMemoryReader memory(bytes.data(), bytes.data() + bytes.size());
    EXPECT_EQ(memory.label(), "");
    EXPECT_EQ(memory.nextTag(), 7u);
    EXPECT_EQ(memory.nextNameLength(), 2u);
    EXPECT_EQ(memory.readNextObject(), ivbgolden::emptyComposite());
    EXPECT_EQ(memory.nextName(), "ab");
    EXPECT_TRUE(memory.atEnd());
    EXPECT_TRUE(memory.readNextObject().empty());
    EXPECT_EQ(memory.readNamedObject("ab"), ivbgolden::emptyComposite());

    QVIVBFileReader fileReader(file.path);
    EXPECT_EQ(fileReader.readNamedObject("ab"), ivbgolden::emptyComposite());
}

TEST(IvbStreamGolden, SmallestStreamIsTwentyBytes) {
    TempFile file("smallest");
    { QVIVBFileWriter writer(file.path); }
    EXPECT_EQ(sourcetree::readBytes(file.path), ivbgolden::smallestStream());
    const Bytes bytes = ivbgolden::smallestStream();
    QVIVBMemoryReader reader(bytes.data(), bytes.data() + bytes.size());
    EXPECT_TRUE(reader.readNextObject().empty());
    EXPECT_TRUE(reader.readNamedObject("").empty());
    EXPECT_TRUE(reader.readNamedObject("x").empty());
}

TEST(IvbStream, NamedAndSequentialReadsOverMemoryAndFile) {
    TempFile file("three");
    const Bytes bytes = threeObjectStream(file);
    QVIVBMemoryReader memory(bytes.data(), bytes.data() + bytes.size());
    QVIVBFileReader fromFile(file.path);
    EXPECT_EQ(memory.label(), "label!");
    EXPECT_EQ(fromFile.label(), "label!");
    const std::string two = "two", none = "three", empty = "";
    EXPECT_EQ(memory.readNamedObject(two), basicInts({2, 2}));
    EXPECT_EQ(memory.readNextObject(), basicInts({3, 3, 3}));  // the lookahead stands behind "two"
    EXPECT_TRUE(memory.readNextObject().empty());
    EXPECT_TRUE(memory.readNamedObject(none).empty());
    EXPECT_EQ(memory.readNamedObject(empty), basicInts({3, 3, 3}));  // first nameless record
    EXPECT_EQ(memory.readNamedObject("one"), basicInts({1}));

    EXPECT_EQ(fromFile.readNextObject(), basicInts({1}));
    EXPECT_EQ(fromFile.readNextObject(), basicInts({2, 2}));
    EXPECT_EQ(fromFile.readNamedObject(two), basicInts({2, 2}));
    EXPECT_EQ(fromFile.readNextObject(), basicInts({3, 3, 3}));
    EXPECT_TRUE(fromFile.readNextObject().empty());
    fromFile.close();
    EXPECT_TRUE(fromFile.atEnd());
}

TEST(IvbStream, TerminalTagEndsTheStreamAndExtraTerminalsStay) {
    TempFile file("terminal");
    {
        QVIVBFileWriter writer(file.path);
        writer.writeObject("a", basicInts({1}));
        writer.writeTerminal();
        writer.writeObject("b", basicInts({2}));
        writer.writeObject("c", 0xFFFF, basicInts({3}));
        writer.writeObject("d", basicInts({4}));
    }
    const Bytes bytes = sourcetree::readBytes(file.path);
    QVIVBMemoryReader reader(bytes.data(), bytes.data() + bytes.size());
    EXPECT_EQ(reader.readNextObject(), basicInts({1}));
    EXPECT_TRUE(reader.readNextObject().empty());  // the second terminal record
    EXPECT_TRUE(reader.readNamedObject("b").empty());
}

TEST(MemoryStreamTest, ReadsSeeksAndEof) {
    const uint8_t data[4] = {1, 2, 3, 4};
    MemoryStream stream(data, data + 4);
    char out[8] = {};
    stream.read(out, 4);
    EXPECT_EQ(stream.gcount(), 4u);
    EXPECT_TRUE(stream.good());  // ending exactly at the end sets no eof
    expectThrowWith<std::ios_base::failure>([&] { stream.seekg(1, std::ios_base::cur); },
                                            "Stream position out of range");
    stream.seekg(-4, std::ios_base::end);
    stream.seekg(2, std::ios_base::beg);
    stream.read(out, 8);
    EXPECT_EQ(stream.gcount(), 2u);
    EXPECT_EQ(out[0], 3);
    EXPECT_FALSE(stream.good());
    stream.seekg(0, std::ios_base::beg);  // seeks never clear eof
    expectThrowWith<std::ios_base::failure>([&] { stream.read(out, 1); }, "Read beyong stream");
    for (auto bad : {std::make_pair(-1LL, std::ios_base::beg), std::make_pair(5LL, std::ios_base::beg),
                     std::make_pair(1LL, std::ios_base::end), std::make_pair(-5LL, std::ios_base::end),
                     std::make_pair(-3LL, std::ios_base::cur)}) {
        EXPECT_THROW(stream.seekg(bad.first, bad.second), std::ios_base::failure) << bad.first;
    }
    MemoryStream unbound;
    EXPECT_FALSE(unbound.good());
    EXPECT_THROW(unbound.read(out, 1), std::ios_base::failure);
}

TEST(IvbStreamDamage, HeaderFailuresOverMemory) {
    const Bytes good = ivbgolden::streamWithOneObject();
    auto with = [&](std::size_t at, uint8_t v) {
        Bytes b = good;
        b[at] = v;
        return b;
    };
    const std::string notIvb = "Not a valid QV IVB file";
    struct Case {
        const char* what;
        Bytes bytes;
        std::string message;
    };
    const std::vector<Case> cases = {
        {"empty", Bytes(), notIvb},
        {"header only", Bytes(good.begin(), good.begin() + 16), notIvb},
        {"wrong magic", with(0, 'J'), notIvb},
        {"wrong version", with(6, 2), notIvb},
        {"version high byte", with(7, 1), notIvb},
        {"label past the end", with(14, 40), "Read beyong stream"},
    };
    for (const Case& c : cases) {
        try {
            QVIVBMemoryReader reader;
            reader.bind(c.bytes.data(), c.bytes.data() + c.bytes.size());
            ADD_FAILURE() << c.what;
        } catch (const std::exception& e) {
            EXPECT_EQ(std::string(e.what()), c.message) << c.what;
        }
    }
    // Unchecked bytes: reserved and byte-order mark.
    Bytes lax = with(8, 0x55);
    lax[12] = 'M';
    QVIVBMemoryReader reader(lax.data(), lax.data() + lax.size());
    EXPECT_EQ(reader.readNamedObject("ab"), ivbgolden::emptyComposite());
    expectThrowWith<std::ios_base::failure>([&] { QVIVBMemoryReader r(good.data() + 1, good.data()); },
                                            "Read beyong stream");
}

TEST(IvbStreamDamage, EveryTruncationFailsOverMemoryAndFile) {
    TempFile file("truncated");
    const Bytes good = threeObjectStream(file);
    for (std::size_t n = 0; n < good.size(); ++n) {
        const Bytes cut(good.begin(), good.begin() + n);
        // Sequential walk and name search each hit the cut.
        for (int named = 0; named < 2; ++named) {
            bool failed = false;
            try {
                QVIVBMemoryReader reader(cut.data(), cut.data() + cut.size());
                if (named) {
                    reader.readNamedObject("missing");
                } else {
                    for (int i = 0; i < 5; ++i) reader.readNextObject();
                }
            } catch (const qv_data_error&) {
                failed = true;
            } catch (const std::ios_base::failure&) {
                failed = true;
            }
            EXPECT_TRUE(failed) << n << (named ? " named" : " sequential");
        }
    }
    // Over a file the stream's own exceptions come first.
    TempFile cutFile("truncated_file");
    for (std::size_t n : {std::size_t(0), std::size_t(10), std::size_t(19), good.size() - 1}) {
        {
            std::ofstream out(cutFile.path, std::ios::binary);
            out.write(reinterpret_cast<const char*>(good.data()), static_cast<std::streamsize>(n));
        }
        EXPECT_THROW(
            {
                QVIVBFileReader reader(cutFile.path);
                for (int i = 0; i < 5; ++i) reader.readNextObject();
            },
            std::ios_base::failure)
            << n;
    }
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
    // A length below 16 is taken as it is; the stream then reads on from there.
    for (uint64_t size : {0ull, 4ull, 15ull}) {
        const Bytes shortSize = withSize(size);
        QVIVBMemoryReader r(shortSize.data(), shortSize.data() + shortSize.size());
        try {
            EXPECT_EQ(r.readNextObject().size(), size);
            for (int i = 0; i < 8; ++i) r.readNamedObject("zz");
        } catch (const std::exception&) {
        }
    }
}
