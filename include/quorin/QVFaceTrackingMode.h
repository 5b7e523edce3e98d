#ifndef QUORIN_QVFACETRACKINGMODE_H
#define QUORIN_QVFACETRACKINGMODE_H

// Which tracker follows faces between frames. 0 or any value outside 1..4
// means none.
enum QVFaceTrackingMode : int {
    QV_TRACKING_NONE = 0,
    QV_TRACKING_SIMPLE = 1,
    QV_TRACKING_KF = 2,
    QV_TRACKING_PF = 3,
    QV_TRACKING_CPF = 4,
};

#endif
