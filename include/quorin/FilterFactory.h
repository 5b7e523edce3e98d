#ifndef QUORIN_FILTERFACTORY_H
#define QUORIN_FILTERFACTORY_H

// Filters made by name from a description, e.g.
//   Filter1DFactory::instance().createInstance(
//       R"({"name":"QV_FILTER1D_GAUSSIAN","param":{"sigma":1.5}})");
// "param" is the filter's own JSON form (its toJson text). createInstance is
// ObjectFactory's: an owned filter, or null for an unknown name or parameters
// the filter refuses; JsonError for a description that is no JSON object.

#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/ObjectFactory.h"
#include "quorin/export.h"

class QUORIN_EXPORT Filter1DFactory : public ObjectFactory<Filter1D> {
public:
    // ensures: the one factory, made on first use.
    static Filter1DFactory& instance();
    // ensures: "QV_FILTER1D_GAUSSIAN" (GaussianFilter1D::create) and
    //          "QV_FILTER1D_DOG" (DoGFilter1D::create) are registered.
    void init();

    Filter1DFactory(const Filter1DFactory&) = delete;
    Filter1DFactory& operator=(const Filter1DFactory&) = delete;

private:
    Filter1DFactory();
};

class QUORIN_EXPORT Filter2DFactory : public ObjectFactory<Filter2D> {
public:
    // ensures: the one factory, made on first use.
    static Filter2DFactory& instance();
    // ensures: "QV_FILTER2D_GAUSSIAN" (GaussianFilter2D::create) and
    //          "QV_FILTER2D_DOG" (DoGFilter2D::create) are registered.
    void init();

    Filter2DFactory(const Filter2DFactory&) = delete;
    Filter2DFactory& operator=(const Filter2DFactory&) = delete;

private:
    Filter2DFactory();
};

#endif
