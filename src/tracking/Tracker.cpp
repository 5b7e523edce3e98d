#include "tracking/Tracker.h"

#include "core/CreateFromText.h"

#include <cstdint>
#include <exception>
#include <new>

namespace {

// left + right - (left' + right'), halved toward zero, without int overflow on
// absurd windows.
double centreShift(int32_t a0, int32_t a1, int32_t b0, int32_t b1)
{
    const int64_t d = (int64_t(a0) + int64_t(a1)) - (int64_t(b0) + int64_t(b1));
    return double(d / 2);
}

// int(double(v) + shift) truncating toward zero, held inside int32 so that a
// runaway velocity cannot turn into undefined behaviour.
int32_t shifted(int32_t v, double shift)
{
    const double r = double(v) + shift;
    if (!(r > -2147483648.0)) return INT32_MIN; // also catches NaN
    if (r >= 2147483647.0) return INT32_MAX;
    return int32_t(r);
}

} // namespace

void Tracker::getPreviousFaces(std::vector<DetectionWindow>* out)
{
    if (!out) return;
    for (size_t j = 0; j < faces.size(); ++j)
        if (faces.alive[j]) out->push_back(faces.items[j].rect);
}

void Tracker::predict(const IN_IMAGE&, std::vector<DetectionWindow>* out)
{
    if (!out) return;
    for (size_t j = 0; j < faces.size(); ++j) {
        if (!faces.alive[j]) continue;
        const TrackFace& f = faces.items[j];
        DetectionWindow w = f.rect;
        w.left = shifted(f.rect.left, f.velocityX);
        w.right = shifted(f.rect.right, f.velocityX);
        w.top = shifted(f.rect.top, f.velocityY);
        w.bottom = shifted(f.rect.bottom, f.velocityY);
        out->push_back(w);
    }
}

void Tracker::match(const std::vector<std::vector<float>>& scores, std::vector<int>* assignment)
{
    if (scores.empty() || !assignment) return;
    const size_t rows = scores.size();
    assignment->resize(rows, -1);
    const size_t cols = scores[0].size();
    if (cols == 0) return;

    std::vector<bool> rowTaken(rows, false), columnTaken(cols, false);
    for (;;) {
        double best = 0.0;
        size_t bestRow = 0, bestCol = 0;
        for (size_t r = 0; r < rows; ++r) {
            if (rowTaken[r]) continue;
            const std::vector<float>& row = scores[r];
            const size_t n = row.size() < cols ? row.size() : cols;
            for (size_t c = 0; c < n; ++c) {
                if (columnTaken[c]) continue;
                const double v = double(row[c]);
                if (v > best) {
                    best = v;
                    bestRow = r;
                    bestCol = c;
                }
            }
        }
        if (best == 0.0) return;
        rowTaken[bestRow] = true;
        columnTaken[bestCol] = true;
        (*assignment)[bestRow] = int(bestCol);
    }
}

void Tracker::update(const IN_IMAGE&, const std::vector<DetectionWindow>& detections)
{
    const size_t m = detections.size();
    const size_t n = faces.size();
    const std::vector<int> assignment = matchDetections(
        detections, n, [&](size_t j) { return bool(faces.alive[j]); }, [&](size_t j) { return faces.items[j].rect; },
        true);

    std::vector<bool> seen(n + m, false);
    for (size_t i = 0; i < m; ++i) {
        const DetectionWindow& d = detections[i];
        const int j = assignment[i];
        if (j >= 0) {
            TrackFace& f = faces.items[size_t(j)];
            f.velocityX = centreShift(d.left, d.right, f.rect.left, f.rect.right);
            f.velocityY = centreShift(d.top, d.bottom, f.rect.top, f.rect.bottom);
            f.rect = d;
            seen[size_t(j)] = true;
        } else {
            TrackFace f;
            f.rect = d;
            const uint32_t slot = faces.insert(f);
            if (slot < seen.size()) seen[slot] = true;
        }
    }

    // No grace period, and no look at the alive flag: a slot already dead is
    // stacked again, so two new faces of one later frame may share a slot.
    removeUnseen(faces, seen, false);

    ++frameCounter;
}

std::string Tracker::toJson() const { return "{}"; }

void Tracker::fromJson(const std::string&) {}

std::string Tracker::name() const { return "SIMPLE_TRACKER"; }

Tracker* Tracker::create(const std::string& parameters) { return createFromText<Tracker>(parameters); }
