#ifndef QUORIN_TESTS_POSTFILTERMODELS_H
#define QUORIN_TESTS_POSTFILTERMODELS_H

// Builders for the post filter tests: hits, frames, and models whose decision
// hangs on one feature value, so that a test can tell by hand which hits pass;
// plus a runner for the Python mirror of the feature in tools/.

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "PostFilterWriters.h"
#include "image/IntegralImage.h"
#include "image/ScoredWindow.h"
#include "postfilter/PostFilter.h"
#include "support/SourceTree.h"

namespace pftest {

// The post filter feature: the cascade score and 16 cells x 59 bins.
constexpr int kFeatureLength = 1 + 16 * 59;

// Index in the feature of bin `code` of cell (row, column) of the 4 x 4 grid.
inline int binIndex(int cellRow, int cellColumn, int code) { return 1 + (cellRow * 4 + cellColumn) * 59 + code; }

// A hit with distinct category scores, so that a whole copy can be told.
inline ScoredWindow hit(float score, int category, DetectionWindow window = {0, 24, 0, 24}) {
    ScoredWindow s;
    s.score = score;
    s.category = category;
    s.window = window;
    for (int i = 0; i < 15; ++i) s.categoryScores[i] = score - i;
    return s;
}

inline bool sameHit(const ScoredWindow& a, const ScoredWindow& b) {
    for (int i = 0; i < 15; ++i)
        if (a.categoryScores[i] != b.categoryScores[i]) return false;
    return a.score == b.score && a.category == b.category && a.window.left == b.window.left &&
           a.window.right == b.window.right && a.window.top == b.window.top && a.window.bottom == b.window.bottom;
}

// Fifteen ILABS categories of rank 0, category c passing when
// feature[index] > biases[c % size]. Scale 1/64 stores the unit weight exactly.
inline std::vector<uint8_t> ilabsThresholdModel(int index, const std::vector<float>& biases) {
    std::vector<postfilterwriters::IlabsCategory> cats(15);
    for (int c = 0; c < 15; ++c) {
        cats[c].linear.assign(kFeatureLength, 0.0f);
        cats[c].linear[index] = 1.0f;
        cats[c].bias = biases[c % biases.size()];
        cats[c].scale = 1.0f / 64.0f;
    }
    return postfilterwriters::ilabsModelPayload(cats);
}

// Linear two-class SVM with one support vector (class 0), the unit vector at
// `index`: label `above` when feature[index] - rho > 0, else `below`.
inline postfilterwriters::SvmModelParams svmThresholdModel(int index, float rho, int32_t above = 1,
                                                         int32_t below = -1) {
    postfilterwriters::SvmModelParams m;
    m.rho = {rho};
    m.decisionThresholds = {0.0f};
    m.labels = {above, below};
    m.svCounts = {1, 0};
    m.featureLength = kFeatureLength;
    m.supportVectors.assign(1, std::vector<float>(kFeatureLength, 0.0f));
    m.supportVectors[0][index] = 1.0f;
    m.coefficients = {{1.0f}};
    return m;
}

// 24 x 24: the left half a ramp rising to the right and down (no local
// maximum, so no code 0), the right half flat at 255 (code 0 throughout).
inline std::vector<uint8_t> halfRampFrame() {
    std::vector<uint8_t> pixels(24 * 24, 255);
    for (int y = 0; y < 24; ++y)
        for (int x = 0; x < 12; ++x) pixels[y * 24 + x] = static_cast<uint8_t>(10 * x + 5 * y);
    return pixels;
}

// What filter `f` lets through of `hits` on the half-ramp frame.
inline std::vector<ScoredWindow> filterOnHalfRamp(const PostFilter& f, const std::vector<ScoredWindow>& hits) {
    std::vector<uint8_t> pixels = halfRampFrame();
    IN_IMAGE image;
    image.Init(24, 24, 24, pixels.data());
    std::vector<ScoredWindow> out;
    f.filter(image, hits, &out);
    return out;
}

// Noise over a slant, fixed seed: every code and every cell sees use.
inline std::vector<uint8_t> noisyFrame(int width, int height, uint32_t seed = 11) {
    std::mt19937 rng(seed);
    std::vector<uint8_t> pixels(static_cast<std::size_t>(width) * height);
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x) pixels[y * width + x] = static_cast<uint8_t>((x * 3 + y * 5) % 97 + rng() % 140);
    return pixels;
}

// True when tools/ilabs_feature.py can run (system Python with numpy).
inline bool featureMirrorAvailable() {
    return std::system("/usr/bin/python3 -c 'import numpy' >/dev/null 2>&1") == 0;
}

// " --hit=L,R,T,B,SCORE,CATEGORY" for each hit, scores printed to round-trip.
inline std::string hitArguments(const std::vector<ScoredWindow>& hits) {
    std::ostringstream out;
    out.precision(9);
    for (const ScoredWindow& h : hits)
        out << " --hit=" << h.window.left << "," << h.window.right << "," << h.window.top << "," << h.window.bottom
            << "," << h.score << "," << h.category;
    return out.str();
}

// Runs tools/ilabs_feature.py with `args` and returns its output lines.
inline std::vector<std::string> runFeatureMirror(const std::string& args) {
    std::vector<std::string> lines;
    FILE* pipe = popen(("/usr/bin/python3 " + sourcetree::path("tools/ilabs_feature.py") + " " + args).c_str(), "r");
    if (pipe == nullptr) return lines;
    std::string text;
    char chunk[4096];
    for (std::size_t n; (n = std::fread(chunk, 1, sizeof chunk, pipe)) > 0;) text.append(chunk, n);
    pclose(pipe);
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

inline std::vector<float> parseFloats(const std::string& line) {
    std::istringstream in(line);
    std::vector<float> values;
    for (float v; in >> v;) values.push_back(v);
    return values;
}

}  // namespace pftest

#endif
