#include "detector/CascadeDetector.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <stdexcept>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "core/Json.h"

namespace {

// Smallest stage record: a feature kind, the bin thresholds, scoreCount and
// remapFlag. Bounds stage counts by the bytes actually present, so that a
// corrupt count can't make the loader reserve memory for stages that aren't there.
constexpr uint32_t kMinStageBytes = 4 + 4 * CascadeStage::kBinThresholds + 4 + 4;

// Largest image side the scratch row may be sized for.
constexpr int32_t kImageMaxSizeLimit = 1 << 16;

int32_t readCount(ModelReader& reader, uint32_t budget)
{
    int32_t n = 0;
    reader.read(&n, sizeof n, 1);
    if (n < 0 || static_cast<uint32_t>(n) > budget / kMinStageBytes)
        throw qv_data_error("Cascade model is malformed: stage count out of range");
    return n;
}

// trunc(log(size / 24) / log(factor)), or INT_MIN where the log is undefined.
int scaleIndex(int size, double logFactor, double bias)
{
    if (size <= 0)
        return std::numeric_limits<int>::min();
    return static_cast<int>(std::log(size / 24.0) / logFactor + bias);
}

DetectionWindow clampToImage(DetectionWindow w, int width, int height)
{
    w.right = std::min(w.right, width);
    w.left = std::max(w.left, 0);
    w.bottom = std::min(w.bottom, height);
    w.top = std::max(w.top, 0);
    return w;
}

} // namespace

CascadeDetector::CascadeDetector(std::string const& configurationText)
{
    defaultConfig();
    const std::map<std::string, std::string> items = parseJsonObject(configurationText);
    std::string model;
    int configuredMaxSize = 0;
    int faceMinSize = 0;
    int faceMaxSize = 0;
    jsonObjectItemToNamedValue(items, "model", model);
    jsonObjectItemToNamedValue(items, "imageMaxSize", configuredMaxSize);
    jsonObjectItemToNamedValue(items, "faceMinSize", faceMinSize);
    jsonObjectItemToNamedValue(items, "faceMaxSize", faceMaxSize);

    if (configuredMaxSize > kImageMaxSizeLimit)
        throw qv_invalid_argument("Image maximum size is out of range");
    if (configuredMaxSize > 0)
        imageMaxSize = configuredMaxSize;
    resizeSkipRow();
    if (faceMinSize > 0)
        minScale = minScaleForSize(faceMinSize);
    const int decidingSize = faceMaxSize > 0 ? faceMaxSize : configuredMaxSize;
    if (decidingSize > 0)
        maxScale = maxScaleForSize(decidingSize);
    // The size tables hold 17 scales; a larger range would index past them.
    if (maxScale >= kScales)
        throw qv_invalid_argument("Face size range exceeds the supported scales");
    initialMinScale = minScale;
    initialMaxScale = maxScale;

    initClassifiers(model);
    initScaledWindows();
    buildSpreadPattern();
}

CascadeDetector::~CascadeDetector() = default;

void CascadeDetector::defaultConfig()
{
    imageMaxSize = 1024;
    minScale = 0;
    maxScale = 16;
    searchStepX = 0.1f;
    searchStepY = 0.1f;
    scaleFactor = 1.25f;
    spreadPositions = 625;
    spreadStepX = 4;
    spreadStepY = 2;
}

int CascadeDetector::minScaleForSize(int size) const
{
    const double v = std::ceil(std::log(size / 24.0) / static_cast<double>(std::log(scaleFactor)));
    return std::max(0, static_cast<int>(std::min(v, 1e6)));
}

int CascadeDetector::maxScaleForSize(int size) const
{
    const double v = std::floor(std::log(size / 24.0) / static_cast<double>(std::log(scaleFactor)));
    return std::max(0, static_cast<int>(std::min(v, 1e6)));
}

void CascadeDetector::initClassifiers(std::string const& modelPath)
{
    ModelReader reader(modelPath, ModelReader::RAW);
    const uint32_t budget = reader.rawSize();
    CascadeStage::checkHeader(reader); // a wrong header is not acted on

    // a model that fails to load leaves no stages to run
    commonTables = StageTables();
    branchTables.clear();
    const int32_t commonCount = readCount(reader, budget);
    commonStages.assign(static_cast<size_t>(commonCount), CascadeStage());
    commonFeatures.clear();
    commonFeatures.resize(static_cast<size_t>(maxScale) + 1);
    commonFeatures[0].resize(static_cast<size_t>(commonCount));
    CascadeStage::loadStages(reader, commonCount, commonStages.data(), commonFeatures[0].data());

    const int firstScaled = std::max(minScale, 1);
    for (int s = firstScaled; s <= maxScale; ++s) {
        const float factor = static_cast<float>(std::pow(static_cast<double>(scaleFactor), static_cast<double>(s)));
        commonFeatures[s].resize(static_cast<size_t>(commonCount));
        CascadeStage::scaleFeatures(commonFeatures[0].data(), commonFeatures[s].data(), commonCount, factor);
    }

    const int branches = commonCount > 0 ? commonStages.back().scoreCount : 0;
    branchStages.clear();
    branchStages.resize(static_cast<size_t>(branches));
    branchFeatures.clear();
    branchFeatures.resize(static_cast<size_t>(maxScale) + 1);
    branchFeatures[0].resize(static_cast<size_t>(branches));
    for (int b = 0; b < branches; ++b) {
        const int32_t count = readCount(reader, budget);
        branchStages[b].resize(static_cast<size_t>(count));
        branchFeatures[0][b].resize(static_cast<size_t>(count));
        CascadeStage::loadStages(reader, count, branchStages[b].data(), branchFeatures[0][b].data());
    }
    for (int s = firstScaled; s <= maxScale; ++s) {
        const float factor = static_cast<float>(std::pow(static_cast<double>(scaleFactor), static_cast<double>(s)));
        branchFeatures[s].resize(static_cast<size_t>(branches));
        for (int b = 0; b < branches; ++b) {
            const int count = static_cast<int>(branchStages[b].size());
            branchFeatures[s][b].resize(static_cast<size_t>(count));
            CascadeStage::scaleFeatures(branchFeatures[0][b].data(), branchFeatures[s][b].data(), count, factor);
        }
    }
    commonTables.build(commonStages);
    branchTables.assign(branchStages.size(), StageTables());
    for (std::size_t b = 0; b < branchStages.size(); ++b)
        branchTables[b].build(branchStages[b]);
    preparedWidth = 0;
    scaleFeatures.clear();
}

void CascadeDetector::initScaledWindows()
{
    for (int i = 0; i < kScales; ++i) {
        const float factor = static_cast<float>(std::pow(static_cast<double>(scaleFactor), static_cast<double>(i)));
        const int size = static_cast<int>(static_cast<double>(factor * 24.0f) + 0.5);
        windowWidth[i] = size;
        windowHeight[i] = size;
        // A step that rounds to 0 pixels would stall the search; hold it at 1.
        stepX[i] = std::max(1, static_cast<int>(static_cast<double>(static_cast<float>(size) * searchStepX) + 0.5));
        stepY[i] = std::max(1, static_cast<int>(static_cast<double>(static_cast<float>(size) * searchStepY) + 0.5));
    }
}

void CascadeDetector::resizeSkipRow()
{
    skipRow.resize(static_cast<size_t>(imageMaxSize), 0);
}

void CascadeDetector::buildSpreadPattern()
{
    scaleOffsets.clear();
    const int span = maxScale - minScale;
    if (span >= 0) {
        scaleOffsets.push_back(0);
        for (int k = 1; k <= span; ++k) {
            scaleOffsets.push_back(k);
            scaleOffsets.push_back(-k);
        }
    }

    spiralX.clear();
    spiralY.clear();
    const size_t limit = static_cast<size_t>(std::max(spreadPositions, 0));
    auto add = [&](int x, int y) {
        if (spiralX.size() < limit) {
            spiralX.push_back(x);
            spiralY.push_back(y);
        }
    };
    add(0, 0);
    for (int r = 1; spiralX.size() < limit; ++r) {
        for (int y = -(r - 1); y <= r - 1; ++y)
            add(-r, y);
        for (int y = -(r - 1); y <= r - 1; ++y)
            add(r, y);
        for (int x = -r; x <= r; ++x)
            add(x, -r);
        for (int x = -r; x <= r; ++x)
            add(x, r);
    }
}

void CascadeDetector::setSearchStep(float x, float y)
{
    searchStepX = std::min(std::max(x, 0.0f), 1.0f);
    searchStepY = std::min(std::max(y, 0.0f), 1.0f);
    if (std::isnan(searchStepX))
        searchStepX = 0.0f;
    if (std::isnan(searchStepY))
        searchStepY = 0.0f;
    initScaledWindows();
}

void CascadeDetector::setFaceSizeRange(int minSize, int maxSize)
{
    if (minSize > 0) {
        minScale = minScaleForSize(minSize);
        if (initialMinScale > minScale)
            throw qv_invalid_argument("Face size range exceeds the initial bounds");
    }
    if (maxSize > 0) {
        maxScale = maxScaleForSize(maxSize);
        if (initialMaxScale < maxScale)
            throw qv_invalid_argument("Face size range exceeds the initial bounds");
    }
}

void CascadeDetector::prepareForFastComputing(int stride)
{
    // Every scale that has features is prepared, not only the present range:
    // a scale that rejoins the range later must never run on offsets of an
    // older width.
    scaleFeatures.resize(commonFeatures.size());
    for (int s = 0; s < static_cast<int>(commonFeatures.size()); ++s) {
        for (WindowFeature& f : commonFeatures[s])
            f.prepareOffsets(stride);
        for (std::vector<WindowFeature>& branch : branchFeatures[s])
            for (WindowFeature& f : branch)
                f.prepareOffsets(stride);
        if (hasFeatures(s))
            scaleFeatures[s].build(commonFeatures[s], branchFeatures[s], stride);
        else
            scaleFeatures[s].clear();
    }
}

ScaleFeatures const* CascadeDetector::featuresFor(int scale, int stride)
{
    if (scale < 0 || scale >= static_cast<int>(commonFeatures.size()) || !hasFeatures(scale))
        return nullptr;
    if (scaleFeatures.size() != commonFeatures.size())
        scaleFeatures.resize(commonFeatures.size());
    ScaleFeatures& features = scaleFeatures[static_cast<size_t>(scale)];
    if (features.stride() != stride && !features.build(commonFeatures[scale], branchFeatures[scale], stride))
        return nullptr;
    return &features;
}

bool CascadeDetector::hasFeatures(int scale) const
{
    if (scale < 0 || scale > initialMaxScale || scale >= kScales)
        return false;
    return scale == 0 || scale >= std::max(initialMinScale, 1);
}

int CascadeDetector::scaleForSize(int size) const
{
    return scaleIndex(size, std::log(static_cast<double>(scaleFactor)), 0.0);
}

int CascadeDetector::nearestScaleForSize(int size) const
{
    return scaleIndex(size, std::log(static_cast<double>(scaleFactor)), 0.5);
}

int CascadeDetector::searchScaleLimit(int width, int height) const
{
    return std::min(std::min(scaleForSize(width), scaleForSize(height)), maxScale);
}

void CascadeDetector::checkImageSize(IN_IMAGE const& image) const
{
    if (imageMaxSize < std::max(image.pixelWidth(), image.pixelHeight()))
        throw qv_data_error("Image is larger than the maximum supported size");
}

void CascadeDetector::ensurePrepared(IN_IMAGE const& image)
{
    if (image.pixelWidth() != preparedWidth) {
        prepareForFastComputing(image.stride);
        preparedWidth = image.pixelWidth();
    }
}

bool CascadeDetector::classify(IN_IMAGE const& image, DetectionWindow const& window, int scale, float minAverage,
                               ClassifyMode mode, float* score, float* categoryScores, int* stage)
{
    if (mode == CLASSIFY_BRIGHTNESS_GATE && image.ComputeAvg(window) < minAverage) {
        *score = kDeadScore;
        *stage = -1;
        return false;
    }
    ScaleFeatures const* features = featuresFor(scale, image.stride);
    if (features == nullptr) {
        *score = kDeadScore;
        *stage = -1;
        return false;
    }
    const float inverseDeviation = image.ComputeNorm(window);
    float scores[kMaxCategories] = {};
    uint32_t const* p = image.data + (window.left + image.stride * window.top);

    const int commonCount = commonTables.count();
    const int rejectedAt = commonTables.width() > 3 ? commonTables.run<5>(features->common(), p, inverseDeviation, scores)
                                            : commonTables.run<3>(features->common(), p, inverseDeviation, scores);
    if (rejectedAt >= 0) {
        *score = scores[0];
        *stage = rejectedAt;
        return false;
    }

    const int branches = static_cast<int>(branchTables.size());
    if (branches < 2) {
        *score = scores[0];
        *stage = 0;
        return true;
    }
    float best = kDeadScore;
    int bestIndex = 0;
    for (int b = 0; b < branches; ++b) {
        categoryScores[b] = scores[b];
        if (scores[b] > best) {
            best = scores[b];
            bestIndex = b;
        }
    }
    scores[0] = best;

    if (branchTables[static_cast<std::size_t>(bestIndex)].run<3>(features->branch(bestIndex), p, inverseDeviation,
                                                                   scores) >= 0) {
        *score = scores[0];
        *stage = commonCount;
        return false;
    }
    *score = scores[0];
    *stage = bestIndex;
    return true;
}

float CascadeDetector::getScore(IN_IMAGE const& image, DetectionWindow const& window)
{
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    if (!(window.left > 0 && window.top > 0 && window.right < W && window.bottom < H))
        return kDeadScore;
    ensurePrepared(image);
    const int scale = std::min(scaleForSize(window.height()), scaleForSize(window.width()));
    if (!hasFeatures(scale))
        return kDeadScore;
    float score = kDeadScore;
    float categoryScores[kMaxCategories] = {};
    int stage = 0;
    classify(image, window, scale, 0.0f, CLASSIFY_PLAIN, &score, categoryScores, &stage);
    return score;
}

void CascadeDetector::getFeature(IN_IMAGE const& image, DetectionWindow const& window, unsigned count,
                                 std::vector<float>& values)
{
    if (count < 1)
        return;
    if (!featureWindowFits(image, window))
        throw qv_invalid_argument("Feature window lies outside the image or the detector's scales");
    const int scale = std::min(scaleForSize(window.height()), scaleForSize(window.width()));
    // Offsets of another width would read the wrong pixels or past the image.
    ensurePrepared(image);
    const float inverseDeviation = image.ComputeNorm(window);
    const int offset = window.left + image.stride * window.top;
    std::vector<WindowFeature> const& features = commonFeatures[scale];
    for (unsigned i = 0; i < count; ++i)
        values.at(i) = features.at(i).Eval(image, inverseDeviation, offset);
}

bool CascadeDetector::featureWindowFits(IN_IMAGE const& image, DetectionWindow const& window) const
{
    // The integral has one more row and column than the image, so a window may
    // reach the last pixel; the trackers' observers test their own, tighter
    // bounds before asking.
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    if (!(window.left >= 0 && window.top >= 0 && window.right <= W && window.bottom <= H))
        return false;
    if (window.right <= window.left || window.bottom <= window.top)
        return false;
    return hasFeatures(std::min(scaleForSize(window.height()), scaleForSize(window.width())));
}

bool CascadeDetector::spreadSearch(IN_IMAGE const& image, DetectionWindow const& window,
                                   std::vector<ScoredWindow>* hits)
{
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    checkImageSize(image);
    ensurePrepared(image);
    const int scaleLimit = std::min(searchScaleLimit(W, H), initialMaxScale);
    const int centerScale =
        std::max(std::min(nearestScaleForSize(window.height()), nearestScaleForSize(window.width())), minScale);
    const int lowest = std::max(minScale, initialMinScale);
    const int64_t centerX = (static_cast<int64_t>(window.left) + window.right) / 2;
    const int64_t centerY = (static_cast<int64_t>(window.top) + window.bottom) / 2;

    for (const int o : scaleOffsets) {
        const int s = std::min(centerScale, scaleLimit) + o;
        if (s < lowest || s > scaleLimit || !hasFeatures(s))
            continue;
        const int w = windowWidth[s];
        const int h = windowHeight[s];
        for (size_t j = 0; j < spiralX.size(); ++j) {
            const int64_t cx = centerX + static_cast<int64_t>(spreadStepX) * spiralX[j];
            const int64_t cy = centerY + static_cast<int64_t>(spreadStepY) * spiralY[j];
            const int64_t left = cx - w / 2;
            const int64_t top = cy - h / 2;
            if (!(left >= 0 && left + w < W && top >= 0 && top + h < H))
                continue;
            DetectionWindow candidate;
            candidate.left = static_cast<int32_t>(left);
            candidate.right = static_cast<int32_t>(left + w);
            candidate.top = static_cast<int32_t>(top);
            candidate.bottom = static_cast<int32_t>(top + h);
            ScoredWindow hit;
            int stage = 0;
            if (classify(image, candidate, s, 0.0f, CLASSIFY_PLAIN, &hit.score, hit.categoryScores, &stage)) {
                hit.category = stage;
                hit.window = candidate;
                hits->push_back(hit);
                return true;
            }
        }
    }
    return false;
}

void CascadeDetector::spreadDetect(IN_IMAGE const& image, std::vector<DetectionWindow> const& previous,
                                   std::vector<DetectionWindow> const& predicted, std::vector<ScoredWindow>* hits)
{
    checkImageSize(image);
    ensurePrepared(image);
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    for (size_t i = 0; i < previous.size(); ++i) {
        if (spreadSearch(image, previous[i], hits))
            continue;
        if (i < predicted.size())
            spreadSearch(image, clampToImage(predicted[i], W, H), hits);
    }
}

void CascadeDetector::exhaustiveSearch(IN_IMAGE const& image, DetectionWindow const& requested,
                                       std::vector<ScoredWindow>* hits)
{
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    // Idempotent after exhaustiveDetect; they keep a direct call from reading
    // outside the image or the scratch row.
    checkImageSize(image);
    ensurePrepared(image);
    DetectionWindow region = clampToImage(requested, W, H);
    region.left = std::min(region.left, W);
    region.top = std::min(region.top, H);

    const int scaleLimit = std::min(searchScaleLimit(W, H), initialMaxScale);
    const int lowest = std::max(minScale, initialMinScale);
    for (int scale = lowest; scale <= scaleLimit; ++scale) {
        if (!hasFeatures(scale))
            continue;
        std::fill(skipRow.begin(), skipRow.end(), 0);
        int32_t* skip = skipRow.data();
        const int w = windowWidth[scale];
        const int h = windowHeight[scale];
        const int sx = stepX[scale];
        const int sy = stepY[scale];
        for (int y = region.top; y < region.bottom && y + h < H; y += sy) {
            for (int x = region.left; x < region.right && x + w < W; x += sx) {
                const int column = (x - region.left) / sx;
                if (skip[column] > 0) {
                    --skip[column];
                    continue;
                }
                DetectionWindow window;
                window.left = x;
                window.right = x + w;
                window.top = y;
                window.bottom = y + h;
                float score;
                float categoryScores[kMaxCategories];
                int stage;
                if (classify(image, window, scale, 0.0f, CLASSIFY_PLAIN, &score, categoryScores, &stage)) {
                    ScoredWindow hit;
                    hit.score = score;
                    hit.category = stage;
                    if (branchStages.size() >= 2)
                        std::memcpy(hit.categoryScores, categoryScores, sizeof categoryScores);
                    hit.window = window;
                    hits->push_back(hit);
                } else if (stage <= 9) {
                    skip[column] = 1;
                    skip[column + 1] = 1;
                }
            }
        }
    }
}

void CascadeDetector::exhaustiveDetect(IN_IMAGE const& image, std::vector<DetectionWindow> const& regions,
                                       std::vector<ScoredWindow>* hits)
{
    checkImageSize(image);
    ensurePrepared(image);
    const int W = image.pixelWidth();
    const int H = image.pixelHeight();
    for (DetectionWindow const& region : regions)
        exhaustiveSearch(image, clampToImage(region, W, H), hits);
}
