#ifndef QUORIN_CORE_FACEDATA_H
#define QUORIN_CORE_FACEDATA_H

// The declaration is public (<quorin/FaceData.h>); the engine also gets the
// text members of the record's value types.
#include "core/FaceEnums.h"
#include "core/LandmarkMap.h"
#include "core/Point2.h"
#include "core/Rect2.h"
#include "quorin/FaceData.h"

#endif
