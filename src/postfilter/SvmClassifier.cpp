#include "postfilter/SvmClassifier.h"

#include <utility>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/ModelInput.h"

namespace pm = postfilter_model;

namespace {

// The sum of the per-class support vector counts, none of them negative.
long long countedSupportVectors(const std::vector<int32_t>& counts)
{
    long long sum = 0;
    for (int32_t n : counts) {
        if (n < 0)
            throw qv_data_error("SVM model support vector count out of range");
        sum += n;
    }
    return sum;
}

}  // namespace

SvmClassifier::SvmClassifier(ModelReader& reader)
{
    init(reader);
}

void SvmClassifier::init(ModelReader& reader)
{
    SvmModel m;
    m.svmType = pm::readInt32(reader);
    m.kernelType = pm::readInt32(reader);
    m.degree = pm::readInt32(reader);
    m.gamma = pm::readFloat(reader);
    m.coef0 = pm::readFloat(reader);
    m.classCount = pm::readInt32(reader);
    if (m.classCount < 1)
        throw qv_data_error("SVM model has no class");
    const long long k = m.classCount;
    const long long pairs = k * (k - 1) / 2;
    m.rho = pm::readFloats(reader, pairs);
    m.decisionThresholds = pm::readFloats(reader, pairs);
    m.labels = pm::readInt32s(reader, k);
    m.svCounts = pm::readInt32s(reader, k);
    m.svTotal = pm::readInt32(reader);
    m.featureLength = pm::readInt32(reader);
    // Both factors are bounded on their own too: with either of them 0 the
    // product says nothing, yet each row is an object to allocate and the
    // first row is made at full length.
    if (m.svTotal < 0 || m.featureLength < 0 || m.svTotal > MAX_SUPPORT_VECTORS
        || m.featureLength > MAX_SUPPORT_VALUES
        || static_cast<long long>(m.svTotal) * m.featureLength > MAX_SUPPORT_VALUES)
        throw qv_data_error("SVM model support vector table out of range");
    if (countedSupportVectors(m.svCounts) != m.svTotal)
        throw qv_data_error("SVM model support vector counts do not add up");
    const int32_t nonZeroCount = pm::readInt32(reader);
    // The entries and the coefficient rows that follow must both be there
    // before the dense table is made.
    if (nonZeroCount < 0)
        throw qv_data_error("SVM model support vector entry count out of range");
    pm::requireBytes(reader, 2LL * nonZeroCount + (k - 1) * m.svTotal, 4);
    m.supportVectors.assign(m.svTotal, std::vector<float>(m.featureLength, 0.0f));
    for (int32_t e = 0; e < nonZeroCount; ++e) {
        std::vector<int16_t> at = pm::readInt16s(reader, 2);
        const float value = pm::readFloat(reader);
        // Row and column count from 1 in the file.
        if (at[0] < 1 || at[0] > m.svTotal || at[1] < 1 || at[1] > m.featureLength)
            throw qv_data_error("SVM model support vector entry out of range");
        m.supportVectors[at[0] - 1][at[1] - 1] = value;
    }
    pm::requireBytes(reader, (k - 1) * m.svTotal, 4);
    m.coefficients.reserve(static_cast<std::size_t>(k - 1));
    for (long long row = 0; row + 1 < k; ++row)
        m.coefficients.push_back(pm::readFloats(reader, m.svTotal));
    setModel(std::move(m));
}

void SvmClassifier::check(const SvmModel& m)
{
    const long long k = m.classCount;
    const std::size_t pairs = static_cast<std::size_t>(k * (k - 1) / 2);
    if (k < 1 || m.rho.size() != pairs || m.decisionThresholds.size() != pairs
        || m.labels.size() != static_cast<std::size_t>(k) || m.svCounts.size() != static_cast<std::size_t>(k))
        throw qv_data_error("SVM model class tables do not match its class count");
    if (countedSupportVectors(m.svCounts) != m.svTotal || m.supportVectors.size() != static_cast<std::size_t>(m.svTotal))
        throw qv_data_error("SVM model support vector counts do not add up");
    for (const auto& sv : m.supportVectors)
        if (sv.size() != static_cast<std::size_t>(m.featureLength))
            throw qv_data_error("SVM model support vector of the wrong length");
    if (m.coefficients.size() != static_cast<std::size_t>(k - 1))
        throw qv_data_error("SVM model coefficient rows do not match its class count");
    for (const auto& row : m.coefficients)
        if (row.size() != static_cast<std::size_t>(m.svTotal))
            throw qv_data_error("SVM model coefficient row of the wrong length");
}

void SvmClassifier::setModel(SvmModel m)
{
    check(m);
    model = std::move(m);
}

float SvmClassifier::dot(const float* a, const float* b, int length)
{
    float sum = 0.0f;
    for (int i = 0; i < length; ++i)
        sum += a[i] * b[i];
    return sum;
}

float SvmClassifier::powi(float base, int exponent)
{
    float result = 1.0f;
    if (exponent < 1)
        return result;
    for (unsigned bits = static_cast<unsigned>(exponent); bits != 0; bits >>= 1) {
        if (bits & 1u)
            result *= base;
        base *= base;
    }
    return result;
}

float SvmClassifier::kernelFunction(const float* feature, const std::vector<float>& supportVector,
                                    const SvmModel& m)
{
    if (m.kernelType != 1)
        return 0.0f;
    const float product = dot(feature, supportVector.data(), static_cast<int>(supportVector.size()));
    return powi(m.gamma * product + m.coef0, m.degree);
}

int32_t SvmClassifier::classify(const float* feature, int length) const
{
    if (model.labels.empty())
        throw qv_unsupported_error("SVM classifier has no model loaded");
    if (length != model.featureLength)
        throw qv_data_error("Incorrect PostFilter's feature length");
    if (length > 0 && feature == nullptr)
        throw qv_invalid_argument("PostFilter feature is null");

    const int k = model.classCount;
    std::vector<float> kv(model.supportVectors.size());
    for (std::size_t i = 0; i < kv.size(); ++i)
        kv[i] = kernelFunction(feature, model.supportVectors[i], model);

    std::vector<int> start(k, 0);
    for (int i = 1; i < k; ++i)
        start[i] = start[i - 1] + model.svCounts[i - 1];

    std::vector<int> votes(k, 0);
    int p = 0;
    for (int i = 0; i < k; ++i) {
        for (int j = i + 1; j < k; ++j, ++p) {
            float sum = 0.0f;
            const std::vector<float>& ci = model.coefficients[j - 1];
            const std::vector<float>& cj = model.coefficients[i];
            for (int t = 0; t < model.svCounts[i]; ++t)
                sum += ci[start[i] + t] * kv[start[i] + t];
            for (int t = 0; t < model.svCounts[j]; ++t)
                sum += cj[start[j] + t] * kv[start[j] + t];
            sum -= model.rho[p];
            if (sum > model.decisionThresholds[p])
                ++votes[i];
            else
                ++votes[j];
        }
    }
    int winner = 0;
    for (int i = 1; i < k; ++i)
        if (votes[i] > votes[winner])
            winner = i;
    return model.labels[winner];
}
