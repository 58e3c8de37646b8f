// Pixel coverage of a triangle, shared by the triangle average and the
// triangle fill so that both see exactly the same pixels.
#ifndef LUMICOR_COMMON_IMAGE_TRIANGLE_H
#define LUMICOR_COMMON_IMAGE_TRIANGLE_H

#include <lumicor/zbm_image.h>

#include <cstdint>

namespace lmk {
namespace image {

// Calls run(y, x0, x1) for every row of the triangle inside a width × height
// image, where x0 .. x1 (inclusive) are the pixels whose integer coordinates
// lie inside the triangle or on an edge. The triangle is convex, so each row
// is one run. A degenerate triangle covers the pixels on its segment.
template <typename Run>
void ForEachTriangleRun(zbm_Pos p0, zbm_Pos p1, zbm_Pos p2, int32_t width, int32_t height, const Run& run) {
    auto lo = [](int32_t a, int32_t b, int32_t c) { return a < b ? (a < c ? a : c) : (b < c ? b : c); };
    auto hi = [](int32_t a, int32_t b, int32_t c) { return a > b ? (a > c ? a : c) : (b > c ? b : c); };
    const int32_t minX = lo(p0.x, p1.x, p2.x) < 0 ? 0 : lo(p0.x, p1.x, p2.x);
    const int32_t minY = lo(p0.y, p1.y, p2.y) < 0 ? 0 : lo(p0.y, p1.y, p2.y);
    const int32_t maxX = hi(p0.x, p1.x, p2.x) >= width ? width - 1 : hi(p0.x, p1.x, p2.x);
    const int32_t maxY = hi(p0.y, p1.y, p2.y) >= height ? height - 1 : hi(p0.y, p1.y, p2.y);
    // Signed side of (x, y) relative to the directed edge a -> b.
    auto side = [](zbm_Pos a, zbm_Pos b, int32_t x, int32_t y) {
        return (static_cast<int64_t>(b.x) - a.x) * (static_cast<int64_t>(y) - a.y) -
               (static_cast<int64_t>(b.y) - a.y) * (static_cast<int64_t>(x) - a.x);
    };
    for (int32_t y = minY; y <= maxY; ++y) {
        int32_t first = -1, last = -1;
        for (int32_t x = minX; x <= maxX; ++x) {
            const int64_t e0 = side(p0, p1, x, y), e1 = side(p1, p2, x, y), e2 = side(p2, p0, x, y);
            if ((e0 >= 0 && e1 >= 0 && e2 >= 0) || (e0 <= 0 && e1 <= 0 && e2 <= 0)) {
                if (first < 0) first = x;
                last = x;
            }
        }
        if (first >= 0) run(y, first, last);
    }
}

}  // namespace image
}  // namespace lmk

#endif
