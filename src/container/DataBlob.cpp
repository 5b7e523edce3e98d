#include "quorin/DataBlob.h"

#include <cstring>
#include <limits>
#include <new>

#include "container/IvbMembers.h"

namespace {

enum Tag : uint32_t {
    kTagXNum = 32,
    kTagYNum = 33,
    kTagFLen = 34,
    kTagMinVal = 35,
    kTagMaxVal = 36,
    kTagData = 37,
    kTagName = 38,
    kTagDataType = 39,
    kTagProperty = 40
};

const char* const kConversionError = "QV IVB object conversion error";

bool hasRange(DataProperty::DataType type) { return type == DataProperty::UINT32 || type == DataProperty::UINT64; }

}  // namespace

DataProperty::DataProperty() { clear(); }

DataProperty::DataProperty(DataType type, uint32_t xNum, uint32_t yNum, uint32_t fLen) {
    clear();
    setup(type, xNum, yNum, fLen);
}

DataProperty::DataProperty(QVIVBObjectSubType subType, uint32_t xNum, uint32_t yNum, uint32_t fLen) {
    clear();
    DataType type = NONE;
    switch (subType.value()) {
        case 4: type = BYTES; break;
        case 8: type = UINT32; break;
        case 12: type = FLOAT32; break;
        case 10: type = UINT64; break;
        case 13: type = FLOAT64; break;
        default: break;
    }
    setup(type, xNum, yNum, fLen);
}

void DataProperty::setup(DataType type, uint32_t xNum, uint32_t yNum, uint32_t fLen) {
    dataType_ = type;
    xNum_ = xNum;
    yNum_ = yNum;
    fLen_ = fLen;
    if (hasRange(type)) {
        minVal_ = 0;
        maxVal_ = 0xFFFFFFFFFFFFFFFFull;
    }
}

void DataProperty::clear() {
    dataType_ = NONE;
    minVal_ = 0;
    maxVal_ = 0;
    xNum_ = 0;
    yNum_ = 0;
    fLen_ = 0;
}

QVIVBObjectSubType DataProperty::ivbSubType() const {
    switch (dataType_) {
        case BYTES: return QVIVBObjectSubType(4);
        case UINT32: return QVIVBObjectSubType(8);
        case FLOAT32: return QVIVBObjectSubType(12);
        case UINT64: return QVIVBObjectSubType(10);
        case FLOAT64: return QVIVBObjectSubType(13);
        default: return QVIVBObjectSubType(0);
    }
}

unsigned long long DataProperty::elementNum() const {
    // x * y fits in 64 bits; times fLen it may not, so saturate: such a blob can
    // never be allocated, and a saturated size fails cleanly in init.
    const unsigned long long grid = gridPointNum();
    if (fLen_ != 0 && grid > std::numeric_limits<unsigned long long>::max() / fLen_)
        return std::numeric_limits<unsigned long long>::max();
    return grid * fLen_;
}

unsigned int DataProperty::elementSize() const { return storageSize(ivbSubType()); }

unsigned long long DataProperty::byteSize() const {
    const unsigned long long n = elementNum();
    const unsigned int size = elementSize();
    if (size != 0 && n > std::numeric_limits<unsigned long long>::max() / size)
        return std::numeric_limits<unsigned long long>::max();
    return n * size;
}

unsigned long long DataProperty::gridPointNum() const { return static_cast<unsigned long long>(xNum_) * yNum_; }

unsigned long long DataProperty::gridPointByteSize() const {
    return static_cast<unsigned long long>(elementSize()) * fLen_;
}

std::vector<uint8_t> DataProperty::toIvb() const {
    QVIVBCompositeObjectPacker packer;
    const unsigned int type = static_cast<unsigned int>(static_cast<int32_t>(dataType_));
    packer.packBasicObject<unsigned int>(std::string(), kTagDataType, &type, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagXNum, &xNum_, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagYNum, &yNum_, 1);
    packer.packBasicObject<unsigned int>(std::string(), kTagFLen, &fLen_, 1);
    if (hasRange(dataType_)) {
        packer.packBasicObject<unsigned long long>(std::string(), kTagMinVal, &minVal_, 1);
        packer.packBasicObject<unsigned long long>(std::string(), kTagMaxVal, &maxVal_, 1);
    }
    return packer.data();
}

void DataProperty::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    // The stored value is the 32-bit pattern of the signed type; unknown values
    // are kept as they are and simply have no sub type.
    unsigned int type = static_cast<unsigned int>(static_cast<int32_t>(dataType_));
    ivbmember::scalar(unpacker, kTagDataType, type);
    dataType_ = static_cast<DataType>(static_cast<int32_t>(type));
    ivbmember::scalar(unpacker, kTagXNum, xNum_);
    ivbmember::scalar(unpacker, kTagYNum, yNum_);
    ivbmember::scalar(unpacker, kTagFLen, fLen_);
    if (hasRange(dataType_)) {
        ivbmember::scalar(unpacker, kTagMinVal, minVal_);
        ivbmember::scalar(unpacker, kTagMaxVal, maxVal_);
    }
}

DataBlob::DataBlob() : data_(nullptr) {}

DataBlob::DataBlob(const DataBlob& other) : name_(other.name_), data_(nullptr) {
    init(other.property_);
    if (data_ != nullptr) std::memcpy(data_, other.data_, property_.byteSize());
}

DataBlob& DataBlob::operator=(const DataBlob& other) {
    if (this == &other) return *this;
    init(other.property_);
    name_ = other.name_;
    if (data_ != nullptr) std::memcpy(data_, other.data_, property_.byteSize());
    return *this;
}

DataBlob::~DataBlob() { release(); }

void DataBlob::release() {
    delete[] data_;
    data_ = nullptr;
    property_.clear();
}

void DataBlob::init(const DataProperty& property) {
    const unsigned long long size = property.byteSize();
    if (size == property_.byteSize()) {
        property_ = property;
        return;
    }
    if (size > std::numeric_limits<std::size_t>::max()) throw std::bad_alloc();
    uint8_t* fresh = size == 0 ? nullptr : new uint8_t[static_cast<std::size_t>(size)];
    delete[] data_;
    data_ = fresh;
    property_ = property;
}

std::vector<uint8_t> DataBlob::toIvb() const {
    QVIVBCompositeObjectPacker packer;
    packer.packBasicObject<char>(std::string(), kTagName, name_.data(), static_cast<unsigned int>(name_.size()));
    packer.packCompositeObject(kTagProperty, property_);
    const unsigned long long size = property_.byteSize();
    if (size > 0xFFFFFFFFull) throw qv_ivb_conversion_error(kConversionError);  // beyond an object's 32-bit reach
    packer.packBasicObject<void>(std::string(), kTagData, data_, static_cast<unsigned int>(size));
    return packer.data();
}

void DataBlob::fromIvb(const std::vector<uint8_t>& bytes) {
    QVIVBCompositeObjectUnpacker unpacker;
    unpacker.parse(bytes);
    unpacker.unpackBasicObjectImpl(unpacker.getObjId(std::string(), kTagName), name_);
    DataProperty property;
    unpacker.unpackCompositeObject(kTagProperty, property);

    // The stored bytes must be exactly what the property describes: more would
    // overrun the buffer, and a property claiming more than is stored would
    // allocate for bytes that are not there.
    const unsigned long long size = property.byteSize();
    const uint32_t id = ivbmember::checkedId(unpacker, kTagData, size);
    init(property);
    unpacker.unpackBasicObjectImpl<void>(id, data_, static_cast<unsigned int>(size));
}
