// KtSimlExtract: the similarity signature of a (small) photo.
#include <lumicor/ktlib.h>

#include <cstdint>
#include <memory>

#include "common/src/internal/memory.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"
#include "ktlib/src/Similarity/cbs/CEMD/colquant/octree.h"
#include "ktlib/src/Similarity/cbs/Texture/texture/texture.h"

namespace {

const int kPaletteSize = 32;

struct PixelLayout {
    int bytes;
    int r, g, b;
};

// Formats 0..4: RGB, BGR, RGBA, BGRA, ARGB.
const PixelLayout kLayouts[5] = {{3, 0, 1, 2}, {3, 2, 1, 0}, {4, 0, 1, 2}, {4, 2, 1, 0}, {4, 1, 2, 3}};

struct ImageDeleter {
    void operator()(_image_s* im) const { image_kill(im); }
};
struct OctreeDeleter {
    void operator()(_octree* tree) const { octree_kill(tree); }
};

_KtMetaSimilarity::_Lab Unpack(uint32_t color) {
    _KtMetaSimilarity::_Lab lab;
    lab.reserved = 0;
    lab.l = static_cast<uint8_t>(color >> 16);
    lab.a = static_cast<uint8_t>(color >> 8);
    lab.b = static_cast<uint8_t>(color);
    return lab;
}

void CopyPixels(const unsigned char* pixels, int pitch, const PixelLayout& layout, _image_s* image) {
    uint8_t* dst = image->data;
    for (int y = 0; y < image->height; ++y) {
        const unsigned char* src = pixels + static_cast<ptrdiff_t>(y) * pitch;
        for (int x = 0; x < image->width; ++x, src += layout.bytes, dst += 4) {
            dst[0] = src[layout.r];
            dst[1] = src[layout.g];
            dst[2] = src[layout.b];
            dst[3] = 0;
        }
    }
}

// Fills meta from the working image; KT_OK or the failing step's code.
int Analyse(const _image_s* image, _KtMetaSimilarity* meta) {
    meta->width = image->width;
    meta->height = image->height;

    _texture_s texture;
    texture_init(&texture, KT_TEXTURE_BINS);
    if (texture_histogram_t2(&texture, image) != 0) return KT_ERR_NO_MEMORY;
    for (int i = 0; i < KT_TEXTURE_BINS; ++i) {
        meta->verHist[i] = static_cast<uint32_t>(texture.vertical[i]);
        meta->horHist[i] = static_cast<uint32_t>(texture.horizontal[i]);
    }

    if (edge_feature(image, meta->edge.value) != 0) return KT_ERR_NO_MEMORY;

    std::unique_ptr<_octree, OctreeDeleter> tree(octree_create());
    if (!tree) return KT_ERR_NO_MEMORY;
    if (octree_build(tree.get(), image) != 0) return KT_ERR_FAILED;
    // A colour held by fewer pixels than this is folded into a larger one.
    const int minCount = image->width * image->height / 2000 + 1;

    _colhist_s palette[kPaletteSize];
    const int colours = octree_get_lab_palette(tree.get(), palette, kPaletteSize, minCount);
    if (colours < 0) return KT_ERR_NO_MEMORY;
    if (colours == 0) return KT_ERR_FAILED;
    meta->ncol32 = static_cast<uint32_t>(colours);
    for (int i = 0; i < kPaletteSize; ++i) {
        if (i < colours) {
            meta->colHist32[i].lab = Unpack(palette[i].color);
            meta->colHist32[i].count = palette[i].count;
        } else {
            meta->colHist32[i] = _KtMetaSimilarity::_ColHist();
        }
    }

    _colhist_s main[1];
    const int mainColours = octree_get_lab_palette(tree.get(), main, 1, minCount);
    if (mainColours < 0) return KT_ERR_NO_MEMORY;
    if (mainColours == 0) return KT_ERR_FAILED;
    meta->mainColor = Unpack(main[0].color);
    return KT_OK;
}

}  // namespace

extern "C" int KtSimlExtract(const unsigned char* pixels, unsigned int width, unsigned int height, int pitch,
                             unsigned int format, _KtMetaSimilarity** out) {
    if (!pixels || !out) return KT_ERR_NULL;
    if (width == 0 || height == 0 || *out) return KT_ERR_STATE;
    if (format > 4) return KT_ERR_UNSUPPORTED;
    const PixelLayout& layout = kLayouts[format];
    const int64_t rowBytes = static_cast<int64_t>(width) * layout.bytes;
    const int64_t absPitch = pitch < 0 ? -static_cast<int64_t>(pitch) : static_cast<int64_t>(pitch);
    if (absPitch < rowBytes) return KT_ERR_STATE;

    std::unique_ptr<_KtMetaSimilarity> meta = lmk::NewObject<_KtMetaSimilarity>();
    if (!meta) return KT_ERR_NO_MEMORY;

    // Too many pixels is a refusal, not a shortage of memory.
    if (static_cast<uint64_t>(width) * height > CBS_IMAGE_MAX_PIXELS) return KT_ERR_FAILED;
    std::unique_ptr<_image_s, ImageDeleter> image(image_create(static_cast<int>(width), static_cast<int>(height)));
    if (!image) return KT_ERR_NO_MEMORY;
    CopyPixels(pixels, pitch, layout, image.get());

    const int status = Analyse(image.get(), meta.get());
    if (status != KT_OK) return status;
    *out = meta.release();
    return KT_OK;
}
