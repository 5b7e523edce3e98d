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
    // The body of every tracker's create: null when construction or fromJson
    // throws a standard exception.
    template <typename T>
    static Tracker* createAs(const std::string& parameters)
    {
        Tracker* t = nullptr;
        try {
            t = new T();
            t->fromJson(parameters);
        } catch (const std::exception&) {
            delete t;
            return nullptr;
        }
        return t;
    }

    // Overlap below this is no evidence of the same face.
    static constexpr double kMinOverlap = 0.3;
};

#endif
