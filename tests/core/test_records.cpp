#include <gtest/gtest.h>

#include <climits>
#include <stdexcept>
#include <string>
#include <vector>

#include "core/ApiError.h"
#include "core/FaceData.h"
#include "core/FaceEnums.h"
#include "core/FaceRecord.h"
#include "core/Json.h"
#include "core/QVFace.h"
#include "core/RecordTexts.h"

namespace {

template <typename F>
std::string jsonErrorOf(F f) {
    try {
        f();
    } catch (const JsonError& e) {
        return e.what();
    }
    return "<no JsonError>";
}

FaceData fullFace() {
    FaceData f;
    f.setDataSet("set");
    f.setFilePath("dir/img 1.pgm");
    f.setFaceRect(Rect2<int32_t>(-5, 20, 110, 120));
    f.setFaceScore(0.123456789f);
    f.setLandmark("leftEye", Point2<float>(30.5f, 40.25f));
    f.setLandmark("nose", Point2<float>(1e-7f, -2.5e6f));
    f.setGoodFace(false);
    f.setPersonName("Ann");
    f.setAge(33.3333333f);
    f.setAgeInterval(FaceAgeInterval(4));
    f.setRace(FaceRace(0));
    f.setGender(FaceGender(1));
    f.setFacePose(FacePose(6));
    return f;
}

// The text form is what record files store: every field, defaults included.
TEST(RecordFaceDataText, DefaultRecordTextAndRoundTrips) {
    EXPECT_EQ(FaceData().toJson(),
              "{\"dataSet\":\"\", \"filePath\":\"\", \"faceRect\":[0,0,0,0], \"faceScore\":-3.40282e+38, "
              "\"landmarks\":{}, \"goodFace\":true, \"personID\":-1, \"personName\":\"\", \"age\":-1, "
              "\"ageInterval\":\"ageIntervalNone\", \"race\":\"raceNone\", \"gender\":\"genderNone\", "
              "\"facePose\":\"poseNone\"}");
    for (const FaceData& original : {FaceData(), fullFace()}) {
        FaceData back;
        back.setFaceScore(7.0f);
        back.fromJson(original.toJson());
        EXPECT_EQ(back.toJson(), original.toJson());
    }
    FaceData back;  // floats keep six significant digits
    back.fromJson(fullFace().toJson());
    EXPECT_EQ(back.faceScore(), 0.123457f);
    EXPECT_EQ(back.landmark("nose"), Point2<float>(1e-7f, -2.5e6f));
    EXPECT_EQ(back.facePose().value, 6);
}

TEST(RecordFaceDataText, AbsentKeysKeepValuesAndUnknownKeysAreIgnored) {
    FaceData f = fullFace();
    const std::string before = f.toJson();
    f.fromJson("{}");
    EXPECT_EQ(f.toJson(), before);
    f.fromJson(R"({"personName":"Bo", "unknown":[1,2,{"x":3}], "faceScore":2, "personID":42})");
    EXPECT_EQ(f.personName(), "Bo");
    EXPECT_EQ(f.faceScore(), 2.0f);
    EXPECT_EQ(f.dataSet(), "set");
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
                             R"({"dataSet":set})", "{\"faceRect\":[1,2,3,4]", "", "{\"a\":\"open}"}) {
        FaceData f;
        EXPECT_EQ(jsonErrorOf([&] { f.fromJson(text); }), "Json deserialization error") << text;
    }
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
        EXPECT_EQ(jsonErrorOf([&] { E(v).toJson(); }), "Json serialization error") << v;
    E e(0);
    const std::string label = E(1).toJson();
    for (const std::string& text : {label.substr(1, label.size() - 2), label + " ", std::string("\"\"")})
        EXPECT_EQ(jsonErrorOf([&] { e.fromJson(text); }), "Json deserialization error") << text;
    EXPECT_EQ(e.value, 0) << "a rejected text leaves the value";
}

TEST(RecordEnumerations, EveryValueRoundTripsAndOthersAreRejected) {
    expectLabelsRoundTrip<FaceAgeInterval>(-1, 4);
    expectLabelsRoundTrip<FaceRace>(-1, 3);
    expectLabelsRoundTrip<FaceGender>(-1, 1);
    expectLabelsRoundTrip<FacePose>(-1, 6);
}

TEST(RecordEnumerations, PoseMirrorsAndWildness) {
    const int mirror[] = {-1, 0, 2, 1, 4, 3, 6, 5};
    for (int v = -1; v <= 6; ++v) {
        EXPECT_EQ(FacePose(v).flip().value, mirror[v + 1]);
        EXPECT_EQ(FacePose(v).wildPose(), v < 0 || v > 2) << v;
    }
    for (int v : {-2, 7, INT_MIN}) EXPECT_EQ(jsonErrorOf([&] { FacePose(v).flip(); }), "Invalid pose");
}

TEST(RecordAttributes, FiveNamedFieldsRoundTripAndOthersRaiseApiError) {
    FaceRecord r(fullFace()), other;
    EXPECT_EQ(r.attribute("attributeAge"), "33.3333321");  // nine digits here, unlike the record text
    for (const char* name : {"attributeAge", "attributeGender", "attributeRace", "attributeAgeInterval", "attributePose"}) {
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
    EXPECT_THROW(r.fromJson("{"), ApiError);
}

TEST(RecordQVFaceHandle, CopiesAreDeepAndFailuresAreReported) {
    QVFace a;
    a.fromJson(fullFace().toJson());
    QVFace b(a);
    b.setPersonName("Cy");
    EXPECT_EQ(a.personName(), "Ann");
    a = b;
    b.setGoodFace(true);
    EXPECT_EQ(a.personName(), "Cy");
    EXPECT_FALSE(a.isGoodFace());
    QVFace fresh;
    EXPECT_THROW(fresh.landmark("nose"), std::invalid_argument);
    EXPECT_THROW(fresh.fromJson("not json"), ApiError);
    EXPECT_EQ(fresh.toJson(), FaceData().toJson());
}

}  // namespace
