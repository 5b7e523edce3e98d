#include "container/FaceModelData.h"

#include <string>

#include "quorin/QVIVBObject.h"

namespace {

const uint32_t kTagDimension = 64;
const uint32_t kTagFirstValue = 160;
const uint32_t kTagProjection = 161;
const uint32_t kTagSecondValue = 162;

const char* const kConversionError = "QV IVB object conversion error";

// The id of the array under tag after checking that it holds exactly
// `expected` elements: an array that disagrees with its count member is not
// trusted either way, and is refused before anything is allocated for it.
uint32_t checkedId(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, unsigned int expected) {
    const uint32_t id = unpacker.getObjId(std::string(), tag);
    QVIVBObjectSubType subType;
    unsigned int count = 0;
    unpacker.getBasicObjectPropertyImpl(id, subType, count);
    if (count != expected) throw qv_ivb_conversion_error(kConversionError);
    return id;
}

template <typename T>
T unpackScalar(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag) {
    T value{};
    unpacker.unpackBasicObjectImpl(checkedId(unpacker, tag, 1), &value, 1);
    return value;
}

}  // namespace

std::vector<uint8_t> FaceModelData::toIvb() const {
    if (dimension < 0 || projection.size() != dimension) throw qv_ivb_conversion_error(kConversionError);
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<int>(std::string(), kTagDimension, &dimension, 1);
    packer.packBasicObject<float>(std::string(), kTagFirstValue, &firstValue, 1);
    packer.packBasicObject<float>(std::string(), kTagSecondValue, &secondValue, 1);
    packer.packBasicObject<float>(std::string(), kTagProjection, projection.data(),
                                  static_cast<unsigned int>(projection.size()));
    return packer.data();
}

void FaceModelData::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    const int32_t newDimension = unpackScalar<int>(unpacker, kTagDimension);
    const float newFirst = unpackScalar<float>(unpacker, kTagFirstValue);
    const float newSecond = unpackScalar<float>(unpacker, kTagSecondValue);
    if (newDimension < 0) throw qv_ivb_conversion_error(kConversionError);
    const uint32_t id = checkedId(unpacker, kTagProjection, static_cast<unsigned int>(newDimension));
    Eigen::VectorXf newProjection(newDimension);
    unpacker.unpackBasicObjectImpl(id, newProjection.data(), static_cast<unsigned int>(newDimension));
    dimension = newDimension;
    firstValue = newFirst;
    secondValue = newSecond;
    projection.swap(newProjection);
}
