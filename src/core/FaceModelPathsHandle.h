#ifndef QUORIN_CORE_FACEMODELPATHSHANDLE_H
#define QUORIN_CORE_FACEMODELPATHSHANDLE_H

// The declaration is public: a host includes it as <quorin/FaceModelPathsHandle.h>.
#include "quorin/FaceModelPathsHandle.h"

#endif
