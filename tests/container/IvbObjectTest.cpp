// IVB objects: the hand-written byte layouts in both directions, the
// unpacker's lookup and refusals, and damaged or lying bytes of every object
// kind stored in this format (blob, face model, representation).

#include <gtest/gtest.h>

#include <new>

#include "container/FaceModelData.h"
#include "container/IvbBytes.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "quorin/DataBlob.h"
#include "quorin/QVFaceModel.h"
#include "quorin/QVFaceRepresentation.h"
#include "quorin/QVIVBObject.h"
#include "support/ExpectThrow.h"
#include "support/IvbGolden.h"

// Lets a test make the no-throw allocation fail, as on an exhausted heap. The
// ordinary allocation does the work otherwise, so that deletes still match.
static bool failNoThrowNew = false;
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    if (failNoThrowNew) return nullptr;
    try {
        return ::operator new(size);
    } catch (...) {
        return nullptr;
    }
}

namespace {

using Bytes = std::vector<uint8_t>;
using ivbgolden::withByte;

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

    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(ivbgolden::emptyComposite());
    EXPECT_TRUE(unpacker.objects().empty());
    unpacker.parse(ivbgolden::compositeWithFloats());
    const uint32_t id = unpacker.getObjId("", 5);
    QVIVBObjectSubType subType;
    unsigned int count = 0;
    unpacker.getBasicObjectPropertyImpl(id, subType, count);
    ASSERT_EQ(count, 2u);
    float back[2] = {0, 0};
    unpacker.unpackBasicObjectImpl(id, back);
    EXPECT_EQ(std::vector<float>(back, back + 2), std::vector<float>(values, values + 2));
}

// The range of a property is stored for unsigned types only: the UINT32
// property carries it, the BYTES property of the blob does not.
TEST(IvbGolden, DataPropertyAndBlobBothWays) {
    EXPECT_EQ(DataProperty(DataProperty::UINT32, 2, 3, 1).toIvb(), ivbgolden::uint32Property());
    DataProperty property;
    property.fromIvb(ivbgolden::uint32Property());
    EXPECT_EQ(property.toIvb(), ivbgolden::uint32Property());
    DataBlob blob;
    blob.setName("f");
    blob.init(DataProperty(DataProperty::BYTES, 1, 1, 2));
    blob.bytePointer()[0] = 0xAB;
    blob.bytePointer()[1] = 0xCD;
    EXPECT_EQ(blob.toIvb(), ivbgolden::byteBlob());  // read back through QVFaceRepresentation below
}

TEST(IvbGolden, FaceHandlesBothWaysAndCopiesAreDeep) {
    LDAModel lda;
    lda.dimension = 2;
    lda.projection = Eigen::Vector2f(0.5f, 0.25f);
    lda.firstValue = 1.5f;
    lda.secondValue = -2.0f;
    EXPECT_EQ(FaceModelData(lda).toIvb(), ivbgolden::faceModel());
    QVFaceModel model;
    model.fromIvb(ivbgolden::faceModel());
    QVFaceModel modelCopy(model);
    model.fromIvb(QVFaceModel().toIvb());
    EXPECT_EQ(model.toIvb(), QVFaceModel().toIvb());
    EXPECT_EQ(modelCopy.toIvb(), ivbgolden::faceModel());
    EXPECT_EQ(QVFaceModel(lda).toIvb(), ivbgolden::faceModel()) << "the host's record";

    QVFaceRepresentation representation;
    representation.fromIvb(ivbgolden::byteBlob());
    EXPECT_EQ(representation.name(), "f");
    EXPECT_EQ(representation.toIvb(), ivbgolden::byteBlob());
}

TEST(IvbUnpacker, LookupRules) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(composite({entry("", 4, object(ivb::kBasic, 9, {1, 0, 0, 0})),
                              entry("", 4, object(ivb::kBasic, 9, {2, 0, 0, 0})),
                              entry("named", 6, object(ivb::kBasic, 9, {3, 0, 0, 0}))}));
    EXPECT_EQ(unpacker.getObjId("", 4), 1u);         // the later duplicate wins
    EXPECT_EQ(unpacker.getObjId("named", 999), 2u);  // a name makes the tag irrelevant
    expectThrowWith<std::invalid_argument>([&] { unpacker.getObjId("", 0); }, "Invalid argument passed");
    for (const char* name : {"", "other"})
        expectThrowWith<qv_data_error>([&] { unpacker.getObjId(name, 8); }, "Could not find corresponding object id");
}

// Malformed composites and basic-object errors are left to FuzzIvbUnpacker:
// the refusals below are the ones that guard allocations.
TEST(IvbUnpacker, EveryBlobTruncationIsRefused) {
    expectEveryCutThrows<qv_ivb_conversion_error>(ivbgolden::byteBlob(), [](const Bytes& cut) { DataBlob().fromIvb(cut); });
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
    EXPECT_THROW(blob.fromIvb(blobWith(DataProperty(DataProperty::FLOAT32, 0xFFFFFFFFu, 0xFFFFFFFFu, 0xFFFFFFFFu))),
                 qv_ivb_conversion_error);
    EXPECT_EQ(blob.bytePointer(), nullptr);
    // More bytes stored than the property says: would overrun the buffer.
    EXPECT_THROW(blob.fromIvb(blobWith(DataProperty(DataProperty::BYTES, 1, 1, 1))), qv_ivb_conversion_error);

    // Damaged face models (dimension at 36, its sub type at 29, the
    // projection's size at 96, kind at 100, sub type at 101) are refused with
    // the conversion error, keeping the members read before the failure: dimension 2
    // and the scalars 1.5, -2 of the golden model, or nothing.
    const Bytes good = ivbgolden::faceModel();
    auto withDimension = [&](uint32_t d) {
        Bytes b = good;
        for (int i = 0; i < 4; ++i) b.at(36 + i) = static_cast<uint8_t>(d >> (8 * i));
        return b;
    };
    const struct {
        const char* what;
        Bytes bytes;
        int32_t dimension;  // the scalars were read with it unless it is 0
    } models[] = {
        {"dimension above the stored floats", withDimension(3), 3},
        {"dimension below the stored floats", withDimension(1), 1},
        {"negative dimension", withDimension(0xFFFFFFFEu), -2},
        {"2^31 - 1 floats claimed", withDimension(0x7FFFFFFFu), 0x7FFFFFFF},
        {"projection as a composite", withByte(good, 100, ivb::kComposite), 2},
        {"projection of sub type 14", withByte(good, 101, 14), 2},
        {"dimension as float", withByte(good, 29, 0x0C), 0},
        {"projection size broken", withByte(good, 96, 0x19), 0},
        {"truncated", Bytes(good.begin(), good.end() - 1), 0},
    };
    for (const auto& c : models) {
        FaceModelData data;
        EXPECT_THROW(data.fromIvb(c.bytes), qv_ivb_conversion_error) << c.what;
        const bool scalarsRead = c.dimension != 0;
        EXPECT_EQ(std::vector<float>({float(data.dimension), data.firstValue, data.secondValue, float(data.projection.size())}),
                  std::vector<float>({float(c.dimension), scalarsRead ? 1.5f : 0.0f, scalarsRead ? -2.0f : 0.0f, 0.0f}))
            << c.what;
    }
}

TEST(IvbUnpacker, DeepNestingIsIndexedFlatAndRefusedByTheReader) {
    // 100000 composites each holding the next under the blob's property tag:
    // nothing walks the nesting recursively, so this is just a wrong blob.
    const std::size_t depth = 100000;
    const uint64_t total = depth * 20 + 16;
    Bytes nested(total, 0);
    for (std::size_t level = 0; level <= depth; ++level) {
        ivb::putObjectHeader(nested.data() + level * 20, total - level * 20, ivb::kComposite, 0);
        if (level < depth) ivb::putU16(nested.data() + level * 20 + 18, 40);
    }
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(nested);
    EXPECT_EQ(unpacker.objects().size(), 1u);
    EXPECT_THROW(DataBlob().fromIvb(nested), std::exception);
    EXPECT_THROW(DataProperty().fromIvb(nested), qv_data_error);
}

TEST(IvbFaceHandles, DamagedRepresentationsAndHandlesWithoutValueRaise) {
    for (const Bytes& bad : {Bytes(), ivbgolden::emptyComposite(), ivbgolden::compositeWithFloats(),
                             withByte(ivbgolden::byteBlob(), 0, 0xB0)})
        expectThrowWith<ApiError>([&] { QVFaceRepresentation().fromIvb(bad); },
                                  "QVFaceRepresentation could not be read from IVB");
    QVFaceRepresentation source;
    source.fromIvb(ivbgolden::byteBlob());
    failNoThrowNew = true;
    QVFaceRepresentation broken(source);
    failNoThrowNew = false;
    const std::string message = "QVFaceRepresentation not initialized properly";
    expectThrowWith<ApiError>([&] { broken.name(); }, message);
    expectThrowWith<ApiError>([&] { broken.fromIvb(ivbgolden::byteBlob()); }, message);
    expectThrowWith<ApiError>([&] { source = broken; }, message);
    expectThrowWith<ApiError>([&] { broken = source; }, message);
    EXPECT_EQ(QVFaceRepresentation(broken).name(), "") << "a copy of it is a fresh, empty value";
}
