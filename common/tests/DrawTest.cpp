#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <random>
#include <set>
#include <utility>
#include <vector>

#include "testkit/fault.h"
#include "testkit/images.h"

namespace {

using lumicor::test::CountPixels;
using lumicor::test::Pixel;
using lumicor::test::SameImage;
typedef std::vector<std::pair<int, int>> Points;

Points SetPixels(const _zbm_Image* image) {
    Points out;
    for (int32_t y = 0; y < image->height; ++y)
        for (int32_t x = 0; x < image->width; ++x)
            if (ZbiuGetPixel(image, x, y).v[0] | ZbiuGetPixel(image, x, y).v[1] | ZbiuGetPixel(image, x, y).v[2])
                out.emplace_back(x, y);
    return out;
}

Points Line(zbm_Pos a, zbm_Pos b) {
    ZbmImagePtr image(ZbiuCreate(8, 8, ZBM_PIXEL_ORDER_GRAY));
    EXPECT_EQ(ZbiuDrawLine(image.get(), a, b, Pixel(1)), ZBIU_OK);
    return SetPixels(image.get());
}

// Pixel lists worked out by hand from the error-term rule (listed row by row).
TEST(DrawTest, BresenhamPixels) {
    const struct {
        zbm_Pos a, b;
        Points pixels;
    } cases[] = {
        {{0, 0}, {2, 1}, {{0, 0}, {1, 1}, {2, 1}}},
        {{0, 0}, {3, 1}, {{0, 0}, {1, 0}, {2, 1}, {3, 1}}},
        {{3, 1}, {0, 0}, {{1, 0}, {0, 0}, {3, 1}, {2, 1}}},  // reversed: steps -1, same e rule
        {{0, 0}, {4, 2}, {{0, 0}, {1, 1}, {2, 1}, {3, 2}, {4, 2}}},
        {{0, 0}, {1, 3}, {{0, 0}, {0, 1}, {1, 2}, {1, 3}}},
        {{5, 5}, {5, 5}, {{5, 5}}},
        {{2, 6}, {5, 3}, {{5, 3}, {4, 4}, {3, 5}, {2, 6}}},
        {{-2, 0}, {2, 0}, {{0, 0}, {1, 0}, {2, 0}}},  // clipped pixel by pixel
    };
    for (const auto& c : cases) {
        Points expected = c.pixels;
        std::sort(expected.begin(), expected.end(), [](const std::pair<int, int>& p, const std::pair<int, int>& q) {
            return p.second != q.second ? p.second < q.second : p.first < q.first;
        });
        EXPECT_EQ(Line(c.a, c.b), expected) << c.a.x << "," << c.a.y << " -> " << c.b.x << "," << c.b.y;
    }
}

// The walk may start where the line enters the image; it must set exactly
// the pixels of the plain walk from p0.
TEST(DrawTest, ClippedLinesMatchThePlainWalk) {
    std::mt19937 rng(7);
    std::uniform_int_distribution<int32_t> coord(-300, 330), far(-100000, 100000);
    for (int i = 0; i < 2000; ++i) {
        const bool wide = i % 4 == 0;
        const zbm_Pos a = {wide ? far(rng) : coord(rng), coord(rng)}, b = {coord(rng), wide ? far(rng) : coord(rng)};
        ZbmImagePtr got(ZbiuCreate(31, 17, ZBM_PIXEL_ORDER_GRAY)), want(ZbiuCreate(31, 17, ZBM_PIXEL_ORDER_GRAY));
        ASSERT_EQ(ZbiuDrawLine(got.get(), a, b, Pixel(9)), ZBIU_OK);
        const long long dx = std::llabs(static_cast<long long>(b.x) - a.x), dy = std::llabs(static_cast<long long>(b.y) - a.y);
        const int sx = b.x > a.x ? 1 : -1, sy = b.y > a.y ? 1 : -1;
        long long x = a.x, y = a.y;
        if (dx >= dy) {
            long long e = -dx;
            for (long long k = 0; k <= dx; ++k) {
                if (x >= 0 && x < 31 && y >= 0 && y < 17) ZbiuSetPixel(want.get(), int32_t(x), int32_t(y), Pixel(9));
                e += 2 * dy, x += sx;
                if (e >= 0) y += sy, e -= 2 * dx;
            }
        } else {
            long long e = -dy;
            for (long long k = 0; k <= dy; ++k) {
                if (x >= 0 && x < 31 && y >= 0 && y < 17) ZbiuSetPixel(want.get(), int32_t(x), int32_t(y), Pixel(9));
                e += 2 * dx, y += sy;
                if (e >= 0) x += sx, e -= 2 * dy;
            }
        }
        ASSERT_TRUE(SameImage(got.get(), want.get())) << a.x << "," << a.y << " -> " << b.x << "," << b.y;
    }
    ZbmImagePtr image(ZbiuCreate(4, 4, ZBM_PIXEL_ORDER_GRAY));
    EXPECT_EQ(ZbiuDrawLine(image.get(), zbm_Pos{-2147483647, 0}, zbm_Pos{2, 2}, Pixel(1)), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(DrawTest, RectangleOutlineAndFill) {
    ZbmImagePtr image(ZbiuCreate(10, 8, ZBM_PIXEL_ORDER_RGB));
    ASSERT_EQ(ZbiuDrawRectangle(image.get(), zbm_Rect{1, 1, 6, 5}, Pixel(255, 0, 0)), ZBIU_OK);
    EXPECT_EQ(CountPixels(image.get(), Pixel(255, 0, 0)), 2 * 6 + 2 * 3);
    EXPECT_EQ(ZbiuGetPixel(image.get(), 6, 5).v[0], 255);  // last column and row of the rectangle
    EXPECT_EQ(ZbiuGetPixel(image.get(), 7, 5).v[0], 0);
    EXPECT_EQ(ZbiuGetPixel(image.get(), 3, 3).v[0], 0);

    const zbm_PackedUchar fill = Pixel(0, 0, 9);
    ZbiuClear(image.get());
    ASSERT_EQ(ZbiuDrawRectangle(image.get(), zbm_Rect{-2, -2, 8, 9}, Pixel(1, 1, 1), 2, &fill), ZBIU_OK);
    EXPECT_EQ(CountPixels(image.get(), fill), 4 * 5);  // inside the outline: columns 0..3, rows 0..4
    EXPECT_EQ(ZbiuGetPixel(image.get(), 4, 3).v[0], 1);  // right band: columns 4..5
    EXPECT_EQ(ZbiuGetPixel(image.get(), 6, 3).v[0], 0);
    EXPECT_EQ(ZbiuDrawRectangle(image.get(), zbm_Rect{0, 0, 2, 2}, Pixel(1), -1), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(DrawTest, DiscsCirclesAndTrianglesCoverTheDocumentedPixels) {
    ZbmImagePtr dot(ZbiuCreate(21, 21, ZBM_PIXEL_ORDER_GRAY)), ring(ZbiuCreate(21, 21, ZBM_PIXEL_ORDER_GRAY));
    const zbm_PackedUchar inside = Pixel(50);
    for (int32_t r : {0, 1, 4, 9}) {
        ZbiuClear(dot.get());
        ZbiuClear(ring.get());
        ASSERT_EQ(ZbiuDrawDot(dot.get(), zbm_Pos{10, 10}, r, Pixel(200)), ZBIU_OK);
        ASSERT_EQ(ZbiuDrawCircle(ring.get(), zbm_Pos{10, 10}, r, Pixel(200), &inside), ZBIU_OK);
        for (int32_t y = 0; y < 21; ++y)
            for (int32_t x = 0; x < 21; ++x) {
                const int dx = x - 10, dy = y - 10;
                const bool in = dx * dx + dy * dy <= r * r + r;
                ASSERT_EQ(ZbiuGetPixel(dot.get(), x, y).v[0], in ? 200 : 0) << r << ": " << x << "," << y;
                ASSERT_EQ(ZbiuGetPixel(ring.get(), x, y).v[0] != 0, in);
            }
        // The outline is the part of the disc that touches the outside.
        EXPECT_EQ(ZbiuGetPixel(ring.get(), 10, 10).v[0], r > 0 ? 50 : 200);
        EXPECT_EQ(ZbiuGetPixel(ring.get(), 10 + r, 10).v[0], 200);
    }
    EXPECT_EQ(ZbiuDrawEllipse(ring.get(), zbm_Pos{0, 0}, -1, 2, Pixel(1)), ZBIU_ERR_INVALID_ARGUMENT);

    // The triangle fill and the triangle average use the pixels whose
    // integer coordinates lie inside or on an edge; the outline follows.
    ZbmImagePtr tri(ZbiuCreate(20, 20, ZBM_PIXEL_ORDER_GRAY));
    ZbmImagePtr noise = lumicor::test::MakeNoiseImage(20, 20, ZBM_PIXEL_ORDER_GRAY, 5);
    const zbm_Pos p0 = {2, 1}, p1 = {17, 6}, p2 = {5, 18};
    ASSERT_EQ(ZbiuDrawTriangle(tri.get(), p0, p1, p2, Pixel(255), &inside), ZBIU_OK);
    auto side = [](zbm_Pos a, zbm_Pos b, int x, int y) { return (b.x - a.x) * (y - a.y) - (b.y - a.y) * (x - a.x); };
    double sum = 0;
    int covered = 0;
    for (int32_t y = 0; y < 20; ++y)
        for (int32_t x = 0; x < 20; ++x) {
            const bool in = side(p0, p1, x, y) >= 0 && side(p1, p2, x, y) >= 0 && side(p2, p0, x, y) >= 0;
            const uint8_t v = ZbiuGetPixel(tri.get(), x, y).v[0];
            if (in) sum += ZbiuGetPixel(noise.get(), x, y).v[0], ++covered;
            ASSERT_TRUE(in ? v != 0 : v != 50) << x << "," << y;
        }
    zbm_PackedFloat avg;
    ASSERT_EQ(ZbiuCalcAvarageInTriangle(noise.get(), p0, p1, p2, &avg), ZBIU_OK);
    EXPECT_FLOAT_EQ(avg.v[0], static_cast<float>(sum / covered));
    EXPECT_EQ(ZbiuGetPixel(tri.get(), 9, 9).v[0], 50);
    EXPECT_EQ(ZbiuGetPixel(tri.get(), 17, 6).v[0], 255);
    ASSERT_EQ(ZbiuCalcAvarageInTriangle(noise.get(), zbm_Pos{-9, -9}, zbm_Pos{-5, -9}, zbm_Pos{-5, -2}, &avg), ZBIU_OK);
    EXPECT_EQ(avg.v[0], 0.0f);
}

TEST(DrawTest, StringsFitTheirCells) {
    // The annotated debug image writes two lines 10 pixels apart from (0, 0).
    ZbmImagePtr image(ZbiuCreate(80, 30, ZBM_PIXEL_ORDER_RGB));
    ASSERT_EQ(ZbiuDrawString(image.get(), "face num: 3", zbm_Pos{0, 0}, ZBM_ALIGNMENT_TOP_LEFT, Pixel(255, 0, 0)), ZBIU_OK);
    ASSERT_EQ(ZbiuDrawString(image.get(), "area num: 2", zbm_Pos{0, 10}, ZBM_ALIGNMENT_TOP_LEFT, Pixel(0, 0, 255)), ZBIU_OK);
    for (const auto& p : SetPixels(image.get())) {
        ASSERT_LT(p.first, 11 * ZBIU_FONT_ADVANCE - 1);
        ASSERT_NE(p.second, 9);
        ASSERT_LT(p.second, 19);
        ASSERT_EQ(ZbiuGetPixel(image.get(), p.first, p.second).v[0] == 255, p.second < 9);
    }

    // Every printable character has its own glyph within the 5 x 9 box.
    std::set<std::vector<uint8_t>> shapes;
    for (char c = '!'; c <= '~'; ++c) {
        ZbmImagePtr cell(ZbiuCreate(7, 11, ZBM_PIXEL_ORDER_GRAY));
        const char text[2] = {c, 0};
        ZbiuDrawString(cell.get(), text, zbm_Pos{1, 1}, ZBM_ALIGNMENT_TOP_LEFT, Pixel(1));
        std::vector<uint8_t> bytes(cell->pData, cell->pData + 77);
        for (int32_t y = 0; y < 11; ++y)
            for (int32_t x = 0; x < 7; ++x)
                if (x == 0 || x == 6 || y == 0 || y == 10) {
                    ASSERT_EQ(bytes[y * 7 + x], 0) << c;
                }
        EXPECT_TRUE(shapes.insert(bytes).second) << "glyph of '" << c << "' repeats another";
    }

    // Alignment puts the block's corner on the anchor.
    ZbiuClear(image.get());
    ASSERT_EQ(ZbiuDrawString(image.get(), "W\nW", zbm_Pos{79, 29}, ZBM_ALIGNMENT_BOTTOM_RIGHT, Pixel(1, 1, 1)), ZBIU_OK);
    const Points pts = SetPixels(image.get());
    ASSERT_FALSE(pts.empty());
    EXPECT_EQ(pts.front().second, 29 - 18);
    EXPECT_EQ(ZbiuGetPixel(image.get(), 79, 29 - 8).v[0], 1);  // second W's right stem in the last column
    EXPECT_EQ(ZbiuDrawString(image.get(), nullptr, zbm_Pos{0, 0}, ZBM_ALIGNMENT_TOP_LEFT, Pixel(1)),
              ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(DrawTest, FillRegionStopsAtTheBorder) {
    ZbmImagePtr image(ZbiuCreate(12, 9, ZBM_PIXEL_ORDER_RGBA));
    ZbiuDrawRectangle(image.get(), zbm_Rect{2, 1, 8, 7}, Pixel(9, 9, 9, 9));
    ZbiuDrawLine(image.get(), zbm_Pos{2, 4}, zbm_Pos{6, 4}, Pixel(9, 9, 9, 9));  // a wall with a gap on the right
    ASSERT_EQ(ZbiuFillRegion(image.get(), zbm_Pos{3, 2}, Pixel(1, 2, 3, 4)), ZBIU_OK);
    EXPECT_EQ(CountPixels(image.get(), Pixel(1, 2, 3, 4)), 6 * 5 - 4);  // interior minus the wall
    EXPECT_EQ(ZbiuGetPixel(image.get(), 0, 0).v[0], 0);

    ZbmImagePtr before(ZbiuCreateClone(image.get()));
    EXPECT_EQ(ZbiuFillRegion(image.get(), zbm_Pos{3, 2}, Pixel(1, 2, 3, 4)), ZBIU_OK);  // same value: nothing to do
    EXPECT_TRUE(SameImage(before.get(), image.get()));
    EXPECT_EQ(ZbiuFillRegion(image.get(), zbm_Pos{12, 0}, Pixel(5)), ZBIU_ERR_INVALID_ARGUMENT);

    lumicor::test::ForEachAllocationFailure(
        [&] {
            ZbiuClear(image.get());
            const int status = ZbiuFillRegion(image.get(), zbm_Pos{0, 0}, Pixel(7, 7, 7, 7));
            EXPECT_TRUE(status == ZBIU_OK || status == ZBIU_ERR_OUT_OF_MEMORY);
        },
        [&](long, bool triggered) {
            if (!triggered) {
                EXPECT_EQ(CountPixels(image.get(), Pixel(7, 7, 7, 7)), 12 * 9);
            }
        });
}

}  // namespace
