#include "TrackerSession.h"

#include <algorithm>
#include <exception>

#include "quorin/FaceModelPathsHandle.h"

namespace qcli {
namespace {

constexpr int kTrackingTarget = 320;  // long side of the tracking mode's work frame
constexpr float kTrackingStep = 0.15f;

// Index one past the string that starts at the quote at `i`, or npos.
std::size_t skipString(const std::string& text, std::size_t i) {
  for (++i; i < text.size(); ++i) {
    if (text[i] == '\\') ++i;
    else if (text[i] == '"') return i + 1;
  }
  return std::string::npos;
}

// Index one past the object that starts at the brace at `i`, or npos.
std::size_t skipObject(const std::string& text, std::size_t i) {
  int depth = 0;
  while (i < text.size()) {
    const char c = text[i];
    if (c == '"') {
      i = skipString(text, i);
      if (i == std::string::npos) return i;
      continue;
    }
    if (c == '{') ++depth;
    if (c == '}' && --depth == 0) return i + 1;
    ++i;
  }
  return std::string::npos;
}

}  // namespace

std::string jsonObjectMember(const std::string& text, const std::string& key) {
  const std::string quoted = "\"" + key + "\"";
  std::size_t i = 0;
  while (i < text.size()) {
    if (text[i] != '"') {
      ++i;
      continue;
    }
    const std::size_t end = skipString(text, i);
    if (end == std::string::npos) return "";
    const bool named = text.compare(i, end - i, quoted) == 0;
    i = end;
    if (!named) continue;
    std::size_t j = text.find_first_not_of(" \t\r\n", i);
    if (j == std::string::npos || text[j] != ':') continue;
    j = text.find_first_not_of(" \t\r\n", j + 1);
    if (j == std::string::npos || text[j] != '{') continue;
    const std::size_t close = skipObject(text, j);
    if (close == std::string::npos) return "";
    return text.substr(j, close - j);
  }
  return "";
}

TrackerSession::TrackerSession(QVFaceTrackingMode mode) {
  guarded("cannot open the face detector", [&] {
    const std::string configuration = jsonObjectMember(FaceModelPathsHandle().toJson(), "faceRects");
    if (configuration.empty()) throw EngineError("the built-in configuration has no detector entry");
    detector_.init(configuration);
    detector_.setSearchStep(kTrackingStep, kTrackingStep);
    detector_.setTrackingMode(mode);
  });
}

FrameResult TrackerSession::detect(const std::vector<std::uint8_t>& frame, int width, int height) {
  if (width <= 0 || height <= 0 || frame.size() < static_cast<std::size_t>(width) * static_cast<std::size_t>(height))
    throw EngineError("frame holds fewer bytes than its size says");
  // The same shrink as the C API's tracking mode.
  const float scale = static_cast<float>(kTrackingTarget) / static_cast<float>(std::max(width, height));
  int w = width, h = height;
  const std::uint8_t* pixels = frame.data();
  if (scale < 1.0f) {
    w = std::max(1, static_cast<int>(scale * static_cast<float>(width)));
    h = std::max(1, static_cast<int>(scale * static_cast<float>(height)));
    work_.resize(static_cast<std::size_t>(w) * static_cast<std::size_t>(h));
    for (int y = 0; y < h; ++y) {
      const std::size_t row = static_cast<std::size_t>(static_cast<long long>(y) * height / h) * width;
      for (int x = 0; x < w; ++x)
        work_[static_cast<std::size_t>(y) * w + x] = frame[row + static_cast<std::size_t>(static_cast<long long>(x) * width / w)];
    }
    pixels = work_.data();
  }
  const int shorter = std::min(w, h);
  guarded("detection failed", [&] {
    detector_.setFaceSizeRange(std::max(32, shorter / 8), shorter);
    detector_.detect(pixels, w, h, faces_);
  });

  std::vector<const FaceData*> order;
  for (const FaceData& f : faces_) order.push_back(&f);
  std::stable_sort(order.begin(), order.end(),
                   [](const FaceData* a, const FaceData* b) { return a->faceScore() > b->faceScore(); });
  FrameResult result;
  const double sx = static_cast<double>(width) / w, sy = static_cast<double>(height) / h;
  for (const FaceData* f : order) {
    const Rect2<int32_t>& r = f->faceRect();
    Face face;
    face.left = static_cast<long long>(r.left * sx);
    face.right = static_cast<long long>(r.right * sx);
    face.top = static_cast<long long>(r.top * sy);
    face.bottom = static_cast<long long>(r.bottom * sy);
    result.faces.push_back(face);
  }
  return result;
}

}  // namespace qcli
