#include "oriel/src/orielplus/prepared_image.h"

namespace oriel {

namespace {
const uint32_t kMaxPixels = 16000000u;
}

bool PreparedImage::Prepare(const uint8_t* pixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                            int32_t stride) {
    Reset();
    int bpp, r, g, b;
    switch (mode) {
        case ORIEL_COLOR_GRAY: bpp = 1; r = g = b = 0; break;
        case ORIEL_COLOR_BGR: bpp = 3; r = 2; g = 1; b = 0; break;
        case ORIEL_COLOR_RGB: bpp = 3; r = 0; g = 1; b = 2; break;
        case ORIEL_COLOR_BGRA: bpp = 4; r = 2; g = 1; b = 0; break;
        case ORIEL_COLOR_RGBA: bpp = 4; r = 0; g = 1; b = 2; break;
        default: return false;
    }
    uint32_t pixelsCount, bytes, rowBytes;
    if (!pixels || width == 0 || height == 0 || !lmk::CheckedMul(width, height, &pixelsCount) ||
        pixelsCount > kMaxPixels || !lmk::CheckedMul(pixelsCount, 3u, &bytes) ||
        !lmk::CheckedMul(width, static_cast<uint32_t>(bpp), &rowBytes))
        return false;
    const int64_t absStride = stride < 0 ? -static_cast<int64_t>(stride) : stride;
    if (absStride < rowBytes) return false;
    rgb_ = lmk::NewArray<uint8_t>(bytes);
    if (!rgb_) return false;
    uint8_t* d = rgb_.get();
    for (uint32_t y = 0; y < height; ++y) {
        const uint8_t* s = pixels + static_cast<intptr_t>(y) * stride;
        for (uint32_t x = 0; x < width; ++x, s += bpp, d += 3) {
            d[0] = s[r];
            d[1] = s[g];
            d[2] = s[b];
        }
    }
    src_ = pixels;
    width_ = width;
    height_ = height;
    mode_ = mode;
    stride_ = stride;
    return true;
}

void PreparedImage::Reset() {
    rgb_.reset();
    src_ = nullptr;
    width_ = height_ = 0;
    stride_ = 0;
}

bool PreparedImage::Matches(const uint8_t* pixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                            int32_t stride) const {
    return Valid() && pixels == src_ && width == width_ && height == height_ && mode == mode_ && stride == stride_;
}

nn::ImageView PreparedImage::View() const {
    nn::ImageView v;
    v.p = rgb_.get();
    v.w = static_cast<int>(width_);
    v.h = static_cast<int>(height_);
    v.stride = static_cast<int>(width_ * 3);
    v.bpp = 3;
    v.r = 0;
    v.g = 1;
    v.b = 2;
    return v;
}

}  // namespace oriel
