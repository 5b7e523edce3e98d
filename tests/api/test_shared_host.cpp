// A host linked against the shared library alone, with the public headers
// only: the exported records and entries must be reachable through the
// library's visible symbols.

#include <gtest/gtest.h>

#include <stdexcept>
#include <vector>

#include "quorin/ApiError.h"
#include "quorin/FaceData.h"
#include "quorin/JsonError.h"
#include "quorin/QVFace.h"
#include "quorin/quorinapi.h"

namespace {

TEST(SharedLibraryHost, RecordsTravelThroughTheExportedInterface) {
    FaceData data;
    data.setFaceRect(Rect2<int32_t>(1, 2, 3, 4));
    data.setLandmark("nose", Point2<float>(0.5f, 0.25f));
    QVFace face;
    face.fromJson(data.toJson());
    QVFace copy(face);
    EXPECT_EQ(copy.faceRect().bottom, 4);
    EXPECT_EQ(copy.landmark("nose").y, 0.25f);
    try {
        copy.fromJson("[]");
        FAIL() << "a bad text must raise";
    } catch (const ApiError&) {
        // The library's own exception type is seen by the host.
    }
    EXPECT_THROW(copy.landmark("chin"), std::invalid_argument);

    // The text members of the record values come from the library too.
    Rect2<int32_t> rect;
    rect.fromJson(data.faceRect().toJson());
    EXPECT_EQ(rect, data.faceRect());
    EXPECT_THROW(rect.fromJson("[1,2,3]"), JsonError);
}

TEST(SharedLibraryHost, EntriesWithoutSessionReportNoFace) {
    quorin_release();
    std::vector<unsigned char> frame(32 * 32);
    std::vector<int> results(17);
    EXPECT_EQ(quorin_detect(frame.data(), 32, 32, results.data(), 1, 0), 0);
    EXPECT_EQ(quorin_detect360High(frame.data(), 32, 32, results.data(), 1), 0);
}

}  // namespace
