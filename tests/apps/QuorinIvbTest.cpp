// Tests of quorin-ivb: its refusal of damaged bytes with the place named, and
// the program's exit codes and output.

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

#include <sys/wait.h>

#include "IvbLayout.h"
#include "support/ExpectThrow.h"
#include "support/IvbGolden.h"
#include "support/SourceTree.h"

namespace {

using Bytes = std::vector<uint8_t>;

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
    expectEveryCutThrows<qivb::Damage>(ivbgolden::streamWithOneObject(), [](const Bytes& cut) { qivb::describe(cut); });
}

TEST(QuorinIvb, ExitCodes) {
    const std::string dir = sourcetree::scratchDir("quorin_ivb_cli");
    for (const auto& [name, bytes] : {std::make_pair("good", ivbgolden::streamWithOneObject()),
                                      std::make_pair("bad", patched(ivbgolden::compositeWithFloats(), 29, {0}))})
        sourcetree::writeText(dir + "/" + name + ".ivb", std::string(bytes.begin(), bytes.end()));
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
