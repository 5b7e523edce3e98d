#ifndef QUORIN_QVFACE_H
#define QUORIN_QVFACE_H

#include <cstdint>
#include <string>

#include "quorin/export.h"

class FaceRecord;

// Public values of a face: a rectangle in the field order left, top, right,
// bottom (right and bottom are coordinates), and a point x, y.
struct QVFaceRect {
    int32_t left;
    int32_t top;
    int32_t right;
    int32_t bottom;
};

struct QVFacePoint {
    float x;
    float y;
};

// The public handle of one face, as FaceDetectionApi::detect returns it. It
// owns its own record (copies are deep; nothing is shared with the engine).
// Every operation below first checks that the record exists and otherwise
// throws ApiError "QVFace not initialized properly": that happens only to a
// handle whose allocation failed, or on copying or assigning from one.
class QUORIN_EXPORT QVFace {
public:
    // ensures: a face with the defaults of FaceData.
    QVFace();
    // ensures: an independent copy of other's record.
    QVFace(const QVFace& other);
    QVFace& operator=(const QVFace& other);
    ~QVFace();

    std::string dataSet() const;
    std::string filePath() const;
    // ensures: right - left, bottom - top of faceRect().
    int32_t faceWidth() const;
    int32_t faceHeight() const;
    QVFaceRect faceRect() const;
    // Higher is better.
    float faceScore() const;
    // ensures: the point named `name` ("leftEye", "rightEye", "nose",
    // "leftMouthCorner", "rightMouthCorner" after detection).
    // throws: std::invalid_argument "No value available for the input
    // landmark" for a name that isn't set.
    QVFacePoint landmark(const std::string& name) const;
    // ensures: landmark(name) gives `point`.
    void setLandmark(const std::string& name, const QVFacePoint& point);
    // Age, gender, race, age class and pose by name, in text form.
    // throws: ApiError for an unknown name or a value that can't be converted.
    std::string attribute(const std::string& name) const;
    void setAttribute(const std::string& name, const std::string& value);
    bool isGoodFace() const;
    void setGoodFace(bool good);
    std::string personName() const;
    void setPersonName(const std::string& name);
    // ensures: the record as one line of JSON (see FaceData::toJson).
    // throws: ApiError if it can't be written.
    std::string toJson() const;
    // requires: a JSON object as toJson writes it; absent keys keep their values.
    // throws: ApiError if the text can't be read.
    void fromJson(const std::string& text);

private:
    FaceRecord& checked() const;

    FaceRecord* record_;
};

#endif
