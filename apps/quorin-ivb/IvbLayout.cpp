#include "IvbLayout.h"

#include <cmath>
#include <cstdio>
#include <cstring>

#include "JsonString.h"
#include "quorin/QVIVBObject.h"
#include "quorin/QVIVBStream.h"

namespace qivb {
namespace {

const char* const kTypeNames[] = {"none",  "void",         "bool",  "char",           "unsigned char",
                                  "signed char", "unsigned short", "short", "unsigned int", "int",
                                  "unsigned long long", "long long", "float", "double"};

// Char arrays up to this length are shown as text.
constexpr std::uint64_t kMaxShownText = 256;

std::uint64_t getU64(const std::uint8_t* p) {
  std::uint64_t v = 0;
  for (int i = 7; i >= 0; --i) v = (v << 8) | p[i];
  return v;
}

unsigned getU16(const std::uint8_t* p) { return static_cast<unsigned>(p[0] | (p[1] << 8)); }

[[noreturn]] void damage(std::uint64_t at, const std::string& what) {
  throw Damage("at byte " + std::to_string(at) + ": " + what);
}

std::string number(double v, int digits) {
  if (!std::isfinite(v)) return qcli::jsonString(std::isnan(v) ? "nan" : (v > 0 ? "inf" : "-inf"));
  char buf[40];
  std::snprintf(buf, sizeof buf, "%.*g", digits, v);
  return buf;
}

// The value of one element as a JSON number (types 2 to 13).
std::string scalarValue(unsigned type, const std::uint8_t* p) {
  std::uint64_t raw = 0;
  const unsigned size = storageSize(QVIVBObjectSubType(type));
  for (unsigned i = size; i-- > 0;) raw = (raw << 8) | p[i];
  switch (type) {
    case 5: return std::to_string(static_cast<std::int8_t>(raw));
    case 7: return std::to_string(static_cast<std::int16_t>(raw));
    case 9: return std::to_string(static_cast<std::int32_t>(raw));
    case 11: return std::to_string(static_cast<std::int64_t>(raw));
    case 12: {
      float f;
      const auto bits = static_cast<std::uint32_t>(raw);
      std::memcpy(&f, &bits, 4);
      return number(f, 9);
    }
    case 13: {
      double d;
      std::memcpy(&d, &raw, 8);
      return number(d, 17);
    }
    default: return std::to_string(raw);  // bool, char, unsigned types
  }
}

// One object of exactly `size` bytes at data, which starts at byte `at` of the
// input. `pad` is the indentation of the object's own lines.
std::string object(const std::uint8_t* data, std::uint64_t size, std::uint64_t at, int depth, const std::string& pad) {
  if (depth > kMaxDepth) damage(at, "composite objects nested deeper than " + std::to_string(kMaxDepth) + " levels");
  if (size < 16) damage(at, "object of " + std::to_string(size) + " bytes, shorter than its 16-byte header");
  const unsigned kind = data[8], type = data[9];
  const std::string in = pad + "  ";
  std::string out = "{\n" + in + "\"offset\": " + std::to_string(at) + ",\n" + in + "\"size\": " + std::to_string(size);
  if (kind == 1) {
    if (type == 0 || type > 13) damage(at + 9, "basic object of unknown element type " + std::to_string(type));
    const unsigned elementSize = storageSize(QVIVBObjectSubType(type));
    if ((size - 16) % elementSize != 0)
      damage(at, std::to_string(size - 16) + " bytes are not a whole number of " + kTypeNames[type] + " elements");
    const std::uint64_t count = (size - 16) / elementSize;
    out += ",\n" + in + "\"kind\": \"basic\",\n" + in + "\"type\": \"" + kTypeNames[type] + "\",\n" + in +
           "\"count\": " + std::to_string(count);
    if (type == 3 && count <= kMaxShownText)
      out += ",\n" + in + "\"text\": " + qcli::jsonString(std::string(reinterpret_cast<const char*>(data + 16), count));
    else if (type >= 2 && count == 1)
      out += ",\n" + in + "\"value\": " + scalarValue(type, data + 16);
    return out + "\n" + pad + "}";
  }
  if (kind != 2) damage(at + 8, "object of unknown kind " + std::to_string(kind));
  if (type != 0) damage(at + 9, "composite object with element type " + std::to_string(type));
  out += ",\n" + in + "\"kind\": \"composite\",\n" + in + "\"entries\": [";
  const std::string entryPad = in + "  ";
  std::uint64_t pos = 16;
  for (bool first = true; pos < size; first = false) {
    if (size - pos < 4) damage(at + pos, "entry info cut short");
    const unsigned nameLength = getU16(data + pos), tag = getU16(data + pos + 2);
    const std::uint64_t nameAt = pos + 4;
    if (nameLength > size - nameAt) damage(at + pos, "entry name runs past the end of its composite");
    const std::uint64_t objectAt = nameAt + nameLength;
    if (size - objectAt < 16) damage(at + objectAt, "entry object header cut short");
    const std::uint64_t objectSize = getU64(data + objectAt);
    if (objectSize > size - objectAt)
      damage(at + objectAt, "object of " + std::to_string(objectSize) + " bytes runs past the end of its composite (" +
                                std::to_string(size - objectAt) + " bytes left)");
    out += std::string(first ? "" : ",") + "\n" + in + "  {\n" + entryPad + "  \"name\": " +
           qcli::jsonString(std::string(reinterpret_cast<const char*>(data + nameAt), nameLength)) + ",\n" + entryPad +
           "  \"tag\": " + std::to_string(tag) + ",\n" + entryPad + "  \"object\": " +
           object(data + objectAt, objectSize, at + objectAt, depth + 1, entryPad + "  ") + "\n" + entryPad + "}";
    pos = objectAt + objectSize;
  }
  return out + (pos > 16 ? "\n" + in : std::string()) + "]\n" + pad + "}";
}

// A whole object: its size field must be exactly the bytes given.
std::string wholeObject(const std::vector<std::uint8_t>& bytes, std::uint64_t at, const std::string& pad) {
  if (bytes.size() < 16) damage(at, "object of " + std::to_string(bytes.size()) + " bytes, shorter than its 16-byte header");
  const std::uint64_t size = getU64(bytes.data());
  if (size != bytes.size())
    damage(at, "object size field says " + std::to_string(size) + " bytes, " + std::to_string(bytes.size()) +
                   " are there");
  return object(bytes.data(), size, at, 0, pad);
}

std::string stream(const std::vector<std::uint8_t>& bytes) {
  std::string out;
  try {
    QVIVBMemoryReader reader(bytes.data(), bytes.data() + bytes.size());
    std::uint64_t at = 16 + reader.label().size();
    out = "{\n  \"format\": \"IVB stream\",\n  \"size\": " + std::to_string(bytes.size()) + ",\n  \"label\": " +
          qcli::jsonString(reader.label()) + ",\n  \"records\": [";
    bool first = true;
    while (!reader.atEnd()) {
      const unsigned tag = reader.nextTag(), nameLength = reader.nextNameLength();
      const std::vector<std::uint8_t> main = reader.readNextObject();
      if (main.empty()) damage(at, "record object empty or cut short");
      out += std::string(first ? "" : ",") + "\n    {\n      \"name\": " + qcli::jsonString(reader.nextName()) +
             ",\n      \"tag\": " + std::to_string(tag) + ",\n      \"offset\": " + std::to_string(at) +
             ",\n      \"object\": " + wholeObject(main, at + 4 + nameLength, "      ") + "\n    }";
      at += 4 + nameLength + main.size();
      first = false;
    }
    at += 4;  // the terminal record
    out += std::string(first ? "" : "\n  ") + "],\n  \"unreadBytes\": " + std::to_string(bytes.size() - at) + "\n}\n";
  } catch (const Damage&) {
    throw;
  } catch (const std::exception& e) {
    // The reader's own failures say only that the stream is damaged.
    throw Damage(std::string("not a readable IVB stream (") + e.what() + ")");
  }
  return out;
}

}  // namespace

std::string describe(const std::vector<std::uint8_t>& bytes) {
  static const char kMagic[] = "IVB@QV";
  if (bytes.size() >= 6 && std::memcmp(bytes.data(), kMagic, 6) == 0) return stream(bytes);
  return "{\n  \"format\": \"IVB object\",\n  \"object\": " + wholeObject(bytes, 0, "  ") + "\n}\n";
}

}  // namespace qivb
