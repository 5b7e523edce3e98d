#ifndef QUORIN_CORE_FACEDATA_H
#define QUORIN_CORE_FACEDATA_H

#include <cstdint>
#include <string>

#include "core/FaceEnums.h"
#include "core/LandmarkMap.h"
#include "core/Rect2.h"
#include "quorin/export.h"

// One face on its way through the engine: the detector sets the rectangle and
// score, the part locator the landmarks, the API layer dataSet and filePath.
// A plain value, copied freely.
class QUORIN_EXPORT FaceData {
public:
    FaceData();

    const std::string& dataSet() const { return dataSet_; }
    void setDataSet(const std::string& v) { dataSet_ = v; }
    const std::string& filePath() const { return filePath_; }
    void setFilePath(const std::string& v) { filePath_ = v; }

    const Rect2<int32_t>& faceRect() const { return faceRect_; }
    void setFaceRect(const Rect2<int32_t>& r) { faceRect_ = r; }
    // right - left and bottom - top (wrapping, never undefined).
    int32_t faceWidth() const;
    int32_t faceHeight() const;

    float faceScore() const { return faceScore_; }
    void setFaceScore(float s) { faceScore_ = s; }

    // Throws std::invalid_argument "No value available for the input landmark".
    // Out of line so that a host reaches them through this exported class.
    Point2<float> landmark(const std::string& name) const;
    void setLandmark(const std::string& name, const Point2<float>& p);
    const LandmarkMap& landmarks() const { return landmarks_; }

    bool isGoodFace() const { return goodFace_; }
    void setGoodFace(bool v) { goodFace_ = v; }
    const std::string& personName() const { return personName_; }
    void setPersonName(const std::string& v) { personName_ = v; }
    float age() const { return age_; }
    void setAge(float v) { age_ = v; }
    FaceAgeInterval ageInterval() const { return ageInterval_; }
    void setAgeInterval(FaceAgeInterval v) { ageInterval_ = v; }
    FaceRace race() const { return race_; }
    void setRace(FaceRace v) { race_ = v; }
    FaceGender gender() const { return gender_; }
    void setGender(FaceGender v) { gender_ = v; }
    FacePose facePose() const { return facePose_; }
    void setFacePose(FacePose v) { facePose_ = v; }

    // All thirteen fields as one line: {"dataSet":"", "filePath":"", ...}.
    std::string toJson() const;
    // Reads the keys that are present, in field order; absent keys keep their
    // values (the record is not reset) and unknown keys are ignored. Throws
    // JsonError on a malformed text or field; fields read before stay set.
    void fromJson(const std::string& text);

private:
    std::string dataSet_;
    std::string filePath_;
    Rect2<int32_t> faceRect_;
    float faceScore_;
    LandmarkMap landmarks_;
    bool goodFace_;
    int32_t personID_;
    std::string personName_;
    float age_;
    FaceAgeInterval ageInterval_;
    FaceRace race_;
    FaceGender gender_;
    FacePose facePose_;
};

#endif
