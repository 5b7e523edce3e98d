// The result blocks of the development photos, in all four rotations and the
// three detection modes, against a file written on x86-64: every build (armhf
// under qemu included) must give the same integers, bit for bit. The decoded
// gray frames are checked too, so that a difference in the photo decoder is
// told apart from one in the engine. Skips when the data cache is absent.
//   QUORIN_WRITE_GOLDEN=1 test_golden_blocks   rewrites the file (x86-64 only)

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/GoldenFile.h"
#include "ImageIo.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"
#include "support/SourceTree.h"

namespace {

// The annotated development photos of the real-photo test.
const char* const kPhotos[] = {"tracking_faces.jpg", "tracking_faces_test.png", "SeanConnery.jpg", "cage.jpg",
                               "audrey.jpg",         "clmtrackr01.jpg",         "franck_02045.jpg", "ironman.jpg"};
constexpr int kBlockInts = 17;
constexpr int kMaxFaces = 100;

uint64_t fnv1a(const std::vector<uint8_t>& bytes) {
    uint64_t h = 1469598103934665603ull;
    for (uint8_t b : bytes) h = (h ^ b) * 1099511628211ull;
    return h;
}

// One line per photo (size and pixel hash) and one per detection.
std::vector<std::string> currentLines() {
    std::vector<std::string> lines;
    quorin_init();
    for (const char* name : kPhotos) {
        const qcli::Image gray = qcli::toGray(qcli::loadImage(devdata::photo(name)));
        std::ostringstream head;
        head << "photo " << name << " " << gray.width << "x" << gray.height << " fnv1a=" << std::hex
             << fnv1a(gray.pixels);
        lines.push_back(head.str());
        for (unsigned mode = 0; mode < 3; ++mode)
            for (int rotation = 0; rotation < 360; rotation += 90) {
                // A detour through another mode discards tracked faces: every
                // line stands on its own frame.
                quorin_setDetectionMode((mode + 1) % 3);
                quorin_setDetectionMode(mode);
                std::vector<unsigned char> frame(gray.pixels.begin(), gray.pixels.end());
                std::vector<int> blocks(size_t(kMaxFaces) * kBlockInts, 0);
                const int n = quorin_detect(frame.data(), gray.width, gray.height, blocks.data(), kMaxFaces, rotation);
                std::ostringstream line;
                line << "detect " << name << " mode=" << mode << " rotation=" << rotation << " faces=" << n << " :";
                for (int i = 0; i < n * kBlockInts; ++i) line << " " << blocks[size_t(i)];
                lines.push_back(line.str());
            }
    }
    quorin_release();
    return lines;
}

std::string goldenPath() { return sourcetree::root() + "/tests/e2e/golden/blocks.txt"; }

}  // namespace

TEST(GoldenBlocks, DevelopmentPhotosGiveTheRecordedBlocks) {
    for (const char* name : kPhotos)
        if (!devdata::exists(devdata::photo(name))) GTEST_SKIP() << devdata::missingNote();
    const std::vector<std::string> lines = currentLines();
    expectGoldenLines(goldenPath(), "quorin_detect blocks of the development photos, written on x86-64; see GoldenBlocksTest.cpp", lines);
}
