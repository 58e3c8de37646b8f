// Training helper for the FeRVL dictionaries: runs the library's finger
// detection exactly as the representative meta does (photo -> about 640 x 480
// -> about 80 x 60, six scales, region detection, snakes, corner completion,
// statistics, patch extraction and turning) and reports what it sees.
//
//   fervl_patches patches LIST OUT   for every photo in LIST (one binary PPM
//                                    per line), append each scored patch to
//                                    OUT as a record: int32 photo index,
//                                    int32 pattern, float x, float y (outline
//                                    point, normalised), int32 scale, int32
//                                    contour, float score, 300 bytes RGB
//                                    (10 x 10, turned)
//   fervl_patches scores LIST        print "index fingerOnLens fingers" per photo
//
// Exit status 0, or 1 with a message on stderr.
#include <lumicor/zbm_image.h>

#include "ktlib/src/finger/fol.h"
#include "ktlib/src/representative/repm_internal.h"

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

namespace {

ZbmImagePtr ReadPpm(const std::string& path) {
    FILE* f = std::fopen(path.c_str(), "rb");
    if (!f) return ZbmImagePtr();
    int w = 0, h = 0, maxval = 0;
    char magic[3] = {0};
    ZbmImagePtr image;
    if (std::fscanf(f, "%2s %d %d %d", magic, &w, &h, &maxval) == 4 && std::strcmp(magic, "P6") == 0 &&
        maxval == 255 && std::fgetc(f) != EOF) {
        image.reset(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_RGB));
        if (image && std::fread(image->pData, 1, static_cast<size_t>(w) * h * 3, f) != static_cast<size_t>(w) * h * 3)
            image.reset();
    }
    std::fclose(f);
    return image;
}

class Dumper : public FOL::PatchObserver {
public:
    Dumper(FILE* out, int32_t index) : out_(out), index_(index) {}
    void OnPatch(const _zbm_Image* patch, int32_t pattern, float x, float y, int32_t scale, int32_t contour,
                 float score) override {
        std::fwrite(&index_, 4, 1, out_);
        std::fwrite(&pattern, 4, 1, out_);
        std::fwrite(&x, 4, 1, out_);
        std::fwrite(&y, 4, 1, out_);
        std::fwrite(&scale, 4, 1, out_);
        std::fwrite(&contour, 4, 1, out_);
        std::fwrite(&score, 4, 1, out_);
        for (int32_t row = 0; row < patch->height; ++row)
            std::fwrite(ZbiuGetConstPointer(patch, 0, row), 1, static_cast<size_t>(patch->width) * 3, out_);
    }

private:
    FILE* out_;
    int32_t index_;
};

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) {
        std::fprintf(stderr, "usage: fervl_patches patches LIST OUT | scores LIST\n");
        return 1;
    }
    const std::string mode = argv[1];
    std::ifstream list(argv[2]);
    if (!list || (mode == "patches" && argc < 4) || (mode != "patches" && mode != "scores")) {
        std::fprintf(stderr, "fervl_patches: bad arguments\n");
        return 1;
    }
    FILE* out = nullptr;
    if (mode == "patches") {
        out = std::fopen(argv[3], "wb");
        if (!out) {
            std::fprintf(stderr, "fervl_patches: cannot write %s\n", argv[3]);
            return 1;
        }
    }
    std::string path;
    int32_t index = 0;
    for (; std::getline(list, path); ++index) {
        ZbmImagePtr photo = ReadPpm(path);
        ZbmImagePtr gray, small;
        if (!photo || ktrepm::MakeWorkingCopies(photo.get(), &gray, &small) != 0) {
            std::fprintf(stderr, "fervl_patches: cannot read %s\n", path.c_str());
            return 1;
        }
        zbmvector<FOL::Finger> fingers;
        float score = 0.0f;
        Dumper dumper(out, index);
        const int status = FOL::CalcFingerScore(small.get(), fingers, score, out ? &dumper : nullptr);
        if (status != 0) {
            std::fprintf(stderr, "fervl_patches: detection failed (%d) on %s\n", status, path.c_str());
            return 1;
        }
        if (!out) std::printf("%d %.6f %d\n", index, score, fingers.size());
        fingers.Clear();
    }
    if (out) std::fclose(out);
    return 0;
}
