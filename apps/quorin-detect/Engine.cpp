#include "Engine.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "ImageIo.h"
#include "quorin/quorinapi.h"

namespace qcli {
namespace {

// Long-side targets of the detection modes.
constexpr int kModeTarget[3] = {240, 320, 640};

// The work frame the engine would make of width x height at a long-side target.
std::pair<long long, long long> workSize(int target, int width, int height) {
  const int longSide = std::max(width, height);
  const float scale = static_cast<float>(target) / static_cast<float>(longSide);
  if (scale >= 1.0f) return {width, height};
  return {static_cast<long long>(scale * static_cast<float>(width)),
          static_cast<long long>(scale * static_cast<float>(height))};
}

}  // namespace

Entry chooseEntry(const Options& o) {
  if (!o.search360) return o.scaled ? Entry::DetectScaled : Entry::Detect;
  if (o.raw) return o.scaled ? Entry::Detect360TrackingScaledOrnt : Entry::Detect360Tracking;
  return o.scaled ? Entry::Detect360HighScaled : Entry::Detect360High;
}

const char* entryName(Entry e) {
  switch (e) {
    case Entry::Detect: return "quorin_detect";
    case Entry::DetectScaled: return "quorin_detectScaled";
    case Entry::Detect360High: return "quorin_detect360High";
    case Entry::Detect360HighScaled: return "quorin_detect360HighScaled";
    case Entry::Detect360Tracking: return "quorin_detect360Tracking";
    case Entry::Detect360TrackingScaledOrnt: return "quorin_detect360TrackingScaled_ornt";
  }
  return "?";
}

Coordinates entryCoordinates(Entry e) {
  switch (e) {
    case Entry::DetectScaled:
    case Entry::Detect360HighScaled:
    case Entry::Detect360TrackingScaledOrnt: return Coordinates::Scaled;
    default: return Coordinates::Frame;
  }
}

std::string frameProblem(const Options& o, int width, int height) {
  const std::string size = std::to_string(width) + "x" + std::to_string(height);
  if (width <= 0 || height <= 0) return "frame size " + size + " is empty";
  if (static_cast<long long>(width) * height > kMaxImagePixels)
    return "frame size " + size + " has more than " + std::to_string(kMaxImagePixels >> 20) + " Mpixel";
  // The modes a call may pass through: the tracking search hops between 0 and
  // 1, the thorough search stays in 2.
  std::vector<int> modes;
  if (!o.search360) modes = {o.effectiveMode()};
  else if (o.raw) modes = {0, 1};
  else modes = {2};
  for (int m : modes) {
    auto [w, h] = workSize(kModeTarget[m], width, height);
    if (w < 1 || h < 1)
      return "frame size " + size + " is too elongated: mode " + std::to_string(m) + " would shrink it to " +
             std::to_string(w) + "x" + std::to_string(h);
  }
  return {};
}

EngineSession::EngineSession(const Options& options)
    : options_(options), entry_(chooseEntry(options)), blocks_(static_cast<std::size_t>(kMaxFaces) * kBlockInts, 0) {
  guarded("engine initialisation failed", [] { quorin_init(); });
  // The 360 entries pick their own modes.
  if (!options_.search360) {
    try {
      guarded("cannot set detection mode", [&] { quorin_setDetectionMode(static_cast<unsigned>(options_.effectiveMode())); });
    } catch (...) {
      quorin_release();
      throw;
    }
  }
}

EngineSession::~EngineSession() {
  try {
    quorin_release();
  } catch (...) {
    // Nothing sensible is left to do with a failure while closing.
  }
}

FrameResult EngineSession::detect(std::vector<std::uint8_t>& frame, int width, int height) {
  const std::string problem = frameProblem(options_, width, height);
  if (!problem.empty()) throw EngineError(problem);
  if (frame.size() < static_cast<std::size_t>(width) * static_cast<std::size_t>(height))
    throw EngineError("frame buffer is smaller than its size");
  std::fill(blocks_.begin(), blocks_.end(), 0);
  unsigned char* image = frame.data();
  int* out = blocks_.data();
  const int maxFaces = std::clamp(options_.maxFaces, 1, kMaxFaces);
  const int rotation = options_.rotation;
  FrameResult result;
  int orientation = -1;
  int n = guarded("detection failed", [&]() -> int {
    switch (entry_) {
      case Entry::Detect: return quorin_detect(image, width, height, out, maxFaces, rotation);
      case Entry::DetectScaled: return quorin_detectScaled(image, width, height, out, maxFaces, rotation);
      case Entry::Detect360High: return quorin_detect360High(image, width, height, out, maxFaces);
      case Entry::Detect360HighScaled: return quorin_detect360HighScaled(image, width, height, out, maxFaces);
      case Entry::Detect360Tracking: return quorin_detect360Tracking(image, width, height, out, maxFaces);
      case Entry::Detect360TrackingScaledOrnt:
        return quorin_detect360TrackingScaled_ornt(image, width, height, out, maxFaces, &orientation);
    }
    return 0;
  });
  if (entry_ == Entry::Detect360TrackingScaledOrnt) {
    result.orientation = orientation;
    result.orientationReported = true;
  }
  // Only as many blocks as were asked for are ever written.
  n = std::clamp(n, 0, maxFaces);
  result.faces.reserve(static_cast<std::size_t>(n));
  for (int k = 0; k < n; ++k) result.faces.push_back(faceFromBlock(out + k * kBlockInts));
  return result;
}

}  // namespace qcli
