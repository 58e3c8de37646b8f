// The library's one writer family for debug images in the binary PNM formats:
// P5 (gray) and P6 (RGB), maxval 255. Engines that dump intermediate planes
// use WritePnm with their own packed rows; zbiuSaveToPpm writes any _zbm_Image
// with a colour meaning as P6.
#ifndef LUMICOR_COMMON_INTERNAL_PPM_H
#define LUMICOR_COMMON_INTERNAL_PPM_H

#include <lumicor/zbm_image.h>

#include <cstdint>

namespace lmk {

enum class PnmStatus {
    kOk = 0,
    kInvalidArgument, // null pointer, empty size or a size that overflows 32 bits
    kOpenFailed,      // nothing was written
    kWriteFailed      // the file exists but is incomplete
};

// Writes "P5" (channels 1) or "P6" (channels 3), "\n<width> <height>\n255\n"
// and then width * height * channels bytes of `pixels` (rows packed, top
// first) with one write call. The file is opened in mode "wb" and closed on
// every path.
PnmStatus WritePnm(const char* path, uint32_t channels, int32_t width, int32_t height, const uint8_t* pixels);

}  // namespace lmk

// Writes `image` as a P6 file: GRAY repeats its byte three times; the RGB
// orders with and without alpha are written R, G, B (alpha dropped); YUV and
// LAB write their three stored bytes as they are.
// Returns 0; 3 for a null argument, an empty image or any other pixel order
// (before anything is opened); 4 when the packed copy cannot be allocated;
// 1 when the file cannot be opened or was not written completely.
int zbiuSaveToPpm(const char* path, const _zbm_Image* image);

#endif
