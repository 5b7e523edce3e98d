#ifndef QUORIN_TESTS_IVBGOLDEN_H
#define QUORIN_TESTS_IVBGOLDEN_H

#include <cstdint>
#include <string>
#include <vector>

// Byte layouts of the IVB formats written out by hand. The golden tests check
// them in both directions; the fuzz targets take them as seeds.
namespace ivbgolden {

inline std::vector<uint8_t> hex(const std::string& text) {
    std::vector<uint8_t> out;
    int high = -1;
    for (char c : text) {
        int v = -1;
        if (c >= '0' && c <= '9') v = c - '0';
        if (c >= 'a' && c <= 'f') v = c - 'a' + 10;
        if (c >= 'A' && c <= 'F') v = c - 'A' + 10;
        if (v < 0) continue;
        if (high < 0) {
            high = v;
        } else {
            out.push_back(static_cast<uint8_t>(high * 16 + v));
            high = -1;
        }
    }
    return out;
}

// A composite with one nameless basic float array {1.5f, -2.0f} under tag 5.
inline std::vector<uint8_t> compositeWithFloats() {
    return hex("2C 00 00 00 00 00 00 00  02  00  00 00 00 00 00 00"
               "00 00  05 00"
               "18 00 00 00 00 00 00 00  01  0C  00 00 00 00 00 00"
               "00 00 C0 3F  00 00 00 C0");
}

inline std::vector<uint8_t> emptyComposite() { return hex("10 00 00 00 00 00 00 00  02  00  00 00 00 00 00 00"); }

// An empty label and one object "ab", tag 7, holding an empty composite.
inline std::vector<uint8_t> streamWithOneObject() {
    return hex("49 56 42 40 51 56  01 00  00 00 00 00  49 49  00 00"
               "02 00  07 00  61 62"
               "10 00 00 00 00 00 00 00  02  00  00 00 00 00 00 00"
               "00 00 FF FF");
}

inline std::vector<uint8_t> smallestStream() { return hex("49 56 42 40 51 56  01 00  00 00 00 00  49 49  00 00  00 00 FF FF"); }

// DataProperty(UINT32, 2, 3, 1): dataType, xNum, yNum, fLen, minVal, maxVal.
inline std::vector<uint8_t> uint32Property() {
    return hex("A8 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 27 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  01 00 00 00"
               "00 00 20 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 21 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  03 00 00 00"
               "00 00 22 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  01 00 00 00"
               "00 00 23 00  18 00 00 00 00 00 00 00  01 0A 00 00 00 00 00 00  00 00 00 00 00 00 00 00"
               "00 00 24 00  18 00 00 00 00 00 00 00  01 0A 00 00 00 00 00 00  FF FF FF FF FF FF FF FF");
}

// A DataBlob "f" of two bytes {0xAB, 0xCD} (type BYTES, 1 x 1 x 2).
inline std::vector<uint8_t> byteBlob() {
    return hex("AF 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 26 00  11 00 00 00 00 00 00 00  01 03 00 00 00 00 00 00  66"
               "00 00 28 00  70 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "  00 00 27 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  00 00 00 00"
               "  00 00 20 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  01 00 00 00"
               "  00 00 21 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  01 00 00 00"
               "  00 00 22 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 25 00  12 00 00 00 00 00 00 00  01 01 00 00 00 00 00 00  AB CD");
}

// A face model: dimension 2 (tag 64), 1.5 (160), -2.0 (162), {0.5, 0.25} (161).
inline std::vector<uint8_t> faceModel() {
    return hex("74 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 40 00  14 00 00 00 00 00 00 00  01 09 00 00 00 00 00 00  02 00 00 00"
               "00 00 A0 00  14 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 C0 3F"
               "00 00 A2 00  14 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 00 C0"
               "00 00 A1 00  18 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 00 3F  00 00 80 3E");
}

// A vector quantizer with one inner node on 2-D vectors: innerNodeNum 1 (tag
// 96), dimension 2 (64), weights {1, -1} (97), threshold 0.5 (98).
inline std::vector<uint8_t> vectorQuantizer() {
    return hex("74 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 60 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  01 00 00 00"
               "00 00 40 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 61 00  18 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 80 3F  00 00 80 BF"
               "00 00 62 00  14 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 00 3F");
}

// Nearest centroids: dimension 2 (tag 64), two rows (192), {1, 2} and {3, 4}
// end to end (193), metric "L1" (194).
inline std::vector<uint8_t> nearestCentroids() {
    return hex("7A 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 40 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 C0 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 C1 00  20 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00"
               "  00 00 80 3F  00 00 00 40  00 00 40 40  00 00 80 40"
               "00 00 C2 00  12 00 00 00 00 00 00 00  01 03 00 00 00 00 00 00  4C 31");
}

// A PCA of rawDim 3 (tag 64) to pcaDim 2 (128): mean {0.5, 1, 2} (129) and the
// rows {1, 2, 3}, {4, 0.5, -1} (130, row by row, so (1, 2) = -1 is element 5).
inline std::vector<uint8_t> pcaTransform() {
    return hex("8C 00 00 00 00 00 00 00  02 00 00 00 00 00 00 00"
               "00 00 40 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  03 00 00 00"
               "00 00 80 00  14 00 00 00 00 00 00 00  01 08 00 00 00 00 00 00  02 00 00 00"
               "00 00 81 00  1C 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00  00 00 00 3F  00 00 80 3F  00 00 00 40"
               "00 00 82 00  28 00 00 00 00 00 00 00  01 0C 00 00 00 00 00 00"
               "  00 00 80 3F  00 00 00 40  00 00 40 40  00 00 80 40  00 00 00 3F  00 00 80 BF");
}

// `b` with byte `at` set to `v`, for the damage tables.
inline std::vector<uint8_t> withByte(std::vector<uint8_t> b, std::size_t at, uint8_t v) {
    b[at] = v;
    return b;
}

}  // namespace ivbgolden

#endif
