#ifndef QUORIN_TRACKING_KFTRACKER_H
#define QUORIN_TRACKING_KFTRACKER_H

#include <string>
#include <vector>

#include <Eigen/Dense>

#include "tracking/Tracker.h"

// "KF_TRACKER": one linear Kalman filter per face over the four edges and a
// two-component velocity. Association is the simple tracker's; the position
// between detections is the filter state, and predict advances it.
class KFTracker : public Tracker {
public:
    struct TrackFace {
        Eigen::VectorXf state;      // left, top, right, bottom, vx, vy
        Eigen::MatrixXf covariance; // P
        Eigen::VectorXf observation; // last measurement: left, top, right, bottom

        TrackFace();
    };

    KFTracker();
    ~KFTracker() override = default;

    // Appends the last measurement of each live face (not the estimate),
    // each component rounded by int(v + 0.5f).
    void getPreviousFaces(std::vector<DetectionWindow>* out) override;
    // Advances every live filter one step and appends the predicted windows.
    void predict(const IN_IMAGE& image, std::vector<DetectionWindow>* out) override;
    // Association on the truncated state, then Kalman correction of the
    // matched faces; unmatched faces die, each freed exactly once.
    void update(const IN_IMAGE& image, const std::vector<DetectionWindow>& detections) override;
    std::string name() const override;

    static Tracker* create(const std::string& parameters);

    QVArrayList<TrackFace> kfFaces;

    // Model matrices shared by all instances; every constructor writes them
    // again with the same values.
    static Eigen::MatrixXf F; // transition, 6 x 6
    static Eigen::MatrixXf Q; // process noise, 6 x 6
    static Eigen::MatrixXf H; // measurement, 4 x 6
    static Eigen::MatrixXf R; // measurement noise, 4 x 4
};

#endif
