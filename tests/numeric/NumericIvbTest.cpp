// Binary forms of the vector quantizer, the nearest-centroid classifier and the
// PCA projection: the hand-written layouts in both directions, round trips of
// larger models, and damaged bytes, each refused with its error, leaving the
// object as it was.

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "core/Errors.h"
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

template <typename T>
Bytes raw(std::initializer_list<T> values) {
    Bytes out(values.size() * sizeof(T));
    std::memcpy(out.data(), values.begin(), out.size());
    return out;
}
Bytes floats(std::initializer_list<float> values) { return raw(values); }
Bytes uints(std::initializer_list<uint32_t> values) { return raw(values); }

// One member: a basic object of any sub type over raw element bytes.
struct Member {
    uint32_t tag;
    uint8_t subType;
    Bytes elements;
};
constexpr uint8_t kF = 12, kU = 8, kI = 9, kC = 3, kUC = 4;

Bytes composite(const std::vector<Member>& members) {
    QVIVBCompositeObjectPacker packer;
    for (const Member& m : members) {
        Bytes object(16, 0);
        const uint64_t size = 16 + m.elements.size();
        for (int i = 0; i < 8; ++i) object[static_cast<size_t>(i)] = static_cast<uint8_t>(size >> (8 * i));
        object[8] = 1;
        object[9] = m.subType;
        object.insert(object.end(), m.elements.begin(), m.elements.end());
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

    // What was read works: the hyperplane x - y against 0.5, the nearest row,
    // the projection with (1, 2) read from stored element 5.
    VectorQuantizer loaded;
    loaded.fromIvb(ivbgolden::vectorQuantizer());
    const float right[2] = {1, 0}, left[2] = {0, 1};
    EXPECT_EQ(loaded.quantize(right), 1u);
    EXPECT_EQ(loaded.quantize(left), 0u);
    NearestCentroidClassifier centroids;
    centroids.fromIvb(ivbgolden::nearestCentroids());
    EXPECT_EQ(centroids.classify({2.9f, 4}), 1u);
    PcaTransform pca;
    pca.fromIvb(ivbgolden::pcaTransform());
    EXPECT_EQ(pca.projection()(1, 2), -1.0f);
    const float input[3] = {1.5f, 2, 3};
    float output[2] = {0, 0};
    pca.transform(input, 3, output);
    EXPECT_FLOAT_EQ(output[0], 6.0f);
    EXPECT_FLOAT_EQ(output[1], 3.5f);
}

TEST(NumericIvb, RoundTripsKeepTheTree) {
    VectorQuantizer q;
    q.setTree(3, 2, {1, 0, 0, 1, 1, 1}, {0, 0, 10});
    VectorQuantizer q2;
    q2.fromIvb(q.toIvb());
    EXPECT_EQ(q2.toIvb(), q.toIvb());
    for (const auto& v : std::vector<std::vector<float>>{{-1, -1}, {-1, 0}, {0, 0}, {4, 6}, {20, -1}})
        EXPECT_EQ(q2.quantize(v.data()), q.quantize(v.data()));
    // No inner node: one leaf of code 0 that never reads the vector.
    q2.fromIvb(composite({{96, kU, uints({0})}, {64, kU, uints({7})}, {97, kF, {}}, {98, kF, {}}}));
    EXPECT_EQ(q2.codeNum(), 1u);
    EXPECT_EQ(q2.quantize(nullptr), 0u);
}

TEST(NumericIvb, EveryTruncationIsRefused) {
    for (const Model& m : models()) {
        for (size_t n = 0; n < m.golden.size(); ++n) {
            Bytes after;
            EXPECT_THROW(m.loadOverGolden(Bytes(m.golden.begin(), m.golden.begin() + static_cast<long>(n)), after),
                         qv_ivb_conversion_error)
                << m.name << " cut at " << n;
            EXPECT_EQ(after, m.golden) << m.name << " cut at " << n;
        }
    }
}

TEST(NumericIvb, DamagedMembersGetTheirErrors) {
    enum Error { kConversion, kMissing };
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
        {"thresholds missing", 0, {{96, kU, one}, {64, kU, two}, {97, kF, w}}, kMissing},
        {"innerNodeNum stored as int", 0, {{96, kI, one}, {64, kU, two}, {97, kF, w}, {98, kF, t}}, kConversion},
        {"weights of sub type 0", 0, {{96, kU, one}, {64, kU, two}, {97, 0, w}, {98, kF, t}}, kConversion},
        {"heap indices beyond int", 0, {{96, kU, uints({0x3FFFFFFF})}, {64, kU, uints({0})}, {97, kF, {}}, {98, kF, t}},
         kConversion},
        {"many rows of dimension 0", 1, {{64, kU, uints({0})}, {192, kU, uints({0xFFFFFFFF})}, {193, kF, {}}, {194, kC, metric}},
         kConversion},
        {"counts whose product wraps 32 bits", 1,
         {{64, kU, uints({0x10000})}, {192, kU, uints({0x10000})}, {193, kF, {}}, {194, kC, metric}}, kConversion},
        {"metric as unsigned char", 1, {{64, kU, two}, {192, kU, two}, {193, kF, rows}, {194, kUC, metric}}, kConversion},
        {"outputs from no input", 2, {{64, kU, uints({0})}, {128, kU, uints({0x40000000})}, {129, kF, {}}, {130, kF, {}}},
         kConversion},
        {"mean longer than rawDim", 2, {{64, kU, one}, {128, kU, one}, {129, kF, w}, {130, kF, t}}, kConversion},
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
        }
        EXPECT_EQ(after, m.golden) << c.what << ": the object must stay as it was";
    }
}

}  // namespace
