#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "core/Errors.h"
#include "core/FaceData.h"
#include "quorin/JvwFile.h"
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
    f.setDataSet("dev");
    f.setFilePath("photos/group " + std::to_string(i) + ".jpg");
    f.setFaceRect(Rect2<int32_t>(10 * i, 20, 10 * i + 64, 84));
    f.setFaceScore(0.5f + static_cast<float>(i));
    f.setLandmark("leftEye", Point2<float>(12.5f, 40.0f));
    f.setLandmark("nose", Point2<float>(30.0f, -1.25f));
    f.setPersonName("p" + std::to_string(i));
    return f;
}

enum class Outcome { OpenRefused, ReadingError, Faces };

struct ReadCase {
    const char* what;
    std::string text;
    Outcome outcome;
    std::size_t faces;
};

// Runs open and readFaces the way a caller must: qv_data_error from open, a
// C string from readFaces.
Outcome readFile(const std::string& path, std::size_t& faces, std::string& message) {
    JvwReader reader;
    try {
        reader.open(path);
    } catch (const qv_data_error& e) {
        message = e.what();
        return Outcome::OpenRefused;
    }
    try {
        faces = reader.readFaces().size();
    } catch (const char* text) {
        message = text;
        return Outcome::ReadingError;
    }
    EXPECT_FALSE(reader.is_open());
    return Outcome::Faces;
}

TEST(JvwReader, AcceptsSkipsAndRefusesLines) {
    const std::string face = "{\"obj\":\"FACE\", \"content\":" + sampleFace(1).toJson() + "}";
    const std::string h = kHeader + "\n";
    const std::vector<ReadCase> cases = {
        {"line 1 alone", h, Outcome::Faces, 0},
        {"line 1 without line feed", kHeader, Outcome::Faces, 0},
        {"empty file", "", Outcome::OpenRefused, 0},
        {"line 1 with a trailing blank", kHeader + " \n", Outcome::OpenRefused, 0},
        {"line 1 with a carriage return", kHeader + "\r\n" + face + "\n", Outcome::OpenRefused, 0},
        {"another version", "JVW@QV\tVERSION=2\n", Outcome::OpenRefused, 0},
        {"blank instead of tab", "JVW@QV VERSION=1\n", Outcome::OpenRefused, 0},
        {"something before line 1", "\n" + h, Outcome::OpenRefused, 0},
        {"one record", h + face + "\n", Outcome::Faces, 1},
        {"record padded with blanks and tabs", h + " \t " + face + "\t \n", Outcome::Faces, 1},
        {"record with a carriage return", h + face + "\r\n", Outcome::Faces, 1},
        {"last record without line feed", h + face + "\n" + face, Outcome::Faces, 2},
        {"blank lines and comments", h + "\n   \n  # note\n#x\n" + face + "\n\t\n", Outcome::Faces, 1},
        {"other record type", h + "{\"obj\":\"BODY\", \"content\":{}}\n" + face + "\n", Outcome::Faces, 1},
        {"face with empty content", h + "{\"obj\":\"FACE\", \"content\":{}}\n", Outcome::Faces, 1},
        {"no content", h + face + "\n{\"obj\":\"BODY\"}\n", Outcome::ReadingError, 0},
        {"no obj", h + "{\"content\":{}}\n", Outcome::ReadingError, 0},
        {"obj not a string", h + "{\"obj\":FACE, \"content\":{}}\n", Outcome::ReadingError, 0},
        {"not an object", h + face + "\nhello\n", Outcome::ReadingError, 0},
        {"unclosed object", h + "{\"obj\":\"FACE\", \"content\":{}\n", Outcome::ReadingError, 0},
        {"content not a face", h + "{\"obj\":\"FACE\", \"content\":[1,2]}\n", Outcome::ReadingError, 0},
        {"face field unreadable", h + "{\"obj\":\"FACE\", \"content\":{\"faceRect\":[1,2]}}\n",
         Outcome::ReadingError, 0},
        {"record broken by a line feed", h + "{\"obj\":\"FACE\", \"content\":{\"dataSet\":\"a\nb\"}}\n",
         Outcome::ReadingError, 0},
    };
    int n = 0;
    for (const ReadCase& c : cases) {
        SCOPED_TRACE(c.what);
        std::size_t faces = 0;
        std::string message;
        const Outcome got = readFile(fileWith("read" + std::to_string(n++) + ".jvw", c.text), faces, message);
        ASSERT_EQ(static_cast<int>(got), static_cast<int>(c.outcome)) << message;
        if (got == Outcome::OpenRefused) {
            EXPECT_EQ(message, "Not a valid QV JVW file");
        } else if (got == Outcome::ReadingError) {
            EXPECT_EQ(message, "QV JVW file reading error");
        } else {
            EXPECT_EQ(faces, c.faces);
        }
    }
    std::size_t faces = 0;
    std::string message;
    EXPECT_EQ(static_cast<int>(readFile(scratch() + "/missing.jvw", faces, message)),
              static_cast<int>(Outcome::OpenRefused));
    EXPECT_EQ(message, "Not a valid QV JVW file");
}

TEST(JvwReader, DamagedFilesNeverCrash) {
    // Every cut of a good file, and every single byte flipped to a few values:
    // each read ends in faces, the open error or the reading error.
    std::string good = kHeader + "\n";
    for (int i = 0; i < 3; ++i) good += "{\"obj\":\"FACE\", \"content\":" + sampleFace(i).toJson() + "}\n";
    for (std::size_t cut = 0; cut <= good.size(); cut += 7) {
        std::size_t faces = 0;
        std::string message;
        readFile(fileWith("cut.jvw", good.substr(0, cut)), faces, message);
        EXPECT_LE(faces, 3u);
    }
    for (std::size_t at = kHeader.size() + 1; at < good.size(); at += 5) {
        for (char c : {'\0', '\n', '{', '"', ']', ','}) {
            std::string bad = good;
            bad[at] = c;
            std::size_t faces = 0;
            std::string message;
            readFile(fileWith("flip.jvw", bad), faces, message);
        }
    }
}

TEST(JvwWriter, WritesOneRecordLinePerFaceOnceAndReadsBack) {
    const std::vector<FaceData> faces = {sampleFace(0), sampleFace(1), FaceData()};
    const std::string path = scratch() + "/three.jvw";
    JvwWriter writer(path);
    writer.writeFaces(faces);
    EXPECT_FALSE(writer.is_open());
    std::string expected = kHeader + "\n";
    for (const FaceData& f : faces) expected += "{\"obj\":\"FACE\", \"content\":" + f.toJson() + "}\n";
    EXPECT_EQ(sourcetree::readText(path), expected);
    const std::vector<FaceData> back = JvwReader(path).readFaces();
    ASSERT_EQ(back.size(), faces.size());
    for (std::size_t i = 0; i < faces.size(); ++i) EXPECT_EQ(back[i].toJson(), faces[i].toJson());

    // One write per file; a second one fails without touching the file.
    for (const std::vector<FaceData>& again : {std::vector<FaceData>{}, std::vector<FaceData>{sampleFace(2)}}) {
        try {
            writer.writeFaces(again);
            ADD_FAILURE() << "a second writeFaces must fail";
        } catch (const std::runtime_error& e) {
            EXPECT_EQ(std::string(e.what()), "QV JVW file write error");
        }
    }
    EXPECT_EQ(sourcetree::readText(path), expected);
    for (const std::string& bad : {scratch() + "/no/such/dir/x.jvw", scratch()}) {
        try {
            JvwWriter failing(bad);
            ADD_FAILURE() << bad;
        } catch (const qv_data_error& e) {
            EXPECT_EQ(std::string(e.what()), "QV JVW file open error");
        }
    }
}

}  // namespace
