#ifndef QUORIN_POSTFILTER_POSTFILTERFACTORY_H
#define QUORIN_POSTFILTER_POSTFILTERFACTORY_H

#include "quorin/ObjectFactory.h"
#include "postfilter/PostFilter.h"

// Makes post filters by name: "ILABS_POSTFILTER", "LBP_SVM_POSTFILTER".
// createInstance returns an owned filter, or null for an unknown name or a
// filter whose parameters or model could not be taken.
class PostFilterFactory : public ObjectFactory<PostFilter> {
public:
    static PostFilterFactory& instance();

    PostFilterFactory(const PostFilterFactory&) = delete;
    PostFilterFactory& operator=(const PostFilterFactory&) = delete;

private:
    PostFilterFactory();
    void init();
};

#endif
