#ifndef QUORIN_QVIVBOBJECT_H
#define QUORIN_QVIVBOBJECT_H

// IVB objects: self-describing, length-prefixed byte blocks. Every object opens
// with a 16-byte header, all integers little-endian, no padding:
//     size (u64, header included) | kind (u8: 1 basic, 2 composite) |
//     subType (u8: element type of a basic object, 0 for a composite) | 6 zero bytes
// A basic object is the header followed by its elements. A composite object is
// the header followed by entries, each
//     nameLength (u16) | tag (u16) | name bytes | one complete object
// bounded by the composite's size, with no end marker.

#include <cstdint>
#include <exception>
#include <map>
#include <string>
#include <vector>

#include "quorin/export.h"

// Raised where IVB bytes cannot be turned into an object.
class QUORIN_EXPORT qv_ivb_conversion_error : public std::exception {
public:
    explicit qv_ivb_conversion_error(const std::string& text) : text_(text) {}
    ~qv_ivb_conversion_error() override;
    const char* what() const noexcept override { return text_.c_str(); }

private:
    std::string text_;
};

// The element type of a basic object: 0 none, 1 void (raw bytes), 2 bool,
// 3 char, 4 unsigned char, 5 signed char, 6 unsigned short, 7 short,
// 8 unsigned int, 9 int, 10 unsigned long long, 11 long long, 12 float, 13 double.
class QUORIN_EXPORT QVIVBObjectSubType {
public:
    QVIVBObjectSubType(unsigned int value = 0) : value_(value) {}
    unsigned int value() const { return value_; }
    bool operator==(const QVIVBObjectSubType& other) const { return value_ == other.value_; }
    bool operator!=(const QVIVBObjectSubType& other) const { return value_ != other.value_; }

private:
    unsigned int value_;
};

// ensures: the element size in bytes of subType (0 for sub type 0).
// throws:  std::invalid_argument "Invalid IVB sub type" for a value above 13.
QUORIN_EXPORT unsigned int storageSize(QVIVBObjectSubType subType);

// The numeric address of an object inside a composite or a stream; 0 means no
// tag. Only the low 16 bits are stored.
class QUORIN_EXPORT QVIVBObjectTag {
public:
    QVIVBObjectTag(uint32_t value = 0) : value_(value) {}
    uint32_t value() const { return value_; }
    bool operator==(const QVIVBObjectTag& other) const { return value_ == other.value_; }
    bool operator<(const QVIVBObjectTag& other) const { return value_ < other.value_; }

private:
    uint32_t value_;
};

// qv_ivb_subtype_traits<T>::type: the sub type value that stores elements of T.
template <typename T>
struct qv_ivb_subtype_traits;
#define QUORIN_IVB_SUBTYPE(T, V) \
    template <>                  \
    struct qv_ivb_subtype_traits<T> { static constexpr unsigned int type = V; }
QUORIN_IVB_SUBTYPE(void, 1);
QUORIN_IVB_SUBTYPE(bool, 2);
QUORIN_IVB_SUBTYPE(char, 3);
QUORIN_IVB_SUBTYPE(unsigned char, 4);
QUORIN_IVB_SUBTYPE(signed char, 5);
QUORIN_IVB_SUBTYPE(unsigned short, 6);
QUORIN_IVB_SUBTYPE(short, 7);
QUORIN_IVB_SUBTYPE(unsigned int, 8);
QUORIN_IVB_SUBTYPE(int, 9);
QUORIN_IVB_SUBTYPE(unsigned long long, 10);
QUORIN_IVB_SUBTYPE(long long, 11);
QUORIN_IVB_SUBTYPE(float, 12);
QUORIN_IVB_SUBTYPE(double, 13);
#undef QUORIN_IVB_SUBTYPE

// Builds one composite object entry by entry. A class's toIvb constructs one,
// packs each member under its tag and returns data().
class QUORIN_EXPORT QVIVBCompositeObjectPacker {
public:
    // ensures: an empty composite (data() is 16 bytes, kind 2).
    QVIVBCompositeObjectPacker() { init(); }

    // ensures: all entries are dropped; the header is back to size 16, kind 2.
    void init();

    // requires: data points to count elements (count is in bytes for void);
    //           data may be null when count is 0.
    // ensures:  one entry (name, tag) holding a basic object of T's sub type.
    template <typename T>
    void packBasicObject(const std::string& name, QVIVBObjectTag tag, const T* data, unsigned int count) {
        packBasicBytes(name, tag, QVIVBObjectSubType(qv_ivb_subtype_traits<T>::type), data, count);
    }

    // requires: T offers std::vector<uint8_t> toIvb() const.
    // ensures:  one nameless entry under tag holding object.toIvb().
    template <typename T>
    void packCompositeObject(QVIVBObjectTag tag, const T& object) {
        const std::vector<uint8_t> bytes = object.toIvb();
        appendObjInfo(std::string(), tag);
        appendObj(bytes);
    }

    // ensures: appends nameLength and tag (each cut to 16 bits) and the name's
    //          bytes as one part. A name longer than 65535 bytes is written whole
    //          with a cut length field; keep names short.
    void appendObjInfo(const std::string& name, QVIVBObjectTag tag);
    // ensures: appends bytes as they stand; the caller vouches that they are a
    //          complete object following an appendObjInfo.
    void appendObj(const std::vector<uint8_t>& bytes);

    // ensures: the finished composite object: header, then every part in order.
    std::vector<uint8_t> data() const;

private:
    void packBasicBytes(const std::string& name, QVIVBObjectTag tag, QVIVBObjectSubType subType, const void* data,
                        unsigned int count);

    uint64_t size_;
    std::vector<std::vector<uint8_t>> parts_;
};

// Indexes the entries of one composite object and hands them out by name or tag.
// A class's fromIvb constructs one, parses its bytes and reads each member.
class QUORIN_EXPORT QVIVBCompositeObjectUnpacker {
public:
    // ensures: the entries of bytes are indexed; nested objects are kept as
    //          bytes, unchecked, until they are unpacked. For a name or tag that
    //          occurs twice the later entry wins.
    // throws:  qv_ivb_conversion_error "QV IVB object conversion error" when bytes
    //          are not one well-formed composite object. Whatever was indexed
    //          before the failure stays; the next parse starts clean.
    void parse(const std::vector<uint8_t>& bytes);

    // ensures: the id of the entry named name or, for an empty name, tagged tag.
    // throws:  std::invalid_argument "Invalid argument passed" for an empty name
    //          and tag 0; qv_data_error "Could not find corresponding object id".
    uint32_t getObjId(const std::string& name, QVIVBObjectTag tag) const;

    // ensures: subType and element count of the basic object id.
    // throws:  std::invalid_argument "Not a valid object id" /
    //          "Not a valid basic IVB object id" (a composite); std::invalid_argument
    //          "Invalid IVB sub type" for an unknown sub type; qv_ivb_conversion_error
    //          for sub type 0, a header shorter than 16 bytes or a byte count that
    //          is not a whole number of elements.
    void getBasicObjectPropertyImpl(uint32_t id, QVIVBObjectSubType& subType, unsigned int& count) const;

    // requires: destination has room for every stored element (ask
    //           getBasicObjectPropertyImpl, or use the form with a capacity).
    // ensures:  the stored elements are copied to destination.
    // throws:   qv_ivb_conversion_error for a bad id, a damaged header, a
    //           composite, or a sub type other than T's (no conversion).
    template <typename T>
    void unpackBasicObjectImpl(uint32_t id, T* destination) const {
        unpackBasicBytes(id, QVIVBObjectSubType(qv_ivb_subtype_traits<T>::type), destination, UINT64_MAX);
    }
    // As above, but also throws qv_ivb_conversion_error, copying nothing, when
    // more than capacity elements are stored.
    template <typename T>
    void unpackBasicObjectImpl(uint32_t id, T* destination, unsigned int capacity) const {
        const QVIVBObjectSubType subType(qv_ivb_subtype_traits<T>::type);
        unpackBasicBytes(id, subType, destination, static_cast<uint64_t>(capacity) * storageSize(subType));
    }
    // ensures: destination holds the text of a char object.
    // throws:  as getBasicObjectPropertyImpl; qv_ivb_conversion_error for a sub
    //          type other than char.
    void unpackBasicObjectImpl(uint32_t id, std::string& destination) const;

    // requires: T offers fromIvb(const std::vector<uint8_t>&).
    // ensures:  object.fromIvb on the bytes of the nameless entry tagged tag.
    // throws:   as getObjId, and whatever object.fromIvb raises.
    template <typename T>
    void unpackCompositeObject(QVIVBObjectTag tag, T& object) const {
        object.fromIvb(objects_[getObjId(std::string(), tag)]);
    }

    // ensures: nothing is indexed.
    void release();

    // The indexed entries, each a whole object with its header, in stream order.
    const std::vector<std::vector<uint8_t>>& objects() const { return objects_; }

private:
    void unpackBasicBytes(uint32_t id, QVIVBObjectSubType subType, void* destination, uint64_t capacityBytes) const;

    std::vector<std::vector<uint8_t>> objects_;
    std::map<std::string, uint32_t> nameIds_;
    std::map<QVIVBObjectTag, uint32_t> tagIds_;
};

#endif
