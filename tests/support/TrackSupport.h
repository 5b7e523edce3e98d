#ifndef QUORIN_TESTS_TRACKSUPPORT_H
#define QUORIN_TESTS_TRACKSUPPORT_H

#include <vector>

#include "image/DetectionWindow.h"

// Windows are written left, top, right, bottom in the tests, like the records.
inline DetectionWindow makeWindow(int left, int top, int right, int bottom)
{
    DetectionWindow w{};
    w.left = left;
    w.right = right;
    w.top = top;
    w.bottom = bottom;
    return w;
}

inline bool sameWindow(const DetectionWindow& a, const DetectionWindow& b)
{
    return a.left == b.left && a.right == b.right && a.top == b.top && a.bottom == b.bottom;
}

#endif
