#include <gtest/gtest.h>

#include <climits>
#include <stdexcept>

#include "core/ApiError.h"
#include "core/FaceData.h"
#include "core/FaceEnums.h"
#include "core/FaceRecord.h"
#include "core/Json.h"
#include "support/ExpectThrow.h"

namespace {

const char* const kReadError = "Json deserialization error";

// Every field set, as toJson writes it: floats keep six significant digits.
const std::string kFullFace =
    R"({"dataSet":"set", "filePath":"dir/img 1.pgm", "faceRect":[-5,20,110,120], "faceScore":0.123457, )"
    R"("landmarks":{"leftEye":[30.5,40.25],"nose":[1e-07,-2.5e+06]}, "goodFace":false, "personID":-1, )"
    R"("personName":"Ann", "age":33.3333, "ageInterval":"ageInterval4", "race":"race0", "gender":"gender1", )"
    R"("facePose":"pose6"})";

FaceData fullFace() {
    FaceData f;
    f.fromJson(kFullFace);
    return f;
}

// The text form is what record files store: every field, defaults included.
TEST(RecordFaceDataText, DefaultRecordTextAndRoundTrips) {
    EXPECT_EQ(FaceData().toJson(),
              "{\"dataSet\":\"\", \"filePath\":\"\", \"faceRect\":[0,0,0,0], \"faceScore\":-3.40282e+38, "
              "\"landmarks\":{}, \"goodFace\":true, \"personID\":-1, \"personName\":\"\", \"age\":-1, "
              "\"ageInterval\":\"ageIntervalNone\", \"race\":\"raceNone\", \"gender\":\"genderNone\", "
              "\"facePose\":\"poseNone\"}");
    EXPECT_EQ(fullFace().toJson(), kFullFace);
}

TEST(RecordFaceDataText, AbsentKeysKeepValuesAndUnknownKeysAreIgnored) {
    FaceData f = fullFace();
    f.fromJson("{}");
    EXPECT_EQ(f.toJson(), kFullFace);
    f.fromJson(R"({"personName":"Bo", "unknown":[1,2,{"x":3}], "personID":42})");
    EXPECT_EQ(f.dataSet() + f.personName(), "setBo");
    EXPECT_NE(f.toJson().find("\"personID\":42"), std::string::npos) << "no accessor, but it travels";
    f.fromJson(R"({"faceRect":[12abc,2,3,4], "age":old})");  // unreadable numbers are no error
    EXPECT_EQ(f.faceRect().left, 12);
    f.fromJson(R"({"landmarks":{"rightEye":[7,8]}})");
    EXPECT_THROW(f.landmark("nose"), std::invalid_argument) << "reading replaces the whole map";
}

TEST(RecordFaceDataText, MalformedFieldsAreRejectedAfterEarlierFieldsWereTaken) {
    for (const char* text : {R"({"faceRect":[1,2,3]})", R"({"faceRect":[1,2,3,4,5]})", R"({"goodFace":1})",
                             R"({"goodFace":"true"})", R"({"landmarks":{"a":[1]}})", R"({"landmarks":[1,2]})",
                             R"({"gender":"gender2"})", R"({"facePose":poseNone})", R"({"race":3})",
                             R"({"dataSet":set})", "{\"faceRect\":[1,2,3,4]", "", "{\"a\":\"open}"})
        expectThrowWith<JsonError>([&] { FaceData().fromJson(text); }, kReadError, text);
    FaceData f;
    EXPECT_THROW(f.fromJson(R"({"dataSet":"kept", "faceRect":[1,2], "personName":"never"})"), JsonError);
    EXPECT_EQ(f.dataSet() + f.personName(), "kept");
    f.setFaceRect(Rect2<int32_t>(INT_MIN, INT_MIN, INT_MAX, INT_MAX));
    EXPECT_EQ(f.faceWidth(), -1) << "wraps instead of being undefined";
}

template <typename E>
void expectLabelsRoundTrip(int lowest, int highest) {
    for (int v = lowest; v <= highest; ++v) {
        E back(99);
        back.fromJson(E(v).toJson());
        EXPECT_EQ(back.value, v);
    }
    for (int v : {lowest - 1, highest + 1, INT_MAX, INT_MIN})
        expectThrowWith<JsonError>([&] { E(v).toJson(); }, "Json serialization error", std::to_string(v));
    E e(0);
    const std::string label = E(1).toJson();
    for (const std::string& text : {label.substr(1, label.size() - 2), label + " ", std::string("\"\"")})
        expectThrowWith<JsonError>([&] { e.fromJson(text); }, kReadError, text);
    EXPECT_EQ(e.value, 0) << "a rejected text leaves the value";
}

TEST(RecordEnumerations, EveryValueRoundTripsOthersAreRejectedAndPosesMirror) {
    expectLabelsRoundTrip<FaceAgeInterval>(-1, 4);
    expectLabelsRoundTrip<FaceRace>(-1, 3);
    expectLabelsRoundTrip<FaceGender>(-1, 1);
    expectLabelsRoundTrip<FacePose>(-1, 6);
    // Poses mirror left and right; all but the frontal ones are wild.
    const int mirror[] = {-1, 0, 2, 1, 4, 3, 6, 5};
    for (int v = -1; v <= 6; ++v) {
        EXPECT_EQ(FacePose(v).flip().value, mirror[v + 1]);
        EXPECT_EQ(FacePose(v).wildPose(), v < 0 || v > 2) << v;
    }
    for (int v : {-2, 7, INT_MIN}) expectThrowWith<JsonError>([&] { FacePose(v).flip(); }, "Invalid pose");
}

TEST(RecordAttributes, FiveNamedFieldsRoundTripAndOthersRaiseApiError) {
    FaceRecord r(fullFace()), other;
    EXPECT_EQ(r.attribute("attributeAge"), "33.3333015");  // nine digits here, unlike the record text
    for (const char* name :
         {"attributeAge", "attributeGender", "attributeRace", "attributeAgeInterval", "attributePose"}) {
        other.setAttribute(name, r.attribute(name));
        EXPECT_EQ(other.attribute(name), r.attribute(name)) << name;
    }
    EXPECT_THROW(r.attribute("age"), ApiError);
    for (const auto& bad : std::vector<std::pair<const char*, const char*>>{
             {"attributeage", "1"}, {"attributeAge", "old"}, {"attributeGender", "1"}})
        EXPECT_THROW(r.setAttribute(bad.first, bad.second), ApiError) << bad.first << " " << bad.second;
    r.faceData().setRace(FaceRace(9));  // reachable from code only, never from text
    EXPECT_THROW(r.attribute("attributeRace"), ApiError);
    EXPECT_THROW(r.toJson(), ApiError);
}

}  // namespace
