// siml_rank: how well the similarity signature finds the same photo again.
//
//   siml_rank [--check] FOLDER
//
// Reads every *.jpg of FOLDER, makes transformed copies of each (re-encoded
// at JPEG quality 50, resized to half size, cropped by 5 % on every side,
// brightened by 25 %), extracts the similarity signature of every image at
// the analysis size (about 19,200 pixels, as the analysis does) and ranks,
// for each original, its own copies against every other photo and its
// copies. Prints the distances and, per original, whether every own copy
// ranks before the nearest different photo; with --check the exit status is
// 1 when one does not. Exits with 77 when FOLDER holds no JPEG photo.
#include <dirent.h>

#include <lumicor/ktlib.h>
#include <lumicor/ktsimilarity.h>
#include <lumicor/zbm_image.h>

#include "photo_io.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace {

struct Rgb {
    int width = 0, height = 0;
    std::vector<uint8_t> pixels;  // RGB, rows back to back
};

// Decodes with the lumicor tool's decoder, which reports corrupt or truncated
// files instead of letting libjpeg end the process.
bool DecodeJpeg(const std::vector<uint8_t>& bytes, Rgb* out, std::string* error) {
    lumicor_tool::Photo photo;
    if (!lumicor_tool::DecodePhoto(bytes, &photo, error)) return false;
    const _zbm_Image* im = photo.image.get();
    out->width = im->width;
    out->height = im->height;
    out->pixels.resize(static_cast<size_t>(im->width) * im->height * 3);
    for (int y = 0; y < im->height; ++y)
        std::memcpy(&out->pixels[static_cast<size_t>(y) * im->width * 3], im->pData + static_cast<size_t>(y) * im->pitch,
                    static_cast<size_t>(im->width) * 3);
    return true;
}

// Resizes with the library's own resize (the one the analysis uses).
bool Resize(const Rgb& src, int width, int height, Rgb* out) {
    _zbm_Image* in = ZbiuCreateAttatchData(const_cast<uint8_t*>(src.pixels.data()), src.width, src.height, src.width * 3,
                                           ZBM_PIXEL_ORDER_RGB);
    _zbm_Image* dst = ZbiuCreate(width, height, ZBM_PIXEL_ORDER_RGB);
    bool ok = in && dst && ZbiuResize(in, dst) == 0;
    if (ok) {
        out->width = width;
        out->height = height;
        out->pixels.assign(dst->pData, dst->pData + static_cast<size_t>(width) * height * 3);
    }
    ZbiuDispose(&in);
    ZbiuDispose(&dst);
    return ok;
}

Rgb Crop(const Rgb& src, double fraction) {
    const int dx = static_cast<int>(src.width * fraction), dy = static_cast<int>(src.height * fraction);
    Rgb out;
    out.width = src.width - 2 * dx;
    out.height = src.height - 2 * dy;
    for (int y = 0; y < out.height; ++y) {
        const uint8_t* row = &src.pixels[(static_cast<size_t>(y + dy) * src.width + dx) * 3];
        out.pixels.insert(out.pixels.end(), row, row + out.width * 3);
    }
    return out;
}

Rgb Brighten(const Rgb& src, double gain) {
    Rgb out = src;
    for (uint8_t& v : out.pixels) v = static_cast<uint8_t>(std::min(255.0, v * gain));
    return out;
}

// The signature as the analysis makes it: from a copy of about 19,200 pixels.
bool Signature(const Rgb& image, _KtMetaSimilarity* meta) {
    const int w = static_cast<int>(std::sqrt(image.width * 19200.0 / image.height));
    const int h = static_cast<int>(std::sqrt(image.height * 19200.0 / image.width));
    Rgb small;
    if (!Resize(image, w, h, &small)) return false;
    _KtMetaSimilarity* m = nullptr;
    if (KtSimlExtract(small.pixels.data(), w, h, w * 3, 0, &m) != KT_OK) return false;
    *meta = *m;
    KtSimlDisposeMeta(&m);
    return true;
}

struct Entry {
    std::string name;
    int photo;  // index of the original it was made from
    _KtMetaSimilarity meta;
};

struct Parts {
    float total, palette;
    unsigned int edge;
    int texture;
};

Parts Distance(const _KtMetaSimilarity& a, const _KtMetaSimilarity& b) {
    Parts p;
    KtSimlDistance(&a, &b, &p.total);
    KtSimlPaletteDistance(&a, &b, &p.palette);
    edge_s ea, eb;
    KtSimlGetEdge(&a, &ea);
    KtSimlGetEdge(&b, &eb);
    p.edge = edge_distance(&ea, &eb);
    _texture_s ta, tb;
    KtSimlGetTexture(&a, &ta);
    KtSimlGetTexture(&b, &tb);
    p.texture = texture_distance(&ta, &tb);
    return p;
}

std::vector<std::string> JpegFiles(const std::string& folder) {
    std::vector<std::string> names;
    if (DIR* dir = opendir(folder.c_str())) {
        while (dirent* e = readdir(dir)) {
            const std::string n = e->d_name;
            if (n.size() > 4 && (n.substr(n.size() - 4) == ".jpg" || n.substr(n.size() - 4) == ".JPG")) names.push_back(n);
        }
        closedir(dir);
    }
    std::sort(names.begin(), names.end());
    return names;
}

}  // namespace

int main(int argc, char** argv) {
    bool check = false;
    std::string folder;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--check") == 0)
            check = true;
        else
            folder = argv[i];
    }
    const std::vector<std::string> files = JpegFiles(folder);
    if (files.empty()) {
        std::printf("siml_rank: skipped: no JPEG photos in '%s' (run `make sample-photos`)\n", folder.c_str());
        return 77;
    }

    const char* kinds[] = {"re-encoded q50", "resized 50%", "cropped 5%", "brightened 25%"};
    std::vector<Entry> entries;
    for (size_t i = 0; i < files.size(); ++i) {
        std::vector<uint8_t> bytes;
        std::string error;
        Rgb photo;
        if (!lumicor_tool::ReadFile(folder + "/" + files[i], &bytes, &error) || !DecodeJpeg(bytes, &photo, &error)) {
            std::printf("siml_rank: %s: %s\n", files[i].c_str(), error.c_str());
            return 2;
        }
        Rgb copies[4];
        if (!DecodeJpeg(lumicor_tool::EncodeJpeg(photo.pixels.data(), photo.width, photo.height, photo.width * 3, 50),
                        &copies[0], &error)) {
            std::printf("siml_rank: %s re-encoded: %s\n", files[i].c_str(), error.c_str());
            return 2;
        }
        Resize(photo, photo.width / 2, photo.height / 2, &copies[1]);
        copies[2] = Crop(photo, 0.05);
        copies[3] = Brighten(photo, 1.25);
        const int index = static_cast<int>(i);
        Entry original{files[i], index, {}};
        if (!Signature(photo, &original.meta)) return 2;
        entries.push_back(original);
        for (int k = 0; k < 4; ++k) {
            Entry copy{files[i] + " " + kinds[k], index, {}};
            if (!Signature(copies[k], &copy.meta)) return 2;
            entries.push_back(copy);
        }
        std::printf("%-14s %5d x %-5d signature %d x %d, %u colours\n", files[i].c_str(), photo.width, photo.height,
                    static_cast<int>(original.meta.width), static_cast<int>(original.meta.height),
                    static_cast<unsigned>(original.meta.ncol32));
    }

    int failures = 0, duplicateMisses = 0, duplicateFalse = 0;
    std::printf("\n%-32s %8s %8s %6s %8s\n", "candidate", "distance", "palette", "edge", "texture");
    for (const Entry& query : entries) {
        if (query.name != files[static_cast<size_t>(query.photo)]) continue;  // originals only
        std::vector<std::pair<Parts, const Entry*>> ranked;
        for (const Entry& e : entries)
            if (&e != &query) ranked.push_back({Distance(query.meta, e.meta), &e});
        std::sort(ranked.begin(), ranked.end(), [](const std::pair<Parts, const Entry*>& a, const std::pair<Parts, const Entry*>& b) {
            return a.first.total < b.first.total;
        });
        std::printf("query %s\n", query.name.c_str());
        float worstOwn = 0, nearestOther = 2;
        for (size_t r = 0; r < ranked.size(); ++r) {
            const Parts& p = ranked[r].first;
            const bool own = ranked[r].second->photo == query.photo;
            if (own) worstOwn = std::max(worstOwn, p.total);
            else nearestOther = std::min(nearestOther, p.total);
            const bool dup = p.total <= KT_SIML_NEAR_DUPLICATE_THRESHOLD;
            if (own && !dup) ++duplicateMisses;
            if (!own && dup) ++duplicateFalse;
            if (r < 6 || own)
                std::printf("  %2zu %-29s %8.4f %8.2f %6u %8d%s\n", r + 1, ranked[r].second->name.c_str(), p.total, p.palette,
                            p.edge, p.texture, own ? "  (same photo)" : "");
        }
        const bool ok = worstOwn < nearestOther;
        if (!ok) ++failures;
        std::printf("  farthest own copy %.4f, nearest different photo %.4f: %s\n", worstOwn, nearestOther,
                    ok ? "all copies first" : "A DIFFERENT PHOTO RANKS BEFORE A COPY");
    }
    std::printf("\n%d of %zu photos rank all their copies first; near-duplicate threshold %.2f: %d copies missed, "
                "%d different photos taken as duplicates\n",
                static_cast<int>(files.size()) - failures, files.size(), KT_SIML_NEAR_DUPLICATE_THRESHOLD, duplicateMisses,
                duplicateFalse);
    return check && failures > 0 ? 1 : 0;
}
