#include "container/ModelReader.h"

#include <cstring>

#include "core/Descramble.h"
#include "core/Errors.h"
#include "core/ModelRegistry.h"
#include "core/ScrambledTexts.h"
#include "quorin/QVIVBStream.h"

namespace {
const char* const kRawModeUnsupported = "The reader does not support raw mode loading";
const char* const kIvbModeUnsupported = "The reader does not support ivb mode loading";
}

ModelReader::ModelReader(const std::string& path, int mode)
    : mode_(-1), source_(nullptr), rawSize_(0), key_(0), counter_(0), end_(nullptr) {
    const std::pair<std::string, std::string> parsed = parseObjectPathAndName(path);
    if (parsed.first.empty()) throw qv_data_error("Invalid model path");
    objectName_ = parsed.second;

    const uint8_t* begin = nullptr;
    const uint8_t* end = nullptr;
    if (!ModelRegistry::instance().findModel(parsed.first, begin, end))
        throw qv_data_error(descrambleText(scrambled::kModelNotFound));

    if (mode == IVB) {
        // The reader owns only the parser; the bytes stay the registry's.
        ivb_.reset(new QVIVBMemoryReader(begin, end));
        mode_ = IVB;
        return;
    }

    if (end < begin || end - begin < 4) throw qv_data_error("Model data truncated");
    mode_ = mode;
    key_ = static_cast<uint32_t>(begin[0] ^ begin[1] ^ begin[2] ^ begin[3]);
    source_ = begin + 4;
    end_ = end;
    rawSize_ = static_cast<uint32_t>(end - source_);
    counter_ = 0;
}

ModelReader::~ModelReader() {}

std::pair<std::string, std::string> ModelReader::parseObjectPathAndName(const std::string& path) {
    const std::string::size_type sep = path.find("::");
    if (sep == std::string::npos) return std::make_pair(path, std::string());
    return std::make_pair(path.substr(0, sep), path.substr(sep + 2));
}

unsigned int ModelReader::read(void* destination, unsigned int size, unsigned int count) {
    if (mode_ != RAW) throw qv_unsupported_error(kRawModeUnsupported);
    // Checked in 64 bits so that a wrapping size*count cannot slip through.
    const uint64_t wanted = static_cast<uint64_t>(size) * count;
    if (wanted > static_cast<uint64_t>(end_ - source_)) throw qv_data_error("Model data truncated");
    if (wanted == 0) return count;
    if (destination == nullptr) throw qv_invalid_argument("Null destination for model read");

    const uint32_t n = static_cast<uint32_t>(wanted);
    uint8_t* out = static_cast<uint8_t*>(destination);
    std::memcpy(out, source_, n);
    for (uint32_t i = 0; i < n; ++i) {
        const uint32_t c = counter_ & 0xFFu;
        out[i] = static_cast<uint8_t>(out[i] ^ key_ ^ ((c * c) & 0xFFu));
        ++counter_;
    }
    source_ += n;
    return count;
}

std::vector<uint8_t> ModelReader::readObject() {
    if (mode_ != IVB) throw qv_unsupported_error(kIvbModeUnsupported);
    if (!objectName_.empty()) return ivb_->readNamedObject(objectName_);
    return ivb_->readNextObject();
}

unsigned int ModelReader::rawSize() const {
    if (mode_ != RAW) throw qv_unsupported_error(kRawModeUnsupported);
    return rawSize_;
}
