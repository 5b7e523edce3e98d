#include "Json.h"

namespace qcli {
namespace {

void appendPoint(std::string& out, const char* name, const Point& p) {
  out += '"';
  out += name;
  out += "\":[" + std::to_string(p.x) + "," + std::to_string(p.y) + "]";
}

}  // namespace

std::string faceJson(const Face& f) {
  std::string out = "{\"rect\":{\"left\":" + std::to_string(f.left) + ",\"top\":" + std::to_string(f.top) +
                    ",\"right\":" + std::to_string(f.right) + ",\"bottom\":" + std::to_string(f.bottom) +
                    "},\"landmarks\":{";
  appendPoint(out, "leftEye", f.leftEye);
  out += ',';
  appendPoint(out, "rightEye", f.rightEye);
  out += ',';
  appendPoint(out, "nose", f.nose);
  out += ',';
  appendPoint(out, "leftMouthCorner", f.leftMouthCorner);
  out += ',';
  appendPoint(out, "rightMouthCorner", f.rightMouthCorner);
  out += "},\"roll\":" + std::to_string(f.roll) + "}";
  return out;
}

std::string facesJson(const std::vector<Face>& faces) {
  std::string out = "[";
  for (std::size_t i = 0; i < faces.size(); ++i) {
    if (i) out += ',';
    out += faceJson(faces[i]);
  }
  out += ']';
  return out;
}

}  // namespace qcli
