// libFuzzer target: arbitrary text through the JSON dialect and through every
// class that reads itself from a text. The first byte picks the reader, the
// rest is the text; the object reader also walks nested values a few levels.
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "FuzzSupport.h"
#include "core/FaceModelPaths.h"
#include "core/FaceRecord.h"
#include "core/Json.h"
#include "core/Point2.h"
#include "quorin/FaceData.h"
#include "quorin/FaceEnums.h"
#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/Normalizers.h"
#include "quorin/QVFace.h"

namespace {

void walk(const std::string& text, int depth) {
    if (depth > 3 || text.empty()) return;
    if (text[0] == '{') {
        for (const auto& item : parseJsonObject(text)) fuzz::refusalIsFine([&] { walk(item.second, depth + 1); });
    } else if (text[0] == '[') {
        for (const auto& item : parseJsonArray(text)) fuzz::refusalIsFine([&] { walk(item, depth + 1); });
    } else {
        int i = 0;
        float f = 0;
        std::string s;
        fuzz::refusalIsFine([&] { JsonValue<int>::fromText(text, i); });
        fuzz::refusalIsFine([&] { JsonValue<float>::fromText(text, f); });
        fuzz::refusalIsFine([&] { JsonValue<std::string>::fromText(text, s); });
        fuzz::refusalIsFine([&] { (void)jsonTextToBool(text); });
    }
}

// Reads the text, writes it back and reads that again: what the engine
// writes it must be able to read.
template <typename T>
void roundTrip(const std::string& text) {
    T value;
    try {
        value.fromJson(text);
    } catch (const std::exception&) {
        return;
    }
    T again;
    again.fromJson(value.toJson());
}

template <typename T>
void created(const std::string& text) {
    std::unique_ptr<T> made(T::create(text));
    if (made) (void)made->toJson();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    fuzz::Input in(data, size);
    const uint8_t pick = in.byte();
    const std::vector<uint8_t> bytes = in.rest();
    const std::string text(bytes.begin(), bytes.end());
    fuzz::refusalIsFine([&] {
        switch (pick % 16) {
        case 0: walk(text, 0); break;
        case 1: (void)parseJsonArray(text); break;
        case 2: {
            std::map<std::string, Point2<float>> landmarks;
            JsonValue<std::map<std::string, Point2<float>>>::fromText(text, landmarks);
            (void)JsonValue<std::map<std::string, Point2<float>>>::toText(landmarks);
            break;
        }
        case 3: roundTrip<FaceData>(text); break;
        case 4: roundTrip<QVFace>(text); break;
        case 5: {
            FaceRecord record;
            record.fromJson(text);
            (void)record.toJson();
            break;
        }
        case 6: roundTrip<FaceModelPaths>(text); break;
        case 7: roundTrip<FaceAgeInterval>(text); break;
        case 8: roundTrip<FaceRace>(text); break;
        case 9: created<GaussianFilter1D>(text); break;
        case 10: created<DoGFilter1D>(text); break;
        case 11: created<GaussianFilter2D>(text); break;
        case 12: created<DoGFilter2D>(text); break;
        case 13: created<QVL1Normalizer>(text); break;
        case 14: created<QVL2HysNormalizer>(text); break;
        default: {
            std::string::size_type pos = 0;
            (void)moveToNextToken(text, pos);
            (void)findPairedChar(text, 0, text.empty() ? '}' : text[0] == '[' ? ']' : '}');
            walk(text, 0);
        }
        }
    });
    return 0;
}
