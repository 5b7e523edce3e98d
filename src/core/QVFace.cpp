#include "core/QVFace.h"

#include <new>

#include "core/ApiError.h"
#include "core/FaceRecord.h"

namespace {
const char* const kNotInitialized = "QVFace not initialized properly";
}

QVFace::QVFace() : record_(new (std::nothrow) FaceRecord()) {}

QVFace::QVFace(const QVFace& other) : record_(nullptr) {
    if (other.record_ == nullptr) throw ApiError(kNotInitialized);
    record_ = new (std::nothrow) FaceRecord(*other.record_);
}

QVFace& QVFace::operator=(const QVFace& other) {
    if (record_ == nullptr || other.record_ == nullptr) throw ApiError(kNotInitialized);
    if (this != &other) *record_ = *other.record_;
    return *this;
}

QVFace::~QVFace() {
    delete record_;
    record_ = nullptr;
}

FaceRecord& QVFace::checked() const {
    if (record_ == nullptr) throw ApiError(kNotInitialized);
    return *record_;
}

std::string QVFace::dataSet() const { return checked().dataSet(); }
std::string QVFace::filePath() const { return checked().filePath(); }
int32_t QVFace::faceWidth() const { return checked().faceWidth(); }
int32_t QVFace::faceHeight() const { return checked().faceHeight(); }

QVFaceRect QVFace::faceRect() const {
    const Rect2<int32_t>& r = checked().faceRect();
    return QVFaceRect{r.left, r.top, r.right, r.bottom};
}

float QVFace::faceScore() const { return checked().faceScore(); }

QVFacePoint QVFace::landmark(const std::string& name) const {
    Point2<float> p = checked().landmark(name);
    return QVFacePoint{p.x, p.y};
}

void QVFace::setLandmark(const std::string& name, const QVFacePoint& point) {
    checked().setLandmark(name, Point2<float>(point.x, point.y));
}

std::string QVFace::attribute(const std::string& name) const { return checked().attribute(name); }
void QVFace::setAttribute(const std::string& name, const std::string& value) {
    checked().setAttribute(name, value);
}
bool QVFace::isGoodFace() const { return checked().isGoodFace(); }
void QVFace::setGoodFace(bool good) { checked().setGoodFace(good); }
std::string QVFace::personName() const { return checked().personName(); }
void QVFace::setPersonName(const std::string& name) { checked().setPersonName(name); }
std::string QVFace::toJson() const { return checked().toJson(); }
void QVFace::fromJson(const std::string& text) { checked().fromJson(text); }
