#ifndef QUORIN_DETECTOR_WINDOWFEATURE_H
#define QUORIN_DETECTOR_WINDOWFEATURE_H

#include <cstdint>

#include "detector/HaarFeature.h"
#include "image/IntegralImage.h"
#include "quorin/WindowFeature.h"

// The declaration is public (<quorin/WindowFeature.h>); the hot evaluation
// stays inline here, where the feature and image types are known.

inline void WindowFeature::prepareOffsets(int stride)
{
    if (kind == HAAR && haar != nullptr)
        haar->prepareOffsets(stride);
}

inline float WindowFeature::Eval(IN_IMAGE const& image, float inverseDeviation, int offset) const
{
    if (kind == HAAR)
        return haar->Eval(image, inverseDeviation, offset);
    if (kind == DEVIATION)
        return inverseDeviation;
    return 0.0f;
}

#endif
