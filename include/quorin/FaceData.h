#ifndef QUORIN_FACEDATA_H
#define QUORIN_FACEDATA_H

#include <cstdint>
#include <string>

#include "quorin/FaceEnums.h"
#include "quorin/LandmarkMap.h"
#include "quorin/Point2.h"
#include "quorin/Rect2.h"
#include "quorin/export.h"

// One face on its way through the engine: FaceDetector sets the rectangle and
// score, the part locator the landmarks, the API layer dataSet and filePath.
// A plain value, copied freely; no operation but fromJson can fail.
class QUORIN_EXPORT FaceData {
public:
    // ensures: empty strings, rectangle 0,0,0,0, score the lowest finite
    // float, no landmarks, good face, personID -1, age -1, classes -1.
    FaceData();

    const std::string& dataSet() const { return dataSet_; }
    void setDataSet(const std::string& v) { dataSet_ = v; }
    const std::string& filePath() const { return filePath_; }
    void setFilePath(const std::string& v) { filePath_ = v; }

    // Pixels of the frame given to detect; right and bottom are coordinates.
    const Rect2<int32_t>& faceRect() const { return faceRect_; }
    void setFaceRect(const Rect2<int32_t>& r) { faceRect_ = r; }
    // ensures: right - left and bottom - top (wrapping, never undefined).
    int32_t faceWidth() const;
    int32_t faceHeight() const;

    // Higher is better; only the order of scores means something.
    float faceScore() const { return faceScore_; }
    void setFaceScore(float s) { faceScore_ = s; }

    // ensures: the point stored under `name`.
    // throws: std::invalid_argument "No value available for the input
    // landmark" when there is none (always, before the part locator ran).
    Point2<float> landmark(const std::string& name) const;
    // ensures: landmark(name) == p.
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

    // ensures: all thirteen fields as one line, {"dataSet":"", "filePath":"",
    // "faceRect":[l,t,r,b], "faceScore":..., ...}; floats keep six significant
    // digits. throws: JsonError "Json serialization error" for an enumeration
    // value out of its range.
    std::string toJson() const;
    // requires: a JSON object. ensures: the keys that are present are read in
    // field order; absent keys keep their values (the record is not reset) and
    // unknown keys are ignored. throws: JsonError on a malformed text or field
    // ("goodFace" must be true or false); fields read before stay set.
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
