/* Detects faces through the C entry points and prints one line per face:
 * left top right bottom, then the five landmarks. With no argument it runs on
 * a plain gray frame (no faces); with a binary PGM (P5, 8-bit) on that.
 *
 *   cc detect_faces.c $(pkg-config --cflags --libs quorinapi) -o detect_faces
 */

#include <quorin/quorinapi.h>

#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#define MAX_FACES 10

static unsigned char* readPgm(const char* path, int* width, int* height) {
    FILE* f = fopen(path, "rb");
    unsigned char* pixels = NULL;
    int maxValue = 0;
    if (f == NULL) return NULL;
    if (fscanf(f, "P5 %d %d %d", width, height, &maxValue) == 3 && maxValue == 255 && *width > 0 &&
        *height > 0 && *width <= 16384 && *height <= 16384 && fgetc(f) != EOF) {
        size_t bytes = (size_t)*width * (size_t)*height;
        pixels = malloc(bytes);
        if (pixels != NULL && fread(pixels, 1, bytes, f) != bytes) {
            free(pixels);
            pixels = NULL;
        }
    }
    fclose(f);
    return pixels;
}

int main(int argc, char** argv) {
    int width = 320, height = 240, n, k;
    int results[17 * MAX_FACES];
    unsigned char* frame;

    if (argc > 1) {
        frame = readPgm(argv[1], &width, &height);
        if (frame == NULL) {
            fprintf(stderr, "%s: not a binary 8-bit PGM file\n", argv[1]);
            return 1;
        }
    } else {
        frame = malloc((size_t)width * (size_t)height);
        if (frame == NULL) return 1;
        memset(frame, 128, (size_t)width * (size_t)height);
    }

    /* Without a session the entries report no face. */
    if (quorin_detect(frame, width, height, results, MAX_FACES, 0) != 0) return 1;

    quorin_init();
    n = quorin_detect(frame, width, height, results, MAX_FACES, 0);
    printf("%d faces\n", n);
    for (k = 0; k < n; ++k) {
        const int* f = results + 17 * k;
        printf("face %d %d %d %d eyes %d,%d %d,%d nose %d,%d mouth %d,%d %d,%d\n", f[5], f[3], f[6], f[4], f[7],
               f[8], f[9], f[10], f[15], f[16], f[11], f[12], f[13], f[14]);
    }
    quorin_release();
    free(frame);
    return 0;
}
