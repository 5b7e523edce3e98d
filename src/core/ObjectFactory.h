#ifndef QUORIN_CORE_OBJECTFACTORY_H
#define QUORIN_CORE_OBJECTFACTORY_H

#include <exception>
#include <map>
#include <memory>
#include <string>

#include "core/Json.h"

// The body of every static create(text): a new T read from `text` with its
// fromJson, or null when the construction or the reading throws a standard
// exception.
template <typename T>
T* createFromText(const std::string& text) {
    std::unique_ptr<T> object;
    try {
        object.reset(new T());
        object->fromJson(text);
    } catch (const std::exception&) {
        return nullptr;
    }
    return object.release();
}

// Name -> creator map through which trackers, post filters, filters and
// normalizers are made from a description text {"name":"X","param":{...}}.
// A concrete factory derives from this, offers a static instance() built as a
// guarded function-local static, and fills `creators` in its constructor:
//     creators["KF_TRACKER"] = &KFTracker::create;
// A creator (by convention the class's static create(text)) returns an owned
// object or null; it must not let a std::exception escape.
template <typename T>
class ObjectFactory {
public:
    typedef T* (*Creator)(const std::string& param);

    virtual ~ObjectFactory() {}

    // Requires: `description` is an object text (malformed text throws
    // JsonError). Ensures: null for an unregistered or absent "name"; else the
    // creator's result for the raw text of "param" (empty when absent).
    T* createInstance(const std::string& description) const {
        const std::map<std::string, std::string> items = parseJsonObject(description);
        std::string name;
        jsonObjectItemToNamedValue(items, "name", name);
        typename std::map<std::string, Creator>::const_iterator creator = creators.find(name);
        if (creator == creators.end() || creator->second == nullptr) return nullptr;
        std::map<std::string, std::string>::const_iterator param = items.find("param");
        return creator->second(param == items.end() ? std::string() : param->second);
    }

protected:
    std::map<std::string, Creator> creators;
};

#endif
