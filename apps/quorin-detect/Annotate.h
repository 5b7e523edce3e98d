#ifndef QUORIN_APPS_ANNOTATE_H
#define QUORIN_APPS_ANNOTATE_H

#include <vector>

#include "Faces.h"
#include "ImageIo.h"

namespace qcli {

// Draws each face's rectangle and its five landmarks onto the image (gray or
// RGB), in the image's own pixels. Anything outside the image is clipped, so
// any coordinates are safe. Line width grows with the image.
void drawFaces(Image& image, const std::vector<Face>& faces);

}  // namespace qcli

#endif
