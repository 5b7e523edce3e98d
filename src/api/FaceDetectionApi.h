#ifndef QUORIN_API_FACEDETECTIONAPI_H
#define QUORIN_API_FACEDETECTIONAPI_H

// The declaration is public: a host includes it as <quorin/FaceDetectionApi.h>.
#include "quorin/FaceDetectionApi.h"

#endif
