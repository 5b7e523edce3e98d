#include "image/IntegralImage.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>

#include "image/Image.h"

namespace {

const char* const kAllocationFailure = "memory allocation failure";

// Entries needed for a pixel size, or -1 when the request can't be held.
int64_t entriesFor(int width, int height)
{
    if (width < 0 || height < 0)
        return -1;
    const int64_t entries = (static_cast<int64_t>(width) + 1) * (static_cast<int64_t>(height) + 1);
    if (entries > std::numeric_limits<int32_t>::max() / 8)
        return -1;
    return entries;
}

// Never changes once built, so every IN_IMAGE shares it.
float const* sharedSqrtTable()
{
    static const float* table = [] {
        static float values[65536];
        for (int i = 0; i < 65536; ++i)
            values[i] = static_cast<float>(std::sqrt(static_cast<double>(static_cast<float>(i))));
        return values;
    }();
    return table;
}

// What ComputeNorm makes of each entry of the square-root table, so that a
// window costs a lookup and no division.
float const* sharedInverseDeviationTable()
{
    static const float* table = [] {
        static float values[65536];
        float const* roots = sharedSqrtTable();
        for (int i = 0; i < 65536; ++i)
            values[i] = roots[i] < 1.0f ? 1.0f : 1.0f / roots[i];
        return values;
    }();
    return table;
}

// Four 32-bit or two 64-bit lanes: the compiler's generic vectors, which
// become SSE2 or NEON adds without asking for a vectorising optimisation level.
typedef uint32_t Lanes32 __attribute__((vector_size(16)));
typedef uint64_t Lanes64 __attribute__((vector_size(16)));

template <typename V, typename T>
inline void addLanes(T* row, T const* above)
{
    V a, b;
    std::memcpy(&a, row, sizeof a);
    std::memcpy(&b, above, sizeof b);
    a += b;
    std::memcpy(row, &a, sizeof a);
}

// row[x] += above[x] and rowSq[x] += aboveSq[x] for x below n.
void addRowAbove(uint32_t* row, uint32_t const* above, uint64_t* rowSq, uint64_t const* aboveSq, int n)
{
    int x = 0;
    for (; x + 4 <= n; x += 4) {
        addLanes<Lanes32>(row + x, above + x);
        addLanes<Lanes64>(rowSq + x, aboveSq + x);
        addLanes<Lanes64>(rowSq + x + 2, aboveSq + x + 2);
    }
    for (; x < n; ++x) {
        row[x] += above[x];
        rowSq[x] += aboveSq[x];
    }
}

} // namespace

// ---------------------------------------------------------------- I_IMAGE

I_IMAGE::I_IMAGE(int width, int height)
{
    Realloc(width, height);
}

I_IMAGE::~I_IMAGE()
{
    Release();
}

bool I_IMAGE::Realloc(int width, int height)
{
    const int64_t entries = entriesFor(width, height);
    if (entries < 0) {
        Release();
        return false;
    }
    if (entries > capacity) {
        uint32_t* fresh = static_cast<uint32_t*>(std::malloc(static_cast<size_t>(entries) * sizeof(uint32_t)));
        if (fresh == nullptr) {
            Release();
            return false;
        }
        std::free(data);
        data = fresh;
        capacity = static_cast<int32_t>(entries);
    }
    stride = width + 1;
    rows = height + 1;
    return true;
}

void I_IMAGE::Release()
{
    std::free(data);
    data = nullptr;
    stride = rows = capacity = 0;
}

void I_IMAGE::fill(int width, int height, int sourceStride, unsigned char const* pixels)
{
    const int s = stride;
    std::memset(data, 0, sizeof(uint32_t) * static_cast<size_t>(s));
    for (int y = 0; y < height; ++y) {
        unsigned char const* src = pixels + static_cast<std::ptrdiff_t>(y) * sourceStride;
        uint32_t const* above = data + static_cast<std::ptrdiff_t>(y) * s;
        uint32_t* row = data + static_cast<std::ptrdiff_t>(y + 1) * s;
        row[0] = 0;
        uint32_t running = 0;
        for (int x = 0; x < width; ++x) {
            running += src[x];
            row[x + 1] = above[x + 1] + running;
        }
    }
}

bool I_IMAGE::Init(int width, int height, int sourceStride, unsigned char const* pixels)
{
    if (width < 0 || height < 0 || (pixels == nullptr && width > 0 && height > 0) || sourceStride < width)
        return false;
    if (stride != width + 1 || rows != height + 1 || data == nullptr)
        if (!Realloc(width, height))
            return false;
    fill(width, height, sourceStride, pixels);
    return true;
}

bool I_IMAGE::Init(IMAGE const* image)
{
    if (image == nullptr)
        return false;
    return Init(image->width, image->height, image->stride, image->data);
}

float I_IMAGE::ComputeAvg(DetectionWindow const& w) const
{
    return ComputeAvg(w.left, w.top, w.right, w.bottom);
}

float I_IMAGE::ComputeAvg(int left, int top, int right, int bottom) const
{
    const uint32_t sum = data[bottom * stride + right] + data[top * stride + left] - data[bottom * stride + left] -
                         data[top * stride + right];
    return static_cast<float>(static_cast<double>(sum) /
                              (static_cast<double>(right - left) * static_cast<double>(bottom - top)));
}

void I_IMAGE::resampleFrom(IN_IMAGE const* source, int left, int top, float scale)
{
    if (source == nullptr || source->data == nullptr || data == nullptr)
        return;
    const int lastX = source->stride - 1;
    const int lastY = source->rows - 1;
    for (int i = 0; i < rows; ++i) {
        int sy = top + static_cast<int>(static_cast<double>(static_cast<float>(i) * scale) + 0.5);
        sy = std::min(std::max(sy, 0), lastY);
        uint32_t* row = data + static_cast<std::ptrdiff_t>(i) * stride;
        for (int j = 0; j < stride; ++j) {
            int sx = left + static_cast<int>(static_cast<double>(static_cast<float>(j) * scale) + 0.5);
            sx = std::min(std::max(sx, 0), lastX);
            row[j] = source->valueAt(sx, sy);
        }
    }
}

double I_IMAGE::interpolate(double x, double y) const
{
    const double fx0 = std::floor(x);
    const double fy0 = std::floor(y);
    // Reads stay inside the array even for a coordinate outside it.
    const int ix = static_cast<int>(std::min(std::max(fx0, 0.0), static_cast<double>(stride - 1)));
    const int iy = static_cast<int>(std::min(std::max(fy0, 0.0), static_cast<double>(rows - 1)));
    double fx = x - fx0;
    double fy = y - fy0;
    if (fx < 0.001 || ix + 1 >= stride)
        fx = 0.0;
    if (fy < 0.001 || iy + 1 >= rows)
        fy = 0.0;
    auto e = [this](int c, int r) { return static_cast<double>(data[r * stride + c]); };
    if (fx == 0.0 && fy == 0.0)
        return e(ix, iy);
    if (fx == 0.0)
        return e(ix, iy + 1) * fy + e(ix, iy) * (1.0 - fy);
    if (fy == 0.0)
        return e(ix + 1, iy) * fx + e(ix, iy) * (1.0 - fx);
    return (e(ix, iy) * (1.0 - fx) + e(ix + 1, iy) * fx) * (1.0 - fy) +
           (e(ix, iy + 1) * (1.0 - fx) + e(ix + 1, iy + 1) * fx) * fy;
}

void I_IMAGE::CropScaleToImage(IMAGE* target, DetectionWindow const* window) const
{
    if (target == nullptr || window == nullptr || data == nullptr)
        return;
    const int left = std::max(window->left, 0);
    const int top = std::max(window->top, 0);
    const int right = std::min(window->right, pixelWidth());
    const int bottom = std::min(window->bottom, pixelHeight());
    const int cropWidth = right - left;
    const int cropHeight = bottom - top;

    if (!(target->width > 0 && target->height > 0)) {
        if (!target->Realloc(std::max(cropWidth, 0), std::max(cropHeight, 0)))
            throw kAllocationFailure;
    }
    if (target->width <= 0 || target->height <= 0 || target->data == nullptr)
        return;
    if (cropWidth <= 0 || cropHeight <= 0) {
        // Nothing of the window lies in the image.
        target->ZeroImage();
        return;
    }

    const int tw = target->width;
    const int th = target->height;
    const double stepX = static_cast<double>(cropWidth) / tw;
    const double stepY = static_cast<double>(cropHeight) / th;
    const double area = stepX * stepY;

    double* buffers = static_cast<double*>(std::malloc(sizeof(double) * 2 * (static_cast<size_t>(tw) + 1)));
    if (buffers == nullptr)
        throw kAllocationFailure;
    double* previous = buffers;
    double* current = buffers + tw + 1;

    for (int j = 0; j <= tw; ++j)
        previous[j] = interpolate(left + j * stepX, top);
    for (int r = 1; r <= th; ++r) {
        const double y = top + r * stepY;
        for (int j = 0; j <= tw; ++j)
            current[j] = interpolate(left + j * stepX, y);
        unsigned char* out = target->data + static_cast<std::ptrdiff_t>(r - 1) * target->stride;
        for (int j = 0; j < tw; ++j) {
            double v = (current[j + 1] + previous[j] - previous[j + 1] - current[j]) / area + 0.5;
            v = std::min(std::max(v, 0.0), 255.0);
            out[j] = static_cast<unsigned char>(static_cast<unsigned>(v));
        }
        std::swap(previous, current);
    }
    std::free(buffers);
}

// ---------------------------------------------------------------- IN_IMAGE

IN_IMAGE::IN_IMAGE()
{
    sqrtTable = sharedSqrtTable();
    inverseDeviationTable = sharedInverseDeviationTable();
}

IN_IMAGE::IN_IMAGE(int width, int height)
{
    sqrtTable = sharedSqrtTable();
    inverseDeviationTable = sharedInverseDeviationTable();
    if (!Realloc(width, height))
        throw kAllocationFailure;
}

IN_IMAGE::~IN_IMAGE()
{
    Release();
}

bool IN_IMAGE::Realloc(int width, int height)
{
    const int64_t entries = entriesFor(width, height);
    if (entries < 0 || !I_IMAGE::Realloc(width, height)) {
        Release();
        throw kAllocationFailure;
    }
    if (entries > squaredCapacity) {
        uint64_t* fresh = static_cast<uint64_t*>(std::malloc(static_cast<size_t>(entries) * sizeof(uint64_t)));
        if (fresh == nullptr) {
            Release();
            throw kAllocationFailure;
        }
        std::free(squared);
        squared = fresh;
        squaredCapacity = static_cast<int32_t>(entries);
    }
    return true;
}

void IN_IMAGE::Release()
{
    std::free(squared);
    squared = nullptr;
    squaredCapacity = 0;
    sqrtTable = nullptr; // shared: dropped, not freed
    I_IMAGE::Release();
}

bool IN_IMAGE::Init(int width, int height, int sourceStride, unsigned char const* pixels)
{
    if (width < 0 || height < 0 || (pixels == nullptr && width > 0 && height > 0) || sourceStride < width)
        return false;
    if (sqrtTable == nullptr)
        sqrtTable = sharedSqrtTable();
    if (stride != width + 1 || rows != height + 1 || data == nullptr || squared == nullptr)
        Realloc(width, height);

    const int s = stride;
    std::memset(data, 0, sizeof(uint32_t) * static_cast<size_t>(s));
    std::memset(squared, 0, sizeof(uint64_t) * static_cast<size_t>(s));
    for (int y = 0; y < height; ++y) {
        unsigned char const* src = pixels + static_cast<std::ptrdiff_t>(y) * sourceStride;
        uint32_t const* above = data + static_cast<std::ptrdiff_t>(y) * s;
        uint32_t* row = data + static_cast<std::ptrdiff_t>(y + 1) * s;
        uint64_t const* aboveSq = squared + static_cast<std::ptrdiff_t>(y) * s;
        uint64_t* rowSq = squared + static_cast<std::ptrdiff_t>(y + 1) * s;
        row[0] = 0;
        rowSq[0] = 0;
        // The running sums are the only serial part: they go into the row
        // first, and the row above is added in a second, vectorisable loop.
        // Integer sums, so the split gives the same entries.
        uint32_t running = 0;
        uint64_t runningSq = 0;
        for (int x = 0; x < width; ++x) {
            const uint32_t p = src[x];
            running += p;
            runningSq += p * p;
            row[x + 1] = running;
            rowSq[x + 1] = runningSq;
        }
        addRowAbove(row + 1, above + 1, rowSq + 1, aboveSq + 1, width);
    }
    return true;
}

bool IN_IMAGE::Init(IMAGE const* image)
{
    if (image == nullptr)
        return false;
    return Init(image->width, image->height, image->stride, image->data);
}

float IN_IMAGE::ComputeNorm(DetectionWindow const& w) const
{
    const int tl = w.top * stride + w.left;
    const int tr = w.top * stride + w.right;
    const int bl = w.bottom * stride + w.left;
    const int br = w.bottom * stride + w.right;
    const uint32_t s = data[br] + data[tl] - data[bl] - data[tr];
    const uint64_t q = squared[br] + squared[tl] - squared[bl] - squared[tr];
    const double n = static_cast<double>(w.right - w.left) * static_cast<double>(w.bottom - w.top);
    const double variance = (static_cast<double>(q) * n - static_cast<double>(s) * static_cast<double>(s)) / (n * n);
    // 8-bit pixels keep the variance below 16,257; the guard only keeps a
    // degenerate window (zero area, NaN) from indexing outside the table.
    int index = 0;
    if (variance >= 1.0)
        index = variance < 65535.0 ? static_cast<int>(variance) : 65535;
    return inverseDeviationTable[index];
}
