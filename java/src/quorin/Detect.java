package quorin;

import java.awt.image.BufferedImage;
import java.io.File;
import java.io.FileDescriptor;
import java.io.FileOutputStream;
import java.io.IOException;
import java.io.PrintStream;
import java.io.UnsupportedEncodingException;
import java.util.List;
import javax.imageio.ImageIO;

/**
 * java -cp quorin.jar quorin.Detect PHOTO...: the faces of each photo (PNG,
 * JPEG as the JDK decodes them) through quorin_detect in mode 2 at rotation 0,
 * one JSON line per photo in the form quorin-detect writes. JPEG decoders
 * differ in their last bits, so only lossless photos give byte-equal lines.
 * Exits with 1 when a photo can't be read, 3 when the engine fails.
 */
public final class Detect {
    /** An 8-bit gray image, rows adjacent. */
    static final class Gray {
        final byte[] pixels;
        final int width;
        final int height;

        Gray(byte[] pixels, int width, int height) {
            this.pixels = pixels;
            this.width = width;
            this.height = height;
        }
    }

    private Detect() {}

    public static void main(String[] args) throws UnsupportedEncodingException {
        if (args.length == 0) {
            System.err.println("usage: java -cp quorin.jar quorin.Detect PHOTO...");
            System.exit(2);
        }
        PrintStream out = new PrintStream(new FileOutputStream(FileDescriptor.out), true, "UTF-8");
        int status = 0;
        try (Detector detector = new Detector()) {
            for (String path : args) {
                Gray gray;
                try {
                    gray = loadGray(path);
                } catch (IOException e) {
                    System.err.println("quorin.Detect: " + e.getMessage());
                    out.println("{\"file\":" + jsonString(path) + ",\"error\":" + jsonString(e.getMessage()) + "}");
                    status = 1;
                    continue;
                }
                List<Face> faces = detector.detect(gray.pixels, gray.width, gray.height, gray.width, 0);
                StringBuilder line = new StringBuilder("{\"file\":").append(jsonString(path))
                        .append(",\"width\":").append(gray.width).append(",\"height\":").append(gray.height)
                        .append(",\"entry\":\"quorin_detect\",\"mode\":2,\"rotation\":0,\"coordinates\":\"frame\",\"faces\":[");
                for (int i = 0; i < faces.size(); ++i) line.append(i == 0 ? "" : ",").append(faces.get(i).toJson());
                out.println(line.append("]}"));
            }
        } catch (IllegalStateException | OutOfMemoryError e) {
            System.err.println("quorin.Detect: " + e.getMessage());
            System.exit(3);
        }
        System.exit(status);
    }

    /** The photo in gray, weighted 0.299, 0.587, 0.114 and rounded as quorin-detect does; alpha is ignored. */
    static Gray loadGray(String path) throws IOException {
        File file = new File(path);
        if (!file.isFile()) throw new IOException("'" + path + "': no such file");
        BufferedImage image = ImageIO.read(file);
        if (image == null) throw new IOException("'" + path + "': not an image the JDK can read");
        final int w = image.getWidth(), h = image.getHeight();
        byte[] gray = new byte[w * h];
        if (image.getType() == BufferedImage.TYPE_BYTE_GRAY) {
            // The raw samples: getRGB would apply the gray colour space's gamma.
            image.getRaster().getDataElements(0, 0, w, h, gray);
            return new Gray(gray, w, h);
        }
        int[] row = new int[w];
        for (int y = 0; y < h; ++y) {
            image.getRGB(0, y, w, 1, row, 0, w);
            for (int x = 0; x < w; ++x) {
                int p = row[x];
                int r = (p >> 16) & 0xff, g = (p >> 8) & 0xff, b = p & 0xff;
                gray[y * w + x] = (byte) ((299 * r + 587 * g + 114 * b + 500) / 1000);
            }
        }
        return new Gray(gray, w, h);
    }

    /** A JSON string as quorin-detect writes one. */
    static String jsonString(String text) {
        StringBuilder s = new StringBuilder("\"");
        for (int i = 0; i < text.length(); ++i) {
            char c = text.charAt(i);
            switch (c) {
                case '"': s.append("\\\""); break;
                case '\\': s.append("\\\\"); break;
                case '\n': s.append("\\n"); break;
                case '\r': s.append("\\r"); break;
                case '\t': s.append("\\t"); break;
                default:
                    if (c < 0x20 || c == 0x7f) s.append(String.format("\\u%04x", (int) c));
                    else s.append(c);
            }
        }
        return s.append('"').toString();
    }
}
