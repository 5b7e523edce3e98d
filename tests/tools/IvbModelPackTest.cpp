#include <gtest/gtest.h>

#include <cstdlib>

#include "container/ModelReader.h"
#include "support/ScopedModel.h"
#include "support/SourceTree.h"

// tools/pack_ivb_models puts the three built-in payloads into one IVB stream;
// served as a model, the stream gives each payload back through IVB mode,
// byte for byte the same as the built-in model read in raw mode.
TEST(IvbModelPack, BuiltInPayloadsComeBackThroughIvbMode) {
    const std::string dir = sourcetree::scratchDir("pack_ivb_models");
    const std::string out = dir + "/models.ivb";
    const std::vector<std::string> names = {"mdcb", "mdnb", "mdpb"};
    std::string command = std::string("'") + QUORIN_PACK_IVB_MODELS + "' '" + out + "'";
    for (const std::string& name : names) command += " '" + sourcetree::path("models/" + name + ".bin") + "'";
    ASSERT_EQ(std::system(command.c_str()), 0) << command;

    ScopedModel stream = ScopedModel::raw("mdivb", sourcetree::readBytes(out));
    ModelReader walk("mdivb", ModelReader::IVB);
    for (const std::string& name : names) {
        ModelReader raw(name, ModelReader::RAW);
        std::vector<uint8_t> builtIn(raw.rawSize());
        raw.read(builtIn.data(), 1, raw.rawSize());
        ASSERT_EQ(builtIn, sourcetree::readBytes(sourcetree::path("models/" + name + ".bin"))) << name;

        const std::vector<uint8_t> named = ModelReader("mdivb::" + name, ModelReader::IVB).readObject();
        ASSERT_EQ(named.size(), builtIn.size() + 16) << name;
        EXPECT_EQ(named[8], 1) << name;  // a basic object
        EXPECT_EQ(named[9], 1) << name;  // of raw bytes
        EXPECT_TRUE(std::equal(builtIn.begin(), builtIn.end(), named.begin() + 16)) << name;
        EXPECT_EQ(walk.readObject(), named) << name;
    }
    EXPECT_TRUE(walk.readObject().empty());
}
