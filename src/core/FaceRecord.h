#ifndef QUORIN_CORE_FACERECORD_H
#define QUORIN_CORE_FACERECORD_H

#include <string>

#include "core/FaceData.h"

// The API layer's wrapper of one FaceData. Besides forwarding, it reaches five
// fields by a textual attribute name and turns codec failures into ApiError.
class FaceRecord {
public:
    FaceRecord() = default;
    explicit FaceRecord(const FaceData& data) : data_(data) {}

    const std::string& dataSet() const { return data_.dataSet(); }
    const std::string& filePath() const { return data_.filePath(); }
    int32_t faceWidth() const { return data_.faceWidth(); }
    int32_t faceHeight() const { return data_.faceHeight(); }
    const Rect2<int32_t>& faceRect() const { return data_.faceRect(); }
    float faceScore() const { return data_.faceScore(); }
    Point2<float> landmark(const std::string& name) const { return data_.landmark(name); }
    void setLandmark(const std::string& name, const Point2<float>& p) { data_.setLandmark(name, p); }
    bool isGoodFace() const { return data_.isGoodFace(); }
    void setGoodFace(bool v) { data_.setGoodFace(v); }
    const std::string& personName() const { return data_.personName(); }
    void setPersonName(const std::string& v) { data_.setPersonName(v); }

    // Five names (stored scrambled, see core/RecordTexts.txt) reach age,
    // gender, race, age interval and pose. The age moves as a plain float
    // text, the classes as their quoted labels. An unknown name or a failed
    // conversion raises ApiError.
    std::string attribute(const std::string& name) const;
    void setAttribute(const std::string& name, const std::string& value);

    // As FaceData, with any failure raised as ApiError.
    std::string toJson() const;
    void fromJson(const std::string& text);

    const FaceData& faceData() const { return data_; }
    FaceData& faceData() { return data_; }

private:
    FaceData data_;
};

#endif
