// The feature vocabulary of a window: every rectangle pattern of six families
// at every size and position that the grow and shift rules allow.
#include <algorithm>
#include <cstdint>
#include <new>

#include "detector/WindowFeature.h"

namespace {

struct Cell {
    int left, top, width, height;
    float weight;
};

int nextSize(int size, float growRatio)
{
    return std::max(static_cast<int>(static_cast<double>(growRatio * static_cast<float>(size)) + 0.5), size + 1);
}

int shiftOf(int size, float shiftRatio)
{
    return std::max(static_cast<int>(static_cast<double>(shiftRatio * static_cast<float>(size)) + 0.5), 1);
}

// Calls emit(cells, n) for every feature, in generation order.
template <typename Emit>
void forEachFeature(int width, int height, int minWidth, int minHeight, float shiftRatio, float growRatio,
                    Emit&& emit)
{
    struct Family {
        int limitA, limitB, cellsX, cellsY;
    };
    const Family families[6] = {
        {width / 2, height, 2, 1}, {width, height / 2, 1, 2},     {width / 3, height, 3, 1},
        {width, height / 3, 1, 3}, {width / 2, height / 2, 2, 2}, {width / 3, height / 3, 3, 3},
    };
    // A cell narrower than a pixel would have no area.
    const int firstA = std::max(minWidth, 1);
    const int firstB = std::max(minHeight, 1);
    for (int f = 0; f < 6; ++f) {
        Family const& fam = families[f];
        for (int a = firstA; a <= fam.limitA; a = nextSize(a, growRatio)) {
            for (int b = firstB; b <= fam.limitB; b = nextSize(b, growRatio)) {
                const int totalW = fam.cellsX * a;
                const int totalH = fam.cellsY * b;
                const int shiftX = shiftOf(a, shiftRatio);
                const int shiftY = shiftOf(b, shiftRatio);
                for (int x = 0; x + totalW <= width; x += shiftX) {
                    for (int y = 0; y + totalH <= height; y += shiftY) {
                        switch (f) {
                        case 0: {
                            const Cell c[] = {{x, y, a, b, 1.0f}, {x + a, y, a, b, -1.0f}};
                            emit(c, 2);
                            break;
                        }
                        case 1: {
                            const Cell c[] = {{x, y, a, b, 1.0f}, {x, y + b, a, b, -1.0f}};
                            emit(c, 2);
                            break;
                        }
                        case 2: {
                            const Cell c1[] = {{x, y, 3 * a, b, -1.0f}, {x + a, y, a, b, 3.0f}};
                            emit(c1, 2);
                            const Cell c2[] = {{x, y, a, b, -1.0f}, {x + 2 * a, y, a, b, 1.0f}};
                            emit(c2, 2);
                            break;
                        }
                        case 3: {
                            const Cell c1[] = {{x, y, a, 3 * b, -1.0f}, {x, y + b, a, b, 3.0f}};
                            emit(c1, 2);
                            const Cell c2[] = {{x, y, a, b, -1.0f}, {x, y + 2 * b, a, b, 1.0f}};
                            emit(c2, 2);
                            break;
                        }
                        case 4: {
                            const Cell tl{x, y, a, b, 1.0f}, tr{x + a, y, a, b, 1.0f}, bl{x, y + b, a, b, 1.0f},
                                br{x + a, y + b, a, b, 1.0f}, all{x, y, 2 * a, 2 * b, 1.0f};
                            auto w = [](Cell c, float weight) {
                                c.weight = weight;
                                return c;
                            };
                            const float area = static_cast<float>(a * b);
                            const Cell f1[] = {w(tl, 1.0f), w(br, -1.0f)};
                            emit(f1, 2);
                            const Cell f2[] = {w(tr, 1.0f), w(bl, -1.0f)};
                            emit(f2, 2);
                            // Compares means, unlike the three after it, which compare scaled sums.
                            const Cell f3[] = {w(tl, 1.0f / area), w(all, -1.0f / (4.0f * area))};
                            emit(f3, 2);
                            const Cell f4[] = {w(tr, 4.0f), w(all, -1.0f)};
                            emit(f4, 2);
                            const Cell f5[] = {w(bl, 4.0f), w(all, -1.0f)};
                            emit(f5, 2);
                            const Cell f6[] = {w(br, 4.0f), w(all, -1.0f)};
                            emit(f6, 2);
                            const Cell f7[] = {w(tl, 1.0f), w(tr, -1.0f), w(bl, -1.0f), w(br, 1.0f)};
                            emit(f7, 4);
                            break;
                        }
                        default: {
                            const Cell c1[] = {{x, y, 3 * a, 3 * b, -1.0f}, {x + a, y + b, a, b, 9.0f}};
                            emit(c1, 2);
                            const Cell c2[] = {{x, y + b, 3 * a, b, -1.0f}, {x + a, y, a, 3 * b, 1.0f}};
                            emit(c2, 2);
                            break;
                        }
                        }
                    }
                }
            }
        }
    }
}

// Pools past this size are refused like a failed allocation.
constexpr int64_t kMaxPoolSize = 1 << 26;

// Size of the pool (deviation feature included) without visiting each
// placement: positions per size pair are counted in closed form, and the count
// stops as soon as it passes the limit, so huge windows are refused at once.
int64_t countFeatures(int width, int height, int minWidth, int minHeight, float shiftRatio, float growRatio)
{
    struct Family {
        int limitA, limitB, cellsX, cellsY, perPosition;
    };
    const Family families[6] = {
        {width / 2, height, 2, 1, 1},     {width, height / 2, 1, 2, 1},     {width / 3, height, 3, 1, 2},
        {width, height / 3, 1, 3, 2},     {width / 2, height / 2, 2, 2, 7}, {width / 3, height / 3, 3, 3, 2},
    };
    const int firstA = std::max(minWidth, 1);
    const int firstB = std::max(minHeight, 1);
    int64_t total = 1;
    for (Family const& fam : families) {
        for (int a = firstA; a <= fam.limitA; a = nextSize(a, growRatio)) {
            for (int b = firstB; b <= fam.limitB; b = nextSize(b, growRatio)) {
                const int64_t nx = (width - fam.cellsX * a) / shiftOf(a, shiftRatio) + 1;
                const int64_t ny = (height - fam.cellsY * b) / shiftOf(b, shiftRatio) + 1;
                total += nx * ny * fam.perPosition;
                if (total > kMaxPoolSize)
                    return total;
            }
        }
    }
    return total;
}

} // namespace

WindowFeature* WindowFeature::generateFeaturePool(int width, int height, int minWidth, int minHeight,
                                                  float shiftRatio, float growRatio, int* count)
{
    if (count == nullptr)
        return nullptr;
    const int64_t total = countFeatures(width, height, minWidth, minHeight, shiftRatio, growRatio);
    if (total > kMaxPoolSize)
        return nullptr;
    WindowFeature* pool = new (std::nothrow) WindowFeature[static_cast<size_t>(total)];
    if (pool == nullptr)
        return nullptr;

    pool[0].kind = DEVIATION;
    int64_t next = 1;
    try {
        forEachFeature(width, height, minWidth, minHeight, shiftRatio, growRatio, [&](Cell const* cells, int n) {
            if (next >= total)
                throw std::bad_alloc();
            WindowFeature& feature = pool[next++];
            HaarFeature* haar = new HaarFeature();
            feature.kind = HAAR;
            feature.haar = haar;
            if (!haar->Init(n))
                throw std::bad_alloc();
            for (int i = 0; i < n; ++i) {
                HaarRect& r = haar->rects[i];
                r = HaarRect();
                r.left = cells[i].left;
                r.right = cells[i].left + cells[i].width;
                r.top = cells[i].top;
                r.bottom = cells[i].top + cells[i].height;
                r.weight = cells[i].weight;
            }
        });
    } catch (...) {
        destroyFeaturePool(pool);
        throw;
    }
    if (next != total) { // the closed-form count and the generator must agree
        destroyFeaturePool(pool);
        return nullptr;
    }
    *count = static_cast<int>(total);
    return pool;
}

void WindowFeature::destroyFeaturePool(WindowFeature* pool)
{
    delete[] pool;
}
