#ifndef QUORIN_CORE_CREATEFROMTEXT_H
#define QUORIN_CORE_CREATEFROMTEXT_H

#include <exception>
#include <memory>
#include <string>

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

#endif
