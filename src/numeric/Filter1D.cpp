#include "core/CreateFromText.h"
#include "numeric/FilterCreate.h"
#include "quorin/Filter1D.h"

#include <cmath>
#include <exception>
#include <map>
#include <new>

#include "core/Json.h"

namespace {

inline std::ptrdiff_t clampIndex(long long i, int n) {
    if (i < 0) return 0;
    if (i > n - 1) return n - 1;
    return static_cast<std::ptrdiff_t>(i);
}

// Far more than any image side; beyond it the kernel could not be held anyway,
// and the float-to-int conversion of the radius would be undefined.
constexpr float kLargestRadius = 1 << 24;

}  // namespace

// ---------------------------------------------------------------------------
Filter1D::~Filter1D() {}

void Filter1D::filterImpl(const float* data, int n, int stride, int outStride, float* out) {
    kernel_.filter(data, n, stride, outStride, out);
}

void Filter1D::filterAtImpl(const float* data, int n, int stride, int index, float* out) {
    kernel_.filterAt(data, n, stride, index, out);
}

// ---------------------------------------------------------------------------
GaussianFilter1D::GaussianFilter1D() : sigma_(0.0f), radius_(0) {}

GaussianFilter1D::GaussianFilter1D(float sigma) : sigma_(0.0f), radius_(0) { init(sigma); }

void GaussianFilter1D::init(float sigma) {
    release();
    const float reach = std::floor(sigma * 3.0f);
    // A negative radius would ask for a kernel of about 2^32 coefficients; it
    // fails here as that allocation would, without touching memory.
    if (!(reach >= 0.0f && reach <= kLargestRadius)) throw std::bad_alloc();
    const int radius = static_cast<int>(reach);
    kernel_.init(radius, static_cast<unsigned int>(2 * radius + 1));
    const unsigned int centre = static_cast<unsigned int>(radius);
    kernel_[centre] = 1.0f;
    float sum = 1.0f;
    for (int j = 1; j <= radius; ++j) {
        const float fj = static_cast<float>(j);
        const float v = std::exp(fj * (fj * -0.5f) / (sigma * sigma));
        kernel_[centre - j] = v;
        sum += 2.0f * v;
    }
    kernel_[centre] /= sum;
    for (int j = 1; j <= radius; ++j) {
        kernel_[centre - j] /= sum;
        kernel_[centre + j] = kernel_[centre - j];
    }
    sigma_ = sigma;
    radius_ = radius;
}

void GaussianFilter1D::release() {
    sigma_ = 0.0f;
    radius_ = 0;
    kernel_.release();
}

void GaussianFilter1D::filterAtImpl(const float* data, int n, int stride, int index, float* out) {
    if (kernel_.size() == 0 || n <= 0) {
        *out = 0.0f;
        return;
    }
    const unsigned int centre = static_cast<unsigned int>(radius_);
    *out = kernel_[centre] * data[clampIndex(index, n) * stride];
    for (int j = 1; j <= radius_; ++j)
        *out += (data[clampIndex(static_cast<long long>(index) - j, n) * stride] +
                 data[clampIndex(static_cast<long long>(index) + j, n) * stride]) *
                kernel_[centre - j];
}

GaussianFilter1D* GaussianFilter1D::create(const std::string& text) { return createFromText<GaussianFilter1D>(text); }

Filter1D* GaussianFilter1D::clone() const { return filter_create::cloneOf<Filter1D>(*this); }

std::string GaussianFilter1D::toJson() const { return "{" + jsonNamedValue("sigma", sigma_) + "}"; }

void GaussianFilter1D::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    float sigma = sigma_;
    jsonObjectItemToNamedValue(items, "sigma", sigma);
    init(sigma);
}

std::string GaussianFilter1D::name() const { return "QV_FILTER1D_GAUSSIAN"; }

// ---------------------------------------------------------------------------
DoGFilter1D::DoGFilter1D() : sigmaL_(0.0f), sigmaH_(0.0f), bufferLength_(0) {}

DoGFilter1D::DoGFilter1D(float sigmaL, float sigmaH) : DoGFilter1D() { init(sigmaL, sigmaH); }

DoGFilter1D::DoGFilter1D(const DoGFilter1D& other) : DoGFilter1D() { init(other.sigmaL_, other.sigmaH_); }

DoGFilter1D& DoGFilter1D::operator=(const DoGFilter1D& other) {
    if (this != &other) init(other.sigmaL_, other.sigmaH_);
    return *this;
}

void DoGFilter1D::init(float sigmaL, float sigmaH) {
    lowerFilter_.init(sigmaL);
    higherFilter_.init(sigmaH);
    sigmaL_ = sigmaL;
    sigmaH_ = sigmaH;
    kernel_ = higherFilter_.kernel() - lowerFilter_.kernel();
}

void DoGFilter1D::release() {
    lowerFilter_.release();
    higherFilter_.release();
    kernel_.release();
    sigmaL_ = 0.0f;
    sigmaH_ = 0.0f;
}

void DoGFilter1D::allocateBuffer(int length) {
    if (length <= 0 || bufferLength_ == static_cast<unsigned int>(length)) return;
    deallocateBuffer();
    lowerBuffer_.resize(static_cast<std::size_t>(length));
    higherBuffer_.resize(static_cast<std::size_t>(length));
    bufferLength_ = static_cast<unsigned int>(length);
}

void DoGFilter1D::deallocateBuffer() {
    lowerBuffer_.clear();
    higherBuffer_.clear();
    bufferLength_ = 0;
}

void DoGFilter1D::filterImpl(const float* data, int n, int stride, int outStride, float* out) {
    if (n <= 0) return;
    allocateBuffer(n);
    lowerFilter_.filter(data, n, stride, 1, lowerBuffer_.data());
    higherFilter_.filter(data, n, stride, 1, higherBuffer_.data());
    for (int i = 0; i < n; ++i)
        out[static_cast<std::ptrdiff_t>(i) * outStride] = higherBuffer_[static_cast<std::size_t>(i)] -
                                                         lowerBuffer_[static_cast<std::size_t>(i)];
}

void DoGFilter1D::filterAtImpl(const float* data, int n, int stride, int index, float* out) {
    float lower = 0.0f, higher = 0.0f;
    lowerFilter_.filterAt(data, n, stride, index, &lower);
    higherFilter_.filterAt(data, n, stride, index, &higher);
    *out = higher - lower;
}

DoGFilter1D* DoGFilter1D::create(const std::string& text) { return createFromText<DoGFilter1D>(text); }

Filter1D* DoGFilter1D::clone() const { return filter_create::cloneOf<Filter1D>(*this); }

std::string DoGFilter1D::toJson() const {
    return "{" + jsonNamedValue("sigmaL", sigmaL_) + ", " + jsonNamedValue("sigmaH", sigmaH_) + "}";
}

void DoGFilter1D::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    float sigmaL = sigmaL_, sigmaH = sigmaH_;
    jsonObjectItemToNamedValue(items, "sigmaL", sigmaL);
    jsonObjectItemToNamedValue(items, "sigmaH", sigmaH);
    init(sigmaL, sigmaH);
}

std::string DoGFilter1D::name() const { return "QV_FILTER1D_DOG"; }
