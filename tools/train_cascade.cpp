// train_cascade: trains our frontal face cascade for the engine's search grid,
// and measures it against the built-in one.
//
//   train_cascade boxes   --faces DIR --five TSV --dev DIR --split JSON --out TSV [--framing FILE]
//       Face boxes in the built-in cascade's framing: runs that cascade (mode 2
//       settings, merged hits) on the face photos, fits one mapping from five
//       points to its boxes (one for human points, one for the teacher's), and
//       applies it to every photo. Splits people by a fixed hash of the
//       identity: 15% go to the report split and are never trained on.
//   train_cascade train   --boxes TSV --negatives LIST --work DIR [--stages N]
//       Boosts stages into WORK/cascade.txt (state) and WORK/model.bin (the
//       engine payload), mining negatives with the engine's own search against
//       the partial cascade. Resumes after the last finished stage.
//   train_cascade measure --boxes TSV --negatives LIST [--model FILE] [--limit N] [--offset K]
//       Faces found and false hits per face-free image through the public
//       entries in modes 0, 1 and 2, the orientation search on turned photos,
//       and features evaluated per window; --model serves FILE as "mdcb".
//   train_cascade model   --cascade STATE --out FILE [--save STATE2]
//                         [--first-stage-from STATE3] [--threshold I:V,...]
//       Writes the engine payload of a saved state. --threshold sets the
//       pass threshold of stage I (from 0) to V: trading a little recall
//       for fewer features per window, measured with `measure`.
//
//   train_cascade joint-train --boxes TSV --negatives LIST --work DIR
//                         [--common-stages N] [--branch-stages N] [--band LO:HI] [--minutes M]
//                         [--train-branches 0,1] [--min-quarter-roll D]
//                         [--pose-boxes TSV [--yaw-band 25:90] [--yaw-copies 4]
//                          [--side-hit-rate 0.99] [--side-routing 0.99]]
//       The roll cascade (tools/lib/BranchTrainer.h): common stages scoring
//       the upright and the two turned categories, then an upright branch and
//       a clockwise one (mirrored for counter-clockwise). Positives are the
//       training photos turned about the face centre (upright within
//       --upright-roll, turned within the band). Resumes from WORK/joint.txt.
//       With --pose-boxes (pose-boxes' rows) a one-band state gets the side
//       band: tables for heads turned sideways on its common stages, then
//       branch 2 (--train-branches 2) on those heads.
//   train_cascade joint-model --work DIR --out FILE [--branch-stages N] [--bias B] [--raise K:D,...]
//                         [--upright-cascade STATE [--upright-stages N]] [--side-bias B]
//                         [--trace Q0,Q1,... --boxes TSV [--pose-boxes TSV]]
//       The engine payload of a joint-train state; --upright-cascade puts a
//       frontal cascade's stages (train's state; its first N) in the upright branch;
//       --trace adds rejections inside common stage K that keep all but the
//       QK quantile of the positives passing them (-1: none).
//   train_cascade pasted --boxes TSV --negatives LIST [--limit N] [--sizes LO:HI]
//       Report faces pasted at LO to HI pixels (30:60) into 320 x 240 cuts of
//       the face-free report images, found in modes 0 and 2.
//   train_cascade raw-hits --image P [--side S] [--step F] [--mode M]
//       A photo's raw cascade hits (category, score, window) and the entry's boxes.
//   train_cascade pose-boxes --pose DIR --out TSV [--boxes TSV --five TSV] [--jsonl FILE]
//       Head-pose photos (and many-identity photos of turned heads) as face
//       rows with their yaw, in the engine's framing; --jsonl also writes
//       them as dump_hits labels. Report people: --report-people (3,6,9,12).
//   train_cascade pose-measure --pose-boxes TSV [--modes 2,0]
//       Faces found by yaw on the head-pose report people.
//   train_cascade roll-measure --boxes TSV [--limit N] [--angles A,...] [--modes M,...]
//       Faces found and mean roll error on report photos turned about the face
//       centre, through quorin_detect.
//   measure and roll-measure take --model, --mdpb and --mdnb: candidate
//   payloads served in place of the built-in "mdcb", "mdpb" and "mdnb".
//
// Lists: the negatives list has one image path and "train" or "report" per
// line (tab separated). Deterministic for a given --seed.

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <iostream>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "StbImageDecoder.h"

#include "BranchTrainer.h"
#include "CascadeTrainer.h"
#include "ImageTurn.h"
#include "ModelPacking.h"
#include "api/FrameOps.h"
#include "core/ModelRegistry.h"
#include "detector/CascadeDetector.h"
#include "detector/WindowMerger.h"
#include "image/IntegralImage.h"
#include "quorin/quorinapi.h"

using namespace cascadetrain;

namespace {

struct Gray {
    std::vector<uint8_t> pixels;
    int width = 0, height = 0;
};

bool loadGray(std::string const& path, Gray& g)
{
    int w = 0, h = 0, c = 0;
    unsigned char* p = stbi_load(path.c_str(), &w, &h, &c, 1);
    if (p == nullptr)
        return false;
    g.pixels.assign(p, p + static_cast<size_t>(w) * h);
    g.width = w;
    g.height = h;
    stbi_image_free(p);
    return true;
}

Gray turned(Gray const& in, int quarters, bool mirror)
{
    Gray f = in;
    if (mirror)
        for (int y = 0; y < f.height; ++y)
            std::reverse(f.pixels.begin() + static_cast<std::ptrdiff_t>(y) * f.width,
                         f.pixels.begin() + static_cast<std::ptrdiff_t>(y + 1) * f.width);
    for (int q = 0; q < quarters; ++q) {
        Gray t;
        t.width = f.height;
        t.height = f.width;
        t.pixels.resize(f.pixels.size());
        for (int y = 0; y < f.height; ++y)
            for (int x = 0; x < f.width; ++x)
                t.pixels[static_cast<size_t>(x) * t.width + (f.height - 1 - y)] = f.pixels[static_cast<size_t>(y) * f.width + x];
        f = std::move(t);
    }
    return f;
}

// Nearest-neighbour shrink to a long side, as the detect entries make work frames.
Gray shrunk(Gray const& in, int longSide)
{
    if (std::max(in.width, in.height) <= longSide)
        return in;
    const float s = static_cast<float>(longSide) / static_cast<float>(std::max(in.width, in.height));
    Gray out;
    out.width = std::max(1, static_cast<int>(s * static_cast<float>(in.width)));
    out.height = std::max(1, static_cast<int>(s * static_cast<float>(in.height)));
    out.pixels.resize(static_cast<size_t>(out.width) * out.height);
    resizeNearest(in.pixels.data(), in.width, in.height, out.pixels.data(), out.width, out.height);
    return out;
}

struct Box {
    double cx = 0, cy = 0, side = 0;
    double left() const { return cx - side / 2; }
    double top() const { return cy - side / 2; }
};

double iou(double al, double at, double ar, double ab, double bl, double bt, double br, double bb)
{
    const double w = std::min(ar, br) - std::max(al, bl), h = std::min(ab, bb) - std::max(at, bt);
    if (w <= 0 || h <= 0)
        return 0;
    return w * h / ((ar - al) * (ab - at) + (br - bl) * (bb - bt) - w * h);
}

double iou(Box const& a, Box const& b)
{
    return iou(a.left(), a.top(), a.left() + a.side, a.top() + a.side, b.left(), b.top(), b.left() + b.side,
               b.top() + b.side);
}

// A labelled face counts as found when some box overlaps it with IoU >= 0.4.
bool found(std::vector<Box> const& boxes, Box const& truth)
{
    for (Box const& b : boxes)
        if (iou(b, truth) >= 0.4)
            return true;
    return false;
}

uint32_t fnv1a(std::string const& s)
{
    uint32_t h = 2166136261u;
    for (unsigned char c : s) {
        h ^= c;
        h *= 16777619u;
    }
    return h;
}

bool reportIdentity(std::string const& identity) { return fnv1a(identity) % 100 < 15; }

// ------------------------------------------------------------------ labels

struct Five {
    double x[5], y[5]; // leftEye, rightEye, nose, leftMouthCorner, rightMouthCorner
};

struct LabelledFace {
    double rect[4];
    Five five;
};

struct LabelledImage {
    std::string image;
    int width = 0, height = 0;
    std::vector<LabelledFace> faces;
};

// Reads one line of the teacher labels (label_faces' JSON lines).
bool parseLabels(std::string const& line, LabelledImage& out)
{
    const size_t at = line.find("\"image\":\"");
    if (at == std::string::npos)
        return false;
    const size_t end = line.find('"', at + 9);
    out.image = line.substr(at + 9, end - at - 9);
    out.faces.clear();
    std::sscanf(line.c_str() + line.find("\"width\":"), "\"width\":%d", &out.width);
    std::sscanf(line.c_str() + line.find("\"height\":"), "\"height\":%d", &out.height);
    for (size_t p = line.find("\"rect\":["); p != std::string::npos; p = line.find("\"rect\":[", p + 1)) {
        LabelledFace f{};
        if (std::sscanf(line.c_str() + p, "\"rect\":[%lf,%lf,%lf,%lf]", &f.rect[0], &f.rect[1], &f.rect[2], &f.rect[3]) != 4)
            continue;
        const size_t q = line.find("\"points\":[", p);
        if (q == std::string::npos)
            continue;
        std::vector<double> v;
        const char* c = line.c_str() + q + 10;
        while (v.size() < 136) {
            while (*c == '[' || *c == ',' || *c == ' ')
                ++c;
            char* e = nullptr;
            const double d = std::strtod(c, &e);
            if (e == c)
                break;
            v.push_back(d);
            c = e;
            while (*c == ']')
                ++c;
        }
        if (v.size() < 136)
            continue;
        auto px = [&](int i) { return v[2 * i]; };
        auto py = [&](int i) { return v[2 * i + 1]; };
        double lx = 0, ly = 0, rx = 0, ry = 0;
        for (int i = 36; i < 42; ++i) {
            lx += px(i) / 6;
            ly += py(i) / 6;
            rx += px(i + 6) / 6;
            ry += py(i + 6) / 6;
        }
        f.five = {{lx, rx, px(30), px(48), px(54)}, {ly, ry, py(30), py(48), py(54)}};
        out.faces.push_back(f);
    }
    return true;
}

// Box from five points: centre = E + p u + q v, side = r |u| + s iod, with E the
// eye midpoint, u from E to the mouth midpoint and v = u turned to the image's right.
struct Mapping {
    double p = 0, q = 0, r = 0, s = 0;
    Box apply(Five const& f) const
    {
        const double ex = (f.x[0] + f.x[1]) / 2, ey = (f.y[0] + f.y[1]) / 2;
        const double ux = (f.x[3] + f.x[4]) / 2 - ex, uy = (f.y[3] + f.y[4]) / 2 - ey;
        const double L = std::hypot(ux, uy), iod = std::hypot(f.x[1] - f.x[0], f.y[1] - f.y[0]);
        return {ex + p * ux + q * uy, ey + p * uy - q * ux, r * L + s * iod};
    }
};

Mapping fitMapping(std::vector<std::pair<Five, Box>> const& pairs)
{
    Mapping m;
    std::vector<double> ps, qs;
    double a11 = 0, a12 = 0, a22 = 0, b1 = 0, b2 = 0;
    for (auto const& [f, b] : pairs) {
        const double ex = (f.x[0] + f.x[1]) / 2, ey = (f.y[0] + f.y[1]) / 2;
        const double ux = (f.x[3] + f.x[4]) / 2 - ex, uy = (f.y[3] + f.y[4]) / 2 - ey;
        const double L2 = ux * ux + uy * uy;
        if (L2 < 1)
            continue;
        const double dx = b.cx - ex, dy = b.cy - ey;
        ps.push_back((dx * ux + dy * uy) / L2);
        qs.push_back((dx * uy - dy * ux) / L2);
        const double L = std::sqrt(L2), iod = std::hypot(f.x[1] - f.x[0], f.y[1] - f.y[0]);
        a11 += L * L;
        a12 += L * iod;
        a22 += iod * iod;
        b1 += L * b.side;
        b2 += iod * b.side;
    }
    if (ps.empty())
        return m;
    auto median = [](std::vector<double> v) {
        std::nth_element(v.begin(), v.begin() + static_cast<std::ptrdiff_t>(v.size() / 2), v.end());
        return v[v.size() / 2];
    };
    m.p = median(ps);
    m.q = median(qs);
    const double det = a11 * a22 - a12 * a12;
    m.r = (b1 * a22 - b2 * a12) / det;
    m.s = (a11 * b2 - a12 * b1) / det;
    return m;
}

// The built-in cascade's merged boxes with the settings of mode 2.
std::vector<Box> builtinBoxes(CascadeDetector& cascade, Gray const& g)
{
    const Gray w = shrunk(g, 640);
    const double back = static_cast<double>(g.width) / w.width;
    const int minSide = std::min(w.width, w.height);
    std::vector<Box> out;
    if (minSide < 32)
        return out;
    cascade.setSearchStep(0.1f, 0.1f);
    cascade.setFaceSizeRange(std::max(32, minSide / 8), minSide);
    IN_IMAGE image;
    if (!image.Init(w.width, w.height, w.width, w.pixels.data()))
        return out;
    DetectionWindow whole;
    whole.left = 0;
    whole.top = 0;
    whole.right = w.width;
    whole.bottom = w.height;
    std::vector<ScoredWindow> raw, merged;
    cascade.exhaustiveDetect(image, {whole}, &raw);
    WindowMerger merger;
    merger.mergeWindows(raw, merged);
    for (ScoredWindow const& s : merged)
        out.push_back({back * (s.window.left + s.window.right) / 2.0, back * (s.window.top + s.window.bottom) / 2.0,
                       back * (s.window.right - s.window.left)});
    return out;
}

std::map<std::string, std::string> args(int argc, char** argv, int from)
{
    std::map<std::string, std::string> a;
    for (int i = from; i + 1 < argc; i += 2)
        a[argv[i]] = argv[i + 1];
    return a;
}

std::string get(std::map<std::string, std::string> const& a, std::string const& k, std::string const& dflt = "")
{
    auto it = a.find(k);
    return it == a.end() ? dflt : it->second;
}

// Dev data split: "name": {"identity": ..., "split": ..., "kind": ...}.
struct DevEntry {
    std::string split, kind;
};
std::map<std::string, DevEntry> readSplit(std::string const& path)
{
    std::map<std::string, DevEntry> out;
    std::ifstream in(path);
    std::string line;
    while (std::getline(in, line)) {
        const size_t a = line.find('"'), b = line.find('"', a + 1);
        const size_t s = line.find("\"split\": \"");
        if (a == std::string::npos || b == std::string::npos || s == std::string::npos)
            continue;
        DevEntry e;
        e.split = line.substr(s + 10, line.find('"', s + 10) - s - 10);
        const size_t k = line.find("\"kind\": \"");
        if (k != std::string::npos)
            e.kind = line.substr(k + 9, line.find('"', k + 9) - k - 9);
        out[line.substr(a + 1, b - a - 1)] = e;
    }
    return out;
}

int commandBoxes(std::map<std::string, std::string> const& a)
{
    const std::string faces = get(a, "--faces"), dev = get(a, "--dev"), out = get(a, "--out");
    std::map<std::string, Five> human;
    {
        std::ifstream in(get(a, "--five"));
        std::string line;
        std::getline(in, line);
        while (std::getline(in, line)) {
            std::istringstream ls(line);
            std::string file;
            Five f{};
            ls >> file;
            for (int i = 0; i < 5; ++i)
                ls >> f.x[i] >> f.y[i];
            if (ls)
                human["photos/" + file] = f;
        }
    }
    struct Item {
        std::string path, identity, split, source;
        Five five;
        bool humanPoints;
    };
    std::vector<Item> items;
    {
        std::ifstream in(faces + "/labels/faces.jsonl");
        std::string line;
        LabelledImage li;
        while (std::getline(in, line)) {
            if (!parseLabels(line, li) || li.faces.empty())
                continue;
            // the person named is the face nearest the centre
            size_t best = 0;
            double bestD = 1e30;
            for (size_t i = 0; i < li.faces.size(); ++i) {
                const double dx = (li.faces[i].rect[0] + li.faces[i].rect[2] - li.width) / 2;
                const double dy = (li.faces[i].rect[1] + li.faces[i].rect[3] - li.height) / 2;
                if (dx * dx + dy * dy < bestD) {
                    bestD = dx * dx + dy * dy;
                    best = i;
                }
            }
            Item it;
            it.path = faces + "/" + li.image;
            const bool lfw = li.image.find("photos/lfw/") == 0;
            it.source = lfw ? "lfw" : "congress";
            if (lfw) {
                const size_t s = std::string("photos/lfw/").size();
                it.identity = "lfw/" + li.image.substr(s, li.image.find('/', s) - s);
            } else {
                it.identity = "congress/" + li.image.substr(li.image.rfind('/') + 1);
            }
            it.split = reportIdentity(it.identity) ? "report" : "train";
            auto h = human.find(li.image);
            it.humanPoints = h != human.end();
            it.five = it.humanPoints ? h->second : li.faces[best].five;
            items.push_back(it);
        }
    }
    // dev data: every teacher face of the face photos and clip frames
    const std::map<std::string, DevEntry> split = readSplit(get(a, "--split"));
    {
        std::ifstream in(dev + "/labels/faces.jsonl");
        std::string line;
        LabelledImage li;
        while (std::getline(in, line)) {
            if (!parseLabels(line, li))
                continue;
            std::string key;
            if (li.image.rfind("photos/", 0) == 0)
                key = li.image.substr(7);
            else if (li.image.rfind("frames/", 0) == 0)
                key = li.image.substr(7, li.image.find('/', 7) - 7);
            else
                continue;
            auto e = split.find(key);
            if (e == split.end() || e->second.kind != "face")
                continue;
            for (LabelledFace const& f : li.faces)
                items.push_back({dev + "/" + li.image, "dev/" + key, e->second.split, "dev", f.five, false});
        }
    }
    // fit on a sample of the many-identity photos where the built-in cascade finds the face
    // the framing the post filter and the landmark net were trained on: the
    // converted cascade's (--framing models/mdcb-converted.bin); without it the
    // built-in cascade's
    std::vector<uint8_t> framing;
    if (!get(a, "--framing").empty()) {
        std::ifstream in(get(a, "--framing"), std::ios::binary);
        framing = packRawModel(std::vector<uint8_t>(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()));
        ModelRegistry::instance().registerModel("framing", framing.data(), framing.data() + framing.size());
    }
    CascadeDetector cascade(framing.empty() ? R"({"model":"mdcb","imageMaxSize":640,"faceMinSize":32,"faceMaxSize":640})"
                                            : R"({"model":"framing","imageMaxSize":640,"faceMinSize":32,"faceMaxSize":640})");
    std::vector<std::pair<Five, Box>> pairsHuman, pairsTeacher;
    size_t tried = 0;
    for (size_t i = 0; i < items.size(); i += 3) {
        if (items[i].source == "dev")
            continue;
        Gray g;
        if (!loadGray(items[i].path, g))
            continue;
        ++tried;
        const Box guess = Mapping{0.2, 0, 1.2, 0.9}.apply(items[i].five);
        double bestIou = 0;
        Box found;
        for (Box const& b : builtinBoxes(cascade, g))
            if (iou(b, guess) > bestIou) {
                bestIou = iou(b, guess);
                found = b;
            }
        if (bestIou >= 0.4)
            (items[i].humanPoints ? pairsHuman : pairsTeacher).push_back({items[i].five, found});
    }
    Mapping mh = fitMapping(pairsHuman), mt = fitMapping(pairsTeacher);
    // one refit with the guess replaced by the first fit, keeping close matches only
    auto refit = [&](std::vector<std::pair<Five, Box>>& pairs, Mapping& m) {
        std::vector<std::pair<Five, Box>> kept;
        for (auto const& pb : pairs)
            if (iou(m.apply(pb.first), pb.second) >= 0.6)
                kept.push_back(pb);
        m = fitMapping(kept);
        return kept.size();
    };
    const size_t kh = refit(pairsHuman, mh), kt = refit(pairsTeacher, mt);
    std::fprintf(stderr, "boxes: %zu photos tried; human points: %zu pairs (%zu kept) p %.4f q %.4f r %.4f s %.4f\n",
                 tried, pairsHuman.size(), kh, mh.p, mh.q, mh.r, mh.s);
    std::fprintf(stderr, "boxes: teacher points: %zu pairs (%zu kept) p %.4f q %.4f r %.4f s %.4f\n",
                 pairsTeacher.size(), kt, mt.p, mt.q, mt.r, mt.s);
    std::ofstream o(out);
    o << "# path\tidentity\tsplit\tsource\tcx\tcy\tside\troll\n";
    for (Item const& it : items) {
        const Box b = (it.humanPoints ? mh : mt).apply(it.five);
        const double roll = std::atan2(it.five.y[1] - it.five.y[0], it.five.x[1] - it.five.x[0]) * 180.0 / 3.14159265358979;
        o << it.path << '\t' << it.identity << '\t' << it.split << '\t' << it.source << '\t' << b.cx << '\t' << b.cy
          << '\t' << b.side << '\t' << roll << '\n';
    }
    std::fprintf(stderr, "boxes: %zu faces -> %s\n", items.size(), out.c_str());
    return 0;
}

struct FaceRow {
    std::string path, identity, split, source;
    Box box;
    double roll = 0; // of the labelled eye line, degrees
    double yaw = 0;  // head-pose rows: < 0 when the nose points to the image's right
};

// Keeps `count` rows spread evenly over the list (all when there are fewer).
void spreadTo(std::vector<FaceRow>& rows, size_t count)
{
    if (rows.size() <= count)
        return;
    std::vector<FaceRow> spread;
    for (size_t i = 0; i < count; ++i)
        spread.push_back(rows[i * rows.size() / count]);
    rows.swap(spread);
}

std::vector<FaceRow> readBoxes(std::string const& path)
{
    std::vector<FaceRow> rows;
    std::ifstream in(path);
    std::string line;
    while (std::getline(in, line)) {
        if (line.empty() || line[0] == '#')
            continue;
        std::istringstream ls(line);
        FaceRow r;
        std::getline(ls, r.path, '\t');
        std::getline(ls, r.identity, '\t');
        std::getline(ls, r.split, '\t');
        std::getline(ls, r.source, '\t');
        ls >> r.box.cx >> r.box.cy >> r.box.side;
        if (!ls)
            continue;
        if (!(ls >> r.roll))
            r.roll = 0;
        if (!(ls >> r.yaw))
            r.yaw = 0;
        rows.push_back(r);
    }
    return rows;
}

std::vector<std::pair<std::string, std::string>> readList(std::string const& path)
{
    std::vector<std::pair<std::string, std::string>> out;
    std::ifstream in(path);
    std::string line;
    while (std::getline(in, line)) {
        const size_t t = line.find('\t');
        if (t != std::string::npos)
            out.push_back({line.substr(0, t), line.substr(t + 1)});
    }
    return out;
}

// ------------------------------------------------------------------ training

// The inverse deviation the engine computes for a window, and the patch.
bool sampleOf(IN_IMAGE const& image, Gray const& g, double left, double top, double side, bool mirror,
              uint8_t* patch, float* inverseDeviation)
{
    DetectionWindow w;
    w.left = static_cast<int>(std::lround(left));
    w.top = static_cast<int>(std::lround(top));
    const int s = static_cast<int>(std::lround(side));
    w.right = w.left + s;
    w.bottom = w.top + s;
    if (w.left < 0 || w.top < 0 || w.right > g.width || w.bottom > g.height || s < 8)
        return false;
    if (!cutPatch(image.data, g.width, g.height, left, top, side, mirror, patch))
        return false;
    *inverseDeviation = image.ComputeNorm(w);
    return *inverseDeviation < kGateInverseDeviation;
}

struct TrainConfig {
    double step = 0.15;       // the coarse grid of modes 0 and 1
    double scaleStep = 1.25;  // ratio between scales
    int copies = 2;
    int negatives = 8000;
    int maxStages = 20;
    uint64_t seed = 19;
    int threads = 2;
};

void positiveSamples(std::vector<FaceRow> const& rows, TrainConfig const& cfg, double jitterSteps, uint64_t seed,
                     SampleSet& out)
{
    std::mt19937_64 rng(seed);
    std::uniform_real_distribution<double> u(-1.0, 1.0);
    uint8_t patch[kPatch * kPatch];
    std::string loaded;
    Gray g;
    std::unique_ptr<IN_IMAGE> image;
    for (FaceRow const& r : rows) {
        if (r.path != loaded) {
            loaded = r.path;
            image.reset();
            if (!loadGray(r.path, g))
                continue;
            image = std::make_unique<IN_IMAGE>();
            if (!image->Init(g.width, g.height, g.width, g.pixels.data())) {
                image.reset();
                continue;
            }
        }
        if (!image)
            continue;
        for (int c = 0; c < cfg.copies; ++c) {
            const double side = r.box.side * std::pow(cfg.scaleStep, 0.5 * u(rng));
            const double dx = jitterSteps * cfg.step * side * u(rng), dy = jitterSteps * cfg.step * side * u(rng);
            float inv = 0;
            if (sampleOf(*image, g, r.box.cx + dx - side / 2, r.box.cy + dy - side / 2, side, c % 2 == 1, patch, &inv))
                out.add(patch, inv);
        }
    }
}

// The engine's exhaustive search over a whole frame at one step, faces from
// `minSize` up to the frame's short side; false when the image can't be made.
bool searchWhole(CascadeDetector& d, Gray const& g, float step, int minSize, IN_IMAGE& image,
                 std::vector<ScoredWindow>& hits)
{
    d.setSearchStep(step, step);
    d.setFaceSizeRange(minSize, std::min(g.width, g.height));
    if (!image.Init(g.width, g.height, g.width, g.pixels.data()))
        return false;
    DetectionWindow whole;
    whole.left = 0;
    whole.top = 0;
    whole.right = g.width;
    whole.bottom = g.height;
    d.exhaustiveDetect(image, {whole}, &hits);
    return true;
}

struct Miner {
    std::vector<Gray> images;
    // Face photos with their face: hits that overlap the face but don't frame
    // it (parts of it, too large, turned) are negatives too; hits elsewhere are
    // left alone, as a photo may hold unlabelled faces.
    std::vector<Gray> facePhotos;
    int faceShare = 30; // percent of the variants cut from face photos (misframed and turned faces)
    std::vector<Box> faceBoxes;
    // The roll each face photo was turned by before (roll cascade); with
    // minQuarterRoll a quarter turn that would leave its face within that
    // many degrees of upright turns it half round instead, so that no face
    // the branches should find is mined as a negative.
    std::vector<double> faceRolls;
    double minQuarterRoll = 0;
    // Per face photo: its face is the only one (the head-pose photos), so a
    // hit away from it is a negative too.
    std::vector<char> soleFace;
    std::string modelName = "cascade_in_training";
    // Which hits to keep and how: -1 drops it, 0 cuts it as it is, 1 mirrored
    // (a branch learns from its mirror branch's hits too). Unset keeps all.
    std::function<int(ScoredWindow const&)> pick;

    // Raw hits of the engine's search with the partial cascade on random
    // variants of the images (size, step, turn, mirror), cut into samples.
    size_t mine(std::vector<uint8_t> const& payload, size_t wanted, uint64_t seed, int threads, SampleSet& out,
                size_t* windowsSearched)
    {
        const std::vector<uint8_t> packed = packRawModel(payload);
        ModelRegistry::instance().registerModel(modelName, packed.data(), packed.data() + packed.size());
        const std::string config = "{\"model\":\"" + modelName + R"(","imageMaxSize":1024,"faceMinSize":24,"faceMaxSize":1024})";
        std::vector<std::unique_ptr<CascadeDetector>> detectors;
        for (int t = 0; t < threads; ++t)
            detectors.push_back(std::make_unique<CascadeDetector>(config));
        std::mt19937_64 rng(seed);
        const size_t batch = 8, maxVariants = 2000;
        const size_t perVariant = std::max<size_t>(8, wanted / 150);
        size_t variants = 0;
        *windowsSearched = 0;
        while (out.size() < wanted && variants < maxVariants) {
            struct Variant {
                size_t image;
                int quarters, longSide;
                bool mirror;
                float step;
                uint64_t seed;
            };
            std::vector<Variant> vs;
            for (size_t b = 0; b < batch; ++b) {
                static const int sides[] = {160, 200, 240, 320, 400, 480, 640, 800, 1024};
                static const float steps[] = {0.05f, 0.1f, 0.15f};
                const bool onFace = !facePhotos.empty() && static_cast<int>(rng() % 100) < faceShare;
                const size_t count = onFace ? facePhotos.size() : images.size();
                vs.push_back({static_cast<size_t>(rng() % count) + (onFace ? images.size() : 0),
                              static_cast<int>(rng() % 4), sides[rng() % 9], (rng() & 1) != 0, steps[rng() % 3], rng()});
                Variant& v = vs.back();
                const size_t face = v.image - images.size();
                if (onFace && v.quarters % 2 == 1 && face < faceRolls.size() &&
                    90.0 - std::fabs(faceRolls[face]) < minQuarterRoll)
                    v.quarters = 2;
            }
            std::vector<SampleSet> found(batch);
            std::vector<size_t> searched(batch, 0);
            auto work = [&](int t) {
                for (size_t b = static_cast<size_t>(t); b < batch; b += static_cast<size_t>(threads)) {
                    Variant const& v = vs[b];
                    const bool onFace = v.image >= images.size();
                    Gray const& source = onFace ? facePhotos[v.image - images.size()] : images[v.image];
                    const Gray g = shrunk(turned(source, v.quarters, v.mirror), v.longSide);
                    Box face;
                    if (onFace) {
                        face = faceBoxes[v.image - images.size()];
                        if (v.mirror)
                            face.cx = source.width - face.cx;
                        int h = source.height;
                        for (int q = 0; q < v.quarters; ++q) {
                            const double x = face.cx;
                            face.cx = h - face.cy;
                            face.cy = x;
                            h = (q % 2 == 0) ? source.width : source.height;
                        }
                        const double f = static_cast<double>(g.width) / (v.quarters % 2 ? source.height : source.width);
                        face = {face.cx * f, face.cy * f, face.side * f};
                    }
                    const int minSide = std::min(g.width, g.height);
                    if (minSide < 32)
                        continue;
                    CascadeDetector& d = *detectors[static_cast<size_t>(t)];
                    IN_IMAGE image;
                    std::vector<ScoredWindow> hits;
                    if (!searchWhole(d, g, v.step, 24, image, hits))
                        continue;
                    searched[b] = hits.size();
                    std::mt19937_64 r(v.seed);
                    std::shuffle(hits.begin(), hits.end(), r);
                    uint8_t patch[kPatch * kPatch];
                    for (size_t k = 0; k < hits.size() && found[b].size() < perVariant; ++k) {
                        DetectionWindow const& w = hits[k].window;
                        if (onFace) {
                            const Box hit{(w.left + w.right) / 2.0, (w.top + w.bottom) / 2.0,
                                          static_cast<double>(w.right - w.left)};
                            const double overlap = iou(hit, face);
                            const size_t f = v.image - images.size();
                            const bool sole = f < soleFace.size() && soleFace[f] != 0;
                            if ((overlap <= 0.0 && !sole) || (v.quarters == 0 && overlap >= 0.4))
                                continue;
                        }
                        const int how = pick ? pick(hits[k]) : 0;
                        float inv = 0;
                        if (how >= 0 && sampleOf(image, g, w.left, w.top, w.right - w.left, how == 1, patch, &inv))
                            found[b].add(patch, inv);
                    }
                }
            };
            std::vector<std::thread> ths;
            for (int t = 1; t < threads; ++t)
                ths.emplace_back(work, t);
            work(0);
            for (std::thread& th : ths)
                th.join();
            for (size_t b = 0; b < batch; ++b) {
                *windowsSearched += searched[b];
                for (size_t k = 0; k < found[b].size() && out.size() < wanted; ++k)
                    out.addFrom(found[b], k);
            }
            variants += batch;
        }
        detectors.clear();
        ModelRegistry::instance().unregisterModel(modelName);
        return variants;
    }
};

int commandTrain(std::map<std::string, std::string> const& a)
{
    TrainConfig cfg;
    const std::string work = get(a, "--work");
    cfg.maxStages = std::atoi(get(a, "--stages", "20").c_str());
    cfg.negatives = std::atoi(get(a, "--negatives-per-stage", "8000").c_str());
    cfg.seed = std::strtoull(get(a, "--seed", "19").c_str(), nullptr, 10);
    const double minutes = std::atof(get(a, "--minutes", "1e9").c_str());
    const double featureFraction = std::atof(get(a, "--feature-fraction", "0.015").c_str());
    // the first stages decide the cost per window: give them a larger share of the pool
    const double earlyFraction = std::atof(get(a, "--early-feature-fraction", get(a, "--feature-fraction", "0.015")).c_str());
    const double firstPositiveWeight = std::atof(get(a, "--first-positive-weight", "1").c_str());
    const double firstHitRate = std::atof(get(a, "--first-hit-rate", "0.998").c_str());
    const int firstTries = std::max(1, std::atoi(get(a, "--first-tries", "1").c_str()));
    // the first stage on positives at the grid point itself: cheaper rejection,
    // at the risk of skipping a face next to a rejected neighbour
    const bool firstTight = get(a, "--first-positives", "wide") == "tight";
    const size_t earlyStages = static_cast<size_t>(std::atoi(get(a, "--early-stages", "0").c_str()));
    const auto start = std::chrono::steady_clock::now();
    std::FILE* log = std::fopen((work + "/train.log").c_str(), "a");
    auto say = [&](const char* fmt, auto... v) {
        const double t = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
        for (std::FILE* f : {stderr, log}) {
            if (f == nullptr)
                continue;
            std::fprintf(f, "[%7.1fs] ", t);
            std::fprintf(f, fmt, v...);
            std::fprintf(f, "\n");
            std::fflush(f);
        }
    };
    std::vector<FaceRow> train;
    for (FaceRow const& r : readBoxes(get(a, "--boxes")))
        if (r.split == "train")
            train.push_back(r);
    Miner miner;
    const int faceShare = std::clamp(std::atoi(get(a, "--face-share", "30").c_str()), 0, 100);
    for (auto const& [path, split] : readList(get(a, "--negatives"))) {
        Gray g;
        if (split == "train" && loadGray(path, g))
            miner.images.push_back(shrunk(g, 1024));
    }
    for (size_t i = 0; i < train.size() && miner.facePhotos.size() < 2000; i += 4) {
        Gray g;
        if (train[i].source != "dev" && loadGray(train[i].path, g)) {
            miner.facePhotos.push_back(std::move(g));
            miner.faceBoxes.push_back(train[i].box);
        }
    }
    say("%zu training faces, %zu face-free images, %zu face photos for misframed windows", train.size(),
        miner.images.size(), miner.facePhotos.size());
    // a fixed spread of the training faces when fewer are asked for
    const size_t maxFaces = static_cast<size_t>(std::atoi(get(a, "--faces", "100000").c_str()));
    spreadTo(train, maxFaces);
    SampleSet tight, wide;
    positiveSamples(train, cfg, 0.5, cfg.seed, tight);
    positiveSamples(train, cfg, 1.5, cfg.seed + 1, wide);
    say("positives: %zu on the grid, %zu with the neighbours' offsets", tight.size(), wide.size());

    Cascade cascade;
    if (cascade.load(work + "/cascade.txt"))
        say("resuming after stage %zu", cascade.stages.size());
    // cells from 2 pixels, grown by a quarter and shifted by a quarter of a cell
    FeaturePool pool(2, 2, 0.25f, 1.25f);
    say("feature pool: %zu", pool.size());
    while (static_cast<int>(cascade.stages.size()) < cfg.maxStages) {
        const size_t k = cascade.stages.size();
        if (std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count() > minutes * 60) {
            say("time limit reached before stage %zu", k);
            break;
        }
        // positives still accepted by the stages so far
        SampleSet const& source = k == 0 && !firstTight ? wide : tight;
        SampleSet pos;
        for (size_t i = 0; i < source.size(); ++i)
            if (cascade.passes(source.integral(i), source.inverseDeviation(i)))
                pos.addFrom(source, i);
        SampleSet neg;
        size_t searched = 0;
        // the first stage only sees face-free images: its job is the cheap rejection
        // of background; misframed and turned faces are left to the later stages
        miner.faceShare = k == 0 ? 0 : faceShare;
        const size_t variants = miner.mine(CascadeWriter::toBytes(cascade.toModel()), static_cast<size_t>(cfg.negatives),
                                           cfg.seed * 1000003u + k, cfg.threads, neg, &searched);
        say("stage %zu: %zu positives, %zu negatives mined from %zu variants (%zu accepted windows seen)", k,
            pos.size(), neg.size(), variants, searched);
        if (neg.size() < 200) {
            say("too few negatives left to mine; stopping");
            break;
        }
        StageOptions o;
        o.seed = cfg.seed * 7919u + k;
        o.featureFraction = k < earlyStages ? earlyFraction : featureFraction;
        o.threads = cfg.threads;
        if (k == 0) {
            // rejections here let the search skip the neighbours: keep the gate
            // and this stage within the first ten engine stages
            o.minHitRate = firstHitRate;
            o.maxStumps = 9;
            o.maxFalseRate = 0.5;
            o.positiveWeight = firstPositiveWeight;
        } else {
            const int first = static_cast<int>(cascade.stages[0].stumps.size());
            o.minStumps = std::max(2, 9 - first);
            o.maxStumps = std::min(120, 12 + 10 * static_cast<int>(k));
        }
        StageReport rep;
        Stage st = trainStage(pool, pos, neg, o, &rep);
        // the first stage's score takes few distinct values, so where its cut falls
        // varies much with the features drawn: try several draws, keep the one that
        // rejects most background (its hit rate is held by construction)
        for (int t = 1; k == 0 && t < firstTries; ++t) {
            StageOptions other = o;
            other.seed = o.seed + 104729u * static_cast<uint64_t>(t);
            StageReport r;
            Stage candidate = trainStage(pool, pos, neg, other, &r);
            say("stage 0, draw %d: hit %.4f, false %.4f", t, r.hitRate, r.falseRate);
            if (r.falseRate < rep.falseRate) {
                st = std::move(candidate);
                rep = r;
            }
        }
        cascade.stages.push_back(std::move(st));
        cascade.save(work + "/cascade.txt");
        CascadeWriter::writeFile(work + "/model.bin", cascade.toModel());
        say("stage %zu done: %d stumps, hit %.4f, false %.4f, median margin %.3f, gain %g", k, rep.stumps,
            rep.hitRate, rep.falseRate, static_cast<double>(cascade.stages.back().medianMargin),
            static_cast<double>(cascade.scoreGain()));
    }
    if (log != nullptr)
        std::fclose(log);
    return 0;
}

// ------------------------------------------------------------------ measuring

constexpr int kBlock = 17;

using Block = std::array<int, kBlock>;

// The result blocks of quorin_detect on a copy of the frame (the engine may work in it).
std::vector<Block> detectBlocks(Gray const& g, int rotation = 0)
{
    std::vector<uint8_t> frame = g.pixels;
    std::vector<Block> blocks(100);
    const int n = quorin_detect(frame.data(), g.width, g.height, blocks[0].data(), 100, rotation);
    blocks.resize(static_cast<size_t>(std::clamp(n, 0, 100)));
    return blocks;
}

Box boxOf(Block const& b)
{
    const double l = b[5], t = b[3], r = b[6], bt = b[4];
    return {(l + r) / 2, (t + bt) / 2, ((r - l) + (bt - t)) / 2};
}

std::vector<Box> detectBoxes(Gray const& g, int rotation = 0)
{
    std::vector<Box> out;
    for (Block const& b : detectBlocks(g, rotation))
        out.push_back(boxOf(b));
    return out;
}

// Features evaluated per window of the exhaustive search at one mode's settings,
// replaying the engine's loop with its skipping rule.
struct Cost {
    double windows = 0, classified = 0, features = 0;
};

void searchCost(CascadeDetector& d, Gray const& frame, int longSide, float step, Cost& cost)
{
    const Gray g = shrunk(frame, longSide);
    const int W = g.width, H = g.height, minSide = std::min(W, H);
    if (minSide < 32)
        return;
    d.setSearchStep(step, step);
    d.setFaceSizeRange(std::max(32, minSide / 8), minSide);
    IN_IMAGE image;
    if (!image.Init(W, H, W, g.pixels.data()))
        return;
    DetectionWindow whole;
    whole.left = 0;
    whole.top = 0;
    whole.right = W;
    whole.bottom = H;
    std::vector<ScoredWindow> unused;
    d.exhaustiveDetect(image, {whole}, &unused); // prepares the offsets
    // features evaluated by one classification, replayed stage by stage (a
    // rejection inside a branch reports only that it happened in a branch)
    auto featuresOf = [&](DetectionWindow const& win, int scale) {
        const float inv = image.ComputeNorm(win);
        float scores[15] = {};
        int n = 0;
        for (size_t i = 0; i < d.commonStages.size(); ++i) {
            WindowFeature const& f = d.commonFeatures[static_cast<size_t>(scale)][i];
            n += f.kind != WindowFeature::EMPTY ? 1 : 0;
            if (d.commonStages[i].UpdateScoreAndThreshold(f.Eval(image, inv, win.left, win.top), scores))
                return std::make_pair(n, static_cast<int>(i));
        }
        if (d.branchStages.size() < 2)
            return std::make_pair(n, -1);
        int best = 0;
        for (int b = 0; b < static_cast<int>(d.branchStages.size()) && b < 15; ++b)
            if (scores[b] > scores[best])
                best = b;
        scores[0] = scores[best];
        auto const& stages = d.branchStages[static_cast<size_t>(best)];
        for (size_t j = 0; j < stages.size(); ++j) {
            WindowFeature const& f = d.branchFeatures[static_cast<size_t>(scale)][static_cast<size_t>(best)][j];
            n += f.kind != WindowFeature::EMPTY ? 1 : 0;
            if (stages[j].UpdateScoreAndThreshold(f.Eval(image, inv, win.left, win.top), scores))
                return std::make_pair(n, static_cast<int>(d.commonStages.size()));
        }
        return std::make_pair(n, -1);
    };
    const double lf = std::log(1.25);
    const int limit = std::min({static_cast<int>(std::log(W / 24.0) / lf), static_cast<int>(std::log(H / 24.0) / lf), 16});
    const int minScale = std::max(0, static_cast<int>(std::ceil(std::log(std::max(32, minSide / 8) / 24.0) / lf)));
    for (int s = minScale; s <= limit; ++s) {
        const int w = static_cast<int>(static_cast<double>(static_cast<float>(std::pow(1.25, s)) * 24.0f) + 0.5);
        const int sx = std::max(1, static_cast<int>(static_cast<double>(static_cast<float>(w) * step) + 0.5));
        std::vector<int> skip(static_cast<size_t>(W / sx + 3), 0);
        for (int y = 0; y + w < H; y += sx)
            for (int x = 0; x + w < W; x += sx) {
                const size_t c = static_cast<size_t>(x / sx);
                cost.windows += 1;
                if (skip[c] > 0) {
                    --skip[c];
                    continue;
                }
                DetectionWindow win;
                win.left = x;
                win.top = y;
                win.right = x + w;
                win.bottom = y + w;
                const std::pair<int, int> r = featuresOf(win, s);
                cost.classified += 1;
                cost.features += r.first;
                const bool ok = r.second < 0;
                const int stage = r.second;
                if (!ok && stage <= 9) {
                    skip[c] = 1;
                    skip[c + 1] = 1;
                }
            }
    }
}

// Candidate payloads served in place of the built-in ones for a measurement:
// --model (the cascade, "mdcb"), --mdpb (post filter), --mdnb (landmark net).
struct Served {
    std::map<std::string, std::vector<uint8_t>> packed;
    bool serve(std::map<std::string, std::string> const& a)
    {
        for (auto const& [key, name] : {std::pair<const char*, const char*>{"--model", "mdcb"}, {"--mdpb", "mdpb"},
                                        {"--mdnb", "mdnb"}}) {
            const std::string path = get(a, key);
            if (path.empty())
                continue;
            std::ifstream in(path, std::ios::binary);
            const std::vector<uint8_t> payload{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
            if (payload.empty()) {
                std::cerr << "cannot read " << path << "\n";
                return false;
            }
            std::vector<uint8_t>& p = packed[name] = packRawModel(payload);
            ModelRegistry::instance().registerModel(name, p.data(), p.data() + p.size());
        }
        return true;
    }
    ~Served()
    {
        for (auto const& entry : packed)
            ModelRegistry::instance().unregisterModel(entry.first);
    }
};

// Why a face is missed: the cascade's raw hits (category, score, window) on a
// photo shrunk to --side, then the public entry's boxes in --mode.
int commandRawHits(std::map<std::string, std::string> const& a)
{
    Served served;
    Gray photo;
    if (!served.serve(a) || !loadGray(get(a, "--image"), photo))
        return 1;
    const Gray g = shrunk(photo, std::atoi(get(a, "--side", "320").c_str()));
    CascadeDetector d(R"({"model":"mdcb","imageMaxSize":1024,"faceMinSize":24,"faceMaxSize":1024})");
    IN_IMAGE image;
    std::vector<ScoredWindow> hits;
    if (searchWhole(d, g, std::strtof(get(a, "--step", "0.1").c_str(), nullptr), 24, image, hits))
        for (ScoredWindow const& h : hits)
            std::printf("hit %d %.2f %d %d %d %d\n", h.category, static_cast<double>(h.score), h.window.left, h.window.top,
                        h.window.right, h.window.bottom);
    quorin_init();
    quorin_setDetectionMode(static_cast<unsigned>(std::atoi(get(a, "--mode", "2").c_str())));
    for (Box const& b : detectBoxes(photo))
        std::printf("box %.0f %.0f %.0f\n", b.cx, b.cy, b.side);
    quorin_release();
    return 0;
}

// Small faces in clutter: report faces pasted (a square twice the face box,
// nearest neighbour) into 320 x 240 cuts of the face-free report images at
// --sizes pixels, found through quorin_detect in modes 0 and 2.
int commandPasted(std::map<std::string, std::string> const& a)
{
    Served served;
    if (!served.serve(a))
        return 1;
    std::vector<FaceRow> report;
    for (FaceRow const& r : readBoxes(get(a, "--boxes")))
        if (r.split == "report" && r.source != "dev")
            report.push_back(r);
    std::vector<Gray> backgrounds;
    for (auto const& [path, split] : readList(get(a, "--negatives"))) {
        Gray g;
        if (split != "report" || !loadGray(path, g))
            continue;
        // the short side to 240, then the centre's 320 x 240
        const int longSide = static_cast<int>(std::ceil(240.0 * std::max(g.width, g.height) / std::min(g.width, g.height)));
        const Gray s = shrunk(g, longSide);
        if (s.width < 320 || s.height < 240)
            continue;
        Gray cut;
        cut.width = 320;
        cut.height = 240;
        const int x0 = (s.width - 320) / 2, y0 = (s.height - 240) / 2;
        for (int y = 0; y < 240; ++y)
            for (int x = 0; x < 320; ++x)
                cut.pixels.push_back(s.pixels[static_cast<size_t>(y0 + y) * s.width + x0 + x]);
        backgrounds.push_back(std::move(cut));
    }
    const size_t limit = static_cast<size_t>(std::atoi(get(a, "--limit", "300").c_str()));
    if (backgrounds.empty() || report.empty())
        return 1;
    const size_t every = std::max<size_t>(1, report.size() / limit);
    std::mt19937_64 rng(41);
    int lo = 30, hi = 60;
    std::sscanf(get(a, "--sizes", "30:60").c_str(), "%d:%d", &lo, &hi);
    lo = std::clamp(lo, 24, 100);
    hi = std::clamp(hi, lo, 100);
    std::vector<std::pair<Gray, Box>> frames;
    for (size_t i = 0; i < report.size() && frames.size() < limit; i += every) {
        Gray photo;
        if (!loadGray(report[i].path, photo))
            continue;
        const double side = lo + static_cast<double>(rng() % static_cast<uint64_t>(hi - lo + 1));
        const double f = side / report[i].box.side;
        Gray frame = backgrounds[frames.size() % backgrounds.size()];
        const int half = static_cast<int>(side);
        const int cx = half + static_cast<int>(rng() % static_cast<uint64_t>(320 - 2 * half));
        const int cy = half + static_cast<int>(rng() % static_cast<uint64_t>(240 - 2 * half));
        for (int y = cy - half; y < cy + half; ++y)
            for (int x = cx - half; x < cx + half; ++x) {
                const int sx = static_cast<int>(std::lround(report[i].box.cx + (x - cx) / f));
                const int sy = static_cast<int>(std::lround(report[i].box.cy + (y - cy) / f));
                if (sx >= 0 && sy >= 0 && sx < photo.width && sy < photo.height)
                    frame.pixels[static_cast<size_t>(y) * 320 + x] = photo.pixels[static_cast<size_t>(sy) * photo.width + sx];
            }
        frames.push_back({std::move(frame), Box{static_cast<double>(cx), static_cast<double>(cy), side}});
    }
    for (int mode : {0, 2}) {
        quorin_init();
        quorin_setDetectionMode(static_cast<unsigned>(mode));
        int hits = 0;
        size_t other = 0;
        for (auto const& [frame, truth] : frames) {
            const std::vector<Box> boxes = detectBoxes(frame);
            const bool hit = found(boxes, truth);
            hits += hit;
            other += boxes.size() - (hit ? 1 : 0);
        }
        quorin_release();
        std::printf("pasted faces %d-%d px in 320 x 240, mode %d: found %d / %zu (%.1f%%), other boxes %zu\n", lo, hi, mode,
                    hits, frames.size(), 100.0 * hits / std::max<size_t>(1, frames.size()), other);
    }
    return 0;
}

int commandMeasure(std::map<std::string, std::string> const& a)
{
    Served served;
    if (!served.serve(a))
        return 1;
    const size_t limit = static_cast<size_t>(std::atoi(get(a, "--limit", "600").c_str()));
    std::vector<FaceRow> report, dev;
    for (FaceRow const& r : readBoxes(get(a, "--boxes"))) {
        if (r.split != "report")
            continue;
        (r.source == "dev" ? dev : report).push_back(r);
    }
    // a fixed spread over the report people, one face per photo; --offset
    // takes the faces between (a set for choosing settings, apart from the
    // one the figures are reported on)
    std::vector<FaceRow> chosen;
    const size_t every = std::max<size_t>(1, report.size() / std::max<size_t>(1, limit));
    const size_t offset = static_cast<size_t>(std::max(0, std::atoi(get(a, "--offset", "0").c_str()))) % every;
    for (size_t i = offset; i < report.size() && chosen.size() < limit; i += every)
        chosen.push_back(report[i]);
    std::vector<Gray> photos;
    for (FaceRow const& r : chosen) {
        Gray g;
        loadGray(r.path, g);
        photos.push_back(g);
    }
    std::vector<Gray> freeImages;
    for (auto const& [path, split] : readList(get(a, "--negatives"))) {
        Gray g;
        if (split == "report" && loadGray(path, g))
            freeImages.push_back(g);
    }
    std::printf("report faces %zu (of %zu), face-free report images %zu\n", chosen.size(), report.size(), freeImages.size());
    const bool costOnly = get(a, "--cost-only") == "1";
    for (int mode = 0; mode <= 2 && !costOnly; ++mode) {
        int hits = 0;
        size_t falseHits = 0;
        quorin_init();
        quorin_setDetectionMode(static_cast<unsigned>(mode));
        for (size_t i = 0; i < photos.size(); ++i) {
            if (photos[i].pixels.empty())
                continue;
            if (mode == 1) {
                // a still camera: the tracker's grid cells cover the frame in 12 frames
                quorin_release();
                quorin_init();
                quorin_setDetectionMode(1);
                bool any = false;
                for (int f = 0; f < 12 && !any; ++f)
                    any = found(detectBoxes(photos[i]), chosen[i].box);
                hits += any;
            } else {
                const std::vector<Box> boxes = detectBoxes(photos[i]);
                hits += found(boxes, chosen[i].box);
                // MEASURE_VERBOSE: the first photos' boxes; =missed: every missed face's
                if (std::getenv("MEASURE_VERBOSE") != nullptr &&
                    (i < 5 || (std::string(std::getenv("MEASURE_VERBOSE")) == "missed" && !found(boxes, chosen[i].box)))) {
                    std::printf("  %s truth %.0f %.0f %.0f:", chosen[i].path.c_str(), chosen[i].box.cx, chosen[i].box.cy,
                                chosen[i].box.side);
                    for (Box const& b : boxes)
                        std::printf(" [%.0f %.0f %.0f]", b.cx, b.cy, b.side);
                    std::printf("\n");
                }
            }
        }
        for (Gray const& g : freeImages) {
            if (mode == 1) {
                quorin_release();
                quorin_init();
                quorin_setDetectionMode(1);
                size_t most = 0;
                for (int f = 0; f < 12; ++f)
                    most = std::max(most, detectBoxes(g).size());
                falseHits += most;
            } else {
                falseHits += detectBoxes(g).size();
            }
        }
        quorin_release();
        std::printf("mode %d: faces found %d / %zu (%.1f%%), false hits per face-free image %.3f\n", mode, hits,
                    photos.size(), 100.0 * hits / std::max<size_t>(1, photos.size()),
                    static_cast<double>(falseHits) / std::max<size_t>(1, freeImages.size()));
    }
    // orientation search on turned photos (a fresh session each, one call)
    const size_t turns = costOnly ? 0 : std::min<size_t>(photos.size(), 150);
    for (int q = 0; q < 4; ++q) {
        std::map<int, int> orientations;
        for (size_t i = 0; i < turns; ++i) {
            const Gray g = turned(photos[i], q, false);
            std::vector<uint8_t> frame = g.pixels;
            std::vector<int> blocks(100 * kBlock, 0);
            int orientation = -2;
            quorin_init();
            quorin_detect360TrackingScaled_ornt(frame.data(), g.width, g.height, blocks.data(), 100, &orientation);
            quorin_release();
            ++orientations[orientation];
        }
        std::printf("turned by %d: orientation", 90 * q);
        for (auto const& [o, n] : orientations)
            std::printf(" %d:%d", o, n);
        std::printf(" (of %zu)\n", turns);
    }
    // development report split: teacher faces in our framing, found in mode 2 and 0
    for (int mode : {0, 2}) {
        if (costOnly)
            break;
        quorin_init();
        quorin_setDetectionMode(static_cast<unsigned>(mode));
        int hits = 0;
        std::map<std::string, std::vector<Box>> byImage;
        for (FaceRow const& r : dev)
            byImage[r.path].push_back(r.box);
        size_t total = 0, extra = 0;
        for (auto const& [path, truths] : byImage) {
            Gray g;
            if (!loadGray(path, g))
                continue;
            const std::vector<Box> boxes = detectBoxes(g);
            for (Box const& t : truths)
                hits += found(boxes, t);
            total += truths.size();
            for (Box const& b : boxes) {
                bool matched = false;
                for (Box const& t : truths)
                    matched = matched || iou(b, t) >= 0.4;
                extra += !matched;
            }
        }
        quorin_release();
        std::printf("development report split, mode %d: faces found %d / %zu, other boxes %zu\n", mode, hits, total, extra);
    }
    // features evaluated per window
    {
        CascadeDetector d(R"({"model":"mdcb","imageMaxSize":1024,"faceMinSize":24,"faceMaxSize":1024})");
        struct M {
            int side;
            float step;
        };
        for (M m : {M{240, 0.15f}, M{320, 0.15f}, M{640, 0.1f}}) {
            Cost faces, free;
            for (size_t i = 0; i < std::min<size_t>(photos.size(), 100); ++i)
                searchCost(d, photos[i], m.side, m.step, faces);
            for (Gray const& g : freeImages)
                searchCost(d, g, m.side, m.step, free);
            std::printf("long side %d step %.2f: features per window %.2f (per classified %.2f) on face photos, %.2f (%.2f) "
                        "on face-free images\n",
                        m.side, static_cast<double>(m.step), faces.features / std::max(1.0, faces.windows),
                        faces.features / std::max(1.0, faces.classified), free.features / std::max(1.0, free.windows),
                        free.features / std::max(1.0, free.classified));
        }
    }
    return 0;
}

// ------------------------------------------------------------------ roll branches

// The photo turned by `degrees` about (cx, cy) (see ImageTurn.h).
Gray rotatedAbout(Gray const& in, double cx, double cy, double degrees)
{
    if (degrees == 0.0)
        return in;
    Gray out = in;
    turnAbout(in.pixels.data(), in.width, in.height, cx, cy, degrees, out.pixels.data());
    return out;
}

// Turned positives: each face photo turned about its box centre by a roll drawn
// from [lo, hi] (the box stays where it is: the engine reports the axis-aligned
// square of a turned face, centred as the upright one), jittered on the grid as
// the upright positives are. `mirrorOut`, if given, gets every patch mirrored
// (the same face with the opposite roll).
void turnedSamples(std::vector<FaceRow> const& rows, TrainConfig const& cfg, double lo, double hi, uint64_t seed,
                   SampleSet& out, SampleSet* mirrorOut, bool mirrorByYaw = false)
{
    std::mt19937_64 rng(seed);
    std::uniform_real_distribution<double> u(-1.0, 1.0), roll(lo, hi);
    uint8_t patch[kPatch * kPatch], flipped[kPatch * kPatch];
    for (FaceRow const& r : rows) {
        Gray photo;
        if (!loadGray(r.path, photo))
            continue;
        for (int c = 0; c < cfg.copies; ++c) {
            // a mirrored copy turned the other way has the same roll
            // (heads turned sideways: mirrored so that the nose points to the image's right)
            const bool mirror = mirrorByYaw ? r.yaw > 0 : c % 2 == 1;
            const double theta = roll(rng);
            const Gray g = rotatedAbout(photo, r.box.cx, r.box.cy, mirror && !mirrorByYaw ? -theta : theta);
            IN_IMAGE image;
            if (!image.Init(g.width, g.height, g.width, g.pixels.data()))
                continue;
            const double side = r.box.side * std::pow(cfg.scaleStep, 0.5 * u(rng));
            const double dx = 0.5 * cfg.step * side * u(rng), dy = 0.5 * cfg.step * side * u(rng);
            float inv = 0;
            if (!sampleOf(image, g, r.box.cx + dx - side / 2, r.box.cy + dy - side / 2, side, mirror, patch, &inv))
                continue;
            out.add(patch, inv);
            if (mirrorOut != nullptr) {
                for (int y = 0; y < kPatch; ++y)
                    for (int x = 0; x < kPatch; ++x)
                        flipped[y * kPatch + x] = patch[y * kPatch + kPatch - 1 - x];
                mirrorOut->add(flipped, inv);
            }
        }
    }
}

// Sample i of a set, mirrored left-right, added to `out` (the patch comes back
// exactly from its integral).
void addMirrored(SampleSet const& set, size_t i, SampleSet& out)
{
    const uint32_t* ii = set.integral(i);
    uint8_t patch[kPatch * kPatch];
    for (int y = 0; y < kPatch; ++y)
        for (int x = 0; x < kPatch; ++x)
            patch[y * kPatch + (kPatch - 1 - x)] = static_cast<uint8_t>(
                ii[(y + 1) * kStride + x + 1] - ii[y * kStride + x + 1] - ii[(y + 1) * kStride + x] + ii[y * kStride + x]);
    out.add(patch, set.inverseDeviation(i));
}

// The training faces of the roll cascade: the boxes' training split, spread
// down to --faces.
std::vector<FaceRow> rollTrainFaces(std::map<std::string, std::string> const& a)
{
    std::vector<FaceRow> train;
    for (FaceRow const& r : readBoxes(get(a, "--boxes")))
        if (r.split == "train")
            train.push_back(r);
    const size_t maxFaces = static_cast<size_t>(std::atoi(get(a, "--faces", "4000").c_str()));
    spreadTo(train, maxFaces);
    return train;
}

// Positives per category: upright within +-uprightRoll, turned clockwise
// within the band, and those mirrored (counter-clockwise).
void rollPositives(std::vector<FaceRow> const& train, TrainConfig const& cfg, double uprightRoll, double bandLo,
                   double bandHi, uint64_t seed, SampleSet& upright, SampleSet& right, SampleSet& left)
{
    turnedSamples(train, cfg, -uprightRoll, uprightRoll, seed, upright, nullptr);
    turnedSamples(train, cfg, bandLo, bandHi, seed + 1, right, &left);
}

// Band 2's positives: the head-pose and many-identity training rows turned
// sideways within --yaw-band (default 25:90), the nose to the image's right
// (mirrored where it points left), within +-10 degrees of roll; and those
// mirrored. None without --pose-boxes.
void sidePositives(std::map<std::string, std::string> const& a, uint64_t seed, SampleSet& right, SampleSet& left,
                   std::vector<FaceRow>* rowsOut = nullptr)
{
    if (get(a, "--pose-boxes").empty())
        return;
    double lo = 25, hi = 90;
    std::sscanf(get(a, "--yaw-band", "25:90").c_str(), "%lf:%lf", &lo, &hi);
    std::vector<FaceRow> rows;
    for (FaceRow const& r : readBoxes(get(a, "--pose-boxes")))
        if (r.split == "train" && std::fabs(r.yaw) >= lo && std::fabs(r.yaw) <= hi)
            rows.push_back(r);
    TrainConfig cfg;
    cfg.copies = std::atoi(get(a, "--yaw-copies", "4").c_str());
    turnedSamples(rows, cfg, -10, 10, seed, right, &left, true);
    if (rowsOut != nullptr)
        *rowsOut = rows;
}

// Category c's branch in JointCascade::branch, and whether its faces are
// mirrored into it (band b's two categories 2b-1 and 2b share branch b).
size_t branchOf(int c, bool* mirrored)
{
    *mirrored = c > 0 && c % 2 == 0;
    return c == 0 ? 0 : static_cast<size_t>((c + 1) / 2);
}

// Adds band 2 (heads turned sideways) to a trained one-band cascade: tables
// for its two categories on every common stage's stumps, stage by stage,
// against windows mined with the earlier stages where only band 2 is alive.
void extendSide(JointCascade& jc, Miner& miner, TrainConfig const& cfg, SampleSet const& right, SampleSet const& left,
                double hitRate, std::function<void(std::string const&)> const& say)
{
    // the stages extended so far with band 2 alive alone: its sums, and the model to mine with
    JointCascade done = jc;
    done.bands = 2;
    done.common.clear();
    done.branch.clear();
    auto sideSums = [&done](const uint32_t* ii, float inv, float* F, bool* alive) {
        float all[15];
        bool on[15];
        done.commonSums(ii, inv, all, on);
        for (int c = 0; c < 2; ++c) {
            F[c] = all[3 + c];
            alive[c] = on[3 + c];
        }
    };
    for (size_t k = 0; k < jc.common.size(); ++k) {
        SampleSet neg;
        size_t searched = 0;
        miner.pick = nullptr;
        miner.faceShare = k == 0 ? 0 : 30;
        const size_t variants = miner.mine(CascadeWriter::toBytes(done.toModel()), static_cast<size_t>(cfg.negatives),
                                           cfg.seed * 1000003u + 500 + k, cfg.threads, neg, &searched);
        SampleSet pos[2];
        float F[2];
        bool ok[2];
        SampleSet const* sets[2] = {&right, &left};
        for (size_t c = 0; c < 2; ++c)
            for (size_t i = 0; i < sets[c]->size(); ++i) {
                sideSums(sets[c]->integral(i), sets[c]->inverseDeviation(i), F, ok);
                if (ok[c])
                    pos[c].addFrom(*sets[c], i);
            }
        std::vector<std::vector<char>> alive(2, std::vector<char>(neg.size(), 0));
        for (size_t i = 0; i < neg.size(); ++i) {
            sideSums(neg.integral(i), neg.inverseDeviation(i), F, ok);
            alive[0][i] = ok[0];
            alive[1][i] = ok[1];
        }
        JointStage st = jc.common[k];
        JointReport rep;
        extendSoftStage(
            st, {&pos[0], &pos[1]}, neg,
            [&sideSums](const uint32_t* ii, float inv, float* sums) {
                bool al[2];
                sideSums(ii, inv, sums, al);
            },
            alive, hitRate, &rep);
        // mining sees band 2 alone: the other categories can never pass
        JointStage mined = st;
        for (size_t c = 0; c < 3; ++c)
            mined.thresholds[c] = 1e30f;
        done.common.push_back(mined);
        jc.common[k] = st;
        char line[200];
        std::snprintf(line, sizeof line,
                      "side band, common stage %zu: positives %zu / %zu, %zu negatives from %zu variants; hit %.4f / "
                      "%.4f, background passing %.4f",
                      k, pos[0].size(), pos[1].size(), neg.size(), variants, rep.hitRate[0], rep.hitRate[1],
                      rep.falseRate);
        say(line);
    }
    jc.bands = 2;
    jc.branch.resize(3);
}

int commandJointTrain(std::map<std::string, std::string> const& a)
{
    TrainConfig cfg;
    const std::string work = get(a, "--work");
    const int commonStages = std::atoi(get(a, "--common-stages", "3").c_str());
    const int branchStages = std::atoi(get(a, "--branch-stages", "16").c_str());
    cfg.negatives = std::atoi(get(a, "--negatives-per-stage", "4000").c_str());
    cfg.seed = std::strtoull(get(a, "--seed", "29").c_str(), nullptr, 10);
    const double minutes = std::atof(get(a, "--minutes", "1e9").c_str());
    const double hitRate = std::atof(get(a, "--hit-rate", "0.995").c_str());
    const double firstHitRate = std::atof(get(a, "--first-hit-rate", "0.997").c_str());
    const double uprightRoll = std::atof(get(a, "--upright-roll", "10").c_str());
    const double uprightRouting = std::atof(get(a, "--upright-routing", "0.98").c_str());
    const int faceShare = std::clamp(std::atoi(get(a, "--face-share", "40").c_str()), 0, 100);
    // branches to train (the upright one may come from the frontal cascade instead)
    const std::string trainBranches = get(a, "--train-branches", "0,1");
    double bandLo = 12, bandHi = 50;
    std::sscanf(get(a, "--band", "12:50").c_str(), "%lf:%lf", &bandLo, &bandHi);
    const auto start = std::chrono::steady_clock::now();
    auto elapsed = [&] { return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count(); };
    std::FILE* log = std::fopen((work + "/train.log").c_str(), "a");
    auto say = [&](const char* fmt, auto... v) {
        for (std::FILE* f : {stderr, log}) {
            if (f == nullptr)
                continue;
            std::fprintf(f, "[%7.1fs] ", elapsed());
            std::fprintf(f, fmt, v...);
            std::fprintf(f, "\n");
            std::fflush(f);
        }
    };
    JointCascade jc;
    if (jc.load(work + "/joint.txt"))
        say("resuming: %d bands, %zu common stages, branch stages %zu / %zu / %zu", jc.bands, jc.common.size(),
            jc.branch.size() > 0 ? jc.branch[0].size() : size_t{0}, jc.branch.size() > 1 ? jc.branch[1].size() : size_t{0},
            jc.branch.size() > 2 ? jc.branch[2].size() : size_t{0});
    jc.branch.resize(static_cast<size_t>(1 + jc.bands));
    const std::vector<FaceRow> train = rollTrainFaces(a);
    Miner miner;
    miner.minQuarterRoll = std::atof(get(a, "--min-quarter-roll", "0").c_str());
    for (auto const& [path, split] : readList(get(a, "--negatives"))) {
        Gray g;
        if (split == "train" && loadGray(path, g))
            miner.images.push_back(shrunk(g, 1024));
    }
    {
        // face photos turned by any roll of the range: parts of turned faces,
        // and faces framed wrongly, are the hard negatives
        std::mt19937_64 rng(cfg.seed + 5);
        std::uniform_real_distribution<double> roll(-bandHi, bandHi);
        for (size_t i = 0; i < train.size() && miner.facePhotos.size() < 1500; i += 2) {
            Gray g;
            if (train[i].source != "dev" && loadGray(train[i].path, g)) {
                const double r = roll(rng);
                miner.facePhotos.push_back(rotatedAbout(g, train[i].box.cx, train[i].box.cy, r));
                miner.faceBoxes.push_back(train[i].box);
                miner.faceRolls.push_back(r);
            }
        }
    }
    SampleSet upright, right, left, sideRight, sideLeft;
    rollPositives(train, cfg, uprightRoll, bandLo, bandHi, cfg.seed, upright, right, left);
    std::vector<FaceRow> sideRows;
    sidePositives(a, cfg.seed + 3, sideRight, sideLeft, &sideRows);
    miner.soleFace.assign(miner.facePhotos.size(), 0);
    for (FaceRow const& r : sideRows) {
        // sideways heads framed wrongly are hard negatives of their branch, and
        // on the head-pose photos (one person before a plain wall) so is every
        // other hit: hair, ears, collars
        Gray g;
        if (loadGray(r.path, g)) {
            miner.facePhotos.push_back(std::move(g));
            miner.faceBoxes.push_back(r.box);
            miner.faceRolls.push_back(0);
            miner.soleFace.push_back(r.source == "pointing04");
        }
    }
    say("%zu faces; positives: upright %zu, turned %zu + %zu mirrored, sideways %zu + %zu mirrored; %zu face-free "
        "images, %zu face photos",
        train.size(), upright.size(), right.size(), left.size(), sideRight.size(), sideLeft.size(),
        miner.images.size(), miner.facePhotos.size());
    FeaturePool pool(2, 2, 0.25f, 1.25f);
    std::vector<SampleSet const*> positives{&upright, &right, &left};
    if (jc.bands > 1 || !sideRows.empty()) {
        positives.push_back(&sideRight);
        positives.push_back(&sideLeft);
    }
    const size_t K = 3;
    auto save = [&] {
        jc.save(work + "/joint.txt");
        CascadeWriter::writeFile(work + "/model.bin", jc.toModel());
    };
    auto timeUp = [&] { return elapsed() > minutes * 60; };

    while (static_cast<int>(jc.common.size()) < commonStages && !timeUp()) {
        const size_t k = jc.common.size();
        SampleSet neg;
        size_t searched = 0;
        miner.faceShare = k == 0 ? 0 : faceShare;
        miner.pick = nullptr;
        const size_t variants = miner.mine(CascadeWriter::toBytes(jc.toModel()), static_cast<size_t>(cfg.negatives),
                                           cfg.seed * 1000003u + k, cfg.threads, neg, &searched);
        std::vector<SampleSet> pos(K);
        std::vector<std::vector<char>> alive(K, std::vector<char>(neg.size(), 0));
        float F[15];
        bool ok[15];
        for (size_t c = 0; c < K; ++c)
            for (size_t i = 0; i < positives[c]->size(); ++i) {
                jc.commonSums(positives[c]->integral(i), positives[c]->inverseDeviation(i), F, ok);
                if (ok[c])
                    pos[c].addFrom(*positives[c], i);
            }
        for (size_t i = 0; i < neg.size(); ++i) {
            jc.commonSums(neg.integral(i), neg.inverseDeviation(i), F, ok);
            for (size_t c = 0; c < K; ++c)
                alive[c][i] = ok[c];
        }
        say("common stage %zu: positives %zu / %zu / %zu, %zu negatives from %zu variants (%zu accepted windows seen)", k,
            pos[0].size(), pos[1].size(), pos[2].size(), neg.size(), variants, searched);
        StageOptions o;
        o.seed = cfg.seed * 7919u + k;
        o.threads = cfg.threads;
        o.featureFraction = k == 0 ? 0.05 : 0.03;
        // rejections within the first ten engine stages let the search skip the neighbours
        o.maxStumps = k == 0 ? 9 : std::min(120, 12 + 10 * static_cast<int>(k));
        o.minStumps = k == 0 ? 2 : 3;
        o.minHitRate = k == 0 ? firstHitRate : hitRate;
        o.maxFalseRate = 0.5;
        const JointCascade* prior = &jc;
        JointReport rep;
        JointStage st = trainSoftStage(
            pool, {&pos[0], &pos[1], &pos[2]}, neg,
            [prior](const uint32_t* ii, float inv, float* sums) {
                bool al[15];
                prior->commonSums(ii, inv, sums, al);
            },
            alive, o, &rep);
        jc.common.push_back(std::move(st));
        jc.branch.assign(2, {});
        jc.uprightBias = 0;
        save();
        say("common stage %zu done: %d stumps, hit %.4f / %.4f / %.4f, background passing %.4f", k, rep.stumps,
            rep.hitRate[0], rep.hitRate[1], rep.hitRate[2], rep.falseRate);
    }
    if (static_cast<int>(jc.common.size()) < commonStages)
        return 0;
    if (jc.bands == 1 && !sideRows.empty()) {
        extendSide(jc, miner, cfg, sideRight, sideLeft, std::atof(get(a, "--side-hit-rate", "0.99").c_str()),
                   [&](std::string const& line) { say("%s", line.c_str()); });
        // the side band takes at most --side-routing of the faces the other categories would get
        std::vector<float> need;
        float F[15];
        bool ok[15];
        for (size_t c = 0; c < K; ++c)
            for (size_t i = 0; i < positives[c]->size(); ++i) {
                jc.commonSums(positives[c]->integral(i), positives[c]->inverseDeviation(i), F, ok);
                float mine = -1e30f, side = -1e30f;
                for (int k = 0; k < jc.categories(); ++k)
                    if (ok[k])
                        (k < 3 ? mine : side) = std::max(k < 3 ? mine : side, jc.margin(k, F[k]));
                if (mine > -1e30f)
                    need.push_back(side > -1e30f ? std::max(0.0f, side - mine) : 0.0f);
            }
        std::sort(need.begin(), need.end());
        const double share = std::atof(get(a, "--side-routing", "0.99").c_str());
        if (!need.empty())
            jc.sideBias = need[std::min(need.size() - 1, static_cast<size_t>(share * need.size()))] + 1e-3f;
        save();
    }
    if (jc.uprightBias == 0.0f) {
        // the bias that sends the asked share of the upright faces upright
        std::vector<float> need;
        float F[15];
        bool ok[15];
        for (size_t i = 0; i < upright.size(); ++i) {
            jc.commonSums(upright.integral(i), upright.inverseDeviation(i), F, ok);
            if (!ok[0])
                continue;
            float other = -1e30f;
            for (size_t c = 1; c < K; ++c)
                if (ok[c])
                    other = std::max(other, jc.margin(static_cast<int>(c), F[c]));
            need.push_back(std::max(0.0f, other - jc.margin(0, F[0])));
        }
        std::sort(need.begin(), need.end());
        if (!need.empty())
            jc.uprightBias = need[std::min(need.size() - 1, static_cast<size_t>(uprightRouting * need.size()))] + 1e-3f;
        save();
    }
    for (size_t c = 0; c < positives.size(); ++c) {
        size_t counts[5] = {0, 0, 0, 0, 0}, dropped = 0;
        for (size_t i = 0; i < positives[c]->size(); ++i) {
            bool passes = false;
            const int route = jc.route(positives[c]->integral(i), positives[c]->inverseDeviation(i), &passes);
            passes ? ++counts[std::min(route, 4)] : ++dropped;
        }
        say("category %zu positives (biases %.3f, %.3f): routed %zu / %zu / %zu / %zu / %zu, rejected %zu", c,
            static_cast<double>(jc.uprightBias), static_cast<double>(jc.sideBias), counts[0], counts[1], counts[2],
            counts[3], counts[4], dropped);
    }
    // the branches, a stage of each in turn
    for (int k = 0; k < branchStages && !timeUp(); ++k)
        for (size_t b = 0; b < jc.branch.size() && !timeUp(); ++b) {
            if (static_cast<int>(jc.branch[b].size()) > k || trainBranches.find(std::to_string(b)) == std::string::npos)
                continue;
            // every face the common stages send to this branch is its positive,
            // whatever its roll (the counter-clockwise branch's faces mirrored)
            SampleSet pos, neg, flipped;
            for (SampleSet const* p : positives)
                for (size_t i = 0; i < p->size(); ++i) {
                    bool passes = false;
                    const int route = jc.route(p->integral(i), p->inverseDeviation(i), &passes);
                    if (!passes)
                        continue;
                    bool mirrored = false;
                    if (branchOf(route, &mirrored) != b)
                        continue;
                    if (!mirrored) {
                        if (jc.branchPasses(b, p->integral(i), p->inverseDeviation(i)))
                            pos.addFrom(*p, i);
                    } else {
                        flipped.clear();
                        addMirrored(*p, i, flipped);
                        if (jc.branchPasses(b, flipped.integral(0), flipped.inverseDeviation(0)))
                            pos.addFrom(flipped, 0);
                    }
                }
            miner.faceShare = faceShare;
            miner.pick = [b](ScoredWindow const& w) {
                bool mirrored = false;
                if (branchOf(w.category, &mirrored) != b)
                    return -1;
                return mirrored ? 1 : 0;
            };
            size_t searched = 0;
            const size_t variants = miner.mine(CascadeWriter::toBytes(jc.toModel()), static_cast<size_t>(cfg.negatives),
                                               cfg.seed * 1000003u + 1000 * (b + 1) + static_cast<size_t>(k), cfg.threads,
                                               neg, &searched);
            say("branch %zu stage %d: %zu positives, %zu negatives from %zu variants (%zu accepted windows seen)", b, k,
                pos.size(), neg.size(), variants, searched);
            if (neg.size() < 200) {
                say("too few negatives left to mine in branch %zu", b);
                continue;
            }
            StageOptions o;
            o.seed = cfg.seed * 7919u + 100 * (b + 1) + static_cast<uint64_t>(k);
            o.threads = cfg.threads;
            o.featureFraction = k < 3 ? 0.03 : 0.015;
            o.maxStumps = std::min(120, 12 + 10 * k);
            o.minStumps = 3;
            o.minHitRate = hitRate;
            o.maxFalseRate = 0.5;
            std::vector<JointStage> const* prior = &jc.branch[b];
            JointReport rep;
            JointStage st = trainSoftStage(
                pool, {&pos}, neg,
                [prior](const uint32_t* ii, float inv, float* sums) {
                    sums[0] = 0.0f;
                    for (JointStage const& s : *prior)
                        sums[0] += s.sums(ii, inv)[0];
                },
                {}, o, &rep);
            jc.branch[b].push_back(std::move(st));
            save();
            say("branch %zu stage %d done: %d stumps, hit %.4f, false %.4f, median margin %.3f", b, k, rep.stumps,
                rep.hitRate[0], rep.falseRate, static_cast<double>(jc.branch[b].back().medianMargin));
        }
    if (log != nullptr)
        std::fclose(log);
    return 0;
}

int commandJointModel(std::map<std::string, std::string> const& a)
{
    JointCascade jc;
    if (!jc.load(get(a, "--work") + "/joint.txt")) {
        std::cerr << "cannot read " << get(a, "--work") << "/joint.txt\n";
        return 1;
    }
    const int stages = std::atoi(get(a, "--branch-stages", "-1").c_str());
    for (std::vector<JointStage>& b : jc.branch)
        if (stages >= 0 && static_cast<size_t>(stages) < b.size())
            b.resize(static_cast<size_t>(stages));
    if (!get(a, "--bias").empty())
        jc.uprightBias = std::strtof(get(a, "--bias").c_str(), nullptr);
    if (!get(a, "--side-bias").empty())
        jc.sideBias = std::strtof(get(a, "--side-bias").c_str(), nullptr);
    // --raise K:D,...: common stage K's thresholds raised by D for every
    // category, trading a little recall for fewer features per window
    std::istringstream raise(get(a, "--raise"));
    for (std::string item; std::getline(raise, item, ',');) {
        const size_t k = static_cast<size_t>(std::atoi(item.c_str()));
        const size_t colon = item.find(':');
        if (colon == std::string::npos || k >= jc.common.size()) {
            std::cerr << "--raise wants STAGE:DELTA with a stage below " << jc.common.size() << "\n";
            return 1;
        }
        const float delta = std::strtof(item.c_str() + colon + 1, nullptr);
        for (float& t : jc.common[k].thresholds)
            t += delta;
        // the last common thresholds also set the margins the branch choice compares
    }
    // --trace Q0,Q1,...: rejections inside the common stages, at a quantile of the
    // partial sums of fresh positives (other rolls and jitter than training's)
    if (!get(a, "--trace").empty()) {
        TrainConfig cfg;
        SampleSet upright, right, left;
        rollPositives(rollTrainFaces(a), cfg, 10, 12, 50, 977, upright, right, left);
        SampleSet sideRight, sideLeft;
        std::vector<SampleSet const*> positives{&upright, &right, &left};
        if (jc.bands > 1) {
            // band 2's positives (--pose-boxes) or none: then no early rejections there
            sidePositives(a, 980, sideRight, sideLeft);
            positives.push_back(&sideRight);
            positives.push_back(&sideLeft);
        }
        std::vector<double> quantiles;
        std::istringstream qs(get(a, "--trace"));
        for (std::string item; std::getline(qs, item, ',');)
            quantiles.push_back(std::atof(item.c_str()));
        jc.traceCommon(positives, quantiles);
    }
    CascadeModel m = jc.toModel();
    // --upright-cascade STATE: the frontal cascade finishes the upright
    // decision, so upright faces meet the cascade they met before
    if (!get(a, "--upright-cascade").empty()) {
        Cascade upright;
        if (!upright.load(get(a, "--upright-cascade"))) {
            std::cerr << "cannot read the cascade state " << get(a, "--upright-cascade") << "\n";
            return 1;
        }
        // --upright-stages N: its first N stages only, to measure what the
        // later ones cost faces turned 10 to 20 degrees in the plane (and what
        // they save in false hits and wrong orientations)
        const int keep = std::atoi(get(a, "--upright-stages", "-1").c_str());
        if (keep > 0 && static_cast<size_t>(keep) < upright.stages.size())
            upright.stages.resize(static_cast<size_t>(keep));
        m.branches[0] = asBranch(upright.toModel());
    }
    return CascadeWriter::writeFile(get(a, "--out"), m) ? 0 : 1;
}

// Faces found and roll error on report photos turned about the face's centre,
// through quorin_detect in the given modes.
int commandRollMeasure(std::map<std::string, std::string> const& a)
{
    Served served;
    if (!served.serve(a))
        return 1;
    const size_t limit = static_cast<size_t>(std::atoi(get(a, "--limit", "300").c_str()));
    std::vector<FaceRow> report;
    for (FaceRow const& r : readBoxes(get(a, "--boxes")))
        if (r.split == "report" && r.source != "dev")
            report.push_back(r);
    std::vector<FaceRow> chosen;
    const size_t every = std::max<size_t>(1, report.size() / std::max<size_t>(1, limit));
    for (size_t i = 0; i < report.size() && chosen.size() < limit; i += every)
        chosen.push_back(report[i]);
    {
        // raw hits of the cascade alone by category, on the first photos at 0 and +30 degrees
        CascadeDetector d(R"({"model":"mdcb","imageMaxSize":1024,"faceMinSize":24,"faceMaxSize":1024})");
        std::map<int, int> byCategory[2];
        for (size_t i = 0; i < std::min<size_t>(chosen.size(), 20); ++i) {
            Gray photo;
            if (!loadGray(chosen[i].path, photo))
                continue;
            for (int t = 0; t < 2; ++t) {
                const Gray g = rotatedAbout(photo, chosen[i].box.cx, chosen[i].box.cy, 30.0 * t);
                IN_IMAGE image;
                std::vector<ScoredWindow> hits;
                if (!searchWhole(d, g, 0.1f, 32, image, hits))
                    continue;
                for (ScoredWindow const& h : hits)
                    ++byCategory[t][h.category];
            }
        }
        for (int t = 0; t < 2; ++t) {
            std::printf("raw cascade hits on 20 photos turned %d, by category:", 30 * t);
            for (auto const& [c, n] : byCategory[t])
                std::printf(" %d:%d", c, n);
            std::printf(" (%zu common stages, %zu branches)\n", d.commonStages.size(), d.branchStages.size());
        }
    }
    std::vector<int> angles;
    std::istringstream as(get(a, "--angles", "0,15,30,45"));
    for (std::string item; std::getline(as, item, ',');)
        angles.push_back(std::atoi(item.c_str()));
    std::istringstream ms(get(a, "--modes", "2,0"));
    for (std::string item; std::getline(ms, item, ',');) {
        const int mode = std::atoi(item.c_str());
        quorin_init();
        quorin_setDetectionMode(static_cast<unsigned>(mode));
        for (int angle : angles) {
            int found = 0, tried = 0;
            double rollError = 0;
            for (int sign : {1, -1}) {
                if (angle == 0 && sign < 0)
                    continue;
                for (FaceRow const& r : chosen) {
                    Gray photo;
                    if (!loadGray(r.path, photo))
                        continue;
                    const Gray g = rotatedAbout(photo, r.box.cx, r.box.cy, sign * angle);
                    ++tried;
                    double bestIou = 0;
                    int roll = 0;
                    for (Block const& b : detectBlocks(g)) {
                        const double o = iou(boxOf(b), r.box);
                        if (o > bestIou) {
                            bestIou = o;
                            roll = b[0];
                        }
                    }
                    if (bestIou >= 0.4) {
                        ++found;
                        rollError += std::abs(roll - (r.roll + sign * angle));
                        if (std::getenv("MEASURE_VERBOSE") != nullptr)
                            std::printf("  %s turned %d: roll %d, labelled %.1f, IoU %.2f\n", r.path.c_str(), sign * angle,
                                        roll, r.roll + sign * angle, bestIou);
                    }
                }
            }
            std::printf("mode %d, turned %2d: found %d / %d (%.1f%%), mean roll error %.2f\n", mode, angle, found, tried,
                        100.0 * found / std::max(1, tried), found > 0 ? rollError / found : 0.0);
            std::fflush(stdout);
        }
        quorin_release();
    }
    return 0;
}

// ------------------------------------------------------------------ faces turned sideways

// Head-pose photos (labels.tsv: file, yaw, pitch, box x, y, w, h, person, ...)
// and the many-identity photos whose five points show a turned head, as face
// rows in the engine's framing. The pose boxes cover the visible face from
// brows to chin; the engine's square follows from the box's height and centre
// by a mapping fitted where the built-in cascade finds the near-frontal faces.
int commandPoseBoxes(std::map<std::string, std::string> const& a)
{
    const std::string dir = get(a, "--pose");
    struct PoseLabel {
        std::string path;
        double yaw, pitch, x, y, w, h;
        int person;
    };
    std::vector<PoseLabel> labels;
    {
        std::ifstream in(dir + "/labels.tsv");
        std::string line;
        std::getline(in, line);
        while (std::getline(in, line)) {
            std::istringstream ls(line);
            PoseLabel l;
            std::getline(ls, l.path, '\t');
            if (ls >> l.yaw >> l.pitch >> l.x >> l.y >> l.w >> l.h >> l.person)
                labels.push_back({dir + "/" + l.path, l.yaw, l.pitch, l.x, l.y, l.w, l.h, l.person});
        }
    }
    if (labels.empty()) {
        std::cerr << "no labels in " << dir << "/labels.tsv\n";
        return 1;
    }
    CascadeDetector cascade(R"({"model":"mdcb","imageMaxSize":640,"faceMinSize":32,"faceMaxSize":640})");
    std::vector<double> scale, dx, dy;
    for (PoseLabel const& l : labels) {
        if (std::fabs(l.yaw) > 15 || std::fabs(l.pitch) > 15)
            continue;
        Gray g;
        if (!loadGray(l.path, g))
            continue;
        for (Box const& b : builtinBoxes(cascade, g))
            if (b.cx > l.x && b.cx < l.x + l.w && b.cy > l.y && b.cy < l.y + l.h) {
                scale.push_back(b.side / l.h);
                dx.push_back((b.cx - l.x - l.w / 2) / l.h);
                dy.push_back((b.cy - l.y - l.h / 2) / l.h);
            }
    }
    if (scale.size() < 20) {
        std::cerr << "the built-in cascade found only " << scale.size() << " near-frontal pose faces\n";
        return 1;
    }
    auto median = [](std::vector<double> v) {
        std::nth_element(v.begin(), v.begin() + static_cast<std::ptrdiff_t>(v.size() / 2), v.end());
        return v[v.size() / 2];
    };
    const double k = median(scale), oy = median(dy);
    std::fprintf(stderr, "pose-boxes: %zu near-frontal faces: side %.3f x box height, centre %+.3f / %+.3f box heights\n",
                 scale.size(), k, median(dx), oy);
    // people split by person: every third for the report
    std::set<int> reportPeople;
    std::istringstream rp(get(a, "--report-people", "3,6,9,12"));
    for (std::string item; std::getline(rp, item, ',');)
        reportPeople.insert(std::atoi(item.c_str()));
    std::ofstream o(get(a, "--out"));
    o << "# path\tidentity\tsplit\tsource\tcx\tcy\tside\troll\tyaw\n";
    if (!get(a, "--jsonl").empty()) {
        // the same boxes as dump_hits' labels, for a data folder whose
        // photos/pointing04 is the pose photos' images folder
        std::ofstream j(get(a, "--jsonl"));
        for (PoseLabel const& l : labels) {
            const double cx = l.x + l.w / 2, cy = l.y + l.h / 2 + oy * l.h, half = k * l.h / 2;
            j << R"({"image":"photos/pointing04/)" << l.path.substr(l.path.rfind('/') + 1) << R"(","faces":[{"rect":[)"
              << cx - half << ',' << cy - half << ',' << cx + half << ',' << cy + half << "]}]}\n";
        }
    }
    for (PoseLabel const& l : labels)
        o << l.path << "\tpointing04/person" << l.person << '\t' << (reportPeople.count(l.person) ? "report" : "train")
          << "\tpointing04\t" << l.x + l.w / 2 << '\t' << l.y + l.h / 2 + oy * l.h << '\t' << k * l.h << "\t0\t" << l.yaw
          << '\n';
    // turned heads among the many-identity photos with human points: the nose
    // off the eyes' midpoint along the eye line, in eye distances
    size_t turnedRows = 0;
    if (!get(a, "--boxes").empty()) {
        std::map<std::string, double> offset;
        std::ifstream five(get(a, "--five"));
        std::string line;
        std::getline(five, line);
        while (std::getline(five, line)) {
            std::istringstream ls(line);
            std::string file;
            double p[6];
            std::getline(ls, file, '\t');
            if (!(ls >> p[0] >> p[1] >> p[2] >> p[3] >> p[4] >> p[5]))
                continue;
            const double ex = p[2] - p[0], ey = p[3] - p[1], d = std::hypot(ex, ey);
            if (d > 1)
                offset[file] = ((p[4] - (p[0] + p[2]) / 2) * ex + (p[5] - (p[1] + p[3]) / 2) * ey) / (d * d);
        }
        const double least = std::atof(get(a, "--min-offset", "0.25").c_str());
        for (FaceRow const& r : readBoxes(get(a, "--boxes"))) {
            const size_t at = r.path.rfind("photos/");
            auto it = offset.find(at == std::string::npos ? r.path : r.path.substr(at + 7));
            if (it == offset.end() || std::fabs(it->second) < least)
                continue;
            // about 35 degrees at the least offset; the sign as the pose photos'
            const double yaw = -std::copysign(std::min(90.0, 35.0 * std::fabs(it->second) / least), it->second);
            o << r.path << '\t' << r.identity << '\t' << r.split << '\t' << r.source << "-turned\t" << r.box.cx << '\t'
              << r.box.cy << '\t' << r.box.side << '\t' << r.roll << '\t' << yaw << '\n';
            ++turnedRows;
        }
    }
    std::fprintf(stderr, "pose-boxes: %zu head-pose rows, %zu turned many-identity rows\n", labels.size(), turnedRows);
    return 0;
}

// A box on a head-pose photo's labelled box (brows to chin, about the framing's size).
bool onPoseBox(Box const& box, Box const& label)
{
    const double half = label.side / 2;
    return std::fabs(box.cx - label.cx) < half && std::fabs(box.cy - label.cy) < half && box.side > 0.5 * label.side &&
           box.side < 2 * label.side;
}

// Faces found by yaw on the head-pose report people through quorin_detect:
// a face is found when a box's centre lies inside the labelled box at a side
// within half to twice the framing's. Also the roll of found turned heads and
// whether the five points lie inside the reported box.
int commandPoseMeasure(std::map<std::string, std::string> const& a)
{
    // the many-identity photos' turned heads are counted under one key (their yaw is a rough guess)
    constexpr int kTurnedHeads = 999;
    Served served;
    if (!served.serve(a))
        return 1;
    std::vector<FaceRow> rows;
    const std::string split = get(a, "--split", "report");
    for (FaceRow const& r : readBoxes(get(a, "--pose-boxes")))
        if ((r.source == "pointing04" || r.source.find("-turned") != std::string::npos) && r.split == split)
            rows.push_back(r);
    std::istringstream ms(get(a, "--modes", "2,0"));
    for (std::string item; std::getline(ms, item, ',');) {
        const int mode = std::atoi(item.c_str());
        quorin_init();
        quorin_setDetectionMode(static_cast<unsigned>(mode));
        std::map<int, std::array<double, 6>> byYaw; // tried, found, other boxes, |roll|, points inside, abs yaw
        for (FaceRow const& r : rows) {
            Gray g;
            if (!loadGray(r.path, g))
                continue;
            const bool pose = r.source == "pointing04";
            std::array<double, 6>& e = byYaw[pose ? static_cast<int>(std::lround(std::fabs(r.yaw))) : kTurnedHeads];
            e[0] += 1;
            bool found = false;
            for (Block const& b : detectBlocks(g)) {
                const Box box = boxOf(b);
                const bool match = !found && (pose ? onPoseBox(box, r.box) : iou(box, r.box) >= 0.4);
                if (!match) {
                    e[2] += 1;
                    continue;
                }
                found = true;
                e[1] += 1;
                e[3] += std::abs(b[0]);
                bool inside = true;
                for (int p = 0; p < 5; ++p)
                    inside = inside && b[7 + 2 * p] >= b[5] && b[7 + 2 * p] <= b[6] && b[8 + 2 * p] >= b[3] &&
                             b[8 + 2 * p] <= b[4];
                e[4] += inside;
            }
            if (!found && std::getenv("MEASURE_VERBOSE") != nullptr)
                std::printf("  missed %s (yaw %.0f)\n", r.path.c_str(), r.yaw);
        }
        for (auto const& [yaw, e] : byYaw) {
            char label[64] = "many-identity turned heads";
            if (yaw != kTurnedHeads)
                std::snprintf(label, sizeof label, "yaw %2d", yaw);
            std::printf("mode %d, %s: found %3.0f / %3.0f (%5.1f%%), other boxes %3.0f, mean |roll| %.1f, points inside %.0f%%\n",
                        mode, label, e[1], e[0], 100.0 * e[1] / std::max(1.0, e[0]), e[2],
                        e[1] > 0 ? e[3] / e[1] : 0.0, e[1] > 0 ? 100.0 * e[4] / e[1] : 0.0);
        }
        std::fflush(stdout);
        quorin_release();
    }
    return 0;
}

const char* kUsage = "usage: train_cascade boxes|train|measure|model|joint-train|joint-model|roll-measure [--key value ...] (see the comment at the top)\n";

} // namespace

// Engine payload of a saved cascade state; --first-stage-from puts the first
// stage of another state in front of this one's later stages (the shipped
// cascade's cheap first stage was trained apart from the rest).
int commandModel(std::map<std::string, std::string> const& a)
{
    Cascade cascade;
    if (!cascade.load(get(a, "--cascade"))) {
        std::cerr << "cannot read the cascade state " << get(a, "--cascade") << "\n";
        return 1;
    }
    const std::string first = get(a, "--first-stage-from");
    if (!first.empty()) {
        Cascade other;
        if (!other.load(first) || other.stages.empty() || cascade.stages.empty()) {
            std::cerr << "cannot take the first stage from " << first << "\n";
            return 1;
        }
        cascade.stages[0] = other.stages[0];
    }
    std::istringstream settings(get(a, "--threshold"));
    for (std::string item; std::getline(settings, item, ',');) {
        const std::string::size_type colon = item.find(':');
        char* end = nullptr;
        const long index = colon == std::string::npos ? -1 : std::strtol(item.c_str(), &end, 10);
        if (index < 0 || static_cast<size_t>(index) >= cascade.stages.size() || end != item.c_str() + colon) {
            std::cerr << "--threshold wants STAGE:VALUE with a stage below " << cascade.stages.size() << ": " << item
                      << "\n";
            return 1;
        }
        cascade.stages[static_cast<size_t>(index)].threshold = std::strtof(item.c_str() + colon + 1, nullptr);
    }
    if (!get(a, "--save").empty() && !cascade.save(get(a, "--save"))) {
        std::cerr << "cannot write " << get(a, "--save") << "\n";
        return 1;
    }
    CascadeWriter::writeFile(get(a, "--out"), cascade.toModel());
    return 0;
}

int main(int argc, char** argv)
{
    if (argc < 2) {
        std::cerr << kUsage;
        return 2;
    }
    const std::string cmd = argv[1];
    const std::map<std::string, std::string> a = args(argc, argv, 2);
    if (cmd == "boxes")
        return commandBoxes(a);
    if (cmd == "train")
        return commandTrain(a);
    if (cmd == "measure")
        return commandMeasure(a);
    if (cmd == "model")
        return commandModel(a);
    if (cmd == "joint-train")
        return commandJointTrain(a);
    if (cmd == "joint-model")
        return commandJointModel(a);
    if (cmd == "roll-measure")
        return commandRollMeasure(a);
    if (cmd == "raw-hits")
        return commandRawHits(a);
    if (cmd == "pasted")
        return commandPasted(a);
    if (cmd == "pose-boxes")
        return commandPoseBoxes(a);
    if (cmd == "pose-measure")
        return commandPoseMeasure(a);
    std::cerr << kUsage;
    return 2;
}
