#include "postfilter/LbpSvmPostFilter.h"

#include <exception>
#include <map>
#include <memory>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "core/Json.h"
#include "image/Image.h"
#include "image/IntegralImage.h"

LbpSvmPostFilter::LbpSvmPostFilter() : descriptor(LBP_CELL_NUMBER, LBP_CELL_NUMBER) {}

LbpSvmPostFilter::LbpSvmPostFilter(const std::string& path) : LbpSvmPostFilter()
{
    init(path);
}

void LbpSvmPostFilter::init(const std::string& path)
{
    modelPath = path;
    descriptor.init(LBP_CELL_NUMBER, LBP_CELL_NUMBER);
    ModelReader reader(path, ModelReader::RAW);
    // Both models stand one after the other in the one file.
    primaryClassifier.init(reader);
    secondaryClassifier.init(reader);
}

PostFilter* LbpSvmPostFilter::create(const std::string& parameters)
{
    std::unique_ptr<LbpSvmPostFilter> filter(new LbpSvmPostFilter());
    try {
        filter->fromJson(parameters);
    } catch (const std::exception&) {
        return nullptr;
    }
    return filter.release();
}

void LbpSvmPostFilter::fromJson(std::string const& text)
{
    const std::map<std::string, std::string> items = parseJsonObject(text);
    std::string path;
    if (jsonObjectItemToNamedValue(items, "model", path))
        init(path);
}

std::string LbpSvmPostFilter::toJson() const
{
    return "{" + jsonNamedValue("model", modelPath) + "}";
}

std::string LbpSvmPostFilter::name() const
{
    return "LBP_SVM_POSTFILTER";
}

void LbpSvmPostFilter::extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels,
                               float* out) const
{
    const int size = SCALED_FACE_SIZE;
    image.CropScaleToImage(&patch, &hit.window);
    // The models of this filter were made on the transposed patch.
    for (int r = 0; r < size; ++r)
        for (int c = 0; c < size; ++c)
            pixels[c * size + r] = static_cast<float>(patch.data[r * patch.stride + c]);
    out[0] = hit.score;
    descriptor.getFeature(pixels, size, size, out + 1);
}

std::vector<float> LbpSvmPostFilter::feature(IN_IMAGE const& image, ScoredWindow const& hit) const
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

void LbpSvmPostFilter::filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
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
        extract(image, hit, patch, pixels.data(), values.data());
        const SvmClassifier& judge = hit.category == 0 ? primaryClassifier : secondaryClassifier;
        if (judge.classify(values.data(), static_cast<int>(values.size())) == 1)
            output->push_back(hit);
    }
}
