#ifndef QUORIN_POSTFILTER_SVMCLASSIFIER_H
#define QUORIN_POSTFILTER_SVMCLASSIFIER_H

#include <cstdint>
#include <vector>

class ModelReader;

// One-against-one support vector classifier with a polynomial kernel.
class SvmClassifier {
public:
    struct SvmModel {
        int32_t svmType = 0;
        int32_t kernelType = 0; // 1: polynomial, the only kernel computed
        int32_t degree = 0;
        float gamma = 0.0f;
        float coef0 = 0.0f;
        int32_t classCount = 0;
        std::vector<float> rho;                // one per pair of classes
        std::vector<float> decisionThresholds; // one per pair of classes
        std::vector<int32_t> labels;           // one per class
        std::vector<int32_t> svCounts;         // support vectors per class, classes in order
        int32_t svTotal = 0;
        int32_t featureLength = 0;
        std::vector<std::vector<float>> supportVectors; // svTotal rows of featureLength
        std::vector<std::vector<float>> coefficients;   // classCount - 1 rows of svTotal
    };

    // Largest dense support vector table a model may ask for, in values; the
    // file stores it sparse, so its size alone does not bound the expansion.
    static constexpr long long MAX_SUPPORT_VALUES = 16LL * 1024 * 1024;
    // Each support vector costs a dot product per judged hit: far beyond this
    // count a post filter could never keep up with a frame.
    static constexpr long long MAX_SUPPORT_VECTORS = 1LL << 16;

    SvmClassifier() = default;
    explicit SvmClassifier(ModelReader& reader);

    // Reads one model from the reader's cursor on. Throws qv_data_error when the
    // model is truncated or inconsistent (no class, counts that do not add up,
    // a sparse entry outside the table); the classifier then stays as it was.
    void init(ModelReader& reader);
    // Test use: takes a model given as values, after the same consistency checks.
    void setModel(SvmModel model);

    // Label of the class with the most pairwise votes (ties: the lower class).
    // Throws qv_data_error("Incorrect PostFilter's feature length") when length
    // differs from the model's featureLength; an empty classifier raises
    // qv_unsupported_error.
    int32_t classify(const float* feature, int length) const;

    static float kernelFunction(const float* feature, const std::vector<float>& supportVector,
                                const SvmModel& model);
    static float dot(const float* a, const float* b, int length);
    static float powi(float base, int exponent);

private:
    static void check(const SvmModel& model);

    SvmModel model;
};

#endif
