// The shared library's dynamic symbol table: exactly the ten C entry points,
// and none of the internal classes and helpers.

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <vector>

namespace {

std::vector<std::string> run(const std::string& command) {
    std::vector<std::string> lines;
    FILE* pipe = popen(command.c_str(), "r");
    if (pipe == nullptr) return lines;
    char buffer[4096];
    while (fgets(buffer, sizeof buffer, pipe) != nullptr) {
        std::string line(buffer);
        while (!line.empty() && (line.back() == '\n' || line.back() == '\r')) line.pop_back();
        lines.push_back(line);
    }
    pclose(pipe);
    return lines;
}

// Defined dynamic symbols, one name per line.
std::vector<std::string> exportedSymbols() {
    return run(std::string("nm -D --defined-only --format=posix '") + QUORIN_SHARED_LIBRARY + "' | cut -d' ' -f1");
}

TEST(SharedLibraryExports, CSymbolsAreExactlyTheTenEntries) {
    const std::vector<std::string> symbols = exportedSymbols();
    ASSERT_FALSE(symbols.empty()) << "nm found nothing in " << QUORIN_SHARED_LIBRARY;
    // Marks that the linker itself defines are not ours.
    const std::set<std::string> linkerMarks = {"_init", "_fini", "_edata", "_end", "__bss_start"};
    std::set<std::string> cSymbols;
    for (const std::string& s : symbols)
        if (s.rfind("_Z", 0) != 0 && linkerMarks.count(s) == 0) cSymbols.insert(s);
    const std::set<std::string> expected = {
        "quorin_init",           "quorin_release",          "quorin_setDetectionMode",
        "quorin_detect",         "quorin_detectScaled",     "quorin_detect360Tracking",
        "quorin_detect360TrackingScaled", "quorin_detect360High", "quorin_detect360HighScaled",
        "quorin_detect360TrackingScaled_ornt"};
    EXPECT_EQ(cSymbols, expected);
}

TEST(SharedLibraryExports, InternalsStayHidden) {
    const std::vector<std::string> demangled = run(std::string("nm -D -C --defined-only '") + QUORIN_SHARED_LIBRARY + "'");
    ASSERT_FALSE(demangled.empty());
    const std::vector<std::string> hidden = {"FaceDetectionPipeline", "PipelineStages", "rotateFrame", "rotatePoint",
                                             "resizeNearest", "truncateToInt", "sessionSnapshot", "FaceRecord::",
                                             "LandmarkMap::", "g_detectionApi", "g_frameBuffer"};
    bool apiExported = false;
    for (const std::string& line : demangled) {
        for (const std::string& name : hidden) EXPECT_EQ(line.find(name), std::string::npos) << line;
        if (line.find("FaceDetectionApi::detect") != std::string::npos) apiExported = true;
    }
    EXPECT_TRUE(apiExported) << "FaceDetectionApi is part of the exported interface";
}

TEST(SharedLibraryExports, RecordLabelsAndAttributeNamesAreNotLegible) {
    std::ifstream in(QUORIN_SHARED_LIBRARY, std::ios::binary);
    const std::string bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_FALSE(bytes.empty());
    for (const char* plain : {"ageIntervalNone", "raceNone", "genderNone", "poseNone", "attributeAgeInterval"})
        EXPECT_EQ(bytes.find(plain), std::string::npos) << plain;
}

}  // namespace
