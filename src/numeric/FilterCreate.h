#pragma once
// The static create/clone members of the filters share these: a filter made
// from a bad text, or a copy that runs out of memory, gives a null result.
#include <exception>
#include <new>
#include <string>

namespace filter_create {

template <typename F>
F* createFrom(const std::string& text) {
    F* filter = nullptr;
    try {
        filter = new F();
        filter->fromJson(text);
        return filter;
    } catch (const std::exception&) {
        delete filter;
        return nullptr;
    }
}

template <typename Base, typename F>
Base* cloneOf(const F& filter) {
    try {
        return new F(filter);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

}  // namespace filter_create
