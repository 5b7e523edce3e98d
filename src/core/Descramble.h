#ifndef QUORIN_CORE_DESCRAMBLE_H
#define QUORIN_CORE_DESCRAMBLE_H

#include <string>

// Length of the alphabet a-z, A-Z, 0-9 on which short texts are scrambled.
extern const unsigned int scrambleAlphabetLength;

// Restores a short text stored by tools/scramble_text.py (see
// core/ScrambledTexts.h): the letter or digit at output position i is shifted
// back by K + i on the alphabet, a backslash is dropped, anything else stays.
// Texts of 1024 characters or more come back unchanged; null gives "".
// Works through one static buffer, so it is not reentrant.
std::string descrambleText(const char* text);

#endif
