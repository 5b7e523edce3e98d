// quorin-ivb: prints the structure of an IVB file as JSON.
//
//   quorin-ivb FILE        a stream ("IVB@QV" ...) or one object as a toIvb writes it
//   quorin-ivb -           the same from standard input (a memory image piped in)
//
// Exit status 0 with the JSON on stdout; 1 for a file that can't be read or is
// damaged, 2 for wrong usage, each with one line on stderr.
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>
#include <vector>

#include "IvbLayout.h"

namespace {

const char* const kUsage =
    "usage: quorin-ivb FILE|-\n"
    "Prints the structure of an IVB stream or IVB object as JSON: records and\n"
    "entries with their names and tags, object kinds, element types, counts and\n"
    "sizes. Exits with 1 and a message on stderr for a damaged file.\n";

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && (std::strcmp(argv[1], "--help") == 0 || std::strcmp(argv[1], "-h") == 0)) {
    std::fputs(kUsage, stdout);
    return 0;
  }
  if (argc != 2) {
    std::fputs(kUsage, stderr);
    return 2;
  }
  const std::string path = argv[1];
  std::vector<std::uint8_t> bytes;
  if (path == "-") {
    bytes.assign(std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>());
  } else {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
      std::fprintf(stderr, "quorin-ivb: %s: cannot open\n", path.c_str());
      return 1;
    }
    bytes.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    if (in.bad()) {
      std::fprintf(stderr, "quorin-ivb: %s: read error\n", path.c_str());
      return 1;
    }
  }
  try {
    std::fputs(qivb::describe(bytes).c_str(), stdout);
  } catch (const qivb::Damage& e) {
    std::fprintf(stderr, "quorin-ivb: %s: damaged IVB data: %s\n", path.c_str(), e.what());
    return 1;
  }
  return 0;
}
