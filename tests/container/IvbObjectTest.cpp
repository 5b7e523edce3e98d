#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <stdexcept>

#include "support/ExpectThrow.h"
#include "container/IvbBytes.h"
#include "core/Errors.h"
#include "quorin/DataBlob.h"
#include "quorin/QVIVBObject.h"
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

TEST(IvbGolden, CompositeWithFloatArrayBothWays) {
    const float values[2] = {1.5f, -2.0f};
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<float>("", 5, values, 2);
    EXPECT_EQ(packer.data(), ivbgolden::compositeWithFloats());

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
    EXPECT_EQ(back[0], 1.5f);
    EXPECT_EQ(back[1], -2.0f);
}

TEST(IvbGolden, EmptyCompositeAndReusedPacker) {
    QVIVBCompositeObjectPacker packer;
    EXPECT_EQ(packer.data(), ivbgolden::emptyComposite());
    const int v = 3;
    packer.packBasicObject<int>("x", 9, &v, 1);
    packer.init();
    EXPECT_EQ(packer.data(), ivbgolden::emptyComposite());
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(ivbgolden::emptyComposite());
    EXPECT_TRUE(unpacker.objects().empty());
}

TEST(IvbGolden, DataPropertyBothWays) {
    const DataProperty property(DataProperty::UINT32, 2, 3, 1);
    EXPECT_EQ(property.toIvb(), ivbgolden::uint32Property());
    DataProperty back;
    back.fromIvb(ivbgolden::uint32Property());
    EXPECT_EQ(back.dataType(), DataProperty::UINT32);
    EXPECT_EQ(back.xNum(), 2u);
    EXPECT_EQ(back.yNum(), 3u);
    EXPECT_EQ(back.fLen(), 1u);
    EXPECT_EQ(back.minVal(), 0u);
    EXPECT_EQ(back.maxVal(), 0xFFFFFFFFFFFFFFFFull);
}

TEST(IvbGolden, DataBlobBothWays) {
    DataBlob blob;
    blob.setName("f");
    blob.init(DataProperty(DataProperty::BYTES, 1, 1, 2));
    blob.bytePointer()[0] = 0xAB;
    blob.bytePointer()[1] = 0xCD;
    EXPECT_EQ(blob.toIvb(), ivbgolden::byteBlob());

    DataBlob back;
    back.fromIvb(ivbgolden::byteBlob());
    EXPECT_EQ(back.name(), "f");
    EXPECT_EQ(back.length(), 2u);
    EXPECT_EQ(back.getDataProperty().ivbSubType().value(), 4u);
    EXPECT_EQ(back.bytePointer()[0], 0xAB);
    EXPECT_EQ(back.bytePointer()[1], 0xCD);
}

TEST(IvbPacker, EmptyTextIsAHeaderOnlyCharObject) {
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<char>("", 3, "", 0);
    const Bytes bytes = packer.data();
    EXPECT_EQ(bytes, composite({entry("", 3, object(ivb::kBasic, 3, {}))}));
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    std::string text = "old";
    unpacker.unpackBasicObjectImpl(unpacker.getObjId("", 3), text);
    EXPECT_EQ(text, "");
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
    const Bytes nested = ivbgolden::emptyComposite();
    // An object whose size field says 3: parse takes those 3 bytes and reads the
    // next entry (nameless, untagged, a 240-byte array whose size field's low
    // byte doubles as the high byte of the 3) from behind them.
    Bytes small = {3, 0, 0, 0, 0, 0, 0};
    const Bytes tail = object(ivb::kBasic, 4, Bytes(240, 0));
    small.insert(small.end(), tail.begin(), tail.end());
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(composite({entry("", 1, object(ivb::kBasic, 99, {})), entry("", 2, object(ivb::kBasic, 0, {1, 2})),
                              entry("", 3, nested), entry("", 4, object(ivb::kBasic, 9, {1, 2, 3})),
                              entry("", 5, object(ivb::kBasic, 9, {7, 0, 0, 0})), entry("", 6, small)}));
    ASSERT_EQ(unpacker.objects().size(), 7u);
    EXPECT_EQ(unpacker.objects()[5].size(), 3u);
    QVIVBObjectSubType st;
    unsigned int count = 0;
    int value = 0;
    unsigned int unsignedValue = 0;
    expectThrowWith<std::invalid_argument>([&] { unpacker.getBasicObjectPropertyImpl(0, st, count); },
                                           "Invalid IVB sub type");
    EXPECT_THROW(unpacker.getBasicObjectPropertyImpl(1, st, count), qv_ivb_conversion_error);  // sub type 0
    expectThrowWith<std::invalid_argument>([&] { unpacker.getBasicObjectPropertyImpl(2, st, count); },
                                           "Not a valid basic IVB object id");
    EXPECT_THROW(unpacker.getBasicObjectPropertyImpl(3, st, count), qv_ivb_conversion_error);  // 3 bytes of int
    expectThrowWith<std::invalid_argument>([&] { unpacker.getBasicObjectPropertyImpl(7, st, count); },
                                           "Not a valid object id");
    // Object whose size field is below 16: parse keeps it, every read refuses it.
    EXPECT_THROW(unpacker.getBasicObjectPropertyImpl(5, st, count), qv_ivb_conversion_error);
    EXPECT_THROW(unpacker.unpackBasicObjectImpl(5, &value), qv_ivb_conversion_error);

    expectThrowWith<qv_ivb_conversion_error>([&] { unpacker.unpackBasicObjectImpl(7, &value); },
                                             "QV IVB object conversion error");
    EXPECT_THROW(unpacker.unpackBasicObjectImpl(2, &value), qv_ivb_conversion_error);          // composite
    EXPECT_THROW(unpacker.unpackBasicObjectImpl(4, &unsignedValue), qv_ivb_conversion_error);  // no conversion
    EXPECT_THROW(unpacker.unpackBasicObjectImpl(4, &value, 0), qv_ivb_conversion_error);       // no room
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
    // A property claiming 2^32-1 cubed floats with two bytes stored.
    DataProperty huge(DataProperty::FLOAT32, 0xFFFFFFFFu, 0xFFFFFFFFu, 0xFFFFFFFFu);
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<char>("", 38, "n", 1);
    packer.packCompositeObject(40, huge);
    const uint8_t two[2] = {1, 2};
    packer.packBasicObject<void>("", 37, two, 2);
    DataBlob blob;
    EXPECT_THROW(blob.fromIvb(packer.data()), qv_ivb_conversion_error);
    EXPECT_EQ(blob.bytePointer(), nullptr);

    // More bytes stored than the property says: would overrun the buffer.
    QVIVBCompositeObjectPacker longer;
    longer.packBasicObject<char>("", 38, "n", 1);
    longer.packCompositeObject(40, DataProperty(DataProperty::BYTES, 1, 1, 1));
    longer.packBasicObject<void>("", 37, two, 2);
    EXPECT_THROW(blob.fromIvb(longer.data()), qv_ivb_conversion_error);
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

TEST(DataPropertyTest, RangeIsStoredOnlyForUnsignedTypes) {
    struct Case {
        DataProperty::DataType type;
        unsigned subType;
        bool range;
        unsigned elementSize;
    };
    for (const Case& c : {Case{DataProperty::BYTES, 4, false, 1}, Case{DataProperty::UINT32, 8, true, 4},
                          Case{DataProperty::FLOAT32, 12, false, 4}, Case{DataProperty::UINT64, 10, true, 8},
                          Case{DataProperty::FLOAT64, 13, false, 8}, Case{DataProperty::NONE, 0, false, 0}}) {
        DataProperty p(c.type, 3, 4, 5);
        EXPECT_EQ(p.ivbSubType().value(), c.subType);
        EXPECT_EQ(DataProperty(p.ivbSubType(), 1, 1, 1).dataType(), c.type);
        EXPECT_EQ(p.byteSize(), 60u * c.elementSize);
        EXPECT_EQ(p.gridPointByteSize(), 5u * c.elementSize);
        p.setMinValue(11);
        p.setMaxValue(22);
        QVIVBCompositeObjectUnpacker unpacker;
        unpacker.parse(p.toIvb());
        EXPECT_EQ(unpacker.objects().size(), c.range ? 6u : 4u) << c.type;

        DataProperty back;
        back.setMinValue(5);
        back.setMaxValue(6);
        back.fromIvb(p.toIvb());
        EXPECT_EQ(back.dataType(), c.type);
        EXPECT_EQ(back.minVal(), c.range ? 11u : 5u);
        EXPECT_EQ(back.maxVal(), c.range ? 22u : 6u);
    }
    EXPECT_EQ(DataProperty(QVIVBObjectSubType(9), 1, 1, 1).dataType(), DataProperty::NONE);
}

TEST(DataBlobTest, CopiesAreDeepAndInitKeepsAnEqualSizedBuffer) {
    DataBlob a;
    a.setName("a");
    a.init(DataProperty(DataProperty::FLOAT32, 2, 1, 1));
    const float v[2] = {1.0f, 2.0f};
    std::memcpy(a.bytePointer(), v, 8);
    DataBlob b(a);
    b.bytePointer()[0] ^= 0xFF;
    EXPECT_NE(a.bytePointer()[0], b.bytePointer()[0]);
    a = a;
    EXPECT_EQ(std::memcmp(a.bytePointer(), v, 8), 0);

    uint8_t* before = a.bytePointer();
    a.init(DataProperty(DataProperty::UINT32, 1, 2, 1));  // same 8 bytes
    EXPECT_EQ(a.bytePointer(), before);
    EXPECT_EQ(std::memcmp(a.bytePointer(), v, 8), 0);
    a.init(DataProperty(DataProperty::BYTES, 0, 0, 0));
    EXPECT_EQ(a.bytePointer(), nullptr);
    b = a;
    EXPECT_EQ(b.bytePointer(), nullptr);
    EXPECT_EQ(b.name(), "a");
}

TEST(IvbSubType, StorageSizes) {
    const unsigned expected[] = {0, 1, 1, 1, 1, 1, 2, 2, 4, 4, 8, 8, 4, 8};
    for (unsigned i = 0; i < 14; ++i) EXPECT_EQ(storageSize(QVIVBObjectSubType(i)), expected[i]) << i;
    expectThrowWith<std::invalid_argument>([] { storageSize(QVIVBObjectSubType(14)); }, "Invalid IVB sub type");
    static_assert(qv_ivb_subtype_traits<unsigned long long>::type == 10, "");
    static_assert(qv_ivb_subtype_traits<void>::type == 1, "");
}
