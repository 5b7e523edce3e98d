// The one instantiation of each record value type, with the text members a
// host reaches through the exported FaceData.

#include <cstdint>

#include "core/Point2.h"
#include "core/Rect2.h"

template class Rect2<int32_t>;
template class Point2<float>;
