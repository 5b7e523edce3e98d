#include "postfilter/LbpPatchFilter.h"

#include <map>

#include "core/Errors.h"
#include "core/Json.h"
#include "image/Image.h"
#include "image/IntegralImage.h"

LbpPatchFilter::LbpPatchFilter(bool transposedPatch)
    : transposed(transposedPatch), descriptor(LBP_CELL_NUMBER, LBP_CELL_NUMBER)
{
}

void LbpPatchFilter::init(const std::string& path)
{
    modelPath = path;
    descriptor.init(LBP_CELL_NUMBER, LBP_CELL_NUMBER);
    loadModel(path);
}

void LbpPatchFilter::fromJson(std::string const& text)
{
    const std::map<std::string, std::string> items = parseJsonObject(text);
    std::string path;
    if (jsonObjectItemToNamedValue(items, "model", path))
        init(path);
}

std::string LbpPatchFilter::toJson() const
{
    return "{" + jsonNamedValue("model", modelPath) + "}";
}

void LbpPatchFilter::extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels,
                             float* out) const
{
    const int size = SCALED_FACE_SIZE;
    image.CropScaleToImage(&patch, &hit.window);
    for (int r = 0; r < size; ++r)
        for (int c = 0; c < size; ++c)
            pixels[transposed ? c * size + r : r * size + c] = static_cast<float>(patch.data[r * patch.stride + c]);
    out[0] = hit.score;
    descriptor.getFeature(pixels, size, size, out + 1);
}

std::vector<float> LbpPatchFilter::feature(IN_IMAGE const& image, ScoredWindow const& hit) const
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

void LbpPatchFilter::filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
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
        if (!passesUnjudged(hit)) {
            extract(image, hit, patch, pixels.data(), values.data());
            if (!judge(hit, values.data(), static_cast<int>(values.size())))
                continue;
        }
        output->push_back(hit);
    }
}
