#include "core/FaceModelPathsHandle.h"

#include "core/FaceModelPaths.h"

FaceModelPathsHandle::FaceModelPathsHandle(const char* path) : paths(new FaceModelPaths(path)) {}

FaceModelPathsHandle::FaceModelPathsHandle(const FaceModelPathsHandle& other)
    : paths(new FaceModelPaths(*other.paths)) {}

FaceModelPathsHandle& FaceModelPathsHandle::operator=(const FaceModelPathsHandle& other) {
    if (this != &other) *paths = *other.paths;
    return *this;
}

FaceModelPathsHandle::~FaceModelPathsHandle() {
    delete paths;
    paths = nullptr;
}

std::string FaceModelPathsHandle::toJson() const { return paths->toJson(); }

void FaceModelPathsHandle::fromJson(const std::string& text) { paths->fromJson(text); }
