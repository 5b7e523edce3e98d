#include "quorin/QVIVBStream.h"

#include <algorithm>
#include <cstring>

#include "container/IvbBytes.h"
#include "core/Errors.h"

namespace {

const char* const kNotIvb = "Not a valid QV IVB file";
const uint8_t kMagic[6] = {'I', 'V', 'B', '@', 'Q', 'V'};
const uint16_t kVersion = 1;
// Main parts are read in steps of this size so that a damaged length claiming
// gigabytes costs no more memory than the bytes the stream really holds.
const uint32_t kReadStep = 1u << 20;

// A stream failure whose what() is the text alone: the library's own
// ios_base::failure appends the error category's words to it.
class StreamFailure : public std::ios_base::failure {
public:
    explicit StreamFailure(const char* text) : std::ios_base::failure(text), text_(text) {}
    const char* what() const noexcept override { return text_; }

private:
    const char* text_;
};

}  // namespace

// --- MemoryStream -----------------------------------------------------------

MemoryStream::MemoryStream() : begin_(nullptr), end_(nullptr), cursor_(nullptr), lastCount_(0), eof_(true) {}

void MemoryStream::bind(const uint8_t* begin, const uint8_t* end) {
    begin_ = begin;
    end_ = end;
    cursor_ = begin;
    lastCount_ = 0;
    eof_ = std::greater<const uint8_t*>()(begin, end);
}

void MemoryStream::read(char* destination, unsigned int count) {
    if (eof_) throw StreamFailure("Read beyong stream");
    const std::size_t available = static_cast<std::size_t>(end_ - cursor_);
    lastCount_ = count;
    if (available < count) {
        lastCount_ = static_cast<unsigned int>(available);
        eof_ = true;
    }
    if (lastCount_ != 0) std::memcpy(destination, cursor_, lastCount_);
    cursor_ += lastCount_;
}

void MemoryStream::seekg(long long offset, std::ios_base::seekdir direction) {
    // Compared as distances, never as pointers formed outside the range.
    const long long size = begin_ != nullptr || end_ != nullptr ? static_cast<long long>(end_ - begin_) : 0;
    const long long at = static_cast<long long>(cursor_ - begin_);
    long long target = 0;
    bool ok = false;
    if (direction == std::ios_base::beg) {
        ok = offset >= 0 && offset <= size;
        target = offset;
    } else if (direction == std::ios_base::end) {
        ok = offset <= 0 && offset >= -size;
        target = size + (ok ? offset : 0);
    } else {
        ok = offset >= -at && offset <= size - at;
        target = at + (ok ? offset : 0);
    }
    if (!ok || size < 0) throw StreamFailure("Stream position out of range");
    cursor_ = begin_ + target;
}

bool MemoryStream::good() const { return begin_ != nullptr && end_ != nullptr && cursor_ != nullptr && !eof_; }

// --- QVIVBStreamReader ------------------------------------------------------

template <typename Stream>
void QVIVBStreamReader<Stream>::failIfShort(unsigned long long wanted) {
    if (static_cast<unsigned long long>(this->gcount()) < wanted) throw qv_data_error(kNotIvb);
}

template <typename Stream>
void QVIVBStreamReader<Stream>::readHeader() {
    uint8_t header[16];
    this->read(reinterpret_cast<char*>(header), sizeof(header));
    failIfShort(sizeof(header));
    if (std::memcmp(header, kMagic, sizeof(kMagic)) != 0 || ivb::getU16(header + 6) != kVersion)
        throw qv_data_error(kNotIvb);
    // A label cut short leaves zeros here; the short read is caught by the
    // record info that must follow it.
    const uint16_t labelLength = ivb::getU16(header + 14);
    std::vector<char> label(labelLength, 0);
    if (labelLength != 0) this->read(label.data(), labelLength);
    label_.assign(label.begin(), label.end());
    readNextObjectInfo();
}

template <typename Stream>
void QVIVBStreamReader<Stream>::readNextObjectInfo() {
    uint8_t info[4];
    this->read(reinterpret_cast<char*>(info), sizeof(info));
    failIfShort(sizeof(info));
    nextNameLength_ = ivb::getU16(info);
    nextTag_ = ivb::getU16(info + 2);
}

template <typename Stream>
void QVIVBStreamReader<Stream>::readNextObjectName() {
    nextName_.clear();
    std::string name(nextNameLength_, '\0');
    if (nextNameLength_ != 0) {
        this->read(&name[0], nextNameLength_);
        failIfShort(nextNameLength_);
    }
    nextName_.swap(name);
}

template <typename Stream>
void QVIVBStreamReader<Stream>::readNextObjectMainPart() {
    buffer_.clear();
    uint8_t header[16];
    this->read(reinterpret_cast<char*>(header), sizeof(header));
    failIfShort(sizeof(header));
    const uint32_t size = static_cast<uint32_t>(ivb::getU64(header));
    this->seekg(-16, std::ios_base::cur);
    uint32_t done = 0;
    while (done < size) {
        const uint32_t step = std::min(size - done, kReadStep);
        buffer_.resize(static_cast<std::size_t>(done) + step);
        this->read(reinterpret_cast<char*>(buffer_.data()) + done, step);
        failIfShort(step);
        done += step;
    }
}

template <typename Stream>
void QVIVBStreamReader<Stream>::skipNextObjectMainPart() {
    uint8_t header[16];
    this->read(reinterpret_cast<char*>(header), sizeof(header));
    failIfShort(sizeof(header));
    const uint64_t size = ivb::getU64(header);
    // As a signed offset such a length would step backwards and could send a
    // name search round in circles.
    if (size > 0x7FFFFFFFFFFFFFFFull) throw qv_data_error(kNotIvb);
    this->seekg(-16, std::ios_base::cur);
    this->seekg(static_cast<long long>(size), std::ios_base::cur);
}

template <typename Stream>
std::vector<uint8_t> QVIVBStreamReader<Stream>::readNextObject() {
    buffer_.clear();
    if (this->good() && nextTag_ != ivb::kTerminalTag) {
        readNextObjectName();
        readNextObjectMainPart();
        readNextObjectInfo();
    }
    return buffer_;
}

template <typename Stream>
std::vector<uint8_t> QVIVBStreamReader<Stream>::readNamedObject(const std::string& name) {
    buffer_.clear();
    this->seekg(0, std::ios_base::beg);
    readHeader();
    while (this->good() && nextTag_ != ivb::kTerminalTag) {
        readNextObjectName();
        if (nextName_ == name) {
            readNextObjectMainPart();
            readNextObjectInfo();
            break;
        }
        skipNextObjectMainPart();
        readNextObjectInfo();
    }
    return buffer_;
}

template class QVIVBStreamReader<MemoryStream>;
template class QVIVBStreamReader<std::ifstream>;

// --- QVIVBMemoryReader ------------------------------------------------------

void QVIVBMemoryReader::bind(const uint8_t* begin, const uint8_t* end) {
    MemoryStream::bind(begin, end);
    label_.clear();
    nextName_.clear();
    buffer_.clear();
    nextNameLength_ = 0;
    nextTag_ = 0;
    readHeader();
}

// --- QVIVBFileReader --------------------------------------------------------

QVIVBFileReader::QVIVBFileReader() { exceptions(std::ios_base::failbit | std::ios_base::badbit); }

QVIVBFileReader::QVIVBFileReader(const std::string& path) {
    exceptions(std::ios_base::failbit | std::ios_base::badbit);
    open(path);
}

QVIVBFileReader::~QVIVBFileReader() {
    try {
        release();
    } catch (...) {
        // A destructor must not throw; the file is closed either way.
    }
}

void QVIVBFileReader::open(const std::string& path) {
    release();
    clear();
    std::ifstream::open(path, std::ios_base::in | std::ios_base::binary);
    nextTag_ = 0;
    readHeader();
}

void QVIVBFileReader::release() {
    if (is_open()) std::ifstream::close();
    label_.clear();
    nextName_.clear();
    nextTag_ = ivb::kTerminalTag;
    buffer_.clear();
}

// --- QVIVBFileWriter --------------------------------------------------------

QVIVBFileWriter::QVIVBFileWriter() { exceptions(std::ios_base::failbit | std::ios_base::badbit); }

QVIVBFileWriter::QVIVBFileWriter(const std::string& path) {
    exceptions(std::ios_base::failbit | std::ios_base::badbit);
    open(path);
}

QVIVBFileWriter::QVIVBFileWriter(const std::string& path, const std::string& label) {
    exceptions(std::ios_base::failbit | std::ios_base::badbit);
    open(path, label);
}

QVIVBFileWriter::~QVIVBFileWriter() {
    try {
        release();
    } catch (...) {
        // A destructor must not throw; every write already left a whole stream.
    }
}

void QVIVBFileWriter::open(const std::string& path, const std::string& label) {
    release();
    clear();
    std::ofstream::open(path, std::ios_base::out | std::ios_base::binary | std::ios_base::trunc);
    uint8_t header[16] = {'I', 'V', 'B', '@', 'Q', 'V', 0, 0, 0, 0, 0, 0, 'I', 'I', 0, 0};
    ivb::putU16(header + 6, kVersion);
    ivb::putU16(header + 14, static_cast<uint16_t>(label.size()));
    write(reinterpret_cast<const char*>(header), sizeof(header));
    write(label.data(), static_cast<std::streamsize>(label.size()));
    writeTerminal();
}

void QVIVBFileWriter::writeObject(const std::string& name, QVIVBObjectTag tag, const std::vector<uint8_t>& data) {
    seekp(-4, std::ios_base::cur);
    uint8_t info[4];
    ivb::putU16(info, static_cast<uint16_t>(name.size()));
    ivb::putU16(info + 2, static_cast<uint16_t>(tag.value()));
    write(reinterpret_cast<const char*>(info), sizeof(info));
    write(name.data(), static_cast<std::streamsize>(name.size()));
    write(reinterpret_cast<const char*>(data.data()), static_cast<std::streamsize>(data.size()));
    writeTerminal();
}

void QVIVBFileWriter::writeTerminal() {
    const uint8_t terminal[4] = {0x00, 0x00, 0xFF, 0xFF};
    write(reinterpret_cast<const char*>(terminal), sizeof(terminal));
}

void QVIVBFileWriter::release() {
    if (is_open()) std::ofstream::close();
}
