#include "faceparts/NeuralNet.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstring>
#include <new>

#include "core/Errors.h"

namespace {

// Tables may lie at any byte offset (a container places the blob where it
// likes), so every field is assembled from bytes; compilers turn these into
// plain loads on little-endian targets.
inline uint16_t Rd16(const uint8_t* p) { return static_cast<uint16_t>(p[0] | (p[1] << 8)); }
inline uint32_t Rd32(const uint8_t* p) {
    return uint32_t(p[0]) | (uint32_t(p[1]) << 8) | (uint32_t(p[2]) << 16) | (uint32_t(p[3]) << 24);
}
inline int64_t Rd64(const uint8_t* p) { return static_cast<int64_t>(uint64_t(Rd32(p)) | (uint64_t(Rd32(p + 4)) << 32)); }
inline int16_t RdI16(const uint8_t* p) { return static_cast<int16_t>(Rd16(p)); }

// The device multiplies and adds in 32 bits and lets the result wrap.
inline int32_t WrapAdd(int32_t a, int32_t b) { return static_cast<int32_t>(uint32_t(a) + uint32_t(b)); }
inline int32_t WrapSub(int32_t a, int32_t b) { return static_cast<int32_t>(uint32_t(a) - uint32_t(b)); }
inline int32_t WrapMul(int32_t a, int32_t b) { return static_cast<int32_t>(uint32_t(a) * uint32_t(b)); }

const uint32_t kSpanBytes = 6;
const uint32_t kMaxSpans = 715827881u;  // keeps 6 * count inside 32 bits
const uint64_t kUnbounded = UINT64_C(1) << 62;

const int32_t kSigmoidTable[257] = {
    0x8000, 0x8240, 0x8480, 0x86BE, 0x88FC, 0x8B39, 0x8D73, 0x8FAC,
    0x91E2, 0x9415, 0x9645, 0x9872, 0x9A9B, 0x9CC0, 0x9EE1, 0xA0FD,
    0xA314, 0xA527, 0xA733, 0xA93A, 0xAB3C, 0xAD37, 0xAF2C, 0xB11A,
    0xB302, 0xB4E3, 0xB6BE, 0xB891, 0xBA5D, 0xBC21, 0xBDDE, 0xBF94,
    0xC142, 0xC2E9, 0xC487, 0xC61E, 0xC7AE, 0xC935, 0xCAB5, 0xCC2D,
    0xCD9D, 0xCF05, 0xD066, 0xD1BF, 0xD310, 0xD45A, 0xD59C, 0xD6D6,
    0xD80A, 0xD935, 0xDA5A, 0xDB77, 0xDC8E, 0xDD9D, 0xDEA6, 0xDFA7,
    0xE0A2, 0xE197, 0xE285, 0xE36C, 0xE44E, 0xE529, 0xE5FE, 0xE6CE,
    0xE797, 0xE85B, 0xE91A, 0xE9D2, 0xEA86, 0xEB35, 0xEBDE, 0xEC83,
    0xED22, 0xEDBD, 0xEE54, 0xEEE5, 0xEF73, 0xEFFC, 0xF081, 0xF102,
    0xF17F, 0xF1F8, 0xF26E, 0xF2E0, 0xF34E, 0xF3B9, 0xF421, 0xF485,
    0xF4E6, 0xF544, 0xF59F, 0xF5F7, 0xF64D, 0xF69F, 0xF6EF, 0xF73D,
    0xF788, 0xF7D0, 0xF816, 0xF85A, 0xF89C, 0xF8DB, 0xF919, 0xF954,
    0xF98E, 0xF9C5, 0xF9FB, 0xFA2F, 0xFA62, 0xFA92, 0xFAC1, 0xFAEF,
    0xFB1B, 0xFB45, 0xFB6E, 0xFB96, 0xFBBC, 0xFBE1, 0xFC05, 0xFC28,
    0xFC49, 0xFC6A, 0xFC89, 0xFCA7, 0xFCC5, 0xFCE1, 0xFCFC, 0xFD16,
    0xFD30, 0xFD49, 0xFD60, 0xFD77, 0xFD8E, 0xFDA3, 0xFDB8, 0xFDCC,
    0xFDDF, 0xFDF2, 0xFE04, 0xFE15, 0xFE26, 0xFE36, 0xFE46, 0xFE55,
    0xFE64, 0xFE72, 0xFE80, 0xFE8D, 0xFE9A, 0xFEA6, 0xFEB2, 0xFEBD,
    0xFEC8, 0xFED3, 0xFEDD, 0xFEE7, 0xFEF1, 0xFEFA, 0xFF03, 0xFF0C,
    0xFF14, 0xFF1D, 0xFF24, 0xFF2C, 0xFF33, 0xFF3A, 0xFF41, 0xFF48,
    0xFF4E, 0xFF54, 0xFF5A, 0xFF60, 0xFF65, 0xFF6B, 0xFF70, 0xFF75,
    0xFF7A, 0xFF7E, 0xFF83, 0xFF87, 0xFF8B, 0xFF8F, 0xFF93, 0xFF97,
    0xFF9B, 0xFF9E, 0xFFA1, 0xFFA5, 0xFFA8, 0xFFAB, 0xFFAE, 0xFFB1,
    0xFFB3, 0xFFB6, 0xFFB9, 0xFFBB, 0xFFBD, 0xFFC0, 0xFFC2, 0xFFC4,
    0xFFC6, 0xFFC8, 0xFFCA, 0xFFCC, 0xFFCE, 0xFFCF, 0xFFD1, 0xFFD3,
    0xFFD4, 0xFFD6, 0xFFD7, 0xFFD9, 0xFFDA, 0xFFDB, 0xFFDD, 0xFFDE,
    0xFFDF, 0xFFE0, 0xFFE1, 0xFFE2, 0xFFE3, 0xFFE4, 0xFFE5, 0xFFE6,
    0xFFE7, 0xFFE8, 0xFFE9, 0xFFEA, 0xFFEA, 0xFFEB, 0xFFEC, 0xFFED,
    0xFFED, 0xFFEE, 0xFFEE, 0xFFEF, 0xFFF0, 0xFFF0, 0xFFF1, 0xFFF1,
    0xFFF2, 0xFFF2, 0xFFF3, 0xFFF3, 0xFFF4, 0xFFF4, 0xFFF5, 0xFFF5,
    0xFFF5, 0xFFF6, 0xFFF6, 0xFFF6, 0xFFF7, 0xFFF7, 0xFFF7, 0xFFF8,
    0xFFFF,
};

// A read position over the blob with an end limit; every field is tested
// against the limit before its pointer is handed out.
struct BlobCursor {
    const uint8_t* base;
    uint64_t limit;
    uint64_t pos;

    void Align(uint64_t k) { pos = (pos + k - 1) / k * k; }
    bool Take(uint64_t bytes, const uint8_t*& at) {
        if (pos > limit || bytes > limit - pos) return false;
        at = base + pos;
        pos += bytes;
        return true;
    }
    bool U16(uint16_t& v, uint64_t align = 2) {
        const uint8_t* p;
        Align(align);
        if (!Take(2, p)) return false;
        v = Rd16(p);
        return true;
    }
    bool U32(uint32_t& v, uint64_t align = 4) {
        const uint8_t* p;
        Align(align);
        if (!Take(4, p)) return false;
        v = Rd32(p);
        return true;
    }
    bool Table(const uint8_t*& at, uint64_t count, uint64_t width, uint64_t align) {
        Align(align);
        return Take(count * width, at);
    }
};

}  // namespace

int32_t SaturatingTrunc(double v) {
    // Truncation toward zero that saturates and maps NaN to 0, as the target's
    // conversion instruction does; a plain cast would be undefined here.
    if (std::isnan(v)) return 0;
    if (v >= 2147483647.0) return INT32_MAX;
    if (v <= -2147483648.0) return INT32_MIN;
    return static_cast<int32_t>(v);
}

int32_t Sigmoid16(int32_t x) {
    const uint32_t a = x < 0 ? 0u - uint32_t(x) : uint32_t(x);
    if (a >= 0x90000u) return x < 0 ? 0 : 0x10000;
    const uint32_t t = (a * 256u) / 9u;
    const uint32_t i = t >> 16;
    const uint32_t f = (t >> 8) & 255u;
    const int32_t r = static_cast<int32_t>((uint32_t(kSigmoidTable[i + 1]) * f + uint32_t(kSigmoidTable[i]) * (256u - f)) >> 8);
    return x >= 0 ? r : 0x10000 - r;
}

int32_t Div16(int32_t a, int32_t b) {
    if (b == 0) {
        if (a == 0) return 0;
        return a < 0 ? INT32_MIN : INT32_MAX;
    }
    const bool negative = (a < 0) != (b < 0);
    uint32_t num = a < 0 ? 0u - uint32_t(a) : uint32_t(a);
    uint32_t den = b < 0 ? 0u - uint32_t(b) : uint32_t(b);
    int room;
    if (num >= 0x1000000u) room = 0;
    else if (num & 0xFF0000u) room = 8;
    else if (num & 0xFF00u) room = 16;
    else room = 24;
    int quotientShift = 0;
    if (room >= 16) {
        num <<= 16;
    } else {
        int width;
        if (den >= 0x1000000u) width = 32;
        else if (den & 0xFF0000u) width = 24;
        else if (den & 0xFF00u) width = 16;
        else width = 8;
        const int n = 16 - room;
        if (width > n) den >>= n;
        else quotientShift = n;
        num <<= room;
    }
    if (den == 0) return negative ? INT32_MIN : INT32_MAX;  // unreachable by the widths above
    const uint32_t q = (num / den) << quotientShift;
    return static_cast<int32_t>(negative ? 0u - q : q);
}

NeuralNet::NeuralNet() = default;
NeuralNet::~NeuralNet() = default;

uint16_t NeuralNet::LayerSize(uint32_t layer) const {
    return layer < tables.layerCount ? Rd16(tables.layerSizes + 2 * layer) : 0;
}

uint32_t NeuralNet::TransferType(uint32_t layer) const {
    if (layer >= tables.layerCount || tables.transferTypes == nullptr) return TXF_SIGMOID;
    return Rd32(tables.transferTypes + 4 * layer);
}

int64_t NeuralNet::BufferLength(const Tables& t) {
    if (t.layerCount == 0) return -1;
    int64_t sum = 0;
    for (uint32_t l = 0; l < t.layerCount; ++l) {
        const uint16_t n = Rd16(t.layerSizes + 2 * l);
        if (n == 0) return -1;
        sum += (l + 1 == t.layerCount && n == 1) ? 2 : n;
    }
    return (sum == 0 || sum > INT32_MAX) ? -1 : sum;
}

int NeuralNet::workBufferLength() const { return static_cast<int>(BufferLength(tables)); }

bool NeuralNet::ReadRunTables(const uint8_t* blob, uint64_t limit, uint64_t& pos, uint16_t version, Tables& t) {
    BlobCursor c{blob, limit, pos};
    if (!c.U16(t.layerCount)) return false;
    const uint32_t layers = t.layerCount;
    if (version > 9) {
        if (!c.U32(t.reservedWord)) return false;
        if (!c.Table(t.transferTypes, layers, 4, 4)) return false;
        if (!c.Table(t.reservedTable, layers, 4, 4)) return false;
    }
    if (version > 11) {
        if (!c.U32(t.reservedCount)) return false;
    } else {
        uint16_t count16;
        if (!c.U16(count16, 4)) return false;
        t.reservedCount = count16;
    }
    if (!c.U16(t.neuronTotal)) return false;
    if (!c.Table(t.layerSizes, layers, 2, 2)) return false;
    if (!c.Table(t.biasFlags, layers, 2, 2)) return false;
    if (!c.Table(t.layerDivisors, layers, 2, 2)) return false;
    const uint32_t inputs = layers ? Rd16(t.layerSizes) : 0;
    if (version > 10) {
        if (!c.U16(t.wideSize) || !c.U16(t.narrowSize) || !c.U16(t.weightSize)) return false;
        if (t.wideSize != 8 || t.narrowSize != 4 || t.weightSize != 2) return false;
        if (!c.Table(t.inputDivisors, inputs, 4, 4)) return false;
        for (uint32_t i = 0; i < inputs; ++i)
            if (static_cast<int32_t>(Rd32(t.inputDivisors + 4 * i)) < 1) return false;
        if (!c.Table(t.inputOffsets, inputs, 8, 8)) return false;
    }
    if (!c.Table(t.inputMeans, inputs, 4, 4)) return false;
    if (!c.U32(t.weightBytes)) return false;
    if (!c.Table(t.weights, t.weightBytes, 1, 2)) return false;
    pos = c.pos;
    return true;
}

bool NeuralNet::ReadBlob(const uint8_t* blob, uint64_t size, bool bounded, uint16_t expected, Tables& t) const {
    if (blob == nullptr) return false;
    if (bounded && size < 2) return false;
    t = Tables();
    BlobCursor head{blob, bounded ? size : kUnbounded, 0};
    if (!head.U16(t.version)) return false;
    if (t.version > 9) {
        if (!head.U16(t.kind)) return false;
    } else {
        t.kind = t.version;
    }
    if (t.kind != 2) return false;
    uint16_t marker;
    if (!head.U16(marker) || marker != expected) return false;

    uint64_t pos = head.pos;
    // The tables up to the weight stream are bounded by the even part of the size.
    if (!ReadRunTables(blob, bounded ? (size & ~uint64_t(1)) : kUnbounded, pos, t.version, t)) return false;

    BlobCursor tail{blob, bounded ? size : kUnbounded, pos};
    if (!tail.U32(t.spanCount)) return false;
    if (t.spanCount == 0 || t.spanCount > kMaxSpans) return false;
    if (!tail.Table(t.spans, t.spanCount, kSpanBytes, 2)) return false;
    if (t.version > 9) {
        uint32_t blobSize;
        if (!tail.U32(blobSize)) return false;
        if (blobSize != tail.pos) return false;
    }
    return CheckRunConsistency(t);
}

// Walks the weight stream and the spans exactly as Run will, so that a blob
// that passes can't make a run read behind its weights or spans, nor touch the
// work buffer outside its length. Blobs without transfer types never run.
bool NeuralNet::CheckRunConsistency(const Tables& t) {
    const int64_t length = BufferLength(t);
    if (length <= 0) return false;
    const uint32_t inputs = Rd16(t.layerSizes);
    if (t.neuronTotal < inputs || t.neuronTotal > length) return false;
    if (t.transferTypes == nullptr) return true;

    uint64_t cursor = 0;
    uint64_t span = 0;
    uint64_t sourceStart = 0;
    for (uint32_t l = 1; l < t.layerCount; ++l) {
        const uint32_t sources = Rd16(t.layerSizes + 2 * (l - 1));
        const uint32_t targets = Rd16(t.layerSizes + 2 * l);
        const bool careful = Rd16(t.layerDivisors + 2 * l) == 0;
        if (Rd16(t.biasFlags + 2 * l) != 0) {
            cursor += cursor % 4;
            cursor += 4ull * targets;
            if (cursor > t.weightBytes) return false;
        }
        for (uint32_t a = 0; a < sources; ++a) {
            if (span >= t.spanCount) return false;
            const uint16_t marker = Rd16(t.spans + kSpanBytes * span);
            do {
                const uint8_t* s = t.spans + kSpanBytes * span;
                const uint32_t first = Rd16(s + 2), last = Rd16(s + 4);
                if (first > last || last >= length) return false;
                const uint64_t count = last - first + 1;
                // The careful loop walks the activation along with the target.
                if (careful && sourceStart + a + count > uint64_t(length)) return false;
                cursor += 2 * count;
                if (cursor > t.weightBytes) return false;
                ++span;
            } while (span < t.spanCount && Rd16(t.spans + kSpanBytes * span) == marker);
        }
        sourceStart += sources;
    }
    return true;
}

void NeuralNet::Adopt(const Tables& t) {
    tables = t;
    runnable = false;
}

void NeuralNet::AllocWorkBuffer() {
    const int64_t length = BufferLength(tables);
    // One guard slot: a two-neuron last layer of paired soft-max writes one
    // entry behind the layer.
    const uint32_t entries = static_cast<uint32_t>(length) + 1;
    std::unique_ptr<int32_t[]> buffer(new int32_t[entries]());
    workBuffer = std::move(buffer);
    workBufferSize = entries;
    runnable = true;
}

int NeuralNet::RestoreLocalConnectNetSafe(const uint8_t* blob, uint32_t size, uint16_t expected) {
    Tables t;
    if (!ReadBlob(blob, size, true, expected, t)) return 0;
    Adopt(t);
    runnable = workBuffer && workBufferSize > uint64_t(BufferLength(tables));
    return 1;
}

int NeuralNet::RestoreLocalConnectNet(const uint8_t* blob, uint16_t expected) {
    Tables t;
    if (!ReadBlob(blob, 0, false, expected, t)) return 0;
    Adopt(t);
    runnable = workBuffer && workBufferSize > uint64_t(BufferLength(tables));
    return 1;
}

const uint8_t* NeuralNet::RestoreRunNetSafe(const uint8_t* blob, uint32_t size, const uint8_t* position,
                                            uint16_t version) {
    if (blob == nullptr || position == nullptr || position < blob || position > blob + size) return nullptr;
    Tables t = tables;
    uint64_t pos = static_cast<uint64_t>(position - blob);
    if (!ReadRunTables(blob, size & ~uint32_t(1), pos, version, t)) return nullptr;
    Adopt(t);  // without its spans this net is not runnable
    return blob + pos;
}

const uint8_t* NeuralNet::RestoreRunNet(const uint8_t* blob, const uint8_t* position, uint16_t version) {
    if (blob == nullptr || position == nullptr || position < blob) return nullptr;
    Tables t = tables;
    uint64_t pos = static_cast<uint64_t>(position - blob);
    if (!ReadRunTables(blob, kUnbounded, pos, version, t)) return nullptr;
    Adopt(t);
    return blob + pos;
}

void NeuralNet::loadBuffer(const uint8_t* data, uint64_t size) {
    Tables t;
    if (size > UINT32_MAX || !ReadBlob(data, size, true, 0, t) || BufferLength(t) <= 0)
        throw qv_operation_error("Failed to set algorithm in CNeuralNet");
    const Tables previous = tables;
    Adopt(t);
    try {
        AllocWorkBuffer();
    } catch (...) {
        tables = previous;
        runnable = workBuffer != nullptr;
        throw;
    }
    fileImage.reset();
}

int NeuralNet::LoadFromFile(FILE* stream) {
    if (stream == nullptr) return 0;
    if (std::fseek(stream, 0, SEEK_END) != 0) return 0;
    const long length = std::ftell(stream);
    std::rewind(stream);
    if (length <= 0 || static_cast<unsigned long>(length) > UINT32_MAX) return 0;
    std::unique_ptr<uint8_t[], void (*)(void*)> image(static_cast<uint8_t*>(std::malloc(size_t(length))), &std::free);
    if (!image) return 0;
    if (std::fread(image.get(), 1, size_t(length), stream) != size_t(length)) return 0;
    Tables t;
    if (!ReadBlob(image.get(), uint64_t(length), true, 0, t) || BufferLength(t) <= 0) return 0;
    const Tables previous = tables;
    Adopt(t);
    try {
        AllocWorkBuffer();
    } catch (const std::bad_alloc&) {
        tables = previous;
        runnable = workBuffer != nullptr;
        return 0;
    }
    fileImage = std::move(image);
    std::fclose(stream);
    return 1;
}

int NeuralNet::LoadFromFile(const char* path) {
    if (path == nullptr) return 0;
    FILE* stream = std::fopen(path, "rb");
    if (stream == nullptr) return 0;
    const int ok = LoadFromFile(stream);
    if (!ok) std::fclose(stream);  // the inner form closes the stream on success
    return ok;
}

bool NeuralNet::inputCount(uint32_t* count) {
    if (count == nullptr) return false;
    *count = 0;
    if (!workBuffer || tables.layerCount == 0) return false;
    *count = LayerSize(0);
    return true;
}

bool NeuralNet::outputCount(uint32_t* count) {
    if (count == nullptr) return false;
    *count = 0;
    if (!workBuffer || tables.layerCount == 0) return false;
    const uint32_t last = tables.layerCount - 1u;
    uint32_t n = LayerSize(last);
    if (n == 1 && tables.transferTypes != nullptr && TransferType(last) == TXF_SOFTMAX) n = 2;
    *count = n;
    return true;
}

uint32_t NeuralNet::inputSize() const {
    if (!workBuffer || tables.layerCount == 0) return 0;
    return LayerSize(0);
}

uint32_t NeuralNet::outputSize() {
    uint32_t n = 0;
    return outputCount(&n) ? n : 0;
}

bool NeuralNet::classifyInts(const int32_t* inputs, uint32_t inputLength, uint32_t* bestClass, float* outputs,
                             uint32_t outputLength) {
    if (bestClass == nullptr || inputLength != inputSize()) return false;
    if (inputLength != 0 && inputs == nullptr) return false;
    const int32_t* result = Run(inputs, bestClass);
    if (result != nullptr && outputs != nullptr) {
        const uint32_t n = std::min(outputSize(), outputLength);
        for (uint32_t i = 0; i < n; ++i) outputs[i] = static_cast<float>(result[i]) / 10000.0f;
    }
    return true;
}

void NeuralNet::ScaleInputs(int32_t* values, int32_t count) const {
    for (int32_t i = 0; i < count; ++i) {
        const int32_t x = values[i];
        const int32_t mean = static_cast<int32_t>(Rd32(tables.inputMeans + 4 * i));
        if (x == INT32_MIN) {
            values[i] = WrapSub(0, mean);
        } else if (x == INT32_MAX) {
            values[i] = WrapSub(65535, mean);
        } else {
            const int64_t offset = Rd64(tables.inputOffsets + 8 * i);
            const int64_t divisor = static_cast<int32_t>(Rd32(tables.inputDivisors + 4 * i));
            const int64_t shifted = static_cast<int64_t>(uint64_t(int64_t(x) * 65535) - uint64_t(offset));
            const int64_t q = shifted / divisor;
            // Both ends saturate to the positive full scale.
            values[i] = (q < -65534 || q > 65535) ? 65535 : static_cast<int32_t>(q);
        }
    }
}

void NeuralNet::SubtractMeans(int32_t* values, int32_t count) const {
    for (int32_t i = 0; i < count; ++i)
        values[i] = WrapSub(values[i], static_cast<int32_t>(Rd32(tables.inputMeans + 4 * i)));
}

void NeuralNet::CentralLoop(int32_t* targets, uint32_t count, const uint8_t* w, const int32_t* activation) {
    const int32_t a = *activation;
    if (a == 0 || count == 0) return;
    // Weights are bytes, which may alias anything; promising the compiler that
    // they don't overlap the targets lets it vectorise the loop.
    int32_t* __restrict out = targets;
    const uint8_t* __restrict in = w;
    const uint32_t factor = uint32_t(a);
    for (uint32_t k = 0; k < count; ++k)
        out[k] = static_cast<int32_t>(uint32_t(out[k]) + factor * uint32_t(int32_t(RdI16(in + 2 * k))));
}

void NeuralNet::CentralLoopUseCaution(int32_t* targets, uint32_t count, const uint8_t* w, const int32_t* activation) {
    if (*activation == 0 || count == 0) return;
    for (uint32_t k = 0; k < count; ++k) {
        const int16_t weight = RdI16(w + 2 * k);
        const double p = double(weight) * double(activation[k]);
        if (p > 2147483647.0) targets[k] = INT32_MAX;
        else if (p < -2147483648.0) targets[k] = INT32_MIN;
        else targets[k] = WrapMul(weight, activation[k]);
    }
}

void NeuralNet::Linear(int32_t* values, uint32_t count, uint16_t divisor) {
    const int32_t d = divisor ? divisor : 1;
    for (uint32_t i = 0; i < count; ++i) values[i] /= d;
}

void NeuralNet::Abs(int32_t* values, uint32_t count, uint16_t divisor) {
    const int32_t d = divisor ? divisor : 1;
    for (uint32_t i = 0; i < count; ++i) {
        const int32_t v = values[i] / d;
        values[i] = v < 0 ? WrapSub(0, v) : v;
    }
}

void NeuralNet::Sigmoid(int32_t* values, uint32_t count, uint16_t divisor) {
    const int32_t d = divisor ? divisor : 1;
    for (uint32_t i = 0; i < count; ++i) values[i] = Sigmoid16(values[i] / d);
}

int32_t NeuralNet::Exp(int32_t x) {
    if (x >= 0) return 65536;
    // e^x = s / (1 - s) with s the logistic of x.
    const uint32_t s = static_cast<uint32_t>(Sigmoid16(x));
    return static_cast<int32_t>((s * 65536u) / (65536u - s));
}

void NeuralNet::SoftMax(int32_t* values, uint32_t count, uint16_t divisor, uint32_t* bestClass) {
    if (count == 1) {
        // One neuron stands for two classes; the raw accumulator decides.
        if (bestClass) *bestClass = static_cast<float>(values[0]) > 0.0f ? 1 : 0;
        Sigmoid(values, 1, divisor);
        const int32_t r = 10000 * values[0] / 65535;
        values[1] = r;
        values[0] = 10000 - r;
        return;
    }
    const int32_t m = divisor ? divisor : 1;
    values[0] /= m;
    if (bestClass) *bestClass = 0;
    if (count < 2) return;
    int32_t maximum = values[0];
    for (uint32_t i = 1; i < count; ++i) {
        values[i] /= m;
        if (values[i] > maximum) {
            maximum = values[i];
            if (bestClass) *bestClass = i;
        }
    }
    uint32_t sum = 0;
    for (uint32_t i = 0; i < count; ++i) {
        values[i] = Exp(WrapSub(values[i], maximum));
        sum += uint32_t(values[i]);
    }
    const int32_t total = static_cast<int32_t>(sum);
    if (total < 1) return;
    for (uint32_t i = 0; i < count; ++i) values[i] = 10000 * values[i] / total;
}

void NeuralNet::TxferLayer(uint32_t type, int32_t* values, uint32_t count, uint16_t divisor, uint32_t* bestClass) {
    switch (type) {
    case TXF_LINEAR: Linear(values, count, divisor); break;
    case TXF_SOFTMAX: SoftMax(values, count, divisor, bestClass); break;
    case TXF_ABS: Abs(values, count, divisor); break;
    case TXF_SOFTMAX_PAIR:
        SoftMax(values, count / 2, divisor, bestClass);
        SoftMax(values + count / 2, count / 2, divisor, bestClass);
        break;
    default: Sigmoid(values, count, divisor); break;
    }
}

const int32_t* NeuralNet::Run(uint32_t* bestClass) {
    if (!workBuffer || !runnable || tables.transferTypes == nullptr) return nullptr;
    int32_t* const work = workBuffer.get();
    const Tables& t = tables;
    const uint32_t layers = t.layerCount;
    const uint32_t inputs = LayerSize(0);
    if (t.version > 10) ScaleInputs(work, static_cast<int32_t>(inputs));
    else SubtractMeans(work, static_cast<int32_t>(inputs));
    std::memset(work + inputs, 0, sizeof(int32_t) * (t.neuronTotal - inputs));

    if (layers < 2) {
        TxferLayer(TransferType(layers - 1), work, 0, 1, bestClass);
        return work;
    }
    const uint8_t* w = t.weights;
    const uint8_t* const weightStart = t.weights;
    const uint8_t* span = t.spans;
    const uint8_t* const spanEnd = t.spans + kSpanBytes * uint64_t(t.spanCount);
    int32_t* source = work;
    int32_t* target = work + inputs;
    uint16_t divisor = 1;
    for (uint32_t l = 1; l < layers; ++l) {
        const uint32_t sources = LayerSize(l - 1);
        const uint32_t targets = LayerSize(l);
        divisor = Rd16(t.layerDivisors + 2 * l);
        const bool careful = divisor == 0;
        if (careful) divisor = 1;
        if (Rd16(t.biasFlags + 2 * l) != 0) {
            w += (w - weightStart) % 4;
            for (uint32_t i = 0; i < targets; ++i) target[i] = WrapAdd(target[i], static_cast<int32_t>(Rd32(w + 4 * i)));
            w += 4 * targets;
        }
        for (uint32_t a = 0; a < sources; ++a) {
            const int32_t* activation = source + a;
            const uint16_t marker = Rd16(span);
            do {
                const uint32_t first = Rd16(span + 2);
                const uint32_t count = Rd16(span + 4) - first + 1;
                if (*activation != 0) {
                    if (careful) CentralLoopUseCaution(work + first, count, w, activation);
                    else CentralLoop(work + first, count, w, activation);
                }
                w += 2 * count;
                span += kSpanBytes;
                // The span array's end also ends a neuron's run of spans.
            } while (span < spanEnd && Rd16(span) == marker);
        }
        if (l + 1 < layers) TxferLayer(TransferType(l), target, targets, divisor, nullptr);
        source = target;
        target += targets;
    }
    TxferLayer(TransferType(layers - 1), source, LayerSize(layers - 1), divisor, bestClass);
    return source;
}

const int32_t* NeuralNet::Run(const int32_t* inputs, uint32_t* bestClass) {
    if (!workBuffer || !runnable || inputs == nullptr) return nullptr;
    std::memcpy(workBuffer.get(), inputs, sizeof(int32_t) * LayerSize(0));
    return Run(bestClass);
}

const int32_t* NeuralNet::Run(const double* inputs, uint32_t* bestClass) {
    if (!workBuffer || !runnable || inputs == nullptr) return nullptr;
    const uint32_t n = LayerSize(0);
    for (uint32_t i = 0; i < n; ++i) workBuffer[i] = SaturatingTrunc(inputs[i]);
    return Run(bestClass);
}
