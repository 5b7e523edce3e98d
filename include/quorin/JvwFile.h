#ifndef QUORIN_JVWFILE_H
#define QUORIN_JVWFILE_H

// JVW record files: a text file whose first line is "JVW@QV<TAB>VERSION=1",
// followed by one JSON record per line, {"obj":"FACE", "content":{...}} with the
// content the text form of FaceData. Blank lines and lines whose first
// non-blank character is '#' are skipped on reading. Each object writes or
// reads one file in one go. An object belongs to one thread.

#include <fstream>
#include <string>
#include <vector>

#include "quorin/export.h"

class FaceData;  // the face record; include its header to fill or read one

// Writes a face list. Its stream raises on failbit and badbit from construction.
class QUORIN_EXPORT JvwWriter : public std::ofstream {
public:
    // ensures: no file is open yet.
    JvwWriter();
    // ensures: as open(path).
    explicit JvwWriter(const std::string& path);

    // ensures: the file is created or truncated and holds line 1 with its line feed.
    // throws:  qv_data_error "QV JVW file open error" when the file can't be
    //          created or written.
    void open(const std::string& path);

    // requires: open succeeded and no writeFaces ran on this object before.
    // ensures:  one record line per face, in order, then the file is closed
    //           (also for an empty list). A text holding a line feed (the record
    //           codec has no escapes) breaks the file's line structure; it is
    //           not guarded here.
    // throws:   std::runtime_error "QV JVW file write error" on any failing
    //           write, close or serialization, including a second call.
    void writeFaces(const std::vector<FaceData>& faces);
};

// Reads a face list. Its stream stays quiet on failure.
class QUORIN_EXPORT JvwReader : public std::ifstream {
public:
    // ensures: no file is open yet.
    JvwReader();
    // ensures: as open(path).
    explicit JvwReader(const std::string& path);

    // ensures: the file is open and its first line, up to the first line feed,
    //          was exactly "JVW@QV\tVERSION=1" (no trimming: a trailing blank
    //          or carriage return is refused, and so is another version).
    // throws:  qv_data_error "Not a valid QV JVW file" for a missing, unreadable
    //          or empty file or a wrong first line.
    void open(const std::string& path);

    // requires: open succeeded.
    // ensures:  the FACE records of the remaining lines in file order, after
    //           trimming white space at both ends of each line; lines of other
    //           record types (with a "content") are skipped; a last line
    //           without line feed counts; the file is closed.
    // throws:   the C string "QV JVW file reading error" (a const char*, not an
    //           exception object) when any line is bad: not an object, no "obj"
    //           string, no "content", or a content that isn't a face record.
    //           No record is returned then.
    std::vector<FaceData> readFaces();
};

#endif
