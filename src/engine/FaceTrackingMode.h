#ifndef QUORIN_ENGINE_FACETRACKINGMODE_H
#define QUORIN_ENGINE_FACETRACKINGMODE_H

// The declaration is public: a host includes it as <quorin/QVFaceTrackingMode.h>.
#include "quorin/QVFaceTrackingMode.h"

#endif
