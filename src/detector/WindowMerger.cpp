#include "detector/WindowMerger.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double kClusterThreshold = 0.4;
constexpr double kSuppressThreshold = 0.4;
constexpr int kHistory = 5;

double areaOf(DetectionWindow const& w)
{
    return static_cast<double>(w.right - w.left) * static_cast<double>(w.bottom - w.top);
}

// A member's own-category score; a category outside the table (not made by
// the detector) falls back to the member's score.
float ownScore(ScoredWindow const& w)
{
    if (w.category >= 0 && w.category < kMaxCategories)
        return w.categoryScores[w.category];
    return w.score;
}

} // namespace

int WindowMerger::intersectWindows(DetectionWindow const& a, DetectionWindow const& b, DetectionWindow& result)
{
    result.left = std::max(a.left, b.left);
    result.right = std::min(a.right, b.right);
    if (result.left > result.right)
        return 0;
    result.top = std::max(a.top, b.top);
    result.bottom = std::min(a.bottom, b.bottom);
    return result.top > result.bottom ? 1 : 2;
}

void WindowMerger::UpdatePosForEarlyRemove(int& position, int removed)
{
    if (position == -1 || removed == -1 || position < removed)
        return;
    if (position == removed)
        position = -1;
    else
        --position;
}

void WindowMerger::clusterWindows(int count, double threshold)
{
    // Descending left: the pair sweep below can stop at the first window that
    // lies wholly beside the present one.
    std::stable_sort(entries.begin(), entries.begin() + count, [](ClusterEntry const& a, ClusterEntry const& b) {
        return a.window->window.left > b.window->window.left;
    });
    if (static_cast<int>(areas.size()) < count)
        areas.resize(static_cast<size_t>(count));
    for (int i = 0; i < count; ++i) {
        entries[i].rank = i;
        entries[i].parent = i;
        areas[i] = areaOf(entries[i].window->window);
    }
    for (int a = 0; a + 1 < count; ++a) {
        for (int b = a + 1; b < count; ++b) {
            DetectionWindow inter;
            const int relation = intersectWindows(entries[a].window->window, entries[b].window->window, inter);
            if (relation == 0)
                break;
            if (relation != 2)
                continue;
            const double dice = 2.0 * areaOf(inter) / (areas[a] + areas[b]);
            if (!(dice > threshold))
                continue;
            const int pa = entries[a].parent;
            const int pb = entries[b].parent;
            if (pa <= pb)
                entries[b].parent = pa;
            else
                entries[a].parent = pb;
        }
    }
}

void WindowMerger::buildGroup(int root)
{
    std::vector<ClusterEntry*> const& members = clusters[root];
    const int m = static_cast<int>(members.size());

    float sumLeft = 0.0f, sumRight = 0.0f, sumTop = 0.0f, sumBottom = 0.0f;
    float best = kDeadScore;
    int history[kHistory] = {-1, -1, -1, -1, -1};
    for (int k = 0; k < m; ++k) {
        ScoredWindow const& w = *members[k]->window;
        sumLeft += static_cast<float>(w.window.left);
        sumRight += static_cast<float>(w.window.right);
        sumTop += static_cast<float>(w.window.top);
        sumBottom += static_cast<float>(w.window.bottom);
        // The members that set a new record, latest first.
        if (w.score > best) {
            best = w.score;
            for (int h = kHistory - 1; h > 0; --h)
                history[h] = history[h - 1];
            history[0] = k;
        }
    }

    MergedWindow out;
    float total = 0.0f;
    for (int c = 0; c < kMaxCategories; ++c) {
        float sum = 0.0f;
        float weights = 0.0f;
        for (int h = 0; h < kHistory && history[h] != -1; ++h) {
            ScoredWindow const& w = *members[history[h]]->window;
            const float weight = static_cast<float>(1.0 / (std::exp(-static_cast<double>(ownScore(w))) + 1.0));
            weights += weight;
            sum += static_cast<float>(weight / (std::exp(-static_cast<double>(w.categoryScores[c])) + 1.0));
        }
        if (weights > 0.0f)
            sum /= weights;
        out.categoryScores[c] = sum;
        total += sum;
    }
    if (total > 0.0f)
        for (int c = 0; c < kMaxCategories; ++c)
            out.categoryScores[c] /= total;

    const float fm = static_cast<float>(m);
    out.score = best;
    out.category = history[0] >= 0 ? members[history[0]]->window->category : 0;
    out.window.left = static_cast<int32_t>(static_cast<double>(sumLeft / fm) + 0.5);
    out.window.right = static_cast<int32_t>(static_cast<double>(sumRight / fm) + 0.5);
    out.window.top = static_cast<int32_t>(static_cast<double>(sumTop / fm) + 0.5);
    out.window.bottom = static_cast<int32_t>(static_cast<double>(sumBottom / fm) + 0.5);
    out.area = areaOf(out.window);
    merged.push_back(out);
}

void WindowMerger::suppressOverlaps()
{
    auto nextOf = [this](int p) { return p + 1 < static_cast<int>(merged.size()) ? p + 1 : -1; };
    auto erase = [this](int p) { merged.erase(merged.begin() + p); };

    int nextA = merged.empty() ? -1 : 0;
    while (nextA != -1) {
        int a = nextA;
        nextA = nextOf(a);
        if (merged[a].area <= 0.0) {
            erase(a);
            UpdatePosForEarlyRemove(nextA, a);
            continue;
        }
        int nextB = nextA;
        while (nextB != -1) {
            int b = nextB;
            nextB = nextOf(b);
            if (merged[b].area <= 0.0) {
                erase(b);
                UpdatePosForEarlyRemove(nextA, b);
                UpdatePosForEarlyRemove(a, b);
                UpdatePosForEarlyRemove(nextB, b);
                continue;
            }
            DetectionWindow inter;
            if (intersectWindows(merged[a].window, merged[b].window, inter) != 2)
                continue;
            const double ratio = areaOf(inter) / std::min(merged[a].area, merged[b].area);
            if (!(ratio > kSuppressThreshold))
                continue;
            if (merged[a].score >= merged[b].score) {
                erase(b);
                UpdatePosForEarlyRemove(nextA, b);
                UpdatePosForEarlyRemove(a, b);
                UpdatePosForEarlyRemove(nextB, b);
                continue;
            }
            erase(a);
            UpdatePosForEarlyRemove(nextB, a);
            UpdatePosForEarlyRemove(b, a);
            UpdatePosForEarlyRemove(nextA, a);
            break;
        }
    }
}

void WindowMerger::mergeWindows(std::vector<ScoredWindow> const& input, std::vector<ScoredWindow>& output)
{
    const int n = static_cast<int>(input.size());
    entries.clear();
    for (int i = 0; i < n; ++i) {
        ClusterEntry e;
        e.index = i;
        e.window = &input[i];
        entries.push_back(e);
    }
    clusterWindows(n, kClusterThreshold);

    if (static_cast<int>(clusters.size()) < n)
        clusters.resize(static_cast<size_t>(n));
    for (std::vector<ClusterEntry*>& list : clusters)
        list.clear();
    for (int i = 0; i < n; ++i) {
        int root = i;
        // Links only ever point to an earlier position, so the walk ends; the
        // step bound guards against a broken chain all the same.
        for (int steps = 0; root >= 0 && root < n && entries[root].parent != root; ++steps) {
            if (steps > n)
                throw "Error: Sid searched out of range!";
            root = entries[root].parent;
        }
        if (root < 0 || root >= n)
            throw "Error: Sid searched out of range!";
        entries[i].parent = root;
        clusters[root].push_back(&entries[i]);
    }

    merged.clear();
    for (int i = 0; i < n; ++i)
        if (!clusters[i].empty())
            buildGroup(i);
    suppressOverlaps();
    for (MergedWindow const& w : merged)
        output.push_back(static_cast<ScoredWindow const&>(w));
}
