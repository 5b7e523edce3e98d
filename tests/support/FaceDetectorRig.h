#ifndef QUORIN_TESTS_FACEDETECTORRIG_H
#define QUORIN_TESTS_FACEDETECTORRIG_H

// A FaceDetector on the square cascade (tests/support/SquareCascade.h) with an
// ILABS post filter that judges by the cascade score alone, served from
// in-memory models for the lifetime of the rig.

#include <string>
#include <vector>

#include "PostFilterModels.h"
#include "ScopedModel.h"
#include "SquareCascade.h"

// The square cascade ends in one score, so the model carries one branch; an
// empty one is never evaluated.
inline CascadeModel singleBranch(CascadeModel model)
{
    if (model.branches.empty()) model.branches.push_back({});
    return model;
}

struct FaceDetectorModels {
    ScopedModel cascade;
    ScopedModel postFilter;

    // Accepted squares score `bonus`; the post filter passes a hit whose score
    // is above `passAbove` (hits of 6 or more pass without a look).
    explicit FaceDetectorModels(float bonus = 1.0f, float passAbove = 0.0f)
        : cascade("fdtest_cascade", CascadeWriter::toBytes(singleBranch(squareCascade(10, bonus)))),
          postFilter("fdtest_ilabs", pftest::ilabsThresholdModel(0, {passAbove}))
    {
    }

    static std::string config(int imageMaxSize = 1024, int faceMinSize = 24, int faceMaxSize = 0)
    {
        return "{\"detector\":" + detectorConfig("fdtest_cascade", imageMaxSize, faceMinSize, faceMaxSize) +
               ",\"postfilter\":{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"fdtest_ilabs\"}}}";
    }
};

#endif
