#include "quorin/JvwFile.h"

#include <exception>
#include <map>
#include <stdexcept>

#include <boost/algorithm/string/trim.hpp>

#include "core/Errors.h"
#include "core/FaceData.h"
#include "core/Json.h"

namespace {

const char kHeaderLine[] = "JVW@QV\tVERSION=1";
const char kFaceType[] = "FACE";

}  // namespace

JvwWriter::JvwWriter() { exceptions(std::ios_base::failbit | std::ios_base::badbit); }

JvwWriter::JvwWriter(const std::string& path) {
    exceptions(std::ios_base::failbit | std::ios_base::badbit);
    open(path);
}

void JvwWriter::open(const std::string& path) {
    try {
        std::ofstream::open(path, std::ios_base::out | std::ios_base::trunc);
        *this << kHeaderLine << '\n';
    } catch (const std::exception&) {
        throw qv_data_error("QV JVW file open error");
    }
}

void JvwWriter::writeFaces(const std::vector<FaceData>& faces) {
    try {
        for (const FaceData& face : faces) {
            const std::string line =
                "{" + jsonNamedValue("obj", std::string(kFaceType)) + ", " + jsonNamedValue("content", face) + "}";
            *this << line << '\n';
        }
        close();
    } catch (const std::exception&) {
        throw std::runtime_error("QV JVW file write error");
    }
}

JvwReader::JvwReader() {}

JvwReader::JvwReader(const std::string& path) { open(path); }

void JvwReader::open(const std::string& path) {
    std::ifstream::open(path);
    // A failed open leaves the line empty, which the comparison refuses.
    std::string line;
    std::getline(*this, line);
    if (line != kHeaderLine) throw qv_data_error("Not a valid QV JVW file");
}

std::vector<FaceData> JvwReader::readFaces() {
    try {
        std::vector<FaceData> result;
        std::string line;
        for (;;) {
            std::getline(*this, line);
            if (fail() || bad()) break;
            boost::algorithm::trim_right(line);
            boost::algorithm::trim_left(line);
            if (line.empty() || line[0] == '#') continue;

            const std::map<std::string, std::string> items = parseJsonObject(line);
            const auto obj = items.find("obj");
            if (obj == items.end()) throw qv_data_error("Not a valid QV JVW file");
            std::string type;
            JsonValue<std::string>::fromText(obj->second, type);
            const auto content = items.find("content");
            if (content == items.end()) throw qv_data_error("Not a valid QV JVW file");
            if (type == kFaceType) {
                FaceData face;
                face.fromJson(content->second);
                result.push_back(face);
            }
        }
        close();
        return result;
    } catch (const std::exception&) {
        // Callers of this format catch the C string; the inner reason is dropped
        // on purpose, as everywhere at a layer boundary.
        throw "QV JVW file reading error";
    }
}
