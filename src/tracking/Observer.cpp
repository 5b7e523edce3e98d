#include "tracking/Observer.h"

#include <cmath>

#include "core/Errors.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"

namespace {

CascadeDetector& needDetector(CascadeDetector* detector)
{
    if (detector == nullptr) throw qv_operation_error("Observer doesn't have a detector yet");
    return *detector;
}

// The observers' own bounds: one pixel tighter than the integral allows on the
// right and bottom, none on the left and top.
bool insideImage(const IN_IMAGE& image, const DetectionWindow& w)
{
    return !(w.left < 0 || w.right >= image.pixelWidth() - 1 || w.top < 0 || w.bottom >= image.pixelHeight() - 1);
}

float logistic(float s) { return 1.0f / (expf(-s) + 1.0f); }

// Reads `count` features of every readable window into rows; the others have
// nothing to teach and are left out, together with their labels.
void featureRows(CascadeDetector& detector, const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                 const std::vector<bool>& labels, unsigned count, std::vector<std::vector<float>>& rows,
                 std::vector<bool>& rowLabels)
{
    if (labels.size() != windows.size())
        throw qv_invalid_argument("Observer training needs one label per window");
    rows.clear();
    rowLabels.clear();
    for (size_t i = 0; i < windows.size(); ++i) {
        if (!detector.featureWindowFits(image, windows[i])) continue;
        rows.emplace_back(count, 0.0f);
        detector.getFeature(image, windows[i], count, rows.back());
        rowLabels.push_back(labels[i]);
    }
}

} // namespace

float HaarLDAObserver::getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const
{
    CascadeDetector& cascade = needDetector(detector);
    if (!insideImage(image, window) || !cascade.featureWindowFits(image, window)) return 0.0f;
    scratch.assign(kFeatures, 0.0f);
    cascade.getFeature(image, window, kFeatures, scratch);
    return logistic(classifier.getScore(scratch));
}

void HaarLDAObserver::trainClassifier(const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                                      const std::vector<bool>& labels)
{
    std::vector<std::vector<float>> rows;
    std::vector<bool> rowLabels;
    featureRows(needDetector(detector), image, windows, labels, kFeatures, rows, rowLabels);
    classifier.train(rows, rowLabels);
}

HaarBoostingLDAObserver::HaarBoostingLDAObserver()
    : classifiers(kClassifiers), alphas(kClassifiers, 0.0f), trainingSets(kTrainingSets)
{
}

float HaarBoostingLDAObserver::getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const
{
    CascadeDetector& cascade = needDetector(detector);
    if (!insideImage(image, window) || !cascade.featureWindowFits(image, window)) return 0.0f;
    // Sized to all ten features, so that the vote runs for every window.
    scratch.assign(kFeatures, 0.0f);
    cascade.getFeature(image, window, kFeatures, scratch);
    float vote = 0.0f, alphaSum = 0.0f;
    for (size_t k = 0; k < classifiers.size() && k < alphas.size(); ++k) {
        alphaSum += alphas[k];
        vote += classifiers[k].getScore(scratch) >= 0.0f ? alphas[k] : -alphas[k];
    }
    return logistic(vote / alphaSum);
}

void HaarBoostingLDAObserver::trainClassifier(const IN_IMAGE& image, const std::vector<DetectionWindow>& windows,
                                              const std::vector<bool>& labels)
{
    CascadeDetector& cascade = needDetector(detector);
    // The fields are open; keep the ring and the votes their fixed sizes.
    trainingSets.resize(kTrainingSets);
    alphas.resize(classifiers.size(), 0.0f);
    {
        std::vector<std::vector<float>> rows;
        std::vector<bool> rowLabels;
        featureRows(cascade, image, windows, labels, kFeatures, rows, rowLabels);
        std::vector<TrainData>& set = trainingSets[trainingRound % kTrainingSets];
        ++trainingRound;
        set.resize(rows.size());
        for (size_t i = 0; i < rows.size(); ++i) {
            set[i].features.swap(rows[i]);
            set[i].label = rowLabels[i];
        }
    }

    std::vector<std::vector<float>> features;
    std::vector<bool> featureLabels;
    expandTrainData(features, featureLabels);
    const size_t n = features.size();

    std::vector<float> w(n, 1.0f / float(n));
    std::vector<bool> prediction(n, false);
    for (size_t k = 0; k < classifiers.size(); ++k) {
        // The sample weights don't enter the discriminant: the ten come out
        // alike and differ only in their alphas.
        classifiers[k].train(features, featureLabels);
        float e = 0.0f;
        for (size_t i = 0; i < n; ++i) {
            prediction[i] = classifiers[k].getScore(features[i]) >= 0.0f;
            if (prediction[i] != featureLabels[i]) e += w[i];
        }
        e = n > 0 ? e / (1.0f - e) : 0.0f;
        for (size_t i = 0; i < n; ++i)
            if (prediction[i] == featureLabels[i]) w[i] *= e;
        float sum = 0.0f;
        for (const float v : w) sum += v;
        for (float& v : w) v /= sum;
        alphas[k] = logf(1.0f / e);
    }
}

void HaarBoostingLDAObserver::expandTrainData(std::vector<std::vector<float>>& features,
                                              std::vector<bool>& labels) const
{
    for (const std::vector<TrainData>& set : trainingSets)
        for (const TrainData& row : set) {
            features.push_back(row.features);
            labels.push_back(row.label);
        }
}
