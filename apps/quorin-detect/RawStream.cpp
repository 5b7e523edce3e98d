#include "RawStream.h"

namespace qcli {

RawFrameReader::RawFrameReader(std::FILE* in, int width, int height)
    : in_(in), frameBytes_(static_cast<std::size_t>(width) * static_cast<std::size_t>(height)) {}

RawFrameReader::Status RawFrameReader::next(std::vector<std::uint8_t>& frame) {
  frame.resize(frameBytes_);
  std::size_t got = 0;
  // fread may return short on a pipe; keep reading until the frame is whole.
  while (got < frameBytes_) {
    std::size_t n = std::fread(frame.data() + got, 1, frameBytes_ - got, in_);
    if (n == 0) break;
    got += n;
  }
  partial_ = got;
  if (got == frameBytes_) return Status::Frame;
  if (std::ferror(in_)) return Status::Error;
  return got == 0 ? Status::End : Status::Truncated;
}

}  // namespace qcli
