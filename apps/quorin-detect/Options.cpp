#include "Options.h"

#include <cerrno>
#include <cstdlib>

#include "ImageIo.h"

namespace qcli {
namespace {

bool parseInt(const std::string& text, long lo, long hi, int& out) {
  if (text.empty() || text.size() > 12) return false;
  const char* begin = text.c_str();
  if (*begin != '-' && (*begin < '0' || *begin > '9')) return false;
  char* end = nullptr;
  errno = 0;
  long v = std::strtol(begin, &end, 10);
  if (errno != 0 || *end != '\0' || v < lo || v > hi) return false;
  out = static_cast<int>(v);
  return true;
}

}  // namespace

void parseFrameSize(const std::string& text, int maxSide, int& width, int& height) {
  auto x = text.find_first_of("xX");
  if (x == std::string::npos || !parseInt(text.substr(0, x), 1, maxSide, width) ||
      !parseInt(text.substr(x + 1), 1, maxSide, height))
    throw UsageError("--raw wants WIDTHxHEIGHT with each side in 1.." + std::to_string(maxSide) + ", not '" + text +
                     "'");
}

int trackerModeFromName(const std::string& name) {
  const char* const names[] = {"simple", "kf", "pf", "cpf"};
  for (int i = 0; i < 4; ++i)
    if (name == names[i]) return i + 1;
  return 0;
}

Options parseOptions(const std::vector<std::string>& args) {
  Options o;
  bool modeGiven = false;
  for (std::size_t i = 0; i < args.size(); ++i) {
    std::string arg = args[i];
    std::string value;
    bool hasInline = false;
    if (arg.size() > 2 && arg.compare(0, 2, "--") == 0) {
      auto eq = arg.find('=');
      if (eq != std::string::npos) {
        value = arg.substr(eq + 1);
        arg = arg.substr(0, eq);
        hasInline = true;
      }
    }
    auto takeValue = [&]() -> std::string {
      if (hasInline) return value;
      if (i + 1 >= args.size()) throw UsageError(arg + " needs a value");
      return args[++i];
    };
    auto noValue = [&]() {
      if (hasInline) throw UsageError(arg + " takes no value");
    };
    if (arg == "-h" || arg == "--help") {
      o.help = true;
      return o;
    } else if (arg == "--mode") {
      std::string v = takeValue();
      if (!parseInt(v, 0, 2, o.mode)) throw UsageError("--mode wants 0, 1 or 2, not '" + v + "'");
      modeGiven = true;
    } else if (arg == "--rotation") {
      std::string v = takeValue();
      if (!parseInt(v, 0, 270, o.rotation) || o.rotation % 90 != 0)
        throw UsageError("--rotation wants 0, 90, 180 or 270, not '" + v + "'");
      o.rotationGiven = true;
    } else if (arg == "--scaled") {
      noValue();
      o.scaled = true;
    } else if (arg == "--360") {
      noValue();
      o.search360 = true;
    } else if (arg == "--max-faces") {
      std::string v = takeValue();
      if (!parseInt(v, 1, 100, o.maxFaces)) throw UsageError("--max-faces wants 1..100, not '" + v + "'");
    } else if (arg == "--annotate") {
      o.annotatePath = takeValue();
      if (o.annotatePath.empty()) throw UsageError("--annotate needs a file name");
    } else if (arg == "--raw") {
      parseFrameSize(takeValue(), kMaxImageSide, o.rawWidth, o.rawHeight);
      o.raw = true;
    } else if (arg == "--annotate-raw") {
      noValue();
      o.annotateRaw = true;
    } else if (arg == "--json") {
      o.jsonPath = takeValue();
      if (o.jsonPath.empty()) throw UsageError("--json needs a file name");
    } else if (arg == "--jvw") {
      o.jvwPath = takeValue();
      if (o.jvwPath.empty()) throw UsageError("--jvw needs a file name");
    } else if (arg == "--tracker") {
      std::string v = takeValue();
      o.tracker = trackerModeFromName(v);
      if (o.tracker == 0) throw UsageError("--tracker wants simple, kf, pf or cpf, not '" + v + "'");
    } else if (arg == "--min-face") {
      std::string v = takeValue();
      if (!parseInt(v, 24, kMaxImageSide, o.minFace))
        throw UsageError("--min-face wants a face side in pixels from 24 (the cascade's window) to " +
                         std::to_string(kMaxImageSide) + ", not '" + v + "'");
    } else if (arg == "--") {
      for (++i; i < args.size(); ++i) o.images.push_back(args[i]);
    } else if (arg.size() > 1 && arg[0] == '-') {
      throw UsageError("unknown option '" + arg + "'");
    } else {
      o.images.push_back(arg);
    }
  }

  if (o.raw && !o.images.empty()) throw UsageError("give either image files or --raw, not both");
  if (!o.raw && o.images.empty()) throw UsageError("no input: give image files, or --raw WxH with frames on stdin");
  if (o.raw && !o.annotatePath.empty()) throw UsageError("--annotate is for images; use --annotate-raw with --raw");
  if (o.annotateRaw && !o.raw) throw UsageError("--annotate-raw needs --raw");
  if (!o.annotatePath.empty() && o.images.size() != 1) throw UsageError("--annotate takes exactly one image");
  if (o.search360 && o.rotationGiven) throw UsageError("--360 searches the rotation itself; drop --rotation");
  if (o.search360 && modeGiven) throw UsageError("--360 chooses its own mode; drop --mode");
  if (o.search360 && !o.scaled && (o.annotateRaw || !o.annotatePath.empty()))
    throw UsageError("annotating with --360 needs --scaled (only scaled results are on the frame's own axes)");
  if (o.search360 && !o.scaled && !o.jvwPath.empty())
    throw UsageError("--jvw with --360 needs --scaled (only scaled results are on the frame's own axes)");
  if (o.tracker != 0 && !o.raw) throw UsageError("--tracker is for --raw streams");
  if (o.tracker != 0 && (o.search360 || o.scaled || modeGiven || o.rotation != 0))
    throw UsageError("--tracker runs the tracking mode on upright frames; drop --360, --scaled, --mode and --rotation");
  if (o.minFace != 0 && o.raw) throw UsageError("--min-face is for photos; --raw streams go through the C API");
  if (o.minFace != 0 && (o.search360 || o.scaled || modeGiven || o.rotationGiven))
    throw UsageError("--min-face searches the upright photo at full resolution; drop --360, --scaled, --mode and --rotation");
  if (!o.jvwPath.empty() && (o.jvwPath == o.jsonPath || o.jvwPath == o.annotatePath))
    throw UsageError("--jvw needs a file of its own");
  return o;
}

std::string usageText() {
  return R"(Usage: quorin-detect [OPTIONS] IMAGE|DIRECTORY...
       quorin-detect [OPTIONS] --raw WxH < frames

Finds faces with libquorinapi. Images (JPEG, PNG, binary PGM/PPM) are turned to
gray and detected one by one (a directory stands for the images in it, in
name order); each gives one JSON line on stdout:
  {"file":..,"width":..,"height":..,"entry":..,"coordinates":..,"faces":[
    {"rect":{"left","top","right","bottom"},
     "landmarks":{"leftEye":[x,y],"rightEye","nose","leftMouthCorner","rightMouthCorner"},
     "roll":degrees}]}
"coordinates" is "frame" (pixels of the frame turned by the rotation) or
"scaled" (-1000..1000 on the axes of the frame as given). Several images show
a progress line on stderr when it is a terminal.

With --raw WxH, stdin carries consecutive 8-bit gray frames of W*H bytes (as
`ffmpeg -i clip.mp4 -f rawvideo -pix_fmt gray -` writes them); the frames go
through the tracking mode one after the other, one JSON line per frame, and a
progress line goes to stderr when it is a terminal.

Options:
  --mode 0|1|2       0 fast (long side 240), 1 tracking (320), 2 high (640);
                     default 2 for images, 1 for --raw
  --rotation DEG     turn the frame clockwise by 0, 90, 180 or 270 first
  --scaled           report -1000..1000 on the frame's own axes
                     (quorin_detectScaled and the Scaled 360 entries)
  --360              let the engine find the rotation: images use
                     quorin_detect360High, --raw uses quorin_detect360Tracking;
                     with --scaled the Scaled entries, and the stream reports
                     the orientation found
  --tracker NAME     with --raw: follow faces with simple, kf (Kalman), pf
                     (particle) or cpf (cascade particle) through the library's
                     FaceDetector class instead of the C API (whose tracking
                     mode is Kalman); frames as the tracking mode takes them,
                     upright only; faces carry rectangles, landmarks are 0
  --min-face N       find faces from N pixels up (at least 24) on the photo at
                     full resolution, through the library's FaceDetectionApi
                     class (up to about 850 pixels), instead of the C API's
                     work frame and its smallest face of an eighth of the
                     work frame's shorter side; upright photos only, the
                     output names "entry":"FaceDetectionApi" and "minFace"
  --max-faces N      report at most N faces (1..100, default 100)
  --annotate OUT.png draw rectangles and landmarks onto the image (one image)
  --annotate-raw     with --raw: write the frames, annotated, to stdout
                     (JSON then only goes to --json FILE)
  --json FILE        write the JSON lines to FILE instead of stdout
  --jvw FILE         also write every face as a JVW record file: line 1
                     "JVW@QV<TAB>VERSION=1", then one {"obj":"FACE",
                     "content":{...}} line per face, with the rectangle and
                     landmarks in pixels of the image as given and the image's
                     name (or "frame N" for --raw) as filePath; the entry
                     points report no score, so faceScore keeps its default
  -h, --help         show this text

Exit status: 0 all inputs done, 1 an input or output failed (unreadable or
corrupt image, truncated stream, unwritable file), 2 bad usage, 3 the engine
failed.
)";
}

}  // namespace qcli
