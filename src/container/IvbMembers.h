#ifndef QUORIN_CONTAINER_IVBMEMBERS_H
#define QUORIN_CONTAINER_IVBMEMBERS_H

#include <cstdint>
#include <stdexcept>
#include <string>

#include "quorin/QVIVBObject.h"

// Reading the members of a class's binary form: each member is a nameless
// basic object under its tag. Whatever the member's object is (a composite, an
// unknown sub type, a count it can't have), the failure is the conversion
// error, as the typed unpack gives it.
//
// An array must hold exactly the number of elements its count members
// promise. A longer one would overrun the room made for it. A shorter one is
// refused too, although zero-padding it would be defined: the room would then
// follow a count no stored byte bounds (a 40-byte object could claim
// gigabytes), while room sized by the bytes present would be overrun by the
// readers that walk the full count (quantize, transform, classify, a blob's
// byteSize). So both are refused before anything is allocated or copied.
namespace ivbmember {

inline const char* conversionError() { return "QV IVB object conversion error"; }

// The id of the basic object under tag and its element count. Throws
// qv_data_error for a missing tag and qv_ivb_conversion_error for an object
// that isn't a basic one of a known sub type.
inline uint32_t basicId(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, unsigned int& count) {
    const uint32_t id = unpacker.getObjId(std::string(), tag);
    QVIVBObjectSubType subType;
    try {
        unpacker.getBasicObjectPropertyImpl(id, subType, count);
    } catch (const std::invalid_argument&) {  // a composite, or a sub type above 13
        throw qv_ivb_conversion_error(conversionError());
    }
    return id;
}

// The id of the array under tag, after checking that it holds `expected`
// elements (any sub type; the unpack checks the type).
inline uint32_t checkedId(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, unsigned long long expected) {
    unsigned int count = 0;
    const uint32_t id = basicId(unpacker, tag, count);
    if (count != expected) throw qv_ivb_conversion_error(conversionError());
    return id;
}

// One scalar member of type T read into target. No element leaves target as
// it was (nothing is copied); more than one would overrun it and is refused.
template <typename T>
void scalar(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, T& target) {
    unsigned int count = 0;
    const uint32_t id = basicId(unpacker, tag, count);
    if (count > 1) throw qv_ivb_conversion_error(conversionError());
    unpacker.unpackBasicObjectImpl(id, &target, 1);
}

// An array member of exactly count elements of T into destination.
template <typename T>
void array(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, T* destination, unsigned long long count) {
    const uint32_t id = checkedId(unpacker, tag, count);
    unpacker.unpackBasicObjectImpl(id, destination, static_cast<unsigned int>(count));
}

// ensures: count as the 32-bit element count of a basic object.
// throws:  qv_ivb_conversion_error when it does not fit one.
inline unsigned int storableCount(unsigned long long count) {
    if (count > 0xFFFFFFFFull) throw qv_ivb_conversion_error(conversionError());
    return static_cast<unsigned int>(count);
}

}  // namespace ivbmember

#endif
