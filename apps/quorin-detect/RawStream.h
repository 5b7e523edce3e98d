#ifndef QUORIN_APPS_RAWSTREAM_H
#define QUORIN_APPS_RAWSTREAM_H

#include <cstdint>
#include <cstdio>
#include <vector>

namespace qcli {

// Reads consecutive 8-bit gray frames of a fixed size from a stream.
class RawFrameReader {
 public:
  enum class Status {
    Frame,      // a whole frame was read
    End,        // the stream ended cleanly between frames
    Truncated,  // the stream ended inside a frame; partialBytes() tells how far
    Error,      // the stream failed to read
  };

  // Requires: width, height > 0 and the stream open for reading.
  RawFrameReader(std::FILE* in, int width, int height);

  // Ensures: on Frame, frame holds width*height bytes.
  Status next(std::vector<std::uint8_t>& frame);

  std::size_t frameBytes() const { return frameBytes_; }
  std::size_t partialBytes() const { return partial_; }

 private:
  std::FILE* in_;
  std::size_t frameBytes_;
  std::size_t partial_ = 0;
};

}  // namespace qcli

#endif
