#include "postfilter/LbpPatchFilter.h"

#include <map>

#include "core/Errors.h"
#include "core/Json.h"
#include "image/Image.h"
#include "image/IntegralImage.h"

namespace {

// The buffers one hit's feature is made in, reused over the hits of a frame.
struct Scratch {
    explicit Scratch(int featureLength)
        : patch(LbpPatchFilter::SCALED_FACE_SIZE, LbpPatchFilter::SCALED_FACE_SIZE, LbpPatchFilter::SCALED_FACE_SIZE,
                nullptr),
          pixels(LbpPatchFilter::SCALED_FACE_SIZE * LbpPatchFilter::SCALED_FACE_SIZE),
          values(static_cast<size_t>(featureLength))
    {
        if (patch.data == nullptr)
            throw qv_operation_error("PostFilter patch allocation failed");
    }
    IMAGE patch;
    std::vector<float> pixels;
    std::vector<float> values;
};

} // namespace

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
    Scratch scratch(descriptor.getLength() + 1);
    extract(image, hit, scratch.patch, scratch.pixels.data(), scratch.values.data());
    return scratch.values;
}

void LbpPatchFilter::filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                            std::vector<ScoredWindow>* output) const
{
    if (output == nullptr)
        throw qv_invalid_argument("PostFilter output is null");
    if (input.empty())
        return;
    Scratch scratch(descriptor.getLength() + 1);
    for (const ScoredWindow& hit : input) {
        if (!passesUnjudged(hit)) {
            extract(image, hit, scratch.patch, scratch.pixels.data(), scratch.values.data());
            if (!judge(hit, scratch.values.data(), static_cast<int>(scratch.values.size())))
                continue;
        }
        output->push_back(hit);
    }
}
