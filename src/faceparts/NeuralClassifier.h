#ifndef QUORIN_FACEPARTS_NEURALCLASSIFIER_H
#define QUORIN_FACEPARTS_NEURALCLASSIFIER_H

#include <cstdint>
#include <memory>

#include "faceparts/NeuralNet.h"

// Head of a net container image: a 16-byte checksum over everything behind
// it, then the format fields; a table of 16-byte items follows at offset 72.
// All integers little-endian; read field by field, never through this struct.
struct NetContainerHeader {
    uint8_t checksumXor[8];
    uint8_t checksumSum[8];
    uint8_t version[4];    // must be 100
    uint8_t totalSize[4];  // the image's exact length
    uint8_t unused0[8];
    uint8_t kind[4];       // only kind 0 makes a net
    uint8_t itemCount[4];
    uint8_t unused1[32];
};
static_assert(sizeof(NetContainerHeader) == 72, "container head is 72 bytes");

// Owns a model image, checks it is whole before believing anything in it, and
// runs the net of its first item behind a float interface.
class NeuralClassifier {
public:
    NeuralClassifier();
    virtual ~NeuralClassifier();
    NeuralClassifier(const NeuralClassifier&) = delete;
    NeuralClassifier& operator=(const NeuralClassifier&) = delete;

    // Writes the XOR and the sum of the 64-bit words from offset 16 to out.
    // Requires size above 88 and outSize 16; returns 1 on success, else 0 (out
    // zeroed whenever it is given).
    static int CheckSum(const NetContainerHeader* image, uint32_t size, uint8_t* out, uint32_t outSize);
    // True only for an image whose checksum, version, size and item table
    // agree, and whose item payloads lie inside the image behind the table.
    static bool Verify(const void* image, uint32_t size);

    // Verifies the image and builds the net from item 0 when the container is
    // of kind 0 with one item; otherwise leaves no net. The net points into
    // pDataBuf afterwards. Throws qv_invalid_argument on a refused image and
    // passes the net's own load failure on.
    void LoadClassifierData(const uint8_t* pDataBuf, uint64_t cDatabuf);
    // Reads the whole raw model object named by path into data (ModelReader).
    void ReadDataFromFile(const char* path);
    // Drops the old model, reads the new one and builds its net.
    void loadFromPath(const char* path);
    // Frees the model image; a net that points into it goes with it.
    virtual void clearData();

    bool inputCount(uint32_t* count);
    bool outputCount(uint32_t* count);
    // Runs the net on length float inputs (truncated toward zero). Throws
    // qv_invalid_argument for null pointers or more inputs than the net has,
    // qv_operation_error when the net can't run. Writes min(outputLength,
    // outputs of the net) values as result / 10000; the rest stay 0.
    void Classify(const float* pInput, uint32_t length, uint32_t* pulBestClass, float* outputs,
                  uint32_t outputLength);

    NeuralNet* net() { return net_.get(); }
    uint64_t dataSize() const { return dataSize_; }

private:
    std::unique_ptr<uint8_t[]> data_;
    uint64_t dataSize_ = 0;
    std::unique_ptr<NeuralNet> net_;
    bool netInData_ = false;  // the net's tables point into data_
};

#endif
