#include "faceparts/FacePartLocator.h"

void FacePartLocator::init(const std::string&) {}
void FacePartLocator::locateParts(const unsigned char*, int, int, std::vector<FaceData>&) {}
