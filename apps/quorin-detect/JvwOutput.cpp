#include "JvwOutput.h"

#include <climits>
#include <exception>

#include "core/FaceData.h"
#include "quorin/JvwFile.h"

namespace qcli {
namespace {

int32_t toInt32(long long v) {
  if (v < INT32_MIN) return INT32_MIN;
  if (v > INT32_MAX) return INT32_MAX;
  return static_cast<int32_t>(v);
}

Point2<float> toPoint(const Point& p) { return Point2<float>(static_cast<float>(p.x), static_cast<float>(p.y)); }

}  // namespace

JvwOutput::JvwOutput(const std::string& path) : path_(path) {
  try {
    writer_ = std::make_unique<JvwWriter>(path);
  } catch (const std::exception& e) {
    throw JvwOutputError("cannot write '" + path + "': " + e.what());
  }
}

JvwOutput::~JvwOutput() = default;

bool JvwOutput::add(const std::string& source, const std::vector<Face>& facesInPixels) {
  std::vector<FaceData> records;
  for (const Face& f : facesInPixels) {
    FaceData d;
    d.setFilePath(source);
    d.setFaceRect(Rect2<int32_t>(toInt32(f.left), toInt32(f.top), toInt32(f.right), toInt32(f.bottom)));
    d.setLandmark("leftEye", toPoint(f.leftEye));
    d.setLandmark("rightEye", toPoint(f.rightEye));
    d.setLandmark("nose", toPoint(f.nose));
    d.setLandmark("leftMouthCorner", toPoint(f.leftMouthCorner));
    d.setLandmark("rightMouthCorner", toPoint(f.rightMouthCorner));
    records.push_back(d);
  }
  if (!records.empty()) {
    // The name is the only free text in the record: check that it survives.
    const std::string text = records.front().toJson();
    if (text.find('\n') != std::string::npos) return false;
    try {
      FaceData back;
      back.fromJson(text);
      if (back.toJson() != text) return false;
    } catch (const std::exception&) {
      return false;
    }
  }
  faces_.insert(faces_.end(), records.begin(), records.end());
  return true;
}

void JvwOutput::finish() {
  try {
    writer_->writeFaces(faces_);
  } catch (const std::exception& e) {
    throw JvwOutputError("cannot write '" + path_ + "': " + e.what());
  }
}

}  // namespace qcli
