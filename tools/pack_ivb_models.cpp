// pack_ivb_models: packs plain model payloads into one IVB stream.
//
//   pack_ivb_models OUT.ivb models/mdcb.bin models/mdnb.bin models/mdpb.bin
//
// Each payload NAME.bin becomes one record named NAME whose main part is a
// basic object of raw bytes (sub type void) holding the payload unchanged, so
// that ModelReader in IVB mode, with the path "MODEL::NAME", hands back the
// 16-byte object header followed by the payload. The output depends only on
// the inputs and their order.
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "quorin/QVIVBObject.h"
#include "quorin/QVIVBStream.h"

namespace {

std::string stem(const std::string& path) {
    const std::string::size_type slash = path.find_last_of('/');
    std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
    const std::string::size_type dot = name.find('.');
    return dot == std::string::npos ? name : name.substr(0, dot);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2 || std::strcmp(argv[1], "--help") == 0 || std::strcmp(argv[1], "-h") == 0) {
        std::fprintf(argc < 2 ? stderr : stdout, "usage: pack_ivb_models OUT.ivb PAYLOAD...\n"
                     "Packs each payload NAME.ext as one raw-bytes object named NAME into one IVB stream.\n");
        return argc < 2 ? 2 : 0;
    }
    try {
        QVIVBFileWriter writer(argv[1], "quorin built-in models");
        for (int i = 2; i < argc; ++i) {
            std::ifstream in(argv[i], std::ios::binary);
            if (!in) {
                std::fprintf(stderr, "pack_ivb_models: cannot read %s\n", argv[i]);
                return 1;
            }
            const std::vector<char> payload((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
            // A raw-bytes object stands alone as a main part: its header carries
            // its length, which is all the stream needs.
            QVIVBCompositeObjectPacker packer;
            packer.packBasicObject<void>("", 0, payload.data(), static_cast<unsigned int>(payload.size()));
            const std::vector<uint8_t> composite = packer.data();
            const std::vector<uint8_t> object(composite.begin() + 20, composite.end());
            writer.writeObject(stem(argv[i]), object);
        }
        writer.close();
    } catch (const std::exception& e) {
        std::fprintf(stderr, "pack_ivb_models: %s\n", e.what());
        return 1;
    }
    return 0;
}
