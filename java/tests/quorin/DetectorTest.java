package quorin;

import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertThrows;
import static org.junit.jupiter.api.Assertions.assertTrue;
import static org.junit.jupiter.api.Assumptions.assumeTrue;

import java.io.File;
import java.nio.ByteBuffer;
import java.util.ArrayList;
import java.util.List;
import java.util.concurrent.Callable;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.function.Executable;

class DetectorTest {
    private static final String PHOTO = "tracking_faces_test.png";  // three people, 600x348, lossless

    private Detector detector;

    @BeforeEach
    void open() {
        detector = new Detector();
    }

    @AfterEach
    void close() {
        detector.close();
    }

    private static Detect.Gray photo() throws Exception {
        String root = System.getenv("QUORIN_DATA_DIR");
        if (root == null) root = System.getProperty("user.home") + "/.cache/quorin";
        File f = new File(root, "photos/" + PHOTO);
        assumeTrue(f.isFile(), "development data not found in " + root + " (run scripts/fetch-data.sh)");
        return Detect.loadGray(f.getPath());
    }

    private static String json(List<Face> faces) {
        StringBuilder s = new StringBuilder();
        for (Face f : faces) s.append(f.toJson()).append('\n');
        return s.toString();
    }

    private static double overlap(Face f, int left, int top, int right, int bottom) {
        double iw = Math.min(f.right, right) - Math.max(f.left, left);
        double ih = Math.min(f.bottom, bottom) - Math.max(f.top, top);
        if (iw <= 0 || ih <= 0) return 0;
        double union = (double) (f.right - f.left) * (f.bottom - f.top) + (double) (right - left) * (bottom - top) - iw * ih;
        return iw * ih / union;
    }

    // The photo at half size turned counter-clockwise, as a sensor held upright
    // delivers it (small enough for the engine's turn step in every mode), with
    // `pad` bytes of noise after every row but the last, in a direct buffer.
    private static ByteBuffer cameraPlane(Detect.Gray g, int shift, int pad) {
        int w = g.height / 2, h = g.width / 2 - shift, stride = w + pad;
        ByteBuffer plane = ByteBuffer.allocateDirect(stride * (h - 1) + w);
        for (int y = 0; y < h; ++y) {
            for (int x = 0; x < w; ++x) plane.put(y * stride + x, g.pixels[2 * x * g.width + g.width - 2 - 2 * (y + shift)]);
            for (int x = w; x < stride && y < h - 1; ++x) plane.put(y * stride + x, (byte) (x * 31 + y * 7));
        }
        return plane;
    }

    private static byte[] packed(ByteBuffer plane, int w, int h, int stride) {
        byte[] out = new byte[w * h];
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x) out[y * w + x] = plane.get(y * stride + x);
        return out;
    }

    @Test
    void findsTheThreePeopleOfTheGroupPhoto() throws Exception {
        Detect.Gray g = photo();
        List<Face> faces = detector.detect(g.pixels, g.width, g.height, g.width, 0);
        assertEquals(3, faces.size(), json(faces));
        int[][] people = {{448, 53, 556, 160}, {41, 80, 148, 188}, {224, 133, 325, 235}};
        for (int[] p : people) {
            Face best = faces.stream().max((a, b) -> Double.compare(overlap(a, p[0], p[1], p[2], p[3]),
                    overlap(b, p[0], p[1], p[2], p[3]))).get();
            assertTrue(overlap(best, p[0], p[1], p[2], p[3]) > 0.5, json(faces));
            assertTrue(best.leftEye.x < best.rightEye.x && best.nose.y < best.leftMouthCorner.y, best.toJson());
        }
        // The scaled entry maps the same faces onto -1000..1000.
        List<Face> scaled = detector.detectScaled(g.pixels, g.width, g.height, g.width, 0);
        assertEquals(faces.size(), scaled.size());
        assertEquals(2000L * faces.get(0).left / g.width - 1000, scaled.get(0).left);
    }

    @Test
    void paddedCameraFramesGiveTheFacesOfTheUnpaddedOnes() throws Exception {
        Detect.Gray g = photo();
        int w = g.height / 2, pad = 45;
        for (Detector.Mode mode : Detector.Mode.values()) {
            List<String> padded = new ArrayList<>(), unpadded = new ArrayList<>();
            List<ByteBuffer> planes = new ArrayList<>();
            for (int shift = 0; shift < 48; shift += 6) planes.add(cameraPlane(g, shift, pad));
            // Two passes over the same stream; a mode change in between clears the tracker.
            for (int pass = 0; pass < 2; ++pass) {
                detector.setMode(mode == Detector.Mode.FAST ? Detector.Mode.HIGH : Detector.Mode.FAST);
                detector.setMode(mode);
                for (int i = 0; i < planes.size(); ++i) {
                    ByteBuffer plane = planes.get(i);
                    int h = g.width / 2 - 6 * i;
                    if (pass == 0) {
                        ByteBuffer before = ByteBuffer.allocate(plane.capacity()).put(plane.duplicate());
                        padded.add(json(detector.detect(plane, w, h, w + pad, 90)));
                        assertEquals(before.flip(), plane, "the host's plane was written");
                    } else {
                        unpadded.add(json(detector.detect(packed(plane, w, h, w + pad), w, h, w, 90)));
                    }
                }
            }
            assertEquals(unpadded, padded, mode.toString());
            assertTrue(padded.get(0).contains("rect"), "no faces in the turned photo, " + mode);
        }
    }

    @Test
    void badArgumentsThrowAndLeaveTheDetectorUsable() throws Exception {
        byte[] small = new byte[100];
        Executable[] illegal = {
            () -> detector.detect((byte[]) null, 10, 10, 10, 0),
            () -> detector.detect((ByteBuffer) null, 10, 10, 10, 0),
            () -> detector.detect(ByteBuffer.allocate(100), 10, 10, 10, 0),   // not direct
            () -> detector.detect(small, 10, 10, 9, 0),                        // stride below width
            () -> detector.detect(small, 0, 10, 10, 0),
            () -> detector.detect(small, 10, -1, 10, 0),
            () -> detector.detect(small, 10, 11, 10, 0),                       // short by a row
            () -> detector.detect(small, 10, 10, 11, 0),                       // padded rows need 109
            () -> detector.detect((ByteBuffer) ByteBuffer.allocateDirect(100).position(1), 10, 10, 10, 0),
            () -> detector.detect(small, 10, 10, Integer.MAX_VALUE, 0),        // stride * height overflows int
            () -> detector.detect(small, 65536, 65536, 65536, 0),              // beyond the engine's frame size
            () -> detector.detect(small, 10, 10, 10, 45),
            () -> detector.detect360High(small, 10, 10, -10),
            () -> detector.setMode(null),
        };
        for (int i = 0; i < illegal.length; ++i) {
            IllegalArgumentException e = assertThrows(IllegalArgumentException.class, illegal[i], "case " + i);
            assertTrue(e.getMessage().startsWith("quorin: "), e.getMessage());
        }
        // A frame without faces passes every entry; the last row needs no padding.
        ByteBuffer plane = ByteBuffer.allocateDirect(11 * 9 + 10);
        assertEquals(0, detector.detect(plane, 10, 10, 11, 0).size());
        assertEquals(0, detector.detect360Tracking(small, 10, 10, 10).size());
        assertEquals(0, detector.detect360TrackingScaled(small, 10, 10, 10).size());
        assertEquals(0, detector.detect360HighScaled(plane, 10, 10, 11).size());
        assertEquals(-1, detector.detect360TrackingScaledOrientation(small, 10, 10, 10).orientation);

        assertThrows(IllegalStateException.class, Detector::new, "a second session");
        detector.close();
        detector.close();
        IllegalStateException closed = assertThrows(IllegalStateException.class, () -> detector.detect(small, 10, 10, 10, 0));
        assertEquals("quorin: the Detector is closed", closed.getMessage());
        detector = new Detector();
    }

    @Test
    void manyThreadsAtOnceGetTheFacesOfOne() throws Exception {
        Detect.Gray g = photo();
        String expected = json(detector.detect(g.pixels, g.width, g.height, g.width, 0));
        ExecutorService pool = Executors.newFixedThreadPool(6);
        try {
            List<Future<String>> runs = new ArrayList<>();
            for (int t = 0; t < 6; ++t) {
                final boolean direct = t % 2 == 0;
                Callable<String> run = () -> {
                    ByteBuffer plane = ByteBuffer.allocateDirect(g.pixels.length);
                    plane.put(g.pixels);
                    plane.rewind();
                    String last = "";
                    for (int i = 0; i < 15; ++i) {
                        String now = json(direct ? detector.detect(plane, g.width, g.height, g.width, 0)
                                                 : detector.detect(g.pixels, g.width, g.height, g.width, 0));
                        if (i > 0 && !now.equals(last)) return now;
                        last = now;
                    }
                    return last;
                };
                runs.add(pool.submit(run));
            }
            for (Future<String> r : runs) assertEquals(expected, r.get());
            // A close while other threads detect: they finish or see a closed detector, nothing else.
            List<Future<String>> late = new ArrayList<>();
            for (int t = 0; t < 4; ++t)
                late.add(pool.submit(() -> {
                    try {
                        for (int i = 0; i < 30; ++i) detector.detect(g.pixels, g.width, g.height, g.width, 0);
                        return "done";
                    } catch (IllegalStateException e) {
                        return e.getMessage();
                    }
                }));
            Thread.sleep(20);
            detector.close();
            for (Future<String> r : late)
                assertTrue(r.get().equals("done") || r.get().equals("quorin: the Detector is closed"), r.get());
        } finally {
            pool.shutdown();
        }
    }
}
