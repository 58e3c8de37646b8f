// Whole-image statistics per stored channel. Sums are kept in 64-bit
// integers (attached host images may exceed the creation ceiling) and
// divided in double precision.
#include <lumicor/zbm_image.h>

#include "common/src/image/image_util.h"
#include "common/src/image/triangle.h"

using namespace lmk::image;

namespace {

zbm_PackedFloat ZeroFloats() {
    zbm_PackedFloat f = {{0.0f, 0.0f, 0.0f, 0.0f}};
    return f;
}

}  // namespace

int ZbiuGetMinMax(const _zbm_Image* image, zbm_PackedUchar* min, zbm_PackedUchar* max) {
    if (!IsValidImage(image) || !min || !max) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t bpp = image->bytesPerPixel;
    zbm_PackedUchar lo = {{0, 0, 0, 0}}, hi = {{0, 0, 0, 0}};
    for (int32_t c = 0; c < bpp; ++c) lo.v[c] = 255;
    for (int32_t y = 0; y < image->height; ++y) {
        const uint8_t* p = Row(image, y);
        for (int32_t x = 0; x < image->width; ++x, p += bpp) {
            for (int32_t c = 0; c < bpp; ++c) {
                if (p[c] < lo.v[c]) lo.v[c] = p[c];
                if (p[c] > hi.v[c]) hi.v[c] = p[c];
            }
        }
    }
    *min = lo;
    *max = hi;
    return ZBIU_OK;
}

int ZbiuCalcAverage(const _zbm_Image* image, zbm_PackedFloat* avg) {
    if (!IsValidImage(image) || !avg) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t bpp = image->bytesPerPixel;
    uint64_t sum[4] = {0, 0, 0, 0};
    for (int32_t y = 0; y < image->height; ++y) {
        const uint8_t* p = Row(image, y);
        for (int32_t x = 0; x < image->width; ++x, p += bpp) {
            for (int32_t c = 0; c < bpp; ++c) sum[c] += p[c];
        }
    }
    const double n = static_cast<double>(image->width) * image->height;
    zbm_PackedFloat out = ZeroFloats();
    for (int32_t c = 0; c < bpp; ++c) out.v[c] = static_cast<float>(static_cast<double>(sum[c]) / n);
    *avg = out;
    return ZBIU_OK;
}

int ZbiuCalcVariance(const _zbm_Image* image, const zbm_PackedFloat& avg, zbm_PackedFloat* var) {
    if (!IsValidImage(image) || !var) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t bpp = image->bytesPerPixel;
    double sum[4] = {0.0, 0.0, 0.0, 0.0};
    for (int32_t y = 0; y < image->height; ++y) {
        const uint8_t* p = Row(image, y);
        for (int32_t x = 0; x < image->width; ++x, p += bpp) {
            for (int32_t c = 0; c < bpp; ++c) {
                const double d = p[c] - static_cast<double>(avg.v[c]);
                sum[c] += d * d;
            }
        }
    }
    const double n = static_cast<double>(image->width) * image->height;
    zbm_PackedFloat out = ZeroFloats();
    for (int32_t c = 0; c < bpp; ++c) out.v[c] = static_cast<float>(sum[c] / n);
    *var = out;
    return ZBIU_OK;
}

int ZbiuCalcAvarageInTriangle(const _zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_Pos p2, zbm_PackedFloat* avg) {
    if (!IsValidImage(image) || !avg) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t bpp = image->bytesPerPixel;
    uint64_t sum[4] = {0, 0, 0, 0};
    uint64_t count = 0;
    ForEachTriangleRun(p0, p1, p2, image->width, image->height, [&](int32_t y, int32_t x0, int32_t x1) {
        const uint8_t* p = ZbiuGetConstPointer(image, x0, y);
        for (int32_t x = x0; x <= x1; ++x, p += bpp) {
            for (int32_t c = 0; c < bpp; ++c) sum[c] += p[c];
        }
        count += static_cast<uint64_t>(x1 - x0 + 1);
    });
    zbm_PackedFloat out = ZeroFloats();
    if (count > 0) {
        for (int32_t c = 0; c < bpp; ++c) {
            out.v[c] = static_cast<float>(static_cast<double>(sum[c]) / static_cast<double>(count));
        }
    }
    *avg = out;
    return ZBIU_OK;
}
