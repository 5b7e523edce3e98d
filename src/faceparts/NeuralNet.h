#ifndef QUORIN_FACEPARTS_NEURALNET_H
#define QUORIN_FACEPARTS_NEURALNET_H

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>

// A small locally connected feed-forward net in 32-bit integer arithmetic.
// Activations are 16.16 fixed point, weights i16, outputs of the soft-max forms
// 0..10000. The whole net lives in one serialised blob; a loaded net points into
// that blob (which must outlive it) and owns only its work buffer.

// Transfer function of a layer; any value not listed runs the sigmoid.
enum tagTXF_TYPE : uint32_t {
    TXF_LINEAR = 0,
    TXF_SIGMOID = 1,
    TXF_SOFTMAX = 4,
    TXF_ABS = 10,
    TXF_SOFTMAX_PAIR = 11,
};

// 16.16 logistic function by a 257-entry table with linear interpolation.
int32_t Sigmoid16(int32_t x);
// 16.16 division a / b without 64-bit arithmetic; b == 0 saturates by the sign of a.
int32_t Div16(int32_t a, int32_t b);
// Truncation toward zero to i32 that saturates and maps NaN to 0.
int32_t SaturatingTrunc(double v);

class NeuralNetBase {
public:
    virtual ~NeuralNetBase() = default;
    // Reads a blob; the net points into data afterwards. Throws on a refused blob.
    virtual void loadBuffer(const uint8_t* data, uint64_t size) = 0;
    virtual bool outputCount(uint32_t* count) = 0;
    virtual bool inputCount(uint32_t* count) = 0;
    virtual bool classifyInts(const int32_t* inputs, uint32_t inputLength, uint32_t* bestClass,
                              float* outputs, uint32_t outputLength) = 0;
};

class NeuralNet : public NeuralNetBase {
public:
    NeuralNet();
    ~NeuralNet() override;
    NeuralNet(const NeuralNet&) = delete;
    NeuralNet& operator=(const NeuralNet&) = delete;

    // Requires: data holds size bytes and outlives the net.
    // Ensures: the net is loaded from data, or qv_operation_error
    // "Failed to set algorithm in CNeuralNet" and the previous state is kept.
    void loadBuffer(const uint8_t* data, uint64_t size) override;
    // False and 0 when nothing is loaded; a one-neuron soft-max reports 2 outputs.
    bool outputCount(uint32_t* count) override;
    bool inputCount(uint32_t* count) override;
    // False unless bestClass is given and inputLength equals the input count.
    // Writes min(outputSize(), outputLength) outputs as value / 10000.
    bool classifyInts(const int32_t* inputs, uint32_t inputLength, uint32_t* bestClass,
                      float* outputs, uint32_t outputLength) override;

    // Checked readers. Non-zero / non-null on success; on success the tables
    // point into blob. Besides the format's own value checks they make sure
    // that every table lies inside the blob and that a run stays inside the
    // weight stream, the span array and the work buffer.
    int RestoreLocalConnectNetSafe(const uint8_t* blob, uint32_t size, uint16_t expected);
    const uint8_t* RestoreRunNetSafe(const uint8_t* blob, uint32_t size, const uint8_t* position,
                                     uint16_t version);
    // Readers without a size: the caller guarantees the blob is whole. The
    // value checks and the run-consistency checks still apply.
    int RestoreLocalConnectNet(const uint8_t* blob, uint16_t expected);
    const uint8_t* RestoreRunNet(const uint8_t* blob, const uint8_t* position, uint16_t version);

    // Sum of the layer sizes (a last layer of size 1 counts 2); -1 when empty.
    int workBufferLength() const;
    // The first inputSize() entries are the inputs of the next Run(bestClass).
    int32_t* inputBuffer() { return workBuffer.get(); }
    uint32_t inputSize() const;
    uint32_t outputSize();

    // Runs the net on the inputs in the work buffer; returns the last layer's
    // activations (valid until the next run), or null when the net can't run.
    const int32_t* Run(uint32_t* bestClass);
    const int32_t* Run(const int32_t* inputs, uint32_t* bestClass);
    const int32_t* Run(const double* inputs, uint32_t* bestClass);

    void LoadFromBuffer(const uint8_t* data, uint32_t size) { loadBuffer(data, size); }
    // 1 on success, 0 on any failure; on success the file image stays allocated
    // for the net's lifetime (it is freed by the destructor).
    int LoadFromFile(const char* path);
    int LoadFromFile(FILE* stream);

    // Steps of Run, open for tests.
    void ScaleInputs(int32_t* values, int32_t count) const;
    void SubtractMeans(int32_t* values, int32_t count) const;
    static void CentralLoop(int32_t* targets, uint32_t count, const uint8_t* weights, const int32_t* activation);
    static void CentralLoopUseCaution(int32_t* targets, uint32_t count, const uint8_t* weights,
                                      const int32_t* activation);
    static void Linear(int32_t* values, uint32_t count, uint16_t divisor);
    static void Abs(int32_t* values, uint32_t count, uint16_t divisor);
    static void Sigmoid(int32_t* values, uint32_t count, uint16_t divisor);
    static int32_t Exp(int32_t x);
    static void SoftMax(int32_t* values, uint32_t count, uint16_t divisor, uint32_t* bestClass);
    static void TxferLayer(uint32_t type, int32_t* values, uint32_t count, uint16_t divisor, uint32_t* bestClass);

    // Table access (little-endian reads out of the blob).
    uint16_t LayerSize(uint32_t layer) const;
    uint32_t TransferType(uint32_t layer) const;

private:
    struct Tables;
    bool ReadBlob(const uint8_t* blob, uint64_t size, bool bounded, uint16_t expected, Tables& t) const;
    static bool ReadRunTables(const uint8_t* blob, uint64_t limit, uint64_t& pos, uint16_t version, Tables& t);
    static bool CheckRunConsistency(const Tables& t);
    static int64_t BufferLength(const Tables& t);
    void Adopt(const Tables& t);
    void AllocWorkBuffer();

    // Header fields and table pointers, read from the blob. Pointers point into
    // the blob; the byte tables are read little-endian wherever they lie.
    struct Tables {
        uint16_t version = 0;
        uint16_t kind = 0;
        uint16_t layerCount = 0;
        uint32_t reservedWord = 2;
        const uint8_t* transferTypes = nullptr;  // u32 per layer
        const uint8_t* reservedTable = nullptr;  // u32 per layer, unused
        uint32_t reservedCount = 0;
        uint16_t neuronTotal = 0;
        const uint8_t* layerSizes = nullptr;     // u16 per layer
        const uint8_t* biasFlags = nullptr;      // u16 per layer
        const uint8_t* layerDivisors = nullptr;  // u16 per layer
        uint16_t wideSize = 0, narrowSize = 0, weightSize = 0;
        const uint8_t* inputDivisors = nullptr;  // i32 per input
        const uint8_t* inputOffsets = nullptr;   // i64 per input
        const uint8_t* inputMeans = nullptr;     // i32 per input
        uint32_t weightBytes = 0;
        const uint8_t* weights = nullptr;
        uint32_t spanCount = 0;
        const uint8_t* spans = nullptr;          // 6-byte records: source, firstTarget, lastTarget
    };

    std::unique_ptr<int32_t[]> workBuffer;
    uint32_t workBufferSize = 0;  // allocated entries: the work length plus one guard slot
    Tables tables;
    bool runnable = false;  // the tables passed a whole-blob read and the run checks
    std::unique_ptr<uint8_t[], void (*)(void*)> fileImage{nullptr, &std::free};
};

#endif
