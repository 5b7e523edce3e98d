#ifndef QUORIN_TRACKING_PARTICLECLOUD_H
#define QUORIN_TRACKING_PARTICLECLOUD_H

#include <cstdint>
#include <vector>

#include "image/DetectionWindow.h"

// The steps that PFTracker::TrackFace and ParticleFilter share. A cloud is a
// list of integer rectangles with one weight each.
namespace particle_cloud {

// 121 rectangles on an 11 x 11 lattice of one-pixel shifts around `rect`
// (dx outer, dy inner, -5..5), weights 1/121.
void seedLattice(const DetectionWindow& rect, std::vector<DetectionWindow>& particles, std::vector<float>& weights);

// Weighted mean, each edge int(sum + 0.5f) in single precision; all zeros for
// an empty cloud. Weights that are not numbers give edges of 0 rather than an
// undefined conversion.
DetectionWindow mean(const std::vector<DetectionWindow>& particles, const std::vector<float>& weights);

// Moves each particle by the velocity plus a random step of up to a tenth of
// its own size per axis; sizes never change. Four lrand48 draws per particle:
// x sign, x magnitude, y sign, y magnitude.
void diffuse(std::vector<DetectionWindow>& particles, int32_t velocityX, int32_t velocityY);

// Divides each weight by their sum. A sum that is not a positive number (all
// likelihoods 0, or one that is not a number) resets the weights to uniform:
// the cloud then keeps its place for this frame instead of carrying
// not-a-number weights into every later one.
void normalise(std::vector<float>& weights);

// Draws `count` particles by weight (binary search on the cumulative weights,
// the last weight left out) and gives each 1/count. An empty cloud stays empty:
// there is nothing to draw from.
void resample(std::vector<DetectionWindow>& particles, std::vector<float>& weights, int count);

} // namespace particle_cloud

#endif
