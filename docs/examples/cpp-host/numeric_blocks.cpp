// Builds filters and normalizers from their descriptions through the
// library's factories, prints each one's name and JSON form, and runs it on a
// short signal: one line per object. Then stores a host's discriminant as a
// face model.
//
//   numeric_blocks

#include <quorin/FilterFactory.h>
#include <quorin/JsonError.h>
#include <quorin/LDAModel.h>
#include <quorin/NormalizerFactory.h>
#include <quorin/QVFaceModel.h>

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

namespace {

void print(const std::string& name, const std::string& json, const std::vector<float>& values) {
    std::printf("%s %s", name.c_str(), json.c_str());
    for (float v : values) std::printf(" %.4f", v);
    std::printf("\n");
}

}  // namespace

int main() {
    const std::vector<float> step = {0, 0, 0, 1, 1, 1};
    for (const char* description : {R"({"name":"QV_FILTER1D_GAUSSIAN","param":{"sigma":1}})",
                                    R"({"name":"QV_FILTER1D_DOG","param":{"sigmaL":0.5,"sigmaH":1}})"}) {
        std::unique_ptr<Filter1D> filter(Filter1DFactory::instance().createInstance(description));
        if (!filter) return 1;
        std::vector<float> out(step.size());
        filter->filter(step.data(), static_cast<int>(step.size()), 1, 1, out.data());
        print(filter->name(), filter->toJson(), out);
    }
    // A 3 x 2 image, rows of the step's halves.
    for (const char* description : {R"({"name":"QV_FILTER2D_GAUSSIAN","param":{"sigmaHorizontal":1,"sigmaVertical":0.5}})",
                                    R"({"name":"QV_FILTER2D_DOG","param":{"lowerFilter":{"sigmaHorizontal":0.5,"sigmaVertical":0.5},"higherFilter":{"sigmaHorizontal":1,"sigmaVertical":1}}})"}) {
        std::unique_ptr<Filter2D> filter(Filter2DFactory::instance().createInstance(description));
        if (!filter) return 1;
        std::vector<float> out(step.size());
        filter->filter(step.data(), 3, 2, 3, 3, out.data());
        print(filter->name(), filter->toJson(), out);
    }
    for (const char* description : {R"({"name":"QV_NORMALIZER_L1","param":{}})",
                                    R"({"name":"QV_NORMALIZER_L2HYS","param":{"clipThreshold":0.5,"alpha":0}})"}) {
        std::unique_ptr<QVNormalizer> normalizer(QVNormalizerFactory::instance().createInstance(description));
        if (!normalizer) return 1;
        const std::vector<float> in = {3, -4, 1};
        std::vector<float> out(in.size());
        normalizer->normalize(in.data(), static_cast<unsigned int>(in.size()), out.data());
        print(normalizer->name(), normalizer->toJson(), out);
    }
    // Unknown names and refused parameters give null; a description that is no
    // JSON object raises.
    const bool unknownIsNull = !std::unique_ptr<Filter1D>(Filter1DFactory::instance().createInstance(R"({"name":"BOX"})"));
    const bool refusedIsNull = !std::unique_ptr<QVNormalizer>(
        QVNormalizerFactory::instance().createInstance(R"({"name":"QV_NORMALIZER_L2","param":{"p":2}})"));
    bool malformedRaises = false;
    try {
        Filter2DFactory::instance().createInstance("QV_FILTER2D_DOG");
    } catch (const JsonError&) {
        malformedRaises = true;
    }
    std::printf("null for unknown %d, null for refused %d, JsonError for malformed %d\n", unknownIsNull,
                refusedIsNull, malformedRaises);

    LDAModel lda;
    lda.dimension = 2;
    lda.projection = Eigen::Vector2f(0.5f, 0.25f);
    std::printf("face model of %d values: %zu IVB bytes\n", lda.dimension, QVFaceModel(lda).toIvb().size());
    return 0;
}
