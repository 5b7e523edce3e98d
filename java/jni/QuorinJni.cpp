// JNI glue of quorin.Detector over the C entry points. The Java side passes
// camera planes (a direct ByteBuffer or a byte[]) with a row stride; the glue
// checks them, copies the rows into a buffer the calling thread keeps, calls
// the entry and hands back the result blocks. Nothing the engine throws may
// cross into the VM: every C++ exception, the C strings included, becomes a
// Java exception with the engine's message.

#include <jni.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "quorin/Errors.h"
#include "quorin/quorinapi.h"

namespace {

constexpr int kBlockInts = 17;
constexpr int kMaxFaces = 100;

// Entries in the order of quorin.Detector's entry numbers.
enum Entry {
  kDetect,
  kDetectScaled,
  kDetect360Tracking,
  kDetect360TrackingScaled,
  kDetect360High,
  kDetect360HighScaled,
  kDetect360TrackingScaledOrnt,
  kEntryCount
};

// The calling thread's frame copy and result blocks. The frame grows to the
// largest frame the thread has passed and is kept, so a camera stream
// allocates nothing per frame; per thread, so that threads calling at once
// meet only the session's own lock.
struct ThreadBuffers {
  std::vector<unsigned char> frame;
  int results[kBlockInts * kMaxFaces];
};
thread_local ThreadBuffers t_buffers;

void throwJava(JNIEnv* env, const char* className, const char* message) {
  if (env->ExceptionCheck()) return;  // the VM's own error (e.g. OutOfMemoryError) stands
  jclass cls = env->FindClass(className);
  if (cls != nullptr) env->ThrowNew(cls, message);
}

// Runs `call`, turning whatever it throws into a pending Java exception: the
// host's bad arguments into IllegalArgumentException, memory into
// OutOfMemoryError, every other engine failure into IllegalStateException.
template <typename R, typename F>
R guarded(JNIEnv* env, R failed, F&& call) {
  try {
    return call();
  } catch (const qv_invalid_argument& e) {
    throwJava(env, "java/lang/IllegalArgumentException", e.what());
  } catch (const std::bad_alloc&) {
    throwJava(env, "java/lang/OutOfMemoryError", "quorin: out of memory");
  } catch (const std::exception& e) {
    throwJava(env, "java/lang/IllegalStateException", e.what());
  } catch (const char* text) {
    const bool memory = text != nullptr && std::strcmp(text, "memory allocation failure") == 0;
    throwJava(env, memory ? "java/lang/OutOfMemoryError" : "java/lang/IllegalStateException",
              text != nullptr ? text : "quorin: engine failure");
  } catch (...) {
    throwJava(env, "java/lang/IllegalStateException", "quorin: unknown engine failure");
  }
  return failed;
}

[[noreturn]] void badArgument(const std::string& message) { throw qv_invalid_argument(message); }

// Where the frame's bytes are: a direct buffer's memory from `offset` to
// `limit`, or a Java array.
struct Source {
  const unsigned char* direct = nullptr;
  jbyteArray array = nullptr;
  int64_t available = 0;
};

Source frameSource(JNIEnv* env, jobject buffer, jbyteArray array, jint offset, jint limit) {
  Source s;
  if (buffer != nullptr) {
    auto* base = static_cast<unsigned char*>(env->GetDirectBufferAddress(buffer));
    if (base == nullptr) badArgument("quorin: the ByteBuffer is not direct (use a direct buffer or a byte[])");
    const int64_t capacity = env->GetDirectBufferCapacity(buffer);
    if (offset < 0 || offset > limit || limit > capacity) badArgument("quorin: the ByteBuffer's position or limit is out of range");
    s.direct = base + offset;
    s.available = static_cast<int64_t>(limit) - offset;
  } else if (array != nullptr) {
    s.array = array;
    s.available = env->GetArrayLength(array);
  } else {
    badArgument("quorin: frame is null");
  }
  return s;
}

// Checks the frame's geometry against its bytes and copies its rows, without
// their padding, into the thread's buffer. The last row need not be padded (a
// camera plane's often is not).
unsigned char* copyFrame(JNIEnv* env, const Source& src, jint width, jint height, jint rowStride) {
  if (width <= 0 || height <= 0) badArgument("quorin: frame width and height must be positive");
  if (rowStride < width) badArgument("quorin: row stride " + std::to_string(rowStride) + " is smaller than the width " + std::to_string(width));
  const int64_t bytes = static_cast<int64_t>(width) * height;
  if (bytes > std::numeric_limits<int32_t>::max()) badArgument("quorin: frame too large");
  const int64_t needed = static_cast<int64_t>(rowStride) * (height - 1) + width;
  if (needed > src.available)
    badArgument("quorin: frame of " + std::to_string(width) + "x" + std::to_string(height) + " at row stride " +
                std::to_string(rowStride) + " needs " + std::to_string(needed) + " bytes, the buffer holds " +
                std::to_string(src.available));
  std::vector<unsigned char>& frame = t_buffers.frame;
  if (frame.size() < static_cast<std::size_t>(bytes)) frame.resize(static_cast<std::size_t>(bytes));
  unsigned char* out = frame.data();
  const bool packed = rowStride == width;
  for (jint y = 0; y < (packed ? 1 : height); ++y) {
    const int64_t from = static_cast<int64_t>(y) * rowStride;
    const int64_t count = packed ? bytes : width;
    unsigned char* to = out + static_cast<std::size_t>(y) * static_cast<std::size_t>(width);
    if (src.direct != nullptr)
      std::memcpy(to, src.direct + from, static_cast<std::size_t>(count));
    else
      env->GetByteArrayRegion(src.array, static_cast<jsize>(from), static_cast<jsize>(count), reinterpret_cast<jbyte*>(to));
  }
  return out;
}

int runEntry(jint entry, unsigned char* frame, jint width, jint height, jint rotation, int& orientation) {
  int* out = t_buffers.results;
  switch (entry) {
    case kDetect: return quorin_detect(frame, width, height, out, kMaxFaces, rotation);
    case kDetectScaled: return quorin_detectScaled(frame, width, height, out, kMaxFaces, rotation);
    case kDetect360Tracking: return quorin_detect360Tracking(frame, width, height, out, kMaxFaces);
    case kDetect360TrackingScaled: return quorin_detect360TrackingScaled(frame, width, height, out, kMaxFaces);
    case kDetect360High: return quorin_detect360High(frame, width, height, out, kMaxFaces);
    case kDetect360HighScaled: return quorin_detect360HighScaled(frame, width, height, out, kMaxFaces);
    case kDetect360TrackingScaledOrnt:
      return quorin_detect360TrackingScaled_ornt(frame, width, height, out, kMaxFaces, &orientation);
    default: badArgument("quorin: unknown detect entry " + std::to_string(entry));
  }
}

}  // namespace

extern "C" {

JNIEXPORT void JNICALL Java_quorin_Detector_nativeInit(JNIEnv* env, jclass) {
  guarded(env, 0, [] {
    quorin_init();
    return 0;
  });
}

JNIEXPORT void JNICALL Java_quorin_Detector_nativeRelease(JNIEnv*, jclass) { quorin_release(); }

JNIEXPORT void JNICALL Java_quorin_Detector_nativeSetMode(JNIEnv* env, jclass, jint mode) {
  guarded(env, 0, [mode] {
    quorin_setDetectionMode(static_cast<unsigned>(mode));
    return 0;
  });
}

// Returns {orientation, blocks of 17 ints per face...}, or null with a Java
// exception pending.
JNIEXPORT jintArray JNICALL Java_quorin_Detector_nativeDetect(JNIEnv* env, jclass, jint entry, jobject buffer,
                                                              jbyteArray array, jint offset, jint limit, jint width,
                                                              jint height, jint rowStride, jint rotation) {
  return guarded(env, static_cast<jintArray>(nullptr), [&]() -> jintArray {
    if (entry < 0 || entry >= kEntryCount) badArgument("quorin: unknown detect entry " + std::to_string(entry));
    if (rotation != 0 && rotation != 90 && rotation != 180 && rotation != 270)
      badArgument("quorin: rotation must be 0, 90, 180 or 270, not " + std::to_string(rotation));
    const Source src = frameSource(env, buffer, array, offset, limit);
    unsigned char* frame = copyFrame(env, src, width, height, rowStride);
    if (env->ExceptionCheck()) return nullptr;
    int orientation = -1;
    int n = runEntry(entry, frame, width, height, rotation, orientation);
    n = n < 0 ? 0 : (n > kMaxFaces ? kMaxFaces : n);
    jintArray out = env->NewIntArray(1 + kBlockInts * n);
    if (out == nullptr) return nullptr;  // OutOfMemoryError pending
    const jint head = orientation;
    env->SetIntArrayRegion(out, 0, 1, &head);
    env->SetIntArrayRegion(out, 1, kBlockInts * n, t_buffers.results);
    return out;
  });
}

}  // extern "C"
