#ifndef QUORIN_APPS_ENGINE_H
#define QUORIN_APPS_ENGINE_H

#include <cstdint>
#include <exception>
#include <stdexcept>
#include <string>
#include <vector>

#include "Faces.h"
#include "Options.h"

namespace qcli {

struct EngineError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// Runs an engine call, turning whatever it throws into EngineError.
template <typename F>
auto guarded(const char* what, F&& call) -> decltype(call()) {
  try {
    return call();
  } catch (const std::exception& e) {
    throw EngineError(std::string(what) + ": " + e.what());
  } catch (const char* text) {
    throw EngineError(std::string(what) + ": " + (text ? text : "(no message)"));
  } catch (...) {
    throw EngineError(std::string(what) + ": unknown failure");
  }
}

// The detect entry point the options select.
enum class Entry {
  Detect,
  DetectScaled,
  Detect360High,
  Detect360HighScaled,
  Detect360Tracking,
  Detect360TrackingScaledOrnt,
};

Entry chooseEntry(const Options& options);
const char* entryName(Entry entry);
Coordinates entryCoordinates(Entry entry);

struct FrameResult {
  std::vector<Face> faces;  // in the entry's coordinates, best first
  int orientation = -1;     // rotation in use, where the entry reports it
  bool orientationReported = false;
};

// The process's one engine session, open from construction to destruction.
// Engine failures (C++ exceptions of any kind) become EngineError.
class EngineSession {
 public:
  explicit EngineSession(const Options& options);
  ~EngineSession();
  EngineSession(const EngineSession&) = delete;
  EngineSession& operator=(const EngineSession&) = delete;

  // Requires: frame holds width*height gray bytes; the engine may overwrite
  // them. Throws EngineError if the frame cannot be handed to the engine or
  // the engine fails.
  FrameResult detect(std::vector<std::uint8_t>& frame, int width, int height);

  Entry entry() const { return entry_; }

 private:
  Options options_;
  Entry entry_;
  std::vector<int> blocks_;
};

// Why the engine cannot take a width x height frame, or empty if it can.
std::string frameProblem(const Options& options, int width, int height);

}  // namespace qcli

#endif
