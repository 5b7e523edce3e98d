#include "postfilter/ILabsPostFilter.h"

#include <exception>
#include <map>
#include <memory>

#include "core/Errors.h"
#include "core/Json.h"
#include "image/Image.h"
#include "image/IntegralImage.h"

ILabsPostFilter::ILabsPostFilter() : descriptor(LBP_CELL_NUMBER, LBP_CELL_NUMBER) {}

ILabsPostFilter::ILabsPostFilter(const std::string& path) : ILabsPostFilter()
{
    init(path);
}

void ILabsPostFilter::init(const std::string& path)
{
    modelPath = path;
    descriptor.init(LBP_CELL_NUMBER, LBP_CELL_NUMBER);
    classifier.init(path);
}

PostFilter* ILabsPostFilter::create(const std::string& parameters)
{
    std::unique_ptr<ILabsPostFilter> filter(new ILabsPostFilter());
    try {
        filter->fromJson(parameters);
    } catch (const std::exception&) {
        return nullptr;
    }
    return filter.release();
}

void ILabsPostFilter::fromJson(std::string const& text)
{
    const std::map<std::string, std::string> items = parseJsonObject(text);
    std::string path;
    if (jsonObjectItemToNamedValue(items, "model", path))
        init(path);
}

std::string ILabsPostFilter::toJson() const
{
    return "{" + jsonNamedValue("model", modelPath) + "}";
}

std::string ILabsPostFilter::name() const
{
    return "ILABS_POSTFILTER";
}

void ILabsPostFilter::extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels,
                              float* out) const
{
    const int size = SCALED_FACE_SIZE;
    image.CropScaleToImage(&patch, &hit.window);
    for (int r = 0; r < size; ++r)
        for (int c = 0; c < size; ++c)
            pixels[r * size + c] = static_cast<float>(patch.data[r * patch.stride + c]);
    out[0] = hit.score;
    descriptor.getFeature(pixels, size, size, out + 1);
}

std::vector<float> ILabsPostFilter::feature(IN_IMAGE const& image, ScoredWindow const& hit) const
{
    const int size = SCALED_FACE_SIZE;
    IMAGE patch(size, size, size, nullptr);
    if (patch.data == nullptr)
        throw qv_operation_error("PostFilter patch allocation failed");
    std::vector<float> pixels(size * size);
    std::vector<float> out(descriptor.getLength() + 1);
    extract(image, hit, patch, pixels.data(), out.data());
    return out;
}

void ILabsPostFilter::filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                             std::vector<ScoredWindow>* output) const
{
    if (output == nullptr)
        throw qv_invalid_argument("PostFilter output is null");
    if (input.empty())
        return;
    const int size = SCALED_FACE_SIZE;
    IMAGE patch(size, size, size, nullptr);
    if (patch.data == nullptr)
        throw qv_operation_error("PostFilter patch allocation failed");
    std::vector<float> pixels(size * size);
    std::vector<float> values(descriptor.getLength() + 1);

    for (const ScoredWindow& hit : input) {
        if (classifier.preClassify(hit.score)) {
            output->push_back(hit);
            continue;
        }
        extract(image, hit, patch, pixels.data(), values.data());
        if (classifier.classify(hit.category, values.data(), static_cast<int>(values.size())))
            output->push_back(hit);
    }
}
