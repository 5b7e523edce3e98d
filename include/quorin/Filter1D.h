#ifndef QUORIN_FILTER1D_H
#define QUORIN_FILTER1D_H

// 1-D filters over float signals: the abstract Filter1D, a Gaussian and a
// difference of Gaussians (DoG). Filters own their kernels and buffers, never
// the signal. A filter with buffers (DoG) must not be used from two threads at
// once, even for filtering; the Gaussian keeps no state while filtering.

#include <string>
#include <vector>

#include "quorin/FilterKernel1D.h"
#include "quorin/export.h"

class QUORIN_EXPORT Filter1D {
public:
    virtual ~Filter1D();
    // ensures: a new copy owned by the caller, or null when memory ran out.
    virtual Filter1D* clone() const = 0;
    // ensures: the parameters as a JSON object text.
    virtual std::string toJson() const = 0;
    // ensures: parameters read from an object text; absent keys keep their values.
    // throws:  JsonError on a malformed text or value.
    virtual void fromJson(const std::string& text) = 0;
    // ensures: the factory key of the class.
    virtual std::string name() const = 0;

    // requires: data holds n samples `stride` floats apart; out has room for n
    //           values `outStride` floats apart.
    // ensures:  out[i * outStride] is the filter's response at sample i, with
    //           the border replicated; nothing happens for n <= 0.
    void filter(const float* data, int n, int stride, int outStride, float* out) { filterImpl(data, n, stride, outStride, out); }
    // requires: as filter; index may lie anywhere (it is clamped when read).
    // ensures:  *out is the response at sample `index`.
    void filterAt(const float* data, int n, int stride, int index, float* out) { filterAtImpl(data, n, stride, index, out); }

    const QVFilterKernel1D& kernel() const { return kernel_; }

protected:
    Filter1D() = default;
    Filter1D(const Filter1D&) = default;
    Filter1D& operator=(const Filter1D&) = default;

    virtual void filterImpl(const float* data, int n, int stride, int outStride, float* out);
    virtual void filterAtImpl(const float* data, int n, int stride, int index, float* out);

    QVFilterKernel1D kernel_;
};

// Gaussian of radius floor(3 * sigma), coefficients summing to 1. Factory key
// "QV_FILTER1D_GAUSSIAN", JSON form {"sigma":value}.
class QUORIN_EXPORT GaussianFilter1D : public Filter1D {
public:
    // ensures: sigma 0, radius 0, empty kernel (filter writes zeros).
    GaussianFilter1D();
    // ensures: as init(sigma).
    explicit GaussianFilter1D(float sigma);

    // ensures: radius() == floor(3 * sigma), kernel of 2 * radius + 1
    //          coefficients with anchor radius, symmetric, summing to 1; a
    //          sigma below 1/3 gives the single coefficient 1.
    // throws:  std::bad_alloc for a negative sigma (its radius is negative), or one so large or
    //          undefined (NaN, infinite) that no kernel can be made; the filter
    //          is then released.
    void init(float sigma);
    // ensures: sigma 0, radius 0, empty kernel.
    void release();

    float sigma() const { return sigma_; }
    int radius() const { return radius_; }

    // ensures: a new filter read from `text` ({"sigma":s}; an empty object
    //          gives sigma 0), or null when reading or memory failed.
    static GaussianFilter1D* create(const std::string& text);

    Filter1D* clone() const override;
    std::string toJson() const override;
    void fromJson(const std::string& text) override;
    std::string name() const override;

protected:
    // The symmetric shortcut: half the multiplications of the general kernel.
    void filterAtImpl(const float* data, int n, int stride, int index, float* out) override;

private:
    float sigma_;
    int radius_;
};

// Gaussian of sigmaH minus Gaussian of sigmaL, whichever is larger. Factory
// key "QV_FILTER1D_DOG", JSON form {"sigmaL":value, "sigmaH":value}.
class QUORIN_EXPORT DoGFilter1D : public Filter1D {
public:
    // ensures: both sigmas 0, empty kernels (filter writes zeros).
    DoGFilter1D();
    // ensures: as init(sigmaL, sigmaH).
    DoGFilter1D(float sigmaL, float sigmaH);
    // ensures: init with the other's two sigmas; buffers are not shared.
    DoGFilter1D(const DoGFilter1D& other);
    DoGFilter1D& operator=(const DoGFilter1D& other);

    // ensures: both Gaussians made, kernel() == higher kernel - lower kernel.
    // throws:  as GaussianFilter1D::init.
    void init(float sigmaL, float sigmaH);
    // ensures: both Gaussians and the kernel released, sigmas 0.
    void release();
    // ensures: both working buffers hold `length` floats (nothing for length <= 0).
    void allocateBuffer(int length);
    // ensures: buffers empty (capacity kept).
    void deallocateBuffer();

    float sigmaL() const { return sigmaL_; }
    float sigmaH() const { return sigmaH_; }

    // ensures: a new filter read from `text`, or null when reading or memory failed.
    static DoGFilter1D* create(const std::string& text);

    Filter1D* clone() const override;
    std::string toJson() const override;
    void fromJson(const std::string& text) override;
    std::string name() const override;

protected:
    void filterImpl(const float* data, int n, int stride, int outStride, float* out) override;
    void filterAtImpl(const float* data, int n, int stride, int index, float* out) override;

private:
    float sigmaL_;
    float sigmaH_;
    GaussianFilter1D lowerFilter_;
    GaussianFilter1D higherFilter_;
    unsigned int bufferLength_;
    std::vector<float> lowerBuffer_;
    std::vector<float> higherBuffer_;
};

#endif
