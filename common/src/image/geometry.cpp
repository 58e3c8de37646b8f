// Lossless geometry: copies, mirrors, quarter and half turns, and the EXIF
// orientation fix-up built from them.
#include <lumicor/zbm_image.h>

#include <cstring>

#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

// Copies one pixel of `bpp` bytes; the compiler unrolls the fixed sizes.
template <int32_t Bpp>
inline void CopyPixel(uint8_t* d, const uint8_t* s) {
    for (int32_t c = 0; c < Bpp; ++c) d[c] = s[c];
}

// dst(x, y) = src(mapX(x, y), mapY(x, y)) walked along destination rows,
// where the source position moves by (stepX, stepY) pixels per destination
// column. Covers every mirror and turn below.
template <int32_t Bpp>
void Remap(const _zbm_Image* src, _zbm_Image* dst, int32_t startX, int32_t startY, int32_t colDx, int32_t colDy,
           int32_t rowDx, int32_t rowDy) {
    const ptrdiff_t colStep = static_cast<ptrdiff_t>(colDx) * Bpp + static_cast<ptrdiff_t>(colDy) * src->pitch;
    for (int32_t y = 0; y < dst->height; ++y) {
        const int32_t sx = startX + rowDx * y;
        const int32_t sy = startY + rowDy * y;
        const uint8_t* s = Row(src, sy) + static_cast<ptrdiff_t>(sx) * Bpp;
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < dst->width; ++x, d += Bpp, s += colStep) CopyPixel<Bpp>(d, s);
    }
}

void RemapAny(const _zbm_Image* src, _zbm_Image* dst, int32_t startX, int32_t startY, int32_t colDx, int32_t colDy,
              int32_t rowDx, int32_t rowDy) {
    switch (src->bytesPerPixel) {
        case 1: Remap<1>(src, dst, startX, startY, colDx, colDy, rowDx, rowDy); break;
        case 3: Remap<3>(src, dst, startX, startY, colDx, colDy, rowDx, rowDy); break;
        default: Remap<4>(src, dst, startX, startY, colDx, colDy, rowDx, rowDy); break;
    }
}

bool SameSizePair(const _zbm_Image* src, const _zbm_Image* dst) { return IsValidPair(src, dst) && SameSize(src, dst); }

bool TransposedPair(const _zbm_Image* src, const _zbm_Image* dst) {
    return IsValidPair(src, dst) && dst->width == src->height && dst->height == src->width;
}

}  // namespace

int ZbiuCopy(const _zbm_Image* src, _zbm_Image* dst) {
    if (!SameSizePair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    for (int32_t y = 0; y < src->height; ++y) std::memcpy(Row(dst, y), Row(src, y), RowBytes(src));
    return ZBIU_OK;
}

int ZbiuFlop(const _zbm_Image* src, _zbm_Image* dst) {
    if (!SameSizePair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    RemapAny(src, dst, src->width - 1, 0, -1, 0, 0, 1);
    return ZBIU_OK;
}

int ZbiuFlip(const _zbm_Image* src, _zbm_Image* dst) {
    if (!SameSizePair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    for (int32_t y = 0; y < src->height; ++y) {
        std::memcpy(Row(dst, src->height - 1 - y), Row(src, y), RowBytes(src));
    }
    return ZBIU_OK;
}

int ZbiuRotate180(const _zbm_Image* src, _zbm_Image* dst) {
    if (!SameSizePair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    RemapAny(src, dst, src->width - 1, src->height - 1, -1, 0, 0, -1);
    return ZBIU_OK;
}

// Source (x, y) goes to (y, W-1-x): destination (u, v) reads source
// (W-1-v, u), so along a destination row the source walks down a column.
int ZbiuRotateLeft(const _zbm_Image* src, _zbm_Image* dst) {
    if (!TransposedPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    RemapAny(src, dst, src->width - 1, 0, 0, 1, -1, 0);
    return ZBIU_OK;
}

// Source (x, y) goes to (H-1-y, x): destination (u, v) reads source (v, H-1-u).
int ZbiuRotateRight(const _zbm_Image* src, _zbm_Image* dst) {
    if (!TransposedPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    RemapAny(src, dst, 0, src->height - 1, 0, -1, 1, 0);
    return ZBIU_OK;
}

int ZbiuAdjustToExifOrientation(_zbm_Image*& image, int orientation) {
    if (!IsValidImage(image)) return ZBIU_ERR_INVALID_ARGUMENT;
    if (orientation < 1 || orientation > 8) return ZBIU_ERR_UNSUPPORTED_VALUE;

    enum Step { kNone, kFlop, kRot180, kFlip, kLeft, kRight };
    static const Step kSteps[9][2] = {
        {kNone, kNone},  {kNone, kNone}, {kFlop, kNone},  {kRot180, kNone}, {kFlip, kNone},
        {kLeft, kFlip},  {kRight, kNone}, {kRight, kFlip}, {kLeft, kNone},
    };
    for (Step step : kSteps[orientation]) {
        if (step == kNone) break;
        const bool turn = step == kLeft || step == kRight;
        _zbm_Image* next = ZbiuCreate(turn ? image->height : image->width, turn ? image->width : image->height,
                                      image->order);
        if (!next) return ZBIU_ERR_OUT_OF_MEMORY;
        int status;
        switch (step) {
            case kFlop: status = ZbiuFlop(image, next); break;
            case kRot180: status = ZbiuRotate180(image, next); break;
            case kFlip: status = ZbiuFlip(image, next); break;
            case kLeft: status = ZbiuRotateLeft(image, next); break;
            default: status = ZbiuRotateRight(image, next); break;
        }
        if (status != ZBIU_OK) {
            ZbiuDispose(&next);
            return status;
        }
        ZbiuDispose(&image);
        image = next;
    }
    return ZBIU_OK;
}
