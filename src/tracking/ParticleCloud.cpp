#include "tracking/ParticleCloud.h"

#include <cmath>
#include <cstdlib>

namespace particle_cloud {
namespace {

constexpr int kLatticeRadius = 5;
constexpr float kDrawScale = 4.656612873e-10f; // 2^-31: lrand48 to [0, 1)

// int(v) toward zero, held inside int32; not-a-number gives 0.
int32_t toInt(float v)
{
    if (std::isnan(v)) return 0;
    if (v <= -2147483648.0f) return INT32_MIN;
    if (v >= 2147483647.0f) return INT32_MAX;
    return int32_t(v);
}

// v + d in int32 without overflow: a cloud pushed to the end of the range
// stays there rather than wrapping around.
int32_t shift(int32_t v, int64_t d)
{
    const int64_t r = int64_t(v) + d;
    if (r < INT32_MIN) return INT32_MIN;
    if (r > INT32_MAX) return INT32_MAX;
    return int32_t(r);
}

// A step of up to a tenth of the size; a degenerate size gives no step.
int64_t jitter(int64_t size)
{
    const long sign = (lrand48() & 1) ? -1 : 1;
    const int64_t range = size / 10 + 1;
    const long draw = lrand48();
    return range > 0 ? sign * (draw % range) : 0;
}

} // namespace

void seedLattice(const DetectionWindow& rect, std::vector<DetectionWindow>& particles, std::vector<float>& weights)
{
    const int side = 2 * kLatticeRadius + 1;
    particles.clear();
    particles.reserve(size_t(side * side));
    for (int dx = -kLatticeRadius; dx <= kLatticeRadius; ++dx)
        for (int dy = -kLatticeRadius; dy <= kLatticeRadius; ++dy) {
            DetectionWindow p;
            p.left = shift(rect.left, dx);
            p.right = shift(rect.right, dx);
            p.top = shift(rect.top, dy);
            p.bottom = shift(rect.bottom, dy);
            particles.push_back(p);
        }
    weights.assign(particles.size(), 1.0f / float(side * side));
}

DetectionWindow mean(const std::vector<DetectionWindow>& particles, const std::vector<float>& weights)
{
    float left = 0.0f, right = 0.0f, top = 0.0f, bottom = 0.0f;
    const size_t n = particles.size() < weights.size() ? particles.size() : weights.size();
    for (size_t i = 0; i < n; ++i) {
        const float w = weights[i];
        const DetectionWindow& p = particles[i];
        left += w * float(p.left);
        right += w * float(p.right);
        top += w * float(p.top);
        bottom += w * float(p.bottom);
    }
    DetectionWindow m;
    m.left = toInt(left + 0.5f);
    m.right = toInt(right + 0.5f);
    m.top = toInt(top + 0.5f);
    m.bottom = toInt(bottom + 0.5f);
    return m;
}

void diffuse(std::vector<DetectionWindow>& particles, int32_t velocityX, int32_t velocityY)
{
    for (DetectionWindow& p : particles) {
        const int64_t w = int64_t(p.right) - p.left;
        const int64_t h = int64_t(p.bottom) - p.top;
        const int64_t dx = velocityX + jitter(w);
        const int64_t dy = velocityY + jitter(h);
        p.left = shift(p.left, dx);
        p.right = shift(p.right, dx);
        p.top = shift(p.top, dy);
        p.bottom = shift(p.bottom, dy);
    }
}

void normalise(std::vector<float>& weights)
{
    float sum = 0.0f;
    for (const float w : weights) sum += w;
    if (!(sum > 0.0f) || !std::isfinite(sum)) {
        if (!weights.empty()) weights.assign(weights.size(), 1.0f / float(weights.size()));
        return;
    }
    for (float& w : weights) w /= sum;
}

void resample(std::vector<DetectionWindow>& particles, std::vector<float>& weights, int count)
{
    const int n = int(particles.size() < weights.size() ? particles.size() : weights.size());
    if (n == 0 || count <= 0) {
        particles.clear();
        weights.clear();
        return;
    }
    std::vector<float> cumulative(size_t(n), 0.0f);
    for (int i = 1; i < n; ++i) cumulative[size_t(i)] = cumulative[size_t(i - 1)] + weights[size_t(i - 1)];

    std::vector<DetectionWindow> drawn(static_cast<size_t>(count));
    for (int i = 0; i < count; ++i) {
        const float u = float(lrand48()) * kDrawScale;
        int lo = 0;
        if (n > 1) {
            // Not a textbook search: it may step one below the first entry
            // at or above u. Weights that are not numbers fail every test and
            // walk lo to the top; lo never leaves 0..n-1.
            int hi = n - 1;
            while (lo < hi) {
                const int mid = (lo + hi) >> 1;
                if (u <= cumulative[size_t(mid)])
                    hi = mid - 1;
                else
                    lo = mid + 1;
            }
        }
        drawn[size_t(i)] = particles[size_t(lo)];
    }
    particles.swap(drawn);
    weights.assign(size_t(count), 1.0f / float(count));
}

} // namespace particle_cloud
