// libFuzzer target: arbitrary bytes as a post filter model. The first byte
// picks the filter (even ILABS, odd LBP+SVM), the rest is the model, read
// through the model reader; a filter that loads then judges a few hits.
#include <memory>
#include <string>
#include <vector>

#include "FuzzSupport.h"
#include "image/IntegralImage.h"
#include "image/ScoredWindow.h"
#include "postfilter/PostFilter.h"
#include "postfilter/PostFilterFactory.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    fuzz::Input in(data, size);
    const bool svm = in.byte() & 1;
    const fuzz::ServedModel model("fzpb", in.rest());
    const std::string description = std::string("{\"name\":\"") + (svm ? "LBP_SVM_POSTFILTER" : "ILABS_POSTFILTER") +
                                    "\",\"param\":{\"model\":\"fzpb\"}}";
    const int width = 64, height = 64;
    static const std::vector<unsigned char> frame = fuzz::testFrame(width, height);
    fuzz::refusalIsFine([&] {
        std::unique_ptr<PostFilter> filter(PostFilterFactory::instance().createInstance(description));
        if (!filter) return;
        IN_IMAGE image;
        if (!image.Init(width, height, width, frame.data())) return;
        std::vector<ScoredWindow> hits(3);
        const int sides[3] = {24, 40, 63};
        for (int k = 0; k < 3; ++k) {
            hits[k].score = 1.0f;
            hits[k].category = k;
            hits[k].window = DetectionWindow{0, sides[k], 0, sides[k]};
        }
        std::vector<ScoredWindow> passed;
        filter->filter(image, hits, &passed);
        (void)filter->toJson();
    });
    return 0;
}
