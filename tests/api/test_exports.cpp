// The shared library as a host sees it: its dynamic symbol table against the
// allowed list kept beside this test (an accidental export, or a public
// symbol that went missing, fails with its name), and the records and entries
// reached through the public headers and the visible symbols alone.

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <iterator>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

#include "quorin/ApiError.h"
#include "quorin/FaceData.h"
#include "quorin/JsonError.h"
#include "quorin/QVFace.h"
#include "quorin/quorinapi.h"

namespace {

// Defined dynamic symbols, demangled, one a line (a name may hold blanks).
std::set<std::string> exportedSymbols() {
    std::set<std::string> names;
    FILE* pipe = popen((std::string("nm -D -C -j --defined-only '") + QUORIN_SHARED_LIBRARY + "'").c_str(), "r");
    if (pipe == nullptr) return names;
    char buffer[4096];
    while (fgets(buffer, sizeof buffer, pipe) != nullptr) {
        std::string line(buffer);
        if (!line.empty() && line.back() == '\n') line.pop_back();
        if (!line.empty()) names.insert(line);
    }
    pclose(pipe);
    return names;
}

// The allowed list: whole names, or prefixes ending in '*'; '#' starts a comment line.
std::vector<std::string> allowedEntries() {
    std::vector<std::string> entries;
    std::ifstream in(QUORIN_EXPORTED_SYMBOLS_LIST);
    for (std::string line; std::getline(in, line);) {
        while (!line.empty() && (line.back() == ' ' || line.back() == '\r')) line.pop_back();
        if (!line.empty() && line[0] != '#') entries.push_back(line);
    }
    return entries;
}

bool matches(const std::string& entry, const std::string& symbol) {
    return entry.back() == '*' ? symbol.compare(0, entry.size() - 1, entry, 0, entry.size() - 1) == 0
                               : symbol == entry;
}

TEST(SharedLibraryExports, MatchTheAllowedList) {
    const std::set<std::string> symbols = exportedSymbols();
    ASSERT_FALSE(symbols.empty()) << "nm found nothing in " << QUORIN_SHARED_LIBRARY;
    const std::vector<std::string> entries = allowedEntries();
    ASSERT_FALSE(entries.empty()) << "no entries read from " << QUORIN_EXPORTED_SYMBOLS_LIST;
    // Marks that the linker itself may define are not ours.
    const std::set<std::string> linkerMarks = {"_init", "_fini", "_edata", "_end", "__bss_start"};
    std::vector<int> hits(entries.size(), 0);
    for (const std::string& symbol : symbols) {
        if (linkerMarks.count(symbol) != 0) continue;
        bool allowed = false;
        for (size_t i = 0; i < entries.size(); ++i)
            if (matches(entries[i], symbol)) {
                ++hits[i];
                allowed = true;
            }
        EXPECT_TRUE(allowed) << "unexpected exported symbol: " << symbol << "\n  (hide it, or add it to "
                             << QUORIN_EXPORTED_SYMBOLS_LIST << " if it belongs to the public interface)";
    }
    for (size_t i = 0; i < entries.size(); ++i)
        EXPECT_GT(hits[i], 0) << "missing exported symbol: \"" << entries[i] << "\" of "
                              << QUORIN_EXPORTED_SYMBOLS_LIST << " matches nothing the library exports";
}

TEST(SharedLibraryExports, RecordLabelsAndAttributeNamesAreNotLegible) {
    std::ifstream in(QUORIN_SHARED_LIBRARY, std::ios::binary);
    const std::string bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_FALSE(bytes.empty());
    for (const char* plain : {"ageIntervalNone", "raceNone", "genderNone", "poseNone", "attributeAgeInterval"})
        EXPECT_EQ(bytes.find(plain), std::string::npos) << plain;
}

TEST(SharedLibraryHost, RecordsAndEntriesWorkThroughTheExportedInterface) {
    FaceData data;
    data.setFaceRect(Rect2<int32_t>(1, 2, 3, 4));
    data.setLandmark("nose", Point2<float>(0.5f, 0.25f));
    QVFace face;
    face.fromJson(data.toJson());
    EXPECT_EQ(QVFace(face).landmark("nose").y, 0.25f);
    EXPECT_THROW(face.fromJson("[]"), ApiError) << "the library's own exception type is seen by the host";
    Rect2<int32_t> rect;
    EXPECT_THROW(rect.fromJson("[1,2,3]"), JsonError);

    quorin_release();
    std::vector<unsigned char> frame(32 * 32);
    std::vector<int> results(17);
    EXPECT_EQ(quorin_detect(frame.data(), 32, 32, results.data(), 1, 0), 0) << "no session, no face";
}

}  // namespace
