#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include "testkit/images.h"

namespace {

using lumicor::test::Pixel;

// A 2 x 2 RGB image with channel values known by hand.
ZbmImagePtr Quad() {
    ZbmImagePtr image(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB));
    ZbiuSetPixel(image.get(), 0, 0, Pixel(0, 10, 255));
    ZbiuSetPixel(image.get(), 1, 0, Pixel(10, 10, 255));
    ZbiuSetPixel(image.get(), 0, 1, Pixel(20, 10, 1));
    ZbiuSetPixel(image.get(), 1, 1, Pixel(30, 10, 1));
    return image;
}

TEST(ImageStatsTest, MinMaxMeanAndVariancePerChannel) {
    ZbmImagePtr image = Quad();
    zbm_PackedUchar lo, hi;
    ASSERT_EQ(ZbiuGetMinMax(image.get(), &lo, &hi), ZBIU_OK);
    EXPECT_EQ(lo.v[0], 0);
    EXPECT_EQ(hi.v[0], 30);
    EXPECT_EQ(lo.v[2], 1);
    EXPECT_EQ(hi.v[2], 255);
    EXPECT_EQ(lo.v[3], 0);  // no fourth channel
    zbm_PackedFloat avg, var;
    ASSERT_EQ(ZbiuCalcAverage(image.get(), &avg), ZBIU_OK);
    EXPECT_FLOAT_EQ(avg.v[0], 15.0f);
    EXPECT_FLOAT_EQ(avg.v[1], 10.0f);
    EXPECT_FLOAT_EQ(avg.v[2], 128.0f);
    ASSERT_EQ(ZbiuCalcVariance(image.get(), avg, &var), ZBIU_OK);
    EXPECT_FLOAT_EQ(var.v[0], 125.0f);  // (225 + 25 + 25 + 225) / 4
    EXPECT_FLOAT_EQ(var.v[1], 0.0f);
    EXPECT_FLOAT_EQ(var.v[2], 16129.0f);
    EXPECT_EQ(ZbiuCalcAverage(nullptr, &avg), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuGetMinMax(image.get(), nullptr, &hi), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(ImageStatsTest, PointOperationsTruncateAndClamp) {
    ZbmImagePtr src = Quad(), dst(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB));
    const zbm_PackedFloat offset = {{5.0f, 0.0f, 0.5f, 0.0f}}, gain = {{1.5f, -1.0f, 2.0f, 0.0f}};
    ASSERT_EQ(ZbiuOffsetImage(src.get(), dst.get(), offset, gain), ZBIU_OK);
    const struct {
        int32_t x, y;
        uint8_t r, g, b;
    } offsetCases[] = {
        {0, 0, 0, 0, 255},  // (0 - 5) x 1.5 clamps to 0; (255 - 0.5) x 2 clamps to 255
        {1, 0, 7, 0, 255},  // (10 - 5) x 1.5 = 7.5 truncates to 7
        {0, 1, 22, 0, 1},   // (1 - 0.5) x 2 = 1
    };
    for (const auto& c : offsetCases) {
        const zbm_PackedUchar p = ZbiuGetPixel(dst.get(), c.x, c.y);
        EXPECT_EQ(p.v[0], c.r);
        EXPECT_EQ(p.v[1], c.g);
        EXPECT_EQ(p.v[2], c.b);
    }
    const zbm_PackedFloat half = {{0.5f, 0.55f, 1.01f, 1.0f}};
    ASSERT_EQ(ZbiuGainImage(src.get(), dst.get(), half), ZBIU_OK);
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 1, 1).v[0], 15);
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 1, 1).v[1], 5);
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 0, 0).v[2], 255);

    ASSERT_EQ(ZbiuNegative(src.get(), dst.get()), ZBIU_OK);
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 1, 1).v[0], 225);
    ASSERT_EQ(ZbiuGammaCompensation(src.get(), dst.get(), 1.0f), ZBIU_OK);
    EXPECT_TRUE(lumicor::test::SameImage(src.get(), dst.get()));
    ASSERT_EQ(ZbiuGammaCompensation(src.get(), dst.get(), 2.0f), ZBIU_OK);
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 1, 0).v[0], 50);  // 255 x sqrt(10 / 255) = 50.498 rounds to 50
    EXPECT_EQ(ZbiuGetPixel(dst.get(), 0, 0).v[2], 255);
    EXPECT_EQ(ZbiuGammaCompensation(src.get(), dst.get(), 0.0f), ZBIU_ERR_INVALID_ARGUMENT);
    ZbmImagePtr other(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_BGR));
    EXPECT_EQ(ZbiuNegative(src.get(), other.get()), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(ImageStatsTest, ThresholdsAndPseudoColour) {
    ZbmImagePtr gray(ZbiuCreate(256, 1, ZBM_PIXEL_ORDER_GRAY)), mask(ZbiuCreate(256, 1, ZBM_PIXEL_ORDER_GRAY));
    for (int32_t x = 0; x < 256; ++x) ZbiuSetPixel(gray.get(), x, 0, Pixel(static_cast<uint8_t>(x)));
    ASSERT_EQ(ZbiuThreshold(gray.get(), mask.get(), 100), ZBIU_OK);
    EXPECT_EQ(lumicor::test::CountPixels(mask.get(), Pixel(255)), 156);
    EXPECT_EQ(ZbiuGetPixel(mask.get(), 100, 0).v[0], 255);
    ASSERT_EQ(ZbiuBandThreshold(gray.get(), mask.get(), 10, 20), ZBIU_OK);
    EXPECT_EQ(lumicor::test::CountPixels(mask.get(), Pixel(255)), 11);
    ZbmImagePtr rgb(ZbiuCreate(256, 1, ZBM_PIXEL_ORDER_RGB)), rgba(ZbiuCreate(256, 1, ZBM_PIXEL_ORDER_BGRA));
    EXPECT_EQ(ZbiuThreshold(rgb.get(), rgb.get(), 1), ZBIU_ERR_INVALID_ARGUMENT);

    ASSERT_EQ(ZbiuGrayToPseudoRgb(gray.get(), rgba.get()), ZBIU_OK);
    const struct {
        int32_t gray;
        uint8_t r, g, b;
    } ramp[] = {{0, 0, 0, 255}, {63, 0, 255, 255}, {127, 0, 255, 0}, {191, 255, 255, 0}, {255, 255, 0, 0}};
    for (const auto& c : ramp) {
        const zbm_PackedUchar p = ZbiuGetPixel(rgba.get(), c.gray, 0);  // B, G, R, A
        EXPECT_TRUE(p.v[0] == c.b && p.v[1] == c.g && p.v[2] == c.r && p.v[3] == 255) << c.gray;
    }
    EXPECT_EQ(ZbiuGrayToPseudoRgb(gray.get(), mask.get()), ZBIU_ERR_INVALID_ARGUMENT);
}

}  // namespace
