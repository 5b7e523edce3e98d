// libFuzzer target: arbitrary bytes as a composite object, and through every
// class that reads one. Any exception is a clean refusal; a crash, overrun or
// leak is a finding.
#include <cstdint>
#include <exception>
#include <vector>

#include "container/FaceModelData.h"
#include "quorin/DataBlob.h"
#include "quorin/ProjectionTransforms.h"
#include "quorin/QVIVBObject.h"
#include "quorin/VectorQuantizer.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::vector<uint8_t> bytes(data, data + size);
    QVIVBCompositeObjectUnpacker unpacker;
    try {
        unpacker.parse(bytes);
    } catch (const std::exception&) {
    }
    // Whatever was indexed, even by a parse that failed, must read safely.
    for (uint32_t id = 0; id <= unpacker.objects().size(); ++id) {
        try {
            QVIVBObjectSubType subType;
            unsigned int count = 0;
            unpacker.getBasicObjectPropertyImpl(id, subType, count);
            std::vector<uint8_t> room(static_cast<size_t>(count) * storageSize(subType));
            unpacker.unpackBasicObjectImpl<void>(id, room.data(), static_cast<unsigned int>(room.size()));
            std::string text;
            unpacker.unpackBasicObjectImpl(id, text);
        } catch (const std::exception&) {
        }
    }
    try {
        DataBlob blob;
        blob.fromIvb(bytes);
        (void)blob.toIvb();
    } catch (const std::exception&) {
    }
    try {
        DataProperty property;
        property.fromIvb(bytes);
    } catch (const std::exception&) {
    }
    try {
        FaceModelData model;
        model.fromIvb(bytes);
        (void)model.toIvb();
    } catch (const std::exception&) {
    }
    // The numeric models: a loaded one must also work on a vector of its size.
    try {
        VectorQuantizer quantizer;
        quantizer.fromIvb(bytes);
        const std::vector<float> v(quantizer.dimension(), 0.25f);
        (void)quantizer.quantize(v.data());
        (void)quantizer.toIvb();
    } catch (const std::exception&) {
    }
    try {
        NearestCentroidClassifier classifier;
        classifier.fromIvb(bytes);
        (void)classifier.classify(std::vector<float>(classifier.dimension(), 0.25f));
        (void)classifier.toIvb();
    } catch (const std::exception&) {
    }
    try {
        PcaTransform pca;
        pca.fromIvb(bytes);
        const std::vector<float> in(pca.rawDim(), 0.25f);
        std::vector<float> out(pca.pcaDim());
        pca.transform(in.data(), pca.rawDim(), out.data());
        (void)pca.toIvb();
    } catch (const std::exception&) {
    }
    return 0;
}
