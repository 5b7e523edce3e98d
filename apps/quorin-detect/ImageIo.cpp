#include "ImageIo.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <limits>
#include <memory>

#include <stb_image.h>
#include <stb_image_write.h>

namespace qcli {
namespace {

struct FileCloser {
  void operator()(std::FILE* f) const { std::fclose(f); }
};
using FilePtr = std::unique_ptr<std::FILE, FileCloser>;

std::string systemReason() { return std::strerror(errno); }

void appendBytes(void* context, void* data, int size) {
  auto* out = static_cast<std::vector<std::uint8_t>*>(context);
  const auto* p = static_cast<const std::uint8_t*>(data);
  out->insert(out->end(), p, p + size);
}

}  // namespace

std::vector<std::uint8_t> readFileBytes(const std::string& path) {
  FilePtr f(std::fopen(path.c_str(), "rb"));
  if (!f) throw ImageError("cannot open '" + path + "': " + systemReason());
  std::vector<std::uint8_t> bytes;
  std::uint8_t chunk[65536];
  for (;;) {
    std::size_t n = std::fread(chunk, 1, sizeof chunk, f.get());
    if (n > 0) {
      if (bytes.size() + n > kMaxFileBytes)
        throw ImageError("'" + path + "' is larger than " + std::to_string(kMaxFileBytes >> 20) + " MiB");
      bytes.insert(bytes.end(), chunk, chunk + n);
    }
    if (n < sizeof chunk) break;
  }
  if (std::ferror(f.get())) throw ImageError("cannot read '" + path + "': " + systemReason());
  return bytes;
}

Image decodeImage(const std::vector<std::uint8_t>& bytes) {
  if (bytes.empty()) throw ImageError("empty file");
  if (bytes.size() > static_cast<std::size_t>(std::numeric_limits<int>::max()))
    throw ImageError("file too large to decode");
  int w = 0, h = 0, channelsInFile = 0;
  const int len = static_cast<int>(bytes.size());
  // Check the header first: a corrupt size must be refused before any pixel
  // memory is asked for.
  if (!stbi_info_from_memory(bytes.data(), len, &w, &h, &channelsInFile))
    throw ImageError(std::string("not a readable JPEG, PNG or PGM image (") + stbi_failure_reason() + ")");
  if (w <= 0 || h <= 0 || w > kMaxImageSide || h > kMaxImageSide)
    throw ImageError("image size " + std::to_string(w) + "x" + std::to_string(h) + " is out of range (1.." +
                     std::to_string(kMaxImageSide) + " per side)");
  if (static_cast<long long>(w) * h > kMaxImagePixels)
    throw ImageError("image size " + std::to_string(w) + "x" + std::to_string(h) + " has more than " +
                     std::to_string(kMaxImagePixels >> 20) + " Mpixel");
  std::unique_ptr<stbi_uc, void (*)(void*)> data(stbi_load_from_memory(bytes.data(), len, &w, &h, &channelsInFile, 3),
                                                  stbi_image_free);
  if (!data) throw ImageError(std::string("cannot decode image (") + stbi_failure_reason() + ")");
  Image image;
  image.width = w;
  image.height = h;
  image.channels = 3;
  image.pixels.assign(data.get(), data.get() + static_cast<std::size_t>(w) * h * 3);
  return image;
}

Image loadImage(const std::string& path) {
  std::vector<std::uint8_t> bytes = readFileBytes(path);
  try {
    return decodeImage(bytes);
  } catch (const ImageError& e) {
    throw ImageError("'" + path + "': " + e.what());
  }
}

std::vector<std::string> imageFiles(const std::string& path) {
  namespace fs = std::filesystem;
  std::error_code ec;
  if (!fs::is_directory(path, ec)) return {path};
  std::vector<std::string> files;
  for (fs::directory_iterator it(path, ec), end; !ec && it != end; it.increment(ec)) {
    std::string ext = it->path().extension().string();
    for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    if ((ext == ".jpg" || ext == ".jpeg" || ext == ".png" || ext == ".pgm" || ext == ".ppm") && it->is_regular_file(ec))
      files.push_back(it->path().string());
  }
  if (ec) throw ImageError("cannot list '" + path + "': " + ec.message());
  std::sort(files.begin(), files.end());
  return files;
}

Image toGray(const Image& image) {
  if (image.channels == 1) return image;
  Image gray;
  gray.width = image.width;
  gray.height = image.height;
  gray.channels = 1;
  const std::size_t n = static_cast<std::size_t>(image.width) * image.height;
  if (image.channels != 3 || image.pixels.size() != n * 3) throw ImageError("malformed RGB image");
  gray.pixels.resize(n);
  const std::uint8_t* p = image.pixels.data();
  for (std::size_t i = 0; i < n; ++i, p += 3)
    gray.pixels[i] = static_cast<std::uint8_t>((299u * p[0] + 587u * p[1] + 114u * p[2] + 500u) / 1000u);
  return gray;
}

std::vector<std::uint8_t> encodePng(const Image& image) {
  const std::size_t n = static_cast<std::size_t>(image.width) * image.height * image.channels;
  if (image.width <= 0 || image.height <= 0 || (image.channels != 1 && image.channels != 3) ||
      image.pixels.size() != n)
    throw ImageError("malformed image for PNG output");
  std::vector<std::uint8_t> png;
  if (!stbi_write_png_to_func(appendBytes, &png, image.width, image.height, image.channels, image.pixels.data(),
                              image.width * image.channels))
    throw ImageError("PNG encoding failed");
  return png;
}

void savePng(const Image& image, const std::string& path) {
  std::vector<std::uint8_t> png = encodePng(image);
  FilePtr f(std::fopen(path.c_str(), "wb"));
  if (!f) throw ImageError("cannot write '" + path + "': " + systemReason());
  if (std::fwrite(png.data(), 1, png.size(), f.get()) != png.size() || std::fflush(f.get()) != 0)
    throw ImageError("cannot write '" + path + "': " + systemReason());
}

}  // namespace qcli
