// Filters against the numpy/OpenCV fixtures and closed forms (a DoG of swapped
// or equal sigmas), plus the edges the fixtures cannot show.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>

#include "core/Errors.h"
#include "core/Json.h"
#include "quorin/FilterFactory.h"
#include "numeric/Fixtures.h"
#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/FilterKernel1D.h"

namespace {

std::vector<float> coefficients(const QVFilterKernel1D& k) {
    std::vector<float> c;
    for (unsigned int i = 0; i < k.size(); ++i) c.push_back(k[i]);
    return c;
}

QVFilterKernel1D kernel(int anchor, const std::vector<float>& values) {
    QVFilterKernel1D k(anchor, static_cast<unsigned int>(values.size()));
    for (unsigned int i = 0; i < k.size(); ++i) k[i] = values[i];
    return k;
}

std::vector<float> filtered(Filter1D& f, const std::vector<float>& signal) {
    std::vector<float> out(signal.size());
    f.filter(signal.data(), static_cast<int>(signal.size()), 1, 1, out.data());
    return out;
}

}  // namespace

// Borders and strides are checked against the references below; what their
// symmetric kernels cannot show: the kernel runs backwards over the signal,
// sums align on the anchors, nothing is read or written for an empty signal,
// and an empty kernel yields 0.
TEST(FilterKernel1D, DirectionSumsAndEmptyCases) {
    const std::vector<float> data = {1, 10, 100, 1000};
    std::vector<float> out(4);
    kernel(0, {1, 2}).filter(data.data(), 4, 1, 1, out.data());  // data[i] + 2 data[i - 1], data[-1] = data[0]
    EXPECT_EQ(out, std::vector<float>({3, 12, 120, 1200}));
    const QVFilterKernel1D a = kernel(1, {1, 2, 3}), b = kernel(3, {10, 20, 30, 40, 50, 60, 70});
    for (const QVFilterKernel1D& sum : {a + b, b + a}) {
        EXPECT_EQ(sum.getAnchor(), 3);
        EXPECT_EQ(coefficients(sum), std::vector<float>({10, 20, 31, 42, 53, 60, 70}));
    }
    // Where only b reaches, a - b keeps +b.
    EXPECT_EQ(coefficients(a - b), std::vector<float>({10, 20, -29, -38, -47, 60, 70}));

    float untouched = 5.0f;
    kernel(0, {1}).filter(nullptr, 0, 1, 1, &untouched);
    EXPECT_EQ(untouched, 5.0f);
    QVFilterKernel1D().filterAt(data.data(), 4, 1, 2, &untouched);
    EXPECT_EQ(untouched, 0.0f);
}

TEST(GaussianFilter1D, KernelsAndOutputsMatchTheReferences) {
    const std::vector<float> signal = fixtures::floats("signal");
    ASSERT_EQ(signal.size(), 40u);
    for (const char* tag : {"0_5", "1_0", "1_5", "2_2"}) {
        SCOPED_TRACE(tag);
        GaussianFilter1D g(std::stof(std::string(tag).replace(1, 1, ".")));
        EXPECT_EQ(g.kernel().getAnchor(), g.radius());
        fixtures::expectAgrees(coefficients(g.kernel()), std::string("gauss1d_kernel_") + tag, 2e-7);
        const std::vector<float> out = filtered(g, signal);
        fixtures::expectAgrees(out, std::string("gauss1d_out_") + tag, 1e-6);
        for (int i = 0; i < 40; ++i) {
            float at = 0;
            g.filterAt(signal.data(), 40, 1, i, &at);
            EXPECT_NEAR(at, out[i], 1e-6);
        }
    }
    GaussianFilter1D narrow(0.3f);  // below 1/3 the kernel is {1}
    EXPECT_EQ(filtered(narrow, signal), signal);
}

TEST(DoGFilter1D, HigherMinusLowerMatchesTheReference) {
    const std::vector<float> signal = fixtures::floats("signal");
    DoGFilter1D dog(1.0f, 2.2f), swapped(2.2f, 1.0f), equal(1.0f, 1.0f);
    const std::vector<float> out = filtered(dog, signal);
    fixtures::expectAgrees(out, "dog1d_out_1_0_2_2", 1e-6);
    const std::vector<float> fromSwapped = filtered(swapped, signal), fromEqual = filtered(equal, signal);
    std::vector<float> fromKernel(signal.size());
    dog.kernel().filter(signal.data(), 40, 1, 1, fromKernel.data());  // the combined kernel
    for (std::size_t i = 0; i < signal.size(); ++i) {
        EXPECT_NEAR(fromKernel[i], out[i], 1e-6);
        EXPECT_FLOAT_EQ(fromSwapped[i], -out[i]);
        EXPECT_EQ(fromEqual[i], 0.0f);
    }
}

TEST(Filter2D, GaussianAndDoGMatchOpenCV) {
    const std::vector<float> image = fixtures::floats("image_17x11");
    ASSERT_EQ(image.size(), 17u * 11u);
    // Source and target with padded strides, to catch stride mix-ups.
    std::vector<float> src(20 * 11, -1e9f), dst(19 * 11, 0.0f), packed(17 * 11);
    for (int y = 0; y < 11; ++y)
        for (int x = 0; x < 17; ++x) src[y * 20 + x] = image[y * 17 + x];
    GaussianFilter2D gauss(1.0f, 1.5f);
    DoGFilter2D dog(1.0f, 2.0f);
    for (const auto& c : std::vector<std::pair<Filter2D*, std::string>>{{&gauss, "gauss2d_out_1_0_1_5"},
                                                                        {&dog, "dog2d_out_1_0_2_0"}}) {
        for (int round = 0; round < 2; ++round) {  // the second run reuses the buffers
            c.first->filter(src.data(), 17, 11, 20, 19, dst.data());
            for (int y = 0; y < 11; ++y)
                for (int x = 0; x < 17; ++x) packed[y * 17 + x] = dst[y * 19 + x];
            fixtures::expectAgrees(packed, c.second, 2e-4);
        }
    }
    // A smaller frame after a larger one gives what a fresh filter gives.
    std::vector<float> alone(19 * 3);
    gauss.filter(src.data(), 5, 3, 20, 19, dst.data());
    GaussianFilter2D(1.0f, 1.5f).filter(src.data(), 5, 3, 20, 19, alone.data());
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 5; ++x) EXPECT_EQ(dst[y * 19 + x], alone[y * 19 + x]);
}
