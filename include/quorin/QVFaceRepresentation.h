#ifndef QUORIN_QVFACEREPRESENTATION_H
#define QUORIN_QVFACEREPRESENTATION_H

#include <cstdint>
#include <string>
#include <vector>

#include "quorin/export.h"

class FaceRepresentationData;

// The public handle of a face representation: a named block of typed feature
// data, stored and exchanged as IVB bytes (a DataBlob's composite object).
// Copies are deep. Every operation first checks the handle's value: one whose
// allocation failed raises ApiError "QVFaceRepresentation not initialized properly".
class QUORIN_EXPORT QVFaceRepresentation {
public:
    // ensures: an empty, unnamed representation.
    // throws:  std::bad_alloc.
    QVFaceRepresentation();
    // ensures: a deep copy. The allocation does not throw: on an exhausted heap
    //          the copy is left without a value and its operations raise ApiError.
    QVFaceRepresentation(const QVFaceRepresentation& other);
    // ensures: a deep copy; assignment to itself does nothing.
    // throws:  ApiError when either side has no value.
    QVFaceRepresentation& operator=(const QVFaceRepresentation& other);
    ~QVFaceRepresentation();

    // ensures: the representation's name.
    std::string name() const;
    // ensures: the IVB bytes of the representation.
    // throws:  ApiError "QVFaceRepresentation could not be written as IVB".
    std::vector<uint8_t> toIvb() const;
    // ensures: the representation read from bytes.
    // throws:  ApiError "QVFaceRepresentation could not be read from IVB" for
    //          bytes that are not a well-formed representation; the handle may
    //          then hold a partly read value.
    void fromIvb(const std::vector<uint8_t>& bytes);

private:
    FaceRepresentationData& checked() const;

    FaceRepresentationData* data_;
};

#endif
