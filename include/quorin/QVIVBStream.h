#ifndef QUORIN_QVIVBSTREAM_H
#define QUORIN_QVIVBSTREAM_H

// IVB streams: a 16-byte header
//     "IVB@QV" | version u16 = 1 | 4 reserved bytes | "II" | labelLength u16
// then labelLength bytes of free label, then records
//     nameLength u16 | tag u16 | name bytes | main part (one IVB object, whose
//     first 8 bytes are its own length)
// closed by the terminal record 00 00 FF FF. A record info with tag 0xFFFF ends
// the stream, whatever follows. All integers little-endian, no padding.
//
// Failures of the readers: a short read, wrong magic or wrong version raise
// qv_data_error "Not a valid QV IVB file". Over a file the stream's exceptions
// are on, so short reads surface first as std::ios_base::failure. After any
// failure a reader is only fit for destruction or a new bind/open.

#include <cstdint>
#include <fstream>
#include <ios>
#include <string>
#include <vector>

#include "quorin/QVIVBObject.h"
#include "quorin/export.h"

// A bounded, read-only byte stream with the four input-stream members the
// reader needs. It does not own the bytes.
class QUORIN_EXPORT MemoryStream {
public:
    // ensures: unbound: null pointers, eof set, good() false.
    MemoryStream();
    MemoryStream(const uint8_t* begin, const uint8_t* end) { bind(begin, end); }

    // ensures: reading starts at begin; eof is set (and every read fails) when
    //          begin lies above end.
    void bind(const uint8_t* begin, const uint8_t* end);

    // ensures: copies up to count bytes and advances by them; gcount() tells how
    //          many. A read that comes short sets eof; one ending exactly at the
    //          end does not.
    // throws:  std::ios_base::failure "Read beyong stream" when eof is already set
    //          (nothing is moved).
    void read(char* destination, unsigned int count);
    unsigned int gcount() const { return lastCount_; }

    // ensures: the cursor moves to offset from beg, end or (any other direction)
    //          the current position; eof is never touched.
    // throws:  std::ios_base::failure "Stream position out of range" for a
    //          position outside [begin, end]; the cursor stays.
    void seekg(long long offset, std::ios_base::seekdir direction);

    // ensures: true when bound and eof is not set.
    bool good() const;

private:
    const uint8_t* begin_;
    const uint8_t* end_;
    const uint8_t* cursor_;
    unsigned int lastCount_;
    bool eof_;
};

// Reads an IVB stream over Stream (MemoryStream or std::ifstream) with a
// one-record lookahead: from readHeader on, the next record's info is known.
// Instantiated for those two streams only.
template <typename Stream>
class QUORIN_EXPORT QVIVBStreamReader : public Stream {
public:
    QVIVBStreamReader() : nextNameLength_(0), nextTag_(0) {}

    // ensures: label() and the first record info are read.
    void readHeader();
    // ensures: the next record's nameLength and tag are read.
    void readNextObjectInfo();
    // ensures: nextName() holds the next record's name.
    void readNextObjectName();
    // ensures: the next main part is loaded, whole, into the reader's buffer.
    //          Memory grows with the bytes actually read, never with what a
    //          damaged length field claims.
    void readNextObjectMainPart();
    // ensures: the position is behind the next main part, without loading it.
    // throws:  qv_data_error "Not a valid QV IVB file" for a length that can't
    //          be a position (2^63 or more); the stream's seek errors.
    void skipNextObjectMainPart();

    // ensures: a copy of the next record's main part, or an empty vector at the
    //          end of the stream (as often as called) or on a stream not good().
    std::vector<uint8_t> readNextObject();
    // ensures: a copy of the main part of the first record named name, searching
    //          from the top every time; empty when there is none. Afterwards the
    //          lookahead stands behind the record found.
    std::vector<uint8_t> readNamedObject(const std::string& name);

    const std::string& label() const { return label_; }
    const std::string& nextName() const { return nextName_; }
    uint16_t nextNameLength() const { return nextNameLength_; }
    uint16_t nextTag() const { return nextTag_; }
    // ensures: true when the next record is the terminal record.
    bool atEnd() const { return nextTag_ == 0xFFFF; }

protected:
    void failIfShort(unsigned long long wanted);

    std::string label_;
    uint16_t nextNameLength_;
    uint16_t nextTag_;
    std::string nextName_;
    std::vector<uint8_t> buffer_;
};

class QUORIN_EXPORT QVIVBMemoryReader : public QVIVBStreamReader<MemoryStream> {
public:
    // ensures: unbound; readNextObject() gives empty vectors.
    QVIVBMemoryReader() {}
    // requires: the bytes outlive the reader.
    // ensures / throws: as bind.
    QVIVBMemoryReader(const uint8_t* begin, const uint8_t* end) { bind(begin, end); }
    // ensures: bound to [begin, end) with the header read.
    // throws:  qv_data_error "Not a valid QV IVB file"; std::ios_base::failure
    //          "Read beyong stream" for a label cut short or begin above end.
    void bind(const uint8_t* begin, const uint8_t* end);
};

class QUORIN_EXPORT QVIVBFileReader : public QVIVBStreamReader<std::ifstream> {
public:
    // ensures: closed, with the stream's exceptions on for failbit and badbit.
    QVIVBFileReader();
    // ensures / throws: as open.
    explicit QVIVBFileReader(const std::string& path);
    ~QVIVBFileReader();
    // ensures: the file is open for binary reading with its header read.
    // throws:  std::ios_base::failure when it can't be opened or is cut short;
    //          qv_data_error "Not a valid QV IVB file" for a wrong magic or version.
    void open(const std::string& path);
    void close() { release(); }
    // ensures: the file is closed, label and name empty, the reader at its end.
    void release();
};

class QUORIN_EXPORT QVIVBFileWriter : public std::ofstream {
public:
    // ensures: closed, with the stream's exceptions on for failbit and badbit.
    QVIVBFileWriter();
    explicit QVIVBFileWriter(const std::string& path);
    QVIVBFileWriter(const std::string& path, const std::string& label);
    ~QVIVBFileWriter();

    // ensures: the file (truncated) holds a header with label and a terminal
    //          record: a complete, empty stream.
    // throws:  std::ios_base::failure when the file can't be opened or written.
    void open(const std::string& path) { open(path, std::string()); }
    void open(const std::string& path, const std::string& label);

    // requires: data is a complete IVB object (a packer's data()); it is written
    //           unchecked. name and tag are cut to 16 bits in the record info.
    // ensures:  the record replaces the terminal record, and a new terminal
    //           record follows: the file is a complete stream after every call.
    // throws:   std::ios_base::failure when a write fails.
    void writeObject(const std::string& name, QVIVBObjectTag tag, const std::vector<uint8_t>& data);
    void writeObject(const std::string& name, const std::vector<uint8_t>& data) { writeObject(name, 0, data); }
    void writeObject(QVIVBObjectTag tag, const std::vector<uint8_t>& data) { writeObject(std::string(), tag, data); }
    void writeObject(const std::vector<uint8_t>& data) { writeObject(std::string(), 0, data); }
    // ensures: four terminal bytes are appended (a second terminal record is
    //          not removed by the next writeObject).
    void writeTerminal();

    // ensures: true when no error flag at all is set.
    bool good() const { return rdstate() == 0; }
    void close() { release(); }
    // ensures: the file is closed.
    // throws:  std::ios_base::failure when closing fails.
    void release();
};

extern template class QVIVBStreamReader<MemoryStream>;
extern template class QVIVBStreamReader<std::ifstream>;

#endif
