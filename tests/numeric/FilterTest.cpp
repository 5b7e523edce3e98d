// Filters against closed forms (kernel sums and symmetry, a constant signal),
// small hand-computed cases, and the numpy/OpenCV reference fixtures.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

#include "core/Errors.h"
#include "core/Json.h"
#include "numeric/FilterFactory.h"
#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/FilterKernel1D.h"
#include "numeric/Fixtures.h"

namespace {

QVFilterKernel1D kernelOf(int anchor, const std::vector<float>& c) {
    QVFilterKernel1D k(anchor, static_cast<unsigned int>(c.size()));
    for (unsigned int i = 0; i < c.size(); ++i) k[i] = c[i];
    return k;
}

std::vector<float> coefficients(const QVFilterKernel1D& k) {
    std::vector<float> c;
    for (unsigned int i = 0; i < k.size(); ++i) c.push_back(k[i]);
    return c;
}

TEST(FilterKernel1D, ConvolvesWithReplicatedBorders) {
    // anchor 0, {1, 2}: out[i] = data[i] + 2 * data[i - 1], data[-1] read as data[0].
    const std::vector<float> data = {1, 10, 100, 1000};
    std::vector<float> out(4);
    kernelOf(0, {1, 2}).filter(data.data(), 4, 1, 1, out.data());
    EXPECT_EQ(out, (std::vector<float>{3, 12, 120, 1200}));
    // Strided input and output: every second sample, written every third float.
    const std::vector<float> strided = {1, -9, 10, -9, 100};
    std::vector<float> spaced(7, -1.0f);
    kernelOf(1, {1, 1, 1}).filter(strided.data(), 3, 2, 3, spaced.data());
    EXPECT_EQ(spaced, (std::vector<float>{12, -1, -1, 111, -1, -1, 210}));
    // Nothing read or written for empty signals; an empty kernel yields 0.
    float untouched = 5.0f;
    kernelOf(0, {1}).filter(nullptr, 0, 1, 1, &untouched);
    EXPECT_EQ(untouched, 5.0f);
    QVFilterKernel1D().filterAt(data.data(), 4, 1, 2, &untouched);
    EXPECT_EQ(untouched, 0.0f);
}

TEST(FilterKernel1D, ArithmeticAlignsOnAnchors) {
    const QVFilterKernel1D small = kernelOf(1, {1, 2, 3});
    const QVFilterKernel1D wide = kernelOf(3, {1, 1, 1, 1, 1, 1, 1});
    const QVFilterKernel1D sum = small + wide;
    EXPECT_EQ(sum.getAnchor(), 3);
    EXPECT_EQ(coefficients(sum), (std::vector<float>{1, 1, 2, 3, 4, 1, 1}));
    // a - b where a covers; +b kept where only b reaches.
    EXPECT_EQ(coefficients(small - wide), (std::vector<float>{1, 1, 0, 1, 2, 1, 1}));
    EXPECT_EQ(coefficients(wide - small), (std::vector<float>{1, 1, 0, -1, -2, 1, 1}));
    // Different tails: anchor 0 of length 3 and anchor 2 of length 3.
    const QVFilterKernel1D lopsided = kernelOf(0, {1, 2, 3}) + kernelOf(2, {4, 5, 6});
    EXPECT_EQ(lopsided.getAnchor(), 2);
    EXPECT_EQ(coefficients(lopsided), (std::vector<float>{4, 5, 7, 2, 3}));
    EXPECT_EQ(coefficients(small * 0.5f), (std::vector<float>{0.5f, 1, 1.5f}));
    EXPECT_EQ((small * 0.5f).getAnchor(), 1);
    QVFilterKernel1D grown = small;
    grown.init(2, 5);
    EXPECT_EQ(coefficients(grown), (std::vector<float>{1, 2, 3, 0, 0}));
}

TEST(GaussianFilter1D, KernelsMatchOpenCVAndSumToOne) {
    struct Case {
        float sigma;
        int radius;
        const char* tag;
    };
    for (const Case& c : {Case{0.5f, 1, "0_5"}, Case{1.0f, 3, "1_0"}, Case{1.5f, 4, "1_5"}, Case{2.2f, 6, "2_2"}}) {
        SCOPED_TRACE(c.sigma);
        GaussianFilter1D g(c.sigma);
        ASSERT_EQ(g.radius(), c.radius);
        ASSERT_EQ(g.kernel().size(), static_cast<unsigned int>(2 * c.radius + 1));
        EXPECT_EQ(g.kernel().getAnchor(), c.radius);
        const std::vector<float> k = coefficients(g.kernel());
        EXPECT_NEAR(std::accumulate(k.begin(), k.end(), 0.0), 1.0, 1e-6);
        for (std::size_t j = 0; j < k.size(); ++j) EXPECT_EQ(k[j], k[k.size() - 1 - j]);
        const std::vector<double> reference = fixtures::values(std::string("gauss1d_kernel_") + c.tag);
        ASSERT_EQ(reference.size(), k.size());
        for (std::size_t j = 0; j < k.size(); ++j) EXPECT_NEAR(k[j], reference[j], 2e-7);
    }
    for (float tiny : {0.0f, 0.3f}) {
        GaussianFilter1D g(tiny);
        EXPECT_EQ(coefficients(g.kernel()), std::vector<float>{1.0f});
        const std::vector<float> data = {3, -1, 7};
        std::vector<float> out(3);
        g.filter(data.data(), 3, 1, 1, out.data());
        EXPECT_EQ(out, data);
    }
}

TEST(GaussianFilter1D, FilteringMatchesNumpyAndTheShortcutAgrees) {
    const std::vector<float> signal = fixtures::floats("signal");
    ASSERT_EQ(signal.size(), 40u);
    const int n = static_cast<int>(signal.size());
    for (auto c : {std::make_pair(0.5f, "0_5"), std::make_pair(1.0f, "1_0"), std::make_pair(2.2f, "2_2")}) {
        SCOPED_TRACE(c.first);
        GaussianFilter1D g(c.first);
        std::vector<float> out(signal.size());
        g.filter(signal.data(), n, 1, 1, out.data());
        const std::vector<double> reference = fixtures::values(std::string("gauss1d_out_") + c.second);
        ASSERT_EQ(reference.size(), out.size());
        for (int i = 0; i < n; ++i) {
            EXPECT_NEAR(out[i], reference[i], 1e-6);
            float at = 0;
            g.filterAt(signal.data(), n, 1, i, &at);
            EXPECT_NEAR(at, out[i], 1e-6);
        }
    }
    // At index 0 with radius 2, the left taps all read sample 0.
    GaussianFilter1D g(0.7f);
    ASSERT_EQ(g.radius(), 2);
    const std::vector<float> data = {2, 4, 8, 16, 32};
    float at = 0;
    g.filterAt(data.data(), 5, 1, 0, &at);
    const QVFilterKernel1D& k = g.kernel();
    EXPECT_FLOAT_EQ(at, (k[0] + k[1] + k[2]) * 2 + k[3] * 4 + k[4] * 8);
    // A constant signal stays constant.
    const std::vector<float> flat(50, 3.25f);
    std::vector<float> out(50);
    GaussianFilter1D(2.2f).filter(flat.data(), 50, 1, 1, out.data());
    for (float v : out) EXPECT_NEAR(v, 3.25f, 1e-5);
}

TEST(DoGFilter1D, HigherMinusLowerWhicheverIsLarger) {
    const std::vector<float> signal = fixtures::floats("signal");
    const int n = static_cast<int>(signal.size());
    DoGFilter1D dog(1.0f, 2.2f);
    std::vector<float> out(signal.size()), swapped(signal.size()), kernelOut(signal.size());
    dog.filter(signal.data(), n, 1, 1, out.data());
    const std::vector<double> reference = fixtures::values("dog1d_out_1_0_2_2");
    ASSERT_EQ(reference.size(), out.size());
    for (int i = 0; i < n; ++i) EXPECT_NEAR(out[i], reference[i], 1e-6);
    // The combined kernel (higher covers lower) gives the same response.
    dog.kernel().filter(signal.data(), n, 1, 1, kernelOut.data());
    for (int i = 0; i < n; ++i) EXPECT_NEAR(kernelOut[i], out[i], 1e-6);
    DoGFilter1D(2.2f, 1.0f).filter(signal.data(), n, 1, 1, swapped.data());
    for (int i = 0; i < n; ++i) EXPECT_FLOAT_EQ(swapped[i], -out[i]);
    float at = 0;
    dog.filterAt(signal.data(), n, 1, 7, &at);
    EXPECT_NEAR(at, out[7], 1e-6);
    // Equal sigmas, and any constant signal, give zeros.
    DoGFilter1D(1.0f, 1.0f).filter(signal.data(), n, 1, 1, out.data());
    for (float v : out) EXPECT_EQ(v, 0.0f);
    const std::vector<float> flat(30, -2.0f);
    dog.filter(flat.data(), 30, 1, 1, out.data());
    for (int i = 0; i < 30; ++i) EXPECT_NEAR(out[i], 0.0f, 1e-6);
    // Copies re-run init and filter alike.
    DoGFilter1D copy(dog);
    EXPECT_EQ(copy.toJson(), "{\"sigmaL\":1, \"sigmaH\":2.2}");
}

TEST(Filter2D, GaussianAndDoGMatchOpenCV) {
    const std::vector<float> image = fixtures::floats("image_17x11");
    ASSERT_EQ(image.size(), 17u * 11u);
    // Source and target with padded strides, to catch stride mix-ups.
    std::vector<float> src(20 * 11, -1e9f), dst(19 * 11, 0.0f);
    for (int y = 0; y < 11; ++y)
        for (int x = 0; x < 17; ++x) src[y * 20 + x] = image[y * 17 + x];
    struct Case {
        Filter2D* filter;
        const char* reference;
        double tolerance;
    };
    GaussianFilter2D gauss(1.0f, 1.5f);
    DoGFilter2D dog(1.0f, 2.0f);
    for (const Case& c : {Case{&gauss, "gauss2d_out_1_0_1_5", 2e-4}, Case{&dog, "dog2d_out_1_0_2_0", 2e-4}}) {
        SCOPED_TRACE(c.reference);
        const std::vector<double> reference = fixtures::values(c.reference);
        ASSERT_EQ(reference.size(), image.size());
        for (int round = 0; round < 2; ++round) {  // the second run reuses the buffers
            c.filter->filter(src.data(), 17, 11, 20, 19, dst.data());
            for (int y = 0; y < 11; ++y)
                for (int x = 0; x < 17; ++x) EXPECT_NEAR(dst[y * 19 + x], reference[y * 17 + x], c.tolerance);
        }
    }
    // A smaller frame after a larger one.
    gauss.filter(src.data(), 5, 3, 20, 19, dst.data());
    GaussianFilter2D small(1.0f, 1.5f);
    std::vector<float> alone(19 * 3);
    small.filter(src.data(), 5, 3, 20, 19, alone.data());
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 5; ++x) EXPECT_EQ(dst[y * 19 + x], alone[y * 19 + x]);
}

TEST(Filter2D, CopyKeepsBothSigmasAssignmentTakesTheHorizontalOne) {
    GaussianFilter2D source(1.0f, 2.0f);
    GaussianFilter2D copied(source);
    GaussianFilter2D assigned(3.0f);
    assigned = source;
    EXPECT_EQ(copied.toJson(), "{\"sigmaHorizontal\":1,\"sigmaVertical\":2}");
    EXPECT_EQ(assigned.toJson(), "{\"sigmaHorizontal\":1,\"sigmaVertical\":1}");
    assigned = assigned;
    EXPECT_EQ(assigned.toJson(), "{\"sigmaHorizontal\":1,\"sigmaVertical\":1}");
    std::unique_ptr<Filter2D> cloned(source.clone());
    EXPECT_EQ(cloned->toJson(), source.toJson());
}

TEST(Filter2D, WithoutOneDimensionalFiltersRaises) {
    GaussianFilter2D empty;
    float pixel = 1.0f, out = 0.0f;
    EXPECT_THROW(empty.filter(&pixel, 1, 1, 1, 1, &out), qv_unsupported_error);
    EXPECT_THROW(empty.toJson(), qv_unsupported_error);
    DoGFilter2D dog;
    EXPECT_THROW(dog.filter(&pixel, 1, 1, 1, 1, &out), qv_unsupported_error);
    try {
        dog.toJson();
        ADD_FAILURE() << "a DoG without Gaussians can't be written";
    } catch (const JsonError& e) {
        EXPECT_STREQ(e.what(), "Json serialization error");
    }
    GaussianFilter2D released(1.0f);
    released.release();
    EXPECT_THROW(released.filter(&pixel, 1, 1, 1, 1, &out), qv_unsupported_error);
}

TEST(Filters, JsonFormsAndFactories) {
    struct Case {
        std::string description;
        std::string json;  // empty: the factory gives null
    };
    const std::vector<Case> oneD = {
        {"{\"name\":\"QV_FILTER1D_GAUSSIAN\",\"param\":{\"sigma\":1.5}}", "{\"sigma\":1.5}"},
        {"{\"name\":\"QV_FILTER1D_GAUSSIAN\",\"param\":{}}", "{\"sigma\":0}"},
        {"{\"name\":\"QV_FILTER1D_DOG\",\"param\":{\"sigmaL\":1, \"sigmaH\":2}}", "{\"sigmaL\":1, \"sigmaH\":2}"},
        {"{\"name\":\"QV_FILTER1D_DOG\",\"param\":{\"sigmaH\":2}}", "{\"sigmaL\":0, \"sigmaH\":2}"},
        {"{\"name\":\"QV_FILTER1D_GAUSSIAN\",\"param\":{\"sigma\":-1}}", ""},
        {"{\"name\":\"QV_FILTER1D_GAUSSIAN\",\"param\":[1]}", ""},
        {"{\"name\":\"QV_FILTER1D_GAUSSIAN\"}", ""},
        {"{\"name\":\"QV_FILTER2D_GAUSSIAN\",\"param\":{}}", ""},
    };
    for (const Case& c : oneD) {
        SCOPED_TRACE(c.description);
        std::unique_ptr<Filter1D> f(Filter1DFactory::instance().createInstance(c.description));
        ASSERT_EQ(f == nullptr, c.json.empty());
        if (!f) continue;
        EXPECT_EQ(f->toJson(), c.json);
        EXPECT_EQ(c.description.find(f->name()), 9u);
    }
    const std::vector<Case> twoD = {
        {"{\"name\":\"QV_FILTER2D_GAUSSIAN\",\"param\":{\"sigmaHorizontal\":1,\"sigmaVertical\":2.5}}",
         "{\"sigmaHorizontal\":1,\"sigmaVertical\":2.5}"},
        {"{\"name\":\"QV_FILTER2D_DOG\",\"param\":{\"lowerFilter\":{\"sigmaHorizontal\":1,\"sigmaVertical\":1}, "
         "\"higherFilter\":{\"sigmaHorizontal\":2,\"sigmaVertical\":2}}}",
         "{\"lowerFilter\":{\"sigmaHorizontal\":1,\"sigmaVertical\":1}, "
         "\"higherFilter\":{\"sigmaHorizontal\":2,\"sigmaVertical\":2}}"},
        {"{\"name\":\"QV_FILTER1D_DOG\",\"param\":{}}", ""},
    };
    for (const Case& c : twoD) {
        SCOPED_TRACE(c.description);
        std::unique_ptr<Filter2D> f(Filter2DFactory::instance().createInstance(c.description));
        ASSERT_EQ(f == nullptr, c.json.empty());
        if (!f) continue;
        EXPECT_EQ(f->toJson(), c.json);
        std::unique_ptr<Filter2D> twin(f->clone());
        EXPECT_EQ(twin->toJson(), c.json);
    }
    // A 2-D Gaussian with only one key stays as it was; a DoG keeps an absent member.
    GaussianFilter2D g(1.0f, 2.0f);
    g.fromJson("{\"sigmaHorizontal\":5}");
    EXPECT_EQ(g.toJson(), "{\"sigmaHorizontal\":1,\"sigmaVertical\":2}");
    DoGFilter2D dog(1.0f, 3.0f);
    dog.fromJson("{\"higherFilter\":{\"sigmaHorizontal\":4,\"sigmaVertical\":4}}");
    EXPECT_EQ(dog.toJson(), "{\"lowerFilter\":{\"sigmaHorizontal\":1,\"sigmaVertical\":1}, "
                            "\"higherFilter\":{\"sigmaHorizontal\":4,\"sigmaVertical\":4}}");
    GaussianFilter1D keep(2.0f);
    keep.fromJson("{}");
    EXPECT_EQ(keep.radius(), 6);
    EXPECT_THROW(keep.fromJson("{\"sigma\":1"), JsonError);
}

TEST(Filters, BadSigmasFailWithoutTouchingMemory) {
    for (float bad : {-0.1f, -0.5f, -100.0f, std::nanf(""), INFINITY, 1e30f}) {
        SCOPED_TRACE(bad);
        EXPECT_THROW(GaussianFilter1D g(bad), std::bad_alloc);
        EXPECT_THROW(DoGFilter1D d(1.0f, bad), std::bad_alloc);
    }
    GaussianFilter1D g(1.0f);
    EXPECT_THROW(g.init(-1.0f), std::bad_alloc);
    EXPECT_EQ(g.kernel().size(), 0u) << "released before the failure";
    // floor(3 * sigma) is negative for every negative sigma, but not for -0.
    EXPECT_EQ(GaussianFilter1D(-0.0f).radius(), 0);
}

}  // namespace
