// vond_meta_seeds DIR: writes a few valid photo meta blobs into DIR, the seed
// corpus of the VondParseMeta fuzz target:
//   handmade.lmeta    two faces, fingers, blur map, four saliency areas
//   empty.lmeta       no faces, no fingers, no blur map, no areas
//   face_areas.lmeta  the hand-made meta with face areas (one direction -1)
//   meta_v6.lmeta     the hand-made meta under meta version 6
#include "testkit/meta_builder.h"

#include <lumicor/vond.h>

#include <cstdio>
#include <fstream>
#include <string>
#include <vector>

namespace {

bool Write(const std::string& path, const _VondMeta& meta) {
    uint32_t size = 0;
    if (VondGetSerializedSize(&meta, &size).status != VOND_STATUS_OK) return false;
    std::vector<uint8_t> blob(size);
    if (VondSerializeMeta(&meta, size, blob.data()).status != VOND_STATUS_OK) return false;
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(blob.data()), static_cast<std::streamsize>(blob.size()));
    return static_cast<bool>(out.flush());
}

bool WriteAll(const std::string& dir) {
    using namespace lumicor::test;
    _VondMeta meta;
    bool ok = BuildHandMadeMeta(&meta) && Write(dir + "/handmade.lmeta", meta);
    if (ok) {
        const int32_t directions[3] = {0, 8, -1};
        ok = SetFaceAreas(&meta, 3, directions) && Write(dir + "/face_areas.lmeta", meta);
    }
    VondDisposeMeta(&meta);
    if (!ok) return false;

    ok = BuildHandMadeMeta(&meta);
    if (ok) {
        meta.version.metaVersion = 6;
        ok = Write(dir + "/meta_v6.lmeta", meta);
    }
    VondDisposeMeta(&meta);
    if (!ok) return false;

    ok = BuildEmptyMeta(&meta) && Write(dir + "/empty.lmeta", meta);
    VondDisposeMeta(&meta);
    return ok;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: vond_meta_seeds DIR\n");
        return 2;
    }
    if (!WriteAll(argv[1])) {
        std::fprintf(stderr, "vond_meta_seeds: cannot write the seeds into %s\n", argv[1]);
        return 1;
    }
    return 0;
}
