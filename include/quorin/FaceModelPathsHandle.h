#ifndef QUORIN_FACEMODELPATHSHANDLE_H
#define QUORIN_FACEMODELPATHSHANDLE_H

#include <string>

#include "quorin/export.h"

class FaceModelPaths;

// The configuration as it passes the public interface: a JSON object with the
// entries "detection", "representation", "recognition" and "attribute", each a
// JSON value. Only "detection" is read by this engine: it holds "faceRects"
// (the FaceDetector configuration) and "faceParts" (the landmark locator's).
// Copies are deep.
class QUORIN_EXPORT FaceModelPathsHandle {
public:
    // requires: `path` null, or the name of a readable file holding the object.
    // ensures: null loads the library's built-in configuration.
    // throws: ApiError when the file can't be read or isn't a JSON object
    // (surrounding white space is fine; a trailing carriage return is not).
    explicit FaceModelPathsHandle(const char* path = nullptr);
    FaceModelPathsHandle(const FaceModelPathsHandle& other);
    FaceModelPathsHandle& operator=(const FaceModelPathsHandle& other);
    ~FaceModelPathsHandle();

    // ensures: {"detection":...,...} with the non-empty entries, no blanks.
    std::string toJson() const;
    // requires: a JSON object. ensures: all four entries are replaced; an
    // absent key leaves its entry empty.
    // throws: JsonError "Json deserialization error" on a malformed text.
    void fromJson(const std::string& text);

private:
    FaceModelPaths* paths;
};

#endif
