#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <cstdlib>
#include <random>

#include "testkit/images.h"

namespace {

using lumicor::test::Pixel;

struct Triple {
    int a, b, c;
};
bool operator==(const Triple& x, const Triple& y) { return x.a == y.a && x.b == y.b && x.c == y.c; }
std::ostream& operator<<(std::ostream& os, const Triple& t) { return os << t.a << "," << t.b << "," << t.c; }

template <typename F>
Triple Apply(F f, Triple in) {
    Triple out{-9, -9, -9};
    f(in.a, in.b, in.c, &out.a, &out.b, &out.c);
    return out;
}

int MaxDiff(Triple x, Triple y) {
    return std::max(std::abs(x.a - y.a), std::max(std::abs(x.b - y.b), std::abs(x.c - y.c)));
}

// Expected values computed independently (double precision, same formulas).
TEST(ColorConversionTest, YuvAndGrayFormulas) {
    const struct {
        Triple rgb, yuv, back;
    } cases[] = {
        {{255, 0, 0}, {76, 85, 255}, {254, 0, 0}},
        {{0, 255, 0}, {150, 43, 21}, {0, 255, 0}},
        {{0, 0, 255}, {29, 255, 107}, {0, 0, 255}},
        {{10, 200, 30}, {124, 75, 47}, {10, 200, 30}},
        {{128, 128, 128}, {128, 128, 128}, {128, 128, 129}},  // the blue constant is 1814 x 128, not 1822 x 128
    };
    for (const auto& c : cases) {
        EXPECT_EQ(Apply(rgb2yuv, c.rgb), c.yuv) << c.rgb;
        EXPECT_EQ(Apply(yuv2rgb, c.yuv), c.back) << c.yuv;
        EXPECT_EQ(ZbiuRgb2Gray(c.rgb.a, c.rgb.b, c.rgb.c), c.yuv.a);
    }
    EXPECT_EQ(Apply(yuv2rgb, Triple{0, 0, 0}), (Triple{0, 136, 0}));  // clamped on the way back
    EXPECT_EQ(Apply(yuv2rgb, Triple{255, 255, 255}), (Triple{255, 120, 255}));
}

TEST(ColorConversionTest, LabFormulas) {
    const struct {
        Triple rgb, lab, srgbLab;
    } cases[] = {
        {{0, 0, 0}, {0, 128, 128}, {0, 128, 128}},
        {{255, 255, 255}, {99, 128, 128}, {99, 128, 128}},  // L is clamped to 99
        {{255, 0, 0}, {53, 208, 195}, {53, 208, 195}},
        {{0, 255, 0}, {88, 42, 211}, {87, 42, 211}},
        {{0, 0, 255}, {32, 207, 20}, {32, 207, 20}},
        {{128, 64, 32}, {61, 143, 156}, {40, 150, 157}},
        {{12, 200, 99}, {82, 72, 146}, {73, 66, 163}},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(Apply(rgb2lab, c.rgb), c.lab) << c.rgb;
        EXPECT_EQ(Apply(srgb2lab, c.rgb), c.srgbLab) << c.rgb;
    }
    EXPECT_EQ(Apply(lab2rgb, Triple{61, 143, 156}), (Triple{128, 63, 32}));
    EXPECT_EQ(Apply(lab2srgb, Triple{73, 66, 163}), (Triple{14, 200, 98}));

    // Round trips lose only the quantisation of the 8-bit Lab channels.
    for (int r = 32; r < 225; r += 8)
        for (int g = 32; g < 225; g += 8)
            for (int b = 32; b < 225; b += 8) {
                const Triple rgb{r, g, b};
                ASSERT_LE(MaxDiff(Apply(lab2rgb, Apply(rgb2lab, rgb)), rgb), 6) << rgb;
                ASSERT_LE(MaxDiff(Apply(lab2srgb, Apply(srgb2lab, rgb)), rgb), 9) << rgb;
            }
}

TEST(ColorConversionTest, HsvFollowsTheDominantChannel) {
    const struct {
        Triple rgb, hsv;
    } cases[] = {
        {{255, 0, 0}, {0, 255, 255}},   {{0, 255, 0}, {120, 255, 255}}, {{0, 0, 255}, {240, 255, 255}},
        {{255, 0, 255}, {300, 255, 255}}, {{10, 20, 30}, {210, 170, 30}}, {{90, 90, 90}, {-1, 0, 90}},
        {{0, 0, 0}, {-1, 0, 0}},
    };
    for (const auto& c : cases) EXPECT_EQ(Apply(rgb2hsv, c.rgb), c.hsv) << c.rgb;
    for (int r = 0; r < 256; r += 5)
        for (int g = 0; g < 256; g += 5)
            for (int b = 0; b < 256; b += 5) {
                const Triple hsv = Apply(rgb2hsv, Triple{r, g, b});
                Triple back;
                fhsv2rgb(static_cast<float>(hsv.a), static_cast<float>(hsv.b), static_cast<float>(hsv.c), &back.a,
                         &back.b, &back.c);
                ASSERT_LE(MaxDiff(back, Triple{r, g, b}), 4) << Triple{r, g, b};
            }
}

TEST(ColorConversionTest, IntegerSquareRoot) {
    const struct {
        uint32_t n, root;
    } cases[] = {{0, 0}, {1, 1}, {3, 1}, {4, 2}, {8, 2}, {9, 3}, {4294836224u, 65534}, {4294836225u, 65535},
                 {4294967295u, 65535}};
    for (const auto& c : cases) EXPECT_EQ(isqrt(c.n), c.root) << c.n;
    std::mt19937 rng(42);
    for (int i = 0; i < 100000; ++i) {
        const uint32_t n = rng();
        const uint64_t r = isqrt(n);
        ASSERT_TRUE(r * r <= n && (r + 1) * (r + 1) > n) << n;
    }
    // The boundaries where a rounded root could slip to the next integer.
    for (uint32_t k = 1; k < 65536; ++k) {
        ASSERT_EQ(isqrt(k * k), k);
        ASSERT_EQ(isqrt(k * k - 1), k - 1);
    }
    EXPECT_EQ(isqrt7(99), 9u);
}

TEST(ColorConversionTest, ConvertColorSpaceRules) {
    ZbmImagePtr rgb(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_RGB, Pixel(10, 20, 30)));
    ZbmImagePtr bgra(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_BGRA));
    ASSERT_EQ(ZbiuConvertColorSpace(rgb.get(), bgra.get()), ZBIU_OK);
    EXPECT_EQ(lumicor::test::CountPixels(bgra.get(), Pixel(30, 20, 10, 255)), 6);

    ZbmImagePtr argb(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_ARGB));
    ZbiuSetPixel(bgra.get(), 0, 0, Pixel(1, 2, 3, 77));
    ASSERT_EQ(ZbiuConvertColorSpace(bgra.get(), argb.get()), ZBIU_OK);  // alpha travels between alpha orders
    EXPECT_EQ(ZbiuGetPixel(argb.get(), 0, 0).v[0], 77);
    EXPECT_EQ(ZbiuGetPixel(argb.get(), 0, 0).v[1], 3);

    ZbmImagePtr gray(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_GRAY)), yuv(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_YUV));
    ZbmImagePtr lab(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_LAB));
    ASSERT_EQ(ZbiuConvertColorSpace(rgb.get(), gray.get()), ZBIU_OK);
    EXPECT_EQ(ZbiuGetPixel(gray.get(), 2, 1).v[0], ZbiuRgb2Gray(10, 20, 30));
    ASSERT_EQ(ZbiuConvertColorSpace(gray.get(), yuv.get()), ZBIU_OK);
    EXPECT_EQ(lumicor::test::CountPixels(yuv.get(), Pixel(ZbiuRgb2Gray(10, 20, 30), 128, 128)), 6);
    ASSERT_EQ(ZbiuConvertColorSpace(gray.get(), bgra.get()), ZBIU_OK);
    EXPECT_EQ(ZbiuGetPixel(bgra.get(), 1, 1).v[3], 255);
    ASSERT_EQ(ZbiuConvertColorSpace(argb.get(), lab.get()), ZBIU_OK);  // offsets of the source order
    const zbm_PackedUchar l = ZbiuGetPixel(lab.get(), 0, 0);
    EXPECT_EQ((Triple{l.v[0], l.v[1], l.v[2]}), Apply(rgb2lab, Triple{3, 2, 1}));

    const struct {
        _zbm_Image *src, *dst;
        int status;
    } refused[] = {
        {gray.get(), lab.get(), ZBIU_ERR_UNSUPPORTED_CONVERSION}, {yuv.get(), lab.get(), ZBIU_ERR_UNSUPPORTED_CONVERSION},
        {lab.get(), gray.get(), ZBIU_ERR_UNSUPPORTED_CONVERSION}, {lab.get(), yuv.get(), ZBIU_ERR_UNSUPPORTED_CONVERSION},
        {yuv.get(), gray.get(), ZBIU_ERR_UNSUPPORTED_CONVERSION}, {rgb.get(), rgb.get(), ZBIU_ERR_INVALID_ARGUMENT},
        {nullptr, rgb.get(), ZBIU_ERR_INVALID_ARGUMENT},
    };
    for (const auto& c : refused) EXPECT_EQ(ZbiuConvertColorSpace(c.src, c.dst), c.status);

    _zbm_Image bad = *rgb;
    bad.order = static_cast<_zbm_PixelOrder>(9);
    EXPECT_EQ(ZbiuConvertColorSpace(&bad, gray.get()), ZBIU_ERR_UNSUPPORTED_VALUE);
    EXPECT_EQ(ZbiuConvertColorSpace(gray.get(), &bad), ZBIU_ERR_INVALID_ARGUMENT);
    ZbmImagePtr small(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB));
    EXPECT_EQ(ZbiuConvertColorSpace(rgb.get(), small.get()), ZBIU_ERR_INVALID_ARGUMENT);
}

}  // namespace
