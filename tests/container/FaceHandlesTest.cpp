#include <gtest/gtest.h>

#include <new>

#include "container/FaceModelData.h"
#include "container/FaceRepresentationData.h"
#include "container/IvbBytes.h"
#include "core/ApiError.h"
#include "quorin/QVFaceModel.h"
#include "quorin/QVFaceRepresentation.h"
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

template <typename F>
void expectApiError(F f, const std::string& message) {
    try {
        f();
        ADD_FAILURE() << "no exception, expected: " << message;
    } catch (const ApiError& e) {
        EXPECT_EQ(std::string(e.what()), message);
    }
}

Bytes withByte(Bytes b, std::size_t at, uint8_t v) {
    b[at] = v;
    return b;
}

}  // namespace

TEST(IvbFaceHandles, GoldenBytesBothWaysAndDeepCopies) {
    QVFaceRepresentation representation;
    representation.fromIvb(ivbgolden::byteBlob());
    EXPECT_EQ(representation.name(), "f");
    EXPECT_EQ(representation.toIvb(), ivbgolden::byteBlob());
    QVFaceRepresentation copy(representation);
    representation.fromIvb(QVFaceRepresentation().toIvb());
    EXPECT_EQ(copy.toIvb(), ivbgolden::byteBlob());

    LDAModel lda;
    lda.dimension = 2;
    lda.projection = Eigen::Vector2f(0.5f, 0.25f);
    lda.firstValue = 1.5f;
    lda.secondValue = -2.0f;
    EXPECT_EQ(FaceModelData(lda).toIvb(), ivbgolden::faceModel());
    FaceModelData data;
    data.fromIvb(ivbgolden::faceModel());
    EXPECT_EQ(data.projection, lda.projection);
    EXPECT_EQ(data.secondValue, -2.0f);
    QVFaceModel model;
    model.fromIvb(ivbgolden::faceModel());
    QVFaceModel modelCopy(model);
    model.fromIvb(QVFaceModel().toIvb());
    EXPECT_EQ(modelCopy.toIvb(), ivbgolden::faceModel());
    data.fromIvb(model.toIvb());
    EXPECT_EQ(data.projection.size(), 0) << "an empty model reads back empty";
}

TEST(IvbFaceHandles, DamagedRepresentationsAndHandlesWithoutValueRaise) {
    for (const Bytes& bad : {Bytes(), ivbgolden::emptyComposite(), ivbgolden::compositeWithFloats(),
                             withByte(ivbgolden::byteBlob(), 0, 0xB0)}) {
        QVFaceRepresentation representation;
        expectApiError([&] { representation.fromIvb(bad); }, "QVFaceRepresentation could not be read from IVB");
    }
    QVFaceRepresentation source;
    source.fromIvb(ivbgolden::byteBlob());
    failNoThrowNew = true;
    QVFaceRepresentation broken(source);
    failNoThrowNew = false;
    const std::string message = "QVFaceRepresentation not initialized properly";
    expectApiError([&] { broken.name(); }, message);
    expectApiError([&] { broken.toIvb(); }, message);
    expectApiError([&] { broken.fromIvb(ivbgolden::byteBlob()); }, message);
    expectApiError([&] { source = broken; }, message);
    expectApiError([&] { broken = source; }, message);
    EXPECT_EQ(QVFaceRepresentation(broken).name(), "") << "a copy of it is a fresh, empty value";
}

TEST(IvbFaceHandles, DamagedModelsFailAndLeaveTheValue) {
    const Bytes good = ivbgolden::faceModel();
    // Offsets: dimension value at 36, projection object size at 96.
    Bytes huge = withByte(withByte(good, 36, 0xFF), 37, 0xFF);
    huge[38] = 0xFF;
    huge[39] = 0x7F;  // 2^31 - 1 floats claimed, two stored
    const std::vector<std::pair<const char*, Bytes>> cases = {
        {"dimension above the stored floats", withByte(good, 36, 3)},
        {"dimension below the stored floats", withByte(good, 36, 1)},
        {"negative dimension", withByte(withByte(good, 36, 0xFE), 39, 0xFF)},
        {"huge dimension", huge},
        {"dimension as float", withByte(good, 29, 0x0C)},
        {"projection size broken", withByte(good, 96, 0x19)},
        {"truncated", Bytes(good.begin(), good.end() - 1)},
    };
    for (const auto& c : cases) {
        FaceModelData data;
        data.fromIvb(good);
        EXPECT_THROW(data.fromIvb(c.second), std::exception) << c.first;
        EXPECT_EQ(data.dimension, 2) << c.first;
        EXPECT_EQ(data.projection.size(), 2) << c.first;
    }
    // Every truncation and every single byte damage: an exception or a value
    // whose projection length is its dimension.
    for (std::size_t i = 0; i < good.size(); ++i) {
        for (uint8_t v : {0x00, 0x01, 0x80, 0xFF}) {
            FaceModelData data;
            try {
                data.fromIvb(withByte(good, i, v));
            } catch (const std::exception&) {
            }
            EXPECT_EQ(data.projection.size(), data.dimension) << i;
        }
    }
}
