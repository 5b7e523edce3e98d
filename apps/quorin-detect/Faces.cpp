#include "Faces.h"

#include <algorithm>

namespace qcli {
namespace {

// Undoes a clockwise turn: p is in the turned frame, the result in the frame
// of size width x height before the turn.
Point unturn(Point p, int rotation, int width, int height) {
  switch (rotation) {
    case 90: return {p.y, height - 1 - p.x};
    case 180: return {width - 1 - p.x, height - 1 - p.y};
    case 270: return {width - 1 - p.y, p.x};
    default: return p;
  }
}

long long unscale(long long v, int size) {
  // -1000..1000 spans the whole side; round half away from zero.
  long long num = (v + 1000) * size;
  return num >= 0 ? (num + 1000) / 2000 : -((-num + 1000) / 2000);
}

Point unscalePoint(Point p, int width, int height) { return {unscale(p.x, width), unscale(p.y, height)}; }

}  // namespace

Face faceFromBlock(const int* block) {
  Face f;
  f.roll = block[0];
  f.top = block[3];
  f.bottom = block[4];
  f.left = block[5];
  f.right = block[6];
  f.leftEye = {block[7], block[8]};
  f.rightEye = {block[9], block[10]};
  f.leftMouthCorner = {block[11], block[12]};
  f.rightMouthCorner = {block[13], block[14]};
  f.nose = {block[15], block[16]};
  return f;
}

Face toImagePixels(const Face& face, Coordinates coords, int rotation, int width, int height) {
  Face out = face;
  Point* outPoints[] = {&out.leftEye, &out.rightEye, &out.nose, &out.leftMouthCorner, &out.rightMouthCorner};
  if (coords == Coordinates::Scaled) {
    out.left = unscale(face.left, width);
    out.right = unscale(face.right, width);
    out.top = unscale(face.top, height);
    out.bottom = unscale(face.bottom, height);
    for (Point* p : outPoints) *p = unscalePoint(*p, width, height);
    return out;
  }
  // Right and bottom lie one past the last pixel: turn the last pixel, not the
  // border, so the box covers the same pixels after the turn.
  Point a = unturn({face.left, face.top}, rotation, width, height);
  Point b = unturn({face.right - 1, face.bottom - 1}, rotation, width, height);
  out.left = std::min(a.x, b.x);
  out.right = std::max(a.x, b.x) + 1;
  out.top = std::min(a.y, b.y);
  out.bottom = std::max(a.y, b.y) + 1;
  for (Point* p : outPoints) *p = unturn(*p, rotation, width, height);
  return out;
}

}  // namespace qcli
