#include "Progress.h"

#include <cstdio>

#include <unistd.h>

namespace qcli {

Progress::Progress(const char* unit, long total)
    : unit_(unit), total_(total), enabled_(isatty(STDERR_FILENO) == 1), last_(Clock::now()) {}

void Progress::step(long done, std::size_t faces, double engineMs) {
  if (!enabled_) return;
  auto now = Clock::now();
  if (now - last_ < std::chrono::milliseconds(200)) return;
  last_ = now;
  show(done, faces, engineMs);
}

void Progress::finish(long done, std::size_t faces, double engineMs) {
  if (!enabled_) return;
  show(done, faces, engineMs);
  std::fputc('\n', stderr);
}

void Progress::show(long done, std::size_t faces, double engineMs) {
  char count[48];
  if (total_ > 0) std::snprintf(count, sizeof count, "%ld/%ld", done, total_);
  else std::snprintf(count, sizeof count, "%ld", done);
  std::fprintf(stderr, "\r%s %s  faces %zu  %.2f ms/%s   ", unit_, count, faces,
               done > 0 ? engineMs / static_cast<double>(done) : 0.0, unit_);
  std::fflush(stderr);
}

}  // namespace qcli
