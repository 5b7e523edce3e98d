#ifndef QUORIN_DETECTOR_CASCADEDETECTOR_H
#define QUORIN_DETECTOR_CASCADEDETECTOR_H

#include <cstdint>
#include <string>
#include <vector>

#include "detector/CascadeStage.h"
#include "detector/ScaleFeatures.h"
#include "detector/StageTables.h"
#include "detector/WindowFeature.h"
#include "image/DetectionWindow.h"
#include "image/IntegralImage.h"
#include "image/ScoredWindow.h"

// Sliding-window cascade search over an IN_IMAGE. The features, not the image,
// are scaled: one copy of every feature per scale, with corner offsets
// prepared once per image width. Two searches: exhaustive (a grid of windows
// at every scale inside regions) and spread (one face near a known place,
// first hit wins). Hits are raw; merging is the caller's.
class CascadeDetector {
public:
    static constexpr int kScales = 17;

    // 0 turns the brightness gate on; the searches pass 2.
    enum ClassifyMode { CLASSIFY_BRIGHTNESS_GATE = 0, CLASSIFY_PLAIN = 2 };

    // Reads "model", "imageMaxSize", "faceMinSize", "faceMaxSize" from the
    // JSON object text and loads the model. Raises what the text codec and
    // the model reader raise, qv_data_error for a malformed model and
    // qv_invalid_argument for sizes the scale tables can't hold.
    explicit CascadeDetector(std::string const& configurationText);
    ~CascadeDetector();

    CascadeDetector(CascadeDetector const&) = delete;
    CascadeDetector& operator=(CascadeDetector const&) = delete;

    void initClassifiers(std::string const& modelPath);
    void defaultConfig();
    void initScaledWindows();
    void resizeSkipRow();
    void buildSpreadPattern();

    // Ratios clamped to 0..1; steps in pixels never fall below 1.
    void setSearchStep(float stepX, float stepY);
    // Non-positive sizes leave their bound alone. Raises qv_invalid_argument
    // "Face size range exceeds the initial bounds" when a bound leaves the
    // range fixed by the configuration (the new bound is stored already).
    void setFaceSizeRange(int minSize, int maxSize);
    void prepareForFastComputing(int stride);

    // Requires: `window` of the scale's size and wholly inside the image.
    // True when the window passes; `stage` then holds its category, otherwise
    // how far it got. Lays out the scale's features for the image's stride
    // when prepareForFastComputing has not; a scale without features rejects
    // at once (score -20, stage -1).
    bool classify(IN_IMAGE const& image, DetectionWindow const& window, int scale, float minAverage,
                  ClassifyMode mode, float* score, float* categoryScores, int* stage);

    // Score of one window at the scale of its size, accepted or not; -20 for
    // a window not strictly inside the image or of a size no scale serves.
    float getScore(IN_IMAGE const& image, DetectionWindow const& window);
    // The first `count` common-stage feature values of a window. Prepares
    // offsets for the image's width when needed. Raises std::out_of_range for
    // a short `values`, qv_invalid_argument for a window that
    // featureWindowFits refuses.
    void getFeature(IN_IMAGE const& image, DetectionWindow const& window, unsigned count,
                    std::vector<float>& values);
    // True when getFeature can read `window`: not empty, inside the image's
    // integral (an edge on the first or last row or column is allowed), and of
    // a size whose scale has features.
    bool featureWindowFits(IN_IMAGE const& image, DetectionWindow const& window) const;

    // One face near `window`: nearest scale first, then alternately larger and
    // smaller, inside a scale from the center outward; stops at the first hit.
    bool spreadSearch(IN_IMAGE const& image, DetectionWindow const& window, std::vector<ScoredWindow>* hits);
    // For each previous window a spread search, and when it finds nothing one
    // around the predicted window. Raises qv_data_error "Image is larger than
    // the maximum supported size" for an image side above imageMaxSize.
    void spreadDetect(IN_IMAGE const& image, std::vector<DetectionWindow> const& previous,
                      std::vector<DetectionWindow> const& predicted, std::vector<ScoredWindow>* hits);
    // All windows whose origin lies in `region` (clamped to the image), at
    // every scale of the range; a window dying in the first ten stages spares
    // its right neighbour and the one below it.
    void exhaustiveSearch(IN_IMAGE const& image, DetectionWindow const& region, std::vector<ScoredWindow>* hits);
    // Raises as spreadDetect; then an exhaustive search of each region.
    void exhaustiveDetect(IN_IMAGE const& image, std::vector<DetectionWindow> const& regions,
                          std::vector<ScoredWindow>* hits);

    int32_t imageMaxSize = 1024;
    int32_t minScale = 0;
    int32_t maxScale = 16;
    float searchStepX = 0.1f;
    float searchStepY = 0.1f;
    float scaleFactor = 1.25f;
    int32_t spreadPositions = 625;
    int32_t spreadStepX = 4;
    int32_t spreadStepY = 2;
    int32_t preparedWidth = 0;
    int32_t initialMinScale = 0;
    int32_t initialMaxScale = 16;
    int32_t windowWidth[kScales] = {};
    int32_t windowHeight[kScales] = {};
    int32_t stepX[kScales] = {};
    int32_t stepY[kScales] = {};
    std::vector<CascadeStage> commonStages;
    std::vector<std::vector<WindowFeature>> commonFeatures;
    std::vector<std::vector<CascadeStage>> branchStages;
    std::vector<std::vector<std::vector<WindowFeature>>> branchFeatures;
    std::vector<int32_t> skipRow;
    std::vector<int32_t> scaleOffsets;
    std::vector<int32_t> spiralX;
    std::vector<int32_t> spiralY;
    // The features of each scale laid out for the search loop, for the
    // stride of the last preparation (see ScaleFeatures).
    std::vector<ScaleFeatures> scaleFeatures;
    // the stages as the window loop reads them, built from the vectors above at load
    StageTables commonTables;
    std::vector<StageTables> branchTables;

private:
    ScaleFeatures const* featuresFor(int scale, int stride);
    int scaleForSize(int size) const;
    int nearestScaleForSize(int size) const;
    int searchScaleLimit(int width, int height) const;
    bool hasFeatures(int scale) const;
    void checkImageSize(IN_IMAGE const& image) const;
    void ensurePrepared(IN_IMAGE const& image);
    int minScaleForSize(int size) const;
    int maxScaleForSize(int size) const;
};

#endif
