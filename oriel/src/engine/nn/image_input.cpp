#include "oriel/src/engine/nn/image_input.h"

#include <cmath>

namespace oriel {
namespace nn {

namespace {

// One canvas pixel (zero outside the crop).
inline void Fetch(const ImageView& img, const Crop& crop, const Canvas& cv, int x, int y, float* v) {
    const int ix = x - cv.offX, iy = y - cv.offY;
    if (ix < 0 || iy < 0 || ix >= crop.w || iy >= crop.h) {
        v[0] = v[1] = v[2] = 0.0f;
        return;
    }
    const uint8_t* px = img.p + static_cast<intptr_t>(crop.y + iy) * img.stride + static_cast<intptr_t>(crop.x + ix) * img.bpp;
    v[0] = px[img.r];
    v[1] = px[img.g];
    v[2] = px[img.b];
}

}  // namespace

Canvas SquareCanvas(const Crop& crop, bool centred) {
    Canvas c;
    const int side = crop.w > crop.h ? crop.w : crop.h;
    c.w = c.h = side;
    if (centred) {
        // The padding is split with the larger half after the crop,
        // rounding the leading half down.
        const int diff = crop.w > crop.h ? crop.w - crop.h : crop.h - crop.w;
        const int after = static_cast<int>(std::floor(diff * 0.5 + 0.5));
        const int before = diff - after;
        if (crop.w > crop.h)
            c.offY = before;
        else
            c.offX = before;
    }
    return c;
}

void SampleCanvas(const ImageView& img, const Crop& crop, const Canvas& cv, int outW, int outH, const float mean[3],
                  float div, float* out) {
    const double sy = static_cast<double>(cv.h) / outH;
    const double sx = static_cast<double>(cv.w) / outW;
    for (int y = 0; y < outH; ++y) {
        const double fy = y * sy;
        const int y0 = static_cast<int>(std::floor(fy));
        const int y1 = static_cast<int>(std::ceil(fy)) < cv.h - 1 ? static_cast<int>(std::ceil(fy)) : cv.h - 1;
        const float dy = static_cast<float>(fy - y0);
        for (int x = 0; x < outW; ++x) {
            const double fx = x * sx;
            const int x0 = static_cast<int>(std::floor(fx));
            const int x1 = static_cast<int>(std::ceil(fx)) < cv.w - 1 ? static_cast<int>(std::ceil(fx)) : cv.w - 1;
            const float dx = static_cast<float>(fx - x0);
            float tl[3], tr[3], bl[3], br[3];
            Fetch(img, crop, cv, x0, y0, tl);
            Fetch(img, crop, cv, x1, y0, tr);
            Fetch(img, crop, cv, x0, y1, bl);
            Fetch(img, crop, cv, x1, y1, br);
            float* o = out + (static_cast<size_t>(y) * outW + x) * 3;
            for (int c = 0; c < 3; ++c) {
                const float top = tl[c] + (tr[c] - tl[c]) * dx;
                const float bottom = bl[c] + (br[c] - bl[c]) * dx;
                o[c] = (top + (bottom - top) * dy - mean[c]) / div;
            }
        }
    }
}

}  // namespace nn
}  // namespace oriel
