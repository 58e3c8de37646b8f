#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <vector>

#include "testkit/images.h"

namespace {

using lumicor::test::MakeNoiseImage;
using lumicor::test::Pixel;
using lumicor::test::SameImage;

// Reference resampling written straight from the rules, one sample at a time,
// on a plain byte vector: position k of an axis is step/2 - 512 + k * step,
// step = (src << 10) / dst, clamped to 0 .. (src << 10) - 1025.
struct Plane {
    int32_t w, h, bpp;
    std::vector<int> px;
    int at(int32_t x, int32_t y, int32_t c) const { return px[(y * w + x) * bpp + c]; }
};

Plane FromImage(const _zbm_Image* image) {
    Plane p{image->width, image->height, image->bytesPerPixel, {}};
    for (int32_t y = 0; y < p.h; ++y)
        for (int32_t x = 0; x < p.w; ++x)
            for (int32_t c = 0; c < p.bpp; ++c) p.px.push_back(ZbiuGetPixel(image, x, y).v[c]);
    return p;
}

long long SamplePos(int32_t src, int32_t dst, int32_t k) {
    const long long step = (static_cast<long long>(src) << 10) / dst;
    long long pos = step / 2 - 512 + k * step;
    const long long hi = (static_cast<long long>(src) << 10) - 1025;
    if (pos > hi) pos = hi;
    if (pos < 0) pos = 0;
    return pos;
}

Plane RefBilinear(const Plane& s, int32_t w, int32_t h) {
    Plane d{w, h, s.bpp, std::vector<int>(static_cast<size_t>(w) * h * s.bpp)};
    for (int32_t y = 0; y < h; ++y) {
        const long long py = SamplePos(s.h, h, y);
        const int32_t y0 = static_cast<int32_t>(py >> 10), fy = static_cast<int32_t>(py & 1023);
        for (int32_t x = 0; x < w; ++x) {
            const long long px = SamplePos(s.w, w, x);
            const int32_t x0 = static_cast<int32_t>(px >> 10), fx = static_cast<int32_t>(px & 1023);
            for (int32_t c = 0; c < s.bpp; ++c) {
                const int top = s.at(x0, y0, c) * (1024 - fx) + s.at(x0 + 1, y0, c) * fx;
                const int bottom = s.at(x0, y0 + 1, c) * (1024 - fx) + s.at(x0 + 1, y0 + 1, c) * fx;
                d.px[(y * w + x) * s.bpp + c] = ((1024 - fy) * top + fy * bottom) >> 20;
            }
        }
    }
    return d;
}

Plane RefHalve(const Plane& s) {
    Plane d{s.w / 2, s.h / 2, s.bpp, {}};
    for (int32_t y = 0; y < d.h; ++y)
        for (int32_t x = 0; x < d.w; ++x)
            for (int32_t c = 0; c < s.bpp; ++c)
                d.px.push_back((s.at(2 * x, 2 * y, c) + s.at(2 * x + 1, 2 * y, c) + s.at(2 * x, 2 * y + 1, c) +
                                s.at(2 * x + 1, 2 * y + 1, c)) >> 2);
    return d;
}

::testing::AssertionResult Matches(const _zbm_Image* image, const Plane& ref) {
    const Plane got = FromImage(image);
    if (got.w != ref.w || got.h != ref.h) return ::testing::AssertionFailure() << "size differs";
    for (size_t i = 0; i < ref.px.size(); ++i)
        if (got.px[i] != ref.px[i])
            return ::testing::AssertionFailure() << "byte " << i << ": " << got.px[i] << " != " << ref.px[i];
    return ::testing::AssertionSuccess();
}

ZbmImagePtr Resized(const _zbm_Image* src, int32_t w, int32_t h) {
    ZbmImagePtr dst(ZbiuCreate(w, h, src->order));
    EXPECT_EQ(ZbiuResize(src, dst.get()), ZBIU_OK);
    return dst;
}

TEST(ImageResizeTest, OddStrongReductionHalvesBilineariallyThenFinishes) {
    // 101 x 51 -> 25 x 12: one halving to 51 x 26 (not exactly 2x, so
    // bilinear), then 51 x 26 -> 25 x 12 (again not exactly 2x).
    ZbmImagePtr src = MakeNoiseImage(101, 51, ZBM_PIXEL_ORDER_RGB, 7);
    ZbmImagePtr dst = Resized(src.get(), 25, 12);
    const Plane ref = RefBilinear(RefBilinear(FromImage(src.get()), 51, 26), 25, 12);
    EXPECT_TRUE(Matches(dst.get(), ref));
    // The path matters: one direct bilinear step gives other values.
    EXPECT_FALSE(Matches(dst.get(), RefBilinear(FromImage(src.get()), 25, 12)));
}

TEST(ImageResizeTest, ExactHalvingIsTheMeanOfEachBlock) {
    ZbmImagePtr src = MakeNoiseImage(200, 100, ZBM_PIXEL_ORDER_BGRA, 3);
    ZbmImagePtr dst = Resized(src.get(), 100, 50);
    EXPECT_TRUE(Matches(dst.get(), RefHalve(FromImage(src.get()))));

    // 400 x 300 -> 64 x 48: two exact halvings, then bilinear from 100 x 75.
    ZbmImagePtr big = MakeNoiseImage(400, 300, ZBM_PIXEL_ORDER_GRAY, 4);
    ZbmImagePtr small = Resized(big.get(), 64, 48);
    EXPECT_TRUE(Matches(small.get(), RefBilinear(RefHalve(RefHalve(FromImage(big.get()))), 64, 48)));
}

TEST(ImageResizeTest, MixedDirectionsGoThroughOneIntermediate) {
    // Width grows, height shrinks: first to 100 x 50, then to 200 x 50.
    ZbmImagePtr src = MakeNoiseImage(100, 100, ZBM_PIXEL_ORDER_RGB, 5);
    ZbmImagePtr dst = Resized(src.get(), 200, 50);
    EXPECT_TRUE(Matches(dst.get(), RefBilinear(RefBilinear(FromImage(src.get()), 100, 50), 200, 50)));
    // Height grows, width shrinks: first to 30 x 100, then to 30 x 150. The
    // first pass is a strong reduction, and the pyramid halves both
    // dimensions (100 x 100 -> 50 x 50) before the final bilinear step.
    ZbmImagePtr tall = Resized(src.get(), 30, 150);
    const Plane first = RefBilinear(RefHalve(FromImage(src.get())), 30, 100);
    EXPECT_TRUE(Matches(tall.get(), RefBilinear(first, 30, 150)));
}

TEST(ImageResizeTest, EnlargementSamplesBilinearly) {
    ZbmImagePtr src = MakeNoiseImage(7, 5, ZBM_PIXEL_ORDER_ARGB, 6);
    ZbmImagePtr dst = Resized(src.get(), 23, 11);
    EXPECT_TRUE(Matches(dst.get(), RefBilinear(FromImage(src.get()), 23, 11)));
}

TEST(ImageResizeTest, FlatImagesStayFlat) {
    const struct {
        int32_t sw, sh, dw, dh;
    } sizes[] = {{1, 1, 9, 4}, {1, 7, 3, 2}, {640, 480, 37, 29}, {33, 9, 5, 40}, {512, 512, 256, 256}, {3, 3, 3, 3}};
    const _zbm_PixelOrder orders[] = {ZBM_PIXEL_ORDER_GRAY, ZBM_PIXEL_ORDER_RGB, ZBM_PIXEL_ORDER_RGBA};
    for (const auto& s : sizes)
        for (_zbm_PixelOrder order : orders) {
            ZbmImagePtr src(ZbiuCreate(s.sw, s.sh, order, Pixel(17, 128, 250, 3)));
            ZbmImagePtr dst = Resized(src.get(), s.dw, s.dh);
            zbm_PackedUchar lo, hi;
            ASSERT_EQ(ZbiuGetMinMax(dst.get(), &lo, &hi), ZBIU_OK);
            for (int32_t c = 0; c < dst->bytesPerPixel; ++c) {
                EXPECT_EQ(lo.v[c], hi.v[c]) << s.sw << "x" << s.sh << " -> " << s.dw << "x" << s.dh;
                EXPECT_EQ(lo.v[c], Pixel(17, 128, 250, 3).v[c]);
            }
        }
}

TEST(ImageResizeTest, BottomUpSourceGivesTheSameResult) {
    ZbmImagePtr src = MakeNoiseImage(64, 48, ZBM_PIXEL_ORDER_RGB, 8);
    // The same picture stored bottom-up.
    std::vector<uint8_t> flipped(64 * 3 * 48);
    for (int32_t y = 0; y < 48; ++y)
        std::memcpy(&flipped[(47 - y) * 64 * 3], ZbiuGetConstPointer(src.get(), 0, y), 64 * 3);
    ZbmImagePtr view(ZbiuCreateAttatchData(&flipped[47 * 64 * 3], 64, 48, -64 * 3, ZBM_PIXEL_ORDER_RGB));
    ZbmImagePtr a = Resized(src.get(), 10, 7), b = Resized(view.get(), 10, 7);
    EXPECT_TRUE(SameImage(a.get(), b.get()));
}

TEST(ImageResizeTest, RejectsMismatchedImages) {
    ZbmImagePtr rgb(ZbiuCreate(8, 8, ZBM_PIXEL_ORDER_RGB)), gray(ZbiuCreate(4, 4, ZBM_PIXEL_ORDER_GRAY));
    EXPECT_EQ(ZbiuResize(rgb.get(), gray.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuResize(rgb.get(), rgb.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuResize(nullptr, gray.get()), ZBIU_ERR_INVALID_ARGUMENT);
}

}  // namespace
