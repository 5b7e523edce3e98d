// quorin-detect: finds faces in JPEG, PNG and PGM images, or in a stream of raw
// gray video frames on stdin, through the public C API of libquorinapi (or,
// with --tracker, its exported FaceDetector class), and
// prints one JSON line per image or frame. It can draw what it found onto the
// image (--annotate) or onto the frames it passes on (--annotate-raw). Run it
// with --help for the options and the output format.

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "Annotate.h"
#include "Engine.h"
#include "Faces.h"
#include "ImageIo.h"
#include "Json.h"
#include "JvwOutput.h"
#include "Options.h"
#include "PhotoSession.h"
#include "Progress.h"
#include "RawStream.h"
#include "TrackerSession.h"

namespace {

using namespace qcli;

enum Exit { kOk = 0, kInputFailed = 1, kUsage = 2, kEngineFailed = 3 };

void complain(const std::string& message) { std::fprintf(stderr, "quorin-detect: %s\n", message.c_str()); }

// Where the JSON lines go; null when they go nowhere (stdout carries frames).
struct JsonSink {
  std::FILE* file = nullptr;
  bool owned = false;
  bool failed = false;
  ~JsonSink() {
    if (owned) std::fclose(file);
  }
  void line(const std::string& text) {
    if (!file) return;
    if (std::fputs(text.c_str(), file) < 0 || std::fputc('\n', file) == EOF || std::fflush(file) != 0) failed = true;
  }
};

std::string frameFields(const Options& o, Entry entry) {
  if (o.minFace != 0) return ",\"entry\":\"FaceDetectionApi\",\"minFace\":" + std::to_string(o.minFace) + ",\"coordinates\":\"frame\"";
  std::string s = ",\"entry\":" + jsonString(entryName(entry));
  if (!o.search360) s += ",\"mode\":" + std::to_string(o.effectiveMode()) + ",\"rotation\":" + std::to_string(o.rotation);
  s += std::string(",\"coordinates\":") + (entryCoordinates(entry) == Coordinates::Scaled ? "\"scaled\"" : "\"frame\"");
  return s;
}

std::vector<Face> inImagePixels(const std::vector<Face>& faces, Entry entry, int rotation, int width, int height) {
  std::vector<Face> out;
  out.reserve(faces.size());
  for (const Face& f : faces) out.push_back(toImagePixels(f, entryCoordinates(entry), rotation, width, height));
  return out;
}

int worse(int a, int b) { return a > b ? a : b; }

int runImages(const Options& o, JsonSink& json, JvwOutput* jvw) {
  std::unique_ptr<EngineSession> engine;
  std::unique_ptr<PhotoSession> photos;  // --min-face: FaceDetectionApi on the full-resolution photo
  const Entry entry = chooseEntry(o);
  int status = kOk;
  std::vector<std::string> files;
  for (const std::string& arg : o.images) {
    try {
      std::vector<std::string> found = imageFiles(arg);
      if (found.empty()) throw ImageError("'" + arg + "' holds no images (.jpg, .jpeg, .png, .pgm, .ppm)");
      files.insert(files.end(), found.begin(), found.end());
    } catch (const ImageError& e) {
      complain(e.what());
      status = worse(status, kInputFailed);
    }
  }
  if (!o.annotatePath.empty() && files.size() != 1) {
    complain("--annotate takes exactly one image, and the arguments stand for " + std::to_string(files.size()));
    return kUsage;
  }
  Progress progress("image", static_cast<long>(files.size()));
  long done = 0;
  std::size_t facesSoFar = 0;
  double engineMs = 0.0;
  for (const std::string& path : files) {
    if (files.size() > 1) progress.step(done, facesSoFar, engineMs);
    ++done;
    auto fail = [&](const std::string& message, int code) {
      complain(message);
      json.line("{\"file\":" + jsonString(path) + ",\"error\":" + jsonString(message) + "}");
      status = worse(status, code);
    };
    Image colour;
    try {
      colour = loadImage(path);
    } catch (const ImageError& e) {
      fail(e.what(), kInputFailed);
      continue;
    }
    const std::string problem = frameProblem(o, colour.width, colour.height);
    if (!problem.empty()) {
      fail("'" + path + "': " + problem, kInputFailed);
      continue;
    }
    if (!engine && !photos) {
      try {
        if (o.minFace != 0)
          photos = std::make_unique<PhotoSession>(o.minFace);
        else
          engine = std::make_unique<EngineSession>(o);
      } catch (const EngineError& e) {
        progress.finish(done - 1, facesSoFar, engineMs);
        complain(e.what());
        return worse(status, kEngineFailed);
      }
    }
    FrameResult result;
    try {
      Image gray = toGray(colour);
      const auto t0 = std::chrono::steady_clock::now();
      if (photos) {
        result = photos->detect(gray.pixels, gray.width, gray.height);
        if (result.faces.size() > static_cast<std::size_t>(o.maxFaces)) result.faces.resize(o.maxFaces);
      } else {
        result = engine->detect(gray.pixels, gray.width, gray.height);
      }
      engineMs += std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - t0).count();
    } catch (const EngineError& e) {
      fail("'" + path + "': " + e.what(), kEngineFailed);
      continue;
    }
    facesSoFar += result.faces.size();
    json.line("{\"file\":" + jsonString(path) + ",\"width\":" + std::to_string(colour.width) +
              ",\"height\":" + std::to_string(colour.height) + frameFields(o, entry) +
              ",\"faces\":" + facesJson(result.faces) + "}");
    if (jvw && !jvw->add(path, inImagePixels(result.faces, entry, o.rotation, colour.width, colour.height))) {
      complain("'" + path + "': this name can't be stored in a JVW record; its faces are left out of --jvw");
      status = worse(status, kInputFailed);
    }
    if (!o.annotatePath.empty()) {
      try {
        drawFaces(colour, inImagePixels(result.faces, entry, o.rotation, colour.width, colour.height));
        savePng(colour, o.annotatePath);
      } catch (const ImageError& e) {
        complain(e.what());
        status = worse(status, kInputFailed);
      }
    }
  }
  if (files.size() > 1) progress.finish(done, facesSoFar, engineMs);
  return status;
}

int runRaw(const Options& o, JsonSink& json, JvwOutput* jvw) {
  const int width = o.rawWidth, height = o.rawHeight;
  const std::string problem = frameProblem(o, width, height);
  if (!problem.empty()) {
    complain(problem);
    return kInputFailed;
  }
  // The session opens with the first whole frame, so a wrong size or an empty
  // stream is reported without waiting for the models to load.
  std::unique_ptr<EngineSession> engine;
  std::unique_ptr<TrackerSession> tracked;  // --tracker: FaceDetector instead of the C API
  const Entry entry = chooseEntry(o);
  RawFrameReader reader(stdin, width, height);
  std::vector<std::uint8_t> frame, work;
  Image canvas;
  canvas.width = width;
  canvas.height = height;
  canvas.channels = 1;
  Progress progress("frame");
  long frames = 0;
  std::size_t lastFaces = 0;
  double engineMs = 0.0;
  for (;;) {
    RawFrameReader::Status st = reader.next(frame);
    if (st == RawFrameReader::Status::End) break;
    if (st == RawFrameReader::Status::Truncated) {
      progress.finish(frames, lastFaces, engineMs);
      complain("stream truncated: frame " + std::to_string(frames) + " has " + std::to_string(reader.partialBytes()) +
               " of " + std::to_string(reader.frameBytes()) + " bytes (is the size " + std::to_string(width) + "x" +
               std::to_string(height) + " right?)");
      return kInputFailed;
    }
    if (st == RawFrameReader::Status::Error) {
      progress.finish(frames, lastFaces, engineMs);
      complain(std::string("cannot read stdin: ") + std::strerror(errno));
      return kInputFailed;
    }
    work = frame;  // the engine may write its turned frame into what it gets
    FrameResult result;
    auto t0 = std::chrono::steady_clock::now();
    if (!engine && !tracked) {
      try {
        if (o.tracker != 0)
          tracked = std::make_unique<TrackerSession>(static_cast<QVFaceTrackingMode>(o.tracker));
        else
          engine = std::make_unique<EngineSession>(o);
      } catch (const EngineError& e) {
        complain(e.what());
        return kEngineFailed;
      }
    }
    try {
      if (tracked) {
        result = tracked->detect(work, width, height);
        if (result.faces.size() > static_cast<std::size_t>(o.maxFaces)) result.faces.resize(o.maxFaces);
      } else {
        result = engine->detect(work, width, height);
      }
    } catch (const EngineError& e) {
      progress.finish(frames, lastFaces, engineMs);
      complain("frame " + std::to_string(frames) + ": " + e.what());
      return kEngineFailed;
    }
    engineMs += std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - t0).count();
    std::string line = "{\"frame\":" + std::to_string(frames);
    if (result.orientationReported) line += ",\"orientation\":" + std::to_string(result.orientation);
    line += ",\"faces\":" + facesJson(result.faces) + "}";
    json.line(line);
    if (jvw) jvw->add("frame " + std::to_string(frames), inImagePixels(result.faces, entry, o.rotation, width, height));
    if (o.annotateRaw) {
      canvas.pixels.swap(frame);
      drawFaces(canvas, inImagePixels(result.faces, entry, o.rotation, width, height));
      if (std::fwrite(canvas.pixels.data(), 1, canvas.pixels.size(), stdout) != canvas.pixels.size() ||
          std::fflush(stdout) != 0) {
        progress.finish(frames, lastFaces, engineMs);
        complain(std::string("cannot write frames to stdout: ") + std::strerror(errno));
        return kInputFailed;
      }
      canvas.pixels.swap(frame);
    }
    if (json.failed) {
      progress.finish(frames, lastFaces, engineMs);
      complain("cannot write the JSON output");
      return kInputFailed;
    }
    ++frames;
    lastFaces = result.faces.size();
    progress.step(frames, lastFaces, engineMs);
  }
  progress.finish(frames, lastFaces, engineMs);
  if (frames == 0) {
    complain("no frames on stdin");
    return kInputFailed;
  }
  return kOk;
}

}  // namespace

int main(int argc, char** argv) {
  Options options;
  try {
    options = parseOptions(std::vector<std::string>(argv + 1, argv + argc));
  } catch (const UsageError& e) {
    complain(e.what());
    std::fprintf(stderr, "Try 'quorin-detect --help'.\n");
    return kUsage;
  }
  if (options.help) {
    std::fputs(usageText().c_str(), stdout);
    return kOk;
  }
  JsonSink json;
  if (!options.jsonPath.empty()) {
    json.file = std::fopen(options.jsonPath.c_str(), "w");
    if (!json.file) {
      complain("cannot write '" + options.jsonPath + "': " + std::strerror(errno));
      return kInputFailed;
    }
    json.owned = true;
  } else if (!options.annotateRaw) {
    json.file = stdout;
  }
  // Opened before any work, so that an unwritable file fails at once.
  std::unique_ptr<JvwOutput> jvw;
  if (!options.jvwPath.empty()) {
    try {
      jvw = std::make_unique<JvwOutput>(options.jvwPath);
    } catch (const JvwOutputError& e) {
      complain(e.what());
      return kInputFailed;
    }
  }
  int status = options.raw ? runRaw(options, json, jvw.get()) : runImages(options, json, jvw.get());
  if (jvw) {
    try {
      jvw->finish();
    } catch (const JvwOutputError& e) {
      complain(e.what());
      status = worse(status, kInputFailed);
    }
  }
  if (json.failed) {
    complain("cannot write the JSON output");
    status = worse(status, kInputFailed);
  }
  return status;
}
