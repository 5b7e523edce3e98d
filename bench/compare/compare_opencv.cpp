// quorin-compare-opencv: times libquorinapi (through its public C API) against
// OpenCV's CascadeClassifier on the same gray frames, and counts the faces each
// finds. From a list of photos it makes frames at each requested long side (320,
// 640 and 1280 by default) and runs both in turn, our engine in mode 2; from a
// raw gray clip (consecutive W*H frames, as ffmpeg writes them) it runs our
// engine in tracking mode (1) frame after frame against OpenCV on every frame.
// OpenCV uses its own frontal cascade (ours is trained for our search grid), scaleFactor 1.25, minNeighbors 3 and the
// smallest and largest face size our engine derives for the frame, on one
// thread like ours. Prints a table: median ms per frame each, the ratio, faces
// found by each and how many of ours overlap one of OpenCV's (IoU >= 0.3).
// Given the teacher labels (one JSON line per image with face rectangles), it
// also counts for the photos how many labelled faces each finds (IoU >= 0.4,
// one box per face), so that speed is read beside recall.
// Deterministic apart from the timings.

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fstream>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <opencv2/objdetect.hpp>

#include "quorin/quorinapi.h"

namespace {

constexpr const char* kDefaultCascade = "/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml";
constexpr int kMaxFaces = 100;
constexpr int kBlockInts = 17;

// Wall time by default; with --cpu-time the calling thread's CPU time, which
// on a machine shared with other jobs leaves out the time the thread waited.
bool g_threadCpuTime = false;

struct Box {
  int left, top, right, bottom;
};

struct Args {
  std::string cascade = kDefaultCascade;
  std::vector<int> sizes = {320, 640, 1280};
  int repeats = 3;
  int cvThreads = 1;
  std::string labelsPath;
  std::string videoPath;
  int videoWidth = 0, videoHeight = 0;
  int videoFrames = 300;
  std::vector<std::string> photos;
};

void usage(std::FILE* to) {
  std::fputs(
      "Usage: quorin-compare-opencv [OPTIONS] PHOTO...\n"
      "Times libquorinapi against OpenCV's CascadeClassifier on the same frames.\n"
      "  --cascade XML       OpenCV cascade (default the frontal face cascade of opencv-data)\n"
      "  --sizes A,B,...     long sides the photos are resized to (default 320,640,1280)\n"
      "  --repeats N         runs per photo and detector; the fastest counts (default 3)\n"
      "  --video RAW         raw 8-bit gray frames for the tracking-mode row\n"
      "  --video-size WxH    size of those frames\n"
      "  --video-frames N    use at most N frames (default 300)\n"
      "  --cv-threads N      OpenCV threads (default 1, as our engine uses one; 0 keeps OpenCV's own default)\n"
      "  --cpu-time          time by the thread's CPU clock instead of the wall clock (needs --cv-threads 1)\n"
      "  --labels JSONL      teacher labels: adds recall columns for the photos\n"
      "  -h, --help          this text\n",
      to);
}

int toInt(const std::string& s, const char* what, long lowest = 1) {
  char* end = nullptr;
  long v = std::strtol(s.c_str(), &end, 10);
  if (s.empty() || *end != '\0' || v < lowest || v > 100000) throw std::invalid_argument(std::string("bad ") + what + ": " + s);
  return static_cast<int>(v);
}

Args parseArgs(int argc, char** argv) {
  Args a;
  for (int i = 1; i < argc; ++i) {
    std::string s = argv[i];
    auto value = [&]() -> std::string {
      if (i + 1 >= argc) throw std::invalid_argument(s + " needs a value");
      return argv[++i];
    };
    if (s == "-h" || s == "--help") {
      usage(stdout);
      std::exit(0);
    } else if (s == "--cascade") {
      a.cascade = value();
    } else if (s == "--sizes") {
      a.sizes.clear();
      std::string list = value();
      std::size_t p = 0;
      while (p <= list.size()) {
        std::size_t q = list.find(',', p);
        if (q == std::string::npos) q = list.size();
        a.sizes.push_back(toInt(list.substr(p, q - p), "size"));
        p = q + 1;
      }
    } else if (s == "--repeats") {
      a.repeats = toInt(value(), "repeat count");
    } else if (s == "--cv-threads") {
      a.cvThreads = toInt(value(), "thread count", 0);
    } else if (s == "--cpu-time") {
      g_threadCpuTime = true;
    } else if (s == "--labels") {
      a.labelsPath = value();
    } else if (s == "--video") {
      a.videoPath = value();
    } else if (s == "--video-size") {
      std::string v = value();
      auto x = v.find('x');
      if (x == std::string::npos) throw std::invalid_argument("--video-size wants WxH");
      a.videoWidth = toInt(v.substr(0, x), "width");
      a.videoHeight = toInt(v.substr(x + 1), "height");
    } else if (s == "--video-frames") {
      a.videoFrames = toInt(value(), "frame count");
    } else if (!s.empty() && s[0] == '-') {
      throw std::invalid_argument("unknown option " + s);
    } else {
      a.photos.push_back(s);
    }
  }
  if (!a.videoPath.empty() && (a.videoWidth == 0 || a.videoHeight == 0))
    throw std::invalid_argument("--video needs --video-size");
  // A mistyped size would otherwise reserve gigabytes for a frame the file can't fill.
  if (static_cast<long long>(a.videoWidth) * a.videoHeight > 8192LL * 8192LL)
    throw std::invalid_argument("--video-size is larger than 8192x8192 pixels");
  if (g_threadCpuTime && a.cvThreads != 1) throw std::invalid_argument("--cpu-time needs --cv-threads 1");
  if (a.photos.empty() && a.videoPath.empty()) throw std::invalid_argument("no photos and no video given");
  return a;
}

// The face size range our engine sets for a frame, in the frame's pixels: an
// eighth of the work frame's shorter side (at least 32), up to that side.
void engineFaceRange(int mode, int width, int height, int& minFace, int& maxFace) {
  const int target = mode == 0 ? 240 : mode == 1 ? 320 : 640;
  const float scale = static_cast<float>(target) / static_cast<float>(std::max(width, height));
  int w = width, h = height;
  if (scale < 1.0f) {
    w = static_cast<int>(scale * static_cast<float>(width));
    h = static_cast<int>(scale * static_cast<float>(height));
  }
  const int workShort = std::min(w, h);
  const float m = static_cast<float>(workShort) / 8.0f;
  const int workMin = m > 32.0f ? static_cast<int>(m) : 32;
  const double back = static_cast<double>(std::min(width, height)) / workShort;
  minFace = static_cast<int>(std::lround(workMin * back));
  maxFace = std::min(width, height);
}

struct Clock {
  using time_point = double;
  static double now() {
    if (g_threadCpuTime) {
      timespec t{};
      clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
      return static_cast<double>(t.tv_sec) * 1e3 + static_cast<double>(t.tv_nsec) * 1e-6;
    }
    return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now().time_since_epoch()).count();
  }
};
double msSince(Clock::time_point t0) { return Clock::now() - t0; }

std::vector<Box> runEngine(const cv::Mat& gray, std::vector<unsigned char>& work, double& ms) {
  work.assign(gray.data, gray.data + gray.total());
  std::vector<int> blocks(static_cast<std::size_t>(kMaxFaces) * kBlockInts);
  auto t0 = Clock::now();
  int n = quorin_detect(work.data(), gray.cols, gray.rows, blocks.data(), kMaxFaces, 0);
  ms = msSince(t0);
  n = std::clamp(n, 0, kMaxFaces);
  std::vector<Box> boxes;
  for (int k = 0; k < n; ++k) {
    const int* b = &blocks[static_cast<std::size_t>(k) * kBlockInts];
    boxes.push_back({b[5], b[3], b[6], b[4]});
  }
  return boxes;
}

std::vector<Box> runOpenCv(cv::CascadeClassifier& cc, const cv::Mat& gray, int mode, double& ms) {
  int minFace = 0, maxFace = 0;
  engineFaceRange(mode, gray.cols, gray.rows, minFace, maxFace);
  std::vector<cv::Rect> found;
  auto t0 = Clock::now();
  cc.detectMultiScale(gray, found, 1.25, 3, 0, cv::Size(minFace, minFace), cv::Size(maxFace, maxFace));
  ms = msSince(t0);
  std::vector<Box> boxes;
  for (const cv::Rect& r : found) boxes.push_back({r.x, r.y, r.x + r.width, r.y + r.height});
  return boxes;
}

double iou(const Box& a, const Box& b) {
  const double w = std::min(a.right, b.right) - std::max(a.left, b.left);
  const double h = std::min(a.bottom, b.bottom) - std::max(a.top, b.top);
  if (w <= 0 || h <= 0) return 0.0;
  const double inter = w * h;
  const double areaA = static_cast<double>(a.right - a.left) * (a.bottom - a.top);
  const double areaB = static_cast<double>(b.right - b.left) * (b.bottom - b.top);
  return inter / (areaA + areaB - inter);
}

// Greedy one-to-one matching by best overlap.
int matched(const std::vector<Box>& ours, const std::vector<Box>& theirs) {
  std::vector<bool> used(theirs.size(), false);
  int count = 0;
  for (const Box& o : ours) {
    int best = -1;
    double bestIou = 0.3;
    for (std::size_t j = 0; j < theirs.size(); ++j) {
      if (used[j]) continue;
      double v = iou(o, theirs[j]);
      if (v >= bestIou) {
        bestIou = v;
        best = static_cast<int>(j);
      }
    }
    if (best >= 0) {
      used[static_cast<std::size_t>(best)] = true;
      ++count;
    }
  }
  return count;
}

// Teacher rectangles by image file name (without folders), in the labelled
// image's pixels. Lines that don't parse are skipped: the labels only add
// columns, they never stop the timing.
using Labels = std::map<std::string, std::vector<std::array<double, 4>>>;

Labels readLabels(const std::string& path) {
  std::ifstream in(path);
  if (!in) throw std::runtime_error("cannot open labels " + path);
  Labels labels;
  std::string line;
  while (std::getline(in, line)) {
    const std::string key = "\"image\":\"";
    std::size_t p = line.find(key);
    if (p == std::string::npos) continue;
    p += key.size();
    const std::size_t q = line.find('"', p);
    if (q == std::string::npos) continue;
    std::string name = line.substr(p, q - p);
    const std::size_t slash = name.rfind('/');
    if (slash != std::string::npos) name = name.substr(slash + 1);
    std::vector<std::array<double, 4>> rects;
    bool ok = true;
    for (std::size_t r = line.find("\"rect\":[", q); ok && r != std::string::npos; r = line.find("\"rect\":[", r)) {
      const char* c = line.c_str() + r + 8;
      std::array<double, 4> v{};
      for (int k = 0; k < 4 && ok; ++k) {
        char* end = nullptr;
        v[static_cast<std::size_t>(k)] = std::strtod(c, &end);
        ok = end != c && (*end == (k < 3 ? ',' : ']'));
        c = end + 1;
      }
      if (ok) rects.push_back(v);
      r += 8;
    }
    if (ok) labels[name] = std::move(rects);
  }
  return labels;
}

std::string baseName(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

// Labelled faces found: one box per face, greedily by best overlap, IoU >= 0.4.
int labelledFound(const std::vector<Box>& truth, const std::vector<Box>& found) {
  struct Pair {
    double v;
    std::size_t t, f;
  };
  std::vector<Pair> pairs;
  for (std::size_t t = 0; t < truth.size(); ++t)
    for (std::size_t f = 0; f < found.size(); ++f) {
      const double v = iou(truth[t], found[f]);
      if (v >= 0.4) pairs.push_back({v, t, f});
    }
  std::stable_sort(pairs.begin(), pairs.end(), [](const Pair& a, const Pair& b) { return a.v > b.v; });
  std::vector<bool> usedT(truth.size(), false), usedF(found.size(), false);
  int n = 0;
  for (const Pair& p : pairs)
    if (!usedT[p.t] && !usedF[p.f]) {
      usedT[p.t] = usedF[p.f] = true;
      ++n;
    }
  return n;
}

double median(std::vector<double> v) {
  if (v.empty()) return 0.0;
  std::sort(v.begin(), v.end());
  const std::size_t n = v.size();
  return n % 2 ? v[n / 2] : 0.5 * (v[n / 2 - 1] + v[n / 2]);
}

struct Row {
  std::string name;
  std::size_t frames = 0;
  std::vector<double> oursMs, cvMs;
  long oursFaces = 0, cvFaces = 0, both = 0;
  long labelled = -1, oursLabelled = 0, cvLabelled = 0;  // -1: no labels for this row
};

void printRow(const Row& r) {
  const double o = median(r.oursMs), c = median(r.cvMs);
  std::printf("%-26s %7zu %10.2f %11.2f %7.1fx %11ld %13ld %8ld", r.name.c_str(), r.frames, o, c,
              o > 0 ? c / o : 0.0, r.oursFaces, r.cvFaces, r.both);
  if (r.labelled > 0)
    std::printf(" %9ld %11.1f%% %12.1f%%", r.labelled, 100.0 * r.oursLabelled / r.labelled,
                100.0 * r.cvLabelled / r.labelled);
  else if (r.labelled == 0)
    std::printf(" %9d %12s %13s", 0, "-", "-");
  std::printf("\n");
  std::fflush(stdout);
}

cv::Mat resizedLongSide(const cv::Mat& gray, int longSide) {
  const double f = static_cast<double>(longSide) / std::max(gray.cols, gray.rows);
  cv::Mat out;
  const int w = std::max(1, static_cast<int>(std::lround(gray.cols * f)));
  const int h = std::max(1, static_cast<int>(std::lround(gray.rows * f)));
  cv::resize(gray, out, cv::Size(w, h), 0, 0, f < 1.0 ? cv::INTER_AREA : cv::INTER_LINEAR);
  return out;
}

}  // namespace

int main(int argc, char** argv) {
  Args args;
  try {
    args = parseArgs(argc, argv);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "quorin-compare-opencv: %s\n", e.what());
    usage(stderr);
    return 2;
  }
  if (args.cvThreads > 0) cv::setNumThreads(args.cvThreads);
  cv::CascadeClassifier cascade;
  if (!cascade.load(args.cascade)) {
    std::fprintf(stderr, "quorin-compare-opencv: cannot load cascade %s\n", args.cascade.c_str());
    return 1;
  }
  std::vector<cv::Mat> photos;
  std::vector<std::string> photoNames;
  for (const std::string& p : args.photos) {
    cv::Mat g = cv::imread(p, cv::IMREAD_GRAYSCALE);
    if (g.empty()) {
      std::fprintf(stderr, "quorin-compare-opencv: skipping unreadable %s\n", p.c_str());
      continue;
    }
    photos.push_back(g);
    photoNames.push_back(baseName(p));
  }
  Labels labels;
  if (!args.labelsPath.empty()) {
    try {
      labels = readLabels(args.labelsPath);
    } catch (const std::exception& e) {
      std::fprintf(stderr, "quorin-compare-opencv: %s\n", e.what());
      return 1;
    }
  }
  const bool withLabels = !args.labelsPath.empty();

  try {
    quorin_init();
  } catch (const std::exception& e) {
    std::fprintf(stderr, "quorin-compare-opencv: engine initialisation failed: %s\n", e.what());
    return 3;
  }

  std::printf("%-26s %7s %10s %11s %8s %11s %13s %8s", "frames", "count", "ours ms", "opencv ms", "ratio",
              "ours faces", "opencv faces", "matched");
  if (withLabels) std::printf(" %9s %12s %13s", "labelled", "ours recall", "opencv recall");
  std::printf("\n");
  std::vector<unsigned char> work;
  int status = 0;
  try {
    if (!photos.empty()) {
      quorin_setDetectionMode(2);
      for (int side : args.sizes) {
        Row row;
        row.name = "photos " + std::to_string(side) + " (mode 2)";
        if (withLabels) row.labelled = 0;
        for (std::size_t k = 0; k < photos.size(); ++k) {
          const cv::Mat& photo = photos[k];
          cv::Mat frame = resizedLongSide(photo, side);
          double best = 1e300, bestCv = 1e300, ms = 0;
          std::vector<Box> ours, theirs;
          for (int r = 0; r < args.repeats; ++r) {
            ours = runEngine(frame, work, ms);
            best = std::min(best, ms);
            theirs = runOpenCv(cascade, frame, 2, ms);
            bestCv = std::min(bestCv, ms);
          }
          row.oursMs.push_back(best);
          row.cvMs.push_back(bestCv);
          row.oursFaces += static_cast<long>(ours.size());
          row.cvFaces += static_cast<long>(theirs.size());
          row.both += matched(ours, theirs);
          ++row.frames;
          const auto found = labels.find(photoNames[k]);
          if (found != labels.end()) {
            const double fx = static_cast<double>(frame.cols) / photo.cols;
            const double fy = static_cast<double>(frame.rows) / photo.rows;
            std::vector<Box> truth;
            for (const auto& r : found->second)
              truth.push_back({static_cast<int>(std::lround(r[0] * fx)), static_cast<int>(std::lround(r[1] * fy)),
                               static_cast<int>(std::lround(r[2] * fx)), static_cast<int>(std::lround(r[3] * fy))});
            row.labelled += static_cast<long>(truth.size());
            row.oursLabelled += labelledFound(truth, ours);
            row.cvLabelled += labelledFound(truth, theirs);
          }
        }
        printRow(row);
      }
    }
    if (!args.videoPath.empty()) {
      std::ifstream in(args.videoPath, std::ios::binary);
      if (!in) throw std::runtime_error("cannot open " + args.videoPath);
      const std::size_t frameBytes = static_cast<std::size_t>(args.videoWidth) * args.videoHeight;
      std::vector<cv::Mat> frames;
      for (int k = 0; k < args.videoFrames; ++k) {
        cv::Mat f(args.videoHeight, args.videoWidth, CV_8UC1);
        if (!in.read(reinterpret_cast<char*>(f.data), static_cast<std::streamsize>(frameBytes))) break;
        frames.push_back(f);
      }
      if (frames.empty()) throw std::runtime_error("no whole frame in " + args.videoPath);
      Row row;
      row.name = "video " + std::to_string(args.videoWidth) + "x" + std::to_string(args.videoHeight) + " (mode 1)";
      // Leave mode 1 and come back, so the tracker starts empty.
      quorin_setDetectionMode(2);
      quorin_setDetectionMode(1);
      double ms = 0;
      for (const cv::Mat& f : frames) {
        std::vector<Box> ours = runEngine(f, work, ms);
        row.oursMs.push_back(ms);
        std::vector<Box> theirs = runOpenCv(cascade, f, 1, ms);
        row.cvMs.push_back(ms);
        row.oursFaces += static_cast<long>(ours.size());
        row.cvFaces += static_cast<long>(theirs.size());
        row.both += matched(ours, theirs);
        ++row.frames;
      }
      printRow(row);
    }
  } catch (const std::exception& e) {
    std::fprintf(stderr, "quorin-compare-opencv: %s\n", e.what());
    status = 1;
  }
  quorin_release();
  std::printf(
      "\nours: libquorinapi through its C API, the whole pipeline (search, merge, post filter, landmarks);\n"
      "  it shrinks each frame to its work size first (long side <= 640 in mode 2, <= 320 in mode 1).\n"
      "opencv: CascadeClassifier::detectMultiScale on the frame as given, its frontal cascade,\n"
      "  scaleFactor 1.25, minNeighbors 3, minSize = the smallest face our engine searches there; %d thread%s%s.\n"
      "photos: per photo the fastest of %d runs each, median over photos; video: every frame once, median.\n"
      "matched: our faces overlapping one of OpenCV's (IoU >= 0.3)%s.\n",
      cv::getNumThreads(), cv::getNumThreads() == 1 ? "" : "s", args.cvThreads == 0 ? " (OpenCV's default)" : "",
      args.repeats, withLabels ? "; recall: labelled faces found, IoU >= 0.4" : "");
  return status;
}
