// Heap traffic of one frame through the C API once the session is warm, and
// what leaves the entries when the heap refuses. This binary replaces the
// global operator new and, through the linker's --wrap, the malloc family of
// the library's objects, counts the bytes every request asks for and can
// refuse large requests. Frame-sized buffers belong to their owners and are
// reused, so a warm frame may ask only for the small strings of the face records.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <string>
#include <vector>

#include "StbImageDecoder.h"

#include "api/FrameOps.h"
#include "api/Session.h"
#include "core/ApiError.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"
#include "support/ExpectThrow.h"
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
// Requests of g_refuseFrom to g_refuseTo bytes are refused.
std::size_t g_refuseFrom = SIZE_MAX;
std::size_t g_refuseTo = SIZE_MAX;
// Refuses only operator new, not the malloc family.
bool g_refuseNewOnly = false;

// False for a request that is to be refused.
bool note(std::size_t bytes) {
    if (g_counting) {
        g_bytes += bytes;
        ++g_requests;
    }
    return bytes < g_refuseFrom || bytes > g_refuseTo;
}

}  // namespace

extern "C" {
void* __wrap_malloc(std::size_t size) { return note(size) || g_refuseNewOnly ? __real_malloc(size) : nullptr; }
void* __wrap_calloc(std::size_t count, std::size_t size) {
    return note(count * size) || g_refuseNewOnly ? __real_calloc(count, size) : nullptr;
}
void* __wrap_realloc(void* pointer, std::size_t size) {
    return note(size) || g_refuseNewOnly ? __real_realloc(pointer, size) : nullptr;
}
void __wrap_free(void* pointer) { __real_free(pointer); }
}

// Every form is replaced: under ASan the array and nothrow forms are the
// sanitizer's own, and a block they hand out must not reach our free.
void* operator new(std::size_t size) {
    if (!note(size)) throw std::bad_alloc();
    if (void* p = __real_malloc(size == 0 ? 1 : size)) return p;
    throw std::bad_alloc();
}
void* operator new[](std::size_t size) { return operator new(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return note(size) ? __real_malloc(size == 0 ? 1 : size) : nullptr;
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

// Each kind of failure that an exhausted heap sends out of the entries, as
// quorinapi.h lists them.
TEST(MemoryFailures, LeaveTheEntriesAsTheirContractsSay) {
    std::vector<int> results(17);
    auto refusing = [](std::size_t from, auto call, std::size_t to = SIZE_MAX) {
        g_refuseFrom = from;
        g_refuseTo = to;
        try {
            call();
        } catch (...) {
            g_refuseFrom = g_refuseTo = SIZE_MAX;
            throw;
        }
        g_refuseFrom = g_refuseTo = SIZE_MAX;
    };
    // The engines' models: ApiError; the session's own buffers: std::bad_alloc.
    expectThrowWith<ApiError>([&] { refusing(1 << 20, [] { quorin_init(); }); },
                              "QVFace Detection API initialization error");
    // That session refuses frames and mode changes.
    expectThrowWith<ApiError>([] { quorin_setDetectionMode(sessionSnapshot().detectionMode == 1 ? 2u : 1u); },
                              "QVFace Detection API set search step error");
    EXPECT_THROW(refusing(kOrientationFrameBytes, [] { quorin_init(); }, kOrientationFrameBytes), std::bad_alloc);
    quorin_init();
    std::vector<unsigned char> frame = qtest::patternFrame(64, 48);
    quorin_detect(frame.data(), 64, 48, results.data(), 1, 0);
    // A larger integral image than the session had: the text.
    frame = qtest::patternFrame(kWidth, kHeight);
    try {
        refusing(1 << 20, [&] { quorin_detect(frame.data(), kWidth, kHeight, results.data(), 1, 0); });
        ADD_FAILURE() << "no failure";
    } catch (const char* text) {
        EXPECT_STREQ(text, "memory allocation failure");
    }
    // A frame larger than the orientation copy: std::bad_alloc.
    frame = qtest::patternFrame(1500, 1000);
    EXPECT_THROW(refusing(1500 * 1000, [&] { quorin_detect360Tracking(frame.data(), 1500, 1000, results.data(), 1); }),
                 std::bad_alloc);
    // The engines' own small requests: ApiError with the text of the step.
    g_refuseNewOnly = true;
    quorin_setDetectionMode(2);
    expectThrowWith<ApiError>([&] { refusing(256, [] { quorin_setDetectionMode(1); }); },
                              "QVFace Detection API set mode error");
    const std::vector<unsigned char> photo = facePhoto();
    if (!photo.empty()) {
        quorin_setDetectionMode(0);
        frame = photo;
        expectThrowWith<ApiError>(
            [&] { refusing(256, [&] { quorin_detect(frame.data(), kWidth, kHeight, results.data(), 1, 0); }); },
            "QVFace Detection API detect error");
    }
    g_refuseNewOnly = false;
    // None of it broke the session.
    frame = qtest::patternFrame(kWidth, kHeight);
    EXPECT_NO_THROW(quorin_detect(frame.data(), kWidth, kHeight, results.data(), 1, 0));
    quorin_release();
}

}  // namespace
