#include <gtest/gtest.h>

#include <functional>

#include "container/IvbBytes.h"
#include "core/Errors.h"
#include "quorin/DataBlob.h"
#include "quorin/QVIVBObject.h"
#include "support/ExpectThrow.h"
#include "support/IvbGolden.h"

namespace {

using Bytes = std::vector<uint8_t>;

// One entry (info + object) as the packer lays it out.
Bytes entry(const std::string& name, uint16_t tag, const Bytes& object) {
    uint8_t info[4];
    ivb::putU16(info, static_cast<uint16_t>(name.size()));
    ivb::putU16(info + 2, tag);
    Bytes out(info, info + 4);
    for (char c : name) out.push_back(static_cast<uint8_t>(c));
    out.insert(out.end(), object.begin(), object.end());
    return out;
}

Bytes object(uint8_t kind, uint8_t subType, const Bytes& body) {
    Bytes out(16);
    ivb::putObjectHeader(out.data(), 16 + body.size(), kind, subType);
    out.insert(out.end(), body.begin(), body.end());
    return out;
}

Bytes composite(const std::vector<Bytes>& entries) {
    Bytes body;
    for (const Bytes& e : entries) body.insert(body.end(), e.begin(), e.end());
    return object(ivb::kComposite, 0, body);
}

}  // namespace

TEST(IvbGolden, CompositeLayoutsBothWays) {
    const float values[2] = {1.5f, -2.0f};
    QVIVBCompositeObjectPacker packer;
    EXPECT_EQ(packer.data(), ivbgolden::emptyComposite());
    packer.packBasicObject<float>("", 5, values, 2);
    EXPECT_EQ(packer.data(), ivbgolden::compositeWithFloats());
    packer.init();
    EXPECT_EQ(packer.data(), ivbgolden::emptyComposite()) << "a reused packer starts afresh";

    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(ivbgolden::compositeWithFloats());
    const uint32_t id = unpacker.getObjId("", 5);
    QVIVBObjectSubType subType;
    unsigned int count = 0;
    unpacker.getBasicObjectPropertyImpl(id, subType, count);
    EXPECT_EQ(subType.value(), 12u);
    ASSERT_EQ(count, 2u);
    float back[2] = {0, 0};
    unpacker.unpackBasicObjectImpl(id, back);
    EXPECT_EQ(std::vector<float>(back, back + 2), std::vector<float>(values, values + 2));
}

TEST(IvbGolden, DataPropertyAndBlobBothWays) {
    EXPECT_EQ(DataProperty(DataProperty::UINT32, 2, 3, 1).toIvb(), ivbgolden::uint32Property());
    DataProperty property;
    property.fromIvb(ivbgolden::uint32Property());
    EXPECT_EQ(property.toIvb(), ivbgolden::uint32Property());
    EXPECT_EQ(property.maxVal(), 0xFFFFFFFFFFFFFFFFull);

    DataBlob blob;
    blob.setName("f");
    blob.init(DataProperty(DataProperty::BYTES, 1, 1, 2));
    blob.bytePointer()[0] = 0xAB;
    blob.bytePointer()[1] = 0xCD;
    EXPECT_EQ(blob.toIvb(), ivbgolden::byteBlob());
    DataBlob back;
    back.fromIvb(ivbgolden::byteBlob());
    EXPECT_EQ(back.name(), "f");
    EXPECT_EQ(back.bytePointer()[1], 0xCD);
    EXPECT_EQ(back.toIvb(), ivbgolden::byteBlob());
}

TEST(IvbUnpacker, LookupRules) {
    const Bytes one = object(ivb::kBasic, 9, {1, 0, 0, 0});
    const Bytes two = object(ivb::kBasic, 9, {2, 0, 0, 0});
    const Bytes three = object(ivb::kBasic, 9, {3, 0, 0, 0});
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(composite({entry("", 4, one), entry("", 4, two), entry("named", 6, three)}));
    ASSERT_EQ(unpacker.objects().size(), 3u);
    EXPECT_EQ(unpacker.getObjId("", 4), 1u);  // the later duplicate wins
    EXPECT_EQ(unpacker.getObjId("", 6), 2u);
    EXPECT_EQ(unpacker.getObjId("named", 999), 2u);  // a name makes the tag irrelevant
    expectThrowWith<std::invalid_argument>([&] { unpacker.getObjId("", 0); }, "Invalid argument passed");
    expectThrowWith<qv_data_error>([&] { unpacker.getObjId("", 8); }, "Could not find corresponding object id");
    expectThrowWith<qv_data_error>([&] { unpacker.getObjId("other", 4); }, "Could not find corresponding object id");
    unpacker.release();
    EXPECT_TRUE(unpacker.objects().empty());
}

TEST(IvbUnpacker, BasicObjectErrors) {
    // An object whose size field says 3: parse takes those 3 bytes and reads the
    // next entry (nameless, untagged, a 240-byte array whose size field's low
    // byte doubles as the high byte of the 3) from behind them.
    Bytes small = {3, 0, 0, 0, 0, 0, 0};
    const Bytes tail = object(ivb::kBasic, 4, Bytes(240, 0));
    small.insert(small.end(), tail.begin(), tail.end());
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(composite({entry("", 1, object(ivb::kBasic, 99, {})), entry("", 2, object(ivb::kBasic, 0, {1, 2})),
                              entry("", 3, ivbgolden::emptyComposite()), entry("", 4, object(ivb::kBasic, 9, {1, 2, 3})),
                              entry("", 5, object(ivb::kBasic, 9, {7, 0, 0, 0})), entry("", 6, small)}));
    ASSERT_EQ(unpacker.objects().size(), 7u);
    EXPECT_EQ(unpacker.objects()[5].size(), 3u);
    QVIVBObjectSubType st;
    unsigned int count = 0, unsignedValue = 0;
    int value = 0;
    const std::string conversion = "QV IVB object conversion error";
    const std::vector<std::pair<std::function<void()>, std::string>> cases = {
        {[&] { unpacker.getBasicObjectPropertyImpl(0, st, count); }, "Invalid IVB sub type"},
        {[&] { unpacker.getBasicObjectPropertyImpl(1, st, count); }, conversion},  // sub type 0
        {[&] { unpacker.getBasicObjectPropertyImpl(2, st, count); }, "Not a valid basic IVB object id"},
        {[&] { unpacker.getBasicObjectPropertyImpl(3, st, count); }, conversion},  // 3 bytes of int
        {[&] { unpacker.getBasicObjectPropertyImpl(7, st, count); }, "Not a valid object id"},
        {[&] { unpacker.getBasicObjectPropertyImpl(5, st, count); }, conversion},  // size field below 16
        {[&] { unpacker.unpackBasicObjectImpl(5, &value); }, conversion},
        {[&] { unpacker.unpackBasicObjectImpl(7, &value); }, conversion},          // no such object
        {[&] { unpacker.unpackBasicObjectImpl(2, &value); }, conversion},          // composite
        {[&] { unpacker.unpackBasicObjectImpl(4, &unsignedValue); }, conversion},  // no conversion
        {[&] { unpacker.unpackBasicObjectImpl(4, &value, 0); }, conversion},       // no room
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(&c - &cases[0]);
        expectThrowWith<std::exception>(c.first, c.second);
    }
    unpacker.unpackBasicObjectImpl(4, &value, 1);
    EXPECT_EQ(value, 7);
}

TEST(IvbUnpacker, MalformedCompositesAreRefused) {
    const Bytes good = ivbgolden::compositeWithFloats();
    auto withSize = [](Bytes b, uint64_t size) {
        ivb::putU64(b.data(), size);
        return b;
    };
    auto withByte = [](Bytes b, std::size_t at, uint8_t v) {
        b[at] = v;
        return b;
    };
    const std::vector<std::pair<const char*, Bytes>> cases = {
        {"shorter than a header", Bytes(15, 0)},
        {"size one past the length", withSize(good, good.size() + 1)},
        {"size one short of the length", withSize(good, good.size() - 1)},
        {"kind basic", withByte(good, 8, 1)},
        {"composite with a sub type", withByte(good, 9, 3)},
        {"one to three stray bytes", composite({Bytes{0, 0, 1}})},
        {"name past the end", withByte(good, 16, 200)},
        {"no room for the object header", composite({entry("abcd", 1, Bytes(12, 0))})},
        {"object size past the end", withByte(good, 20, 0x19)},
        {"object size above 32 bits", withByte(good, 24, 1)},
        {"trailing bytes after an entry", composite({entry("", 1, ivbgolden::emptyComposite()), Bytes{0, 0}})},
    };
    for (const auto& c : cases) {
        QVIVBCompositeObjectUnpacker unpacker;
        EXPECT_THROW(unpacker.parse(c.second), qv_ivb_conversion_error) << c.first;
    }
}

TEST(IvbUnpacker, EveryTruncationAndByteDamageOfABlobFailsCleanly) {
    const Bytes good = ivbgolden::byteBlob();
    for (std::size_t n = 0; n < good.size(); ++n) {
        DataBlob blob;
        EXPECT_THROW(blob.fromIvb(Bytes(good.begin(), good.begin() + n)), qv_ivb_conversion_error) << n;
    }
    // Every byte set to each of a few values: either a blob whose bytes agree
    // with its property, or an exception; never an overrun (ASan watches).
    for (std::size_t i = 0; i < good.size(); ++i) {
        for (uint8_t v : {0x00, 0x01, 0x10, 0x7F, 0xFF}) {
            Bytes damaged = good;
            damaged[i] = v;
            DataBlob blob;
            try {
                blob.fromIvb(damaged);
                EXPECT_EQ(blob.getDataProperty().byteSize(), 2u) << i;
            } catch (const std::exception&) {
            }
        }
    }
}

TEST(IvbUnpacker, CountsThatDisagreeWithTheDataAreRefusedBeforeAllocating) {
    // A blob of two stored bytes under the given property.
    auto blobWith = [](const DataProperty& property) {
        QVIVBCompositeObjectPacker packer;
        packer.packBasicObject<char>("", 38, "n", 1);
        packer.packCompositeObject(40, property);
        const uint8_t two[2] = {1, 2};
        packer.packBasicObject<void>("", 37, two, 2);
        return packer.data();
    };
    DataBlob blob;
    // 2^32-1 cubed floats claimed: refused before any allocation.
    EXPECT_THROW(blob.fromIvb(blobWith(DataProperty(DataProperty::FLOAT32, 0xFFFFFFFFu, 0xFFFFFFFFu, 0xFFFFFFFFu))),
                 qv_ivb_conversion_error);
    EXPECT_EQ(blob.bytePointer(), nullptr);
    // More bytes stored than the property says: would overrun the buffer.
    EXPECT_THROW(blob.fromIvb(blobWith(DataProperty(DataProperty::BYTES, 1, 1, 1))), qv_ivb_conversion_error);
}

TEST(IvbUnpacker, DeepNestingIsIndexedFlatAndRefusedByTheReader) {
    // 100000 composites each holding the next under the blob's property tag:
    // nothing walks the nesting recursively, so this is just a wrong blob.
    const std::size_t depth = 100000;
    const uint64_t total = depth * 20 + 16;
    Bytes nested(total, 0);
    for (std::size_t level = 0; level <= depth; ++level) {
        uint8_t* at = nested.data() + level * 20;
        ivb::putObjectHeader(at, total - level * 20, ivb::kComposite, 0);
        if (level < depth) ivb::putU16(at + 18, 40);
    }
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(nested);
    EXPECT_EQ(unpacker.objects().size(), 1u);
    DataBlob blob;
    EXPECT_THROW(blob.fromIvb(nested), std::exception);
    DataProperty property;
    EXPECT_THROW(property.fromIvb(nested), qv_data_error);
}

TEST(IvbDataProperty, RangeIsStoredOnlyForUnsignedTypes) {
    struct Case {
        DataProperty::DataType type;
        unsigned subType;
        bool range;
    };
    for (const Case& c : {Case{DataProperty::BYTES, 4, false}, Case{DataProperty::UINT32, 8, true},
                          Case{DataProperty::FLOAT32, 12, false}, Case{DataProperty::UINT64, 10, true},
                          Case{DataProperty::FLOAT64, 13, false}, Case{DataProperty::NONE, 0, false}}) {
        SCOPED_TRACE(c.subType);
        DataProperty p(c.type, 3, 4, 5);
        EXPECT_EQ(p.ivbSubType().value(), c.subType);
        p.setMinValue(11);
        p.setMaxValue(22);
        DataProperty back;
        back.setMaxValue(6);
        back.fromIvb(p.toIvb());
        EXPECT_EQ(back.dataType(), c.type);
        EXPECT_EQ(back.maxVal(), c.range ? 22u : 6u);
    }
}

TEST(IvbSubType, StorageSizes) {
    const unsigned expected[] = {0, 1, 1, 1, 1, 1, 2, 2, 4, 4, 8, 8, 4, 8};
    for (unsigned i = 0; i < 14; ++i) EXPECT_EQ(storageSize(QVIVBObjectSubType(i)), expected[i]) << i;
    expectThrowWith<std::invalid_argument>([] { storageSize(QVIVBObjectSubType(14)); }, "Invalid IVB sub type");
}
