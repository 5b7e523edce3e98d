#ifndef QUORIN_TRACKING_PARTICLERANDOM_H
#define QUORIN_TRACKING_PARTICLERANDOM_H

// The particle trackers draw from the process-wide lrand48 stream, which each
// new PFTracker or CPFTracker seeds anew from the clock. Tests fix the seed so
// that a run repeats exactly.
namespace particle_random {

// srand48 with the fixed seed if one is set, otherwise with time(NULL).
void reseed();

// From now on reseed() uses `seed` instead of the clock.
void fixSeed(long seed);
// Back to the clock.
void clearFixedSeed();

} // namespace particle_random

#endif
