#ifndef QUORIN_TRACKING_PFTRACKER_H
#define QUORIN_TRACKING_PFTRACKER_H

#include <cstdint>
#include <string>
#include <vector>

#include "tracking/FaceEstimation.h"
#include "tracking/Tracker.h"

// "PF_TRACKER": each face is a cloud of candidate rectangles. predict
// resamples, jitters and re-weighs the cloud with the cascade's score; the
// face is the weighted mean. A detection never touches the particles: it only
// sets the velocity with which the cloud drifts.
class PFTracker : public Tracker {
public:
    struct TrackFace {
        std::vector<DetectionWindow> particles;
        std::vector<float> weights;
        int32_t velocityX = 0;
        int32_t velocityY = 0;
        DetectionWindow meanCache{};
        bool meanValid = false;

        TrackFace() = default;
        // 121 particles on the lattice of one-pixel shifts around rect.
        explicit TrackFace(const DetectionWindow& rect);

        DetectionWindow mean();
        void diffuse();
        // Weights from the estimator, normalised; all-zero likelihoods give
        // uniform weights.
        void estimate(FaceEstimation& estimator, const IN_IMAGE& image);
        void resample();
        // Velocity = displacement from the cloud's mean to the detection.
        void setObservation(const DetectionWindow& detection);
    };

    // Seeds the particle random stream (particle_random::reseed).
    PFTracker();
    ~PFTracker() override = default;

    void setEstimator(const FaceEstimation& e) { estimator = e; }

    // Per live face: resample, diffuse, estimate, and append the mean.
    // Raises "Face estimator doesn't have a detector yet" without a detector.
    void predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out) override;
    // Association on the clouds' means (overlap of 0.3 at least); matched
    // faces take the detection as their velocity, unmatched ones die.
    void update(const IN_IMAGE& image, const std::vector<DetectionWindow>& detections) override;
    std::string name() const override;

    static Tracker* create(const std::string& parameters);

    QVArrayList<TrackFace> pfFaces;
    FaceEstimation estimator;
};

#endif
