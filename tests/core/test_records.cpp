// Face records: FaceData and its text form, Rect2/Point2/LandmarkMap, the
// four class enumerations, FaceRecord's attributes, and the QVFace handle.

#include <gtest/gtest.h>

#include <climits>
#include <cstdlib>
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
#include "support/SourceTree.h"

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

TEST(FaceDataText, DefaultRecordWritesEveryFieldWithItsDefault) {
    const std::string text = FaceData().toJson();
    EXPECT_EQ(text,
              "{\"dataSet\":\"\", \"filePath\":\"\", \"faceRect\":[0,0,0,0], \"faceScore\":-3.40282e+38, "
              "\"landmarks\":{}, \"goodFace\":true, \"personID\":-1, \"personName\":\"\", \"age\":-1, "
              "\"ageInterval\":\"ageIntervalNone\", \"race\":\"raceNone\", \"gender\":\"genderNone\", "
              "\"facePose\":\"poseNone\"}");
    FaceData back;
    back.setFaceScore(7.0f);
    back.fromJson(text);
    EXPECT_FLOAT_EQ(back.faceScore(), -3.40282e+38f);
    EXPECT_EQ(back.faceWidth(), 0);
}

TEST(FaceDataText, RoundTripKeepsAllFieldsUpToSixDigits) {
    FaceData back;
    back.fromJson(fullFace().toJson());
    EXPECT_EQ(back.dataSet() + "|" + back.filePath() + "|" + back.personName(), "set|dir/img 1.pgm|Ann");
    EXPECT_EQ(back.faceRect(), Rect2<int32_t>(-5, 20, 110, 120));
    EXPECT_EQ(back.faceScore(), 0.123457f);
    EXPECT_EQ(back.age(), 33.3333f);
    EXPECT_EQ(back.landmark("leftEye"), Point2<float>(30.5f, 40.25f));
    EXPECT_EQ(back.landmark("nose"), Point2<float>(1e-7f, -2.5e6f));
    EXPECT_FALSE(back.isGoodFace());
    EXPECT_EQ((std::vector<int>{back.ageInterval().value, back.race().value, back.gender().value,
                                back.facePose().value}),
              (std::vector<int>{4, 0, 1, 6}));
    FaceData again;  // a second trip changes nothing
    again.fromJson(back.toJson());
    EXPECT_EQ(again.toJson(), back.toJson());
}

TEST(FaceDataText, AbsentKeysKeepValuesAndUnknownKeysAreIgnored) {
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
}

TEST(FaceDataText, MalformedFieldsAreRejectedAfterEarlierFieldsWereTaken) {
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

TEST(RecordValueText, RectPointAndLandmarkMapText) {
    EXPECT_EQ(Rect2<int32_t>(-1, 2, 30, 400).toJson(), "[-1,2,30,400]");
    EXPECT_EQ(Point2<float>(1.5f, 0.1234567f).toJson(), "[1.5,0.123457]");
    Point2<float> p;
    p.fromJson("[ 1.5 , 2 ]");
    EXPECT_EQ(p, Point2<float>(1.5f, 2.0f));
    for (const char* text : {"[1]", "[1,2,3]", "1,2", "[]", "[\"1\",2"})
        EXPECT_EQ(jsonErrorOf([&] { p.fromJson(text); }), "Json deserialization error") << text;

    LandmarkMap m;
    EXPECT_EQ(m.toJson(), "{}");
    m.setLandmark("nose", Point2<float>(3, 4));
    m.setLandmark("leftEye", Point2<float>(1, 2));
    m.setLandmark("nose", Point2<float>(5, 6));
    EXPECT_EQ(m.toJson(), R"({"leftEye":[1,2],"nose":[5,6]})");
    m.fromJson(R"({"rightEye":[7,8]})");
    EXPECT_EQ(m.size(), 1u) << "reading replaces the whole map";
    try {
        m.landmark("nose");
        FAIL();
    } catch (const std::invalid_argument& e) {
        EXPECT_STREQ(e.what(), "No value available for the input landmark");
    }
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

TEST(FaceEnumerations, EveryValueRoundTripsAndOthersAreRejected) {
    expectLabelsRoundTrip<FaceAgeInterval>(-1, 4);
    expectLabelsRoundTrip<FaceRace>(-1, 3);
    expectLabelsRoundTrip<FaceGender>(-1, 1);
    expectLabelsRoundTrip<FacePose>(-1, 6);
}

TEST(FaceEnumerations, PoseMirrorsAndWildness) {
    const int mirror[] = {-1, 0, 2, 1, 4, 3, 6, 5};
    for (int v = -1; v <= 6; ++v) {
        EXPECT_EQ(FacePose(v).flip().value, mirror[v + 1]);
        EXPECT_EQ(FacePose(v).flip().flip().value, v);
        EXPECT_EQ(FacePose(v).wildPose(), v < 0 || v > 2) << v;
    }
    for (int v : {-2, 7, INT_MIN}) EXPECT_EQ(jsonErrorOf([&] { FacePose(v).flip(); }), "Invalid pose");
    EXPECT_TRUE(FacePose().wildPose());
    EXPECT_TRUE(FacePose::Compare()(FacePose(-1), FacePose(0)));
    EXPECT_FALSE(FacePose::Compare()(FacePose(2), FacePose(2)));
}

TEST(RecordTexts, StoredLabelsAreGeneratedFromTheirTable) {
    EXPECT_EQ(FacePose(3).toJson(), "\"pose3\"");
    EXPECT_EQ(FaceAgeInterval(-1).toJson(), "\"ageIntervalNone\"");
    const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") +
                                "' --check --table '" + sourcetree::path("src/core/RecordTexts.txt") +
                                "' --header '" + sourcetree::path("src/core/RecordTexts.h") + "'";
    EXPECT_EQ(std::system(command.c_str()), 0) << "regenerate src/core/RecordTexts.h";
}

TEST(FaceRecordAttributes, FiveNamedFieldsRoundTripAndOthersRaiseApiError) {
    FaceRecord r(fullFace()), other;
    EXPECT_EQ(r.attribute("attributeAge"), "33.3333321");
    EXPECT_EQ(r.attribute("attributeGender"), FaceGender(1).toJson());
    for (const char* name : {"attributeAge", "attributeGender", "attributeRace", "attributeAgeInterval", "attributePose"}) {
        other.setAttribute(name, r.attribute(name));
        EXPECT_EQ(other.attribute(name), r.attribute(name)) << name;
    }
    EXPECT_THROW(r.attribute("age"), ApiError);
    EXPECT_THROW(r.setAttribute("attributeage", "1"), ApiError);
    EXPECT_THROW(r.setAttribute("attributeAge", "old"), ApiError);
    EXPECT_THROW(r.setAttribute("attributeGender", "1"), ApiError);
    r.faceData().setRace(FaceRace(9));  // reachable from code only, never from text
    EXPECT_THROW(r.attribute("attributeRace"), ApiError);
    EXPECT_THROW(r.toJson(), ApiError);
    EXPECT_THROW(r.fromJson("{"), ApiError);
}

TEST(QVFaceHandle, CopiesAreDeepAndFailuresAreReported) {
    QVFace a;
    a.fromJson(fullFace().toJson());
    QVFace b(a);
    b.setPersonName("Cy");
    b.setLandmark("leftEye", QVFacePoint{1, 2});
    EXPECT_EQ(a.personName(), "Ann");
    EXPECT_EQ(a.landmark("leftEye").x, 30.5f);
    a = b;
    b.setGoodFace(true);
    EXPECT_EQ(a.personName(), "Cy");
    EXPECT_FALSE(a.isGoodFace());
    EXPECT_EQ(a.faceRect().left, -5);
    EXPECT_EQ(a.faceWidth(), 115);
    QVFace fresh;
    EXPECT_THROW(fresh.landmark("nose"), std::invalid_argument);
    EXPECT_THROW(fresh.fromJson("not json"), ApiError);
    EXPECT_EQ(fresh.toJson(), FaceData().toJson());
}

}  // namespace
