#ifndef QUORIN_CORE_LANDMARKMAP_H
#define QUORIN_CORE_LANDMARKMAP_H

// The declaration is public (<quorin/LandmarkMap.h>); the engine also gets the
// text members of the points.
#include "core/Point2.h"
#include "quorin/LandmarkMap.h"

// "No value available for the input landmark": a name that holds no point.
extern const char* const kNoLandmarkValue;

#endif
