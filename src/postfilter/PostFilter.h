#ifndef QUORIN_POSTFILTER_POSTFILTER_H
#define QUORIN_POSTFILTER_POSTFILTER_H

#include <string>
#include <vector>

#include "image/ScoredWindow.h"

class IN_IMAGE;

// A second opinion on the merged hits of a frame: passes on those it believes
// in, unchanged and in order. Configured once through fromJson, read-only after.
class PostFilter {
public:
    virtual ~PostFilter();

    // Appends to *output every hit of `input` that passes, copied whole.
    virtual void filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                        std::vector<ScoredWindow>* output) const = 0;
    // The filter's parameters as JSON text.
    virtual std::string toJson() const = 0;
    // Takes the parameters from JSON text, loading the model if one is named.
    virtual void fromJson(std::string const& text) = 0;
    // The name under which the filter is registered.
    virtual std::string name() const = 0;
};

#endif
