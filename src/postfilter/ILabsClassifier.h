#ifndef QUORIN_POSTFILTER_ILABSCLASSIFIER_H
#define QUORIN_POSTFILTER_ILABSCLASSIFIER_H

#include <memory>
#include <string>
#include <vector>

class ModelReader;

// Per-category quadratic classifier over the cascade score plus an LBP histogram.
class ILabsClassifier {
public:
    static constexpr float FAST_PASS_SCORE = 6.0f;
    static constexpr int CATEGORY_NUMBER = 15;

    // One category's low-rank quadratic form:
    // score = -bias + sum_r (L_r.f) * (w_r + R_r.f) + linear.f
    class CategoryModel {
    public:
        // Reads one category record. Throws qv_data_error on a negative or oversized
        // count, a matrix block that does not fill R rows of D values, or a record
        // running past the end of the model.
        explicit CategoryModel(ModelReader& reader);
        // Test and tool use: a category from plain values (rows must be D long).
        CategoryModel(std::vector<float> linear, std::vector<float> quadraticWeights,
                      std::vector<std::vector<float>> leftRows,
                      std::vector<std::vector<float>> rightRows, float bias);

        // Throws qv_data_error("Incorrect PostFilter's feature length") when
        // length differs from the model's feature length D.
        float getScore(const float* feature, int length) const;

        int featureLength() const { return static_cast<int>(linear.size()); }
        int rank() const { return static_cast<int>(quadraticWeights.size()); }

        // A quantised block: int32 (ignored), int32 count, float32 scale, count int16.
        static std::vector<float> readVector(ModelReader& reader);
        // The same block filling rows x columns values row after row; the count
        // must be exactly rows * columns.
        static std::vector<std::vector<float>> readMatrix(ModelReader& reader, int rows, int columns);

    private:
        std::vector<float> linear;
        std::vector<float> quadraticWeights;
        std::vector<std::vector<float>> leftRows;
        std::vector<std::vector<float>> rightRows;
        float bias;
    };

    ILabsClassifier();
    ~ILabsClassifier();
    ILabsClassifier(const ILabsClassifier&) = delete;
    ILabsClassifier& operator=(const ILabsClassifier&) = delete;

    // Loads the 15 category records of the model; on failure the classifier is
    // left empty and the reader's or loader's exception goes on.
    void init(const std::string& modelPath);
    // Test use: installs categories built from plain values.
    void setCategories(std::vector<std::unique_ptr<CategoryModel>> models);
    void release();

    int categoryCount() const { return static_cast<int>(categories.size()); }

    // True when the cascade score alone is enough to pass the hit.
    bool preClassify(float score) const { return score >= FAST_PASS_SCORE; }
    // True when the category's score is strictly above 0. A category outside
    // the loaded ones (or no model at all) raises qv_invalid_argument.
    bool classify(int category, const float* feature, int length) const;
    // The category's score itself, with the same checks as classify.
    float categoryScore(int category, const float* feature, int length) const;

private:
    std::vector<CategoryModel*> categories;
};

#endif
