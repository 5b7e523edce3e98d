// label_faces: teacher labels for the development data.
//
// Reads every image of the development data cache (photos/*, frames/*/*.pgm and
// negatives/*, in name order) as 8-bit gray, finds faces with dlib's HOG frontal face
// detector, places dlib's 68-point shape model in each, and writes one JSON line per
// image to labels/faces.jsonl in the cache. The labels serve to train and check the
// built-in models; they are never shipped. The output is deterministic for a given
// dlib version: no randomness is involved.
//
// Line format:
//   {"image":"photos/x.jpg","width":W,"height":H,"faces":[
//     {"rect":[left,top,right,bottom],"confidence":c,"points":[[x,y],...68 pairs]}]}
// rect is in pixels with right and bottom one past the face (it may reach beyond the
// image); confidence is the detector's margin (higher is surer); points follow the
// iBUG 68-point order (0-16 jaw, 17-26 brows, 27-35 nose, 36-41 eye on the image's
// left, 42-47 eye on the image's right, 48-67 mouth; 48 and 54 the mouth corners).

#include <dlib/image_processing.h>
#include <dlib/image_processing/frontal_face_detector.h>

#include "StbImageDecoder.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

namespace fs = std::filesystem;

namespace {

const char* kUsage =
    "usage: label_faces [--data DIR] [--out FILE] [--predictor FILE] [--upsample N]\n"
    "                   [--only SUBSTRING] [--shard K/N]\n"
    "Labels faces and 68 landmarks in the development data with dlib (HOG detector).\n"
    "  --data DIR        data cache (default $QUORIN_DATA_DIR or ~/.cache/quorin)\n"
    "  --out FILE        JSON lines output (default DIR/labels/faces.jsonl)\n"
    "  --predictor FILE  68-point model (default\n"
    "                    /usr/share/dlib/shape_predictor_68_face_landmarks.dat)\n"
    "  --upsample N      doublings of images whose longer side is at most 1024 (default 1),\n"
    "                    so that faces down to about 40 pixels are found\n"
    "  --only SUBSTRING  label only images whose relative path contains SUBSTRING\n"
    "  --shard K/N       label only the K-th of every N images in name order (0 <= K < N), so\n"
    "                    that N processes can share a large set; concatenate their outputs\n";

bool isImage(fs::path const& p) {
    std::string e = p.extension().string();
    std::transform(e.begin(), e.end(), e.begin(), [](unsigned char c) { return std::tolower(c); });
    return e == ".jpg" || e == ".jpeg" || e == ".png" || e == ".pgm";
}

std::vector<std::string> listImages(fs::path const& root) {
    std::vector<std::string> out;
    for (char const* sub : {"photos", "frames", "negatives"}) {
        fs::path dir = root / sub;
        if (!fs::is_directory(dir)) continue;
        for (auto const& e : fs::recursive_directory_iterator(dir))
            if (e.is_regular_file() && isImage(e.path()))
                out.push_back(fs::relative(e.path(), root).generic_string());
    }
    std::sort(out.begin(), out.end());
    return out;
}

std::string jsonString(std::string const& s) {
    std::string o = "\"";
    for (char c : s) {
        if (c == '"' || c == '\\') o += '\\';
        if (static_cast<unsigned char>(c) < 0x20) continue;
        o += c;
    }
    return o + "\"";
}

}  // namespace

int main(int argc, char** argv) {
    std::string data, out, only;
    std::string predictorPath = "/usr/share/dlib/shape_predictor_68_face_landmarks.dat";
    int upsample = 1, shardK = 0, shardN = 1;
    if (char const* env = std::getenv("QUORIN_DATA_DIR")) data = env;
    else if (char const* home = std::getenv("HOME")) data = std::string(home) + "/.cache/quorin";
    for (int i = 1; i < argc; ++i) {
        std::string a = argv[i];
        auto value = [&](std::string& dst) {
            if (i + 1 >= argc) { std::cerr << a << " needs a value\n" << kUsage; std::exit(2); }
            dst = argv[++i];
        };
        if (a == "--help" || a == "-h") { std::cout << kUsage; return 0; }
        else if (a == "--data") value(data);
        else if (a == "--out") value(out);
        else if (a == "--predictor") value(predictorPath);
        else if (a == "--only") value(only);
        else if (a == "--shard") {
            std::string v; value(v);
            if (std::sscanf(v.c_str(), "%d/%d", &shardK, &shardN) != 2 || shardN < 1 || shardK < 0 || shardK >= shardN) {
                std::cerr << "--shard needs K/N with 0 <= K < N\n"; return 2;
            }
        } else if (a == "--upsample") {
            std::string v; value(v);
            upsample = std::atoi(v.c_str());
            if (upsample < 0 || upsample > 2) { std::cerr << "--upsample must be 0, 1 or 2\n"; return 2; }
        } else { std::cerr << "unknown argument " << a << "\n" << kUsage; return 2; }
    }
    if (data.empty() || !fs::is_directory(fs::path(data) / "photos")) {
        std::cerr << "no development data in '" << data << "' (run scripts/fetch-data.sh)\n";
        return 1;
    }
    if (out.empty()) out = (fs::path(data) / "labels" / "faces.jsonl").string();
    fs::create_directories(fs::path(out).parent_path());

    dlib::frontal_face_detector detector = dlib::get_frontal_face_detector();
    dlib::shape_predictor predictor;
    try {
        dlib::deserialize(predictorPath) >> predictor;
    } catch (std::exception const& e) {
        std::cerr << "cannot read shape model " << predictorPath << ": " << e.what() << "\n";
        return 1;
    }

    std::string tmp = out + ".tmp";
    std::ofstream os(tmp);
    if (!os) { std::cerr << "cannot write " << tmp << "\n"; return 1; }
    size_t images = 0, faces = 0, index = 0;
    for (std::string const& rel : listImages(data)) {
        if (!only.empty() && rel.find(only) == std::string::npos) continue;
        if (index++ % static_cast<size_t>(shardN) != static_cast<size_t>(shardK)) continue;
        int w = 0, h = 0, n = 0;
        unsigned char* px = stbi_load((fs::path(data) / rel).c_str(), &w, &h, &n, 1);
        if (!px) { std::cerr << "skipping unreadable " << rel << "\n"; continue; }
        dlib::array2d<unsigned char> img(h, w);
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x) img[y][x] = px[static_cast<size_t>(y) * w + x];
        stbi_image_free(px);

        int ups = std::max(w, h) <= 1024 ? upsample : 0;
        dlib::pyramid_down<2> pyr;
        dlib::array2d<unsigned char> big;
        dlib::assign_image(big, img);
        for (int k = 0; k < ups; ++k) dlib::pyramid_up(big, pyr);
        std::vector<dlib::rect_detection> dets;
        detector(big, dets, 0.0);

        os << "{\"image\":" << jsonString(rel) << ",\"width\":" << w << ",\"height\":" << h << ",\"faces\":[";
        for (size_t d = 0; d < dets.size(); ++d) {
            dlib::full_object_detection shape = predictor(big, dets[d].rect);
            dlib::rectangle const& r = dets[d].rect;
            // map back to the original image; right and bottom one past the face
            dlib::dpoint tl = pyr.point_down(dlib::dpoint(r.left(), r.top()), ups);
            dlib::dpoint br = pyr.point_down(dlib::dpoint(r.right() + 1, r.bottom() + 1), ups);
            char buf[160];
            std::snprintf(buf, sizeof buf, "%s{\"rect\":[%.1f,%.1f,%.1f,%.1f],\"confidence\":%.4f,\"points\":[",
                          d ? "," : "", tl.x(), tl.y(), br.x(), br.y(), dets[d].detection_confidence);
            os << buf;
            for (unsigned p = 0; p < shape.num_parts(); ++p) {
                dlib::dpoint q = pyr.point_down(dlib::dpoint(shape.part(p)), ups);
                std::snprintf(buf, sizeof buf, "%s[%.1f,%.1f]", p ? "," : "", q.x(), q.y());
                os << buf;
            }
            os << "]}";
        }
        os << "]}\n";
        ++images;
        faces += dets.size();
    }
    os.close();
    if (!os) { std::cerr << "write error on " << tmp << "\n"; return 1; }
    fs::rename(tmp, out);
    std::cerr << "label_faces: " << images << " images, " << faces << " faces -> " << out << "\n";
    return 0;
}
