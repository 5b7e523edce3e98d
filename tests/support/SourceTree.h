#ifndef QUORIN_TESTS_SOURCETREE_H
#define QUORIN_TESTS_SOURCETREE_H

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>

#include <unistd.h>
#include <vector>

// Paths into the source tree and small file helpers for tests that check
// generated or embedded data against its source.
// Set by tests/CMakeLists.txt; other users (the benchmarks) get the working
// directory and /tmp.
#ifndef QUORIN_TEST_SOURCE_DIR
#define QUORIN_TEST_SOURCE_DIR "."
#endif
#ifndef QUORIN_TEST_BINARY_DIR
#define QUORIN_TEST_BINARY_DIR "/tmp"
#endif

namespace sourcetree {

// The environment may point elsewhere (a copied tree); otherwise the trees the
// tests were configured in.
inline std::string root() {
    const char* dir = std::getenv("QUORIN_SOURCE_DIR");
    return dir ? std::string(dir) : std::string(QUORIN_TEST_SOURCE_DIR);
}

inline std::string binaryRoot() {
    const char* dir = std::getenv("QUORIN_BINARY_DIR");
    return dir ? std::string(dir) : std::string(QUORIN_TEST_BINARY_DIR);
}

inline std::string path(const std::string& relative) { return root() + "/" + relative; }

inline std::vector<uint8_t> readBytes(const std::string& file) {
    std::ifstream in(file, std::ios::binary);
    return std::vector<uint8_t>((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

inline std::string readText(const std::string& file) {
    std::ifstream in(file, std::ios::binary);
    return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

inline void writeText(const std::string& file, const std::string& text) {
    std::ofstream out(file, std::ios::binary);
    out << text;
}

// A fresh scratch directory under the build tree (or /tmp when it can't be made).
inline std::string scratchDir(const std::string& name) {
    // One directory per process: ctest runs the cases of one program in
    // parallel processes, and each clears its directory first.
    const std::string dir = binaryRoot() + "/test-scratch/" + name + "-" + std::to_string(::getpid());
    const std::string command = "rm -rf '" + dir + "' && mkdir -p '" + dir + "'";
    if (std::system(command.c_str()) != 0) return "/tmp";
    return dir;
}

// The Python that tools run with (stdlib only is needed by the text and model tools).
inline std::string python() { return "/usr/bin/python3"; }

}  // namespace sourcetree

#endif
