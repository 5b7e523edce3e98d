#ifndef QUORIN_APPS_IMAGEIO_H
#define QUORIN_APPS_IMAGEIO_H

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace qcli {

// Largest side accepted from a file or a raw stream; beyond it a header is
// more likely forged than real.
constexpr int kMaxImageSide = 16384;
// Largest pixel count decoded (64 Mpixel, 192 MiB as RGB).
constexpr long long kMaxImagePixels = 1LL << 26;
// Largest file read into memory before decoding.
constexpr std::size_t kMaxFileBytes = 256u << 20;

struct ImageError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// An 8-bit image with 1 (gray) or 3 (RGB) interleaved channels, no padding.
struct Image {
  int width = 0;
  int height = 0;
  int channels = 0;
  std::vector<std::uint8_t> pixels;
};

// Requires: bytes of a JPEG, PNG or binary PGM/PPM file.
// Ensures: an RGB image; throws ImageError naming what is wrong otherwise.
Image decodeImage(const std::vector<std::uint8_t>& bytes);

// Reads a whole file; throws ImageError with the system's reason.
std::vector<std::uint8_t> readFileBytes(const std::string& path);

// The images a command-line argument stands for: a directory's files with an
// image extension (.jpg, .jpeg, .png, .pgm, .ppm, any case) in name order, not
// descending; any other path as it is. Throws ImageError if a directory can't
// be listed.
std::vector<std::string> imageFiles(const std::string& path);

// Reads and decodes; errors name the file.
Image loadImage(const std::string& path);

// Ensures: a gray image of the same size (ITU-R BT.601 luma, rounded).
Image toGray(const Image& image);

// Encodes as PNG; throws ImageError if the image is malformed.
std::vector<std::uint8_t> encodePng(const Image& image);

// Writes an image as PNG; throws ImageError if the file cannot be written.
void savePng(const Image& image, const std::string& path);

}  // namespace qcli

#endif
