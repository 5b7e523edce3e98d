#include <gtest/gtest.h>

#include "core/ObjectFactory.h"
