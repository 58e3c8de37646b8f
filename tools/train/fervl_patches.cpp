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
//   fervl_patches regions LIST DIR   for every photo, DIR/NNNNN.ppm: the 80 x 60
//                                    image of the first scale at 4x, likely
//                                    pixels tinted, accepted regions in colour,
//                                    traced outline points white, final finger
//                                    outlines yellow; and print per photo
//                                    "index regions contours fingerOnLens"
//
// Exit status 0, or 1 with a message on stderr.
#include <lumicor/zbm_image.h>

#include "ktlib/src/finger/fol.h"
#include "ktlib/src/representative/repm_internal.h"
#include "common/src/internal/ppm.h"

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

// What the region stage sees at the first scale, drawn 4x enlarged.
bool DumpRegions(const _zbm_Image* small, const std::string& path, int32_t* regions, int32_t* contoursFound,
                 const zbmvector<FOL::Finger>& fingers) {
    ZbmImagePtr rgb(ZbiuCreate(small->width, small->height, ZBM_PIXEL_ORDER_RGB));
    if (!rgb || ZbiuConvertColorSpace(small, rgb.get()) != 0) return false;
    FOL::Detector detector;
    zbmvector<zbmvector<zbm_Pos>> contours;
    if (detector.DetectInitialRegions(rgb.get(), FOL::DefaultFingerLiklihood(), contours) != 0) return false;
    const int32_t w = rgb->width, h = rgb->height, z = 4;
    std::vector<uint8_t> out(static_cast<size_t>(w * z) * h * z * 3);
    static const uint8_t palette[6][3] = {{255, 0, 0}, {0, 200, 0}, {0, 0, 255}, {255, 0, 255}, {0, 255, 255}, {255, 128, 0}};
    auto put = [&](int32_t x, int32_t y, const uint8_t* c) {
        for (int32_t dy = 0; dy < z; ++dy)
            for (int32_t dx = 0; dx < z; ++dx) std::memcpy(&out[((y * z + dy) * w * z + x * z + dx) * 3], c, 3);
    };
    *regions = 0;
    for (int32_t i = 0; i < detector.Regions().size(); ++i) *regions += detector.Regions()[i].accepted;
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            const uint8_t* p = ZbiuGetConstPointer(rgb.get(), x, y);
            uint8_t c[3] = {p[0], p[1], p[2]};
            const int32_t label = detector.LabelTable()[y * w + x];
            const bool likely = detector.FingerTable()[y * w + x] >= 0.1f;
            for (int k = 0; k < 3; ++k) {
                if (label > 0)
                    c[k] = static_cast<uint8_t>((c[k] + palette[(label - 1) % 6][k]) / 2);
                else if (likely)
                    c[k] = static_cast<uint8_t>((c[k] * 3 + 128) / 4);
                else
                    c[k] = static_cast<uint8_t>(c[k] / 3);
            }
            put(x, y, c);
        }
    }
    static const uint8_t white[3] = {255, 255, 255}, yellow[3] = {255, 255, 0};
    *contoursFound = contours.size();
    for (int32_t i = 0; i < contours.size(); ++i)
        for (int32_t k = 0; k < contours[i].size(); ++k) put(contours[i][k].x, contours[i][k].y, white);
    for (int32_t i = 0; i < fingers.size(); ++i)
        for (int32_t k = 0; k < fingers[i].points.size(); ++k) {
            const int32_t x = static_cast<int32_t>(fingers[i].points[k].x * w), y = static_cast<int32_t>(fingers[i].points[k].y * h);
            if (x >= 0 && y >= 0 && x < w && y < h) put(x, y, yellow);
        }
    contours.Clear();
    return lmk::WritePnm(path.c_str(), 3, w * z, h * z, out.data()) == lmk::PnmStatus::kOk;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) {
        std::fprintf(stderr, "usage: fervl_patches patches LIST OUT | scores LIST | regions LIST DIR\n");
        return 1;
    }
    const std::string mode = argv[1];
    std::ifstream list(argv[2]);
    if (!list || (mode != "scores" && argc < 4) || (mode != "patches" && mode != "scores" && mode != "regions")) {
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
        if (mode == "regions") {
            char name[32];
            std::snprintf(name, sizeof name, "/%05d.ppm", index);
            int32_t regions = 0, contours = 0;
            if (!DumpRegions(small.get(), argv[3] + std::string(name), &regions, &contours, fingers)) {
                std::fprintf(stderr, "fervl_patches: cannot dump regions of %s\n", path.c_str());
                return 1;
            }
            std::printf("%d %d %d %.6f\n", index, regions, contours, score);
        } else if (!out) {
            std::printf("%d %.6f %d\n", index, score, fingers.size());
        }
        fingers.Clear();
    }
    if (out) std::fclose(out);
    return 0;
}
