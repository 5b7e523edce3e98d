#ifndef QUORIN_ERRORS_H
#define QUORIN_ERRORS_H

#include <stdexcept>
#include <string>

#include "quorin/export.h"

// The engine's exceptions below the public layer. Each carries a fixed text
// (what()); the public classes name in their contracts which one they raise.
// Each layer catches what derives from std::exception at its boundary and
// raises its own class, so a host usually sees these only from FaceDetector
// and the C entry points.

// A caller's argument is out of its domain (a null frame, a side <= 0, ...).
class QUORIN_EXPORT qv_invalid_argument : public std::invalid_argument {
public:
    explicit qv_invalid_argument(const std::string& what) : std::invalid_argument(what) {}
};

// A value outside the range an operation is defined on.
class QUORIN_EXPORT qv_domain_error : public std::domain_error {
public:
    explicit qv_domain_error(const std::string& what) : std::domain_error(what) {}
};

// An operation that cannot run in the object's state ("Failed to create
// PostFilter", an operation before init).
class QUORIN_EXPORT qv_operation_error : public std::runtime_error {
public:
    explicit qv_operation_error(const std::string& what) : std::runtime_error(what) {}
};

// Data that the engine cannot use ("Image is larger than the maximum
// supported size", a damaged model).
class QUORIN_EXPORT qv_data_error : public std::runtime_error {
public:
    explicit qv_data_error(const std::string& what) : std::runtime_error(what) {}
};

// A request for something this build does not provide.
class QUORIN_EXPORT qv_unsupported_error : public std::runtime_error {
public:
    explicit qv_unsupported_error(const std::string& what) : std::runtime_error(what) {}
};

#endif
