#include "PhotoSession.h"

#include <algorithm>
#include <cmath>
#include <regex>
#include <string>

#include "ImageIo.h"
#include "TrackerSession.h"
#include "quorin/FaceModelPathsHandle.h"

namespace qcli {
namespace {

// `object` with the integer member `key` set to `value` (added if absent).
std::string withMember(const std::string& object, const std::string& key, int value) {
  const std::string member = "\"" + key + "\":" + std::to_string(value);
  const std::regex present("\"" + key + "\"\\s*:\\s*-?[0-9]+");
  if (std::regex_search(object, present)) return std::regex_replace(object, present, member);
  return "{" + member + (object.size() > 2 ? "," : "") + object.substr(1);
}

// The built-in configuration with the detector's bounds opened for photos:
// any side up to kMaxImageSide, faces from minFace up.
FaceModelPathsHandle photoConfiguration(int minFace) {
  FaceModelPathsHandle handle;
  std::string text = handle.toJson();
  const std::string detector = jsonObjectMember(text, "detector");
  if (detector.empty()) throw EngineError("the built-in configuration has no detector entry");
  std::string opened = withMember(detector, "imageMaxSize", kMaxImageSide);
  opened = withMember(opened, "faceMinSize", minFace);
  opened = withMember(opened, "faceMaxSize", PhotoSession::kMaxFaceSide);
  text.replace(text.find(detector), detector.size(), opened);
  handle.fromJson(text);
  return handle;
}

long long truncated(float v) { return static_cast<long long>(v); }

}  // namespace

PhotoSession::PhotoSession(int minFace) : minFace_(minFace) {
  guarded("cannot open the face detector", [&] {
    api_.init(photoConfiguration(minFace_));
    api_.setSearchStep(0.1f, 0.1f);
  });
}

FrameResult PhotoSession::detect(const std::vector<std::uint8_t>& frame, int width, int height) {
  if (width <= 0 || height <= 0 || frame.size() < static_cast<std::size_t>(width) * static_cast<std::size_t>(height))
    throw EngineError("frame holds fewer bytes than its size says");
  FrameResult result;
  const int shorter = std::min(width, height);
  if (shorter < minFace_) return result;
  std::vector<QVFace> faces = guarded("detection failed", [&] {
    api_.setFaceSizeRange(minFace_, std::min(shorter, kMaxFaceSide));
    DetectionRequest request;
    request.pixels = frame.data();
    request.width = width;
    request.height = height;
    return api_.detect(request);
  });
  std::stable_sort(faces.begin(), faces.end(),
                   [](const QVFace& a, const QVFace& b) { return a.faceScore() > b.faceScore(); });
  guarded("landmarks missing", [&] {
    for (const QVFace& f : faces) {
      const QVFaceRect r = f.faceRect();
      Face face;
      face.left = r.left;
      face.top = r.top;
      face.right = r.right;
      face.bottom = r.bottom;
      Point* points[] = {&face.leftEye, &face.rightEye, &face.nose, &face.leftMouthCorner, &face.rightMouthCorner};
      const char* names[] = {"leftEye", "rightEye", "nose", "leftMouthCorner", "rightMouthCorner"};
      for (int i = 0; i < 5; ++i) {
        const QVFacePoint p = f.landmark(names[i]);
        *points[i] = {truncated(p.x), truncated(p.y)};
      }
      // The roll of a result block: the eye line's angle, from the pixel values.
      face.roll = static_cast<int>(std::atan2(static_cast<double>(face.rightEye.y - face.leftEye.y),
                                              static_cast<double>(face.rightEye.x - face.leftEye.x)) *
                                   180.0 / 3.14159265);
      result.faces.push_back(face);
    }
  });
  return result;
}

}  // namespace qcli
