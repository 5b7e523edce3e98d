#ifndef QUORIN_CORE_QVFACE_H
#define QUORIN_CORE_QVFACE_H

// The declaration is public: a host includes it as <quorin/QVFace.h>.
#include "quorin/QVFace.h"

#endif
