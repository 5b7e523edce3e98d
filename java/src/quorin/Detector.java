package quorin;

import java.nio.ByteBuffer;
import java.util.List;

/**
 * The face detector of libquorinapi, for one 8-bit gray plane at a time (a
 * camera's Y plane). The library has one engine session per process: a
 * Detector opens it and {@link #close()} releases it, so at most one Detector is
 * open at a time; use try-with-resources.
 *
 * <p>Frames are a direct {@link ByteBuffer} (read from its position to its
 * limit) or a byte[], with width, height and the row stride in bytes; the last
 * row need not be padded. The frame is copied, never written. Calls from several
 * threads at once are safe (the engine runs them one after the other), but the
 * tracking mode and the 360 entries follow one stream of frames: drive them from
 * one thread.
 *
 * <p>Errors: bad arguments throw IllegalArgumentException, a closed detector or
 * an engine failure IllegalStateException, memory OutOfMemoryError, each with
 * the engine's message.
 */
public final class Detector implements AutoCloseable {
    /** Detection modes: work frame long side 240, 320 with a tracker, 640. */
    public enum Mode { FAST, TRACKING, HIGH }

    /** Faces and the orientation the 360 search settled on (0, 90, 180, 270; -1 when none). */
    public static final class Oriented {
        public final int orientation;
        public final List<Face> faces;

        Oriented(int orientation, List<Face> faces) {
            this.orientation = orientation;
            this.faces = faces;
        }
    }

    // Entry numbers of the glue (QuorinJni.cpp).
    private static final int DETECT = 0, DETECT_SCALED = 1, TRACKING_360 = 2, TRACKING_360_SCALED = 3,
            HIGH_360 = 4, HIGH_360_SCALED = 5, TRACKING_360_SCALED_ORNT = 6;

    static {
        // Older Android linkers do not find a library's dependencies in the
        // app's own folder: load the engine first where it is there to load.
        try {
            System.loadLibrary("quorinapi");
        } catch (UnsatisfiedLinkError e) {
            // found through libquorinjni's run path instead
        }
        System.loadLibrary("quorinjni");
    }

    private static final Object SESSION = new Object();
    private static Detector open;  // guarded by SESSION

    /**
     * Opens the engine session in mode HIGH.
     *
     * @throws IllegalStateException if another Detector is open, or the models can't be loaded
     */
    public Detector() {
        synchronized (SESSION) {
            if (open != null) throw new IllegalStateException("quorin: a Detector is already open in this process; close it first");
            try {
                nativeInit();
            } catch (RuntimeException | Error e) {
                nativeRelease();  // a failed init leaves the engine's session open but unusable
                throw e;
            }
            open = this;
        }
    }

    /** Releases the session; waits for a detection in progress on another thread. Repeated calls do nothing. */
    @Override
    public void close() {
        synchronized (SESSION) {
            if (open != this) return;
            open = null;
            nativeRelease();
        }
    }

    /** Selects the mode; a new mode discards the tracked faces. */
    public void setMode(Mode mode) {
        if (mode == null) throw new IllegalArgumentException("quorin: mode is null");
        requireOpen();
        nativeSetMode(mode.ordinal());
    }

    /** Faces in the frame turned clockwise by rotation (0, 90, 180, 270), in pixels of the turned frame. */
    public List<Face> detect(ByteBuffer frame, int width, int height, int rowStride, int rotation) {
        return faces(DETECT, frame, null, width, height, rowStride, rotation);
    }

    public List<Face> detect(byte[] frame, int width, int height, int rowStride, int rotation) {
        return faces(DETECT, null, frame, width, height, rowStride, rotation);
    }

    /** As detect, coordinates -1000..1000 on the axes of the frame as given. */
    public List<Face> detectScaled(ByteBuffer frame, int width, int height, int rowStride, int rotation) {
        return faces(DETECT_SCALED, frame, null, width, height, rowStride, rotation);
    }

    public List<Face> detectScaled(byte[] frame, int width, int height, int rowStride, int rotation) {
        return faces(DETECT_SCALED, null, frame, width, height, rowStride, rotation);
    }

    /** Searches the four rotations (mode FAST), then tracks at the one found; coordinates as detect. */
    public List<Face> detect360Tracking(ByteBuffer frame, int width, int height, int rowStride) {
        return faces(TRACKING_360, frame, null, width, height, rowStride, 0);
    }

    public List<Face> detect360Tracking(byte[] frame, int width, int height, int rowStride) {
        return faces(TRACKING_360, null, frame, width, height, rowStride, 0);
    }

    /** As detect360Tracking, coordinates as detectScaled. */
    public List<Face> detect360TrackingScaled(ByteBuffer frame, int width, int height, int rowStride) {
        return faces(TRACKING_360_SCALED, frame, null, width, height, rowStride, 0);
    }

    public List<Face> detect360TrackingScaled(byte[] frame, int width, int height, int rowStride) {
        return faces(TRACKING_360_SCALED, null, frame, width, height, rowStride, 0);
    }

    /** As detect360TrackingScaled, with the orientation in use. */
    public Oriented detect360TrackingScaledOrientation(ByteBuffer frame, int width, int height, int rowStride) {
        return oriented(run(TRACKING_360_SCALED_ORNT, frame, null, width, height, rowStride, 0));
    }

    public Oriented detect360TrackingScaledOrientation(byte[] frame, int width, int height, int rowStride) {
        return oriented(run(TRACKING_360_SCALED_ORNT, null, frame, width, height, rowStride, 0));
    }

    /** Tries up to four rotations in mode HIGH, from the one that worked last; coordinates as detect. */
    public List<Face> detect360High(ByteBuffer frame, int width, int height, int rowStride) {
        return faces(HIGH_360, frame, null, width, height, rowStride, 0);
    }

    public List<Face> detect360High(byte[] frame, int width, int height, int rowStride) {
        return faces(HIGH_360, null, frame, width, height, rowStride, 0);
    }

    /** As detect360High, coordinates as detectScaled. */
    public List<Face> detect360HighScaled(ByteBuffer frame, int width, int height, int rowStride) {
        return faces(HIGH_360_SCALED, frame, null, width, height, rowStride, 0);
    }

    public List<Face> detect360HighScaled(byte[] frame, int width, int height, int rowStride) {
        return faces(HIGH_360_SCALED, null, frame, width, height, rowStride, 0);
    }

    private List<Face> faces(int entry, ByteBuffer buffer, byte[] array, int width, int height, int rowStride,
                             int rotation) {
        return Face.fromBlocks(run(entry, buffer, array, width, height, rowStride, rotation), 1);
    }

    private static Oriented oriented(int[] blocks) {
        return new Oriented(blocks[0], Face.fromBlocks(blocks, 1));
    }

    private int[] run(int entry, ByteBuffer buffer, byte[] array, int width, int height, int rowStride, int rotation) {
        requireOpen();
        // A close on another thread after this check makes the engine return no faces.
        if (buffer != null)
            return nativeDetect(entry, buffer, null, buffer.position(), buffer.limit(), width, height, rowStride, rotation);
        return nativeDetect(entry, null, array, 0, 0, width, height, rowStride, rotation);
    }

    private void requireOpen() {
        synchronized (SESSION) {
            if (open != this) throw new IllegalStateException("quorin: the Detector is closed");
        }
    }

    private static native void nativeInit();

    private static native void nativeRelease();

    private static native void nativeSetMode(int mode);

    private static native int[] nativeDetect(int entry, ByteBuffer buffer, byte[] array, int offset, int limit,
                                             int width, int height, int rowStride, int rotation);
}
