// NetWriter: makes the library's net blob and net container from a plain
// description of a locally connected integer net (layer sizes, transfer types,
// divisors, biases, input scaling, and per source neuron its runs of target
// weights), and runs that description through a reference integer forward
// pass written straight from the format's rules, independent of the library's
// reader and loop, so that tests can hold the two against each other bit for
// bit. Header-only, no dependency beyond the standard library; tools and tests
// include it, the library never does.
#ifndef QUORIN_TOOLS_NETWRITER_H
#define QUORIN_TOOLS_NETWRITER_H

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <random>
#include <stdexcept>
#include <vector>

namespace netwriter {

// A run of consecutive targets fed by one source neuron. Targets are absolute
// indices into the work buffer (input layer first). marker < 0 lets the writer
// use the source neuron's own index as the span's run marker.
struct Span {
    uint32_t firstTarget = 0;
    std::vector<int16_t> weights;
    int32_t marker = -1;
    int32_t lastTarget = -1;  // < 0: firstTarget + weights - 1; else written as given (malformed blobs)
};

struct NetDescription {
    uint16_t version = 12;
    uint16_t kind = 2;
    uint16_t marker = 0;
    uint32_t reservedWord = 0;
    std::vector<uint16_t> layerSizes;      // [0] is the input count
    std::vector<uint32_t> transferTypes;   // per layer; [0] is never used
    std::vector<uint16_t> divisors;        // per layer; 0 selects saturating overwrite
    std::vector<std::vector<int32_t>> biases;  // per layer; empty: no biases
    std::vector<int32_t> inputDivisors;    // versions above 10
    std::vector<int64_t> inputOffsets;     // versions above 10
    std::vector<int32_t> inputMeans;
    // spans[l][a]: the spans of source neuron a of layer l-1 into the net (l >= 1).
    std::vector<std::vector<std::vector<Span>>> spans;
    int32_t neuronTotal = -1;  // < 0: the sum of the layer sizes
    uint16_t wideSize = 8, narrowSize = 4, weightSize = 2;
};

inline uint32_t layerStart(const NetDescription& d, size_t layer) {
    uint32_t s = 0;
    for (size_t l = 0; l < layer; ++l) s += d.layerSizes[l];
    return s;
}

class ByteSink {
public:
    std::vector<uint8_t> bytes;
    void align(size_t k) {
        while (bytes.size() % k) bytes.push_back(0);
    }
    void u16(uint32_t v, size_t a = 2) {
        align(a);
        bytes.push_back(uint8_t(v));
        bytes.push_back(uint8_t(v >> 8));
    }
    void u32(uint32_t v, size_t a = 4) {
        align(a);
        for (int i = 0; i < 4; ++i) bytes.push_back(uint8_t(v >> (8 * i)));
    }
    void u64(uint64_t v, size_t a = 8) {
        align(a);
        for (int i = 0; i < 8; ++i) bytes.push_back(uint8_t(v >> (8 * i)));
    }
};

// Serialises d. Layout rules: little-endian, each field aligned from the
// blob's first byte, biases of a layer aligned by the stream's own rule.
inline std::vector<uint8_t> writeBlob(const NetDescription& d) {
    const size_t L = d.layerSizes.size();
    const size_t N = L ? d.layerSizes[0] : 0;
    auto per = [&](const auto& v, size_t i, auto def) { return i < v.size() ? v[i] : def; };
    ByteSink b;
    b.u16(d.version);
    if (d.version > 9) b.u16(d.kind);
    b.u16(d.marker);
    b.u16(uint32_t(L));
    if (d.version > 9) {
        b.u32(d.reservedWord);
        for (size_t l = 0; l < L; ++l) b.u32(per(d.transferTypes, l, 1u));
        for (size_t l = 0; l < L; ++l) b.u32(0);
    }
    if (d.version > 11) b.u32(0);
    else b.u16(0, 4);
    uint32_t total = layerStart(d, L);
    b.u16(d.neuronTotal >= 0 ? uint32_t(d.neuronTotal) : total);
    for (size_t l = 0; l < L; ++l) b.u16(d.layerSizes[l]);
    for (size_t l = 0; l < L; ++l) b.u16(l < d.biases.size() && !d.biases[l].empty() ? 1 : 0);
    for (size_t l = 0; l < L; ++l) b.u16(per(d.divisors, l, uint16_t(1)));
    if (d.version > 10) {
        b.u16(d.wideSize);
        b.u16(d.narrowSize);
        b.u16(d.weightSize);
        for (size_t i = 0; i < N; ++i) b.u32(uint32_t(per(d.inputDivisors, i, int32_t(1))));
        for (size_t i = 0; i < N; ++i) b.u64(uint64_t(per(d.inputOffsets, i, int64_t(0))));
    }
    for (size_t i = 0; i < N; ++i) b.u32(uint32_t(per(d.inputMeans, i, int32_t(0))));

    // Weight stream, in running order.
    std::vector<uint8_t> stream;
    uint32_t spanCount = 0;
    for (size_t l = 1; l < L; ++l) {
        if (l < d.biases.size() && !d.biases[l].empty()) {
            if (d.biases[l].size() != d.layerSizes[l]) throw std::invalid_argument("bias count differs from layer size");
            const size_t pad = stream.size() % 4;
            stream.insert(stream.end(), pad, 0);
            for (int32_t v : d.biases[l])
                for (int i = 0; i < 4; ++i) stream.push_back(uint8_t(uint32_t(v) >> (8 * i)));
        }
        for (size_t a = 0; a < d.layerSizes[l - 1]; ++a)
            for (const Span& s : d.spans.at(l).at(a)) {
                for (int16_t w : s.weights) {
                    stream.push_back(uint8_t(uint16_t(w)));
                    stream.push_back(uint8_t(uint16_t(w) >> 8));
                }
                ++spanCount;
            }
    }
    b.u32(uint32_t(stream.size()));
    b.align(2);
    b.bytes.insert(b.bytes.end(), stream.begin(), stream.end());
    b.u32(spanCount);
    b.align(2);
    for (size_t l = 1; l < L; ++l) {
        const uint32_t start = layerStart(d, l - 1);
        for (size_t a = 0; a < d.layerSizes[l - 1]; ++a)
            for (const Span& s : d.spans.at(l).at(a)) {
                if (s.weights.empty()) throw std::invalid_argument("a span needs at least one weight");
                b.u16(s.marker >= 0 ? uint32_t(s.marker) : uint32_t(start + a) & 0xFFFF);
                b.u16(s.firstTarget);
                b.u16(s.lastTarget >= 0 ? uint32_t(s.lastTarget) : uint32_t(s.firstTarget + s.weights.size() - 1));
            }
    }
    if (d.version > 9) {
        b.align(4);
        b.u32(uint32_t(b.bytes.size() + 4));
    }
    return b.bytes;
}

// ---- net container ------------------------------------------------------

inline void containerChecksum(std::vector<uint8_t>& image) {
    uint64_t x = 0, s = 0;
    const size_t n = (image.size() - 16) / 8;
    for (size_t i = 0; i < n; ++i) {
        uint64_t w = 0;
        for (int k = 0; k < 8; ++k) w |= uint64_t(image[16 + 8 * i + k]) << (8 * k);
        x ^= w;
        s += w;
    }
    for (int k = 0; k < 8; ++k) {
        image[k] = uint8_t(x >> (8 * k));
        image[8 + k] = uint8_t(s >> (8 * k));
    }
}

// A container of the given items (payloads follow the table in order) with a
// correct checksum.
inline std::vector<uint8_t> writeContainer(const std::vector<std::vector<uint8_t>>& items, uint32_t kind = 0) {
    size_t total = 72 + 16 * items.size();
    for (const auto& it : items) total += it.size();
    std::vector<uint8_t> img(72 + 16 * items.size(), 0);
    auto put32 = [&](size_t off, uint32_t v) {
        for (int i = 0; i < 4; ++i) img[off + i] = uint8_t(v >> (8 * i));
    };
    put32(16, 100);
    put32(20, uint32_t(total));
    put32(32, kind);
    put32(36, uint32_t(items.size()));
    size_t off = img.size();
    for (size_t i = 0; i < items.size(); ++i) {
        put32(72 + 16 * i, uint32_t(off));
        put32(72 + 16 * i + 12, uint32_t(items[i].size()));
        off += items[i].size();
    }
    for (const auto& it : items) img.insert(img.end(), it.begin(), it.end());
    containerChecksum(img);
    return img;
}

// ---- builders -------------------------------------------------------------

// A fully connected net: every source neuron of layer l-1 has one span over
// all of layer l, weights drawn uniformly from [-weightRange, weightRange].
inline NetDescription denseNet(const std::vector<uint16_t>& sizes, const std::vector<uint32_t>& types,
                               const std::vector<uint16_t>& divisors, uint32_t seed, int weightRange = 300,
                               bool withBiases = true, uint16_t version = 12) {
    NetDescription d;
    d.version = version;
    d.layerSizes = sizes;
    d.transferTypes = types;
    d.divisors = divisors;
    std::mt19937 rng(seed);
    std::uniform_int_distribution<int> w(-weightRange, weightRange);
    std::uniform_int_distribution<int> bias(-20000, 20000);
    d.biases.resize(sizes.size());
    d.spans.resize(sizes.size());
    for (size_t l = 1; l < sizes.size(); ++l) {
        if (withBiases)
            for (uint16_t i = 0; i < sizes[l]; ++i) d.biases[l].push_back(bias(rng));
        const uint32_t start = layerStart(d, l);
        d.spans[l].resize(sizes[l - 1]);
        for (auto& neuron : d.spans[l]) {
            Span s;
            s.firstTarget = start;
            for (uint16_t i = 0; i < sizes[l]; ++i) s.weights.push_back(int16_t(w(rng)));
            neuron.push_back(s);
        }
    }
    const size_t N = sizes.empty() ? 0 : sizes[0];
    d.inputDivisors.assign(N, 1);
    d.inputOffsets.assign(N, 0);
    d.inputMeans.assign(N, 0);
    return d;
}

// ---- reference forward pass ----------------------------------------------

namespace ref {

inline int32_t wrap(int64_t v) { return int32_t(uint32_t(uint64_t(v))); }

inline int32_t sigmoid16(int32_t x) {
    static const std::vector<int64_t> table = [] {
        std::vector<int64_t> t(257);
        for (int i = 0; i < 256; ++i) t[i] = int64_t(std::floor(65536.0 / (1.0 + std::exp(-9.0 * i / 256.0)) + 0.5));
        t[256] = 0xFFFF;
        return t;
    }();
    const int64_t a = std::llabs(int64_t(x));
    if (a >= 0x90000) return x < 0 ? 0 : 0x10000;
    const int64_t t = a * 256 / 9;
    const int64_t i = t >> 16, f = (t >> 8) & 255;
    const int64_t r = (table[i + 1] * f + table[i] * (256 - f)) >> 8;
    return int32_t(x >= 0 ? r : 0x10000 - r);
}

inline int32_t exp16(int32_t x) {
    if (x >= 0) return 65536;
    const uint64_t s = uint64_t(sigmoid16(x));
    return int32_t(uint32_t((s * 65536) / (65536 - s)));
}

inline void softmax(int32_t* v, int64_t n, int32_t divisor, uint32_t* best) {
    const int32_t m = divisor ? divisor : 1;
    if (n == 1) {
        if (best) *best = v[0] > 0 ? 1 : 0;
        const int32_t s = sigmoid16(v[0] / m);
        const int32_t r = int32_t(int64_t(10000) * s / 65535);
        v[1] = r;
        v[0] = 10000 - r;
        return;
    }
    v[0] /= m;
    if (best) *best = 0;
    if (n < 2) return;
    int32_t mx = v[0];
    for (int64_t i = 1; i < n; ++i) {
        v[i] /= m;
        if (v[i] > mx) {
            mx = v[i];
            if (best) *best = uint32_t(i);
        }
    }
    int64_t sum = 0;
    for (int64_t i = 0; i < n; ++i) {
        v[i] = exp16(wrap(int64_t(v[i]) - mx));
        sum += v[i];
    }
    const int32_t total = wrap(sum);
    if (total < 1) return;
    for (int64_t i = 0; i < n; ++i) v[i] = int32_t(int64_t(10000) * v[i] / total);
}

inline void transfer(uint32_t type, int32_t* v, int64_t n, int32_t divisor, uint32_t* best) {
    const int32_t m = divisor ? divisor : 1;
    if (type == 0) {
        for (int64_t i = 0; i < n; ++i) v[i] /= m;
    } else if (type == 10) {
        for (int64_t i = 0; i < n; ++i) v[i] = wrap(std::llabs(int64_t(v[i] / m)));
    } else if (type == 4) {
        softmax(v, n, divisor, best);
    } else if (type == 11) {
        softmax(v, n / 2, divisor, best);
        softmax(v + n / 2, n / 2, divisor, best);
    } else {
        for (int64_t i = 0; i < n; ++i) v[i] = sigmoid16(v[i] / m);
    }
}

}  // namespace ref

// The outputs of d for inputs (as the last layer's activations, with the
// second value of a one-neuron soft-max), and the best class through best.
inline std::vector<int32_t> referenceRun(const NetDescription& d, const std::vector<int32_t>& inputs,
                                         uint32_t* best) {
    const size_t L = d.layerSizes.size();
    const uint32_t total = layerStart(d, L);
    std::vector<int32_t> work(total + 2, 0);
    const size_t N = d.layerSizes[0];
    for (size_t i = 0; i < N; ++i) {
        const int64_t x = inputs.at(i);
        const int64_t mean = d.inputMeans.at(i);
        if (d.version <= 10) {
            work[i] = ref::wrap(x - mean);
        } else if (x == INT32_MIN) {
            work[i] = ref::wrap(-mean);
        } else if (x == INT32_MAX) {
            work[i] = ref::wrap(65535 - mean);
        } else {
            const int64_t num = int64_t(uint64_t(x * 65535) - uint64_t(d.inputOffsets.at(i)));
            const int64_t q = num / d.inputDivisors.at(i);
            work[i] = (q < -65534 || q > 65535) ? 65535 : int32_t(q);
        }
    }
    uint32_t lastDivisor = 1;
    for (size_t l = 1; l < L; ++l) {
        const uint32_t tStart = layerStart(d, l);
        const uint32_t sStart = layerStart(d, l - 1);
        const bool careful = d.divisors.at(l) == 0;
        lastDivisor = careful ? 1 : d.divisors[l];
        if (l < d.biases.size())
            for (size_t i = 0; i < d.biases[l].size(); ++i) work[tStart + i] = ref::wrap(int64_t(work[tStart + i]) + d.biases[l][i]);
        for (uint32_t a = 0; a < d.layerSizes[l - 1]; ++a) {
            const uint32_t src = sStart + a;
            if (work[src] == 0) continue;
            for (const Span& s : d.spans[l][a])
                for (size_t k = 0; k < s.weights.size(); ++k) {
                    int32_t& target = work[s.firstTarget + k];
                    if (careful) {
                        const int64_t p = int64_t(s.weights[k]) * work[src + k];
                        target = p > INT32_MAX ? INT32_MAX : p < INT32_MIN ? INT32_MIN : int32_t(p);
                    } else {
                        target = ref::wrap(int64_t(target) + int64_t(work[src]) * s.weights[k]);
                    }
                }
        }
        if (l + 1 < L) ref::transfer(d.transferTypes.at(l), &work[tStart], d.layerSizes[l], int32_t(lastDivisor), nullptr);
    }
    const uint32_t lastStart = layerStart(d, L - 1);
    uint32_t n = d.layerSizes[L - 1];
    ref::transfer(d.transferTypes.at(L - 1), &work[lastStart], L > 1 ? n : 0, int32_t(lastDivisor), best);
    if (n == 1 && d.transferTypes.at(L - 1) == 4) n = 2;
    return std::vector<int32_t>(work.begin() + lastStart, work.begin() + lastStart + n);
}

}  // namespace netwriter

#endif
