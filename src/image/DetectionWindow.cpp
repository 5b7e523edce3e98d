#include "image/DetectionWindow.h"

#include <algorithm>

float DetectionWindow::Overlap(DetectionWindow const& other) const
{
    const int32_t iw = std::min(right, other.right) - std::max(left, other.left);
    const int32_t ih = std::min(bottom, other.bottom) - std::max(top, other.top);
    if (iw <= 0 || ih <= 0)
        return 0.0f;
    const double inter = static_cast<double>(static_cast<float>(iw) * static_cast<float>(ih));
    const double areaA = static_cast<double>(width()) * static_cast<double>(height());
    const double areaB = static_cast<double>(other.width()) * static_cast<double>(other.height());
    return static_cast<float>(inter / (areaB + areaA - inter));
}
