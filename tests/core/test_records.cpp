// Face records: FaceData and its text form, Rect2/Point2/LandmarkMap, the
// four class enumerations, FaceRecord's attributes, and the QVFace handle.

#include <gtest/gtest.h>

#include <climits>
#include <limits>
#include <stdexcept>
#include <string>

#include "core/ApiError.h"
#include "core/FaceData.h"
#include "core/FaceEnums.h"
#include "core/FaceRecord.h"
#include "core/Json.h"
#include "core/QVFace.h"

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

void expectSameFields(const FaceData& a, const FaceData& b) {
    EXPECT_EQ(a.dataSet(), b.dataSet());
    EXPECT_EQ(a.filePath(), b.filePath());
    EXPECT_EQ(a.faceRect(), b.faceRect());
    EXPECT_EQ(a.landmarks().points(), b.landmarks().points());
    EXPECT_EQ(a.isGoodFace(), b.isGoodFace());
    EXPECT_EQ(a.personName(), b.personName());
    EXPECT_EQ(a.ageInterval(), b.ageInterval());
    EXPECT_EQ(a.race(), b.race());
    EXPECT_EQ(a.gender(), b.gender());
    EXPECT_EQ(a.facePose(), b.facePose());
}

// ------------------------------------------------------------ FaceData text

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
    EXPECT_TRUE(back.isGoodFace());
    EXPECT_EQ(back.faceWidth(), 0);
}

TEST(FaceDataText, RoundTripKeepsAllFieldsUpToSixDigits) {
    const FaceData original = fullFace();
    FaceData back;
    back.fromJson(original.toJson());
    expectSameFields(back, FaceData(back));  // copy is a plain value
    EXPECT_EQ(back.dataSet(), "set");
    EXPECT_EQ(back.filePath(), "dir/img 1.pgm");
    EXPECT_EQ(back.faceRect(), Rect2<int32_t>(-5, 20, 110, 120));
    EXPECT_EQ(back.faceScore(), 0.123457f);
    EXPECT_EQ(back.age(), 33.3333f);
    EXPECT_EQ(back.landmark("leftEye"), Point2<float>(30.5f, 40.25f));
    EXPECT_EQ(back.landmark("nose"), Point2<float>(1e-7f, -2.5e6f));
    EXPECT_FALSE(back.isGoodFace());
    EXPECT_EQ(back.personName(), "Ann");
    EXPECT_EQ(back.ageInterval().value, 4);
    EXPECT_EQ(back.race().value, 0);
    EXPECT_EQ(back.gender().value, 1);
    EXPECT_EQ(back.facePose().value, 6);
    EXPECT_EQ(back.toJson(), FaceData(back).toJson());
    // A second trip changes nothing: the text form is a fixed point.
    FaceData again;
    again.fromJson(back.toJson());
    EXPECT_EQ(again.toJson(), back.toJson());
}

TEST(FaceDataText, AbsentKeysKeepValuesAndUnknownKeysAreIgnored) {
    FaceData f = fullFace();
    const std::string before = f.toJson();
    f.fromJson("{}");
    EXPECT_EQ(f.toJson(), before);
    f.fromJson(R"({"personName":"Bo", "unknown":[1,2,{"x":3}], "faceScore":2})");
    EXPECT_EQ(f.personName(), "Bo");
    EXPECT_EQ(f.faceScore(), 2.0f);
    EXPECT_EQ(f.dataSet(), "set");
    // personID has no accessor, but it travels through the text.
    f.fromJson(R"({"personID":42})");
    EXPECT_NE(f.toJson().find("\"personID\":42"), std::string::npos);
}

TEST(FaceDataText, MalformedFieldsAreRejectedAfterEarlierFieldsWereTaken) {
    const char* const bad[] = {
        R"({"faceRect":[1,2,3]})",         R"({"faceRect":[1,2,3,4,5]})",  R"({"faceRect":{}})",
        R"({"goodFace":1})",               R"({"goodFace":"true"})",       R"({"landmarks":{"a":[1]}})",
        R"({"landmarks":[1,2]})",          R"({"gender":"gender2"})",      R"({"facePose":poseNone})",
        R"({"ageInterval":"ageinterval0"})", R"({"race":3})",              R"({"dataSet":set})",
        "{\"faceRect\":[1,2,3,4]",         "",                             "{\"a\":\"unterminated}",
    };
    for (const char* text : bad) {
        FaceData f;
        EXPECT_EQ(jsonErrorOf([&] { f.fromJson(text); }), "Json deserialization error") << text;
    }
    FaceData f;
    EXPECT_THROW(f.fromJson(R"({"dataSet":"kept", "faceRect":[1,2], "personName":"never"})"), JsonError);
    EXPECT_EQ(f.dataSet(), "kept");
    EXPECT_EQ(f.personName(), "");
}

TEST(FaceDataText, UnreadableNumbersAreNoError) {
    FaceData f;
    f.fromJson(R"({"faceRect":[12abc,2,3,4], "age":old})");
    EXPECT_EQ(f.faceRect().left, 12);
}

TEST(FaceDataSizes, WidthAndHeightNeverOverflow) {
    FaceData f;
    f.setFaceRect(Rect2<int32_t>(INT_MIN, INT_MIN, INT_MAX, INT_MAX));
    EXPECT_EQ(f.faceWidth(), -1);  // wraps instead of being undefined
    f.setFaceRect(Rect2<int32_t>(10, 20, 15, 50));
    EXPECT_EQ(f.faceWidth(), 5);
    EXPECT_EQ(f.faceHeight(), 30);
}

// ------------------------------------------------------- value types' text

TEST(RecordValueText, RectAndPointWriteWithoutBlanksAndReadWithThem) {
    EXPECT_EQ(Rect2<int32_t>(-1, 2, 30, 400).toJson(), "[-1,2,30,400]");
    EXPECT_EQ(Point2<float>(1.5f, 0.1234567f).toJson(), "[1.5,0.123457]");
    Point2<float> p;
    p.fromJson("[ 1.5 , 2 ]");
    EXPECT_EQ(p, Point2<float>(1.5f, 2.0f));
    Rect2<int32_t> r;
    r.fromJson("[ 1 ,\t2,3 , 4 ]");
    EXPECT_EQ(r, Rect2<int32_t>(1, 2, 3, 4));
    for (const char* text : {"[1]", "[1,2,3]", "1,2", "[]", "[\"1\",2"}) {
        EXPECT_EQ(jsonErrorOf([&] { p.fromJson(text); }), "Json deserialization error") << text;
    }
}

TEST(RecordValueText, LandmarkMapIsOrderedByNameAndReplacedWhole) {
    LandmarkMap m;
    EXPECT_EQ(m.toJson(), "{}");
    m.setLandmark("nose", Point2<float>(3, 4));
    m.setLandmark("leftEye", Point2<float>(1, 2));
    m.setLandmark("nose", Point2<float>(5, 6));
    EXPECT_EQ(m.size(), 2u);
    EXPECT_EQ(m.toJson(), R"({"leftEye":[1,2],"nose":[5,6]})");
    m.fromJson(R"({"rightEye":[7,8]})");
    EXPECT_EQ(m.size(), 1u);
    try {
        m.landmark("nose");
        FAIL();
    } catch (const std::invalid_argument& e) {
        EXPECT_STREQ(e.what(), "No value available for the input landmark");
    }
    EXPECT_THROW(m.fromJson(R"({"a":[1,2],"b":"x"})"), JsonError);
}

// ------------------------------------------------------------ enumerations

TEST(FaceEnumerations, EveryValueRoundTripsAndOthersAreRejected) {
    for (int v = -1; v <= 4; ++v) {
        FaceAgeInterval e(v), back(99);
        back.fromJson(e.toJson());
        EXPECT_EQ(back.value, v);
    }
    for (int v = -1; v <= 3; ++v) {
        FaceRace e(v), back;
        back.fromJson(e.toJson());
        EXPECT_EQ(back.value, v);
    }
    for (int v = -1; v <= 1; ++v) {
        FaceGender e(v), back;
        back.fromJson(e.toJson());
        EXPECT_EQ(back.value, v);
    }
    for (int v = -1; v <= 6; ++v) {
        FacePose e(v), back;
        back.fromJson(e.toJson());
        EXPECT_EQ(back.value, v);
    }
    for (int v : {-2, 5, INT_MAX, INT_MIN})
        EXPECT_EQ(jsonErrorOf([&] { FaceAgeInterval(v).toJson(); }), "Json serialization error") << v;
    EXPECT_EQ(jsonErrorOf([&] { FaceGender(2).toJson(); }), "Json serialization error");
    EXPECT_EQ(jsonErrorOf([&] { FaceRace(4).toJson(); }), "Json serialization error");
    EXPECT_EQ(jsonErrorOf([&] { FacePose(7).toJson(); }), "Json serialization error");
    FaceGender g(1);
    const std::string label = FaceGender(0).toJson();
    for (const std::string& text : {label.substr(1, label.size() - 2), label + " ", std::string("\"\""), std::string()})
        EXPECT_EQ(jsonErrorOf([&] { g.fromJson(text); }), "Json deserialization error") << text;
    EXPECT_EQ(g.value, 1) << "a rejected text leaves the value";
}

TEST(FaceEnumerations, PoseMirrorsAndWildness) {
    const int mirror[] = {-1, 0, 2, 1, 4, 3, 6, 5};
    for (int v = -1; v <= 6; ++v) {
        EXPECT_EQ(FacePose(v).flip().value, mirror[v + 1]);
        EXPECT_EQ(FacePose(v).flip().flip().value, v);
    }
    for (int v : {-2, 7, INT_MIN}) EXPECT_EQ(jsonErrorOf([&] { FacePose(v).flip(); }), "Invalid pose");
    EXPECT_TRUE(FacePose().wildPose());
    for (int v : {0, 1, 2}) EXPECT_FALSE(FacePose(v).wildPose());
    for (int v : {3, 4, 5, 6}) EXPECT_TRUE(FacePose(v).wildPose());
    EXPECT_TRUE(FacePose::Compare()(FacePose(-1), FacePose(0)));
    EXPECT_FALSE(FacePose::Compare()(FacePose(2), FacePose(2)));
}

// ----------------------------------------------------------- FaceRecord

TEST(FaceRecordAttributes, FiveNamedFieldsRoundTripAsText) {
    FaceRecord r(fullFace());
    EXPECT_EQ(r.attribute("attributeAge"), "33.3333321");
    EXPECT_EQ(r.attribute("attributeGender"), FaceGender(1).toJson());
    EXPECT_EQ(r.attribute("attributePose"), FacePose(6).toJson());
    FaceRecord other;
    for (const char* name :
         {"attributeAge", "attributeGender", "attributeRace", "attributeAgeInterval", "attributePose"}) {
        other.setAttribute(name, r.attribute(name));
        EXPECT_EQ(other.attribute(name), r.attribute(name)) << name;
    }
    EXPECT_EQ(other.faceData().age(), r.faceData().age());
}

TEST(FaceRecordAttributes, UnknownNamesAndBadValuesRaiseApiError) {
    FaceRecord r;
    EXPECT_THROW(r.attribute("age"), ApiError);
    EXPECT_THROW(r.attribute(""), ApiError);
    EXPECT_THROW(r.setAttribute("attributeage", "1"), ApiError);
    EXPECT_THROW(r.setAttribute("attributeAge", "old"), ApiError);
    EXPECT_THROW(r.setAttribute("attributeGender", "1"), ApiError);
    EXPECT_EQ(r.faceData().gender().value, -1);
    r.faceData().setRace(FaceRace(9));  // only reachable from code, never from text
    EXPECT_THROW(r.attribute("attributeRace"), ApiError);
    EXPECT_THROW(r.toJson(), ApiError);
    EXPECT_THROW(r.fromJson("{"), ApiError);
}

// ---------------------------------------------------------------- QVFace

TEST(QVFaceHandle, CopiesAreDeep) {
    QVFace a;
    a.fromJson(fullFace().toJson());
    QVFace b(a);
    b.setPersonName("Cy");
    b.setLandmark("leftEye", QVFacePoint{1, 2});
    EXPECT_EQ(a.personName(), "Ann");
    EXPECT_EQ(a.landmark("leftEye").x, 30.5f);
    a = b;
    EXPECT_EQ(a.personName(), "Cy");
    b.setGoodFace(true);
    EXPECT_FALSE(a.isGoodFace());
    const QVFaceRect r = a.faceRect();
    EXPECT_EQ(r.left, -5);
    EXPECT_EQ(r.bottom, 120);
    EXPECT_EQ(a.faceWidth(), 115);
    EXPECT_EQ(a.faceHeight(), 100);
}

TEST(QVFaceHandle, FailuresAreReportedNotHidden) {
    QVFace f;
    EXPECT_THROW(f.landmark("nose"), std::invalid_argument);
    EXPECT_THROW(f.fromJson("not json"), ApiError);
    EXPECT_THROW(f.attribute("nothing"), ApiError);
    EXPECT_EQ(f.toJson(), FaceData().toJson());
}

}  // namespace
