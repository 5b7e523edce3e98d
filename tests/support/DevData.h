#ifndef QUORIN_TESTS_DEVDATA_H
#define QUORIN_TESTS_DEVDATA_H

#include <cstdlib>
#include <string>
#include <sys/stat.h>

// Where scripts/fetch-data.sh keeps the development photos and clips: outside
// git, so tests that read them skip when the cache has not been fetched.
namespace devdata {

inline std::string root() {
    if (const char* dir = std::getenv("QUORIN_DATA_DIR"))
        return dir;
    const char* home = std::getenv("HOME");
    return std::string(home ? home : "/root") + "/.cache/quorin";
}

inline std::string photo(const std::string& name) { return root() + "/photos/" + name; }

inline bool exists(const std::string& path) {
    struct stat st;
    return ::stat(path.c_str(), &st) == 0;
}

inline std::string missingNote() {
    return "development data not found in " + root() + " (run scripts/fetch-data.sh)";
}

}  // namespace devdata

#endif
