#include "detector/WindowFeature.h"

#include <new>

#include "container/ModelReader.h"

WindowFeature::~WindowFeature()
{
    Release();
}

WindowFeature::WindowFeature(WindowFeature&& other) noexcept : kind(other.kind), haar(other.haar)
{
    other.kind = EMPTY;
    other.haar = nullptr;
}

WindowFeature& WindowFeature::operator=(WindowFeature&& other) noexcept
{
    if (this != &other) {
        Release();
        kind = other.kind;
        haar = other.haar;
        other.kind = EMPTY;
        other.haar = nullptr;
    }
    return *this;
}

void WindowFeature::Release()
{
    delete haar;
    haar = nullptr;
    kind = EMPTY;
}

bool WindowFeature::Init(ModelReader& reader)
{
    Release();
    int32_t k = 0;
    reader.read(&k, sizeof k, 1);
    if (k == DEVIATION) {
        kind = k;
        return true;
    }
    if (k != HAAR) {
        kind = k;
        return false;
    }
    HaarFeature* h = new (std::nothrow) HaarFeature();
    if (h == nullptr)
        return false;
    try {
        const bool ok = h->Init(reader);
        kind = HAAR;
        haar = h;
        return ok;
    } catch (...) {
        delete h;
        throw;
    }
}

bool WindowFeature::Init(WindowFeature const* source, float scale)
{
    if (source == this)
        return true;
    Release();
    if (source == nullptr)
        return false;
    kind = source->kind;
    if (kind == DEVIATION)
        return true;
    if (kind != HAAR || source->haar == nullptr)
        return false;
    haar = new (std::nothrow) HaarFeature();
    if (haar == nullptr) {
        kind = EMPTY;
        return false;
    }
    return haar->Init(source->haar, scale);
}

float WindowFeature::Eval(IN_IMAGE const& image, float inverseDeviation, int x, int y) const
{
    if (kind == HAAR)
        return haar->Eval(image, inverseDeviation, x, y);
    if (kind == DEVIATION)
        return inverseDeviation;
    return 0.0f;
}
