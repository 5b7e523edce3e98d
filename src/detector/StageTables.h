#ifndef QUORIN_DETECTOR_STAGETABLES_H
#define QUORIN_DETECTOR_STAGETABLES_H

#include <cstdint>
#include <cstring>
#include <vector>

#include "detector/CascadeStage.h"
#include "detector/ScaleFeatures.h"

// The stages of one chain (the common stages or one branch) laid out for the
// window loop, as ScaleFeatures lays out their features: per stage one record
// of 64-byte lines holding the bin thresholds, the reject thresholds and the
// bin scores bin by bin, so a stage touches two or three lines where the
// CascadeStage object (640 bytes, scores category by category) touched up to
// six, and the scores of one bin load as vectors. Stages that remap (or update
// no score) keep their CascadeStage and run through it. Results are those of
// CascadeStage::UpdateScoreAndThreshold bit for bit: the same additions in the
// same order.
//
// Records: a one-score stage is one line, bin thresholds [0, 7), the reject
// threshold at 7, the bin scores [8, 16). A stage of k > 1 scores is padded to
// w = ceil(k / 4) vectors of four: bin thresholds [0, 7), reject thresholds
// from 8, bin b's scores from 8 + 4w + 4w * b, whole lines in all.
class StageTables {
public:
    // Lays out `stages`; throws std::bad_alloc when memory runs out.
    void build(std::vector<CascadeStage> const& stages);

    int count() const { return static_cast<int>(kinds_.size()); }
    // The most scores a laid-out stage updates (0 for none): the width the
    // caller's run<N> should keep in registers.
    int width() const { return width_; }

    // Runs the chain over one window, its features from `feature`, on
    // `scores` (15 floats); returns the index of the stage that rejects, or -1.
    // The first N scores stay in registers through stages that update at most
    // N; others go through the array.
    template <int N>
    int run(ScaleFeatures::Cursor feature, uint32_t const* p, float inverseDeviation, float* scores) const;

private:
    // The chain when every stage it lays out updates one score (a branch):
    // that score stays in a register.
    int runSingle(ScaleFeatures::Cursor feature, uint32_t const* p, float inverseDeviation, float* scores) const;

    struct alignas(64) Line {
        float v[16];
    };
    // Per stage: its score count when laid out here (1 to 15), or 0 when it
    // runs through its CascadeStage (a remap, or no score).
    std::vector<uint8_t> kinds_;
    std::vector<Line> lines_;
    std::vector<CascadeStage> general_;
    bool singleOnly_ = true;
    int width_ = 0;
};

inline int StageTables::runSingle(ScaleFeatures::Cursor feature, uint32_t const* p, float inverseDeviation,
                                  float* scores) const
{
    float r = scores[0];
    float const* rec = lines_.empty() ? nullptr : lines_.front().v;
    CascadeStage const* general = general_.data();
    const int n = count();
    for (int i = 0; i < n; ++i, feature.next()) {
        const float value = feature.value(p, inverseDeviation);
        bool rejected;
        if (kinds_[static_cast<std::size_t>(i)] == 1) {
            r += rec[8 + CascadeStage::binOf(rec, value)];
            rejected = r < rec[7];
            rec += 16;
        } else {
            scores[0] = r;
            rejected = (general++)->UpdateScoreAndThreshold(value, scores);
            r = scores[0];
        }
        if (rejected) {
            scores[0] = r;
            return i;
        }
    }
    scores[0] = r;
    return -1;
}

// The vectors of four and the floats of a stage record of k scores.
inline int stageVectors(int k) { return (k + 3) / 4; }
inline int stageRecordFloats(int k) { return k == 1 ? 16 : 16 * ((8 + 36 * stageVectors(k) + 15) / 16); }

template <int N>
int StageTables::run(ScaleFeatures::Cursor feature, uint32_t const* p, float inverseDeviation, float* scores) const
{
    // Four scores per vector (SSE or NEON where there is one, else scalar
    // code from the compiler); the padding lanes add 0 against a threshold of
    // minus infinity and are masked out of the verdict.
    typedef float F4 __attribute__((vector_size(16)));
    typedef int32_t I4 __attribute__((vector_size(16)));
    if (singleOnly_)
        return runSingle(feature, p, inverseDeviation, scores);
    constexpr int W = (N + 3) / 4;
    static_assert(4 * W <= kMaxCategories, "the scores array holds the padding lanes");
    F4 r[W];
    std::memcpy(r, scores, sizeof r);
    auto store = [&] { std::memcpy(scores, r, sizeof(float) * N); };
    auto load = [&] { std::memcpy(r, scores, sizeof r); };
    const F4 dead = {kDeadScore, kDeadScore, kDeadScore, kDeadScore};
    I4 real[W];
    for (int w = 0; w < W; ++w)
        for (int l = 0; l < 4; ++l)
            real[w][l] = 4 * w + l < N ? -1 : 0;

    float const* rec = lines_.empty() ? nullptr : lines_.front().v;
    CascadeStage const* general = general_.data();
    const int n = count();
    for (int i = 0; i < n; ++i, feature.next()) {
        const float value = feature.value(p, inverseDeviation);
        const int k = kinds_[static_cast<std::size_t>(i)];
        bool rejected;
        if (k == 1) {
            r[0][0] += rec[8 + CascadeStage::binOf(rec, value)];
            rejected = r[0][0] < rec[7];
        } else if (k == N) {
            // The scores live or die by the image, so selects, not branches;
            // lane by lane the same as CascadeStage::updateScore.
            F4 const* threshold = reinterpret_cast<F4 const*>(rec + 8);
            F4 const* add = reinterpret_cast<F4 const*>(rec + 8 + 4 * W + 4 * W * CascadeStage::binOf(rec, value));
            I4 alive = {0, 0, 0, 0};
            for (int w = 0; w < W; ++w) {
                const I4 was = ~(r[w] <= dead);
                const F4 sum = r[w] + add[w];
                const I4 lives = was & ~(sum < threshold[w]);
                const F4 next = reinterpret_cast<F4>((reinterpret_cast<I4>(sum) & lives) |
                                                     (reinterpret_cast<I4>(dead) & ~lives));
                r[w] = reinterpret_cast<F4>((reinterpret_cast<I4>(next) & was) |
                                            (reinterpret_cast<I4>(r[w]) & ~was));
                alive |= lives & real[w];
            }
            rejected = (alive[0] | alive[1] | alive[2] | alive[3]) == 0;
        } else if (k != 0) {
            store();
            const int w = stageVectors(k);
            float const* add = rec + 8 + 4 * w + 4 * w * CascadeStage::binOf(rec, value);
            int deadCount = 0;
            for (int c = 0; c < k; ++c)
                deadCount += CascadeStage::updateScore(scores[c], add[c], rec[8 + c]);
            rejected = deadCount == k;
            load();
        } else {
            store();
            rejected = (general++)->UpdateScoreAndThreshold(value, scores);
            load();
        }
        if (k != 0)
            rec += stageRecordFloats(k);
        if (rejected) {
            store();
            return i;
        }
    }
    store();
    return -1;
}

#endif
