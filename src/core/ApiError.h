#ifndef QUORIN_CORE_APIERROR_H
#define QUORIN_CORE_APIERROR_H

// The declaration is public: a host includes it as <quorin/ApiError.h>.
#include "quorin/ApiError.h"

#endif
