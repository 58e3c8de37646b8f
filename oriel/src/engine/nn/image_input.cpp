#include "oriel/src/engine/nn/image_input.h"

#include <cmath>

namespace oriel {
namespace nn {

namespace {

// Columns handled per pass (their sampling positions live on the stack).
const int kColumnChunk = 256;

// Start of canvas row y in the photo, or null outside the crop.
inline const uint8_t* CanvasRow(const ImageView& img, const Crop& crop, const Canvas& cv, int y) {
    const int iy = y - cv.offY;
    if (iy < 0 || iy >= crop.h) return nullptr;
    return img.p + static_cast<intptr_t>(crop.y + iy) * img.stride;
}

// Byte offset of canvas column x in a photo row, or -1 outside the crop.
inline intptr_t CanvasColumn(const ImageView& img, const Crop& crop, const Canvas& cv, int x) {
    const int ix = x - cv.offX;
    if (ix < 0 || ix >= crop.w) return -1;
    return static_cast<intptr_t>(crop.x + ix) * img.bpp;
}

// One canvas pixel (zero outside the crop).
inline void Fetch(const ImageView& img, const uint8_t* row, intptr_t col, float* v) {
    if (!row || col < 0) {
        v[0] = v[1] = v[2] = 0.0f;
        return;
    }
    const uint8_t* px = row + col;
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
    // The horizontal sampling positions are the same on every row: worked
    // out once per chunk of columns.
    intptr_t col0[kColumnChunk], col1[kColumnChunk];
    float dxs[kColumnChunk];
    for (int cx = 0; cx < outW; cx += kColumnChunk) {
        const int n = outW - cx < kColumnChunk ? outW - cx : kColumnChunk;
        for (int i = 0; i < n; ++i) {
            const double fx = (cx + i) * sx;
            const int x0 = static_cast<int>(std::floor(fx));
            const int x1 = static_cast<int>(std::ceil(fx)) < cv.w - 1 ? static_cast<int>(std::ceil(fx)) : cv.w - 1;
            col0[i] = CanvasColumn(img, crop, cv, x0);
            col1[i] = CanvasColumn(img, crop, cv, x1);
            dxs[i] = static_cast<float>(fx - x0);
        }
        for (int y = 0; y < outH; ++y) {
            const double fy = y * sy;
            const int y0 = static_cast<int>(std::floor(fy));
            const int y1 = static_cast<int>(std::ceil(fy)) < cv.h - 1 ? static_cast<int>(std::ceil(fy)) : cv.h - 1;
            const float dy = static_cast<float>(fy - y0);
            const uint8_t* row0 = CanvasRow(img, crop, cv, y0);
            const uint8_t* row1 = CanvasRow(img, crop, cv, y1);
            float* o = out + (static_cast<size_t>(y) * outW + cx) * 3;
            for (int i = 0; i < n; ++i, o += 3) {
                const float dx = dxs[i];
                float tl[3], tr[3], bl[3], br[3];
                Fetch(img, row0, col0[i], tl);
                Fetch(img, row0, col1[i], tr);
                Fetch(img, row1, col0[i], bl);
                Fetch(img, row1, col1[i], br);
                for (int c = 0; c < 3; ++c) {
                    const float top = tl[c] + (tr[c] - tl[c]) * dx;
                    const float bottom = bl[c] + (br[c] - bl[c]) * dx;
                    o[c] = (top + (bottom - top) * dy - mean[c]) / div;
                }
            }
        }
    }
}

}  // namespace nn
}  // namespace oriel
