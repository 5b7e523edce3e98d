#include "tracking/KFTracker.h"

#include "core/CreateFromText.h"

#include <cmath>
#include <cstdint>
#include <exception>

Eigen::MatrixXf KFTracker::F;
Eigen::MatrixXf KFTracker::Q;
Eigen::MatrixXf KFTracker::H;
Eigen::MatrixXf KFTracker::R;

namespace {

constexpr float kInitialVariance = 10000.0f;
constexpr float kMeasurementVariance = 42.25f; // 6.5 pixels

// int(v) toward zero, held inside int32: a diverged filter must not turn a
// float-to-int conversion into undefined behaviour.
int32_t toInt(float v)
{
    if (!(v > -2147483648.0f)) return INT32_MIN; // also NaN
    if (v >= 2147483647.0f) return INT32_MAX;
    return int32_t(v);
}

int32_t roundHalfUp(float v) { return toInt(v + 0.5f); }

} // namespace

KFTracker::TrackFace::TrackFace()
    : state(Eigen::VectorXf::Zero(6)),
      covariance(Eigen::MatrixXf::Identity(6, 6) * kInitialVariance)
{
}

KFTracker::KFTracker()
{
    // White-acceleration model of unit time step: each edge moves with the
    // velocity of its axis; the edges are not coupled with one another.
    F = Eigen::MatrixXf::Identity(6, 6);
    F(0, 4) = 1.0f;
    F(1, 5) = 1.0f;
    F(2, 4) = 1.0f;
    F(3, 5) = 1.0f;

    Q = Eigen::MatrixXf::Zero(6, 6);
    for (int e = 0; e < 4; ++e) Q(e, e) = 0.25f;
    Q(4, 4) = 1.0f;
    Q(5, 5) = 1.0f;
    Q(0, 4) = Q(4, 0) = 0.5f;
    Q(2, 4) = Q(4, 2) = 0.5f;
    Q(1, 5) = Q(5, 1) = 0.5f;
    Q(3, 5) = Q(5, 3) = 0.5f;

    H = Eigen::MatrixXf::Zero(4, 6);
    H.block(0, 0, 4, 4) = Eigen::MatrixXf::Identity(4, 4);

    R = Eigen::MatrixXf::Identity(4, 4) * kMeasurementVariance;
}

void KFTracker::getPreviousFaces(std::vector<DetectionWindow>* out)
{
    if (!out) return;
    for (size_t j = 0; j < kfFaces.size(); ++j) {
        if (!kfFaces.alive[j]) continue;
        const Eigen::VectorXf& o = kfFaces.items[j].observation;
        if (o.size() < 4) continue; // a live face always has its measurement
        DetectionWindow w{};
        w.left = roundHalfUp(o[0]);
        w.right = roundHalfUp(o[2]);
        w.top = roundHalfUp(o[1]);
        w.bottom = roundHalfUp(o[3]);
        out->push_back(w);
    }
}

void KFTracker::predict(const IN_IMAGE&, std::vector<DetectionWindow>* out)
{
    for (size_t j = 0; j < kfFaces.size(); ++j) {
        if (!kfFaces.alive[j]) continue;
        TrackFace& f = kfFaces.items[j];
        f.state = F * f.state;
        f.covariance = F * f.covariance * F.transpose() + Q;
        if (!out) continue;
        DetectionWindow w{};
        w.left = roundHalfUp(f.state[0]);
        w.right = roundHalfUp(f.state[2]);
        w.top = roundHalfUp(f.state[1]);
        w.bottom = roundHalfUp(f.state[3]);
        out->push_back(w);
    }
}

void KFTracker::update(const IN_IMAGE&, const std::vector<DetectionWindow>& detections)
{
    const size_t m = detections.size();
    const size_t n = kfFaces.size();

    // Scores on the truncated state; predict reports the rounded one.
    const std::vector<int> assignment = matchDetections(
        detections, n, [&](size_t j) { return bool(kfFaces.alive[j]); },
        [&](size_t j) {
            const Eigen::VectorXf& s = kfFaces.items[j].state;
            DetectionWindow w{};
            w.left = toInt(s[0]);
            w.right = toInt(s[2]);
            w.top = toInt(s[1]);
            w.bottom = toInt(s[3]);
            return w;
        },
        true);

    std::vector<bool> seen(n + m, false);
    for (size_t i = 0; i < m; ++i) {
        const DetectionWindow& d = detections[i];
        Eigen::VectorXf z(4);
        z << float(d.left), float(d.top), float(d.right), float(d.bottom);
        const int j = assignment[i];
        if (j < 0) {
            TrackFace f;
            f.state.head(4) = z;
            f.observation = z;
            const uint32_t slot = kfFaces.insert(f);
            if (slot < seen.size()) seen[slot] = true;
            continue;
        }
        TrackFace& f = kfFaces.items[size_t(j)];
        f.observation = z;
        const Eigen::VectorXf y = z - H * f.state;
        const Eigen::MatrixXf S = H * f.covariance * H.transpose() + R;
        const Eigen::MatrixXf K = f.covariance * H.transpose() * S.inverse();
        f.state = f.state + K * y;
        f.covariance = (Eigen::MatrixXf::Identity(6, 6) - K * H) * f.covariance;
        seen[size_t(j)] = true;
    }

    // Unlike the simple tracker, only live slots are freed, so each index
    // stands on the free stack at most once.
    removeUnseen(kfFaces, seen, true);

    ++frameCounter;
}

std::string KFTracker::name() const { return "KF_TRACKER"; }

Tracker* KFTracker::create(const std::string& parameters) { return createFromText<KFTracker>(parameters); }
