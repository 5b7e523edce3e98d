#ifndef QUORIN_APPS_JVWOUTPUT_H
#define QUORIN_APPS_JVWOUTPUT_H

#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "Faces.h"

class JvwWriter;
class FaceData;

namespace qcli {

struct JvwOutputError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// The --jvw record file: every face of the run as one FACE record, in pixels
// of the image (or frame) as given, with the source's name as filePath. The
// file's first line is written on opening; the records all at once at finish,
// as the writer takes one list per file.
class JvwOutput {
 public:
  // Throws JvwOutputError naming the file when it can't be created.
  explicit JvwOutput(const std::string& path);
  ~JvwOutput();
  JvwOutput(const JvwOutput&) = delete;
  JvwOutput& operator=(const JvwOutput&) = delete;

  // Queues the faces of one source. Returns false (and queues nothing) when
  // the source's name would not read back from a record: the record text has
  // no escapes, so quotes, brackets and line breaks can't be stored.
  bool add(const std::string& source, const std::vector<Face>& facesInPixels);

  // Writes the queued records and closes the file; throws JvwOutputError.
  void finish();


 private:
  std::string path_;
  std::unique_ptr<JvwWriter> writer_;
  std::vector<FaceData> faces_;
};

}  // namespace qcli

#endif
