#ifndef QUORIN_TRACKING_PARTICLEFILTER_H
#define QUORIN_TRACKING_PARTICLEFILTER_H

#include <vector>

#include "image/DetectionWindow.h"

class IN_IMAGE;
class Observer;

// The particle machine of PFTracker with a pluggable observation model and no
// velocity. It keeps the observer's address: whoever owns both must re-point
// it when they move (CascadePF does).
class ParticleFilter {
public:
    void setParticleNumber(int n) { particleNumber = n; }
    void setObserver(const Observer& o) { observer = &o; }
    const Observer* getObserver() const { return observer; }

    std::vector<DetectionWindow>& getParticles() { return particles; }
    std::vector<float>& getWeights() { return weights; }
    // Copies; the mean cache is left as it is.
    void setParticles(const std::vector<DetectionWindow>& p) { particles = p; }
    void setWeights(const std::vector<float>& w) { weights = w; }

    DetectionWindow getMean();
    void predict() {} // a step of the interface with nothing to do
    // Jitter of up to a tenth of each particle's size per axis.
    void diffuse();
    // Weights from the observer, normalised; a cloud with no evidence (sum of
    // 0 or not a number) gets uniform weights. Raises qv_operation_error
    // without an observer.
    void estimate(const IN_IMAGE& image);
    // Draws particleNumber particles by weight from the present cloud; an
    // empty cloud stays empty.
    void resample();

    int particleNumber = 0;
    const Observer* observer = nullptr;
    std::vector<DetectionWindow> particles;
    std::vector<float> weights;
    DetectionWindow meanCache{};
    bool meanValid = false;
};

#endif
