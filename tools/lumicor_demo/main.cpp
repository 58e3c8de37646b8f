// lumicor_demo [DIR]: builds a hand-made photo meta (two faces, quality
// metas with fingers and a blur map, four attention areas), writes it as
// DIR/demo.lmeta (DIR defaults to the current directory), reads the file
// back, checks that the blob round-trips byte for byte and prints the meta.
#include "testkit/meta_builder.h"

#include <lumicor/vond.h>

#include <cstdio>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace {

int Fail(const char* what, const _VondResult& r) {
    std::fprintf(stderr, "lumicor_demo: %s: status %u in %s: %s\n", what, static_cast<unsigned>(r.status),
                 r.function ? r.function : "?", r.message ? r.message : "");
    return 1;
}

std::vector<uint8_t> Serialize(const _VondMeta& meta, _VondResult* result) {
    uint32_t size = 0;
    *result = VondGetSerializedSize(&meta, &size);
    if (result->status != VOND_STATUS_OK) return {};
    std::vector<uint8_t> blob(size);
    *result = VondSerializeMeta(&meta, size, blob.data());
    return blob;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string dir = argc > 1 ? argv[1] : ".";
    const std::string path = dir + "/demo.lmeta";

    const _VondVersion* v = VondGetVersion();
    std::printf("Vond %d.%d.%08x, metaVersion = %d, flags = %d\n", v->major, v->minor, static_cast<unsigned>(v->build),
                v->metaVersion, v->flags);

    _VondMeta meta;
    if (!lumicor::test::BuildHandMadeMeta(&meta)) {
        std::fprintf(stderr, "lumicor_demo: out of memory\n");
        return 1;
    }
    _VondResult r;
    const std::vector<uint8_t> blob = Serialize(meta, &r);
    VondDisposeMeta(&meta);
    if (r.status != VOND_STATUS_OK) return Fail("serialise", r);
    std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(blob.data()),
                                               static_cast<std::streamsize>(blob.size()));
    std::ifstream in(path, std::ios::binary);
    const std::vector<uint8_t> stored((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    if (stored.size() != blob.size()) {
        std::fprintf(stderr, "lumicor_demo: cannot write and read back %s\n", path.c_str());
        return 1;
    }
    std::printf("wrote %s (%zu bytes)\n", path.c_str(), blob.size());

    _VondMeta parsed;
    r = VondParseMeta(static_cast<uint32_t>(stored.size()), stored.data(), &parsed);
    if (r.status != VOND_STATUS_OK) {
        VondDisposeMeta(&parsed);
        return Fail("parse", r);
    }
    const std::vector<uint8_t> again = Serialize(parsed, &r);
    if (r.status != VOND_STATUS_OK) {
        VondDisposeMeta(&parsed);
        return Fail("serialise the parsed meta", r);
    }
    if (again != stored) {
        VondDisposeMeta(&parsed);
        std::fprintf(stderr, "lumicor_demo: the blob did not round-trip\n");
        return 1;
    }
    std::printf("read it back: %zu bytes, identical after a second serialisation\n", stored.size());
    VondDumpMeta(&parsed);
    VondDisposeMeta(&parsed);
    return 0;
}
