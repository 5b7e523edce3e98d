#ifndef QUORIN_CORE_FACEMODELPATHSHANDLE_H
#define QUORIN_CORE_FACEMODELPATHSHANDLE_H

#include <string>

#include "quorin/export.h"

class FaceModelPaths;

// Public handle of the configuration. Null path: the built-in default;
// otherwise a JSON file. Construction raises ApiError when the configuration
// cannot be loaded. Copies are deep.
class QUORIN_EXPORT FaceModelPathsHandle {
public:
    explicit FaceModelPathsHandle(const char* path = nullptr);
    FaceModelPathsHandle(const FaceModelPathsHandle& other);
    FaceModelPathsHandle& operator=(const FaceModelPathsHandle& other);
    ~FaceModelPathsHandle();

    std::string toJson() const;
    void fromJson(const std::string& text);

private:
    FaceModelPaths* paths;
};

#endif
