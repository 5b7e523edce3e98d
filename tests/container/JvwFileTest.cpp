#include <gtest/gtest.h>

#include <stdexcept>

#include "core/Errors.h"
#include "core/FaceData.h"
#include "quorin/JvwFile.h"
#include "support/ExpectThrow.h"
#include "support/SourceTree.h"

namespace {

const std::string kHeader = "JVW@QV\tVERSION=1";

std::string scratch() {
    static const std::string dir = sourcetree::scratchDir("jvw");
    return dir;
}

std::string fileWith(const std::string& name, const std::string& text) {
    const std::string path = scratch() + "/" + name;
    sourcetree::writeText(path, text);
    return path;
}

FaceData sampleFace(int i) {
    FaceData f;
    f.setFilePath("photos/group " + std::to_string(i) + ".jpg");
    f.setFaceRect(Rect2<int32_t>(10 * i, 20, 10 * i + 64, 84));
    f.setLandmark("nose", Point2<float>(30.0f, -1.25f));
    f.setPersonName("p" + std::to_string(i));
    return f;
}

const std::string kOpenRefused = "Not a valid QV JVW file", kReadingError = "QV JVW file reading error";

// Opens and reads the way a caller must (qv_data_error from open, a C string
// from readFaces): the error's text, or the number of faces read.
std::string readFile(const std::string& path) {
    JvwReader reader;
    try {
        reader.open(path);
        return std::to_string(reader.readFaces().size()) + " faces";
    } catch (const qv_data_error& e) {
        return e.what();
    } catch (const char* text) {
        return text;
    }
}

}  // namespace

TEST(JvwReader, AcceptsSkipsAndRefusesLines) {
    const std::string face = "{\"obj\":\"FACE\", \"content\":" + sampleFace(1).toJson() + "}";
    const std::string h = kHeader + "\n";
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"", kOpenRefused},
        {kHeader + " \n", kOpenRefused},
        {kHeader + "\r\n" + face + "\n", kOpenRefused},
        {"JVW@QV\tVERSION=2\n", kOpenRefused},
        {h + face + "\n", "1 faces"},
        {h + " \t " + face + "\t \n", "1 faces"},  // padded with blanks and tabs
        {h + face + "\r\n", "1 faces"},
        {h + "\n   \n  # note\n#x\n" + face + "\n\t\n", "1 faces"},
        {h + "{\"obj\":\"BODY\", \"content\":{}}\n" + face + "\n", "1 faces"},  // other record types skipped
        {h + "{\"obj\":\"FACE\", \"content\":{}}\n", "1 faces"},
        {h + face + "\n{\"obj\":\"BODY\"}\n", kReadingError},  // no content
        {h + "{\"obj\":FACE, \"content\":{}}\n", kReadingError},
        {h + face + "\nhello\n", kReadingError},
        {h + "{\"obj\":\"FACE\", \"content\":[1,2]}\n", kReadingError},
        {h + "{\"obj\":\"FACE\", \"content\":{\"faceRect\":[1,2]}}\n", kReadingError},
        {h + "{\"obj\":\"FACE\", \"content\":{\"dataSet\":\"a\nb\"}}\n", kReadingError},
    };
    for (std::size_t i = 0; i < cases.size(); ++i)
        EXPECT_EQ(readFile(fileWith("read" + std::to_string(i) + ".jvw", cases[i].first)), cases[i].second)
            << "case " << i << ": " << cases[i].first;
    EXPECT_EQ(readFile(scratch() + "/missing.jvw"), kOpenRefused);
}

TEST(JvwWriter, WritesOneRecordLinePerFaceOnceAndReadsBack) {
    const std::vector<FaceData> faces = {sampleFace(0), sampleFace(1), FaceData()};
    const std::string path = scratch() + "/three.jvw";
    JvwWriter writer(path);
    writer.writeFaces(faces);
    std::string expected = kHeader + "\n";
    for (const FaceData& f : faces) expected += "{\"obj\":\"FACE\", \"content\":" + f.toJson() + "}\n";
    EXPECT_EQ(sourcetree::readText(path), expected);
    EXPECT_EQ(JvwReader(path).readFaces().at(1).toJson(), faces[1].toJson());

    // One write per file; a second one fails without touching the file.
    expectThrowWith<std::runtime_error>([&] { writer.writeFaces({sampleFace(2)}); }, "QV JVW file write error");
    EXPECT_EQ(sourcetree::readText(path), expected);
    for (const std::string& bad : {scratch() + "/no/such/dir/x.jvw", scratch()})
        expectThrowWith<qv_data_error>([&] { JvwWriter failing(bad); }, "QV JVW file open error");
}
