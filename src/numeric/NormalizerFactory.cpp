#include "quorin/NormalizerFactory.h"

QVNormalizerFactory::QVNormalizerFactory() { init(); }

QVNormalizerFactory& QVNormalizerFactory::instance() {
    static QVNormalizerFactory factory;
    return factory;
}

void QVNormalizerFactory::init() {
    creators["QV_NORMALIZER_L1"] = [](const std::string& t) -> QVNormalizer* { return QVL1Normalizer::create(t); };
    creators["QV_NORMALIZER_L2"] = [](const std::string& t) -> QVNormalizer* { return QVL2Normalizer::create(t); };
    creators["QV_NORMALIZER_L1SQRT"] = [](const std::string& t) -> QVNormalizer* { return QVL1SqrtNormalizer::create(t); };
    creators["QV_NORMALIZER_L2HYS"] = [](const std::string& t) -> QVNormalizer* { return QVL2HysNormalizer::create(t); };
}
