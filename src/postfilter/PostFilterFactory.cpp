#include "postfilter/PostFilterFactory.h"

#include "postfilter/ILabsPostFilter.h"
#include "postfilter/LbpSvmPostFilter.h"

PostFilterFactory& PostFilterFactory::instance()
{
    static PostFilterFactory factory;
    return factory;
}

PostFilterFactory::PostFilterFactory()
{
    init();
}

void PostFilterFactory::init()
{
    creators["ILABS_POSTFILTER"] = &ILabsPostFilter::create;
    creators["LBP_SVM_POSTFILTER"] = &LbpSvmPostFilter::create;
}
