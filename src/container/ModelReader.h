#ifndef QUORIN_CONTAINER_MODELREADER_H
#define QUORIN_CONTAINER_MODELREADER_H

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

class QVIVBMemoryReader;

// The one way to model bytes. A path "model" or "model::object" resolves
// through ModelRegistry to a built-in byte range. In raw mode the range is
// 4 seed bytes (key = their XOR) then the payload, whose byte p is stored
// XORed with the key and with low8((p % 256)^2); read() hands the payload out
// plain, in order, single pass. In IVB mode the range is an IVB stream and
// readObject() hands out its objects whole, by the name behind "::" or in order.
class ModelReader {
public:
    enum Mode { IVB = 0, RAW = 1 };

    // Throws qv_data_error for an empty model path ("Invalid model path"), an
    // unknown model, or a raw range too short for the seed. In IVB mode the
    // stream header is read at once: qv_data_error "Not a valid QV IVB file"
    // (or std::ios_base::failure "Read beyong stream" for a cut label). Any
    // mode other than 0 is raw and kept as given.
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

    // IVB mode: the main part of the object named by the path's "::" part, or,
    // for a path without one, of the next object in the stream; empty when
    // there is no such object or the stream is exhausted. Throws
    // qv_unsupported_error "The reader does not support ivb mode loading" in
    // raw mode, and the stream's errors on damaged bytes.
    std::vector<uint8_t> readObject();

    int mode() const { return mode_; }
    const std::string& objectName() const { return objectName_; }

private:
    int mode_;
    const uint8_t* source_;                  // read cursor in raw mode
    std::unique_ptr<QVIVBMemoryReader> ivb_;  // the stream in IVB mode
    std::string objectName_;
    uint32_t rawSize_;
    uint32_t key_;
    uint32_t counter_;
    const uint8_t* end_;  // end of the registry range; bounds every read
};

#endif
