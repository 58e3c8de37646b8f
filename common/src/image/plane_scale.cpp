// IIScaleImage: plane scaling for the attention engine and the face detector.
#include "common/src/internal/plane_scale.h"

#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "common/src/image/image_util.h"
#include "common/src/internal/memory.h"

using lmk::image::AxisSample;
using lmk::image::AxisSampler;
using lmk::image::Bilinear;

namespace {

bool ValidPlane(const void* p, int32_t w, int32_t h, int32_t stride) {
    if (p == nullptr || w < 1 || h < 1 || stride < w) return false;
    return static_cast<int64_t>(stride) * (h - 1) + w <= INT32_MAX;
}

// One bilinear step. Column samples are computed per pixel so that the step
// needs no scratch memory.
void ScaleStep(uint8_t* dst, int32_t dw, int32_t dh, int32_t ds, const uint8_t* src, int32_t sw, int32_t sh,
               int32_t ss) {
    if (dw == sw && dh == sh) {
        for (int32_t y = 0; y < dh; ++y) {
            std::memcpy(dst + static_cast<ptrdiff_t>(y) * ds, src + static_cast<ptrdiff_t>(y) * ss,
                        static_cast<size_t>(dw));
        }
        return;
    }
    const AxisSampler xs(sw, dw);
    const AxisSampler ys(sh, dh);
    // Column samples in blocks, so that the step needs no heap memory.
    constexpr int32_t kBlock = 256;
    AxisSample cols[kBlock];
    for (int32_t bx = 0; bx < dw; bx += kBlock) {
        const int32_t n = dw - bx < kBlock ? dw - bx : kBlock;
        for (int32_t i = 0; i < n; ++i) cols[i] = xs.At(bx + i, 1);
        for (int32_t y = 0; y < dh; ++y) {
            const AxisSample row = ys.At(y, 1);
            const uint8_t* top = src + static_cast<ptrdiff_t>(row.offset0) * ss;
            const uint8_t* bottom = src + static_cast<ptrdiff_t>(row.offset1) * ss;
            uint8_t* d = dst + static_cast<ptrdiff_t>(y) * ds + bx;
            for (int32_t i = 0; i < n; ++i) {
                const AxisSample& col = cols[i];
                d[i] = static_cast<uint8_t>(Bilinear(top[col.offset0], top[col.offset1], bottom[col.offset0],
                                                     bottom[col.offset1], col.weight, row.weight));
            }
        }
    }
}

int32_t NextSize(int32_t current, int32_t target) {
    return current > 2 * static_cast<int64_t>(target) ? (current + 1) / 2 : target;
}

}  // namespace

int IIScaleImage(uint8_t* dst, int32_t dstWidth, int32_t dstHeight, int32_t dstStride, const uint8_t* src,
                 int32_t srcWidth, int32_t srcHeight, int32_t srcStride) {
    if (!ValidPlane(dst, dstWidth, dstHeight, dstStride) || !ValidPlane(src, srcWidth, srcHeight, srcStride)) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    const bool reduce = srcWidth > 2 * static_cast<int64_t>(dstWidth) ||
                        srcHeight > 2 * static_cast<int64_t>(dstHeight);
    if (!reduce) {
        ScaleStep(dst, dstWidth, dstHeight, dstStride, src, srcWidth, srcHeight, srcStride);
        return ZBIU_OK;
    }
    // Two scratch planes, packed: the first halving is the largest level and
    // every later level fits in the second.
    const int32_t w1 = NextSize(srcWidth, dstWidth), h1 = NextSize(srcHeight, dstHeight);
    const int32_t w2 = NextSize(w1, dstWidth), h2 = NextSize(h1, dstHeight);
    lmk::MallocPtr<uint8_t> first(static_cast<uint8_t*>(std::malloc(static_cast<size_t>(w1) * h1)));
    if (!first) return ZBIU_ERR_OUT_OF_MEMORY;
    lmk::MallocPtr<uint8_t> second;
    if (w1 > 2 * static_cast<int64_t>(dstWidth) || h1 > 2 * static_cast<int64_t>(dstHeight)) {
        second.reset(static_cast<uint8_t*>(std::malloc(static_cast<size_t>(w2) * h2)));
        if (!second) return ZBIU_ERR_OUT_OF_MEMORY;
    }
    const uint8_t* cur = src;
    int32_t cw = srcWidth, ch = srcHeight, cs = srcStride;
    int level = 0;
    while (cw > 2 * static_cast<int64_t>(dstWidth) || ch > 2 * static_cast<int64_t>(dstHeight)) {
        const int32_t nw = NextSize(cw, dstWidth), nh = NextSize(ch, dstHeight);
        uint8_t* next = (level & 1) ? second.get() : first.get();
        ScaleStep(next, nw, nh, nw, cur, cw, ch, cs);
        cur = next;
        cw = nw;
        ch = nh;
        cs = nw;
        ++level;
    }
    ScaleStep(dst, dstWidth, dstHeight, dstStride, cur, cw, ch, cs);
    return ZBIU_OK;
}
