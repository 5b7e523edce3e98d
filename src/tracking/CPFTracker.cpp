#include "tracking/CPFTracker.h"

#include "core/CreateFromText.h"

#include "core/Errors.h"
#include "tracking/ParticleRandom.h"

CPFTracker::CPFTracker() { particle_random::reseed(); }

void CPFTracker::predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out)
{
    // Windows of slots that arise here stay empty until a predict writes them.
    lastPredicted.resize(cascades.size(), DetectionWindow{});
    for (size_t i = 0; i < cascades.size(); ++i) {
        if (!cascades.alive[i]) continue;
        DetectionWindow w{};
        if (cascades.items[i].predict(image, &w) == 0) continue;
        if (out) out->push_back(w);
        lastPredicted[i] = w;
    }
}

void CPFTracker::update(const IN_IMAGE& image, const std::vector<DetectionWindow>& detections)
{
    const size_t n = lastPredicted.size();
    const size_t m = detections.size();

    // Scored on the last prediction, with no overlap bound.
    const std::vector<int> assignment = matchDetections(
        detections, n, [&](size_t j) { return cascades.isAlive(j); }, [&](size_t j) { return lastPredicted[j]; },
        false);

    // A new face may land in a slot beyond the n predicted ones (an update
    // without a predict has n of 0), so seen covers every slot there is.
    std::vector<bool> seen(cascades.size() + m, false);
    for (size_t i = 0; i < m; ++i) {
        int j = assignment[i];
        if (j < 0) {
            if (detector == nullptr)
                throw qv_operation_error("Cascade particle filter tracker doesn't have a detector yet");
            CascadePF fresh;
            fresh.init(*detector);
            j = int(cascades.insert(fresh));
        }
        seen[size_t(j)] = true;
        cascades.items[size_t(j)].update(image, detections[i]);
    }

    // As in the simple tracker, dead slots are stacked again every frame.
    removeUnseen(cascades, seen, false);
    cascades.boundFreeSlots();
    // The windows belong to the predict just answered: the next update
    // without a predict of its own matches nothing and opens a face per
    // detection.
    lastPredicted.clear();

    ++frameCounter;
}

std::string CPFTracker::name() const { return "CPF_TRACKER"; }

Tracker* CPFTracker::create(const std::string& parameters) { return createFromText<CPFTracker>(parameters); }
