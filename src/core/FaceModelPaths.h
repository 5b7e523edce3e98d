#ifndef QUORIN_CORE_FACEMODELPATHS_H
#define QUORIN_CORE_FACEMODELPATHS_H

#include <string>

// The engine's configuration: one JSON text (or "") per area. Only "detection"
// has a reader here; its "faceRects" and "faceParts" entries configure the
// detector and the part locator.
class FaceModelPaths {
public:
    FaceModelPaths();
    // See init.
    explicit FaceModelPaths(const char* path);
    ~FaceModelPaths();

    // Null path: the built-in default configuration; otherwise the file at
    // `path`. The text is trimmed of LF, TAB, FF, VT and blanks (not CR) and
    // read with fromJson. Any failure raises ApiError with one fixed text.
    void init(const char* path);
    void release();

    std::string detection() const { return detection_; }
    std::string representation() const { return representation_; }
    std::string recognition() const { return recognition_; }
    std::string attribute() const { return attribute_; }
    void setDetection(const std::string& text) { detection_ = text; }
    void setRepresentation(const std::string& text) { representation_ = text; }
    void setRecognition(const std::string& text) { recognition_ = text; }
    void setAttribute(const std::string& text) { attribute_ = text; }

    // Non-empty fields only, as stored, no blanks: {"detection":{...},...}.
    std::string toJson() const;
    // All four fields overwritten, absent keys give "". Throws JsonError on a
    // malformed text (fields then untouched).
    void fromJson(const std::string& text);

private:
    std::string detection_;
    std::string representation_;
    std::string recognition_;
    std::string attribute_;
};

#endif
