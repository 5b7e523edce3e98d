#ifndef QUORIN_CONTAINER_MODELREADER_H
#define QUORIN_CONTAINER_MODELREADER_H

#include <cstdint>
#include <string>
#include <utility>

// The one way to model bytes. A path "model" or "model::object" resolves
// through ModelRegistry to a built-in byte range. In raw mode the range is
// 4 seed bytes (key = their XOR) then the payload, whose byte p is stored
// XORed with the key and with low8((p % 256)^2); read() hands the payload out
// plain, in order, single pass.
class ModelReader {
public:
    enum Mode { IVB = 0, RAW = 1 };

    // Throws qv_data_error for an empty model path ("Invalid model path"), an
    // unknown model, or a range too short for the seed; qv_unsupported_error
    // for IVB mode, which this build does not serve. Any mode other than 0
    // is accepted and kept as given, but only RAW can read.
    ModelReader(const std::string& path, int mode);
    ~ModelReader();

    ModelReader(const ModelReader&) = delete;
    ModelReader& operator=(const ModelReader&) = delete;

    // "a::b::c" -> ("a", "b::c"); no "::" -> (path, "").
    static std::pair<std::string, std::string> parseObjectPathAndName(const std::string& path);

    // Copies the next size*count payload bytes, unscrambled, to destination
    // and returns count. Throws qv_unsupported_error outside raw mode and
    // qv_data_error ("Model data truncated") when the read would pass the
    // end of the payload; nothing is consumed then.
    unsigned int read(void* destination, unsigned int size, unsigned int count);

    // The whole payload's length (not what is left). Raw mode only.
    unsigned int rawSize() const;

    int mode() const { return mode_; }
    const std::string& objectName() const { return objectName_; }

private:
    int mode_;
    const uint8_t* source_;  // read cursor in raw mode
    std::string objectName_;
    uint32_t rawSize_;
    uint32_t key_;
    uint32_t counter_;
    const uint8_t* end_;  // end of the registry range; bounds every read
};

#endif
