#ifndef QUORIN_TOOLS_CASCADETRAINER_H
#define QUORIN_TOOLS_CASCADETRAINER_H

// Boosting core of the cascade trainer (tools/train_cascade.cpp).
//
// Samples are 24 x 24 patches kept as their integral image (25 x 25, uint32)
// together with the inverse deviation the engine computes for the window the
// patch was cut from. Features come from WindowFeature::generateFeaturePool and
// are evaluated with the engine's arithmetic (uint32 rectangle sums, float32
// weighted accumulation, times the inverse deviation), so a sample cut at the
// base scale gets exactly the value the engine gets.
//
// A stage is boosted from decision stumps by gentle boosting; its reject
// threshold keeps a set share of the positives. The written model has the
// layout of the converted cascade: a contrast gate, one engine stage per stump,
// a score reset before each boosted stage after the first, and a final stage
// that subtracts the last threshold, so an accepted window's score is the
// margin of the last boosted stage (times a power-of-two gain).

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "CascadeWriter.h"

class WindowFeature;

namespace cascadetrain {

constexpr int kPatch = 24;
constexpr int kStride = kPatch + 1;
constexpr int kIntegralSize = kStride * kStride;
// The gate rejects windows whose deviation is 10 or less (inverse at or above 0.1).
constexpr float kGateInverseDeviation = 0.1f;

// Labelled samples, stored flat.
class SampleSet {
public:
    // Adds a 24 x 24 patch (row-major) with the inverse deviation of its source window.
    void add(const uint8_t* patch, float inverseDeviation);
    // Adds sample i of another set.
    void addFrom(SampleSet const& other, size_t i);
    size_t size() const { return inverseDeviations.size(); }
    const uint32_t* integral(size_t i) const { return integrals.data() + i * kIntegralSize; }
    float inverseDeviation(size_t i) const { return inverseDeviations[i]; }
    void clear()
    {
        integrals.clear();
        inverseDeviations.clear();
    }
    void reserve(size_t n)
    {
        integrals.reserve(n * kIntegralSize);
        inverseDeviations.reserve(n);
    }

private:
    std::vector<uint32_t> integrals;
    std::vector<float> inverseDeviations;
};

struct Rect {
    float weight;
    int left, top, right, bottom;
};

// A Haar feature as rectangles at the base window (no per-scale data).
struct Feature {
    std::vector<Rect> rects;
    float eval(const uint32_t* integral, float inverseDeviation) const;
};

// The feature vocabulary (rectangle features only; the pool's deviation
// feature is the gate's business).
class FeaturePool {
public:
    FeaturePool(int minWidth, int minHeight, float shiftRatio, float growRatio);
    size_t size() const { return features.size(); }
    Feature const& operator[](size_t i) const { return features[i]; }

private:
    std::vector<Feature> features;
};

struct Stump {
    Feature feature;
    float threshold = 0.0f; // value >= threshold takes `above`
    float above = 0.0f;
    float below = 0.0f;
    float eval(const uint32_t* integral, float inverseDeviation) const
    {
        return feature.eval(integral, inverseDeviation) >= threshold ? above : below;
    }
};

struct Stage {
    std::vector<Stump> stumps;
    float threshold = 0.0f; // the stage passes when its float sum is >= threshold
    // Margin of this stage's positives, median; sets the score gain when it is last.
    float medianMargin = 1.0f;
    float sum(const uint32_t* integral, float inverseDeviation) const;
    bool passes(const uint32_t* integral, float inverseDeviation) const
    {
        return sum(integral, inverseDeviation) >= threshold;
    }
};

struct Cascade {
    std::vector<Stage> stages;
    // Median accepted-window score to aim the gain at (the converted cascade's
    // median over true faces); the gain is the nearest power of two.
    float targetMedianScore = 4.1f;

    bool passes(const uint32_t* integral, float inverseDeviation) const;
    // Gain applied to the last stage: a power of two, so decisions stay exact.
    float scoreGain() const;
    // Engine payload (see the file comment).
    CascadeModel toModel() const;
    // Text state with exact (hexadecimal) floats; false on I/O or format error.
    bool save(std::string const& path) const;
    bool load(std::string const& path);
};

struct StageOptions {
    double minHitRate = 0.997;  // share of the stage's positives kept
    double maxFalseRate = 0.5;  // stop adding stumps at or below this share of negatives kept
    int minStumps = 2;
    int maxStumps = 60;
    double featureFraction = 0.12; // share of the pool tried per round
    int bins = 64;                 // histogram bins for the threshold search
    double positiveWeight = 1.0;   // starting weight of the positives against the negatives
    int threads = 2;
    uint64_t seed = 1;
};

struct StageReport {
    double hitRate = 0, falseRate = 0;
    int stumps = 0;
};

// Boosts one stage on the given samples (both sets non-empty). Deterministic
// for a given seed, whatever the thread count.
Stage trainStage(FeaturePool const& pool, SampleSet const& positives, SampleSet const& negatives,
                 StageOptions const& options, StageReport* report);

// Cuts a square window (left, top, side; in pixels, fractional allowed) of an
// image, given by its integral (uint32, one zero row and column, row stride
// width + 1), into a 24 x 24 patch by area averaging; `mirror` flips it
// left-right. False when the window leaves the image.
bool cutPatch(const uint32_t* integral, int width, int height, double left, double top, double side, bool mirror,
              uint8_t* patch);

} // namespace cascadetrain

#endif
