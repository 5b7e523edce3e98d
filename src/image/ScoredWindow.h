#ifndef QUORIN_IMAGE_SCOREDWINDOW_H
#define QUORIN_IMAGE_SCOREDWINDOW_H

#include <cstdint>

#include "image/DetectionWindow.h"

// Dead or impossible score throughout the detector.
constexpr float kDeadScore = -20.0f;

// Largest number of parallel scores (categories) of a cascade.
constexpr int kMaxCategories = 15;

// One hit of the detector: made by the cascade search, merged by the window
// merger, judged by the post filter. A plain value.
struct ScoredWindow {
    float score = kDeadScore;
    // On an accepted window the index of the winning cascade branch, 0 to 14.
    int32_t category = 0;
    // Filled only when the cascade has two or more branches.
    float categoryScores[kMaxCategories] = {};
    DetectionWindow window;
};

#endif
