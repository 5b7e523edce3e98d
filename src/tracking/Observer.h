#ifndef QUORIN_TRACKING_OBSERVER_H
#define QUORIN_TRACKING_OBSERVER_H

#include <cstdint>
#include <vector>

#include "image/DetectionWindow.h"
#include "tracking/LDAClassifier.h"

class CascadeDetector;
class IN_IMAGE;

// Turns a candidate rectangle into a likelihood in 0..1 for one image, and
// learns on line from labelled windows around the tracked face.
class Observer {
public:
    virtual ~Observer() = default;
    virtual float getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const = 0;
    virtual void trainClassifier(const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                                 const std::vector<bool>& labels) = 0;
};

// One discriminant on the first 5 cascade features, retrained from scratch on
// every call. Holds the detector, doesn't own it.
class HaarLDAObserver : public Observer {
public:
    static constexpr unsigned kFeatures = 5;

    void init(CascadeDetector& cascade) { detector = &cascade; }
    // 0 for a window that reaches outside the image (left or top below 0,
    // right or bottom at width - 1 or height - 1 or beyond) or that the
    // cascade has no features for; otherwise the logistic of the score.
    // Raises qv_operation_error without a detector.
    float getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const override;
    // Windows the cascade can't read are left out of the training. Raises
    // "Train LDA classifier with no features" when none is left.
    void trainClassifier(const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                         const std::vector<bool>& labels) override;

    CascadeDetector* detector = nullptr;
    LDAClassifier classifier;

private:
    mutable std::vector<float> scratch; // one window's features, kept for reuse
};

// A boosted vote of 10 discriminants on the first 10 cascade features, trained
// on the union of up to five training sets kept as a ring: each call replaces
// the oldest set, so memory stays bounded however long the track lives.
class HaarBoostingLDAObserver : public Observer {
public:
    static constexpr unsigned kFeatures = 10;
    static constexpr size_t kClassifiers = 10;
    static constexpr size_t kTrainingSets = 5;

    struct TrainData {
        std::vector<float> features;
        bool label = false;
    };

    HaarBoostingLDAObserver();

    void init(CascadeDetector& cascade) { detector = &cascade; }
    // Bounds and detector as HaarLDAObserver; the logistic of the alpha-weighted
    // vote over alphaSum. Untrained or degenerate alphas give a value that is
    // not a number, which the particle filter treats as no evidence.
    float getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const override;
    // Fills the set at trainingRound modulo 5, then boosts over all sets
    // (AdaBoost.M1 weights; the discriminants themselves ignore the weights).
    void trainClassifier(const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                         const std::vector<bool>& labels) override;
    // Appends the rows and labels of all five sets, in ring order from set 0.
    void expandTrainData(std::vector<std::vector<float>>& features, std::vector<bool>& labels) const;

    CascadeDetector* detector = nullptr;
    std::vector<LDAClassifier> classifiers;
    std::vector<float> alphas;
    std::vector<std::vector<TrainData>> trainingSets;
    uint32_t trainingRound = 0; // counts calls; the set filled is this modulo 5

private:
    mutable std::vector<float> scratch;
};

#endif
