#include "quorin/QVFaceRepresentation.h"

#include <new>

#include "container/FaceRepresentationData.h"
#include "core/ApiError.h"

namespace {
const char* const kNotInitialized = "QVFaceRepresentation not initialized properly";
}

QVFaceRepresentation::QVFaceRepresentation() : data_(new FaceRepresentationData()) {}

QVFaceRepresentation::QVFaceRepresentation(const QVFaceRepresentation& other)
    : data_(new (std::nothrow) FaceRepresentationData()) {
    if (data_ != nullptr && other.data_ != nullptr) *data_ = *other.data_;
}

QVFaceRepresentation& QVFaceRepresentation::operator=(const QVFaceRepresentation& other) {
    if (this == &other) return *this;
    checked() = other.checked();
    return *this;
}

QVFaceRepresentation::~QVFaceRepresentation() { delete data_; }

FaceRepresentationData& QVFaceRepresentation::checked() const {
    if (data_ == nullptr) throw ApiError(kNotInitialized);
    return *data_;
}

std::string QVFaceRepresentation::name() const { return checked().name(); }

std::vector<uint8_t> QVFaceRepresentation::toIvb() const { return checked().toIvb(); }

void QVFaceRepresentation::fromIvb(const std::vector<uint8_t>& bytes) { checked().fromIvb(bytes); }
