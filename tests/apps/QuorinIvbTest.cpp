// Tests of quorin-ivb: the JSON it prints for streams and bare objects, its
// refusal of damaged bytes with the place named, and the program's exit codes.

#include <gtest/gtest.h>

#include <cctype>
#include <cstdlib>
#include <sstream>
#include <string>
#include <vector>

#include <sys/wait.h>

#include "IvbLayout.h"
#include "core/Json.h"
#include "quorin/QVIVBStream.h"
#include "support/IvbGolden.h"
#include "support/SourceTree.h"

namespace {

using Bytes = std::vector<uint8_t>;

// The value at `path` in a JSON text: object keys and array indices, apart by blanks.
std::string at(std::string json, const std::string& path) {
    while (!json.empty() && json.back() == '\n') json.pop_back();
    std::istringstream steps(path);
    for (std::string step; steps >> step;)
        json = std::isdigit(step[0]) ? parseJsonArray(json).at(std::stoul(step)) : parseJsonObject(json)[step];
    return json;
}

void writeFile(const std::string& path, const Bytes& bytes) {
    sourcetree::writeText(path, std::string(bytes.begin(), bytes.end()));
}

TEST(QuorinIvb, DescribesTheSmallStreamExactly) {
    EXPECT_EQ(qivb::describe(ivbgolden::streamWithOneObject()),
              "{\n"
              "  \"format\": \"IVB stream\",\n"
              "  \"size\": 42,\n"
              "  \"label\": \"\",\n"
              "  \"records\": [\n"
              "    {\n"
              "      \"name\": \"ab\",\n"
              "      \"tag\": 7,\n"
              "      \"offset\": 16,\n"
              "      \"object\": {\n"
              "        \"offset\": 22,\n"
              "        \"size\": 16,\n"
              "        \"kind\": \"composite\",\n"
              "        \"entries\": []\n"
              "      }\n"
              "    }\n"
              "  ],\n"
              "  \"unreadBytes\": 0\n"
              "}\n");
    EXPECT_EQ(at(qivb::describe(ivbgolden::smallestStream()), "records"), "[]");
}

TEST(QuorinIvb, NestedObjectsShowTypesCountsValuesAndText) {
    const std::string file = sourcetree::scratchDir("quorin_ivb") + "/models.ivb";
    {
        QVIVBFileWriter writer(file, "two \"models\"");
        writer.writeObject("vq", 9, ivbgolden::vectorQuantizer());
        writer.writeObject("blob", ivbgolden::byteBlob());
    }
    Bytes bytes = sourcetree::readBytes(file);
    bytes.push_back(0xEE);  // behind the terminal record: never read, but counted
    const std::string json = qivb::describe(bytes);
    // Valid JSON to an independent reader, escapes included (the engine's own
    // codec reads no escapes, so the label is blanked for it below).
    sourcetree::writeText(file + ".json", json);
    EXPECT_EQ(std::system((sourcetree::python() + " -m json.tool '" + file + ".json' > /dev/null").c_str()), 0) << json;
    const std::string quoted = "\"two \\\"models\\\"\"";
    ASSERT_NE(json.find("\"label\": " + quoted), std::string::npos);
    const std::string top = json.substr(0, json.find(quoted)) + "\"\"" + json.substr(json.find(quoted) + quoted.size());
    const std::string vq = "records 0 object entries ", blob = "records 1 object entries ";
    const std::vector<std::pair<std::string, std::string>> expected = {
        {"unreadBytes", "1"}, {"records 0 name", "\"vq\""}, {"records 0 tag", "9"}, {vq + "2 tag", "97"},
        {vq + "2 object type", "\"float\""}, {vq + "2 object count", "2"},
        {vq + "2 object value", ""},  // only single numbers show their value
        {vq + "3 object value", "0.5"},
        // The blob: its name as text, its property a nested composite.
        {blob + "0 object text", "\"f\""}, {blob + "1 object kind", "\"composite\""},
        {blob + "2 object type", "\"void\""}};
    for (const auto& e : expected) EXPECT_EQ(at(top, e.first), e.second) << e.first;
    // A bare object, as a class's toIvb writes it.
    const std::string bare = qivb::describe(ivbgolden::nearestCentroids());
    EXPECT_EQ(at(bare, "format"), "\"IVB object\"");
    EXPECT_EQ(at(bare, "object size"), "122");
}

Bytes patched(Bytes bytes, std::size_t at, std::initializer_list<uint8_t> values) {
    for (uint8_t v : values) bytes.at(at++) = v;
    return bytes;
}

Bytes nested(int depth) {
    Bytes inner = ivbgolden::emptyComposite();
    for (int i = 0; i < depth; ++i) {
        Bytes outer = {0, 0, 0, 0, 0, 0, 0, 0, 2, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 0};
        outer.insert(outer.end(), inner.begin(), inner.end());
        for (int b = 0; b < 8; ++b) outer[static_cast<std::size_t>(b)] = static_cast<uint8_t>(outer.size() >> (8 * b));
        inner.swap(outer);
    }
    return inner;
}

TEST(QuorinIvb, DamageIsRefusedWithItsPlace) {
    const Bytes floats = ivbgolden::compositeWithFloats();  // inner object at 20, its kind at 28, type at 29
    struct Case {
        const char* what;
        Bytes bytes;
        const char* message;  // a part of what() that must appear
    };
    const std::vector<Case> cases = {
        {"size one byte long", patched(floats, 0, {0x2D}), "object size field says 45 bytes, 44 are there"},
        {"element type 0", patched(floats, 29, {0}), "at byte 29: basic object of unknown element type 0"},
        {"element type 99", patched(floats, 29, {99}), "unknown element type 99"},
        {"7 bytes of floats", patched(floats, 20, {0x17}), "7 bytes are not a whole number of float elements"},
        {"kind 3", patched(floats, 28, {3}), "at byte 28: object of unknown kind 3"},
        {"inner size past the end", patched(floats, 20, {0x19}), "runs past the end of its composite"},
        {"inner size below a header", patched(floats, 20, {0x08}), "shorter than its 16-byte header"},
        {"name past the end", patched(floats, 16, {0x40}), "entry name runs past"},
        {"nesting too deep", nested(qivb::kMaxDepth + 1), "nested deeper than 64 levels"},
        {"stream with a wrong version", patched(ivbgolden::streamWithOneObject(), 6, {2}), "not a readable IVB stream"},
        {"stream object cut inside", patched(ivbgolden::streamWithOneObject(), 22, {0x08}), ""},
    };
    for (const Case& c : cases) {
        try {
            ADD_FAILURE() << c.what << ": described as " << qivb::describe(c.bytes);
        } catch (const qivb::Damage& e) {
            EXPECT_NE(std::string(e.what()).find(c.message), std::string::npos) << c.what << ": " << e.what();
        }
    }
    EXPECT_NO_THROW(qivb::describe(nested(qivb::kMaxDepth)));
    // Every cut of a stream is damage, never a crash or a partial answer.
    const Bytes stream = ivbgolden::streamWithOneObject();
    for (std::size_t n = 0; n < stream.size(); ++n)
        EXPECT_THROW(qivb::describe(Bytes(stream.begin(), stream.begin() + static_cast<long>(n))), qivb::Damage) << n;
}

TEST(QuorinIvb, ExitCodes) {
    const std::string dir = sourcetree::scratchDir("quorin_ivb_cli");
    writeFile(dir + "/good.ivb", ivbgolden::streamWithOneObject());
    writeFile(dir + "/bad.ivb", patched(ivbgolden::compositeWithFloats(), 29, {0}));
    struct Run {
        std::string args;
        int status;
        const char* out;  // a part of stdout, or of stderr for a failure
    };
    const std::vector<Run> runs = {
        {"'" + dir + "/good.ivb'", 0, "\"name\": \"ab\""},
        {"- < '" + dir + "/good.ivb'", 0, "\"format\": \"IVB stream\""},
        {"'" + dir + "/bad.ivb'", 1, "bad.ivb: damaged IVB data: at byte 29"},
        {"'" + dir + "/missing.ivb'", 1, "missing.ivb: cannot open"},
        {"", 2, "usage: quorin-ivb"},
    };
    for (const Run& r : runs) {
        const std::string out = dir + "/out.txt";
        const std::string command = std::string("'") + QUORIN_IVB_EXE + "' " + r.args + " > '" + out + "' 2>&1";
        const int rc = std::system(command.c_str());
        ASSERT_TRUE(WIFEXITED(rc)) << command;
        EXPECT_EQ(WEXITSTATUS(rc), r.status) << command;
        EXPECT_NE(sourcetree::readText(out).find(r.out), std::string::npos) << command << "\n" << sourcetree::readText(out);
    }
}

}  // namespace
