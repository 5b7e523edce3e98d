#include "tracking/CascadePF.h"

#include "image/IntegralImage.h"

namespace {

constexpr float kPositiveOverlap = 0.9f;

void label(const DetectionWindow& detection, const std::vector<DetectionWindow>& windows, std::vector<bool>& labels)
{
    labels.resize(windows.size());
    for (size_t i = 0; i < windows.size(); ++i) labels[i] = detection.Overlap(windows[i]) >= kPositiveOverlap;
}

} // namespace

constexpr int CascadePF::kParticleNumbers[2];

CascadePF::CascadePF(const CascadePF& other)
    : initialized(other.initialized), filters(other.filters), ldaObserver(other.ldaObserver),
      boostObserver(other.boostObserver)
{
    pointFiltersAtOwnObservers();
}

CascadePF::CascadePF(CascadePF&& other) noexcept
    : initialized(other.initialized), filters(std::move(other.filters)), ldaObserver(std::move(other.ldaObserver)),
      boostObserver(std::move(other.boostObserver))
{
    pointFiltersAtOwnObservers();
}

CascadePF& CascadePF::operator=(const CascadePF& other)
{
    if (this != &other) {
        initialized = other.initialized;
        filters = other.filters;
        ldaObserver = other.ldaObserver;
        boostObserver = other.boostObserver;
        pointFiltersAtOwnObservers();
    }
    return *this;
}

CascadePF& CascadePF::operator=(CascadePF&& other) noexcept
{
    if (this != &other) {
        initialized = other.initialized;
        filters = std::move(other.filters);
        ldaObserver = std::move(other.ldaObserver);
        boostObserver = std::move(other.boostObserver);
        pointFiltersAtOwnObservers();
    }
    return *this;
}

void CascadePF::pointFiltersAtOwnObservers()
{
    if (filters.size() > 0) filters[0].setObserver(ldaObserver);
    if (filters.size() > 1) filters[1].setObserver(boostObserver);
}

void CascadePF::init(CascadeDetector& detector)
{
    ldaObserver.init(detector);
    boostObserver.init(detector);
    filters.assign(2, ParticleFilter());
    for (size_t i = 0; i < filters.size(); ++i) filters[i].setParticleNumber(kParticleNumbers[i]);
    pointFiltersAtOwnObservers();
}

int CascadePF::predict(const IN_IMAGE& image, DetectionWindow* window)
{
    if (initialized == 0 || filters.empty()) return 0;
    ParticleFilter& first = filters[0];
    first.resample();
    first.predict();
    first.diffuse();
    first.estimate(image);
    for (size_t i = 1; i < filters.size(); ++i) {
        ParticleFilter& f = filters[i];
        f.setParticles(filters[i - 1].getParticles());
        f.setWeights(filters[i - 1].getWeights());
        f.resample();
        f.diffuse();
        f.estimate(image);
    }
    if (window) *window = filters.back().getMean();
    return 1;
}

void CascadePF::update(const IN_IMAGE& image, const DetectionWindow& detection)
{
    if (filters.empty()) return; // not initialised with a detector: nothing to learn with
    std::vector<DetectionWindow> samples;
    std::vector<float> weights;
    if (initialized != 0) {
        samples = filters.back().getParticles();
        weights = filters.back().getWeights();
    } else {
        // Seeds: the lattice, less the shifts that leave the image.
        const int64_t W = image.pixelWidth() - 1;
        const int64_t H = image.pixelHeight() - 1;
        for (int dx = -5; dx <= 5; ++dx)
            for (int dy = -5; dy <= 5; ++dy) {
                const int64_t left = int64_t(detection.left) + dx, right = int64_t(detection.right) + dx;
                const int64_t top = int64_t(detection.top) + dy, bottom = int64_t(detection.bottom) + dy;
                if (!(left >= 0 && right < W && top >= 0 && bottom < H)) continue;
                DetectionWindow c;
                c.left = int32_t(left);
                c.right = int32_t(right);
                c.top = int32_t(top);
                c.bottom = int32_t(bottom);
                samples.push_back(c);
            }
        weights.assign(samples.size(), samples.empty() ? 0.0f : 1.0f / float(samples.size()));
    }
    std::vector<bool> labels;
    label(detection, samples, labels);
    filters[0].setParticles(samples);
    filters[0].setWeights(weights);
    ldaObserver.trainClassifier(image, samples, labels);
    boostObserver.trainClassifier(image, samples, labels);
    initialized = 1;
}
