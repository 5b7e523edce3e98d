#ifndef QUORIN_APPS_PROGRESS_H
#define QUORIN_APPS_PROGRESS_H

#include <chrono>
#include <cstddef>

namespace qcli {

// The progress line on stderr while a stream or a list of images runs, shown
// only when stderr is a terminal and redrawn at most five times a second.
class Progress {
 public:
  // `unit` names what is counted ("frame", "image"); total 0 when unknown.
  explicit Progress(const char* unit, long total = 0);
  // After `done` units; `faces` is what the caller reports (the last frame's,
  // or all so far), engineMs the engine's time over all of them.
  void step(long done, std::size_t faces, double engineMs);
  // Draws the final state and ends the line.
  void finish(long done, std::size_t faces, double engineMs);

 private:
  using Clock = std::chrono::steady_clock;
  void show(long done, std::size_t faces, double engineMs);
  const char* unit_;
  long total_;
  bool enabled_;
  Clock::time_point last_;
};

}  // namespace qcli

#endif
