#include "container/FaceModelData.h"

#include <string>

#include "container/IvbMembers.h"
#include "quorin/QVIVBObject.h"

namespace {

const uint32_t kTagDimension = 64;
const uint32_t kTagFirstValue = 160;
const uint32_t kTagProjection = 161;
const uint32_t kTagSecondValue = 162;

const char* const kConversionError = "QV IVB object conversion error";

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
    const int32_t newDimension = ivbmember::scalar<int>(unpacker, kTagDimension);
    const float newFirst = ivbmember::scalar<float>(unpacker, kTagFirstValue);
    const float newSecond = ivbmember::scalar<float>(unpacker, kTagSecondValue);
    if (newDimension < 0) throw qv_ivb_conversion_error(kConversionError);
    const uint32_t id = ivbmember::checkedId(unpacker, kTagProjection, static_cast<unsigned int>(newDimension));
    Eigen::VectorXf newProjection(newDimension);
    unpacker.unpackBasicObjectImpl(id, newProjection.data(), static_cast<unsigned int>(newDimension));
    dimension = newDimension;
    firstValue = newFirst;
    secondValue = newSecond;
    projection.swap(newProjection);
}
