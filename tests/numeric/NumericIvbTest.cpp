// Vector quantizer, nearest-centroid classifier and PCA projection: routing,
// distances and the numpy projection; their binary forms in both directions;
// and damaged bytes, each refused with its error, leaving the object as it was.

#include <gtest/gtest.h>

#include <cstring>

#include "container/IvbBytes.h"
#include "core/Errors.h"
#include "numeric/Fixtures.h"
#include "quorin/ProjectionTransforms.h"
#include "quorin/QVIVBObject.h"
#include "quorin/VectorQuantizer.h"
#include "support/IvbGolden.h"

namespace {

using Bytes = std::vector<uint8_t>;

// Loads `bytes` into an object holding `golden`: the error text, "" when it
// loaded (and writes `bytes` back). A refused load must leave the object as it was.
template <typename T>
std::string loadOverGolden(const Bytes& golden, const Bytes& bytes) {
    T object;
    object.fromIvb(golden);
    try {
        object.fromIvb(bytes);
        EXPECT_EQ(object.toIvb(), bytes);
        return "";
    } catch (const std::exception& e) {
        EXPECT_EQ(object.toIvb(), golden) << "the object must stay as it was";
        return e.what();
    }
}

// The three classes behind one face, so that every table runs over all of them.
struct Model {
    const char* name;
    Bytes golden;
    std::string (*load)(const Bytes& golden, const Bytes& bytes);
};

const std::vector<Model> kModels = {
    {"VectorQuantizer", ivbgolden::vectorQuantizer(), &loadOverGolden<VectorQuantizer>},
    {"NearestCentroidClassifier", ivbgolden::nearestCentroids(), &loadOverGolden<NearestCentroidClassifier>},
    {"PcaTransform", ivbgolden::pcaTransform(), &loadOverGolden<PcaTransform>}};

template <typename T>
Bytes raw(std::initializer_list<T> values) {
    Bytes out(values.size() * sizeof(T));
    std::memcpy(out.data(), values.begin(), out.size());
    return out;
}

// One member: an object of any kind and sub type over raw element bytes.
struct Member {
    uint32_t tag;
    uint8_t subType;
    Bytes elements;
    uint8_t kind = ivb::kBasic;
};
constexpr uint8_t kF = 12, kU = 8;

Bytes composite(const std::vector<Member>& members) {
    QVIVBCompositeObjectPacker packer;
    for (const Member& m : members) {
        Bytes object(16 + m.elements.size());
        ivb::putObjectHeader(object.data(), object.size(), m.kind, m.subType);
        std::copy(m.elements.begin(), m.elements.end(), object.begin() + 16);
        packer.appendObjInfo(std::string(), m.tag);
        packer.appendObj(object);
    }
    return packer.data();
}

}  // namespace

TEST(VectorQuantizer, RoutesThroughTheTreeAndRefusesTreesThatDoNotFit) {
    EXPECT_THROW(VectorQuantizer().quantize(nullptr), qv_operation_error);
    // Node 0 splits on x at 0, node 1 on y at 0, node 2 on x + y at 10; leaves
    // carry codes 0..3. Below the threshold goes left, ties go right.
    VectorQuantizer q;
    q.setTree(3, 2, {1, 0, 0, 1, 1, 1}, {0, 0, 10});
    for (const auto& c : std::vector<std::pair<std::vector<float>, unsigned>>{
             {{-1, -1}, 0}, {{-1, 0}, 1}, {{-5, 3}, 1}, {{0, 0}, 2}, {{4, 5}, 2}, {{4, 6}, 3}, {{20, -1}, 3}})
        EXPECT_EQ(q.quantize(c.first.data()), c.second) << c.first[0] << "," << c.first[1];
    EXPECT_THROW(q.setTree(3, 2, {1, 0, 0, 1, 1}, {0, 0, 10}), qv_invalid_argument);
    EXPECT_THROW(q.setTree(2, 2, {1, 0, 0, 1}, {0}), qv_invalid_argument);
    EXPECT_THROW(q.setTree(1, 0, {}, {0}), qv_invalid_argument);
    EXPECT_EQ(q.codeNum(), 4u);
    // No inner node: one leaf of code 0 that never reads the vector. A
    // dimension stored with no element keeps the present one.
    q.fromIvb(composite({{96, kU, raw<uint32_t>({0})}, {64, kU, {}}, {97, kF, {}}, {98, kF, {}}}));
    EXPECT_EQ(q.quantize(nullptr), 0u);
    EXPECT_EQ(q.dimension(), 2u);
}

TEST(NearestCentroidClassifier, L1DistanceTiesAndChecks) {
    const NearestCentroidClassifier c(3, {{0, 0, 0}, {10, 10, 10}, {1, -1, 0}, {-1, 1, 0}}, "L1");
    EXPECT_EQ(c.classify({0.9f, -1.1f, 0}), 2u);
    EXPECT_EQ(c.classify({1, 0, 0}), 0u) << "rows 0 and 2 are both at 1; the earlier wins";
    EXPECT_THROW(c.classify({1, 2}), qv_data_error);
    EXPECT_THROW(NearestCentroidClassifier(2, {{1, 2}}, "L2").classify({5, 5}), qv_operation_error);
    EXPECT_THROW(NearestCentroidClassifier(2, {{1, 2}, {3}}, "L1"), qv_invalid_argument);
    EXPECT_EQ(NearestCentroidClassifier(2, {}, "L1").classify({5, 5}), 0u) << "no centroids";
    EXPECT_THROW(NearestCentroidClassifier().classify({}), qv_operation_error) << "no metric";
}

TEST(PcaTransform, MatchesNumpyAndChecksSizes) {
    const std::vector<float> mean = fixtures::floats("pca_mean"), rows = fixtures::floats("pca_projection_rows");
    std::vector<float> input = fixtures::floats("pca_input");
    ASSERT_EQ(mean.size(), 24u);
    ASSERT_EQ(rows.size(), 5u * 24u);
    ASSERT_EQ(input.size(), 24u);
    const Eigen::MatrixXf projection = Eigen::Map<const Eigen::Matrix<float, 5, 24, Eigen::RowMajor>>(rows.data());
    const PcaTransform pca(Eigen::Map<const Eigen::VectorXf>(mean.data(), 24), projection);
    std::vector<float> out(6, -7.0f);
    EXPECT_THROW(pca.transform(input.data(), 23, out.data()), qv_invalid_argument);
    input.push_back(1e9f);  // a longer input is read only up to rawDim
    pca.transform(input.data(), 25, out.data());
    EXPECT_EQ(out[5], -7.0f) << "written past pcaDim";
    out.pop_back();
    fixtures::expectAgrees(out, "pca_output", 1e-4);
    EXPECT_THROW(PcaTransform(Eigen::VectorXf::Zero(3), Eigen::MatrixXf::Zero(2, 4)), qv_invalid_argument);
}

TEST(NumericIvb, HandWrittenLayoutsBothWays) {
    VectorQuantizer q;
    q.setTree(1, 2, {1.0f, -1.0f}, {0.5f});
    EXPECT_EQ(q.toIvb(), ivbgolden::vectorQuantizer());
    EXPECT_EQ(NearestCentroidClassifier(2, {{1, 2}, {3, 4}}, "L1").toIvb(), ivbgolden::nearestCentroids());
    Eigen::MatrixXf projection(2, 3);
    projection << 1, 2, 3, 4, 0.5f, -1;
    EXPECT_EQ(PcaTransform(Eigen::Vector3f(0.5f, 1, 2), projection).toIvb(), ivbgolden::pcaTransform());

    // Matrices are stored row by row: (1, 2) = -1 is element 5.
    PcaTransform pca;
    pca.fromIvb(ivbgolden::pcaTransform());
    EXPECT_EQ(pca.projection()(1, 2), -1.0f);
    for (const Model& m : kModels) EXPECT_EQ(m.load(m.golden, m.golden), "") << m.name;
}

// Damaged members are left to FuzzIvbUnpacker, which loads all three models.
