// The exported entry points: each forwards to the process's one session, which
// serialises the calls (see api/Session.h). Exceptions are not caught here;
// they leave through the entry to the host.

#include "api/Session.h"
#include "core/Errors.h"
#include "quorin/quorinapi.h"

extern "C" {

void quorin_init(void) { processSession().init(); }

void quorin_release(void) { processSession().release(); }

void quorin_setDetectionMode(unsigned int mode) { processSession().setDetectionMode(mode); }

int quorin_detect(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation) {
    return processSession().detect(image, width, height, results, maxFaces, rotation, false);
}

int quorin_detectScaled(unsigned char* image, int width, int height, int* results, int maxFaces, int rotation) {
    return processSession().detect(image, width, height, results, maxFaces, rotation, true);
}

int quorin_detect360Tracking(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return processSession().detect360Tracking(image, width, height, results, maxFaces, false, nullptr);
}

int quorin_detect360TrackingScaled(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return processSession().detect360Tracking(image, width, height, results, maxFaces, true, nullptr);
}

int quorin_detect360High(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return processSession().detect360High(image, width, height, results, maxFaces, false);
}

int quorin_detect360HighScaled(unsigned char* image, int width, int height, int* results, int maxFaces) {
    return processSession().detect360High(image, width, height, results, maxFaces, true);
}

int quorin_detect360TrackingScaled_ornt(unsigned char* image, int width, int height, int* results, int maxFaces,
                                        int* orientation) {
    if (orientation == nullptr) throw qv_invalid_argument("quorin: orientation pointer is null");
    return processSession().detect360Tracking(image, width, height, results, maxFaces, true, orientation);
}

}  // extern "C"
