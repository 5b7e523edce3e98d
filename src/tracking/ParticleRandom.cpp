#include "tracking/ParticleRandom.h"

#include <cstdlib>
#include <ctime>

namespace particle_random {
namespace {

bool fixed = false;
long fixedSeed = 0;

} // namespace

void reseed() { srand48(fixed ? fixedSeed : long(time(nullptr))); }

void fixSeed(long seed)
{
    fixed = true;
    fixedSeed = seed;
}

void clearFixedSeed() { fixed = false; }

} // namespace particle_random
