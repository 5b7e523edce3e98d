#ifndef QUORIN_CORE_FACEENUMS_H
#define QUORIN_CORE_FACEENUMS_H

// The declaration is public: a host includes it as <quorin/FaceEnums.h>.
#include "quorin/FaceEnums.h"

#endif
