#ifndef QUORIN_DETECTOR_MULTIFRAMEOPTIMIZER_H
#define QUORIN_DETECTOR_MULTIFRAMEOPTIMIZER_H

// The declaration is public: a host includes it as <quorin/MultiframeOptimizer.h>.
#include "quorin/MultiframeOptimizer.h"

#endif
