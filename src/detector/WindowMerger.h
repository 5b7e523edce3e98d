#ifndef QUORIN_DETECTOR_WINDOWMERGER_H
#define QUORIN_DETECTOR_WINDOWMERGER_H

#include <cstdint>
#include <vector>

#include "image/DetectionWindow.h"
#include "image/ScoredWindow.h"

// A merged window with its area.
struct MergedWindow : ScoredWindow {
    double area = 0.0;
};

// One input window during clustering.
struct ClusterEntry {
    int32_t index = 0;  // position in the input
    int32_t rank = 0;   // position after sorting
    int32_t parent = 0; // sorted position of the entry this one is linked to
    ScoredWindow const* window = nullptr;
};

// Reduces the clumps of raw hits around each face to one window per face:
// links windows whose Dice overlap is above 0.4 into clusters, merges each
// cluster (mean rectangle, best score, blended category scores), then drops a
// merged window that lies for more than 0.4 of the smaller area on a better one.
// Holds no result between calls; its vectors only keep their capacity.
class WindowMerger {
public:
    WindowMerger() = default;

    // Appends the merged windows to `output` (a different vector from `input`).
    void mergeWindows(std::vector<ScoredWindow> const& input, std::vector<ScoredWindow>& output);

    void clusterWindows(int count, double threshold);
    void buildGroup(int root);
    // 0: apart horizontally; 1: apart vertically; 2: overlapping or touching.
    static int intersectWindows(DetectionWindow const& a, DetectionWindow const& b, DetectionWindow& result);
    static void UpdatePosForEarlyRemove(int& position, int removed);

    std::vector<double> areas;
    std::vector<MergedWindow> merged;
    std::vector<ClusterEntry> entries;
    std::vector<std::vector<ClusterEntry*>> clusters;

private:
    void suppressOverlaps();
};

#endif
