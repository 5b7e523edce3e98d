#include "postfilter/ILabsClassifier.h"

#include <utility>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/ModelInput.h"

namespace {

float dot(const std::vector<float>& row, const float* feature)
{
    float sum = 0.0f;
    for (std::size_t i = 0; i < row.size(); ++i)
        sum += row[i] * feature[i];
    return sum;
}

} // namespace

std::vector<float> ILabsClassifier::CategoryModel::readVector(ModelReader& reader)
{
    postfilter_model::readInt32(reader); // block tag, unused
    const int32_t count = postfilter_model::readInt32(reader);
    const float scale = postfilter_model::readFloat(reader);
    std::vector<int16_t> raw = postfilter_model::readInt16s(reader, count);
    std::vector<float> values(raw.size());
    for (std::size_t i = 0; i < raw.size(); ++i)
        values[i] = static_cast<float>(raw[i]) * scale;
    return values;
}

std::vector<std::vector<float>> ILabsClassifier::CategoryModel::readMatrix(ModelReader& reader, int rows,
                                                                           int columns)
{
    postfilter_model::readInt32(reader); // block tag, unused
    const int32_t count = postfilter_model::readInt32(reader);
    const float scale = postfilter_model::readFloat(reader);
    if (static_cast<long long>(count) != static_cast<long long>(rows) * columns)
        throw qv_data_error("PostFilter model matrix does not match its vectors");
    std::vector<int16_t> raw = postfilter_model::readInt16s(reader, count);
    std::vector<std::vector<float>> matrix(rows, std::vector<float>(columns, 0.0f));
    std::size_t k = 0;
    for (auto& row : matrix)
        for (float& v : row)
            v = static_cast<float>(raw[k++]) * scale;
    return matrix;
}

ILabsClassifier::CategoryModel::CategoryModel(ModelReader& reader) : bias(0.0f)
{
    postfilter_model::readInt32(reader); // record tag, unused
    linear = readVector(reader);
    quadraticWeights = readVector(reader);
    const int d = featureLength();
    const int r = rank();
    leftRows = readMatrix(reader, r, d);
    rightRows = readMatrix(reader, r, d);
    bias = postfilter_model::readFloat(reader);
    postfilter_model::readInt32(reader); // record trailer, unused
}

ILabsClassifier::CategoryModel::CategoryModel(std::vector<float> linearIn, std::vector<float> weightsIn,
                                              std::vector<std::vector<float>> leftIn,
                                              std::vector<std::vector<float>> rightIn, float biasIn)
    : linear(std::move(linearIn)), quadraticWeights(std::move(weightsIn)), leftRows(std::move(leftIn)),
      rightRows(std::move(rightIn)), bias(biasIn)
{
    bool shaped = leftRows.size() == quadraticWeights.size() && rightRows.size() == quadraticWeights.size();
    for (std::size_t r = 0; shaped && r < leftRows.size(); ++r)
        shaped = leftRows[r].size() == linear.size() && rightRows[r].size() == linear.size();
    if (!shaped)
        throw qv_invalid_argument("PostFilter category rows must match its vectors");
}

float ILabsClassifier::CategoryModel::getScore(const float* feature, int length) const
{
    if (length != featureLength())
        throw qv_data_error("Incorrect PostFilter's feature length");
    if (length > 0 && feature == nullptr)
        throw qv_invalid_argument("PostFilter feature is null");
    float score = -bias;
    for (std::size_t r = 0; r < quadraticWeights.size(); ++r) {
        const float a = dot(leftRows[r], feature);
        score += a * quadraticWeights[r];
        const float b = dot(rightRows[r], feature);
        score += a * b;
    }
    for (std::size_t i = 0; i < linear.size(); ++i)
        score += linear[i] * feature[i];
    return score;
}

ILabsClassifier::ILabsClassifier() = default;

ILabsClassifier::~ILabsClassifier()
{
    release();
}

void ILabsClassifier::release()
{
    for (CategoryModel* model : categories)
        delete model;
    categories.clear();
}

void ILabsClassifier::init(const std::string& modelPath)
{
    release();
    ModelReader reader(modelPath, ModelReader::RAW);
    std::vector<std::unique_ptr<CategoryModel>> loaded;
    loaded.reserve(CATEGORY_NUMBER);
    for (int c = 0; c < CATEGORY_NUMBER; ++c)
        loaded.push_back(std::make_unique<CategoryModel>(reader));
    setCategories(std::move(loaded));
}

void ILabsClassifier::setCategories(std::vector<std::unique_ptr<CategoryModel>> models)
{
    release();
    categories.reserve(models.size());
    for (auto& model : models)
        categories.push_back(model.release());
}

bool ILabsClassifier::classify(int category, const float* feature, int length) const
{
    return categoryScore(category, feature, length) > 0.0f;
}

float ILabsClassifier::categoryScore(int category, const float* feature, int length) const
{
    if (category < 0 || category >= categoryCount())
        throw qv_invalid_argument(categories.empty() ? "PostFilter has no model loaded"
                                                     : "PostFilter category out of range");
    return categories[category]->getScore(feature, length);
}
