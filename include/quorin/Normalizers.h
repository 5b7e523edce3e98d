#ifndef QUORIN_NORMALIZERS_H
#define QUORIN_NORMALIZERS_H

// Normalizers of float vectors (feature histograms) by four schemes. Each has
// a factory key, a JSON form and a static create(text). All sums run in float,
// in element order, with one accumulator. input and output may be the same
// array. Normalizers keep no working state: one object may normalize from
// several threads into different outputs.

#include <cmath>
#include <cstdint>
#include <iterator>
#include <string>

#include "quorin/export.h"

namespace qv_detail {
// Raises qv_domain_error "Negative value is not allowed in qvL1SqrtNormalize".
[[noreturn]] QUORIN_EXPORT void raiseNegativeL1SqrtInput();
}  // namespace qv_detail

class QUORIN_EXPORT QVNormalizer {
public:
    // 2^-23 (bits 0x34000000): keeps every divisor above 0, so a zero vector
    // normalizes to zeros.
    static constexpr float epsilon = 1.1920929e-7f;

    virtual ~QVNormalizer();
    // requires: input holds `length` floats, output has room for them.
    // ensures:  output holds the normalized vector; nothing is written for length 0.
    virtual void normalize(const float* input, unsigned int length, float* output) const = 0;
    // ensures: the factory key of the class.
    virtual std::string name() const = 0;
    virtual std::string toJson() const = 0;
    // throws: JsonError on a malformed or unexpected text.
    virtual void fromJson(const std::string& text) = 0;

protected:
    QVNormalizer() = default;
    QVNormalizer(const QVNormalizer&) = default;
    QVNormalizer& operator=(const QVNormalizer&) = default;
};

// ensures: out[i] = sqrt(in[i] / (sum of in + epsilon)); returns the iterator
//          behind the last element written (out itself for an empty range).
// throws:  qv_domain_error "Negative value is not allowed in qvL1SqrtNormalize"
//          at the first value below 0, before anything is written (NaN and -0
//          pass).
template <typename InputIt, typename OutputIt>
OutputIt qvL1SqrtNormalize(InputIt first, InputIt last, OutputIt out) {
    if (first == last) return out;
    float sum = 0.0f;
    for (InputIt it = first; it != last; ++it) {
        const float v = *it;
        if (v < 0.0f) qv_detail::raiseNegativeL1SqrtInput();
        sum += v;
    }
    sum += QVNormalizer::epsilon;
    for (; first != last; ++first, ++out) *out = std::sqrt(static_cast<float>(*first) / sum);
    return out;
}

// ensures: with n elements, x = sqrt(sum of squares) + epsilon + alpha * n;
//          out = in / x, clipped from above at clipThreshold (values below
//          -clipThreshold stay), then divided by sqrt(sum of its squares) +
//          epsilon. Returns the iterator behind the last element written.
// requires: OutputIt can be read back and walked twice (a pointer will do).
template <typename InputIt, typename OutputIt>
OutputIt qvL2HysNormalize(InputIt first, InputIt last, float clipThreshold, float alpha, OutputIt out) {
    float squares = 0.0f;
    std::uint64_t n = 0;
    for (InputIt it = first; it != last; ++it, ++n) {
        const float v = *it;
        squares += v * v;
    }
    const float x = std::sqrt(squares) + QVNormalizer::epsilon + alpha * static_cast<float>(n);
    OutputIt end = out;
    for (; first != last; ++first, ++end) {
        float v = static_cast<float>(*first) / x;
        if (v > clipThreshold) v = clipThreshold;
        *end = v;
    }
    squares = 0.0f;
    for (OutputIt it = out; it != end; ++it) squares += static_cast<float>(*it) * static_cast<float>(*it);
    const float y = std::sqrt(squares) + QVNormalizer::epsilon;
    for (OutputIt it = out; it != end; ++it) *it = static_cast<float>(*it) / y;
    return end;
}

// ensures: trunc(x + 0.5) through a signed 64-bit integer: halves go up for
//          positive values, and qvRound(-1.2f) is 0, qvRound(-1.5f) is -1.
//          Beyond the 64-bit range (where a float has no fraction left),
//          infinities and NaN come back as x + 0.5, never through an
//          undefined conversion.
QUORIN_EXPORT float qvRound(float x);

// out[i] = in[i] / (sum of |in| + epsilon); signs kept. Key "QV_NORMALIZER_L1", JSON "{}".
class QUORIN_EXPORT QVL1Normalizer : public QVNormalizer {
public:
    void normalize(const float* input, unsigned int length, float* output) const override;
    std::string name() const override;
    std::string toJson() const override;
    // throws: JsonError "Json deserialization error" for an object with any key.
    void fromJson(const std::string& text) override;
    // ensures: a new object, or null when the text isn't an empty object.
    static QVL1Normalizer* create(const std::string& text);
};

// out[i] = in[i] / (sqrt(sum of squares) + epsilon). Key "QV_NORMALIZER_L2", JSON "{}".
class QUORIN_EXPORT QVL2Normalizer : public QVNormalizer {
public:
    void normalize(const float* input, unsigned int length, float* output) const override;
    std::string name() const override;
    std::string toJson() const override;
    // throws: JsonError "Json deserialization error" for an object with any key.
    void fromJson(const std::string& text) override;
    static QVL2Normalizer* create(const std::string& text);
};

// qvL1SqrtNormalize. Key "QV_NORMALIZER_L1SQRT", JSON "{}".
class QUORIN_EXPORT QVL1SqrtNormalizer : public QVNormalizer {
public:
    // throws: qv_domain_error for a negative input value; output unchanged then.
    void normalize(const float* input, unsigned int length, float* output) const override;
    std::string name() const override;
    std::string toJson() const override;
    // throws: JsonError "Json deserialization error" for an object with any key.
    void fromJson(const std::string& text) override;
    static QVL1SqrtNormalizer* create(const std::string& text);
};

// qvL2HysNormalize. Key "QV_NORMALIZER_L2HYS", JSON
// {"clipThreshold":value,"alpha":value}. The default clipThreshold 0 zeroes
// every positive value, so only negative ones survive.
class QUORIN_EXPORT QVL2HysNormalizer : public QVNormalizer {
public:
    QVL2HysNormalizer();
    QVL2HysNormalizer(float clipThreshold, float alpha);

    float clipThreshold() const { return clipThreshold_; }
    float alpha() const { return alpha_; }

    void normalize(const float* input, unsigned int length, float* output) const override;
    std::string name() const override;
    std::string toJson() const override;
    // ensures: present keys read; an absent key leaves its field.
    void fromJson(const std::string& text) override;
    static QVL2HysNormalizer* create(const std::string& text);

private:
    float clipThreshold_;
    float alpha_;
};

#endif
