#include "quorin/FilterFactory.h"

Filter1DFactory::Filter1DFactory() { init(); }

Filter1DFactory& Filter1DFactory::instance() {
    static Filter1DFactory factory;
    return factory;
}

void Filter1DFactory::init() {
    creators["QV_FILTER1D_GAUSSIAN"] = [](const std::string& text) -> Filter1D* { return GaussianFilter1D::create(text); };
    creators["QV_FILTER1D_DOG"] = [](const std::string& text) -> Filter1D* { return DoGFilter1D::create(text); };
}

Filter2DFactory::Filter2DFactory() { init(); }

Filter2DFactory& Filter2DFactory::instance() {
    static Filter2DFactory factory;
    return factory;
}

void Filter2DFactory::init() {
    creators["QV_FILTER2D_GAUSSIAN"] = [](const std::string& text) -> Filter2D* { return GaussianFilter2D::create(text); };
    creators["QV_FILTER2D_DOG"] = [](const std::string& text) -> Filter2D* { return DoGFilter2D::create(text); };
}
