#ifndef QUORIN_APPS_OPTIONS_H
#define QUORIN_APPS_OPTIONS_H

#include <stdexcept>
#include <string>
#include <vector>

namespace qcli {

struct UsageError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

struct Options {
  bool help = false;
  int mode = -1;  // -1: 2 for images, 1 for a raw stream
  int rotation = 0;
  bool rotationGiven = false;
  bool scaled = false;
  bool search360 = false;
  int maxFaces = 100;
  std::string annotatePath;
  bool raw = false;
  int rawWidth = 0;
  int rawHeight = 0;
  bool annotateRaw = false;
  std::string jsonPath;
  std::string jvwPath;
  int tracker = 0;  // 1..4: --tracker, the raw path through FaceDetector; 0: the C API
  int minFace = 0;  // --min-face: smallest face for the full-resolution photo path; 0: the C API
  std::vector<std::string> images;

  int effectiveMode() const { return mode >= 0 ? mode : (raw ? 1 : 2); }
};

// Requires: the arguments after the program name.
// Ensures: a consistent set of options, or UsageError saying what is wrong.
Options parseOptions(const std::vector<std::string>& args);

// Parses "WxH" with both sides in 1..maxSide; throws UsageError otherwise.
void parseFrameSize(const std::string& text, int maxSide, int& width, int& height);

// "simple", "kf", "pf", "cpf" to the tracking modes 1..4; 0 for anything else.
int trackerModeFromName(const std::string& name);

std::string usageText();

}  // namespace qcli

#endif
