#include "ktlib/src/Similarity/cbs/Texture/texture/texture.h"

#include <cstdio>
#include <cstring>

#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/imatrix/imatrix.h"

namespace {

const int kBlock = 2 * KT_TEXTURE_BINS;  // 16 x 16 luma blocks
// Weights (percent) of frequencies 1..5: low frequencies come from shading
// and gradients more than from texture.
const int32_t kWeight[6] = {100, 60, 75, 85, 90, 95};

void WeightLowFrequencies(int32_t* magnitude) {
    for (int f = 1; f <= 5; ++f) magnitude[f] = magnitude[f] * kWeight[f] / 100;
}

// Bin of a weighted magnitude vector: the strongest frequency 1..8 (the first
// on ties; 8 shares bin 7), or 0 when even that is below the flatness limit.
int DominantBin(const int32_t* magnitude, int32_t flat) {
    int best = 1;
    for (int f = 2; f <= 8; ++f)
        if (magnitude[f] > magnitude[best]) best = f;
    if (magnitude[best] < flat) return 0;
    return best == 8 ? 7 : best;
}

bool ValidImage(const _image_s* image) { return image && image->data && image->width > 0 && image->height > 0; }

// Prepares t for the image; false when the histograms stay at their
// one-count default because the image holds no complete block.
bool Start(_texture_s* t, const _image_s* image) {
    t->width = image->width;
    t->height = image->height;
    texture_clear(t);
    if (image->height < kBlock || image->width < kBlock) {
        t->vertical[0] = 1;
        t->horizontal[0] = 1;
        return false;
    }
    return true;
}

}  // namespace

extern "C" int texture_init(_texture_s* t, int bins) {
    if (!t || bins < 1 || bins > KT_TEXTURE_BINS) return -1;
    std::memset(t, 0, sizeof(*t));
    t->bins = bins;
    return 0;
}

extern "C" void texture_clear(_texture_s* t) {
    if (!t) return;
    std::memset(t->vertical, 0, sizeof(t->vertical));
    std::memset(t->horizontal, 0, sizeof(t->horizontal));
}

extern "C" void texture_print(const _texture_s* t, FILE* stream) {
    if (!stream) stream = stdout;
    if (!t) return;
    std::fprintf(stream, "texture %d x %d, %d bins\n", static_cast<int>(t->width), static_cast<int>(t->height),
                 static_cast<int>(t->bins));
    std::fprintf(stream, "vertical   = {");
    for (int i = 0; i < KT_TEXTURE_BINS; ++i) std::fprintf(stream, "%d, ", static_cast<int>(t->vertical[i]));
    std::fprintf(stream, "}\nhorizontal = {");
    for (int i = 0; i < KT_TEXTURE_BINS; ++i) std::fprintf(stream, "%d, ", static_cast<int>(t->horizontal[i]));
    std::fprintf(stream, "}\n");
}

// Runs `count` on every complete 16 x 16 block, once with the rows' DFT
// magnitudes for the horizontal histogram and once with the columns' for the
// vertical one. -1 when the block matrix cannot be allocated.
template <typename Count>
int ForEachBlock(_texture_s* t, const _image_s* image, Count count) {
    _matrix_s block;
    if (matrix_init(&block, kBlock, kBlock) != 0) return -1;
    for (int y = 0; y <= image->height - kBlock; y += kBlock) {
        for (int x = 0; x <= image->width - kBlock; x += kBlock) {
            matrix_crop_image_y(&block, image, x, y);
            matrix_dft_hor(&block);
            count(block.data, t->horizontal);
            matrix_crop_image_y(&block, image, x, y);
            matrix_transpose(&block);
            matrix_dft_hor(&block);
            count(block.data, t->vertical);
        }
    }
    matrix_free(&block);
    return 0;
}

extern "C" int texture_histogram_t2(_texture_s* t, const _image_s* image) {
    if (!t || t->bins != KT_TEXTURE_BINS || !ValidImage(image)) return -1;
    if (!Start(t, image)) return 0;
    // One count per row (or column) of the block.
    return ForEachBlock(t, image, [](int32_t* magnitudes, int32_t* histogram) {
        for (int r = 0; r < kBlock; ++r) {
            int32_t* row = magnitudes + r * kBlock;
            WeightLowFrequencies(row);
            ++histogram[DominantBin(row, 20)];
        }
    });
}

extern "C" int texture_histogram_t(_texture_s* t, const _image_s* image) {
    if (!t || t->bins != KT_TEXTURE_BINS || !ValidImage(image)) return -1;
    if (!Start(t, image)) return 0;
    // One count per block, from the sum of its magnitude vectors.
    return ForEachBlock(t, image, [](int32_t* magnitudes, int32_t* histogram) {
        int32_t sum[kBlock] = {};
        for (int r = 0; r < kBlock; ++r)
            for (int f = 0; f < kBlock; ++f) sum[f] += magnitudes[r * kBlock + f];
        WeightLowFrequencies(sum);
        ++histogram[DominantBin(sum, 400)];
    });
}
