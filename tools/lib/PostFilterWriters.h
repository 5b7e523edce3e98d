#ifndef QUORIN_TOOLS_POSTFILTERWRITERS_H
#define QUORIN_TOOLS_POSTFILTERWRITERS_H

// Writers of the two post filter model payloads, byte for byte as the loaders
// read them (little-endian, plain: pack with packRawModel from ModelPacking.h
// before serving). Tests make their models with these, and so does the
// model-training tool.
//
// ILABS model: per category an int32 tag, quantised vectors `linear` (D values)
// and `quadraticWeights` (R values), quantised matrices `leftRows` and
// `rightRows` (R x D, row after row), float32 bias, int32 trailer. A quantised
// block is int32 tag, int32 count, float32 scale, count int16; value = int16 * scale.
//
// SVM model: header ints/floats, rho and thresholds per class pair, labels and
// support vector counts per class, svTotal, featureLength, the support vectors
// as sparse entries (int16 row, int16 column from 1, float32 value), then the
// coefficients, (k - 1) rows of svTotal float32. The SVM filter's file holds two
// such models, the primary (category 0) first.

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <stdexcept>
#include <vector>

namespace postfilterwriters {

class ByteWriter {
public:
    void int32(int32_t v) { put(static_cast<uint32_t>(v), 4); }
    void int16(int16_t v) { put(static_cast<uint16_t>(v), 2); }
    void float32(float v) {
        uint32_t bits;
        std::memcpy(&bits, &v, 4);
        put(bits, 4);
    }
    void floats(const std::vector<float>& v) { for (float x : v) float32(x); }
    void int32s(const std::vector<int32_t>& v) { for (int32_t x : v) int32(x); }
    std::vector<uint8_t>& bytes() { return bytes_; }
    const std::vector<uint8_t>& bytes() const { return bytes_; }

private:
    void put(uint32_t v, int n) {
        for (int i = 0; i < n; ++i) bytes_.push_back(static_cast<uint8_t>(v >> (8 * i)));
    }
    std::vector<uint8_t> bytes_;
};

// One quantised block as stored.
struct QuantisedBlock {
    int32_t tag = 0;
    float scale = 1.0f;
    std::vector<int16_t> values;
};

// Quantises values with one scale per block. scale 0 picks max|v| / 32767
// (1 for an all-zero block); values are rounded to the nearest step and clamped.
inline QuantisedBlock quantise(const std::vector<float>& values, float scale = 0.0f) {
    QuantisedBlock block;
    if (scale == 0.0f) {
        float top = 0.0f;
        for (float v : values) top = std::max(top, std::fabs(v));
        scale = top > 0.0f ? top / 32767.0f : 1.0f;
    }
    block.scale = scale;
    block.values.reserve(values.size());
    for (float v : values) {
        double q = std::nearbyint(static_cast<double>(v) / scale);
        q = std::min(32767.0, std::max(-32768.0, q));
        block.values.push_back(static_cast<int16_t>(q));
    }
    return block;
}

// The values a loader gets back from a block: int16 widened, times scale, in float32.
inline std::vector<float> dequantise(const QuantisedBlock& block) {
    std::vector<float> out;
    out.reserve(block.values.size());
    for (int16_t v : block.values) out.push_back(static_cast<float>(v) * block.scale);
    return out;
}

// count defaults to the number of values; give another to write a miscounted block.
inline void writeBlock(ByteWriter& w, const QuantisedBlock& block, long long count = -1) {
    w.int32(block.tag);
    w.int32(static_cast<int32_t>(count < 0 ? static_cast<long long>(block.values.size()) : count));
    w.float32(block.scale);
    for (int16_t v : block.values) w.int16(v);
}

struct IlabsCategory {
    std::vector<float> linear;                // D
    std::vector<float> quadraticWeights;      // R
    std::vector<std::vector<float>> leftRows;  // R x D
    std::vector<std::vector<float>> rightRows; // R x D
    float bias = 0.0f;
    // Fixed scale for every block (0: one automatic scale per block).
    float scale = 0.0f;
};

inline std::vector<float> flatten(const std::vector<std::vector<float>>& rows) {
    std::vector<float> flat;
    for (const auto& r : rows) flat.insert(flat.end(), r.begin(), r.end());
    return flat;
}

inline void writeIlabsCategory(ByteWriter& w, const IlabsCategory& c) {
    const std::size_t d = c.linear.size();
    if (c.leftRows.size() != c.quadraticWeights.size() || c.rightRows.size() != c.quadraticWeights.size())
        throw std::invalid_argument("ILABS category: row count differs from the weights");
    for (std::size_t r = 0; r < c.leftRows.size(); ++r)
        if (c.leftRows[r].size() != d || c.rightRows[r].size() != d)
            throw std::invalid_argument("ILABS category: row length differs from the linear term");
    w.int32(0);
    writeBlock(w, quantise(c.linear, c.scale));
    writeBlock(w, quantise(c.quadraticWeights, c.scale));
    writeBlock(w, quantise(flatten(c.leftRows), c.scale));
    writeBlock(w, quantise(flatten(c.rightRows), c.scale));
    w.float32(c.bias);
    w.int32(0);
}

// A model of the given categories, in order (the filter reads 15).
inline std::vector<uint8_t> ilabsModelPayload(const std::vector<IlabsCategory>& categories) {
    ByteWriter w;
    for (const auto& c : categories) writeIlabsCategory(w, c);
    return w.bytes();
}

// The category as the loader will hold it after quantisation.
inline IlabsCategory ilabsAsLoaded(const IlabsCategory& c) {
    IlabsCategory out;
    out.linear = dequantise(quantise(c.linear, c.scale));
    out.quadraticWeights = dequantise(quantise(c.quadraticWeights, c.scale));
    const std::size_t d = c.linear.size();
    std::vector<float> left = dequantise(quantise(flatten(c.leftRows), c.scale));
    std::vector<float> right = dequantise(quantise(flatten(c.rightRows), c.scale));
    for (std::size_t r = 0; r < c.quadraticWeights.size(); ++r) {
        out.leftRows.emplace_back(left.begin() + r * d, left.begin() + (r + 1) * d);
        out.rightRows.emplace_back(right.begin() + r * d, right.begin() + (r + 1) * d);
    }
    out.bias = c.bias;
    return out;
}

struct SvmModelParams {
    int32_t svmType = 0;
    int32_t kernelType = 1;
    int32_t degree = 1;
    float gamma = 1.0f;
    float coef0 = 0.0f;
    int32_t classCount = 2;
    std::vector<float> rho;                // k(k-1)/2
    std::vector<float> decisionThresholds; // k(k-1)/2
    std::vector<int32_t> labels;           // k
    std::vector<int32_t> svCounts;         // k
    int32_t featureLength = 0;
    std::vector<std::vector<float>> supportVectors; // svTotal x featureLength, dense
    std::vector<std::vector<float>> coefficients;   // (k-1) x svTotal
};

// Writes one model; the support vectors go out as their non-zero entries.
inline void writeSvmModel(ByteWriter& w, const SvmModelParams& m) {
    w.int32(m.svmType);
    w.int32(m.kernelType);
    w.int32(m.degree);
    w.float32(m.gamma);
    w.float32(m.coef0);
    w.int32(m.classCount);
    w.floats(m.rho);
    w.floats(m.decisionThresholds);
    w.int32s(m.labels);
    w.int32s(m.svCounts);
    w.int32(static_cast<int32_t>(m.supportVectors.size()));
    w.int32(m.featureLength);
    int32_t nonZero = 0;
    for (const auto& sv : m.supportVectors)
        for (float v : sv) nonZero += v != 0.0f ? 1 : 0;
    w.int32(nonZero);
    for (std::size_t r = 0; r < m.supportVectors.size(); ++r)
        for (std::size_t c = 0; c < m.supportVectors[r].size(); ++c)
            if (m.supportVectors[r][c] != 0.0f) {
                if (r + 1 > 32767 || c + 1 > 32767)
                    throw std::invalid_argument("SVM model: support vector table too large for int16 indices");
                w.int16(static_cast<int16_t>(r + 1));
                w.int16(static_cast<int16_t>(c + 1));
                w.float32(m.supportVectors[r][c]);
            }
    for (const auto& row : m.coefficients) w.floats(row);
}

// The SVM filter's file: the primary model (category 0), then the secondary one.
inline std::vector<uint8_t> svmModelPayload(const SvmModelParams& primary, const SvmModelParams& secondary) {
    ByteWriter w;
    writeSvmModel(w, primary);
    writeSvmModel(w, secondary);
    return w.bytes();
}

}  // namespace postfilterwriters

#endif
