// Point operations: each output byte depends only on the input byte of the
// same channel, so every operation builds one 256-entry table per channel
// (with the operation's own arithmetic) and maps the image through it.
#include <lumicor/zbm_image.h>

#include <cmath>

#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

typedef uint8_t ChannelTables[4][256];

bool IsPointPair(const _zbm_Image* src, const _zbm_Image* dst) { return IsValidPair(src, dst) && SameSize(src, dst); }

void ApplyTables(const _zbm_Image* src, _zbm_Image* dst, const ChannelTables& tables) {
    const int32_t bpp = src->bytesPerPixel;
    for (int32_t y = 0; y < src->height; ++y) {
        const uint8_t* s = Row(src, y);
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < src->width; ++x, s += bpp, d += bpp) {
            for (int32_t c = 0; c < bpp; ++c) d[c] = tables[c][s[c]];
        }
    }
}

// Truncates toward zero and clamps to 0..255; NaN gives 0.
uint8_t TruncateClamp(float v) {
    if (!(v > 0.0f)) return 0;
    if (v >= 255.0f) return 255;
    return static_cast<uint8_t>(v);
}

template <typename F>
void BuildTables(ChannelTables& tables, const F& f) {
    for (int c = 0; c < 4; ++c)
        for (int v = 0; v < 256; ++v) tables[c][v] = f(c, v);
}

bool IsGrayPair(const _zbm_Image* src, const _zbm_Image* dst) {
    return IsPointPair(src, dst) && src->order == ZBM_PIXEL_ORDER_GRAY;
}

}  // namespace

int ZbiuOffsetImage(const _zbm_Image* src, _zbm_Image* dst, zbm_PackedFloat offset, zbm_PackedFloat gain) {
    if (!IsPointPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    ChannelTables tables;
    BuildTables(tables, [&](int c, int v) { return TruncateClamp((static_cast<float>(v) - offset.v[c]) * gain.v[c]); });
    ApplyTables(src, dst, tables);
    return ZBIU_OK;
}

int ZbiuGainImage(const _zbm_Image* src, _zbm_Image* dst, zbm_PackedFloat gain) {
    if (!IsPointPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    ChannelTables tables;
    BuildTables(tables, [&](int c, int v) { return TruncateClamp(static_cast<float>(v) * gain.v[c]); });
    ApplyTables(src, dst, tables);
    return ZBIU_OK;
}

int ZbiuGammaCompensation(const _zbm_Image* src, _zbm_Image* dst, float gamma) {
    if (!IsPointPair(src, dst) || !(gamma > 0.0f) || !std::isfinite(gamma)) return ZBIU_ERR_INVALID_ARGUMENT;
    const double exponent = 1.0 / static_cast<double>(gamma);
    ChannelTables tables;
    BuildTables(tables, [&](int, int v) {
        const double out = std::floor(255.0 * std::pow(v / 255.0, exponent) + 0.5);
        return static_cast<uint8_t>(out > 255.0 ? 255.0 : out);
    });
    ApplyTables(src, dst, tables);
    return ZBIU_OK;
}

int ZbiuNegative(const _zbm_Image* src, _zbm_Image* dst) {
    if (!IsPointPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    ChannelTables tables;
    BuildTables(tables, [](int, int v) { return static_cast<uint8_t>(255 - v); });
    ApplyTables(src, dst, tables);
    return ZBIU_OK;
}

int ZbiuThreshold(const _zbm_Image* src, _zbm_Image* dst, uint8_t t) {
    return ZbiuBandThreshold(src, dst, t, 255);
}

int ZbiuBandThreshold(const _zbm_Image* src, _zbm_Image* dst, uint8_t lo, uint8_t hi) {
    if (!IsGrayPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    ChannelTables tables;
    BuildTables(tables, [&](int, int v) { return static_cast<uint8_t>(v >= lo && v <= hi ? 255 : 0); });
    ApplyTables(src, dst, tables);
    return ZBIU_OK;
}

int ZbiuGrayToPseudoRgb(const _zbm_Image* src, _zbm_Image* dst) {
    if (!IsValidImage(src) || !IsValidImage(dst) || src == dst || !SameSize(src, dst) ||
        src->order != ZBM_PIXEL_ORDER_GRAY || !IsRgbFamily(dst->order)) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    // Blue -> cyan -> green -> yellow -> red in four linear ramps of 64
    // levels, each reaching its end colour exactly.
    uint8_t ramp[256][3];
    for (int v = 0; v < 256; ++v) {
        const int k = (v & 63) * 255 / 63;
        int r, g, b;
        switch (v >> 6) {
            case 0: r = 0, g = k, b = 255; break;
            case 1: r = 0, g = 255, b = 255 - k; break;
            case 2: r = k, g = 255, b = 0; break;
            default: r = 255, g = 255 - k, b = 0; break;
        }
        ramp[v][0] = static_cast<uint8_t>(r);
        ramp[v][1] = static_cast<uint8_t>(g);
        ramp[v][2] = static_cast<uint8_t>(b);
    }
    const RgbWriter put(dst->order);
    const int32_t dbpp = dst->bytesPerPixel;
    for (int32_t y = 0; y < src->height; ++y) {
        const uint8_t* s = Row(src, y);
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < src->width; ++x, ++s, d += dbpp) put(d, ramp[*s][0], ramp[*s][1], ramp[*s][2]);
    }
    return ZBIU_OK;
}
