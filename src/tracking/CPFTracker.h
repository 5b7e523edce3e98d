#ifndef QUORIN_TRACKING_CPFTRACKER_H
#define QUORIN_TRACKING_CPFTRACKER_H

#include <string>
#include <vector>

#include "tracking/CascadePF.h"
#include "tracking/Tracker.h"

// "CPF_TRACKER": a CascadePF per face. Association is on the windows of the
// last predict, with no overlap threshold: any overlap above 0 can match.
class CPFTracker : public Tracker {
public:
    // Seeds the particle random stream (particle_random::reseed).
    CPFTracker();
    ~CPFTracker() override = default;

    // Holds the detector, doesn't own it; FaceDetector calls this right after
    // making the tracker.
    void setDetector(CascadeDetector& cascade) { detector = &cascade; }

    // Runs every live, trained face's cascade and appends its window; keeps the
    // window per slot for the next update.
    void predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out) override;
    // Matches detections to the last predicted windows, opens a face per
    // unmatched detection, and trains each matched or new face on its
    // detection; unmatched faces die. A new face without a detector raises
    // qv_operation_error; what the observers' training raises passes through.
    void update(const IN_IMAGE& image, const std::vector<DetectionWindow>& detections) override;
    std::string name() const override;

    static Tracker* create(const std::string& parameters);

    QVArrayList<CascadePF> cascades;
    std::vector<DetectionWindow> lastPredicted;
    CascadeDetector* detector = nullptr;
};

#endif
