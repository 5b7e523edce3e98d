#ifndef QUORIN_DATABLOB_H
#define QUORIN_DATABLOB_H

#include <cstdint>
#include <string>
#include <vector>

#include "quorin/QVIVBObject.h"
#include "quorin/export.h"

// The shape of a block of typed data: element type, a grid of xNum by yNum
// points with fLen elements at each, and for the unsigned types a value range.
class QUORIN_EXPORT DataProperty {
public:
    // Fixed to 32 bits: any stored value is a valid DataType, known or not.
    enum DataType : int32_t {
        NONE = -1,
        BYTES = 0,    // sub type 4, unsigned char
        UINT32 = 1,   // sub type 8, unsigned int
        FLOAT32 = 2,  // sub type 12, float
        UINT64 = 3,   // sub type 10, unsigned long long
        FLOAT64 = 4   // sub type 13, double
    };

    // ensures: dataType NONE, everything else 0.
    DataProperty();
    // ensures: setup(type, xNum, yNum, fLen) on a default property.
    DataProperty(DataType type, uint32_t xNum, uint32_t yNum, uint32_t fLen);
    // ensures: as above with the data type of subType (4, 8, 12, 10, 13), NONE
    //          for any other sub type.
    DataProperty(QVIVBObjectSubType subType, uint32_t xNum, uint32_t yNum, uint32_t fLen);

    // ensures: the four are stored; for UINT32 and UINT64 the range becomes
    //          0 .. 0xFFFFFFFFFFFFFFFF, for the others it stays as it was.
    void setup(DataType type, uint32_t xNum, uint32_t yNum, uint32_t fLen);
    // ensures: back to the defaults.
    void clear();

    void setMinValue(unsigned long long value) { minVal_ = value; }
    void setMaxValue(unsigned long long value) { maxVal_ = value; }
    DataType dataType() const { return dataType_; }
    unsigned long long minVal() const { return minVal_; }
    unsigned long long maxVal() const { return maxVal_; }
    uint32_t xNum() const { return xNum_; }
    uint32_t yNum() const { return yNum_; }
    uint32_t fLen() const { return fLen_; }

    // ensures: the sub type of dataType, 0 for NONE or an unknown value.
    QVIVBObjectSubType ivbSubType() const;
    // Sizes in 64 bits: the three 32-bit dimensions can't wrap their product.
    unsigned long long elementNum() const;
    unsigned int elementSize() const;
    unsigned long long byteSize() const;
    unsigned long long gridPointNum() const;
    unsigned long long gridPointByteSize() const;

    // ensures: a composite of dataType (tag 39), xNum (32), yNum (33), fLen (34)
    //          as one unsigned int each and, for UINT32 and UINT64, minVal (35)
    //          and maxVal (36) as one unsigned long long each.
    std::vector<uint8_t> toIvb() const;
    // ensures: the fields read back in that order; for other data types the
    //          range keeps its present values.
    //          A member stored with no element keeps its field as it was.
    // throws:  qv_ivb_conversion_error and the unpacker's errors on damaged bytes,
    //          also for a member that isn't a basic object of its type or holds
    //          more than one element. Fields read before the failure keep
    //          their new values.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    DataType dataType_;
    unsigned long long minVal_;
    unsigned long long maxVal_;
    uint32_t xNum_;
    uint32_t yNum_;
    uint32_t fLen_;
};

// A named block of typed bytes. Copies are deep.
class QUORIN_EXPORT DataBlob {
public:
    DataBlob();
    DataBlob(const DataBlob& other);
    // ensures: a deep copy; assignment to itself does nothing.
    DataBlob& operator=(const DataBlob& other);
    ~DataBlob();

    // ensures: no data, a default property; the name stays.
    void release();
    // ensures: getDataProperty() == property. When the byte size is unchanged the
    //          buffer and its contents are kept; otherwise it is made anew,
    //          uninitialised (null for 0 bytes).
    // throws:  std::bad_alloc for a size the heap can't give.
    void init(const DataProperty& property);

    const DataProperty& getDataProperty() const { return property_; }
    const std::string& name() const { return name_; }
    void setName(const std::string& name) { name_ = name; }
    // ensures: the number of elements, property.elementNum().
    unsigned long long length() const { return property_.elementNum(); }
    // ensures: the byteSize() bytes of the blob, or null when it has none.
    uint8_t* bytePointer() { return data_; }
    const uint8_t* bytePointer() const { return data_; }

    // ensures: a composite of the name (tag 38, char), the property (tag 40,
    //          composite) and the bytes (tag 37, void).
    std::vector<uint8_t> toIvb() const;
    // ensures: name, property and bytes read back; the buffer sized by init.
    // throws:  qv_ivb_conversion_error and the unpacker's errors on damaged bytes,
    //          among them a byte array whose length differs from the property's
    //          byte size (checked before anything is allocated) or that isn't
    //          a basic object of raw bytes. A failure keeps the parts read
    //          before it.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    std::string name_;
    DataProperty property_;
    uint8_t* data_;
};

#endif
