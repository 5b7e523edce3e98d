// Writes a photo of the data cache as the binary PGM that the example hosts
// read: photo_to_pgm in.jpg out.pgm.

#include <cstdio>
#include <fstream>

#include "ImageIo.h"

int main(int argc, char** argv) {
    if (argc != 3) {
        std::fprintf(stderr, "usage: %s photo out.pgm\n", argv[0]);
        return 2;
    }
    try {
        const qcli::Image gray = qcli::toGray(qcli::loadImage(argv[1]));
        std::ofstream out(argv[2], std::ios::binary);
        out << "P5\n" << gray.width << ' ' << gray.height << "\n255\n";
        out.write(reinterpret_cast<const char*>(gray.pixels.data()), static_cast<std::streamsize>(gray.pixels.size()));
        if (!out) throw qcli::ImageError(std::string(argv[2]) + ": cannot be written");
    } catch (const std::exception& e) {
        std::fprintf(stderr, "%s\n", e.what());
        return 1;
    }
    return 0;
}
