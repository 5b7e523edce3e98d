#ifndef QUORIN_NUMERIC_FILTERFACTORY_H
#define QUORIN_NUMERIC_FILTERFACTORY_H

#include "core/ObjectFactory.h"
#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/export.h"

// Filters by name: {"name":"QV_FILTER1D_GAUSSIAN","param":{"sigma":1.5}}.
// Both singletons are built on first use and read-only afterwards.
class QUORIN_EXPORT Filter1DFactory : public ObjectFactory<Filter1D> {
public:
    static Filter1DFactory& instance();
    // Registers "QV_FILTER1D_GAUSSIAN" and "QV_FILTER1D_DOG".
    void init();

private:
    Filter1DFactory();
};

class QUORIN_EXPORT Filter2DFactory : public ObjectFactory<Filter2D> {
public:
    static Filter2DFactory& instance();
    // Registers "QV_FILTER2D_GAUSSIAN" and "QV_FILTER2D_DOG".
    void init();

private:
    Filter2DFactory();
};

#endif
