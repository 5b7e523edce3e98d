#ifndef QUORIN_FACEPARTS_FACEPARTLOCATOR_H
#define QUORIN_FACEPARTS_FACEPARTLOCATOR_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "core/FaceData.h"

class IMAGE;
class NeuralClassifier;

// Finds five landmarks per face by direct regression: the face rectangle is
// squeezed into the net's square patch by nearest-neighbour sampling, scaled so
// that its pixels sum to a constant, and the net's ten outputs, read as (x, y)
// fractions of the rectangle, become the landmarks in part-table order.
class FacePartLocator {
public:
    FacePartLocator();
    ~FacePartLocator();
    FacePartLocator(const FacePartLocator&) = delete;
    FacePartLocator& operator=(const FacePartLocator&) = delete;

    // parameters: a JSON object; "neuralNetModelPath" names the net's model
    // (absent: the empty path, which the model reader refuses). Load failures
    // propagate.
    void init(const std::string& parameters);
    // Replaces the classifier with one loaded from path and prepares the patch.
    void Init(const char* path);
    // Makes the patch when the net's input count is a perfect square; else the
    // locator stays unusable (every face then fails in locateParts).
    void preparePatch();

    // image: width x height gray, stride width. Sets the five landmarks of each
    // face in order. Stops silently at the first face reaching past the right
    // or bottom edge; skips faces that are empty or start left of or above the
    // frame. When the net fails on a face, its five parts become (-1, -1) and
    // qv_operation_error "Failed to detect face parts" is raised.
    void locateParts(const unsigned char* image, int width, int height, std::vector<FaceData>& faces);

    bool ready() const { return ready_ != 0; }
    int patchWidth() const { return patchWidth_; }
    int patchHeight() const { return patchHeight_; }

    // The part names in the order of the net's output pairs.
    static const char* const kPartNames[5];

private:
    std::unique_ptr<NeuralClassifier> classifier_;
    int32_t patchWidth_ = 0;
    int32_t patchHeight_ = 0;
    int32_t ready_ = 0;
    std::unique_ptr<IMAGE> patch_;
    std::unique_ptr<float[]> netInput_;
};

// Five landmark points, x before y, in part-table order; layout 0 frontal,
// 1 turned, 2 profile (an eye and a mouth corner), other: the two eyes only.
struct FacePointSet {
    int32_t layout;
    float points[5][2];
};

// A canonical face square and its roll angle in radians.
struct FaceSquare {
    float angle;
    int32_t left;
    int32_t right;
    int32_t top;
    int32_t bottom;
};

// From landmark points to the face square they imply. With reorder (layouts 0
// and 1 only) swaps eyes and mouth corners into a consistent handedness first,
// in the record itself.
void MapFPts2GTRc(FacePointSet* points, FaceSquare* square, bool reorder);

#endif
