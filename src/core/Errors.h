#ifndef QUORIN_CORE_ERRORS_H
#define QUORIN_CORE_ERRORS_H

#include <stdexcept>
#include <string>

#include "quorin/export.h"

// The engine's exceptions below the public layer. Each layer catches what derives
// from std::exception at its boundary and raises its own class with a fixed text.

class QUORIN_EXPORT qv_invalid_argument : public std::invalid_argument {
public:
    explicit qv_invalid_argument(const std::string& what) : std::invalid_argument(what) {}
};

class QUORIN_EXPORT qv_domain_error : public std::domain_error {
public:
    explicit qv_domain_error(const std::string& what) : std::domain_error(what) {}
};

class QUORIN_EXPORT qv_operation_error : public std::runtime_error {
public:
    explicit qv_operation_error(const std::string& what) : std::runtime_error(what) {}
};

class QUORIN_EXPORT qv_data_error : public std::runtime_error {
public:
    explicit qv_data_error(const std::string& what) : std::runtime_error(what) {}
};

class QUORIN_EXPORT qv_unsupported_error : public std::runtime_error {
public:
    explicit qv_unsupported_error(const std::string& what) : std::runtime_error(what) {}
};

#endif
