#ifndef QUORIN_APPS_PHOTOSESSION_H
#define QUORIN_APPS_PHOTOSESSION_H

#include <cstdint>
#include <vector>

#include "Engine.h"
#include "quorin/FaceDetectionApi.h"

namespace qcli {

// --min-face: the exported FaceDetectionApi (cascade, post filter, landmarks)
// on the photo at its full resolution, with faces from minFace pixels to the
// photo's shorter side (at most kMaxFaceSide, the cascade's largest scale),
// at the thorough mode's search step. The C entries instead shrink the photo to
// their work frame and search faces from an eighth of its shorter side: right
// for camera frames, too coarse for small faces in a group photo.
class PhotoSession {
 public:
  static constexpr int kMinFaceSide = 24;    // the cascade's window
  static constexpr int kMaxFaceSide = 1000;  // covers the cascade's 17 scales

  // Requires: minFace >= kMinFaceSide. Throws EngineError if the detector
  // can't be built.
  explicit PhotoSession(int minFace);
  PhotoSession(const PhotoSession&) = delete;
  PhotoSession& operator=(const PhotoSession&) = delete;

  // Requires: frame holds width*height gray bytes, sides up to kMaxImageSide.
  // Ensures: the faces in pixels of the photo, best score first, landmarks
  // and roll as the C entries compute them. Throws EngineError.
  FrameResult detect(const std::vector<std::uint8_t>& frame, int width, int height);

 private:
  int minFace_;
  FaceDetectionApi api_;
};

}  // namespace qcli

#endif
