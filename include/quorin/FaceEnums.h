#ifndef QUORIN_FACEENUMS_H
#define QUORIN_FACEENUMS_H

#include <cstdint>
#include <string>

#include "quorin/export.h"

// Four small classes of the face records, each wrapping one enumeration value.
// -1 means "not set". The text form is the quoted label of the value; the
// engine only stores, writes and reads these values. For each class:
//   toJson   ensures: the quoted label of `value`.
//            throws: JsonError "Json serialization error" for a value outside
//            the class's range.
//   fromJson requires: exactly one of the quoted labels that toJson writes.
//            ensures: `value` is that label's value.
//            throws: JsonError "Json deserialization error" otherwise.

class QUORIN_EXPORT FaceAgeInterval {
public:
    FaceAgeInterval() = default;
    explicit FaceAgeInterval(int32_t v) : value(v) {}
    std::string toJson() const;  // values -1..4
    void fromJson(const std::string& text);
    bool operator==(const FaceAgeInterval& o) const { return value == o.value; }

    int32_t value = -1;
};

class QUORIN_EXPORT FaceRace {
public:
    FaceRace() = default;
    explicit FaceRace(int32_t v) : value(v) {}
    std::string toJson() const;  // values -1..3
    void fromJson(const std::string& text);
    bool operator==(const FaceRace& o) const { return value == o.value; }

    int32_t value = -1;
};

class QUORIN_EXPORT FaceGender {
public:
    FaceGender() = default;
    explicit FaceGender(int32_t v) : value(v) {}
    std::string toJson() const;  // values -1..1
    void fromJson(const std::string& text);
    bool operator==(const FaceGender& o) const { return value == o.value; }

    int32_t value = -1;
};

class QUORIN_EXPORT FacePose {
public:
    FacePose() = default;
    explicit FacePose(int32_t v) : value(v) {}
    std::string toJson() const;  // values -1..6
    void fromJson(const std::string& text);

    // ensures: the pose of the mirrored face: 1<->2, 3<->4, 5<->6; -1 and 0 stay.
    // throws: JsonError "Invalid pose" for any other value.
    FacePose flip() const;
    // True for 3..6 and for "not set" (-1): the value taken as unsigned is above 2.
    bool wildPose() const { return static_cast<uint32_t>(value) > 2u; }

    struct Compare {
        bool operator()(const FacePose& a, const FacePose& b) const { return a.value < b.value; }
    };
    bool operator==(const FacePose& o) const { return value == o.value; }

    int32_t value = -1;
};

#endif
