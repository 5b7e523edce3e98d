#ifndef QUORIN_CONTAINER_IVBMEMBERS_H
#define QUORIN_CONTAINER_IVBMEMBERS_H

#include <cstdint>
#include <string>

#include "quorin/QVIVBObject.h"

// Reading the members of a class's binary form: each member is a nameless
// basic object under its tag. A stored array must hold exactly the number of
// elements its count members promise: a longer one would overrun the room made
// for it, a shorter one would leave part of the member unread, so both are
// refused before anything is allocated or copied.
namespace ivbmember {

inline const char* conversionError() { return "QV IVB object conversion error"; }

// The id of the array under tag, after checking that it holds `expected`
// elements (any sub type; the unpack checks the type). Throws qv_data_error
// for a missing tag and qv_ivb_conversion_error for another element count.
inline uint32_t checkedId(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag, unsigned long long expected) {
    const uint32_t id = unpacker.getObjId(std::string(), tag);
    QVIVBObjectSubType subType;
    unsigned int count = 0;
    unpacker.getBasicObjectPropertyImpl(id, subType, count);
    if (count != expected) throw qv_ivb_conversion_error(conversionError());
    return id;
}

// One scalar member of type T: anything but exactly one T is damage.
template <typename T>
T scalar(const QVIVBCompositeObjectUnpacker& unpacker, uint32_t tag) {
    T value{};
    unpacker.unpackBasicObjectImpl(checkedId(unpacker, tag, 1), &value, 1);
    return value;
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
