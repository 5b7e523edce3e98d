#ifndef QUORIN_LDAMODEL_H
#define QUORIN_LDAMODEL_H

// A linear discriminant as a host holds it: a projection vector and two
// scalars. QVFaceModel(const LDAModel&) turns it into a model with a binary
// form; nothing in the library makes one.

#include <Eigen/Dense>
#include <cstdint>

struct LDAModel {
    int32_t dimension = 0;        // the length of projection
    Eigen::VectorXf projection;
    float firstValue = 0.0f;
    float secondValue = 0.0f;
};

#endif
