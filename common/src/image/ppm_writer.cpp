// Debug image writers (binary PGM/PPM).
#include "common/src/internal/ppm.h"

#include "common/src/internal/memory.h"

#include <cstdio>

namespace lmk {

PnmStatus WritePnm(const char* path, uint32_t channels, int32_t width, int32_t height, const uint8_t* pixels) {
    if (path == nullptr || pixels == nullptr || (channels != 1 && channels != 3) || width <= 0 || height <= 0)
        return PnmStatus::kInvalidArgument;
    uint32_t bytes;
    if (!CheckedMul(static_cast<uint32_t>(width), static_cast<uint32_t>(height), channels, &bytes))
        return PnmStatus::kInvalidArgument;

    std::FILE* fp = std::fopen(path, "wb");
    if (fp == nullptr) return PnmStatus::kOpenFailed;
    const bool headerOk = std::fprintf(fp, "P%c\n%d %d\n255\n", channels == 1 ? '5' : '6', width, height) > 0;
    const bool dataOk = headerOk && std::fwrite(pixels, 1, bytes, fp) == bytes;
    const bool closeOk = std::fclose(fp) == 0;
    return headerOk && dataOk && closeOk ? PnmStatus::kOk : PnmStatus::kWriteFailed;
}

}  // namespace lmk

int zbiuSaveToPpm(const char* path, const _zbm_Image* image) {
    if (path == nullptr || image == nullptr || image->pData == nullptr || image->width <= 0 || image->height <= 0)
        return ZBIU_ERR_INVALID_ARGUMENT;

    // Source byte of each output channel (R, G, B) within one pixel.
    int32_t pick[3];
    switch (image->order) {
    case ZBM_PIXEL_ORDER_GRAY:
        pick[0] = pick[1] = pick[2] = 0;
        break;
    case ZBM_PIXEL_ORDER_RGB:
    case ZBM_PIXEL_ORDER_BGR:
    case ZBM_PIXEL_ORDER_RGBA:
    case ZBM_PIXEL_ORDER_BGRA:
    case ZBM_PIXEL_ORDER_ARGB:
    case ZBM_PIXEL_ORDER_ABGR: {
        int32_t alpha;
        ZbiuGetRgbOffset(image->order, &pick[0], &pick[1], &pick[2], &alpha);
        break;
    }
    case ZBM_PIXEL_ORDER_YUV:
    case ZBM_PIXEL_ORDER_LAB:
        pick[0] = 0;
        pick[1] = 1;
        pick[2] = 2;
        break;
    default:
        return ZBIU_ERR_INVALID_ARGUMENT;
    }

    const uint32_t width = static_cast<uint32_t>(image->width);
    const uint32_t height = static_cast<uint32_t>(image->height);
    uint32_t bytes;
    if (!lmk::CheckedMul(width, height, 3, &bytes)) return ZBIU_ERR_INVALID_ARGUMENT;
    lmk::UniqueArray<uint8_t> packed = lmk::NewArray<uint8_t>(bytes);
    if (!packed) return ZBIU_ERR_OUT_OF_MEMORY;

    const int32_t bpp = image->bytesPerPixel;
    uint8_t* out = packed.get();
    for (uint32_t y = 0; y < height; ++y) {
        const uint8_t* row = image->pData + static_cast<ptrdiff_t>(y) * image->pitch;
        for (uint32_t x = 0; x < width; ++x) {
            const uint8_t* px = row + static_cast<ptrdiff_t>(x) * bpp;
            *out++ = px[pick[0]];
            *out++ = px[pick[1]];
            *out++ = px[pick[2]];
        }
    }
    return lmk::WritePnm(path, 3, image->width, image->height, packed.get()) == lmk::PnmStatus::kOk ? 0 : 1;
}
