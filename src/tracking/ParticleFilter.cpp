#include "tracking/ParticleFilter.h"

#include "core/Errors.h"
#include "tracking/Observer.h"
#include "tracking/ParticleCloud.h"

DetectionWindow ParticleFilter::getMean()
{
    if (!meanValid) {
        meanCache = particle_cloud::mean(particles, weights);
        meanValid = true;
    }
    return meanCache;
}

void ParticleFilter::diffuse()
{
    meanValid = false;
    particle_cloud::diffuse(particles, 0, 0);
}

void ParticleFilter::estimate(const IN_IMAGE& image)
{
    meanValid = false;
    if (observer == nullptr) throw qv_operation_error("Particle filter doesn't have an observer yet");
    weights.resize(particles.size());
    for (size_t i = 0; i < particles.size(); ++i) weights[i] = observer->getLikelihood(image, particles[i]);
    particle_cloud::normalise(weights);
}

void ParticleFilter::resample()
{
    meanValid = false;
    particle_cloud::resample(particles, weights, particleNumber);
}
