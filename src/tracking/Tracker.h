#ifndef QUORIN_TRACKING_TRACKER_H
#define QUORIN_TRACKING_TRACKER_H

#include <cstdint>
#include <exception>
#include <string>
#include <vector>

#include "image/DetectionWindow.h"
#include "tracking/QVArrayList.h"

class IN_IMAGE;

// Keeps faces alive across frames. The base class is itself the simple tracker
// ("SIMPLE_TRACKER"): one rectangle and one velocity per face. Subclasses swap
// the motion model but keep the rhythm of update: score all detections against
// all live faces, assign greedily one-to-one, refresh matched faces, open a face
// per unmatched detection, drop every face no detection confirmed this frame.
class Tracker {
public:
    struct TrackFace {
        DetectionWindow rect;
        double velocityX = 0.0; // centre shift between the last two matched frames
        double velocityY = 0.0;
    };

    Tracker() = default;
    virtual ~Tracker() = default;

    // Appends the rectangle of every live face, in slot order.
    virtual void getPreviousFaces(std::vector<DetectionWindow>* out);
    // Appends each live face's rectangle moved by its velocity, in slot order.
    // Does not change the tracks.
    virtual void predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out);
    // Takes the frame's final detections; advances frameCounter by one.
    virtual void update(const IN_IMAGE& image, const std::vector<DetectionWindow>& detections);
    // The trackers have no configuration: "{}" out, anything in.
    virtual std::string toJson() const;
    virtual void fromJson(const std::string& text);
    virtual std::string name() const;

    // Null when construction or fromJson throws a standard exception.
    static Tracker* create(const std::string& parameters);

    // Greedy best-first assignment. scores has one row per detection and one
    // column per track slot; assignment[row] becomes the column or -1. Values
    // of 0 are never chosen; among equal values the first in row-major order
    // wins. Rows shorter than the first are read as zero-padded.
    static void match(const std::vector<std::vector<float>>& scores, std::vector<int>* assignment);

    uint32_t frameCounter = 0; // number of update calls so far
    QVArrayList<TrackFace> faces;

protected:
    // Overlap below this is no evidence of the same face.
    static constexpr double kMinOverlap = 0.3;

    // The matching half of every update: detection i is scored against the
    // window `windowOf(j)` of each of the n slots for which `alive(j)` holds,
    // by their overlap, cut to 0 below kMinOverlap when `cut`. Returns one
    // entry per detection: the slot it continues, or -1 for a new face.
    template <typename Alive, typename WindowOf>
    static std::vector<int> matchDetections(const std::vector<DetectionWindow>& detections, size_t n, Alive alive,
                                            WindowOf windowOf, bool cut)
    {
        const size_t m = detections.size();
        std::vector<std::vector<float>> scores(m, std::vector<float>(n, 0.0f));
        for (size_t j = 0; j < n; ++j) {
            if (!alive(j)) continue;
            const DetectionWindow w = windowOf(j);
            for (size_t i = 0; i < m; ++i) {
                const float s = detections[i].Overlap(w);
                scores[i][j] = cut && double(s) < kMinOverlap ? 0.0f : s;
            }
        }
        std::vector<int> assignment;
        match(scores, &assignment);
        assignment.resize(m, -1);
        return assignment;
    }

    // The closing half: every slot that no detection of this frame marked in
    // `seen` is removed; with `liveOnly` only the slots still alive.
    template <typename T>
    static void removeUnseen(QVArrayList<T>& list, const std::vector<bool>& seen, bool liveOnly)
    {
        for (size_t j = 0; j < list.size(); ++j)
            if ((!liveOnly || list.alive[j]) && (j >= seen.size() || !seen[j])) list.remove(uint32_t(j));
    }
};

#endif
