#pragma once
// stb_image's decoder with its implementation, for the development programs and
// tests that read photos. Include it in exactly one source file of a program.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"
#pragma GCC diagnostic ignored "-Wsign-compare"
#pragma GCC diagnostic ignored "-Wunused-function"
#pragma GCC diagnostic ignored "-Wunused-but-set-variable"
#define STB_IMAGE_IMPLEMENTATION
#define STBI_NO_HDR
#include <stb/stb_image.h>
#pragma GCC diagnostic pop
