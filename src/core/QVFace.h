#ifndef QUORIN_CORE_QVFACE_H
#define QUORIN_CORE_QVFACE_H

#include <cstdint>
#include <string>

#include "quorin/export.h"

class FaceRecord;

// Public values of a face: a rectangle in the field order left, top, right,
// bottom, and a point x, y.
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

// The public handle of one face. It owns its own record (copies are deep) and
// every operation first checks that the record exists: a handle whose
// allocation failed raises ApiError "QVFace not initialized properly".
class QUORIN_EXPORT QVFace {
public:
    QVFace();
    QVFace(const QVFace& other);
    QVFace& operator=(const QVFace& other);
    ~QVFace();

    std::string dataSet() const;
    std::string filePath() const;
    int32_t faceWidth() const;
    int32_t faceHeight() const;
    QVFaceRect faceRect() const;
    float faceScore() const;
    // Throws std::invalid_argument "No value available for the input landmark".
    QVFacePoint landmark(const std::string& name) const;
    void setLandmark(const std::string& name, const QVFacePoint& point);
    std::string attribute(const std::string& name) const;
    void setAttribute(const std::string& name, const std::string& value);
    bool isGoodFace() const;
    void setGoodFace(bool good);
    std::string personName() const;
    void setPersonName(const std::string& name);
    // The record's text form; failures raise ApiError.
    std::string toJson() const;
    void fromJson(const std::string& text);

private:
    FaceRecord& checked() const;

    FaceRecord* record_;
};

#endif
