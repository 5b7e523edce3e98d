#include "postfilter/ILabsPostFilter.h"

#include "core/CreateFromText.h"

ILabsPostFilter::ILabsPostFilter() : LbpPatchFilter(false) {}

ILabsPostFilter::ILabsPostFilter(const std::string& path) : ILabsPostFilter()
{
    init(path);
}

PostFilter* ILabsPostFilter::create(const std::string& parameters)
{
    return createFromText<ILabsPostFilter>(parameters);
}

std::string ILabsPostFilter::name() const
{
    return "ILABS_POSTFILTER";
}

void ILabsPostFilter::loadModel(const std::string& path)
{
    classifier.init(path);
}

bool ILabsPostFilter::passesUnjudged(ScoredWindow const& hit) const
{
    return classifier.preClassify(hit.score);
}

bool ILabsPostFilter::judge(ScoredWindow const& hit, const float* values, int count) const
{
    return classifier.classify(hit.category, values, count);
}
