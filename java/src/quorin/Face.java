package quorin;

import java.util.ArrayList;
import java.util.Collections;
import java.util.List;

/**
 * One face as the engine reports it: the rectangle, the five landmarks and the
 * roll angle. "Left" is the image's left. Coordinates are those of the entry
 * that found the face: pixels of the turned frame, or -1000..1000 on the axes of
 * the frame as given for the Scaled entries.
 */
public final class Face {
    /** A landmark position. */
    public static final class Point {
        public final int x;
        public final int y;

        Point(int x, int y) {
            this.x = x;
            this.y = y;
        }
    }

    public final int roll;
    public final int left;
    public final int top;
    public final int right;
    public final int bottom;
    public final Point leftEye;
    public final Point rightEye;
    public final Point nose;
    public final Point leftMouthCorner;
    public final Point rightMouthCorner;

    // The engine's block of 17 ints at `at`: roll, two unused, top, bottom,
    // left, right, eyes, mouth corners, nose.
    private Face(int[] b, int at) {
        roll = b[at];
        top = b[at + 3];
        bottom = b[at + 4];
        left = b[at + 5];
        right = b[at + 6];
        leftEye = new Point(b[at + 7], b[at + 8]);
        rightEye = new Point(b[at + 9], b[at + 10]);
        leftMouthCorner = new Point(b[at + 11], b[at + 12]);
        rightMouthCorner = new Point(b[at + 13], b[at + 14]);
        nose = new Point(b[at + 15], b[at + 16]);
    }

    static List<Face> fromBlocks(int[] blocks, int from) {
        List<Face> faces = new ArrayList<>((blocks.length - from) / 17);
        for (int at = from; at + 17 <= blocks.length; at += 17) faces.add(new Face(blocks, at));
        return Collections.unmodifiableList(faces);
    }

    /** The face as quorin-detect writes it: {"rect":{..},"landmarks":{..},"roll":..}. */
    public String toJson() {
        return "{\"rect\":{\"left\":" + left + ",\"top\":" + top + ",\"right\":" + right + ",\"bottom\":" + bottom
                + "},\"landmarks\":{" + point("leftEye", leftEye) + "," + point("rightEye", rightEye) + ","
                + point("nose", nose) + "," + point("leftMouthCorner", leftMouthCorner) + ","
                + point("rightMouthCorner", rightMouthCorner) + "},\"roll\":" + roll + "}";
    }

    @Override
    public String toString() {
        return toJson();
    }

    private static String point(String name, Point p) {
        return "\"" + name + "\":[" + p.x + "," + p.y + "]";
    }
}
