// libFuzzer target: the C entry points as a host drives them, with frame sizes
// up to 400 x 400, any rotation value, mode and entry, and arbitrary pixels
// (the input's tail, repeated over the frame). One session serves all runs,
// as in a host; its state carries from one input to the next.
#include <algorithm>
#include <vector>

#include "FuzzSupport.h"
#include "quorin/quorinapi.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool opened = (quorin_init(), true);
    (void)opened;
    fuzz::Input in(data, size);
    const int width = 1 + in.u16() % 400;
    const int height = 1 + in.u16() % 400;
    const uint8_t modeByte = in.byte();
    const uint8_t entry = in.byte();
    const uint8_t rotationByte = in.byte();
    const int maxFaces = int(int8_t(in.byte()));
    static const int kRotations[6] = {0, 90, 180, 270, -90, 45};
    const int rotation = kRotations[rotationByte % 6];
    std::vector<uint8_t> pattern = in.rest();
    if (pattern.empty()) pattern.push_back(0x80);
    std::vector<unsigned char> frame(size_t(width) * height);
    for (size_t i = 0; i < frame.size(); ++i) frame[i] = pattern[i % pattern.size()];
    std::vector<int> results(17 * 128, 0);  // room for any maxFaces of one signed byte
    int orientation = 0;
    fuzz::refusalIsFine([&] {
        quorin_setDetectionMode(modeByte % 4);  // 3 is not a mode: it must change nothing
        unsigned char* f = frame.data();
        int* r = results.data();
        switch (entry % 8) {
        case 0: quorin_detect(f, width, height, r, maxFaces, rotation); break;
        case 1: quorin_detectScaled(f, width, height, r, maxFaces, rotation); break;
        case 2: quorin_detect360Tracking(f, width, height, r, maxFaces); break;
        case 3: quorin_detect360TrackingScaled(f, width, height, r, maxFaces); break;
        case 4: quorin_detect360High(f, width, height, r, maxFaces); break;
        case 5: quorin_detect360HighScaled(f, width, height, r, maxFaces); break;
        case 6: quorin_detect360TrackingScaled_ornt(f, width, height, r, maxFaces, &orientation); break;
        default: quorin_detect(f, width, height, r, 0, rotation);
        }
    });
    return 0;
}
