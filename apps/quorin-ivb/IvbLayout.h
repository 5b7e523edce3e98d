#ifndef QUORIN_APPS_IVBLAYOUT_H
#define QUORIN_APPS_IVBLAYOUT_H

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace qivb {

// Raised for bytes that are not a well-formed IVB stream or object; what()
// names the byte offset and what is wrong there.
class Damage : public std::runtime_error {
public:
  explicit Damage(const std::string& what) : std::runtime_error(what) {}
};

// Composite objects nested deeper than this are refused rather than walked.
constexpr int kMaxDepth = 64;

// The structure of `bytes` as indented JSON. A stream (starting with the magic
// "IVB@QV") gives its label, its records (name, tag, offset) and each record's
// object; anything else is read as one IVB object, as a class's toIvb writes
// it. Objects give kind, size, and for a basic object its element type and
// count (with the value of a single number and the text of a char array), for
// a composite its entries (name, tag, object). Throws Damage.
std::string describe(const std::vector<std::uint8_t>& bytes);

}  // namespace qivb

#endif
