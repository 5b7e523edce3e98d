#include "postfilter/LbpSvmPostFilter.h"

#include "core/CreateFromText.h"

#include "container/ModelReader.h"

LbpSvmPostFilter::LbpSvmPostFilter() : LbpPatchFilter(true) {}

LbpSvmPostFilter::LbpSvmPostFilter(const std::string& path) : LbpSvmPostFilter()
{
    init(path);
}

PostFilter* LbpSvmPostFilter::create(const std::string& parameters)
{
    return createFromText<LbpSvmPostFilter>(parameters);
}

std::string LbpSvmPostFilter::name() const
{
    return "LBP_SVM_POSTFILTER";
}

void LbpSvmPostFilter::loadModel(const std::string& path)
{
    ModelReader reader(path, ModelReader::RAW);
    // Both models stand one after the other in the one file.
    primaryClassifier.init(reader);
    secondaryClassifier.init(reader);
}

bool LbpSvmPostFilter::judge(ScoredWindow const& hit, const float* values, int count) const
{
    const SvmClassifier& model = hit.category == 0 ? primaryClassifier : secondaryClassifier;
    return model.classify(values, count) == 1;
}
