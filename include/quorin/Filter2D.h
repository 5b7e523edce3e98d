#ifndef QUORIN_FILTER2D_H
#define QUORIN_FILTER2D_H

// 2-D filters over float images: the abstract Filter2D, the separable filter
// (rows first, then columns), its Gaussian form and a 2-D difference of
// Gaussians. Strides count floats. Working buffers grow on demand and are kept
// between calls, so filtering frames of one size allocates once; one object
// must therefore not filter from two threads at once.

#include <memory>
#include <string>
#include <vector>

#include "quorin/Filter1D.h"
#include "quorin/export.h"

class QUORIN_EXPORT Filter2D {
public:
    virtual ~Filter2D();
    // requires: src holds height rows of width floats, srcStride apart; dst
    //           has room for height rows of width floats, dstStride apart;
    //           src and dst don't overlap.
    // ensures:  dst holds the filtered image, the border replicated.
    virtual void filter(const float* src, int width, int height, int srcStride, int dstStride, float* dst) = 0;
    // ensures: a new copy owned by the caller, or null when memory ran out.
    virtual Filter2D* clone() const = 0;
    virtual std::string toJson() const = 0;
    // throws: JsonError on a malformed text or value.
    virtual void fromJson(const std::string& text) = 0;
    // ensures: the factory key of the class.
    virtual std::string name() const = 0;

protected:
    Filter2D() = default;
    Filter2D(const Filter2D&) = default;
    Filter2D& operator=(const Filter2D&) = default;
};

// A horizontal and a vertical 1-D filter run one after the other.
class QUORIN_EXPORT SeparableFilter2D : public Filter2D {
public:
    // ensures: no 1-D filters (filter raises), no buffer.
    SeparableFilter2D();
    // ensures: clones of both of other's filters; no buffer.
    SeparableFilter2D(const SeparableFilter2D& other);
    // ensures: this object's filters released, then BOTH directions get a
    //          clone of other's horizontal filter (kept as the established
    //          behaviour: an assigned filter has the source's horizontal
    //          parameters in both directions). Self-assignment changes nothing.
    SeparableFilter2D& operator=(const SeparableFilter2D& other);
    ~SeparableFilter2D() override;

    void init() {}
    // ensures: both 1-D filters destroyed; the buffer stays.
    void release();
    // ensures: a width x height buffer; nothing when the sizes are as stored or
    //          either is <= 0 (an existing buffer stays then).
    void allocateBuffer(int width, int height);
    void deallocateBuffer();

    // ensures: rows filtered by the horizontal filter into the buffer, then
    //          columns by the vertical filter into dst.
    // throws:  qv_unsupported_error when either 1-D filter is missing.
    void filter(const float* src, int width, int height, int srcStride, int dstStride, float* dst) override;

    const Filter1D* horizontalFilter() const { return horizontalFilter_.get(); }
    const Filter1D* verticalFilter() const { return verticalFilter_.get(); }

protected:
    std::unique_ptr<Filter1D> horizontalFilter_;
    std::unique_ptr<Filter1D> verticalFilter_;

private:
    int bufferWidth_;
    int bufferHeight_;
    std::vector<float> buffer_;
};

// Gaussian in each direction. Factory key "QV_FILTER2D_GAUSSIAN", JSON form
// {"sigmaHorizontal":value,"sigmaVertical":value} (no blank after the comma).
class QUORIN_EXPORT GaussianFilter2D : public SeparableFilter2D {
public:
    // ensures: no 1-D filters yet (filter and toJson raise).
    GaussianFilter2D();
    // ensures: as init(sigma, sigma).
    explicit GaussianFilter2D(float sigma);
    // ensures: as init(sigmaHorizontal, sigmaVertical).
    GaussianFilter2D(float sigmaHorizontal, float sigmaVertical);

    // ensures: GaussianFilter1D(sigmaHorizontal) on rows, (sigmaVertical) on columns.
    // throws:  as GaussianFilter1D::init.
    void init(float sigmaHorizontal, float sigmaVertical);

    // ensures: a new filter read from `text`, or null when reading or memory failed.
    static GaussianFilter2D* create(const std::string& text);

    Filter2D* clone() const override;
    // throws: qv_unsupported_error when the 1-D filters are missing.
    std::string toJson() const override;
    // ensures: init only when both keys are present; otherwise unchanged.
    void fromJson(const std::string& text) override;
    std::string name() const override;
};

// 2-D Gaussian of sigmaHigher minus 2-D Gaussian of sigmaLower. Factory key
// "QV_FILTER2D_DOG", JSON form {"lowerFilter":{...}, "higherFilter":{...}} with
// each value a GaussianFilter2D object.
class QUORIN_EXPORT DoGFilter2D : public Filter2D {
public:
    // ensures: Gaussians without 1-D filters (filter and toJson raise).
    DoGFilter2D();
    // ensures: as init(sigmaLower, sigmaHigher).
    DoGFilter2D(float sigmaLower, float sigmaHigher);
    // ensures: copies of both Gaussians; no buffers.
    DoGFilter2D(const DoGFilter2D& other);
    DoGFilter2D& operator=(const DoGFilter2D&) = delete;

    // ensures: lower Gaussian (sigmaLower, sigmaLower), higher (sigmaHigher, sigmaHigher).
    void init(float sigmaLower, float sigmaHigher);
    // ensures: both Gaussians without 1-D filters, buffers freed.
    void release();
    // ensures: two width x height buffers; nothing when the sizes are as stored
    //          or either is <= 0.
    void allocateBuffer(int width, int height);
    void deallocateBuffer();

    // ensures: dst = higher - lower, element by element; nothing for an empty size.
    // throws:  qv_unsupported_error when the Gaussians have no 1-D filters.
    void filter(const float* src, int width, int height, int srcStride, int dstStride, float* dst) override;

    const GaussianFilter2D& lowerFilter() const { return lowerFilter_; }
    const GaussianFilter2D& higherFilter() const { return higherFilter_; }

    // ensures: a new filter read from `text`, or null when reading or memory failed.
    static DoGFilter2D* create(const std::string& text);

    Filter2D* clone() const override;
    // throws: JsonError "Json serialization error" when a Gaussian can't be written.
    std::string toJson() const override;
    // ensures: each present key read into its Gaussian; an absent one is left as it is.
    void fromJson(const std::string& text) override;
    std::string name() const override;

private:
    GaussianFilter2D lowerFilter_;
    GaussianFilter2D higherFilter_;
    int bufferWidth_;
    int bufferHeight_;
    std::vector<float> lowerBuffer_;
    std::vector<float> higherBuffer_;
};

#endif
