#include "Annotate.h"

#include <algorithm>

namespace qcli {
namespace {

struct Colour {
  std::uint8_t r, g, b, gray;
};

constexpr Colour kBox{0, 230, 0, 255};
constexpr Colour kOutline{0, 0, 0, 0};
constexpr Colour kEye{255, 40, 40, 255};
constexpr Colour kNose{255, 220, 0, 255};
constexpr Colour kMouth{230, 0, 230, 255};

// Fills [x0, x1) x [y0, y1), clipped to the image.
void fill(Image& im, long long x0, long long y0, long long x1, long long y1, Colour c) {
  x0 = std::max(x0, 0LL);
  y0 = std::max(y0, 0LL);
  x1 = std::min(x1, static_cast<long long>(im.width));
  y1 = std::min(y1, static_cast<long long>(im.height));
  if (x0 >= x1 || y0 >= y1) return;
  const int ch = im.channels;
  for (long long y = y0; y < y1; ++y) {
    std::uint8_t* row = im.pixels.data() + (static_cast<std::size_t>(y) * im.width) * ch;
    for (long long x = x0; x < x1; ++x) {
      std::uint8_t* p = row + x * ch;
      if (ch == 1) {
        p[0] = c.gray;
      } else {
        p[0] = c.r;
        p[1] = c.g;
        p[2] = c.b;
      }
    }
  }
}

void frame(Image& im, long long l, long long t, long long r, long long b, long long w, Colour c) {
  fill(im, l, t, r, t + w, c);
  fill(im, l, b - w, r, b, c);
  fill(im, l, t, l + w, b, c);
  fill(im, r - w, t, r, b, c);
}

void mark(Image& im, Point p, long long radius, Colour c) {
  // A dark border keeps the mark visible on any background.
  fill(im, p.x - radius - 1, p.y - radius - 1, p.x + radius + 2, p.y + radius + 2, kOutline);
  fill(im, p.x - radius, p.y - radius, p.x + radius + 1, p.y + radius + 1, c);
}

}  // namespace

void drawFaces(Image& image, const std::vector<Face>& faces) {
  const std::size_t need = static_cast<std::size_t>(image.width) * image.height * image.channels;
  if (image.width <= 0 || image.height <= 0 || (image.channels != 1 && image.channels != 3) ||
      image.pixels.size() != need)
    throw ImageError("malformed image for annotation");
  const long long line = std::max(2, std::min(image.width, image.height) / 200);
  const long long radius = line + 1;
  for (const Face& f : faces) {
    long long l = std::min(f.left, f.right), r = std::max(f.left, f.right);
    long long t = std::min(f.top, f.bottom), b = std::max(f.top, f.bottom);
    frame(image, l - 1, t - 1, r + 1, b + 1, line + 2, kOutline);
    frame(image, l, t, r, b, line, kBox);
    mark(image, f.leftEye, radius, kEye);
    mark(image, f.rightEye, radius, kEye);
    mark(image, f.nose, radius, kNose);
    mark(image, f.leftMouthCorner, radius, kMouth);
    mark(image, f.rightMouthCorner, radius, kMouth);
  }
}

}  // namespace qcli
