#ifndef QUORIN_QUORINAPI_H
#define QUORIN_QUORINAPI_H

/*
 * libquorinapi: on-device face detection and tracking.
 *
 * One session per process, driven from one thread at a time. Frames are 8-bit
 * gray, width*height bytes without row padding. Every face is reported as a block
 * of 17 ints at results + 17*k, best score first:
 *   [0] roll angle in degrees   [1],[2] untouched
 *   [3] top  [4] bottom  [5] left  [6] right
 *   [7],[8] left eye   [9],[10] right eye
 *   [11],[12] left mouth corner  [13],[14] right mouth corner  [15],[16] nose
 * At most 100 faces are written per call. The detect entries may overwrite the
 * frame they are given (a rotated work frame is written back into it).
 * Errors inside the engine leave these functions as C++ exceptions.
 */

#include "quorin/export.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Opens the session: loads the built-in models and selects detection mode 2. */
QUORIN_EXPORT void quorin_init(void);

/* Closes the session; a second call does nothing. */
QUORIN_EXPORT void quorin_release(void);

/* 0: fast (long side 240), 1: tracking (320, Kalman tracker), 2: high (640).
 * Requires an open session for any mode other than the current one. */
QUORIN_EXPORT void quorin_setDetectionMode(unsigned int mode);

/* Detects faces in a frame turned clockwise by rotation (0, 90, 180, 270);
 * coordinates are pixels of the rotated frame. Returns the number of faces
 * (min(found, maxFaces)); 0 without a session. */
QUORIN_EXPORT int quorin_detect(unsigned char* image, int width, int height,
                                int* results, int maxFaces, int rotation);

/* As quorin_detect, with coordinates mapped to -1000..1000 on the axes of the
 * unrotated frame. */
QUORIN_EXPORT int quorin_detectScaled(unsigned char* image, int width, int height,
                                      int* results, int maxFaces, int rotation);

/* Orientation-searching entries: try the four rotations until faces appear and
 * remember the one that worked. Tracking variants follow it in mode 1; High
 * variants search in mode 2. */
QUORIN_EXPORT int quorin_detect360Tracking(unsigned char* image, int width, int height,
                                           int* results, int maxFaces);
QUORIN_EXPORT int quorin_detect360TrackingScaled(unsigned char* image, int width, int height,
                                                 int* results, int maxFaces);
QUORIN_EXPORT int quorin_detect360High(unsigned char* image, int width, int height,
                                       int* results, int maxFaces);
QUORIN_EXPORT int quorin_detect360HighScaled(unsigned char* image, int width, int height,
                                             int* results, int maxFaces);

/* As quorin_detect360TrackingScaled; stores the orientation in use (or -1). */
QUORIN_EXPORT int quorin_detect360TrackingScaled_ornt(unsigned char* image, int width, int height,
                                                      int* results, int maxFaces, int* orientation);

#ifdef __cplusplus
}
#endif

#endif
