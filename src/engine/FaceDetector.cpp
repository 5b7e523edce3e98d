#include "engine/FaceDetector.h"

#include <algorithm>
#include <map>

#include "core/Errors.h"
#include "core/Json.h"
#include "detector/CascadeDetector.h"
#include "detector/WindowMerger.h"
#include "image/IntegralImage.h"
#include "postfilter/PostFilter.h"
#include "postfilter/PostFilterFactory.h"
#include "tracking/CPFTracker.h"
#include "tracking/PFTracker.h"
#include "tracking/Tracker.h"
#include "tracking/TrackerFactory.h"

namespace {

// Overlap below this does not make a tracked and a new hit one face.
constexpr double kMinOverlap = 0.3;

constexpr int kGridCells = 12;

std::string rawValue(const std::map<std::string, std::string>& items, const char* key)
{
    const auto it = items.find(key);
    return it == items.end() ? std::string() : it->second;
}

const char* trackerDescription(QVFaceTrackingMode mode)
{
    switch (static_cast<int>(mode)) {
    case 1: return "{  \"name\" : \"SIMPLE_TRACKER\",   \"param\" : {  }}";
    case 2: return "{  \"name\" : \"KF_TRACKER\",   \"param\" : {  }}";
    case 3: return "{  \"name\" : \"PF_TRACKER\",   \"param\" : {  }}";
    case 4: return "{  \"name\" : \"CPF_TRACKER\",   \"param\" : {  }}";
    default: return nullptr;
    }
}

// The matching's lists, kept by the detector between frames.
struct JoinScratch {
    std::vector<std::vector<float>> overlap;
    std::vector<int> columnOfRow;
    std::vector<int> rowOfColumn;
};

// Matches the post-filtered new hits against the tracked hits, grows tracked
// windows to a wider match, and appends the unmatched new ones.
void joinNewHits(std::vector<ScoredWindow>& trackedHits, const std::vector<ScoredWindow>& finalHits, int width,
                 int height, JoinScratch& scratch)
{
    const size_t tracked = trackedHits.size();
    const size_t fresh = finalHits.size();

    // Greedy best-first on overlaps, the same assignment the trackers use:
    // rows are tracked hits, columns new ones. Rows are resized, not made
    // anew, so that they keep their capacity.
    std::vector<int>& columnOfRow = scratch.columnOfRow;
    columnOfRow.clear();
    if (tracked > 0 && fresh > 0) {
        std::vector<std::vector<float>>& overlap = scratch.overlap;
        overlap.resize(tracked);
        for (size_t i = 0; i < tracked; ++i) {
            overlap[i].assign(fresh, 0.0f);
            for (size_t j = 0; j < fresh; ++j) {
                const float v = trackedHits[i].window.Overlap(finalHits[j].window);
                overlap[i][j] = double(v) < kMinOverlap ? 0.0f : v;
            }
        }
        Tracker::match(overlap, &columnOfRow);
    }
    std::vector<int>& rowOfColumn = scratch.rowOfColumn;
    rowOfColumn.assign(fresh, -1);
    for (size_t i = 0; i < columnOfRow.size(); ++i)
        if (columnOfRow[i] >= 0) rowOfColumn[size_t(columnOfRow[i])] = int(i);

    for (size_t j = 0; j < fresh; ++j) {
        const int i = rowOfColumn[j];
        if (i < 0) {
            trackedHits.push_back(finalHits[j]); // a new face
            continue;
        }
        // A wider new hit grows the tracked window around its own centre, as
        // long as it stays inside the frame; score and category stay those of
        // the tracked hit. Only widths decide.
        DetectionWindow& t = trackedHits[size_t(i)].window;
        const DetectionWindow& n = finalHits[j].window;
        const int newWidth = n.right - n.left;
        const int newHeight = n.bottom - n.top;
        if (newWidth <= t.right - t.left) continue;
        const int dW = newWidth - (t.right - t.left);
        const int dH = newHeight - (t.bottom - t.top);
        const int left = t.left - dW / 2;
        const int right = left + newWidth;
        const int top = t.top - dH / 2;
        const int bottom = top + newHeight;
        if (left >= 0 && right < width && top >= 0 && bottom < height) {
            t.left = left;
            t.right = right;
            t.top = top;
            t.bottom = bottom;
        }
    }
}

} // namespace

struct FaceDetector::FrameScratch {
    IN_IMAGE image;
    std::vector<DetectionWindow> previous;
    std::vector<DetectionWindow> predicted;
    std::vector<DetectionWindow> regions;
    std::vector<DetectionWindow> finalWindows;
    JoinScratch join;
};

FaceDetector::FaceDetector() = default;

FaceDetector::~FaceDetector() { release(); }

void FaceDetector::init(const std::string& configurationText)
{
    release();
    const std::map<std::string, std::string> items = parseJsonObject(configurationText);
    const std::string detectorText = rawValue(items, "detector");
    const std::string postfilterText = rawValue(items, "postfilter");

    detector = new CascadeDetector(detectorText);
    merger = new WindowMerger();
    // A malformed post filter description is the same failure as an unknown
    // name: the caller learns only that no filter could be made.
    PostFilter* filter = nullptr;
    try {
        filter = PostFilterFactory::instance().createInstance(postfilterText);
    } catch (const std::exception&) {
        filter = nullptr;
    }
    if (filter == nullptr) {
        release();
        throw qv_operation_error("Failed to create PostFilter");
    }
    postFilter = filter;
}

void FaceDetector::release()
{
    delete detector;
    detector = nullptr;
    delete merger;
    merger = nullptr;
    delete postFilter;
    postFilter = nullptr;
    delete tracker;
    tracker = nullptr;
    delete scratch;
    scratch = nullptr;
}

void FaceDetector::setTrackingMode(QVFaceTrackingMode mode)
{
    delete tracker;
    tracker = nullptr;
    const char* description = trackerDescription(mode);
    if (description == nullptr) return;
    // An unregistered name gives null: tracking simply stays off.
    tracker = TrackerFactory::instance().createInstance(description);
    // The particle trackers weigh their clouds with this cascade, which
    // outlives them (release destroys the tracker with it).
    if (PFTracker* pf = dynamic_cast<PFTracker*>(tracker)) {
        FaceEstimation estimation;
        estimation.setDetector(detector);
        pf->setEstimator(estimation);
    } else if (CPFTracker* cpf = dynamic_cast<CPFTracker*>(tracker)) {
        if (detector != nullptr) cpf->setDetector(*detector);
    }
}

void FaceDetector::setSearchStep(float stepX, float stepY)
{
    if (detector == nullptr) throw qv_operation_error("FaceDetector is not initialized");
    detector->setSearchStep(stepX, stepY);
}

void FaceDetector::setFaceSizeRange(int minSize, int maxSize)
{
    if (detector == nullptr) throw qv_operation_error("FaceDetector is not initialized");
    detector->setFaceSizeRange(minSize, maxSize);
}

DetectionWindow FaceDetector::exhaustiveDetectSubRegion(int width, int height) const
{
    const int columns = width < height ? 3 : 4;
    const int rows = kGridCells / columns;
    const int k = tracker != nullptr ? int(tracker->frameCounter % kGridCells) : 0;
    const int cellWidth = width / columns;
    const int cellHeight = height / rows;
    const int column = k % columns;
    const int row = k / columns;
    DetectionWindow cell;
    cell.left = column * cellWidth;
    cell.right = cell.left + cellWidth;
    cell.top = row * cellHeight;
    cell.bottom = (row + 1) * cellHeight;
    return cell;
}

void FaceDetector::detect(const unsigned char* gray, int width, int height, std::vector<FaceData>& faces)
{
    if (detector == nullptr || merger == nullptr || postFilter == nullptr)
        throw qv_operation_error("FaceDetector is not initialized");
    if (gray == nullptr) throw qv_invalid_argument("Frame has no pixels");
    if (width <= 0 || height <= 0) throw qv_invalid_argument("Frame size must be positive");
    // Tested before anything is built or the tracker predicts, so that a
    // refused frame changes nothing.
    if (std::max(width, height) > detector->imageMaxSize)
        throw qv_data_error("Image is larger than the maximum supported size");

    trackedHits.clear();
    rawHits.clear();
    mergedHits.clear();
    finalHits.clear();

    if (scratch == nullptr) scratch = new FrameScratch();
    FrameScratch& frame = *scratch;

    // The host's rows are adjacent: the stride is the width. The integral
    // image is rebuilt in place and grows only for a larger frame.
    IN_IMAGE& image = frame.image;
    if (!image.Init(width, height, width, gray)) throw qv_operation_error("Frame could not be prepared for the search");

    frame.regions.clear();
    if (tracker != nullptr) {
        std::vector<DetectionWindow>& previous = frame.previous;
        std::vector<DetectionWindow>& predicted = frame.predicted;
        previous.clear();
        predicted.clear();
        tracker->getPreviousFaces(&previous);
        tracker->predict(image, &predicted);
        // spreadDetect pairs the two lists by index; a tracker that predicts
        // fewer windows than it knows must not make it read past the end.
        if (predicted.size() < previous.size()) predicted.resize(previous.size(), DetectionWindow());
        detector->spreadDetect(image, previous, predicted, &trackedHits);
        frame.regions.push_back(exhaustiveDetectSubRegion(width, height));
    } else {
        DetectionWindow whole;
        whole.left = 0;
        whole.right = width;
        whole.top = 0;
        whole.bottom = height;
        frame.regions.push_back(whole);
    }
    detector->exhaustiveDetect(image, frame.regions, &rawHits);

    merger->mergeWindows(rawHits, mergedHits);
    postFilter->filter(image, mergedHits, &finalHits);

    if (tracker != nullptr) {
        joinNewHits(trackedHits, finalHits, width, height, frame.join);
        finalHits.clear();
        merger->mergeWindows(trackedHits, finalHits);
        std::vector<DetectionWindow>& windows = frame.finalWindows;
        windows.clear();
        for (const ScoredWindow& hit : finalHits) windows.push_back(hit.window);
        tracker->update(image, windows);
    }

    faces.resize(finalHits.size());
    for (size_t i = 0; i < finalHits.size(); ++i) {
        const DetectionWindow& w = finalHits[i].window;
        faces[i].setFaceRect(Rect2<int32_t>(w.left, w.top, w.right, w.bottom));
        faces[i].setFaceScore(finalHits[i].score);
    }
}
