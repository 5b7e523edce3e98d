#ifndef QUORIN_TRACKING_CASCADEPF_H
#define QUORIN_TRACKING_CASCADEPF_H

#include <cstdint>
#include <vector>

#include "tracking/Observer.h"
#include "tracking/ParticleFilter.h"

// Two particle filters in a row for one face: 3000 particles weighed by the
// 5-feature discriminant, then 600 drawn from them weighed by the boosted
// vote. Both observers learn this face on line from each detection.
//
// The filters point at this object's own observers; copies and moves re-point
// them, so a CascadePF stored by value never refers into another one.
class CascadePF {
public:
    static constexpr int kParticleNumbers[2] = {3000, 600};

    CascadePF() = default;
    CascadePF(const CascadePF& other);
    CascadePF(CascadePF&& other) noexcept;
    CascadePF& operator=(const CascadePF& other);
    CascadePF& operator=(CascadePF&& other) noexcept;
    ~CascadePF() = default;

    // Both observers on `detector`, two filters with their particle numbers.
    void init(CascadeDetector& detector);
    // 0 with nothing done before the first update; otherwise runs both stages
    // and gives the last stage's mean.
    int predict(const IN_IMAGE& image, DetectionWindow* window);
    // The first call seeds filter 0 with the lattice of one-pixel shifts kept
    // inside the image; later calls hand the last stage's cloud back to
    // filter 0. Each call trains both observers on that cloud, labelled by an
    // overlap of 0.9 with the detection. Raises "Train LDA classifier with no
    // features" when no window of the cloud can be read; `initialized` then
    // stays as it was.
    void update(const IN_IMAGE& image, const DetectionWindow& detection);

    uint32_t initialized = 0;
    std::vector<ParticleFilter> filters;
    HaarLDAObserver ldaObserver;
    HaarBoostingLDAObserver boostObserver;

private:
    void pointFiltersAtOwnObservers();
};

#endif
