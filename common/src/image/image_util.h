// Checks and row access shared by the image operations. Every operation
// validates its records with IsValidImage before touching a pixel, so the
// loops below may assume a non-null buffer, sizes of at least 1 × 1 and row
// offsets that fit in 32 bits.
#ifndef LUMICOR_COMMON_IMAGE_IMAGE_UTIL_H
#define LUMICOR_COMMON_IMAGE_IMAGE_UTIL_H

#include <lumicor/zbm_image.h>

#include <cstddef>
#include <cstdint>

namespace lmk {
namespace image {

// Creation ceiling: bounds the memory one image may take.
constexpr uint32_t kMaxCreatePixels = 16000000u;

inline bool IsValidOrder(int32_t order) { return order >= 0 && order < ZBM_PIXEL_ORDER_NUM; }

inline bool IsRgbFamily(int32_t order) { return order >= ZBM_PIXEL_ORDER_RGB && order <= ZBM_PIXEL_ORDER_ABGR; }

inline int32_t BytesPerPixel(int32_t order) {
    static const int32_t kBytes[ZBM_PIXEL_ORDER_NUM] = {1, 3, 3, 4, 4, 4, 4, 3, 3};
    return IsValidOrder(order) ? kBytes[order] : 0;
}

// True when width × height pixels of `order` with this pitch can be addressed
// with 32-bit offsets: sizes >= 1, |pitch| >= one row, and the span from the
// first to the last byte fits in int32.
inline bool IsValidLayout(int32_t width, int32_t height, int32_t pitch, int32_t order) {
    const int32_t bpp = BytesPerPixel(order);
    if (bpp == 0 || width < 1 || height < 1) return false;
    const int64_t rowBytes = static_cast<int64_t>(width) * bpp;
    const int64_t absPitch = pitch < 0 ? -static_cast<int64_t>(pitch) : pitch;
    if (absPitch < rowBytes) return false;
    return absPitch * (height - 1) + rowBytes <= INT32_MAX;
}

inline bool IsValidImage(const _zbm_Image* image) {
    return image && image->pData && image->bytesPerPixel == BytesPerPixel(image->order) &&
           IsValidLayout(image->width, image->height, image->pitch, image->order);
}

inline bool SameSize(const _zbm_Image* a, const _zbm_Image* b) {
    return a->width == b->width && a->height == b->height;
}

// Both valid, distinct and of the same pixel order.
inline bool IsValidPair(const _zbm_Image* src, const _zbm_Image* dst) {
    return IsValidImage(src) && IsValidImage(dst) && src != dst && src->order == dst->order;
}

inline const uint8_t* Row(const _zbm_Image* image, int32_t y) {
    return image->pData + static_cast<ptrdiff_t>(y) * image->pitch;
}
inline uint8_t* Row(_zbm_Image* image, int32_t y) { return image->pData + static_cast<ptrdiff_t>(y) * image->pitch; }

inline uint32_t RowBytes(const _zbm_Image* image) {
    return static_cast<uint32_t>(image->width) * static_cast<uint32_t>(image->bytesPerPixel);
}

// 10-bit bilinear blend of four neighbours with weights fx, fy in 0..1024;
// the result never exceeds the largest input (255 × 2^20 fits in 32 bits).
inline uint32_t Bilinear(uint32_t tl, uint32_t tr, uint32_t bl, uint32_t br, uint32_t fx, uint32_t fy) {
    return ((1024u - fy) * (tl * (1024u - fx) + tr * fx) + fy * (bl * (1024u - fx) + br * fx)) >> 20;
}

// Resampling positions shared by ZbiuResize and IIScaleImage.
// Byte offsets of the two neighbours along one axis and the 10-bit weight of
// the second one.
struct AxisSample {
    int32_t offset0;
    int32_t offset1;
    uint32_t weight;
};

// Sample k of an axis: position step/2 - 512 + k × step with
// step = (src << 10) / dst, clamped to 0 .. (src << 10) - 1025 so that both
// neighbours exist. A one-pixel source has an empty clamp range: every sample
// then sits on pixel 0 with weight 0.
class AxisSampler {
public:
    AxisSampler(int32_t srcSize, int32_t dstSize)
        : step_((static_cast<int64_t>(srcSize) << 10) / dstSize),
          first_(step_ / 2 - 512),
          max_((static_cast<int64_t>(srcSize) << 10) - 1025),
          last_(srcSize - 1) {}

    AxisSample At(int32_t k, int32_t scale) const {
        int64_t pos = first_ + step_ * k;
        if (pos > max_) pos = max_;
        if (pos < 0) pos = 0;
        const int32_t i0 = static_cast<int32_t>(pos >> 10);
        const int32_t i1 = i0 < last_ ? i0 + 1 : last_;
        return AxisSample{i0 * scale, i1 * scale, static_cast<uint32_t>(pos & 1023)};
    }

private:
    int64_t step_;
    int64_t first_;
    int64_t max_;
    int32_t last_;
};

inline zbm_PackedUchar ReadPixel(const uint8_t* p, int32_t bpp) {
    zbm_PackedUchar v = {{0, 0, 0, 0}};
    for (int32_t c = 0; c < bpp; ++c) v.v[c] = p[c];
    return v;
}

inline void WritePixel(uint8_t* p, int32_t bpp, const zbm_PackedUchar& v) {
    for (int32_t c = 0; c < bpp; ++c) p[c] = v.v[c];
}

// Writes one pixel when (x, y) lies inside the image (the clipping rule of
// ZbiuSetPixel, for loops that validated the image once).
inline void PlotClipped(_zbm_Image* image, int64_t x, int64_t y, const zbm_PackedUchar& v) {
    if (x < 0 || y < 0 || x >= image->width || y >= image->height) return;
    WritePixel(Row(image, static_cast<int32_t>(y)) + static_cast<ptrdiff_t>(x) * image->bytesPerPixel,
               image->bytesPerPixel, v);
}

// Pixels x0 .. x1 (inclusive) of row y, clipped to the image.
inline void SpanClipped(_zbm_Image* image, int64_t y, int64_t x0, int64_t x1, const zbm_PackedUchar& v) {
    if (y < 0 || y >= image->height) return;
    if (x0 < 0) x0 = 0;
    if (x1 >= image->width) x1 = image->width - 1;
    if (x0 > x1) return;
    const int32_t bpp = image->bytesPerPixel;
    uint8_t* p = Row(image, static_cast<int32_t>(y)) + static_cast<ptrdiff_t>(x0) * bpp;
    for (int64_t x = x0; x <= x1; ++x, p += bpp) WritePixel(p, bpp, v);
}

inline bool SamePixel(const uint8_t* p, int32_t bpp, const zbm_PackedUchar& v) {
    for (int32_t c = 0; c < bpp; ++c)
        if (p[c] != v.v[c]) return false;
    return true;
}

// Channel offsets of an RGB-family order; alpha is -1 when absent.
struct RgbOffsets {
    int32_t r, g, b, a;
    explicit RgbOffsets(_zbm_PixelOrder order) { ZbiuGetRgbOffset(order, &r, &g, &b, &a); }
};

// Writes r, g, b into an RGB-family pixel; alpha (when present) becomes 255.
struct RgbWriter {
    RgbOffsets o;
    explicit RgbWriter(_zbm_PixelOrder order) : o(order) {}
    void operator()(uint8_t* d, int r, int g, int b) const {
        d[o.r] = static_cast<uint8_t>(r);
        d[o.g] = static_cast<uint8_t>(g);
        d[o.b] = static_cast<uint8_t>(b);
        if (o.a >= 0) d[o.a] = 255;
    }
};

}  // namespace image
}  // namespace lmk

#endif
