// The host's pixel orders (LmcPixelOrder numbering, which the driver also
// takes) and the library's _zbm_PixelOrder of the same bytes. The two
// numberings differ for the four-byte orders.
#ifndef LUMICOR_DRIVER_HOST_PIXEL_ORDER_H
#define LUMICOR_DRIVER_HOST_PIXEL_ORDER_H

#include <lumicor/zbm_image.h>

#include <cstddef>
#include <cstdint>

namespace vond {

// Host orders 0..6 describe a byte buffer; 7 is one 32-bit ARGB word per pixel.
constexpr int32_t kHostOrderInt32Argb = 7;
constexpr int32_t kHostOrderCount = 8;

// The _zbm_PixelOrder of host orders 0..6; false for 7 and anything else.
inline bool HostOrderToZbm(int32_t hostOrder, _zbm_PixelOrder* out) {
    static const _zbm_PixelOrder kMap[7] = {ZBM_PIXEL_ORDER_GRAY, ZBM_PIXEL_ORDER_RGB,  ZBM_PIXEL_ORDER_BGR,
                                            ZBM_PIXEL_ORDER_ARGB, ZBM_PIXEL_ORDER_ABGR, ZBM_PIXEL_ORDER_RGBA,
                                            ZBM_PIXEL_ORDER_BGRA};
    if (hostOrder < 0 || hostOrder >= kHostOrderInt32Argb) return false;
    *out = kMap[hostOrder];
    return true;
}

// Fills the RGB image `rgb` (its own width and height) from host words of
// order 7: row y starts y * pitch bytes after `words` (pitch a multiple of 4,
// possibly negative); each word gives R = bits 16-23, G = 8-15, B = 0-7 and
// its alpha is dropped.
inline void CopyInt32ArgbToRgb(const uint32_t* words, int32_t pitch, _zbm_Image* rgb) {
    const ptrdiff_t wordsPerRow = pitch / 4;
    for (int32_t y = 0; y < rgb->height; ++y) {
        const uint32_t* src = words + static_cast<ptrdiff_t>(y) * wordsPerRow;
        uint8_t* dst = rgb->pData + static_cast<ptrdiff_t>(y) * rgb->pitch;
        for (int32_t x = 0; x < rgb->width; ++x) {
            const uint32_t v = src[x];
            *dst++ = static_cast<uint8_t>((v >> 16) & 255);
            *dst++ = static_cast<uint8_t>((v >> 8) & 255);
            *dst++ = static_cast<uint8_t>(v & 255);
        }
    }
}

}  // namespace vond

#endif
