#include "tracking/PFTracker.h"

#include "core/CreateFromText.h"

#include "tracking/ParticleCloud.h"
#include "tracking/ParticleRandom.h"

PFTracker::TrackFace::TrackFace(const DetectionWindow& rect) { particle_cloud::seedLattice(rect, particles, weights); }

DetectionWindow PFTracker::TrackFace::mean()
{
    if (!meanValid) {
        meanCache = particle_cloud::mean(particles, weights);
        meanValid = true;
    }
    return meanCache;
}

void PFTracker::TrackFace::diffuse()
{
    meanValid = false;
    particle_cloud::diffuse(particles, velocityX, velocityY);
}

void PFTracker::TrackFace::estimate(FaceEstimation& estimator, const IN_IMAGE& image)
{
    meanValid = false;
    weights.resize(particles.size());
    for (size_t i = 0; i < particles.size(); ++i) weights[i] = estimator.getLikelihood(image, particles[i]);
    particle_cloud::normalise(weights);
}

void PFTracker::TrackFace::resample()
{
    meanValid = false;
    particle_cloud::resample(particles, weights, int(particles.size()));
}

void PFTracker::TrackFace::setObservation(const DetectionWindow& detection)
{
    const DetectionWindow m = mean();
    // Halved toward zero in 64 bits, then held in int32.
    const int64_t dx = ((int64_t(detection.left) + detection.right) - m.left - m.right) / 2;
    const int64_t dy = ((int64_t(detection.top) + detection.bottom) - m.top - m.bottom) / 2;
    velocityX = int32_t(dx < INT32_MIN ? INT32_MIN : dx > INT32_MAX ? INT32_MAX : dx);
    velocityY = int32_t(dy < INT32_MIN ? INT32_MIN : dy > INT32_MAX ? INT32_MAX : dy);
}

PFTracker::PFTracker() { particle_random::reseed(); }

void PFTracker::predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out)
{
    for (size_t j = 0; j < pfFaces.size(); ++j) {
        if (!pfFaces.alive[j]) continue;
        TrackFace& f = pfFaces.items[j];
        f.resample();
        f.diffuse();
        f.estimate(estimator, image);
        const DetectionWindow m = f.mean();
        if (out) out->push_back(m);
    }
}

void PFTracker::update(const IN_IMAGE&, const std::vector<DetectionWindow>& detections)
{
    const size_t m = detections.size();
    const size_t n = pfFaces.size();

    const std::vector<int> assignment = matchDetections(
        detections, n, [&](size_t j) { return bool(pfFaces.alive[j]); },
        [&](size_t j) { return pfFaces.items[j].mean(); }, true);

    std::vector<bool> seen(n + m, false);
    for (size_t i = 0; i < m; ++i) {
        const int j = assignment[i];
        if (j >= 0) {
            pfFaces.items[size_t(j)].setObservation(detections[i]);
            seen[size_t(j)] = true;
        } else {
            const uint32_t slot = pfFaces.insert(TrackFace(detections[i]));
            if (slot < seen.size()) seen[slot] = true;
        }
    }

    // As in the simple tracker, dead slots are stacked again every frame.
    removeUnseen(pfFaces, seen, false);
    pfFaces.boundFreeSlots();

    ++frameCounter;
}

std::string PFTracker::name() const { return "PF_TRACKER"; }

Tracker* PFTracker::create(const std::string& parameters) { return createFromText<PFTracker>(parameters); }
