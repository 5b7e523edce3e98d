#ifndef QUORIN_ENGINE_FACEDETECTOR_H
#define QUORIN_ENGINE_FACEDETECTOR_H

// The declaration is public (<quorin/FaceDetector.h>); the engine also needs
// the window types that the public header only names.
#include "image/DetectionWindow.h"
#include "image/ScoredWindow.h"
#include "quorin/FaceDetector.h"

#endif
