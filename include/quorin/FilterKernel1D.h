#ifndef QUORIN_FILTERKERNEL1D_H
#define QUORIN_FILTERKERNEL1D_H

// A 1-D convolution kernel over float signals. Signals are addressed with a
// stride counted in floats; positions outside 0..n-1 read the nearest end
// sample (the border is replicated). A plain value, copied freely.

#include <vector>

#include "quorin/export.h"

class QUORIN_EXPORT QVFilterKernel1D {
public:
    // ensures: anchor 0, no coefficients.
    QVFilterKernel1D();
    // ensures: `size` zero coefficients, the given anchor.
    QVFilterKernel1D(int anchor, unsigned int size);

    // ensures: size() == size (kept values stay, new ones are 0), getAnchor() == anchor.
    // throws:  std::bad_alloc / std::length_error when the size can't be held.
    void init(int anchor, unsigned int size);
    // ensures: anchor 0, no coefficients.
    void release();

    int getAnchor() const { return anchor_; }
    unsigned int size() const { return static_cast<unsigned int>(coefficients_.size()); }
    // requires: i < size().
    float& operator[](unsigned int i) { return coefficients_[i]; }
    const float& operator[](unsigned int i) const { return coefficients_[i]; }

    // requires: data holds n samples `stride` floats apart; out is writable.
    // ensures:  *out = sum over j of coefficient[j] * data[clamp(anchor + index - j)]
    //           (a true convolution, summed in float in ascending j); 0 for an
    //           empty kernel, and 0 without reading anything when n <= 0.
    void filterAt(const float* data, int n, int stride, int index, float* out) const;
    // ensures: filterAt for every index 0..n-1, written to out[i * outStride];
    //          nothing happens for n <= 0.
    void filter(const float* data, int n, int stride, int outStride, float* out) const;

    // ensures: same anchor, every coefficient multiplied by `factor`.
    QVFilterKernel1D operator*(float factor) const;

private:
    int anchor_;
    std::vector<float> coefficients_;
};

// Both align the kernels on their anchors. The result's anchor is the larger
// anchor and it reaches as far as the longer tail. operator+ adds; operator-
// gives a - b where a has a coefficient and keeps +b where only b has one, so
// it is a true difference only when a covers b on both sides.
QUORIN_EXPORT QVFilterKernel1D operator+(const QVFilterKernel1D& a, const QVFilterKernel1D& b);
QUORIN_EXPORT QVFilterKernel1D operator-(const QVFilterKernel1D& a, const QVFilterKernel1D& b);

#endif
