// Whole-image conversion between pixel orders.
#include <lumicor/zbm_image.h>

#include "common/src/image/color_util.h"
#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

template <int32_t SrcBpp, int32_t DstBpp, typename F>
void ForEachPixelT(const _zbm_Image* src, _zbm_Image* dst, const F& f) {
    for (int32_t y = 0; y < src->height; ++y) {
        const uint8_t* s = Row(src, y);
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < src->width; ++x, s += SrcBpp, d += DstBpp) f(s, d);
    }
}

// Runs f(sourcePixel, destinationPixel) over the image with the pixel
// strides fixed at compile time.
template <typename F>
void ForEachPixel(const _zbm_Image* src, _zbm_Image* dst, const F& f) {
    const int32_t key = src->bytesPerPixel * 10 + dst->bytesPerPixel;
    switch (key) {
        case 11: ForEachPixelT<1, 1>(src, dst, f); break;
        case 13: ForEachPixelT<1, 3>(src, dst, f); break;
        case 14: ForEachPixelT<1, 4>(src, dst, f); break;
        case 31: ForEachPixelT<3, 1>(src, dst, f); break;
        case 33: ForEachPixelT<3, 3>(src, dst, f); break;
        case 34: ForEachPixelT<3, 4>(src, dst, f); break;
        case 41: ForEachPixelT<4, 1>(src, dst, f); break;
        case 43: ForEachPixelT<4, 3>(src, dst, f); break;
        default: ForEachPixelT<4, 4>(src, dst, f); break;
    }
}

void RgbToRgb(const _zbm_Image* src, _zbm_Image* dst) {
    const RgbOffsets s(src->order), d(dst->order);
    // Alpha survives only between two orders that both have it.
    const bool copyAlpha = s.a >= 0 && d.a >= 0;
    ForEachPixel(src, dst, [&](const uint8_t* sp, uint8_t* dp) {
        dp[d.r] = sp[s.r];
        dp[d.g] = sp[s.g];
        dp[d.b] = sp[s.b];
        if (d.a >= 0) dp[d.a] = copyAlpha ? sp[s.a] : 255;
    });
}

int ConvertDifferentOrders(const _zbm_Image* src, _zbm_Image* dst) {
    const _zbm_PixelOrder so = src->order, dor = dst->order;
    const bool srcRgb = IsRgbFamily(so), dstRgb = IsRgbFamily(dor);
    const RgbOffsets s(so);
    if (srcRgb && dstRgb) {
        RgbToRgb(src, dst);
    } else if (so == ZBM_PIXEL_ORDER_GRAY && dstRgb) {
        const RgbWriter put(dor);
        ForEachPixel(src, dst, [&](const uint8_t* sp, uint8_t* dp) { put(dp, sp[0], sp[0], sp[0]); });
    } else if (srcRgb && dor == ZBM_PIXEL_ORDER_GRAY) {
        ForEachPixel(src, dst, [&](const uint8_t* sp, uint8_t* dp) { dp[0] = Gray(sp[s.r], sp[s.g], sp[s.b]); });
    } else if (so == ZBM_PIXEL_ORDER_GRAY && dor == ZBM_PIXEL_ORDER_YUV) {
        ForEachPixel(src, dst, [](const uint8_t* sp, uint8_t* dp) {
            dp[0] = sp[0];
            dp[1] = 128;
            dp[2] = 128;
        });
    } else if (srcRgb && (dor == ZBM_PIXEL_ORDER_YUV || dor == ZBM_PIXEL_ORDER_LAB)) {
        const auto convert = dor == ZBM_PIXEL_ORDER_YUV ? rgb2yuv : rgb2lab;
        ForEachPixel(src, dst, [&](const uint8_t* sp, uint8_t* dp) {
            int c0, c1, c2;
            convert(sp[s.r], sp[s.g], sp[s.b], &c0, &c1, &c2);
            dp[0] = static_cast<uint8_t>(c0);
            dp[1] = static_cast<uint8_t>(c1);
            dp[2] = static_cast<uint8_t>(c2);
        });
    } else if ((so == ZBM_PIXEL_ORDER_YUV || so == ZBM_PIXEL_ORDER_LAB) && dstRgb) {
        const auto convert = so == ZBM_PIXEL_ORDER_YUV ? yuv2rgb : lab2rgb;
        const RgbWriter put(dor);
        ForEachPixel(src, dst, [&](const uint8_t* sp, uint8_t* dp) {
            int r, g, b;
            convert(sp[0], sp[1], sp[2], &r, &g, &b);
            put(dp, r, g, b);
        });
    } else {
        // GRAY or YUV to LAB, LAB to GRAY or YUV, YUV to GRAY.
        return ZBIU_ERR_UNSUPPORTED_CONVERSION;
    }
    return ZBIU_OK;
}

}  // namespace

int ZbiuConvertColorSpace(const _zbm_Image* src, _zbm_Image* dst) {
    if (!src || !dst || src == dst) return ZBIU_ERR_INVALID_ARGUMENT;
    if (!IsValidOrder(src->order)) return ZBIU_ERR_UNSUPPORTED_VALUE;
    if (!IsValidOrder(dst->order)) return ZBIU_ERR_INVALID_ARGUMENT;
    if (!IsValidImage(src) || !IsValidImage(dst) || !SameSize(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    if (src->order == dst->order) return ZbiuCopy(src, dst);
    return ConvertDifferentOrders(src, dst);
}
