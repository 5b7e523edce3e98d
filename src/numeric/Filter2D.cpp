#include "core/CreateFromText.h"
#include "numeric/FilterCreate.h"
#include "quorin/Filter2D.h"

#include <cstddef>
#include <exception>
#include <map>
#include <new>

#include "core/Descramble.h"
#include "core/Errors.h"
#include "core/Json.h"
#include "numeric/NumericTexts.h"

namespace {

std::unique_ptr<Filter1D> cloneFilter(const std::unique_ptr<Filter1D>& filter) {
    return std::unique_ptr<Filter1D>(filter ? filter->clone() : nullptr);
}

inline std::size_t area(int width, int height) {
    return static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
}

float sigmaOf(const Filter1D* filter) {
    const GaussianFilter1D* gaussian = dynamic_cast<const GaussianFilter1D*>(filter);
    if (gaussian == nullptr) throw qv_unsupported_error(descrambleText(scrambled::kGaussianFilter2DNotSerializable));
    return gaussian->sigma();
}

}  // namespace

Filter2D::~Filter2D() {}

// ---------------------------------------------------------------------------
SeparableFilter2D::SeparableFilter2D() : bufferWidth_(0), bufferHeight_(0) {}

SeparableFilter2D::SeparableFilter2D(const SeparableFilter2D& other)
    : Filter2D(other),
      horizontalFilter_(cloneFilter(other.horizontalFilter_)),
      verticalFilter_(cloneFilter(other.verticalFilter_)),
      bufferWidth_(0),
      bufferHeight_(0) {}

SeparableFilter2D& SeparableFilter2D::operator=(const SeparableFilter2D& other) {
    if (this == &other) return *this;
    release();
    horizontalFilter_ = cloneFilter(other.horizontalFilter_);
    verticalFilter_ = cloneFilter(other.horizontalFilter_);
    return *this;
}

SeparableFilter2D::~SeparableFilter2D() {}

void SeparableFilter2D::release() {
    horizontalFilter_.reset();
    verticalFilter_.reset();
}

void SeparableFilter2D::allocateBuffer(int width, int height) {
    if ((width == bufferWidth_ && height == bufferHeight_) || width <= 0 || height <= 0) return;
    deallocateBuffer();
    buffer_.resize(area(width, height));
    bufferWidth_ = width;
    bufferHeight_ = height;
}

void SeparableFilter2D::deallocateBuffer() {
    buffer_.clear();
    bufferWidth_ = 0;
    bufferHeight_ = 0;
}

void SeparableFilter2D::filter(const float* src, int width, int height, int srcStride, int dstStride, float* dst) {
    if (!horizontalFilter_ || !verticalFilter_)
        throw qv_unsupported_error(descrambleText(scrambled::kSeparableFilterWithoutFilters));
    if (width <= 0 || height <= 0) return;
    allocateBuffer(width, height);
    float* buffer = buffer_.data();
    for (int y = 0; y < height; ++y)
        horizontalFilter_->filter(src + static_cast<std::ptrdiff_t>(y) * srcStride, width, 1, 1,
                                  buffer + static_cast<std::ptrdiff_t>(y) * width);
    for (int x = 0; x < width; ++x) verticalFilter_->filter(buffer + x, height, width, dstStride, dst + x);
}

// ---------------------------------------------------------------------------
GaussianFilter2D::GaussianFilter2D() {}

GaussianFilter2D::GaussianFilter2D(float sigma) { init(sigma, sigma); }

GaussianFilter2D::GaussianFilter2D(float sigmaHorizontal, float sigmaVertical) { init(sigmaHorizontal, sigmaVertical); }

void GaussianFilter2D::init(float sigmaHorizontal, float sigmaVertical) {
    release();
    horizontalFilter_.reset(new GaussianFilter1D(sigmaHorizontal));
    verticalFilter_.reset(new GaussianFilter1D(sigmaVertical));
}

GaussianFilter2D* GaussianFilter2D::create(const std::string& text) { return createFromText<GaussianFilter2D>(text); }

Filter2D* GaussianFilter2D::clone() const { return filter_create::cloneOf<Filter2D>(*this); }

std::string GaussianFilter2D::toJson() const {
    if (!horizontalFilter_ || !verticalFilter_)
        throw qv_unsupported_error(descrambleText(scrambled::kGaussianFilter2DNotSerializable));
    return "{" + jsonNamedValue("sigmaHorizontal", sigmaOf(horizontalFilter_.get())) + "," +
           jsonNamedValue("sigmaVertical", sigmaOf(verticalFilter_.get())) + "}";
}

void GaussianFilter2D::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    float sigmaHorizontal = 0.0f, sigmaVertical = 0.0f;
    const bool hasHorizontal = jsonObjectItemToNamedValue(items, "sigmaHorizontal", sigmaHorizontal);
    const bool hasVertical = jsonObjectItemToNamedValue(items, "sigmaVertical", sigmaVertical);
    if (hasHorizontal && hasVertical) init(sigmaHorizontal, sigmaVertical);
}

std::string GaussianFilter2D::name() const { return "QV_FILTER2D_GAUSSIAN"; }

// ---------------------------------------------------------------------------
DoGFilter2D::DoGFilter2D() : bufferWidth_(0), bufferHeight_(0) {}

DoGFilter2D::DoGFilter2D(float sigmaLower, float sigmaHigher) : DoGFilter2D() { init(sigmaLower, sigmaHigher); }

DoGFilter2D::DoGFilter2D(const DoGFilter2D& other)
    : Filter2D(other),
      lowerFilter_(other.lowerFilter_),
      higherFilter_(other.higherFilter_),
      bufferWidth_(0),
      bufferHeight_(0) {}

void DoGFilter2D::init(float sigmaLower, float sigmaHigher) {
    lowerFilter_.init(sigmaLower, sigmaLower);
    higherFilter_.init(sigmaHigher, sigmaHigher);
}

void DoGFilter2D::release() {
    lowerFilter_.release();
    higherFilter_.release();
    deallocateBuffer();
}

void DoGFilter2D::allocateBuffer(int width, int height) {
    if ((width == bufferWidth_ && height == bufferHeight_) || width <= 0 || height <= 0) return;
    deallocateBuffer();
    lowerBuffer_.resize(area(width, height));
    higherBuffer_.resize(area(width, height));
    bufferWidth_ = width;
    bufferHeight_ = height;
}

void DoGFilter2D::deallocateBuffer() {
    lowerBuffer_.clear();
    higherBuffer_.clear();
    bufferWidth_ = 0;
    bufferHeight_ = 0;
}

void DoGFilter2D::filter(const float* src, int width, int height, int srcStride, int dstStride, float* dst) {
    // Empty sizes leave the buffers alone; the Gaussians then write nothing.
    allocateBuffer(width, height);
    lowerFilter_.filter(src, width, height, srcStride, width, lowerBuffer_.data());
    higherFilter_.filter(src, width, height, srcStride, width, higherBuffer_.data());
    for (int y = 0; y < height; ++y) {
        const std::size_t row = static_cast<std::size_t>(y) * static_cast<std::size_t>(width);
        float* out = dst + static_cast<std::ptrdiff_t>(y) * dstStride;
        for (int x = 0; x < width; ++x) out[x] = higherBuffer_[row + x] - lowerBuffer_[row + x];
    }
}

DoGFilter2D* DoGFilter2D::create(const std::string& text) { return createFromText<DoGFilter2D>(text); }

Filter2D* DoGFilter2D::clone() const { return filter_create::cloneOf<Filter2D>(*this); }

std::string DoGFilter2D::toJson() const {
    return "{" + jsonNamedValue("lowerFilter", lowerFilter_) + ", " + jsonNamedValue("higherFilter", higherFilter_) +
           "}";
}

void DoGFilter2D::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    jsonObjectItemToNamedValue(items, "lowerFilter", lowerFilter_);
    jsonObjectItemToNamedValue(items, "higherFilter", higherFilter_);
}

std::string DoGFilter2D::name() const { return "QV_FILTER2D_DOG"; }
