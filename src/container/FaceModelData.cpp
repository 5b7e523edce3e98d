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
    // Each member as it is read, so that a failure keeps what came before it.
    ivbmember::scalar(unpacker, kTagDimension, dimension);
    ivbmember::scalar(unpacker, kTagFirstValue, firstValue);
    ivbmember::scalar(unpacker, kTagSecondValue, secondValue);
    if (dimension < 0) throw qv_ivb_conversion_error(kConversionError);
    const uint32_t id = ivbmember::checkedId(unpacker, kTagProjection, static_cast<unsigned int>(dimension));
    Eigen::VectorXf newProjection(dimension);
    unpacker.unpackBasicObjectImpl(id, newProjection.data(), static_cast<unsigned int>(dimension));
    projection.swap(newProjection);
}
