#ifndef QUORIN_TESTS_POSTFILTERMODELS_H
#define QUORIN_TESTS_POSTFILTERMODELS_H

// Builders of post filter models and frames for the tests: models whose
// decision hangs on one feature value, so that a test can tell by hand which
// hits pass.

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "PostFilterWriters.h"

namespace pftest {

// Length of the post filter feature: the cascade score and 16 cells x 59 bins.
constexpr int kFeatureLength = 1 + 16 * 59;

// Index in the feature of bin `code` of cell (row, column) of the 4 x 4 grid.
inline int binIndex(int cellRow, int cellColumn, int code) {
    return 1 + (cellRow * 4 + cellColumn) * 59 + code;
}

// ILABS category of rank 0 whose score is feature[index] * weight - bias.
// The scale 1/64 stores small multiples of 1/64 exactly.
inline postfilterwriters::IlabsCategory linearCategory(int index, float weight, float bias) {
    postfilterwriters::IlabsCategory c;
    c.linear.assign(kFeatureLength, 0.0f);
    c.linear[index] = weight;
    c.bias = bias;
    c.scale = 1.0f / 64.0f;
    return c;
}

// Fifteen categories, category c judging by feature[index] > biases[c].
inline std::vector<uint8_t> ilabsThresholdModel(int index, const std::vector<float>& biases) {
    std::vector<postfilterwriters::IlabsCategory> cats;
    for (int c = 0; c < 15; ++c) cats.push_back(linearCategory(index, 1.0f, biases[c % biases.size()]));
    return postfilterwriters::ilabsModelPayload(cats);
}

// Linear two-class SVM: one support vector (class 0), the unit vector at
// `index`, coefficient 1; class 0 (label `above`) wins when
// feature[index] - rho > 0, else class 1 (label `below`).
inline postfilterwriters::SvmModelSpec svmThresholdModel(int index, float rho, int32_t above = 1,
                                                         int32_t below = -1) {
    postfilterwriters::SvmModelSpec m;
    m.kernelType = 1;
    m.degree = 1;
    m.gamma = 1.0f;
    m.coef0 = 0.0f;
    m.classCount = 2;
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

// 24 x 24 frame: the left half a ramp that rises to the right (no pixel there
// is a local maximum), the right half flat at 255. So in the untransposed
// patch the right cells hold only code 0 and the left ones none.
inline std::vector<uint8_t> halfRampFrame() {
    std::vector<uint8_t> pixels(24 * 24, 255);
    for (int y = 0; y < 24; ++y)
        for (int x = 0; x < 12; ++x) pixels[y * 24 + x] = static_cast<uint8_t>(10 * x + 5 * y);
    return pixels;
}

// A noisy frame with smooth blobs, fixed seed: textured enough that every
// LBP code and every cell sees use.
inline std::vector<uint8_t> noisyFrame(int width, int height, uint32_t seed = 11) {
    std::mt19937 rng(seed);
    std::vector<uint8_t> pixels(static_cast<std::size_t>(width) * height);
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x)
            pixels[y * width + x] = static_cast<uint8_t>((x * 3 + y * 5) % 97 + rng() % 140);
    return pixels;
}

inline void writeFile(const std::string& path, const std::vector<uint8_t>& bytes) {
    std::ofstream out(path, std::ios::binary);
    out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

// True when tools/ilabs_feature.py can run here (system Python with numpy,
// source dir known to the test).
inline bool featureMirrorAvailable() {
    return std::getenv("QUORIN_SOURCE_DIR") != nullptr &&
           std::system("/usr/bin/python3 -c 'import numpy' >/dev/null 2>&1") == 0;
}

// Runs tools/ilabs_feature.py with `args` and returns its output lines.
inline std::vector<std::string> runFeatureMirror(const std::string& args) {
    const char* source = std::getenv("QUORIN_SOURCE_DIR");
    std::vector<std::string> lines;
    if (source == nullptr) return lines;
    const std::string command = std::string("/usr/bin/python3 ") + source + "/tools/ilabs_feature.py " + args;
    FILE* pipe = popen(command.c_str(), "r");
    if (pipe == nullptr) return lines;
    std::string text;
    char chunk[4096];
    std::size_t n;
    while ((n = std::fread(chunk, 1, sizeof chunk, pipe)) > 0) text.append(chunk, n);
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
