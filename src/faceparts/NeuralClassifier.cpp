#include "faceparts/NeuralClassifier.h"

#include <algorithm>
#include <cstring>

#include "container/ModelReader.h"
#include "core/Errors.h"

namespace {

const uint32_t kHeadBytes = 72;
const uint32_t kItemBytes = 16;
const uint32_t kContainerVersion = 100;

inline uint32_t Rd32(const uint8_t* p) {
    return uint32_t(p[0]) | (uint32_t(p[1]) << 8) | (uint32_t(p[2]) << 16) | (uint32_t(p[3]) << 24);
}
inline uint64_t Rd64(const uint8_t* p) { return uint64_t(Rd32(p)) | (uint64_t(Rd32(p + 4)) << 32); }

}  // namespace

NeuralClassifier::NeuralClassifier() = default;

NeuralClassifier::~NeuralClassifier() {
    clearData();
    net_.reset();
}

int NeuralClassifier::CheckSum(const NetContainerHeader* image, uint32_t size, uint8_t* out, uint32_t outSize) {
    if (out != nullptr && outSize != 0) std::memset(out, 0, outSize);
    if (image == nullptr || size <= 88 || out == nullptr || outSize != 16) return 0;
    const uint8_t* bytes = reinterpret_cast<const uint8_t*>(image);
    const uint32_t words = (size - 16) / 8;
    uint64_t x = 0, sum = 0;
    for (uint32_t i = 0; i < words; ++i) {
        const uint64_t w = Rd64(bytes + 16 + 8 * uint64_t(i));
        x ^= w;
        sum += w;
    }
    for (int k = 0; k < 8; ++k) {
        out[k] = uint8_t(x >> (8 * k));
        out[8 + k] = uint8_t(sum >> (8 * k));
    }
    return 1;
}

bool NeuralClassifier::Verify(const void* image, uint32_t size) {
    if (image == nullptr || size < 88) return false;
    const uint8_t* bytes = static_cast<const uint8_t*>(image);
    uint8_t sum[16];
    if (!CheckSum(static_cast<const NetContainerHeader*>(image), size, sum, sizeof sum)) return false;
    if (std::memcmp(sum, bytes, sizeof sum) != 0) return false;
    const NetContainerHeader* head = static_cast<const NetContainerHeader*>(image);
    const uint32_t total = Rd32(head->totalSize);
    if (total != size || Rd32(head->version) != kContainerVersion) return false;
    const uint64_t count = Rd32(head->itemCount);
    if (count == 0) return false;
    // The table must fit before any of it is read (count is the image's word).
    const uint64_t tableEnd = kHeadBytes + kItemBytes * count;
    if (tableEnd > total) return false;
    uint64_t running = tableEnd + Rd32(bytes + kHeadBytes + 12);
    if (running > total) return false;
    for (uint64_t i = 1; i < count; ++i) {
        running += Rd32(bytes + kHeadBytes + kItemBytes * i + 12);
        if (running > total) return false;
    }
    if (running != total) return false;
    // Sizes alone don't place the payloads: each must lie behind the table
    // and inside the image, or a net would be read from outside it.
    for (uint64_t i = 0; i < count; ++i) {
        const uint8_t* item = bytes + kHeadBytes + kItemBytes * i;
        const uint64_t offset = Rd32(item);
        const uint64_t length = Rd32(item + 12);
        if (offset < tableEnd || offset + length > total) return false;
    }
    return true;
}

void NeuralClassifier::LoadClassifierData(const uint8_t* pDataBuf, uint64_t cDatabuf) {
    if (cDatabuf >> 32) throw qv_invalid_argument("Invalid argument cDatabuf in Classifier::LoadClassifierData");
    if (!Verify(pDataBuf, static_cast<uint32_t>(cDatabuf)))
        throw qv_invalid_argument("Argument pDataBuf, cDatabuf not compatible in Classifier::LoadClassifierData");
    const NetContainerHeader* head = reinterpret_cast<const NetContainerHeader*>(pDataBuf);
    if (Rd32(head->kind) != 0 || Rd32(head->itemCount) != 1) return;  // an image of another sort
    net_.reset(new NeuralNet());
    netInData_ = data_ && pDataBuf >= data_.get() && pDataBuf < data_.get() + dataSize_;
    const uint8_t* item = pDataBuf + kHeadBytes;
    net_->LoadFromBuffer(pDataBuf + Rd32(item), Rd32(item + 12));
}

void NeuralClassifier::ReadDataFromFile(const char* path) {
    ModelReader reader(path ? path : "", ModelReader::RAW);
    const uint32_t size = reader.rawSize();
    std::unique_ptr<uint8_t[]> bytes(new uint8_t[size ? size : 1]);
    if (size) reader.read(bytes.get(), 1, size);
    data_ = std::move(bytes);
    dataSize_ = size;
}

void NeuralClassifier::loadFromPath(const char* path) {
    // The net may point into the image about to be dropped; it must not
    // outlive it, even when the new image is refused.
    if (netInData_) net_.reset();
    clearData();
    ReadDataFromFile(path);
    if (dataSize_ != 0) LoadClassifierData(data_.get(), dataSize_);
}

void NeuralClassifier::clearData() {
    if (netInData_) {
        net_.reset();
        netInData_ = false;
    }
    data_.reset();
    dataSize_ = 0;
}

bool NeuralClassifier::inputCount(uint32_t* count) {
    if (count == nullptr) return false;
    *count = 0;
    if (!net_) return false;
    *count = net_->inputSize();
    return true;
}

bool NeuralClassifier::outputCount(uint32_t* count) {
    if (count == nullptr) return false;
    *count = 0;
    return net_ ? net_->outputCount(count) : false;
}

void NeuralClassifier::Classify(const float* pInput, uint32_t length, uint32_t* pulBestClass, float* outputs,
                                uint32_t outputLength) {
    if (pInput == nullptr) throw qv_invalid_argument("Invalid argument pInput in Classifier::Classify");
    if (pulBestClass == nullptr) throw qv_invalid_argument("Invalid argument pulBestClass in Classifier::Classify");
    *pulBestClass = 0;
    if (outputs != nullptr && outputLength != 0) std::fill(outputs, outputs + outputLength, 0.0f);
    if (!net_) throw qv_operation_error("Neural Net is not constructed");
    uint32_t inputs = 0;
    if (!net_->inputCount(&inputs)) throw qv_operation_error("Neural Net input number error");
    int32_t* buffer = net_->inputBuffer();
    if (buffer == nullptr) throw qv_operation_error("Neural Net input buffer error");
    if (length > inputs) throw qv_invalid_argument("Invalid argument length in Classifier::Classify");
    for (uint32_t i = 0; i < length; ++i) buffer[i] = SaturatingTrunc(pInput[i]);
    const int32_t* result = net_->Run(pulBestClass);
    if (result == nullptr) throw qv_operation_error("Neural Net output error");
    if (outputs != nullptr && outputLength != 0) {
        // Only the net's own outputs exist in its buffer; the rest stay 0.
        const uint32_t n = std::min(outputLength, net_->outputSize());
        for (uint32_t i = 0; i < n; ++i) outputs[i] = static_cast<float>(result[i]) / 10000.0f;
    }
}
