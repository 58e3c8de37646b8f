// Drawing into images: lines (also used for masks, so the pixel rule is
// fixed), debug shapes and flood fill. Everything is clipped pixel by pixel.
#include <lumicor/zbm_image.h>

#include <cmath>

#include "common/src/image/image_util.h"
#include "common/src/image/triangle.h"

using namespace lmk::image;

namespace {

// Beyond this the error terms of a line could overflow 64 bits.
constexpr int64_t kMaxLineCoordinate = int64_t(1) << 29;
// Beyond this the ellipse test could overflow 64 bits.
constexpr int32_t kMaxRadius = 30000;

// Half width of row dy of an ellipse with radii rx, ry: the largest dx with
// dx^2 ry^2 + dy^2 rx^2 <= rx^2 ry^2 + rx ry min(rx, ry), or -1 when the row
// is outside. For a circle the bound is r^2 + r, which gives round shapes
// without the single-pixel spikes of the exact r^2.
int64_t HalfWidth(int64_t dy, int64_t rx, int64_t ry) {
    if (dy < -ry || dy > ry) return -1;
    if (ry == 0) return rx;
    const int64_t bound = rx * rx * ry * ry + rx * ry * (rx < ry ? rx : ry) - dy * dy * rx * rx;
    const int64_t ry2 = ry * ry;
    int64_t dx = static_cast<int64_t>(std::sqrt(static_cast<double>(bound) / static_cast<double>(ry2)));
    while (dx > 0 && dx * dx * ry2 > bound) --dx;
    while ((dx + 1) * (dx + 1) * ry2 <= bound) ++dx;
    return dx > rx ? rx : dx;
}

// Ellipse outline (pixels of the shape with a 4-neighbour outside it) in
// color, inside in *fill when fill is given.
int DrawEllipseShape(_zbm_Image* image, zbm_Pos c, int32_t rx, int32_t ry, const zbm_PackedUchar& color,
                     const zbm_PackedUchar* fill) {
    if (!IsValidImage(image) || rx < 0 || ry < 0 || rx > kMaxRadius || ry > kMaxRadius) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    for (int64_t dy = -ry; dy <= ry; ++dy) {
        const int64_t y = c.y + dy;
        if (y < 0 || y >= image->height) continue;
        const int64_t hw = HalfWidth(dy, rx, ry);
        const int64_t up = HalfWidth(dy - 1, rx, ry), down = HalfWidth(dy + 1, rx, ry);
        int64_t inner = (up < down ? up : down);
        if (inner > hw - 1) inner = hw - 1;
        if (inner < 0) {
            SpanClipped(image, y, c.x - hw, c.x + hw, color);
            continue;
        }
        SpanClipped(image, y, c.x - hw, c.x - inner - 1, color);
        SpanClipped(image, y, c.x + inner + 1, c.x + hw, color);
        if (fill) SpanClipped(image, y, c.x - inner, c.x + inner, *fill);
    }
    return ZBIU_OK;
}

void FillBox(_zbm_Image* image, int64_t x0, int64_t y0, int64_t x1, int64_t y1, const zbm_PackedUchar& v) {
    if (y0 < 0) y0 = 0;
    if (y1 >= image->height) y1 = image->height - 1;
    for (int64_t y = y0; y <= y1; ++y) SpanClipped(image, y, x0, x1, v);
}

}  // namespace

// Bresenham with integer error terms: for an x-major line e starts at -dx and
// each of the dx + 1 pixels is set, then e += 2 dy, x steps, and when e >= 0
// y steps too and e -= 2 dx (y-major: the same with x and y exchanged). After
// k pixels the minor axis has stepped floor((2 dminor k + dmajor) / (2 dmajor))
// times, which lets the walk start where the major axis enters the image and
// stop where it leaves it without changing any pixel.
int ZbiuDrawLine(_zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_PackedUchar value) {
    if (!IsValidImage(image)) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t coords[4] = {p0.x, p0.y, p1.x, p1.y};
    for (int32_t v : coords) {
        if (v < -kMaxLineCoordinate || v > kMaxLineCoordinate) return ZBIU_ERR_INVALID_ARGUMENT;
    }
    const int64_t dx = p1.x > p0.x ? int64_t(p1.x) - p0.x : int64_t(p0.x) - p1.x;
    const int64_t dy = p1.y > p0.y ? int64_t(p1.y) - p0.y : int64_t(p0.y) - p1.y;
    const bool xMajor = dx >= dy;
    const int64_t dMajor = xMajor ? dx : dy, dMinor = xMajor ? dy : dx;
    const int64_t stepMajor = (xMajor ? p1.x > p0.x : p1.y > p0.y) ? 1 : -1;
    const int64_t stepMinor = (xMajor ? p1.y > p0.y : p1.x > p0.x) ? 1 : -1;
    const int64_t startMajor = xMajor ? p0.x : p0.y, startMinor = xMajor ? p0.y : p0.x;
    const int64_t limit = xMajor ? image->width : image->height;

    // Pixels k = kFirst .. kLast have their major coordinate inside the image.
    int64_t kFirst = 0, kLast = dMajor;
    if (stepMajor > 0) {
        if (startMajor < 0) kFirst = -startMajor;
        if (limit - 1 - startMajor < kLast) kLast = limit - 1 - startMajor;
    } else {
        if (startMajor > limit - 1) kFirst = startMajor - (limit - 1);
        if (startMajor < kLast) kLast = startMajor;
    }
    if (kFirst > kLast) return ZBIU_OK;

    const int64_t minorSteps = dMajor == 0 ? 0 : (2 * dMinor * kFirst + dMajor) / (2 * dMajor);
    int64_t e = -dMajor + 2 * dMinor * kFirst - 2 * dMajor * minorSteps;
    int64_t major = startMajor + stepMajor * kFirst, minor = startMinor + stepMinor * minorSteps;
    for (int64_t k = kFirst; k <= kLast; ++k) {
        if (xMajor) {
            PlotClipped(image, major, minor, value);
        } else {
            PlotClipped(image, minor, major, value);
        }
        e += 2 * dMinor;
        major += stepMajor;
        if (e >= 0) {
            minor += stepMinor;
            e -= 2 * dMajor;
        }
    }
    return ZBIU_OK;
}

int ZbiuDrawDot(_zbm_Image* image, zbm_Pos center, int32_t radius, zbm_PackedUchar value) {
    return DrawEllipseShape(image, center, radius, radius, value, &value);
}

int ZbiuDrawRectangle(_zbm_Image* image, const zbm_Rect& rect, zbm_PackedUchar color, int32_t lineWidth,
                      const zbm_PackedUchar* fill) {
    if (!IsValidImage(image) || lineWidth < 0) return ZBIU_ERR_INVALID_ARGUMENT;
    if (rect.width <= 0 || rect.height <= 0) return ZBIU_OK;
    const int64_t x0 = rect.x, y0 = rect.y;
    const int64_t x1 = x0 + rect.width - 1, y1 = y0 + rect.height - 1;
    const int64_t lw = lineWidth;
    if (2 * lw >= rect.width || 2 * lw >= rect.height) {
        // The outline (lineWidth > 0 here) covers the whole rectangle.
        FillBox(image, x0, y0, x1, y1, color);
        return ZBIU_OK;
    }
    if (lw > 0) {
        FillBox(image, x0, y0, x1, y0 + lw - 1, color);
        FillBox(image, x0, y1 - lw + 1, x1, y1, color);
        FillBox(image, x0, y0 + lw, x0 + lw - 1, y1 - lw, color);
        FillBox(image, x1 - lw + 1, y0 + lw, x1, y1 - lw, color);
    }
    if (fill) FillBox(image, x0 + lw, y0 + lw, x1 - lw, y1 - lw, *fill);
    return ZBIU_OK;
}

int ZbiuDrawCircle(_zbm_Image* image, zbm_Pos center, int32_t radius, zbm_PackedUchar color,
                   const zbm_PackedUchar* fill) {
    return DrawEllipseShape(image, center, radius, radius, color, fill);
}

int ZbiuDrawEllipse(_zbm_Image* image, zbm_Pos center, int32_t rx, int32_t ry, zbm_PackedUchar color,
                    const zbm_PackedUchar* fill) {
    return DrawEllipseShape(image, center, rx, ry, color, fill);
}

int ZbiuDrawTriangle(_zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_Pos p2, zbm_PackedUchar color,
                     const zbm_PackedUchar* fill) {
    if (!IsValidImage(image)) return ZBIU_ERR_INVALID_ARGUMENT;
    if (fill) {
        ForEachTriangleRun(p0, p1, p2, image->width, image->height,
                           [&](int32_t y, int32_t x0, int32_t x1) { SpanClipped(image, y, x0, x1, *fill); });
    }
    int status = ZbiuDrawLine(image, p0, p1, color);
    if (status == ZBIU_OK) status = ZbiuDrawLine(image, p1, p2, color);
    if (status == ZBIU_OK) status = ZbiuDrawLine(image, p2, p0, color);
    return status;
}

// Scanline flood fill: each pending point seeds one run of matching pixels
// in its row; after the run is painted, one point per matching run in the
// rows above and below is queued.
int ZbiuFillRegion(_zbm_Image* image, zbm_Pos seed, zbm_PackedUchar value) {
    if (!IsValidImage(image) || seed.x < 0 || seed.y < 0 || seed.x >= image->width || seed.y >= image->height) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    const int32_t bpp = image->bytesPerPixel;
    const zbm_PackedUchar target = ReadPixel(ZbiuGetConstPointer(image, seed.x, seed.y), bpp);
    if (SamePixel(ZbiuGetConstPointer(image, seed.x, seed.y), bpp, value)) return ZBIU_OK;
    auto matches = [&](int32_t x, int32_t y) { return SamePixel(ZbiuGetConstPointer(image, x, y), bpp, target); };

    zbmlist<zbm_Pos> pending;
    if (!pending.PushBack(seed)) return ZBIU_ERR_OUT_OF_MEMORY;
    while (!pending.Empty()) {
        const zbm_Pos p = pending.Back();
        pending.PopBack();
        if (!matches(p.x, p.y)) continue;
        int32_t left = p.x, right = p.x;
        while (left > 0 && matches(left - 1, p.y)) --left;
        while (right < image->width - 1 && matches(right + 1, p.y)) ++right;
        SpanClipped(image, p.y, left, right, value);
        for (int32_t ny = p.y - 1; ny <= p.y + 1; ny += 2) {
            if (ny < 0 || ny >= image->height) continue;
            for (int32_t x = left; x <= right;) {
                if (!matches(x, ny)) {
                    ++x;
                    continue;
                }
                const zbm_Pos next = {x, ny};
                if (!pending.PushBack(next)) return ZBIU_ERR_OUT_OF_MEMORY;
                while (x <= right && matches(x, ny)) ++x;
            }
        }
    }
    return ZBIU_OK;
}
