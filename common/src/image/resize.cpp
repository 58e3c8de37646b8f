// Resizing. Every stored result downstream (working images, similarity
// signatures, blur maps) is computed from images made here, so the sampling
// positions, the 10-bit weights and the order of the passes are fixed:
// bilinear sampling on a 10-bit grid, exact 2×2 means for exact halvings, and
// a halving pyramid for strong reductions so that every output pixel averages
// all the input pixels it covers.
#include <lumicor/zbm_image.h>

#include <cstdlib>

#include "common/src/image/image_util.h"
#include "common/src/internal/memory.h"

using namespace lmk::image;

namespace {

template <int32_t Bpp>
int BilinearT(const _zbm_Image* src, _zbm_Image* dst) {
    lmk::UniqueArray<AxisSample> columns = lmk::NewArray<AxisSample>(static_cast<size_t>(dst->width));
    if (!columns) return ZBIU_ERR_OUT_OF_MEMORY;
    const AxisSampler xs(src->width, dst->width);
    for (int32_t x = 0; x < dst->width; ++x) columns[x] = xs.At(x, Bpp);
    const AxisSampler ys(src->height, dst->height);
    for (int32_t y = 0; y < dst->height; ++y) {
        const AxisSample row = ys.At(y, 1);
        const uint8_t* top = Row(src, row.offset0);
        const uint8_t* bottom = Row(src, row.offset1);
        const uint32_t fy = row.weight;
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < dst->width; ++x, d += Bpp) {
            const AxisSample& col = columns[x];
            const uint8_t* tl = top + col.offset0;
            const uint8_t* tr = top + col.offset1;
            const uint8_t* bl = bottom + col.offset0;
            const uint8_t* br = bottom + col.offset1;
            for (int32_t c = 0; c < Bpp; ++c) {
                d[c] = static_cast<uint8_t>(Bilinear(tl[c], tr[c], bl[c], br[c], col.weight, fy));
            }
        }
    }
    return ZBIU_OK;
}

int ResizeBilinear(const _zbm_Image* src, _zbm_Image* dst) {
    switch (src->bytesPerPixel) {
        case 1: return BilinearT<1>(src, dst);
        case 3: return BilinearT<3>(src, dst);
        default: return BilinearT<4>(src, dst);
    }
}

// Exact halving: each destination pixel is the truncated mean of its 2×2
// source block.
template <int32_t Bpp>
void HalveT(const _zbm_Image* src, _zbm_Image* dst) {
    for (int32_t y = 0; y < dst->height; ++y) {
        const uint8_t* a = Row(src, 2 * y);
        const uint8_t* b = Row(src, 2 * y + 1);
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < dst->width; ++x, a += 2 * Bpp, b += 2 * Bpp, d += Bpp) {
            for (int32_t c = 0; c < Bpp; ++c) {
                d[c] = static_cast<uint8_t>((a[c] + a[c + Bpp] + b[c] + b[c + Bpp]) >> 2);
            }
        }
    }
}

// A reduction to at most 2× in each dimension: exact halving when the
// source is exactly twice the destination in both, else bilinear.
int Reduce(const _zbm_Image* src, _zbm_Image* dst) {
    if (src->width != 2 * dst->width || src->height != 2 * dst->height) return ResizeBilinear(src, dst);
    switch (src->bytesPerPixel) {
        case 1: HalveT<1>(src, dst); break;
        case 3: HalveT<3>(src, dst); break;
        default: HalveT<4>(src, dst); break;
    }
    return ZBIU_OK;
}

// Entry into the pyramid: the source is more than twice the destination in
// either dimension.
bool MoreThanTwice(int32_t w, int32_t h, const _zbm_Image* dst) {
    return w > 2 * static_cast<int64_t>(dst->width) || h > 2 * static_cast<int64_t>(dst->height);
}

// Whether the pyramid halves once more: the whole-number ratio of either
// dimension to the destination is still above 2. A level only slightly
// above twice the destination (51 for 25) is therefore not halved again but
// reduced by the final bilinear step, as the stored results expect.
bool HalveAgain(int32_t w, int32_t h, const _zbm_Image* dst) { return w / dst->width > 2 || h / dst->height > 2; }

// Scratch level of the pyramid: a packed image record over a caller buffer.
_zbm_Image ScratchImage(uint8_t* data, int32_t width, int32_t height, const _zbm_Image* like) {
    _zbm_Image image;
    image.pData = data;
    image.width = width;
    image.height = height;
    image.pitch = width * like->bytesPerPixel;
    image.order = like->order;
    image.bytesPerPixel = like->bytesPerPixel;
    image.ownsData = 0;
    return image;
}

// Strong reduction: halve both dimensions to ((n + 1) / 2) with the
// reduction rule, and repeat while HalveAgain holds, ping-ponging between two
// scratch buffers (odd levels in the first, even levels in the second); one
// final reduction then produces dst.
int ResizePyramid(const _zbm_Image* src, _zbm_Image* dst) {
    const int32_t bpp = src->bytesPerPixel;
    const int32_t w1 = (src->width + 1) / 2, h1 = (src->height + 1) / 2;
    const int32_t w2 = (w1 + 1) / 2, h2 = (h1 + 1) / 2;
    // The source passed the 32-bit layout check, so a quarter of it fits.
    lmk::MallocPtr<uint8_t> first(static_cast<uint8_t*>(
        std::malloc(static_cast<size_t>(w1) * static_cast<size_t>(h1) * static_cast<size_t>(bpp))));
    if (!first) return ZBIU_ERR_OUT_OF_MEMORY;
    lmk::MallocPtr<uint8_t> second;
    if (HalveAgain(w1, h1, dst)) {
        second.reset(static_cast<uint8_t*>(
            std::malloc(static_cast<size_t>(w2) * static_cast<size_t>(h2) * static_cast<size_t>(bpp))));
        if (!second) return ZBIU_ERR_OUT_OF_MEMORY;
    }

    _zbm_Image levels[2];
    const _zbm_Image* current = src;
    int level = 0;
    do {
        _zbm_Image& next = levels[level & 1];
        next = ScratchImage(level & 1 ? second.get() : first.get(), (current->width + 1) / 2,
                            (current->height + 1) / 2, src);
        const int status = Reduce(current, &next);
        if (status != ZBIU_OK) return status;
        current = &next;
        ++level;
    } while (HalveAgain(current->width, current->height, dst));
    return Reduce(current, dst);
}

}  // namespace

int ZbiuResize(const _zbm_Image* src, _zbm_Image* dst) {
    if (!IsValidPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t sw = src->width, sh = src->height, dw = dst->width, dh = dst->height;

    if (sw == dw && sh == dh) return ZbiuCopy(src, dst);

    // One dimension grows while the other shrinks: first change only the
    // shrinking one (reduction rules), then only the growing one.
    if ((dw > sw && dh < sh) || (dw < sw && dh > sh)) {
        ZbmImagePtr temp(dw > sw ? ZbiuCreate(sw, dh, src->order) : ZbiuCreate(dw, sh, src->order));
        if (!temp) return ZBIU_ERR_OUT_OF_MEMORY;
        const int status = ZbiuResize(src, temp.get());
        return status != ZBIU_OK ? status : ZbiuResize(temp.get(), dst);
    }

    if (dw > sw || dh > sh) return ResizeBilinear(src, dst);
    if (!MoreThanTwice(sw, sh, dst)) return Reduce(src, dst);
    return ResizePyramid(src, dst);
}
