#ifndef QUORIN_OBJECTFACTORY_H
#define QUORIN_OBJECTFACTORY_H

// Objects made by name from a description text {"name":"X","param":{...}}:
// the base of the filter and normalizer factories (quorin/FilterFactory.h,
// quorin/NormalizerFactory.h). A concrete factory is a singleton reached
// through its static instance(), built on first use and read-only afterwards,
// so lookups need no lock.

#include <map>
#include <string>

#include "quorin/export.h"

namespace qv_detail {
// ensures: name is the string under "name" (empty when absent), param the raw
//          text under "param" (empty when absent).
// throws:  JsonError when description is not a JSON object text or "name" is
//          not a string.
QUORIN_EXPORT void readFactoryDescription(const std::string& description, std::string& name, std::string& param);
}  // namespace qv_detail

template <typename T>
class ObjectFactory {
public:
    // A creator takes the "param" text and returns an owned object or null; it
    // lets no std::exception escape.
    typedef T* (*Creator)(const std::string& param);

    virtual ~ObjectFactory() {}

    // requires: description is a JSON object text.
    // ensures:  an object owned by the caller (release it with delete), made
    //           by the creator registered under "name" from the text of
    //           "param" (an empty text when absent); null for an unknown or
    //           absent name, and for parameters the class refuses; the two
    //           are not told apart.
    // throws:   JsonError for a malformed description.
    T* createInstance(const std::string& description) const {
        std::string name, param;
        qv_detail::readFactoryDescription(description, name, param);
        const typename std::map<std::string, Creator>::const_iterator creator = creators.find(name);
        if (creator == creators.end() || creator->second == nullptr) return nullptr;
        return creator->second(param);
    }

protected:
    std::map<std::string, Creator> creators;
};

#endif
