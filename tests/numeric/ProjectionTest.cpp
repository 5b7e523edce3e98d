// Vector quantizer, nearest-centroid classifier and PCA projection: tree
// layout and routing, distances and ties, the numpy projection, and the
// failures of unloaded or mismatched models. Also checks that the stored
// texts of this subsystem are current.

#include <gtest/gtest.h>

#include <cstdlib>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "core/Descramble.h"
#include "core/Errors.h"
#include "numeric/Fixtures.h"
#include "numeric/NumericTexts.h"
#include "quorin/ProjectionTransforms.h"
#include "quorin/VectorQuantizer.h"
#include "support/SourceTree.h"

namespace {

TEST(VectorQuantizer, HeapLayoutAndRouting) {
    VectorQuantizer empty;
    const float v[2] = {0.0f, 0.0f};
    EXPECT_THROW(empty.quantize(v), qv_operation_error);

    VectorQuantizer single;
    single.setTree(0, 2, {}, {});
    ASSERT_EQ(single.nodes().size(), 1u);
    EXPECT_TRUE(single.nodes()[0].isLeafNode());
    EXPECT_EQ(single.codeNum(), 1u);
    EXPECT_EQ(single.quantize(nullptr), 0u);

    // Three inner nodes on 2-D vectors: node 0 splits on x at 0, node 1 on y at
    // 0, node 2 on x + y at 10. Leaves 3..6 carry codes 0..3.
    VectorQuantizer q;
    q.setTree(3, 2, {1, 0, 0, 1, 1, 1}, {0, 0, 10});
    ASSERT_EQ(q.nodes().size(), 7u);
    EXPECT_EQ(q.codeNum(), 4u);
    EXPECT_EQ(q.nodes()[1].leftChild(), 3);
    EXPECT_EQ(q.nodes()[1].rightChild(), 4);
    EXPECT_EQ(q.nodes()[2].leftChild(), 5);
    EXPECT_EQ(q.nodes()[2].rightChild(), 6);
    for (int i = 3; i < 7; ++i) {
        EXPECT_TRUE(q.nodes()[i].isLeafNode());
        EXPECT_EQ(q.nodes()[i].code(), static_cast<unsigned int>(i - 3));
        EXPECT_EQ(q.nodes()[i].weights(), nullptr);
    }
    struct Case {
        float x, y;
        unsigned int code;
    };
    // x < 0 goes left (threshold 0 > x); ties at the threshold go right.
    for (const Case& c : {Case{-1, -1, 0}, Case{-1, 0, 1}, Case{-5, 3, 1}, Case{0, 0, 2}, Case{4, 5, 2}, Case{4, 6, 3},
                          Case{20, -1, 3}}) {
        const float vec[2] = {c.x, c.y};
        EXPECT_EQ(q.quantize(vec), c.code) << c.x << "," << c.y;
    }
    EXPECT_THROW(q.nodes()[4].nextNode(v), qv_unsupported_error);
    // Sizes that don't fit the tree are refused and leave it as it was.
    EXPECT_THROW(q.setTree(3, 2, {1, 0, 0, 1, 1}, {0, 0, 10}), qv_invalid_argument);
    EXPECT_THROW(q.setTree(2, 2, {1, 0, 0, 1}, {0}), qv_invalid_argument);
    EXPECT_THROW(q.setTree(1, 0, {}, {0}), qv_invalid_argument);
    EXPECT_EQ(q.codeNum(), 4u);
}

TEST(NearestCentroidClassifier, L1DistanceTiesAndChecks) {
    const NearestCentroidClassifier c(3, {{0, 0, 0}, {10, 10, 10}, {1, -1, 0}, {-1, 1, 0}}, "L1");
    EXPECT_EQ(c.classify({9, 9, 9}), 1u);
    EXPECT_EQ(c.classify({0.2f, 0, 0}), 0u);
    EXPECT_EQ(c.classify({0, 0, 0}), 0u);
    EXPECT_EQ(c.classify({1, 0, 0}), 0u) << "rows 0 and 2 are both at 1; the earlier wins";
    EXPECT_EQ(c.classify({0, 1, 0}), 0u);
    EXPECT_EQ(c.classify({0.9f, -1.1f, 0}), 2u);
    EXPECT_THROW(c.classify({1, 2}), qv_data_error);
    EXPECT_EQ(NearestCentroidClassifier(2, {}, "L1").classify({5, 5}), 0u);
    EXPECT_THROW(NearestCentroidClassifier(2, {{1, 2}}, "L2").classify({5, 5}), qv_operation_error);
    // A default classifier fails the metric test for an empty vector, the length test otherwise.
    NearestCentroidClassifier none;
    EXPECT_THROW(none.classify({}), qv_operation_error);
    EXPECT_THROW(none.classify({1}), qv_data_error);
    EXPECT_THROW(NearestCentroidClassifier(2, {{1, 2}, {3}}, "L1"), qv_invalid_argument);
    NearestCentroidClassifier released = c;
    released.release();
    EXPECT_EQ(released.dimension(), 0u);
    EXPECT_TRUE(released.centroids().empty());
    EXPECT_EQ(c.centroidNum(), 4u) << "copies are deep";
}

TEST(PcaTransform, MatchesNumpyAndChecksSizes) {
    const std::vector<float> mean = fixtures::floats("pca_mean"), rows = fixtures::floats("pca_projection_rows"),
                             input = fixtures::floats("pca_input");
    const std::vector<double> expected = fixtures::values("pca_output");
    ASSERT_EQ(mean.size(), 24u);
    ASSERT_EQ(rows.size(), 5u * 24u);
    ASSERT_EQ(expected.size(), 5u);
    Eigen::MatrixXf projection(5, 24);
    for (int r = 0; r < 5; ++r)
        for (int c = 0; c < 24; ++c) projection(r, c) = rows[static_cast<std::size_t>(r * 24 + c)];
    const PcaTransform pca(Eigen::Map<const Eigen::VectorXf>(mean.data(), 24), projection);
    EXPECT_EQ(pca.rawDim(), 24u);
    EXPECT_EQ(pca.pcaDim(), 5u);
    std::vector<float> out(6, -7.0f);
    std::vector<float> longer = input;
    longer.push_back(1e9f);  // length takes no part beyond the check
    pca.transform(longer.data(), static_cast<unsigned int>(longer.size()), out.data());
    for (int i = 0; i < 5; ++i) EXPECT_NEAR(out[i], expected[i], 1e-4);
    EXPECT_EQ(out[5], -7.0f);
    EXPECT_THROW(pca.transform(input.data(), 23, out.data()), qv_invalid_argument);
    // pcaDim 0 writes nothing.
    const PcaTransform none(Eigen::VectorXf::Zero(3), Eigen::MatrixXf(0, 3));
    const float three[3] = {1, 2, 3};
    out[0] = -7.0f;
    none.transform(three, 3, out.data());
    EXPECT_EQ(out[0], -7.0f);
    EXPECT_THROW(PcaTransform(Eigen::VectorXf::Zero(3), Eigen::MatrixXf::Zero(2, 4)), qv_invalid_argument);
}

TEST(NumericTexts, HeaderMatchesItsTable) {
    std::istringstream table(sourcetree::readText(sourcetree::path("src/numeric/NumericTexts.txt")));
    std::map<std::string, std::string> plain;
    for (std::string line; std::getline(table, line);) {
        const std::size_t tab = line.find('\t');
        if (line.empty() || line[0] == '#' || tab == std::string::npos) continue;
        plain[line.substr(0, tab)] = line.substr(tab + 1);
    }
    EXPECT_EQ(descrambleText(scrambled::kSeparableFilterWithoutFilters), plain["kSeparableFilterWithoutFilters"]);
    EXPECT_EQ(descrambleText(scrambled::kCentroidMetricUnsupported), plain["kCentroidMetricUnsupported"]);
    const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") +
                                "' --check --table '" + sourcetree::path("src/numeric/NumericTexts.txt") +
                                "' --header '" + sourcetree::path("src/numeric/NumericTexts.h") + "'";
    EXPECT_EQ(std::system(command.c_str()), 0) << "regenerate src/numeric/NumericTexts.h";
}

}  // namespace
