#include "quorin/QVIVBObject.h"

#include <cstring>
#include <stdexcept>

#include "container/IvbBytes.h"
#include "core/Errors.h"

namespace {

const char* const kConversionError = "QV IVB object conversion error";

[[noreturn]] void conversionError() { throw qv_ivb_conversion_error(kConversionError); }

}  // namespace

qv_ivb_conversion_error::~qv_ivb_conversion_error() = default;

unsigned int storageSize(QVIVBObjectSubType subType) {
    static const unsigned int sizes[] = {0, 1, 1, 1, 1, 1, 2, 2, 4, 4, 8, 8, 4, 8};
    if (subType.value() >= sizeof(sizes) / sizeof(sizes[0])) throw std::invalid_argument("Invalid IVB sub type");
    return sizes[subType.value()];
}

void QVIVBCompositeObjectPacker::init() {
    size_ = ivb::kObjectHeaderSize;
    parts_.clear();
}

void QVIVBCompositeObjectPacker::appendObjInfo(const std::string& name, QVIVBObjectTag tag) {
    std::vector<uint8_t> info(4 + name.size());
    ivb::putU16(info.data(), static_cast<uint16_t>(name.size()));
    ivb::putU16(info.data() + 2, static_cast<uint16_t>(tag.value()));
    if (!name.empty()) std::memcpy(info.data() + 4, name.data(), name.size());
    size_ += info.size();
    parts_.push_back(std::move(info));
}

void QVIVBCompositeObjectPacker::appendObj(const std::vector<uint8_t>& bytes) {
    size_ += bytes.size();
    parts_.push_back(bytes);
}

void QVIVBCompositeObjectPacker::packBasicBytes(const std::string& name, QVIVBObjectTag tag, QVIVBObjectSubType subType,
                                                const void* data, unsigned int count) {
    // 64-bit so that a count near 2^32 of 8-byte elements cannot wrap.
    const uint64_t bytes = static_cast<uint64_t>(count) * storageSize(subType);
    std::vector<uint8_t> object(ivb::kObjectHeaderSize + bytes);
    ivb::putObjectHeader(object.data(), object.size(), ivb::kBasic, static_cast<uint8_t>(subType.value()));
    if (bytes != 0) std::memcpy(object.data() + ivb::kObjectHeaderSize, data, bytes);
    appendObjInfo(name, tag);
    size_ += object.size();
    parts_.push_back(std::move(object));
}

std::vector<uint8_t> QVIVBCompositeObjectPacker::data() const {
    std::vector<uint8_t> out;
    out.reserve(size_);
    out.resize(ivb::kObjectHeaderSize);
    ivb::putObjectHeader(out.data(), size_, ivb::kComposite, 0);
    for (const std::vector<uint8_t>& part : parts_) out.insert(out.end(), part.begin(), part.end());
    return out;
}

void QVIVBCompositeObjectUnpacker::release() {
    objects_.clear();
    nameIds_.clear();
    tagIds_.clear();
}

void QVIVBCompositeObjectUnpacker::parse(const std::vector<uint8_t>& bytes) {
    release();
    const uint64_t n = bytes.size();
    const uint8_t* b = bytes.data();
    if (n < ivb::kObjectHeaderSize) conversionError();
    if (ivb::getU64(b) != n) conversionError();
    if (b[8] != ivb::kComposite || b[9] != 0) conversionError();
    if (n == ivb::kObjectHeaderSize) return;
    if (n - ivb::kObjectHeaderSize < 4) conversionError();

    // Every test below compares against the bytes left, never a sum that
    // could wrap, so no entry can make the position pass the end.
    uint64_t pos = ivb::kObjectHeaderSize;
    for (;;) {
        const uint16_t nameLength = ivb::getU16(b + pos);
        const uint16_t tag = ivb::getU16(b + pos + 2);
        pos += 4;
        if (nameLength > n - pos) conversionError();
        const std::string name(reinterpret_cast<const char*>(b + pos), nameLength);
        pos += nameLength;
        if (n - pos < ivb::kObjectHeaderSize) conversionError();
        const uint64_t size = ivb::getU64(b + pos);
        if (size > 0xFFFFFFFFull || size > n - pos) conversionError();

        const uint32_t id = static_cast<uint32_t>(objects_.size());
        objects_.emplace_back(b + pos, b + pos + size);
        if (tag != 0) tagIds_[QVIVBObjectTag(tag)] = id;
        if (!name.empty()) nameIds_[name] = id;

        pos += size;
        if (pos >= n) return;
        if (n - pos < 4) conversionError();
    }
}

uint32_t QVIVBCompositeObjectUnpacker::getObjId(const std::string& name, QVIVBObjectTag tag) const {
    if (!name.empty()) {
        const auto it = nameIds_.find(name);
        if (it != nameIds_.end()) return it->second;
    } else {
        if (tag.value() == 0) throw std::invalid_argument("Invalid argument passed");
        const auto it = tagIds_.find(tag);
        if (it != tagIds_.end()) return it->second;
    }
    throw qv_data_error("Could not find corresponding object id");
}

void QVIVBCompositeObjectUnpacker::getBasicObjectPropertyImpl(uint32_t id, QVIVBObjectSubType& subType,
                                                              unsigned int& count) const {
    if (id >= objects_.size()) throw std::invalid_argument("Not a valid object id");
    const std::vector<uint8_t>& object = objects_[id];
    if (object.size() < ivb::kObjectHeaderSize) conversionError();
    if (object[8] != ivb::kBasic) throw std::invalid_argument("Not a valid basic IVB object id");
    const QVIVBObjectSubType stored(object[9]);
    const unsigned int elementSize = storageSize(stored);
    // Sub type 0 names no element, so there is no count to give.
    if (elementSize == 0) conversionError();
    const uint32_t bytes = static_cast<uint32_t>(ivb::getU64(object.data())) - ivb::kObjectHeaderSize;
    if (bytes % elementSize != 0) conversionError();
    subType = stored;
    count = bytes / elementSize;
}

void QVIVBCompositeObjectUnpacker::unpackBasicBytes(uint32_t id, QVIVBObjectSubType subType, void* destination,
                                                    uint64_t capacityBytes) const {
    if (id >= objects_.size()) conversionError();
    const std::vector<uint8_t>& object = objects_[id];
    if (object.size() < ivb::kObjectHeaderSize || ivb::getU64(object.data()) != object.size()) conversionError();
    if (object[8] != ivb::kBasic || object[9] != subType.value()) conversionError();
    const uint64_t bytes = object.size() - ivb::kObjectHeaderSize;
    if (bytes > capacityBytes) conversionError();
    if (bytes != 0) std::memcpy(destination, object.data() + ivb::kObjectHeaderSize, bytes);
}

void QVIVBCompositeObjectUnpacker::unpackBasicObjectImpl(uint32_t id, std::string& destination) const {
    QVIVBObjectSubType subType;
    unsigned int count = 0;
    getBasicObjectPropertyImpl(id, subType, count);
    if (subType.value() != qv_ivb_subtype_traits<char>::type) conversionError();
    destination.assign(reinterpret_cast<const char*>(objects_[id].data()) + ivb::kObjectHeaderSize, count);
}
