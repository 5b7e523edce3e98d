#ifndef QUORIN_APPS_TRACKERSESSION_H
#define QUORIN_APPS_TRACKERSESSION_H

#include <cstdint>
#include <string>
#include <vector>

#include "Engine.h"
#include "quorin/FaceData.h"
#include "quorin/FaceDetector.h"

namespace qcli {

// The raw-video path with a tracker of the user's choice: the exported
// FaceDetector class on the library's built-in detector configuration, fed the
// way the tracking mode of the C API feeds it (long side shrunk to 320 by
// nearest neighbour, search step 0.15, faces from max(32, shorter side / 8) to
// the shorter side). Faces carry rectangles only: landmarks are the C API's.
class TrackerSession {
 public:
  // Requires: tracking mode 1 (simple), 2 (Kalman), 3 (particle) or 4
  // (cascade particle). Throws EngineError if the detector can't be built.
  explicit TrackerSession(QVFaceTrackingMode mode);
  TrackerSession(const TrackerSession&) = delete;
  TrackerSession& operator=(const TrackerSession&) = delete;

  // Requires: frame holds width*height gray bytes, rotation 0.
  // Ensures: the faces in pixels of the frame, best score first.
  // Throws EngineError if the engine fails.
  FrameResult detect(const std::vector<std::uint8_t>& frame, int width, int height);

 private:
  FaceDetector detector_;
  std::vector<std::uint8_t> work_;
  std::vector<FaceData> faces_;
};

// The raw text of the first member named `key` whose value is a JSON object,
// searched at any depth; empty if there is none. Strings are skipped whole, so
// braces inside them don't count.
std::string jsonObjectMember(const std::string& text, const std::string& key);

}  // namespace qcli

#endif
