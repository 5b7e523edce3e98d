#include "detector/CascadeStage.h"

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "detector/WindowFeature.h"

namespace {

int32_t readInt(ModelReader& reader)
{
    int32_t v = 0;
    reader.read(&v, sizeof v, 1);
    return v;
}

} // namespace

bool CascadeStage::checkHeader(ModelReader& reader)
{
    const int32_t width = readInt(reader);
    const int32_t height = readInt(reader);
    const int32_t thresholds = readInt(reader);
    return width == 24 && height == 24 && thresholds == kBinThresholds;
}

void CascadeStage::Init(ModelReader& reader, WindowFeature* target)
{
    feature = target;
    // A feature of unknown kind or a failed allocation leaves a feature that
    // evaluates to 0; the stage itself goes on reading.
    if (target != nullptr)
        target->Init(reader);
    else {
        WindowFeature scratch;
        scratch.Init(reader);
    }
    reader.read(binThresholds, sizeof(float), kBinThresholds);
    scoreCount = readInt(reader);
    if (scoreCount < 0 || scoreCount > kMaxCategories)
        throw qv_data_error("Cascade model is malformed: score count out of range");
    remapFlag = readInt(reader);
    if (remapFlag != 0) {
        for (int i = 0; i < scoreCount; ++i) {
            remap[i] = readInt(reader);
            if (remap[i] < 0 || remap[i] >= scoreCount)
                throw qv_data_error("Cascade model is malformed: remap entry out of range");
        }
    }
    for (int i = 0; i < scoreCount; ++i) {
        reader.read(binScores[i], sizeof(float), kBins);
        reader.read(&rejectThreshold[i], sizeof(float), 1);
    }
}

void CascadeStage::loadStages(ModelReader& reader, int count, CascadeStage* stages, WindowFeature* features)
{
    for (int i = 0; i < count; ++i)
        stages[i].Init(reader, &features[i]);
}

void CascadeStage::scaleFeatures(WindowFeature const* source, WindowFeature* destination, int count, float scale)
{
    for (int i = 0; i < count; ++i)
        destination[i].Init(&source[i], scale);
}

void CascadeStage::destroyStages(CascadeStage* stages)
{
    delete[] stages;
}

void CascadeStage::applyRemap(float* scores) const
{
    float saved[kMaxCategories];
    for (int i = 0; i < scoreCount; ++i)
        saved[i] = scores[i];
    for (int i = 0; i < scoreCount; ++i)
        scores[i] = saved[remap[i]];
}
