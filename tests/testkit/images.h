// Synthetic images for tests: deterministic noise, flat images and byte-wise
// comparison of two images whatever their pitch.
#ifndef LUMICOR_TESTKIT_IMAGES_H
#define LUMICOR_TESTKIT_IMAGES_H

#include <lumicor/zbm_image.h>

#include <cstdint>
#include <cstring>

namespace lumicor {
namespace test {

// Every byte from a fixed linear congruential sequence seeded by `seed`.
inline ZbmImagePtr MakeNoiseImage(int32_t width, int32_t height, _zbm_PixelOrder order, uint32_t seed = 1) {
    ZbmImagePtr image(ZbiuCreate(width, height, order));
    if (!image) return image;
    uint32_t state = seed * 2654435761u + 12345u;
    for (int32_t y = 0; y < height; ++y) {
        uint8_t* row = ZbiuGetPointer(image.get(), 0, y);
        for (int32_t i = 0; i < width * image->bytesPerPixel; ++i) {
            state = state * 1103515245u + 12345u;
            row[i] = static_cast<uint8_t>(state >> 23);
        }
    }
    return image;
}

inline zbm_PackedUchar Pixel(uint8_t a, uint8_t b = 0, uint8_t c = 0, uint8_t d = 0) {
    zbm_PackedUchar p = {{a, b, c, d}};
    return p;
}

// Same size, order and pixel bytes (padding ignored).
inline bool SameImage(const _zbm_Image* a, const _zbm_Image* b) {
    if (!a || !b || a->width != b->width || a->height != b->height || a->order != b->order) return false;
    for (int32_t y = 0; y < a->height; ++y) {
        if (std::memcmp(ZbiuGetConstPointer(a, 0, y), ZbiuGetConstPointer(b, 0, y),
                        static_cast<size_t>(a->width) * a->bytesPerPixel) != 0) {
            return false;
        }
    }
    return true;
}

// Number of pixels whose first bytesPerPixel bytes equal `value`.
inline int32_t CountPixels(const _zbm_Image* image, zbm_PackedUchar value) {
    int32_t n = 0;
    for (int32_t y = 0; y < image->height; ++y)
        for (int32_t x = 0; x < image->width; ++x)
            n += std::memcmp(ZbiuGetConstPointer(image, x, y), value.v, image->bytesPerPixel) == 0;
    return n;
}

}  // namespace test
}  // namespace lumicor

#endif
