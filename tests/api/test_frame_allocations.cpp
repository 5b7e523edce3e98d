// Heap traffic of one frame through the C API once the session is warm. This
// binary replaces the global operator new and, through the linker's --wrap,
// the malloc family of the library's objects, and counts the bytes every
// request asks for. Frame-sized buffers belong to their owners and are reused,
// so a warm frame may ask only for the small strings of the face records.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <string>
#include <vector>

#include "StbImageDecoder.h"

#include "api/FrameOps.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"
#include "support/ScriptedStages.h"

extern "C" {
void* __real_malloc(std::size_t size);
void* __real_calloc(std::size_t count, std::size_t size);
void* __real_realloc(void* pointer, std::size_t size);
void __real_free(void* pointer);
}

namespace {

bool g_counting = false;
std::size_t g_bytes = 0;
std::size_t g_requests = 0;

void note(std::size_t bytes) {
    if (!g_counting) return;
    g_bytes += bytes;
    ++g_requests;
}

}  // namespace

extern "C" {
void* __wrap_malloc(std::size_t size) {
    note(size);
    return __real_malloc(size);
}
void* __wrap_calloc(std::size_t count, std::size_t size) {
    note(count * size);
    return __real_calloc(count, size);
}
void* __wrap_realloc(void* pointer, std::size_t size) {
    note(size);
    return __real_realloc(pointer, size);
}
void __wrap_free(void* pointer) { __real_free(pointer); }
}

// Every form is replaced: under ASan the array and nothrow forms are the
// sanitizer's own, and a block they hand out must not reach our free.
void* operator new(std::size_t size) {
    note(size);
    if (void* p = __real_malloc(size == 0 ? 1 : size)) return p;
    throw std::bad_alloc();
}
void* operator new[](std::size_t size) { return operator new(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    note(size);
    return __real_malloc(size == 0 ? 1 : size);
}
void* operator new[](std::size_t size, const std::nothrow_t& tag) noexcept { return operator new(size, tag); }
void operator delete(void* p) noexcept { __real_free(p); }
void operator delete[](void* p) noexcept { __real_free(p); }
void operator delete(void* p, std::size_t) noexcept { __real_free(p); }
void operator delete[](void* p, std::size_t) noexcept { __real_free(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { __real_free(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { __real_free(p); }

namespace {

constexpr int kWidth = 640;
constexpr int kHeight = 480;
constexpr std::size_t kFrameBudget = 64 * 1024;

// A face photo of the clip set sampled to 640 x 480, or an empty frame when the data cache
// has not been fetched.
std::vector<unsigned char> facePhoto() {
    const std::string path = devdata::photo("franck_01829.jpg");
    int w = 0, h = 0, channels = 0;
    unsigned char* pixels = stbi_load(path.c_str(), &w, &h, &channels, 1);
    if (pixels == nullptr) return {};
    std::vector<unsigned char> frame(static_cast<std::size_t>(kWidth) * kHeight);
    resizeNearest(pixels, w, h, frame.data(), kWidth, kHeight);
    stbi_image_free(pixels);
    return frame;
}

struct FrameCost {
    std::size_t bytes;
    std::size_t requests;
    int faces;
};

// The costliest of `frames` frames after `warmUp` frames in `mode`.
FrameCost worstWarmFrame(std::vector<unsigned char> const& source, unsigned mode, int warmUp, int frames) {
    quorin_init();
    quorin_setDetectionMode(mode);
    std::vector<int> results(100 * 17);
    std::vector<unsigned char> frame(source);
    FrameCost worst{0, 0, 0};
    for (int i = 0; i < warmUp + frames; ++i) {
        frame = source;  // the entry may write the turned frame back
        g_bytes = g_requests = 0;
        g_counting = i >= warmUp;
        const int faces = quorin_detect(frame.data(), kWidth, kHeight, results.data(), 100, 0);
        g_counting = false;
        if (g_bytes >= worst.bytes) worst = FrameCost{g_bytes, g_requests, faces};
    }
    quorin_release();
    return worst;
}

TEST(FrameAllocations, WarmFramesStayUnderBudgetInEveryMode) {
    const std::vector<unsigned char> photo = facePhoto();
    if (photo.empty()) std::printf("face photo skipped: %s\n", devdata::missingNote().c_str());
    for (const auto& frame : {qtest::patternFrame(kWidth, kHeight), photo}) {
        if (frame.empty()) continue;
        for (unsigned mode = 0; mode <= 2; ++mode) {
            // Tracking visits its 12 search cells once before the count starts,
            // so that every cell's hits have grown the lists once.
            const FrameCost cost = worstWarmFrame(frame, mode, 14, 12);
            SCOPED_TRACE((frame == photo ? "face photo, mode " : "pattern, mode ") + std::to_string(mode));
            EXPECT_LT(cost.bytes, kFrameBudget) << cost.requests << " requests, " << cost.faces << " faces";
            if (frame == photo) {
                EXPECT_GT(cost.faces, 0) << "the photo should exercise the face path";
            }
        }
    }
}

}  // namespace
