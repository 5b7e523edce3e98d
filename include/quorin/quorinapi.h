#ifndef QUORIN_QUORINAPI_H
#define QUORIN_QUORINAPI_H

/*
 * libquorinapi: on-device face detection and tracking, C entry points.
 *
 * One session per process, meant to be driven from one thread at a time,
 * quorin_init and quorin_release included. As a safety guard the session has
 * one lock, held for the whole of every entry: calls from several threads at
 * once run one after the other instead of corrupting the session. A
 * quorin_release while another thread detects waits for that detection and
 * then closes the session; calls after it behave as without a session. The
 * guard gives no order between threads: a host that interleaves them still
 * gets each thread's frames mixed with the others' (the orientation search and
 * the tracker follow one stream of frames). Frames are 8-bit gray,
 * width*height bytes without row padding.
 *
 * Result blocks. Every face is reported as a block of 17 ints at
 * results + 17*k, best score first:
 *   [0] roll angle in degrees   [1],[2] untouched
 *   [3] top  [4] bottom  [5] left  [6] right
 *   [7],[8] left eye   [9],[10] right eye
 *   [11],[12] left mouth corner  [13],[14] right mouth corner  [15],[16] nose
 * "Left" is the image's left. Blocks are written for k < min(faces found,
 * maxFaces, 100), with maxFaces taken as unsigned; nothing else in `results`
 * is touched.
 *
 * Rules shared by the seven detect entries (image, width, height, results,
 * maxFaces):
 *   requires: `image` writable and width*height bytes: the entries may write
 *     the turned work frame back into it. `results` room for 17*maxFaces ints
 *     when maxFaces > 0 (the Scaled entries map that many blocks when more
 *     than 100 faces are found), for 17*100 ints when maxFaces < 0; it may be
 *     null when maxFaces is 0.
 *   ensures: returns min(faces found, maxFaces), compared as signed ints: so
 *     maxFaces 0 runs the detection and returns 0 with nothing written, and a
 *     negative maxFaces writes up to 100 blocks and returns that negative
 *     number (the Scaled entries then leave the blocks in pixels, unmapped).
 *     Without a session (before quorin_init, after quorin_release) returns 0
 *     at once and touches nothing, whatever the arguments.
 *   throws: errors leave as C++ exceptions of the engine's runtime; a host
 *     that calls from C must not let one reach it (build the calling layer as
 *     C++ and catch there, with a catch (const char*) beside catch (...)).
 *     The classes are declared in <quorin/Errors.h> and <quorin/ApiError.h>.
 *     This is everything that can leave a detect entry:
 *     - qv_invalid_argument, before any session state changes: a null
 *       `image` ("quorin: frame pointer is null"), width or height <= 0
 *       ("quorin: frame width and height must be positive"), width*height
 *       above INT32_MAX ("quorin: frame too large"), a null `results` with
 *       maxFaces != 0 ("quorin: result pointer is null");
 *     - ApiError "QVFace Detection API not initialized properly" in a session
 *       whose quorin_init failed;
 *     - ApiError "QVFace Detection API detect error" when the engine fails on
 *       the frame (a standard exception inside it, std::bad_alloc included),
 *       "QVFace Detection API set face size range error" when it refuses the
 *       frame's face sizes, and, from the 360 entries, the mode errors of
 *       quorin_setDetectionMode;
 *     - the C string "memory allocation failure" (a const char*, not an
 *       exception object) when the image memory for a frame larger than any
 *       before can't be had; the session stays usable;
 *     - std::bad_alloc from the 360 tracking entries when the copy of a frame
 *       larger than any before (above 1 MiB) can't be had;
 *     - the C string "Error: Sid searched out of range!" (a const char*) if
 *       the merging of hits ever found its links broken: a guard that no frame
 *       is known to reach;
 *     - std::invalid_argument "No value available for the input landmark" if
 *       the landmark locator left a point out: a guard that the built-in
 *       models never reach.
 *     Every ApiError carries its text in a std::string: when the heap can't
 *     even hold that, std::bad_alloc leaves in its place, from any entry but
 *     quorin_release.
 */

#include "quorin/export.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Opens the session: loads the built-in models and selects detection mode 2.
 * ensures: an open session in mode 2, orientation unknown (-1). A session that
 *   is already open is closed first.
 * throws: ApiError "QVFace Detection API initialization error" when the models
 *   or the configuration can't be loaded (memory for them included); the
 *   session is then open but unusable (the detect entries raise "QVFace
 *   Detection API not initialized properly") until quorin_release or a new
 *   quorin_init. std::bad_alloc when the session's own buffers (under 2 MiB)
 *   can't be had, with the same unusable session. The C string "memory
 *   allocation failure" (a const char*) if image memory of the models can't
 *   be had. Nothing else. */
QUORIN_EXPORT void quorin_init(void);

/* Closes the session and frees all its memory.
 * ensures: no session; without one this does nothing. While another thread
 *   is inside an entry, waits until that call has returned. Never throws. */
QUORIN_EXPORT void quorin_release(void);

/* Selects the detection mode: 0 fast (work frame long side 240, no tracker),
 * 1 tracking (320, Kalman tracker), 2 thorough (640, no tracker).
 * ensures: the current mode again changes nothing at all (the tracker keeps
 *   its faces). A new mode 0..2 is set and discards the tracked faces. Any
 *   other value keeps the mode. Except for the current mode, the history of
 *   result blocks is cleared.
 * throws: ApiError "QVFace Detection API not initialized properly" for a new
 *   mode 0..2 without a session; ApiError "QVFace Detection API set search
 *   step error" or "QVFace Detection API set mode error" in a session whose
 *   quorin_init failed (and the latter if the new tracker's memory can't be
 *   had). Nothing else. */
QUORIN_EXPORT void quorin_setDetectionMode(unsigned int mode);

/* Detects faces in the frame turned clockwise by `rotation` (0, 90, 180, 270;
 * any other value leaves the frame unturned), after shrinking it to the long
 * side of the current mode. Coordinates are pixels of the turned frame at its
 * full size. See the shared rules above. */
QUORIN_EXPORT int quorin_detect(unsigned char* image, int width, int height,
                                int* results, int maxFaces, int rotation);

/* As quorin_detect, with coordinates mapped to -1000..1000 on the axes of the
 * unturned frame. */
QUORIN_EXPORT int quorin_detectScaled(unsigned char* image, int width, int height,
                                      int* results, int maxFaces, int rotation);

/* Orientation search: while the orientation is unknown, tries the rotations
 * 0, 90, 180, 270 in mode 0 on a copy of the frame and keeps the first with
 * faces; once known, detects at it in mode 1 (tracking). After a successful
 * search five frames may pass without faces; after them the first empty frame
 * makes the orientation unknown again. Coordinates as quorin_detect. */
QUORIN_EXPORT int quorin_detect360Tracking(unsigned char* image, int width, int height,
                                           int* results, int maxFaces);
/* As quorin_detect360Tracking, coordinates as quorin_detectScaled. */
QUORIN_EXPORT int quorin_detect360TrackingScaled(unsigned char* image, int width, int height,
                                                 int* results, int maxFaces);

/* Orientation search in mode 2: tries up to four rotations, starting at the
 * one that worked last and going on by 90 degrees, on the host's frame itself
 * (a turned attempt may leave the frame turned for the next one). No faces at
 * all four makes the orientation unknown. Coordinates as quorin_detect. */
QUORIN_EXPORT int quorin_detect360High(unsigned char* image, int width, int height,
                                       int* results, int maxFaces);
/* As quorin_detect360High, coordinates as quorin_detectScaled. */
QUORIN_EXPORT int quorin_detect360HighScaled(unsigned char* image, int width, int height,
                                             int* results, int maxFaces);

/* As quorin_detect360TrackingScaled, then stores the orientation in use (0,
 * 90, 180, 270, or -1 after a search that found nothing) in *orientation.
 * Without a session it stores the last session's orientation (0 before any).
 * throws: qv_invalid_argument "quorin: orientation pointer is null" first,
 *   then what quorin_detect360TrackingScaled throws. */
QUORIN_EXPORT int quorin_detect360TrackingScaled_ornt(unsigned char* image, int width, int height,
                                                      int* results, int maxFaces, int* orientation);

#ifdef __cplusplus
}
#endif

#endif
