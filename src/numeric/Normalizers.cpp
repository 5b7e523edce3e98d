#include "quorin/Normalizers.h"

#include <exception>
#include <map>

#include "core/Errors.h"
#include "core/Json.h"
#include "core/CreateFromText.h"

namespace {

// The three schemes without parameters take only the empty object.
void readNoParameters(const std::string& text) {
    if (!parseJsonObject(text).empty()) throw JsonError(kJsonDeserializationError);
}

}  // namespace

namespace qv_detail {
void raiseNegativeL1SqrtInput() { throw qv_domain_error("Negative value is not allowed in qvL1SqrtNormalize"); }
}  // namespace qv_detail

constexpr float QVNormalizer::epsilon;

QVNormalizer::~QVNormalizer() {}

float qvRound(float x) {
    const float shifted = x + 0.5f;
    // Beyond 2^62 a float has no fraction to cut, and the conversion would be
    // undefined past 2^63; NaN fails the test too.
    if (!(std::fabs(shifted) < 4.6e18f)) return shifted;
    return static_cast<float>(static_cast<std::int64_t>(shifted));
}

// ---------------------------------------------------------------------------
void QVL1Normalizer::normalize(const float* input, unsigned int length, float* output) const {
    float sum = 0.0f;
    for (unsigned int i = 0; i < length; ++i) sum += std::fabs(input[i]);
    sum += epsilon;
    for (unsigned int i = 0; i < length; ++i) output[i] = input[i] / sum;
}
std::string QVL1Normalizer::name() const { return "QV_NORMALIZER_L1"; }
std::string QVL1Normalizer::toJson() const { return "{}"; }
void QVL1Normalizer::fromJson(const std::string& text) { readNoParameters(text); }
QVL1Normalizer* QVL1Normalizer::create(const std::string& text) { return createFromText<QVL1Normalizer>(text); }

// ---------------------------------------------------------------------------
void QVL2Normalizer::normalize(const float* input, unsigned int length, float* output) const {
    float squares = 0.0f;
    for (unsigned int i = 0; i < length; ++i) squares += input[i] * input[i];
    const float norm = std::sqrt(squares) + epsilon;
    for (unsigned int i = 0; i < length; ++i) output[i] = input[i] / norm;
}
std::string QVL2Normalizer::name() const { return "QV_NORMALIZER_L2"; }
std::string QVL2Normalizer::toJson() const { return "{}"; }
void QVL2Normalizer::fromJson(const std::string& text) { readNoParameters(text); }
QVL2Normalizer* QVL2Normalizer::create(const std::string& text) { return createFromText<QVL2Normalizer>(text); }

// ---------------------------------------------------------------------------
void QVL1SqrtNormalizer::normalize(const float* input, unsigned int length, float* output) const {
    qvL1SqrtNormalize(input, input + length, output);
}
std::string QVL1SqrtNormalizer::name() const { return "QV_NORMALIZER_L1SQRT"; }
std::string QVL1SqrtNormalizer::toJson() const { return "{}"; }
void QVL1SqrtNormalizer::fromJson(const std::string& text) { readNoParameters(text); }
QVL1SqrtNormalizer* QVL1SqrtNormalizer::create(const std::string& text) {
    return createFromText<QVL1SqrtNormalizer>(text);
}

// ---------------------------------------------------------------------------
QVL2HysNormalizer::QVL2HysNormalizer() : clipThreshold_(0.0f), alpha_(0.0f) {}
QVL2HysNormalizer::QVL2HysNormalizer(float clipThreshold, float alpha) : clipThreshold_(clipThreshold), alpha_(alpha) {}

void QVL2HysNormalizer::normalize(const float* input, unsigned int length, float* output) const {
    qvL2HysNormalize(input, input + length, clipThreshold_, alpha_, output);
}
std::string QVL2HysNormalizer::name() const { return "QV_NORMALIZER_L2HYS"; }
std::string QVL2HysNormalizer::toJson() const {
    return "{" + jsonNamedValue("clipThreshold", clipThreshold_) + "," + jsonNamedValue("alpha", alpha_) + "}";
}
void QVL2HysNormalizer::fromJson(const std::string& text) {
    const std::map<std::string, std::string> items = parseJsonObject(text);
    jsonObjectItemToNamedValue(items, "clipThreshold", clipThreshold_);
    jsonObjectItemToNamedValue(items, "alpha", alpha_);
}
QVL2HysNormalizer* QVL2HysNormalizer::create(const std::string& text) { return createFromText<QVL2HysNormalizer>(text); }
