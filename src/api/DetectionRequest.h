#ifndef QUORIN_API_DETECTIONREQUEST_H
#define QUORIN_API_DETECTIONREQUEST_H

// The declaration is public: a host includes it as <quorin/DetectionRequest.h>.
#include "quorin/DetectionRequest.h"

#endif
