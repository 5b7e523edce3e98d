#ifndef QUORIN_NUMERIC_NORMALIZERFACTORY_H
#define QUORIN_NUMERIC_NORMALIZERFACTORY_H

#include "core/ObjectFactory.h"
#include "quorin/Normalizers.h"
#include "quorin/export.h"

// Normalizers by name: {"name":"QV_NORMALIZER_L2HYS","param":{"clipThreshold":0.2,"alpha":0}}.
class QUORIN_EXPORT QVNormalizerFactory : public ObjectFactory<QVNormalizer> {
public:
    static QVNormalizerFactory& instance();
    // Registers "QV_NORMALIZER_L1", "QV_NORMALIZER_L2", "QV_NORMALIZER_L1SQRT", "QV_NORMALIZER_L2HYS".
    void init();

private:
    QVNormalizerFactory();
};

#endif
