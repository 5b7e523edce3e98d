#ifndef QUORIN_NORMALIZERFACTORY_H
#define QUORIN_NORMALIZERFACTORY_H

// Normalizers made by name from a description, e.g.
//   QVNormalizerFactory::instance().createInstance(
//       R"({"name":"QV_NORMALIZER_L2HYS","param":{"clipThreshold":0.2,"alpha":0}})");
// "param" is the normalizer's own JSON form (its toJson text). createInstance
// is ObjectFactory's: an owned normalizer, or null for an unknown name or
// parameters the class refuses (any key for L1, L2 and L1SQRT); JsonError for
// a description that is no JSON object.

#include "quorin/Normalizers.h"
#include "quorin/ObjectFactory.h"
#include "quorin/export.h"

class QUORIN_EXPORT QVNormalizerFactory : public ObjectFactory<QVNormalizer> {
public:
    // ensures: the one factory, made on first use.
    static QVNormalizerFactory& instance();
    // ensures: "QV_NORMALIZER_L1", "QV_NORMALIZER_L2", "QV_NORMALIZER_L1SQRT"
    //          and "QV_NORMALIZER_L2HYS" are registered, each with its class's
    //          static create.
    void init();

    QVNormalizerFactory(const QVNormalizerFactory&) = delete;
    QVNormalizerFactory& operator=(const QVNormalizerFactory&) = delete;

private:
    QVNormalizerFactory();
};

#endif
