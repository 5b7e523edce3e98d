#include "quorin/FilterKernel1D.h"

#include <algorithm>
#include <cstddef>

namespace {

inline std::ptrdiff_t clampIndex(long long i, int n) {
    if (i < 0) return 0;
    if (i > n - 1) return n - 1;
    return static_cast<std::ptrdiff_t>(i);
}

enum class Combine { Add, Subtract };

QVFilterKernel1D combine(const QVFilterKernel1D& a, const QVFilterKernel1D& b, Combine how) {
    const long long tailA = static_cast<long long>(a.size()) - a.getAnchor() - 1;
    const long long tailB = static_cast<long long>(b.size()) - b.getAnchor() - 1;
    const int anchor = std::max(a.getAnchor(), b.getAnchor());
    // Never negative: the kernel with the longer tail starts at or after 0.
    const long long length = anchor + std::max(tailA, tailB) + 1;
    QVFilterKernel1D result(anchor, static_cast<unsigned int>(length));
    for (unsigned int j = 0; j < b.size(); ++j) result[static_cast<unsigned int>(anchor - b.getAnchor() + j)] = b[j];
    for (unsigned int i = 0; i < a.size(); ++i) {
        float& r = result[static_cast<unsigned int>(anchor - a.getAnchor() + i)];
        r = how == Combine::Add ? r + a[i] : a[i] - r;
    }
    return result;
}

}  // namespace

QVFilterKernel1D::QVFilterKernel1D() : anchor_(0) {}

QVFilterKernel1D::QVFilterKernel1D(int anchor, unsigned int size) : anchor_(anchor), coefficients_(size, 0.0f) {}

void QVFilterKernel1D::init(int anchor, unsigned int size) {
    coefficients_.resize(size, 0.0f);
    anchor_ = anchor;
}

void QVFilterKernel1D::release() {
    anchor_ = 0;
    coefficients_.clear();
}

void QVFilterKernel1D::filterAt(const float* data, int n, int stride, int index, float* out) const {
    *out = 0.0f;
    if (n <= 0) return;
    const long long base = static_cast<long long>(anchor_) + index;
    for (std::size_t j = 0; j < coefficients_.size(); ++j)
        *out += coefficients_[j] * data[clampIndex(base - static_cast<long long>(j), n) * stride];
}

void QVFilterKernel1D::filter(const float* data, int n, int stride, int outStride, float* out) const {
    for (int i = 0; i < n; ++i) filterAt(data, n, stride, i, out + static_cast<std::ptrdiff_t>(i) * outStride);
}

QVFilterKernel1D QVFilterKernel1D::operator*(float factor) const {
    QVFilterKernel1D result(*this);
    for (float& c : result.coefficients_) c *= factor;
    return result;
}

QVFilterKernel1D operator+(const QVFilterKernel1D& a, const QVFilterKernel1D& b) { return combine(a, b, Combine::Add); }

QVFilterKernel1D operator-(const QVFilterKernel1D& a, const QVFilterKernel1D& b) {
    return combine(a, b, Combine::Subtract);
}
