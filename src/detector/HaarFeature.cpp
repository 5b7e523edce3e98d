#include "detector/HaarFeature.h"

#include <cstdlib>
#include <new>

#include "container/ModelReader.h"
#include "core/Errors.h"

namespace {

int32_t readInt(ModelReader& reader)
{
    int32_t v = 0;
    reader.read(&v, sizeof v, 1);
    return v;
}

float readFloat(ModelReader& reader)
{
    float v = 0.0f;
    reader.read(&v, sizeof v, 1);
    return v;
}

inline float rectSum(uint32_t const* p, HaarRect const& r)
{
    return static_cast<float>(p[r.cornerBottomRight] + p[r.cornerTopLeft] - p[r.cornerTopRight] -
                              p[r.cornerBottomLeft]);
}

} // namespace

HaarFeature::HaarFeature(HaarFeature const* source, float scale)
{
    Init(source, scale);
}

HaarFeature::~HaarFeature()
{
    Release();
}

void HaarFeature::Release()
{
    std::free(rects);
    rects = nullptr;
}

bool HaarFeature::Init(int n)
{
    Release();
    count = n;
    if (n <= 0)
        return n == 0;
    rects = static_cast<HaarRect*>(std::malloc(sizeof(HaarRect) * static_cast<size_t>(n)));
    if (rects == nullptr) {
        count = 0;
        return false;
    }
    return true;
}

bool HaarFeature::Init(ModelReader& reader)
{
    Release();
    const int32_t n = readInt(reader);
    if (n < 0 || n > kMaxRects)
        throw qv_data_error("Cascade model is malformed: rectangle count out of range");
    const bool allocated = Init(n);
    for (int i = 0; i < n; ++i) {
        HaarRect r;
        r.weight = readFloat(reader);
        // Stored left, top, right, bottom; held left, right, top, bottom.
        r.left = readInt(reader);
        r.top = readInt(reader);
        r.right = readInt(reader);
        r.bottom = readInt(reader);
        if (r.left < 0 || r.top < 0 || r.right > kBaseSize || r.bottom > kBaseSize || r.left >= r.right ||
            r.top >= r.bottom)
            throw qv_data_error("Cascade model is malformed: rectangle outside the 24 x 24 window");
        if (allocated)
            rects[i] = r;
    }
    if (!allocated)
        count = 0;
    return allocated;
}

bool HaarFeature::Init(HaarFeature const* source, float scale)
{
    if (source == nullptr)
        return false;
    if (source == this)
        return true;
    if (!Init(source->count))
        return false;
    for (int i = 0; i < count; ++i) {
        HaarRect const& s = source->rects[i];
        HaarRect& d = rects[i];
        d = s;
        d.left = static_cast<int32_t>(0.5f + static_cast<float>(s.left) * scale);
        d.right = static_cast<int32_t>(0.5f + static_cast<float>(s.right) * scale);
        d.top = static_cast<int32_t>(0.5f + static_cast<float>(s.top) * scale);
        d.bottom = static_cast<int32_t>(0.5f + static_cast<float>(s.bottom) * scale);
        // Per-pixel response stays independent of the rounding of the corners.
        const float oldArea = static_cast<float>((s.bottom - s.top) * (s.right - s.left));
        const float newArea = static_cast<float>((d.bottom - d.top) * (d.right - d.left));
        d.weight = oldArea * s.weight / newArea;
    }
    return true;
}

void HaarFeature::prepareOffsets(int stride)
{
    for (int i = 0; i < count; ++i) {
        HaarRect& r = rects[i];
        r.cornerTopLeft = static_cast<uint32_t>(r.top * stride + r.left);
        r.cornerBottomLeft = static_cast<uint32_t>(r.bottom * stride + r.left);
        r.cornerTopRight = static_cast<uint32_t>(r.top * stride + r.right);
        r.cornerBottomRight = static_cast<uint32_t>(r.bottom * stride + r.right);
    }
}

float HaarFeature::evalLoop(uint32_t const* p, float inverseDeviation) const
{
    if (count == 4) {
        float v = rectSum(p, rects[0]) * rects[0].weight;
        v += rectSum(p, rects[1]) * rects[1].weight;
        v += rectSum(p, rects[2]) * rects[2].weight;
        v += rectSum(p, rects[3]) * rects[3].weight;
        return v * inverseDeviation;
    }
    float v = 0.0f;
    for (int i = 0; i < count; ++i)
        v += rectSum(p, rects[i]) * rects[i].weight;
    return v * inverseDeviation;
}

float HaarFeature::Eval(I_IMAGE const& image, float inverseDeviation, int x, int y) const
{
    float v = 0.0f;
    for (int i = 0; i < count; ++i) {
        HaarRect const& r = rects[i];
        const uint32_t sum = image.valueAt(x + r.right, y + r.bottom) + image.valueAt(x + r.left, y + r.top) -
                             image.valueAt(x + r.right, y + r.top) - image.valueAt(x + r.left, y + r.bottom);
        v += static_cast<float>(sum) * r.weight;
    }
    return v * inverseDeviation;
}
