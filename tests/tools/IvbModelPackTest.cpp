// tools/pack_ivb_models puts the three built-in payloads into one IVB stream.
// Served as a model, the stream gives each payload back through IVB mode, byte
// for byte: engines built from them are then the built-in ones.

#include <gtest/gtest.h>

#include <cstdlib>

#include "container/ModelReader.h"
#include "support/ScopedModel.h"
#include "support/SourceTree.h"

namespace {

const std::vector<std::string> kNames = {"mdcb", "mdnb", "mdpb"};

TEST(IvbModelPack, PayloadsComeBackThroughIvbModeByteForByte) {
    const std::string out = sourcetree::scratchDir("pack_ivb_models") + "/models.ivb";
    std::string command = std::string("'") + QUORIN_PACK_IVB_MODELS + "' '" + out + "'";
    for (const std::string& name : kNames) command += " '" + sourcetree::path("models/" + name + ".bin") + "'";
    ASSERT_EQ(std::system(command.c_str()), 0) << command;
    const ScopedModel stream = ScopedModel::raw("mdivb", sourcetree::readBytes(out));

    // Each object, by name and in order, is a basic object of raw bytes
    // holding the built-in payload as the library has it.
    ModelReader walk("mdivb", ModelReader::IVB);
    for (const std::string& name : kNames) {
        ModelReader raw(name, ModelReader::RAW);
        std::vector<uint8_t> builtIn(raw.rawSize());
        raw.read(builtIn.data(), 1, raw.rawSize());
        ASSERT_EQ(builtIn, sourcetree::readBytes(sourcetree::path("models/" + name + ".bin"))) << name;
        const std::vector<uint8_t> named = ModelReader("mdivb::" + name, ModelReader::IVB).readObject();
        ASSERT_EQ(named.size(), builtIn.size() + 16) << name;
        EXPECT_EQ(named[8], 1) << name;  // a basic object
        EXPECT_EQ(named[9], 1) << name;  // of raw bytes
        EXPECT_EQ(std::vector<uint8_t>(named.begin() + 16, named.end()), builtIn) << name;
        EXPECT_EQ(walk.readObject(), named) << name;
    }
    EXPECT_TRUE(walk.readObject().empty());
}

}  // namespace
