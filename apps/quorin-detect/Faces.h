#ifndef QUORIN_APPS_FACES_H
#define QUORIN_APPS_FACES_H

#include <string>
#include <vector>

namespace qcli {

// Ints per face in the engine's result block, and the most it writes per call.
constexpr int kBlockInts = 17;
constexpr int kMaxFaces = 100;

struct Point {
  long long x = 0;
  long long y = 0;
};

// One reported face. Coordinates are 64-bit so that mapping values the engine
// wrote cannot overflow.
struct Face {
  int roll = 0;
  long long left = 0, top = 0, right = 0, bottom = 0;
  Point leftEye, rightEye, nose, leftMouthCorner, rightMouthCorner;
};

// What the coordinates of a block are measured in.
enum class Coordinates {
  Frame,   // pixels of the frame turned clockwise by the rotation
  Scaled,  // -1000..1000 on the axes of the frame as given
};

// Requires: block points at 17 ints in the engine's layout (roll, -, -, top,
// bottom, left, right, eyes, mouth corners, nose).
Face faceFromBlock(const int* block);

// Maps a face from engine coordinates to pixels of the width x height frame as
// it was handed in. rotation is 0, 90, 180 or 270 (used for Frame only).
Face toImagePixels(const Face& face, Coordinates coords, int rotation, int width, int height);

}  // namespace qcli

#endif
