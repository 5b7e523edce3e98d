// Binary forms of the vector quantizer, the nearest-centroid classifier and the
// PCA projection: the hand-written layouts in both directions, round trips of
// larger models, and damaged bytes, each refused with its error, leaving the
// object as it was.

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "core/Errors.h"
#include "numeric/Fixtures.h"
#include "quorin/ProjectionTransforms.h"
#include "quorin/QVIVBObject.h"
#include "quorin/VectorQuantizer.h"
#include "support/IvbGolden.h"

namespace {

using Bytes = std::vector<uint8_t>;

// The three classes behind one face, so that every table runs over all of them.
struct Model {
    const char* name;
    Bytes golden;
    std::function<Bytes(const Bytes&)> reload;  // fromIvb into a fresh object, then toIvb
    // fromIvb into an object holding the golden model; returns its toIvb after
    // the attempt (also when the attempt throws, through `after`).
    std::function<void(const Bytes&, Bytes& after)> loadOverGolden;
};

template <typename T>
Model model(const char* name, const Bytes& golden) {
    return Model{name, golden,
                 [](const Bytes& bytes) {
                     T object;
                     object.fromIvb(bytes);
                     return object.toIvb();
                 },
                 [golden](const Bytes& bytes, Bytes& after) {
                     T object;
                     object.fromIvb(golden);
                     try {
                         object.fromIvb(bytes);
                     } catch (...) {
                         after = object.toIvb();
                         throw;
                     }
                     after = object.toIvb();
                 }};
}

std::vector<Model> models() {
    return {model<VectorQuantizer>("VectorQuantizer", ivbgolden::vectorQuantizer()),
            model<NearestCentroidClassifier>("NearestCentroidClassifier", ivbgolden::nearestCentroids()),
            model<PcaTransform>("PcaTransform", ivbgolden::pcaTransform())};
}

Bytes floats(std::initializer_list<float> values) {
    Bytes out(values.size() * 4);
    std::memcpy(out.data(), values.begin(), out.size());
    return out;
}
Bytes uints(std::initializer_list<uint32_t> values) {
    Bytes out(values.size() * 4);
    std::memcpy(out.data(), values.begin(), out.size());
    return out;
}

// One member: a basic object of any sub type over raw element bytes, or (sub
// type 0xFF) an empty composite in its place.
struct Member {
    uint32_t tag;
    uint8_t subType;
    Bytes elements;
};
constexpr uint8_t kF = 12, kU = 8, kI = 9, kC = 3, kUC = 4, kComposite = 0xFF;

Bytes composite(const std::vector<Member>& members) {
    QVIVBCompositeObjectPacker packer;
    for (const Member& m : members) {
        Bytes object = m.subType == kComposite ? ivbgolden::emptyComposite() : Bytes(16, 0);
        if (m.subType != kComposite) {
            const uint64_t size = 16 + m.elements.size();
            for (int i = 0; i < 8; ++i) object[static_cast<size_t>(i)] = static_cast<uint8_t>(size >> (8 * i));
            object[8] = 1;
            object[9] = m.subType;
            object.insert(object.end(), m.elements.begin(), m.elements.end());
        }
        packer.appendObjInfo(std::string(), m.tag);
        packer.appendObj(object);
    }
    return packer.data();
}

TEST(NumericIvb, HandWrittenLayoutsBothWays) {
    VectorQuantizer q;
    q.setTree(1, 2, {1.0f, -1.0f}, {0.5f});
    EXPECT_EQ(q.toIvb(), ivbgolden::vectorQuantizer());
    EXPECT_EQ(NearestCentroidClassifier(2, {{1, 2}, {3, 4}}, "L1").toIvb(), ivbgolden::nearestCentroids());
    Eigen::MatrixXf projection(2, 3);
    projection << 1, 2, 3, 4, 0.5f, -1;
    EXPECT_EQ(PcaTransform(Eigen::Vector3f(0.5f, 1, 2), projection).toIvb(), ivbgolden::pcaTransform());

    for (const Model& m : models()) EXPECT_EQ(m.reload(m.golden), m.golden) << m.name;

    // What was read works: the hyperplane x - y against 0.5 (a tie goes right).
    VectorQuantizer loaded;
    loaded.fromIvb(ivbgolden::vectorQuantizer());
    ASSERT_EQ(loaded.nodes().size(), 3u);
    const float right[2] = {1, 0}, left[2] = {0, 1}, tie[2] = {0.5f, 0};
    EXPECT_EQ(loaded.quantize(right), 1u);
    EXPECT_EQ(loaded.quantize(left), 0u);
    EXPECT_EQ(loaded.quantize(tie), 1u);
    NearestCentroidClassifier centroids;
    centroids.fromIvb(ivbgolden::nearestCentroids());
    EXPECT_EQ(centroids.metric(), "L1");
    EXPECT_EQ(centroids.classify({2.9f, 4}), 1u);
    EXPECT_EQ(centroids.classify({2, 3}), 0u) << "a tie keeps the earlier row";
    PcaTransform pca;
    pca.fromIvb(ivbgolden::pcaTransform());
    EXPECT_EQ(pca.projection()(1, 2), -1.0f);
    const float input[3] = {1.5f, 2, 3};
    float output[2] = {0, 0};
    pca.transform(input, 3, output);
    EXPECT_FLOAT_EQ(output[0], 6.0f);
    EXPECT_FLOAT_EQ(output[1], 3.5f);
}

TEST(NumericIvb, RoundTripsKeepLargerModels) {
    VectorQuantizer q;
    q.setTree(3, 2, {1, 0, 0, 1, 1, 1}, {0, 0, 10});
    VectorQuantizer q2;
    q2.fromIvb(q.toIvb());
    EXPECT_EQ(q2.toIvb(), q.toIvb());
    for (const auto& v : std::vector<std::vector<float>>{{-1, -1}, {-1, 0}, {0, 0}, {4, 6}, {20, -1}})
        EXPECT_EQ(q2.quantize(v.data()), q.quantize(v.data()));
    VectorQuantizer leaf;
    leaf.fromIvb(composite({{96, kU, uints({0})}, {64, kU, uints({7})}, {97, kF, {}}, {98, kF, {}}}));
    EXPECT_EQ(leaf.codeNum(), 1u);
    EXPECT_EQ(leaf.quantize(nullptr), 0u);

    const NearestCentroidClassifier c(3, {{0, 0, 0}, {10, 10, 10}, {1, -1, 0}}, "L1");
    NearestCentroidClassifier c2;
    c2.fromIvb(c.toIvb());
    EXPECT_EQ(c2.centroids(), c.centroids());
    EXPECT_EQ(c2.classify({9, 9, 9}), 1u);

    const std::vector<float> mean = fixtures::floats("pca_mean"), rows = fixtures::floats("pca_projection_rows"),
                             input = fixtures::floats("pca_input");
    ASSERT_EQ(rows.size(), 5u * 24u);
    Eigen::MatrixXf projection(5, 24);
    for (int r = 0; r < 5; ++r)
        for (int col = 0; col < 24; ++col) projection(r, col) = rows[static_cast<size_t>(r * 24 + col)];
    const PcaTransform pca(Eigen::Map<const Eigen::VectorXf>(mean.data(), 24), projection);
    PcaTransform pca2;
    pca2.fromIvb(pca.toIvb());
    EXPECT_EQ(pca2.projection(), pca.projection());
    EXPECT_EQ(pca2.mean(), pca.mean());
    std::vector<float> a(5), b(5);
    pca.transform(input.data(), 24, a.data());
    pca2.transform(input.data(), 24, b.data());
    EXPECT_EQ(a, b);

    // Defaults survive too (a default quantizer comes back as the one-leaf tree).
    for (const Bytes& bytes : {NearestCentroidClassifier().toIvb(), PcaTransform().toIvb()})
        EXPECT_EQ(bytes.size(), 16u + 4 * 20u + 2 * 4u);
    NearestCentroidClassifier none;
    none.fromIvb(NearestCentroidClassifier().toIvb());
    EXPECT_EQ(none.centroidNum(), 0u);
}

TEST(NumericIvb, TruncationsAndByteDamageNeverHurt) {
    for (const Model& m : models()) {
        for (size_t n = 0; n < m.golden.size(); ++n) {
            Bytes after;
            EXPECT_THROW(m.loadOverGolden(Bytes(m.golden.begin(), m.golden.begin() + static_cast<long>(n)), after),
                         qv_ivb_conversion_error)
                << m.name << " cut at " << n;
            EXPECT_EQ(after, m.golden) << m.name << " cut at " << n;
        }
        // Every byte replaced by a few telling values: either a clean load or a
        // clean refusal that leaves the object as it was (the sanitizers watch).
        for (size_t at = 0; at < m.golden.size(); ++at) {
            for (uint8_t value : {0x00, 0x01, 0x7F, 0xFF}) {
                Bytes damaged = m.golden;
                damaged[at] = value;
                Bytes after;
                try {
                    m.loadOverGolden(damaged, after);
                } catch (const std::exception&) {
                    EXPECT_EQ(after, m.golden) << m.name << " byte " << at << " = " << int(value);
                }
            }
        }
    }
}

TEST(NumericIvb, DamagedMembersGetTheirErrors) {
    enum Error { kConversion, kMissing, kNotBasic, kBadSubType };
    struct Case {
        const char* what;
        size_t model;  // index into models()
        std::vector<Member> members;
        Error error;
    };
    const Bytes w = floats({1, -1}), t = floats({0.5f}), two = uints({2}), one = uints({1});
    const Bytes rows = floats({1, 2, 3, 4}), metric = {'L', '1'};
    const std::vector<Case> cases = {
        {"more inner nodes than arrays", 0, {{96, kU, two}, {64, kU, two}, {97, kF, w}, {98, kF, t}}, kConversion},
        {"weights longer than n * dimension", 0, {{96, kU, one}, {64, kU, two}, {97, kF, floats({1, 2, 3})}, {98, kF, t}},
         kConversion},
        {"thresholds missing", 0, {{96, kU, one}, {64, kU, two}, {97, kF, w}}, kMissing},
        {"innerNodeNum stored as int", 0, {{96, kI, one}, {64, kU, two}, {97, kF, w}, {98, kF, t}}, kConversion},
        {"innerNodeNum of two elements", 0, {{96, kU, uints({1, 1})}, {64, kU, two}, {97, kF, w}, {98, kF, t}},
         kConversion},
        {"weights as a composite", 0, {{96, kU, one}, {64, kU, two}, {97, kComposite, {}}, {98, kF, t}}, kNotBasic},
        {"weights of sub type 0", 0, {{96, kU, one}, {64, kU, two}, {97, 0, w}, {98, kF, t}}, kConversion},
        {"weights of sub type 99", 0, {{96, kU, one}, {64, kU, two}, {97, 99, w}, {98, kF, t}}, kBadSubType},
        {"heap indices beyond int", 0, {{96, kU, uints({0x3FFFFFFF})}, {64, kU, uints({0})}, {97, kF, {}}, {98, kF, t}},
         kConversion},
        {"many rows of dimension 0", 1, {{64, kU, uints({0})}, {192, kU, uints({0xFFFFFFFF})}, {193, kF, {}}, {194, kC, metric}},
         kConversion},
        {"counts whose product wraps 32 bits", 1,
         {{64, kU, uints({0x10000})}, {192, kU, uints({0x10000})}, {193, kF, {}}, {194, kC, metric}}, kConversion},
        {"rows shorter than they say", 1, {{64, kU, two}, {192, kU, two}, {193, kF, floats({1, 2, 3})}, {194, kC, metric}},
         kConversion},
        {"metric as unsigned char", 1, {{64, kU, two}, {192, kU, two}, {193, kF, rows}, {194, kUC, metric}}, kConversion},
        {"metric missing", 1, {{64, kU, two}, {192, kU, two}, {193, kF, rows}}, kMissing},
        {"outputs from no input", 2, {{64, kU, uints({0})}, {128, kU, uints({0x40000000})}, {129, kF, {}}, {130, kF, {}}},
         kConversion},
        {"mean longer than rawDim", 2, {{64, kU, one}, {128, kU, one}, {129, kF, w}, {130, kF, t}}, kConversion},
        {"projection shorter than pcaDim * rawDim", 2, {{64, kU, two}, {128, kU, two}, {129, kF, w}, {130, kF, w}},
         kConversion},
        {"pcaDim missing", 2, {{64, kU, one}, {129, kF, t}, {130, kF, t}}, kMissing},
    };
    const std::vector<Model> all = models();
    for (const Case& c : cases) {
        const Model& m = all[c.model];
        Bytes after;
        try {
            m.loadOverGolden(composite(c.members), after);
            ADD_FAILURE() << c.what << ": loaded";
        } catch (const qv_ivb_conversion_error& e) {
            EXPECT_EQ(c.error, kConversion) << c.what;
            EXPECT_STREQ(e.what(), "QV IVB object conversion error") << c.what;
        } catch (const qv_data_error& e) {
            EXPECT_EQ(c.error, kMissing) << c.what;
            EXPECT_STREQ(e.what(), "Could not find corresponding object id") << c.what;
        } catch (const std::invalid_argument& e) {
            EXPECT_EQ(std::string(e.what()), c.error == kNotBasic ? "Not a valid basic IVB object id" : "Invalid IVB sub type")
                << c.what;
            EXPECT_TRUE(c.error == kNotBasic || c.error == kBadSubType) << c.what;
        }
        EXPECT_EQ(after, m.golden) << c.what << ": the object must stay as it was";
    }
}

}  // namespace
