#include <gtest/gtest.h>

#include "support/ScopedModel.h"
#include "container/ModelReader.h"

TEST(ModelReaderRaw, RoundTrip) {
    std::vector<uint8_t> payload(600);
    for (size_t i = 0; i < payload.size(); ++i) payload[i] = static_cast<uint8_t>(i * 7);
    ScopedModel model("roundtrip", payload);
    ModelReader reader("roundtrip", ModelReader::RAW);
    ASSERT_EQ(reader.rawSize(), 600u);
    std::vector<uint8_t> out(600);
    reader.read(out.data(), 1, 600);
    EXPECT_EQ(out, payload);
}
