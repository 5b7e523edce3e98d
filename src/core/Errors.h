#ifndef QUORIN_CORE_ERRORS_H
#define QUORIN_CORE_ERRORS_H

// The declaration is public: a host includes it as <quorin/Errors.h>.
#include "quorin/Errors.h"

#endif
