#include "postfilter/PostFilter.h"

PostFilter::~PostFilter() = default;
