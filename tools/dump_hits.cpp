// dump_hits: the post filter's training material, mined with our own detector.
//
// For every image named in the teacher labels (labels/faces.jsonl of the data
// cache, written by label_faces) and every face-free image in negatives/, runs
// the library's cascade search and window merger as the detect entries do
// without a tracker, at the three work sizes of the detection modes (long side
// 640 with search step 0.1, 320 and 240 with step 0.15; smallest face
// max(32, short side / 8)), and writes for each merged hit the 945 values the
// ILABS post filter judges (cascade score, then the LBP histogram of the
// window's 24 x 24 patch) together with its best overlap with a teacher face.
//
// Each image is also searched mirrored (teacher faces mirrored with it); the
// face-free images of negatives/ are searched turned by 90, 180 and 270 degrees
// too and at more sizes with a finer step, for hard negatives: the cascade
// rarely fires on them at the detect entries' settings.
//
// With --turns, each face photo is also searched turned in the plane (variant
// t30, t-30, ...; each teacher face keeps its size, centred where its centre
// turned to), for the material of the roll categories; with --quarters also
// turned by quarter turns (q90, q180, q270), where every hit is a false one.
//
// Output: FILE.tsv, one line per hit: image, variant (m = mirrored, r90 ...),
// work long side, best IoU with a teacher face (-1 for images of negatives/),
// score, left, top, right, bottom (in the variant's full-size frame), category;
// and FILE.f32, the features of the same hits as little-endian float32 rows of
// 945. Labelling (face, false hit, ambiguous) is left to the trainer, which
// knows the split. Deterministic: no randomness is involved.

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <iostream>
#include <sstream>
#include <string>
#include <vector>

#include "StbImageDecoder.h"

#include "ImageTurn.h"
#include "ModelPacking.h"
#include "api/FrameOps.h"
#include "core/ModelRegistry.h"
#include "detector/CascadeDetector.h"
#include "detector/WindowMerger.h"
#include "image/IntegralImage.h"
#include "postfilter/ILabsPostFilter.h"

namespace fs = std::filesystem;

namespace {

const char* kUsage =
    "usage: dump_hits --out PREFIX [--data DIR] [--model FILE] [--turns A,B,...]\n"
    "  --data DIR     data cache (default $QUORIN_DATA_DIR or ~/.cache/quorin)\n"
    "  --out PREFIX   writes PREFIX.tsv and PREFIX.f32 (required: the cache's own labels/hits belong to\n"
    "                 scripts/mine-hits.sh, which checks them against the built-in cascade)\n"
    "  --model FILE   a cascade payload to search with instead of the built-in one\n"
    "  --turns LIST   also search each face photo turned by these angles (degrees,\n"
    "                 clockwise) about its centre, the teacher faces turned with it\n"
    "  --quarters     also search each face photo turned by 90, 180 and 270 degrees,\n"
    "                 with no teacher face: what is found there is a false hit\n";

struct Box {
    double left, top, right, bottom;
};

struct Labelled {
    std::string image;
    std::vector<Box> faces;
};

double iou(Box const& a, Box const& b)
{
    const double w = std::min(a.right, b.right) - std::max(a.left, b.left);
    const double h = std::min(a.bottom, b.bottom) - std::max(a.top, b.top);
    if (w <= 0 || h <= 0)
        return 0.0;
    const double inter = w * h;
    const double areaA = (a.right - a.left) * (a.bottom - a.top);
    const double areaB = (b.right - b.left) * (b.bottom - b.top);
    return inter / (areaA + areaB - inter);
}

// The labeller writes one flat JSON object per line; only "image" and the
// "rect" arrays are needed here, so a small scan does instead of a parser.
bool parseLabelLine(std::string const& line, Labelled& out)
{
    const std::string key = "\"image\":\"";
    const size_t at = line.find(key);
    if (at == std::string::npos)
        return false;
    const size_t end = line.find('"', at + key.size());
    if (end == std::string::npos)
        return false;
    out.image = line.substr(at + key.size(), end - at - key.size());
    out.faces.clear();
    for (size_t p = line.find("\"rect\":["); p != std::string::npos; p = line.find("\"rect\":[", p + 1)) {
        Box b{};
        if (std::sscanf(line.c_str() + p, "\"rect\":[%lf,%lf,%lf,%lf]", &b.left, &b.top, &b.right, &b.bottom) == 4)
            out.faces.push_back(b);
    }
    return true;
}

struct Mode {
    int longSide;
    float step;
};
const std::vector<Mode> kModes = {{640, 0.1f}, {320, 0.15f}, {240, 0.15f}};
const std::vector<Mode> kNegativeModes = {{640, 0.05f}, {480, 0.05f}, {400, 0.05f}, {320, 0.05f},
                                          {240, 0.05f}, {160, 0.05f}};

struct Frame {
    std::vector<unsigned char> pixels;
    int width = 0, height = 0;
};

Frame mirrored(const unsigned char* gray, int width, int height)
{
    Frame f{std::vector<unsigned char>(static_cast<size_t>(width) * height), width, height};
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x)
            f.pixels[static_cast<size_t>(y) * width + x] = gray[static_cast<size_t>(y) * width + (width - 1 - x)];
    return f;
}

// Clockwise quarter turns.
Frame turned(const unsigned char* gray, int width, int height, int quarters)
{
    Frame f{std::vector<unsigned char>(gray, gray + static_cast<size_t>(width) * height), width, height};
    for (int q = 0; q < quarters; ++q) {
        Frame t{std::vector<unsigned char>(f.pixels.size()), f.height, f.width};
        for (int y = 0; y < f.height; ++y)
            for (int x = 0; x < f.width; ++x)
                t.pixels[static_cast<size_t>(x) * t.width + (f.height - 1 - y)] =
                    f.pixels[static_cast<size_t>(y) * f.width + x];
        f = std::move(t);
    }
    return f;
}

class Miner {
public:
    Miner(std::ofstream& tsv, std::ofstream& features) : tsv(tsv), features(features)
    {
        cascade = new CascadeDetector(R"({"model":"mdcb","imageMaxSize":640,"faceMinSize":32,"faceMaxSize":640})");
    }
    ~Miner() { delete cascade; }

    int mine(std::string const& name, std::string const& variant, const unsigned char* gray, int width, int height,
             std::vector<Box> const& faces, bool faceFree, std::vector<Mode> const& modes)
    {
        int hits = 0;
        std::vector<unsigned char> work;
        for (Mode const& mode : modes) {
            const int longSide = std::max(width, height);
            int w = width, h = height;
            const unsigned char* pixels = gray;
            double scale = 1.0;
            if (longSide > mode.longSide) {
                const float s = static_cast<float>(mode.longSide) / static_cast<float>(longSide);
                w = static_cast<int>(s * static_cast<float>(width));
                h = static_cast<int>(s * static_cast<float>(height));
                if (w < 24 || h < 24)
                    continue;
                work.assign(static_cast<size_t>(w) * h, 0);
                if (!resizeNearest(gray, width, height, work.data(), w, h))
                    continue;
                pixels = work.data();
                scale = static_cast<double>(w) / width;
            }
            const int minSide = std::min(w, h);
            if (minSide < 32)
                continue;
            cascade->setSearchStep(mode.step, mode.step);
            cascade->setFaceSizeRange(std::max(32, minSide / 8), minSide);
            IN_IMAGE image;
            if (!image.Init(w, h, w, pixels))
                continue;
            DetectionWindow whole;
            whole.left = 0;
            whole.top = 0;
            whole.right = w;
            whole.bottom = h;
            std::vector<ScoredWindow> raw, merged;
            cascade->exhaustiveDetect(image, {whole}, &raw);
            merger.mergeWindows(raw, merged);
            for (ScoredWindow const& hit : merged) {
                const Box box{hit.window.left / scale, hit.window.top / scale, hit.window.right / scale,
                              hit.window.bottom / scale};
                double best = faceFree ? -1.0 : 0.0;
                for (Box const& f : faces)
                    best = std::max(best, iou(box, f));
                const std::vector<float> values = filter.feature(image, hit);
                features.write(reinterpret_cast<const char*>(values.data()),
                               static_cast<std::streamsize>(values.size() * sizeof(float)));
                tsv << name << '\t' << variant << '\t' << mode.longSide << '\t' << best << '\t' << hit.score << '\t' << box.left << '\t'
                    << box.top << '\t' << box.right << '\t' << box.bottom << '\t' << hit.category << '\n';
                ++hits;
            }
        }
        return hits;
    }

private:
    std::ofstream& tsv;
    std::ofstream& features;
    CascadeDetector* cascade = nullptr;
    WindowMerger merger;
    ILabsPostFilter filter; // only its feature is used: no model needed
};

} // namespace

int main(int argc, char** argv)
{
    std::string data;
    if (const char* env = std::getenv("QUORIN_DATA_DIR"))
        data = env;
    else if (const char* home = std::getenv("HOME"))
        data = std::string(home) + "/.cache/quorin";
    std::string out, model, turnList;
    bool quarters = false;
    for (int i = 1; i < argc; ++i) {
        const std::string a = argv[i];
        if (a == "--quarters") {
            quarters = true;
            continue;
        }
        if (a == "--help" || a == "-h") {
            std::cout << kUsage;
            return 0;
        }
        if ((a == "--data" || a == "--out" || a == "--model" || a == "--turns") && i + 1 < argc) {
            (a == "--data" ? data : a == "--out" ? out : a == "--model" ? model : turnList) = argv[++i];
            continue;
        }
        std::cerr << kUsage;
        return 2;
    }
    if (out.empty()) {
        std::cerr << kUsage;
        return 2;
    }
    std::ifstream labels(data + "/labels/faces.jsonl");
    if (!labels) {
        std::cerr << "dump_hits: no teacher labels in " << data << "/labels (run label_faces first)\n";
        return 1;
    }
    std::ofstream tsv(out + ".tsv"), features(out + ".f32", std::ios::binary);
    if (!tsv || !features) {
        std::cerr << "dump_hits: cannot write " << out << ".tsv/.f32\n";
        return 1;
    }
    std::vector<uint8_t> packed;
    if (!model.empty()) {
        std::ifstream in(model, std::ios::binary);
        packed = packRawModel(std::vector<uint8_t>(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()));
        if (packed.size() <= 4) {
            std::cerr << "dump_hits: cannot read " << model << "\n";
            return 1;
        }
        ModelRegistry::instance().registerModel("mdcb", packed.data(), packed.data() + packed.size());
    }
    std::vector<double> turns;
    {
        std::istringstream ts(turnList);
        for (std::string item; std::getline(ts, item, ',');)
            turns.push_back(std::atof(item.c_str()));
    }
    Miner miner(tsv, features);
    int images = 0, hits = 0;
    std::string line;
    Labelled entry;
    while (std::getline(labels, line)) {
        if (!parseLabelLine(line, entry))
            continue;
        int w = 0, h = 0, channels = 0;
        const std::string path = data + "/" + entry.image;
        unsigned char* gray = stbi_load(path.c_str(), &w, &h, &channels, 1);
        if (gray == nullptr) {
            std::cerr << "dump_hits: cannot read " << path << "\n";
            continue;
        }
        // Images of negatives/ hold no face whatever the teacher says.
        const bool faceFree = entry.image.rfind("negatives/", 0) == 0;
        hits += miner.mine(entry.image, "-", gray, w, h, entry.faces, faceFree, kModes);
        std::vector<Box> flippedFaces;
        for (Box const& b : entry.faces)
            flippedFaces.push_back({w - b.right, b.top, w - b.left, b.bottom});
        const Frame m = mirrored(gray, w, h);
        hits += miner.mine(entry.image, "m", m.pixels.data(), w, h, flippedFaces, faceFree, kModes);
        for (double t : faceFree ? std::vector<double>{} : turns) {
            Frame f{std::vector<unsigned char>(static_cast<size_t>(w) * h), w, h};
            turnAbout(gray, w, h, w / 2.0, h / 2.0, t, f.pixels.data());
            std::vector<Box> moved;
            for (Box const& b : entry.faces) {
                double x = (b.left + b.right) / 2, y = (b.top + b.bottom) / 2;
                turnPoint(w / 2.0, h / 2.0, t, x, y);
                moved.push_back({x - (b.right - b.left) / 2, y - (b.bottom - b.top) / 2, x + (b.right - b.left) / 2,
                                 y + (b.bottom - b.top) / 2});
            }
            std::ostringstream name;
            name << 't' << t;
            hits += miner.mine(entry.image, name.str(), f.pixels.data(), w, h, moved, false, kModes);
        }
        for (int q = 1; q <= 3 && quarters && !faceFree; ++q) {
            // a face on its side or upside down is no face to the engine
            const Frame t = turned(gray, w, h, q);
            hits += miner.mine(entry.image, "q" + std::to_string(90 * q), t.pixels.data(), t.width, t.height, {}, false,
                               kModes);
        }
        if (faceFree) {
            hits += miner.mine(entry.image, "-", gray, w, h, {}, true, kNegativeModes);
            hits += miner.mine(entry.image, "m", m.pixels.data(), w, h, {}, true, kNegativeModes);
            for (int q = 1; q <= 3; ++q) {
                const Frame t = turned(gray, w, h, q);
                hits += miner.mine(entry.image, "r" + std::to_string(90 * q), t.pixels.data(), t.width, t.height, {},
                                   true, kNegativeModes);
            }
        }
        stbi_image_free(gray);
        ++images;
    }
    std::cerr << "dump_hits: " << images << " images, " << hits << " hits -> " << out << ".tsv/.f32\n";
    return 0;
}
