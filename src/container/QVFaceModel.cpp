#include "quorin/QVFaceModel.h"

#include "container/FaceModelData.h"
#include "core/ApiError.h"
#include "quorin/LDAModel.h"

namespace {
const char* const kNotInitialized = "QVFaceModel not initialized properly";
}

QVFaceModel::QVFaceModel() : data_(new FaceModelData()) {}

QVFaceModel::QVFaceModel(const LDAModel& model) : data_(new FaceModelData(model)) {}

QVFaceModel::QVFaceModel(const QVFaceModel& other) : data_(new FaceModelData()) {
    if (other.data_ != nullptr) *data_ = *other.data_;
}

QVFaceModel& QVFaceModel::operator=(const QVFaceModel& other) {
    if (this == &other) return *this;
    checked() = other.checked();
    return *this;
}

QVFaceModel::~QVFaceModel() { delete data_; }

FaceModelData& QVFaceModel::checked() const {
    if (data_ == nullptr) throw ApiError(kNotInitialized);
    return *data_;
}

std::vector<uint8_t> QVFaceModel::toIvb() const { return checked().toIvb(); }

void QVFaceModel::fromIvb(const std::vector<uint8_t>& bytes) { checked().fromIvb(bytes); }
