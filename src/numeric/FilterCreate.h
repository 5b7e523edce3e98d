#pragma once
// The static clone members of the filters share this: a copy that runs out of
// memory gives a null result (create uses createFromText of core/CreateFromText.h).
#include <exception>
#include <new>
#include <string>

namespace filter_create {

template <typename Base, typename F>
Base* cloneOf(const F& filter) {
    try {
        return new F(filter);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

}  // namespace filter_create
