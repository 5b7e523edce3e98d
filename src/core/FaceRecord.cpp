#include "core/FaceRecord.h"

#include <exception>

#include <boost/lexical_cast.hpp>

#include "core/ApiError.h"
#include "core/Descramble.h"
#include "core/RecordTexts.h"
#include "core/ScrambledTexts.h"

namespace {

enum class Attribute { Age, Gender, Race, AgeInterval, Pose, Unknown };

// The names are stored scrambled and compared, in this order, with the whole name.
Attribute attributeOf(const std::string& name) {
    if (name == descrambleText(scrambled::kAttributeAge)) return Attribute::Age;
    if (name == descrambleText(scrambled::kAttributeGender)) return Attribute::Gender;
    if (name == descrambleText(scrambled::kAttributeRace)) return Attribute::Race;
    if (name == descrambleText(scrambled::kAttributeAgeInterval)) return Attribute::AgeInterval;
    if (name == descrambleText(scrambled::kAttributePose)) return Attribute::Pose;
    return Attribute::Unknown;
}

template <typename E>
E enumFromText(const std::string& text) {
    E value;
    value.fromJson(text);
    return value;
}

}  // namespace

std::string FaceRecord::attribute(const std::string& name) const {
    Attribute which = attributeOf(name);
    if (which == Attribute::Unknown) throw ApiError(descrambleText(scrambled::kFaceAttributeUnknown));
    try {
        switch (which) {
            case Attribute::Age: return boost::lexical_cast<std::string>(data_.age());
            case Attribute::Gender: return data_.gender().toJson();
            case Attribute::Race: return data_.race().toJson();
            case Attribute::AgeInterval: return data_.ageInterval().toJson();
            default: return data_.facePose().toJson();
        }
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kFaceAttributeReadFailed));
    }
}

void FaceRecord::setAttribute(const std::string& name, const std::string& value) {
    Attribute which = attributeOf(name);
    if (which == Attribute::Unknown) throw ApiError(descrambleText(scrambled::kFaceAttributeUnknown));
    try {
        switch (which) {
            case Attribute::Age: data_.setAge(boost::lexical_cast<float>(value)); break;
            case Attribute::Gender: data_.setGender(enumFromText<FaceGender>(value)); break;
            case Attribute::Race: data_.setRace(enumFromText<FaceRace>(value)); break;
            case Attribute::AgeInterval: data_.setAgeInterval(enumFromText<FaceAgeInterval>(value)); break;
            default: data_.setFacePose(enumFromText<FacePose>(value)); break;
        }
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kFaceAttributeWriteFailed));
    }
}

std::string FaceRecord::toJson() const {
    try {
        return data_.toJson();
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kFaceRecordWriteFailed));
    }
}

void FaceRecord::fromJson(const std::string& text) {
    try {
        data_.fromJson(text);
    } catch (const std::exception&) {
        throw ApiError(descrambleText(scrambled::kFaceRecordReadFailed));
    }
}
