#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <vector>

#include "common/src/image/resize.h"
#include "testkit/fault.h"
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
            // A one-pixel axis has no second neighbour (its weight is 0).
            const int32_t x1 = x0 + 1 < s.w ? x0 + 1 : x0, y1 = y0 + 1 < s.h ? y0 + 1 : y0;
            for (int32_t c = 0; c < s.bpp; ++c) {
                const int top = s.at(x0, y0, c) * (1024 - fx) + s.at(x1, y0, c) * fx;
                const int bottom = s.at(x0, y1, c) * (1024 - fx) + s.at(x1, y1, c) * fx;
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

// The whole resize, one rule at a time: same size, mixed directions through
// one intermediate, enlargement, at most 2x, or the halving pyramid.
Plane RefReduce(const Plane& s, int32_t w, int32_t h) {
    return s.w == 2 * w && s.h == 2 * h ? RefHalve(s) : RefBilinear(s, w, h);
}

Plane RefResize(const Plane& s, int32_t w, int32_t h) {
    if (s.w == w && s.h == h) return s;
    if (w > s.w && h < s.h) return RefResize(RefResize(s, s.w, h), w, h);
    if (w < s.w && h > s.h) return RefResize(RefResize(s, w, s.h), w, h);
    if (w > s.w || h > s.h) return RefBilinear(s, w, h);
    if (s.w <= 2 * w && s.h <= 2 * h) return RefReduce(s, w, h);
    Plane level = s;
    do {
        level = RefReduce(level, (level.w + 1) / 2, (level.h + 1) / 2);
    } while (level.w / w > 2 || level.h / h > 2);
    return RefReduce(level, w, h);
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

// An image of `order` whose rows lie `pad` bytes apart beyond the pixels, in
// a buffer the test owns; the padding holds a marker that no resize may touch.
struct PaddedImage {
    static constexpr uint8_t kMarker = 0xA5;
    std::vector<uint8_t> bytes;
    ZbmImagePtr image;
    PaddedImage(int32_t w, int32_t h, _zbm_PixelOrder order, int32_t pad, bool bottomUp) {
        const int32_t rowBytes = w * ZbiuGetBytesPerPixel(order), pitch = rowBytes + pad;
        bytes.assign(static_cast<size_t>(pitch) * h, kMarker);
        uint8_t* first = bottomUp ? &bytes[static_cast<size_t>(pitch) * (h - 1)] : bytes.data();
        image.reset(ZbiuCreateAttatchData(first, w, h, bottomUp ? -pitch : pitch, order));
    }
    bool PaddingIntact() const {
        const int32_t rowBytes = image->width * image->bytesPerPixel;
        const int32_t pitch = image->pitch < 0 ? -image->pitch : image->pitch;
        for (size_t i = 0; i < bytes.size(); ++i)
            if (static_cast<int32_t>(i % pitch) >= rowBytes && bytes[i] != kMarker) return false;
        return true;
    }
};

// Random sizes around the paths' boundaries (1 pixel, odd sizes, exact and
// near halvings, pyramids of several levels), every pixel width, padded and
// bottom-up rows on both sides.
TEST(ImageResizeTest, MatchesTheRulesOnRandomSizes) {
    const _zbm_PixelOrder orders[] = {ZBM_PIXEL_ORDER_GRAY, ZBM_PIXEL_ORDER_RGB, ZBM_PIXEL_ORDER_BGRA,
                                      ZBM_PIXEL_ORDER_LAB, ZBM_PIXEL_ORDER_ARGB};
    uint32_t state = 12345u;
    const auto next = [&state](uint32_t n) {
        state = state * 1664525u + 1013904223u;
        return static_cast<int32_t>((state >> 8) % n);
    };
    for (int round = 0; round < 120; ++round) {
        const int32_t sw = 1 + next(round % 3 == 0 ? 9 : 260), sh = 1 + next(round % 4 == 0 ? 5 : 200);
        int32_t dw, dh;
        switch (round % 4) {
            case 0: dw = (sw + 1) / 2, dh = (sh + 1) / 2; break;  // halving or close to it
            case 1: dw = 1 + next(sw), dh = 1 + next(sh); break;  // reduction
            default: dw = 1 + next(70), dh = 1 + next(60); break;  // anything
        }
        const _zbm_PixelOrder order = orders[round % 5];
        PaddedImage src(sw, sh, order, next(3) * 3, round % 3 == 1);
        for (uint8_t& b : src.bytes) b = static_cast<uint8_t>(next(256));
        PaddedImage dst(dw, dh, order, next(2) * 5, round % 5 == 2);
        ASSERT_TRUE(src.image && dst.image);
        SCOPED_TRACE(::testing::Message() << sw << "x" << sh << " -> " << dw << "x" << dh << " order " << order);
        ASSERT_EQ(ZbiuResize(src.image.get(), dst.image.get()), ZBIU_OK);
        EXPECT_TRUE(Matches(dst.image.get(), RefResize(FromImage(src.image.get()), dw, dh)));
        EXPECT_TRUE(dst.PaddingIntact());
    }
}

uint32_t Fnv1a(const _zbm_Image* image) {
    uint32_t h = 2166136261u;
    for (int32_t y = 0; y < image->height; ++y) {
        const uint8_t* row = ZbiuGetConstPointer(image, 0, y);
        for (int32_t i = 0; i < image->width * image->bytesPerPixel; ++i) h = (h ^ row[i]) * 16777619u;
    }
    return h;
}

// Camera-sized reductions, every pixel order. The hashes were recorded from
// the straightforward per-pixel loops (one index computation per pixel and
// channel) before the row loops were specialised and vectorised; any change
// in a stored byte shows here.
TEST(ImageResizeTest, KeepsTheRecordedResults) {
    const struct {
        int32_t sw, sh, dw, dh;
        _zbm_PixelOrder order;
        uint32_t hash;
    } cases[] = {
        {1600, 1200, 640, 480, ZBM_PIXEL_ORDER_RGB, 0xa859a1cau},     // one halving, bilinear finish
        {1600, 1200, 40, 30, ZBM_PIXEL_ORDER_RGB, 0x3b18cb43u},       // exact halvings down to 100 x 75
        {1601, 1199, 160, 120, ZBM_PIXEL_ORDER_BGR, 0x1f1bf595u},     // odd levels, bilinear halvings
        {1280, 960, 640, 480, ZBM_PIXEL_ORDER_RGBA, 0x5fc9989eu},     // one exact halving
        {1022, 766, 511, 383, ZBM_PIXEL_ORDER_BGRA, 0xf5da2c8du},     // exact halving, odd result
        {999, 777, 320, 240, ZBM_PIXEL_ORDER_ARGB, 0xd33add28u},      // pyramid of 4-byte pixels
        {1000, 750, 37, 29, ZBM_PIXEL_ORDER_ABGR, 0xf88d33f4u},       // deep pyramid
        {1200, 800, 600, 400, ZBM_PIXEL_ORDER_GRAY, 0x0da7bb59u},     // gray halving
        {1203, 801, 100, 66, ZBM_PIXEL_ORDER_GRAY, 0x99d47f8cu},      // gray pyramid
        {901, 601, 450, 300, ZBM_PIXEL_ORDER_YUV, 0xf1cd56c7u},       // just under 2x: bilinear
        {640, 480, 678, 452, ZBM_PIXEL_ORDER_LAB, 0x7f3b0436u},       // mixed directions
        {300, 200, 641, 401, ZBM_PIXEL_ORDER_RGB, 0xe1ea87c2u},       // enlargement
        {2000, 1, 40, 1, ZBM_PIXEL_ORDER_RGB, 0x1f4fd6c3u},           // one-pixel rows
        {1, 1500, 1, 7, ZBM_PIXEL_ORDER_RGBA, 0x0f4b6520u},           // one-pixel columns
    };
    for (const auto& c : cases) {
        ZbmImagePtr src = MakeNoiseImage(c.sw, c.sh, c.order, static_cast<uint32_t>(c.sw + c.dh));
        ZbmImagePtr dst = Resized(src.get(), c.dw, c.dh);
        const uint32_t hash = Fnv1a(dst.get());
        EXPECT_EQ(hash, c.hash) << c.sw << "x" << c.sh << " -> " << c.dw << "x" << c.dh << " order " << c.order;
    }
}

// Several sizes of one photo at once give what one resize per size gives,
// whether the pyramids share levels, whatever other path a size takes, and
// out of memory reports 4.
TEST(ImageResizeTest, ResizeEachMatchesOneResizePerSize) {
    const struct {
        int32_t sw, sh;
        _zbm_PixelOrder order;
        std::vector<std::pair<int32_t, int32_t>> sizes;
    } cases[] = {
        {1203, 901, ZBM_PIXEL_ORDER_RGB, {{640, 480}, {40, 30}}},               // 602 x 451 shared, then apart
        {1600, 1200, ZBM_PIXEL_ORDER_BGRA, {{40, 30}, {400, 300}, {99, 75}}},  // depths 6, 1 and 3
        {800, 600, ZBM_PIXEL_ORDER_GRAY, {{100, 75}, {800, 600}, {500, 900}, {45, 601}, {13, 10}}},
        {640, 480, ZBM_PIXEL_ORDER_RGB, {{320, 240}, {40, 30}}},                // only one pyramid
    };
    for (const auto& c : cases) {
        ZbmImagePtr src = MakeNoiseImage(c.sw, c.sh, c.order, static_cast<uint32_t>(c.sw));
        std::vector<ZbmImagePtr> got, want;
        std::vector<_zbm_Image*> targets;
        for (const auto& size : c.sizes) {
            got.emplace_back(ZbiuCreate(size.first, size.second, c.order));
            targets.push_back(got.back().get());
            want.push_back(Resized(src.get(), size.first, size.second));
        }
        ASSERT_EQ(lmk::image::ResizeEach(src.get(), targets.data(), static_cast<int32_t>(targets.size())), ZBIU_OK);
        for (size_t i = 0; i < got.size(); ++i)
            EXPECT_TRUE(SameImage(got[i].get(), want[i].get())) << c.sw << "x" << c.sh << " size " << i;

        int status = -1;
        const long allocations = lumicor::test::ForEachAllocationFailure(
            [&] { status = lmk::image::ResizeEach(src.get(), targets.data(), static_cast<int32_t>(targets.size())); },
            [&](long, bool triggered) { EXPECT_EQ(status, triggered ? ZBIU_ERR_OUT_OF_MEMORY : ZBIU_OK); });
        EXPECT_GT(allocations, 0);
    }
    ZbmImagePtr src(ZbiuCreate(8, 8, ZBM_PIXEL_ORDER_RGB)), gray(ZbiuCreate(4, 4, ZBM_PIXEL_ORDER_GRAY));
    _zbm_Image* const mismatched[] = {gray.get()};
    EXPECT_EQ(lmk::image::ResizeEach(src.get(), mismatched, 1), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(ImageResizeTest, RejectsMismatchedImages) {
    ZbmImagePtr rgb(ZbiuCreate(8, 8, ZBM_PIXEL_ORDER_RGB)), gray(ZbiuCreate(4, 4, ZBM_PIXEL_ORDER_GRAY));
    EXPECT_EQ(ZbiuResize(rgb.get(), gray.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuResize(rgb.get(), rgb.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuResize(nullptr, gray.get()), ZBIU_ERR_INVALID_ARGUMENT);
}

}  // namespace
