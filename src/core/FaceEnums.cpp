#include "core/FaceEnums.h"

#include "core/Descramble.h"
#include "core/Json.h"
#include "core/RecordTexts.h"

namespace {

// Stored forms of the labels, in order of value from -1; restored at each use.
const char* const kAgeIntervalLabels[] = {scrambled::kLabelAgeIntervalNone, scrambled::kLabelAgeInterval0,
                                          scrambled::kLabelAgeInterval1,    scrambled::kLabelAgeInterval2,
                                          scrambled::kLabelAgeInterval3,    scrambled::kLabelAgeInterval4};
const char* const kRaceLabels[] = {scrambled::kLabelRaceNone, scrambled::kLabelRace0, scrambled::kLabelRace1,
                                   scrambled::kLabelRace2, scrambled::kLabelRace3};
const char* const kGenderLabels[] = {scrambled::kLabelGenderNone, scrambled::kLabelGender0,
                                     scrambled::kLabelGender1};
const char* const kPoseLabels[] = {scrambled::kLabelPoseNone, scrambled::kLabelPose0, scrambled::kLabelPose1,
                                   scrambled::kLabelPose2,    scrambled::kLabelPose3, scrambled::kLabelPose4,
                                   scrambled::kLabelPose5,    scrambled::kLabelPose6};

template <std::size_t N>
std::string labelOf(int32_t value, const char* const (&labels)[N]) {
    // Compare in 64 bits so that no value wraps into the range.
    int64_t index = static_cast<int64_t>(value) + 1;
    if (index < 0 || index >= static_cast<int64_t>(N)) throw JsonError(kJsonSerializationError);
    return "\"" + descrambleText(labels[index]) + "\"";
}

template <std::size_t N>
int32_t valueOf(const std::string& text, const char* const (&labels)[N]) {
    for (std::size_t i = 0; i < N; ++i) {
        if (text == "\"" + descrambleText(labels[i]) + "\"") return static_cast<int32_t>(i) - 1;
    }
    throw JsonError(kJsonDeserializationError);
}

}  // namespace

std::string FaceAgeInterval::toJson() const { return labelOf(value, kAgeIntervalLabels); }
void FaceAgeInterval::fromJson(const std::string& text) { value = valueOf(text, kAgeIntervalLabels); }

std::string FaceRace::toJson() const { return labelOf(value, kRaceLabels); }
void FaceRace::fromJson(const std::string& text) { value = valueOf(text, kRaceLabels); }

std::string FaceGender::toJson() const { return labelOf(value, kGenderLabels); }
void FaceGender::fromJson(const std::string& text) { value = valueOf(text, kGenderLabels); }

std::string FacePose::toJson() const { return labelOf(value, kPoseLabels); }
void FacePose::fromJson(const std::string& text) { value = valueOf(text, kPoseLabels); }

FacePose FacePose::flip() const {
    static const int32_t kMirror[] = {-1, 0, 2, 1, 4, 3, 6, 5};
    if (value < -1 || value > 6) throw JsonError("Invalid pose");
    return FacePose(kMirror[value + 1]);
}
