#include "core/Descramble.h"

#include <cstring>

namespace {

const char kAlphabet[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
// The shift the stored texts were made with; tools/scramble_text.py uses the same.
const unsigned int kScrambleShift = 23;
const std::size_t kBufferSize = 1024;

int alphabetValue(char c) {
    if (c >= 'a' && c <= 'z') return c - 'a';
    if (c >= 'A' && c <= 'Z') return c - 'A' + 26;
    if (c >= '0' && c <= '9') return c - '0' + 52;
    return -1;
}

}  // namespace

const unsigned int scrambleAlphabetLength = sizeof(kAlphabet) - 1;

std::string descrambleText(const char* text) {
    if (text == nullptr) return std::string();
    const std::size_t length = std::strlen(text);
    if (length >= kBufferSize) return std::string(text, length);

    // A single pass without allocation: labels go through here for every face.
    static char buffer[kBufferSize];
    const unsigned int n = scrambleAlphabetLength;
    std::size_t out = 0;
    std::size_t limit = length;
    for (std::size_t in = 0; out < limit; ++in) {
        const char c = text[in];
        if (c == '\\') {
            --limit;
            continue;
        }
        const int v = alphabetValue(c);
        if (v < 0) {
            buffer[out] = c;
        } else {
            buffer[out] = kAlphabet[(2 * n - (kScrambleShift % n + out % n) + static_cast<unsigned int>(v)) % n];
        }
        ++out;
    }
    buffer[limit] = '\0';
    return std::string(buffer, limit);
}
