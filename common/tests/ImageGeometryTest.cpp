#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <cmath>
#include <cstring>
#include <functional>
#include <vector>

#include "testkit/images.h"

namespace {

using lumicor::test::MakeNoiseImage;
using lumicor::test::SameImage;

typedef int (*GeometryOp)(const _zbm_Image*, _zbm_Image*);

ZbmImagePtr Apply(GeometryOp op, const _zbm_Image* src, bool turn) {
    ZbmImagePtr dst(ZbiuCreate(turn ? src->height : src->width, turn ? src->width : src->height, src->order));
    EXPECT_EQ(op(src, dst.get()), ZBIU_OK);
    return dst;
}

bool SamePixelAt(const _zbm_Image* a, int32_t ax, int32_t ay, const _zbm_Image* b, int32_t bx, int32_t by) {
    return std::memcmp(ZbiuGetConstPointer(a, ax, ay), ZbiuGetConstPointer(b, bx, by), a->bytesPerPixel) == 0;
}

// Where source pixel (x, y) of a w x h image lands.
typedef std::function<void(int32_t x, int32_t y, int32_t w, int32_t h, int32_t* dx, int32_t* dy)> Mapping;

::testing::AssertionResult FollowsMapping(const _zbm_Image* src, const _zbm_Image* dst, const Mapping& map) {
    for (int32_t y = 0; y < src->height; ++y)
        for (int32_t x = 0; x < src->width; ++x) {
            int32_t dx, dy;
            map(x, y, src->width, src->height, &dx, &dy);
            if (!SamePixelAt(src, x, y, dst, dx, dy))
                return ::testing::AssertionFailure() << "source " << x << "," << y << " not at " << dx << "," << dy;
        }
    return ::testing::AssertionSuccess();
}

TEST(ImageGeometryTest, RoundTripsAreIdentity) {
    const _zbm_PixelOrder orders[] = {ZBM_PIXEL_ORDER_GRAY, ZBM_PIXEL_ORDER_BGR, ZBM_PIXEL_ORDER_RGBA};
    for (_zbm_PixelOrder order : orders) {
        ZbmImagePtr src = MakeNoiseImage(7, 4, order, 9);
        for (GeometryOp turn : {ZbiuRotateLeft, ZbiuRotateRight}) {
            ZbmImagePtr a = Apply(turn, src.get(), true), b = Apply(turn, a.get(), true);
            ZbmImagePtr c = Apply(turn, b.get(), true), d = Apply(turn, c.get(), true);
            EXPECT_TRUE(SameImage(d.get(), src.get()));
            EXPECT_FALSE(SameImage(b.get(), src.get()));
        }
        for (GeometryOp mirror : {ZbiuFlop, ZbiuFlip, ZbiuRotate180}) {
            ZbmImagePtr once = Apply(mirror, src.get(), false);
            EXPECT_TRUE(SameImage(Apply(mirror, once.get(), false).get(), src.get()));
        }
    }
}

TEST(ImageGeometryTest, RefusesWrongShapesAndAliasing) {
    ZbmImagePtr src(ZbiuCreate(4, 3, ZBM_PIXEL_ORDER_RGB)), same(ZbiuCreate(4, 3, ZBM_PIXEL_ORDER_RGB));
    ZbmImagePtr turned(ZbiuCreate(3, 4, ZBM_PIXEL_ORDER_RGB)), gray(ZbiuCreate(4, 3, ZBM_PIXEL_ORDER_GRAY));
    EXPECT_EQ(ZbiuCopy(src.get(), src.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuCopy(src.get(), gray.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuFlop(src.get(), turned.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuRotateLeft(src.get(), same.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuRotateRight(nullptr, turned.get()), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuRotate(src.get(), same.get(), NAN), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuRotate(src.get(), same.get(), INFINITY), ZBIU_ERR_INVALID_ARGUMENT);
}

// Orientations 2, 3, 4, 6 and 8 are exactly Flop, Rotate180, Flip,
// RotateRight and RotateLeft, so this table also checks those mappings.
TEST(ImageGeometryTest, ExifOrientationMakesTheImageUpright) {
    const Mapping expected[9] = {
        nullptr,
        [](int32_t x, int32_t y, int32_t, int32_t, int32_t* dx, int32_t* dy) { *dx = x, *dy = y; },
        [](int32_t x, int32_t y, int32_t w, int32_t, int32_t* dx, int32_t* dy) { *dx = w - 1 - x, *dy = y; },
        [](int32_t x, int32_t y, int32_t w, int32_t h, int32_t* dx, int32_t* dy) { *dx = w - 1 - x, *dy = h - 1 - y; },
        [](int32_t x, int32_t y, int32_t, int32_t h, int32_t* dx, int32_t* dy) { *dx = x, *dy = h - 1 - y; },
        [](int32_t x, int32_t y, int32_t, int32_t, int32_t* dx, int32_t* dy) { *dx = y, *dy = x; },  // transpose
        [](int32_t x, int32_t y, int32_t, int32_t h, int32_t* dx, int32_t* dy) { *dx = h - 1 - y, *dy = x; },
        [](int32_t x, int32_t y, int32_t w, int32_t h, int32_t* dx, int32_t* dy) { *dx = h - 1 - y, *dy = w - 1 - x; },
        [](int32_t x, int32_t y, int32_t w, int32_t, int32_t* dx, int32_t* dy) { *dx = y, *dy = w - 1 - x; },
    };
    ZbmImagePtr src = MakeNoiseImage(6, 4, ZBM_PIXEL_ORDER_BGR, 3);
    for (int orientation = 1; orientation <= 8; ++orientation) {
        _zbm_Image* image = ZbiuCreateClone(src.get());
        ASSERT_EQ(ZbiuAdjustToExifOrientation(image, orientation), ZBIU_OK);
        EXPECT_EQ(image->width, orientation >= 5 ? 4 : 6);
        EXPECT_TRUE(FollowsMapping(src.get(), image, expected[orientation])) << "orientation " << orientation;
        ZbiuDispose(&image);
    }

    _zbm_Image* photo = ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_RGB);
    ASSERT_EQ(ZbiuAdjustToExifOrientation(photo, 6), ZBIU_OK);
    EXPECT_EQ(photo->width, 480);
    EXPECT_EQ(photo->height, 640);
    _zbm_Image* before = photo;
    EXPECT_EQ(ZbiuAdjustToExifOrientation(photo, 9), ZBIU_ERR_UNSUPPORTED_VALUE);
    EXPECT_EQ(ZbiuAdjustToExifOrientation(photo, 0), ZBIU_ERR_UNSUPPORTED_VALUE);
    EXPECT_EQ(photo, before);
    ZbiuDispose(&photo);
    _zbm_Image* none = nullptr;
    EXPECT_EQ(ZbiuAdjustToExifOrientation(none, 1), ZBIU_ERR_INVALID_ARGUMENT);

    // An attached host picture is replaced by an owned copy, its pixels untouched.
    std::vector<uint8_t> host(6 * 4 * 3, 5);
    _zbm_Image* attached = ZbiuCreateAttatchData(host.data(), 6, 4, 18, ZBM_PIXEL_ORDER_RGB);
    ASSERT_EQ(ZbiuAdjustToExifOrientation(attached, 8), ZBIU_OK);
    EXPECT_EQ(attached->ownsData, 1);
    EXPECT_EQ(lumicor::test::CountPixels(attached, lumicor::test::Pixel(5, 5, 5)), 24);
    ZbiuDispose(&attached);
}

TEST(ImageGeometryTest, FreeRotationByAQuarterTurnMatchesRotateRight) {
    // On an odd square the centres coincide and the fixed-point sine of a
    // quarter turn is exact; only destination pixels whose source lies on
    // the last row or column stay unwritten.
    ZbmImagePtr src = MakeNoiseImage(9, 9, ZBM_PIXEL_ORDER_RGB, 4);
    ZbmImagePtr right = Apply(ZbiuRotateRight, src.get(), true);
    ZbmImagePtr free(ZbiuCreate(9, 9, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(1, 2, 3)));
    ASSERT_EQ(ZbiuRotate(src.get(), free.get(), static_cast<float>(M_PI / 2)), ZBIU_OK);
    for (int32_t y = 0; y < 9; ++y)
        for (int32_t x = 0; x < 9; ++x) {
            // Destination (x, y) reads source (y, 8 - x).
            if (y == 8 || x == 0) {
                EXPECT_EQ(ZbiuGetPixel(free.get(), x, y).v[0], 1) << x << "," << y;
            } else {
                EXPECT_TRUE(SamePixelAt(free.get(), x, y, right.get(), x, y)) << x << "," << y;
            }
        }

    // Angle 0 (and whole turns) copy the interior.
    ZbmImagePtr zero(ZbiuCreate(9, 9, ZBM_PIXEL_ORDER_RGB));
    ASSERT_EQ(ZbiuRotate(src.get(), zero.get(), 0.0f), ZBIU_OK);
    EXPECT_TRUE(SamePixelAt(zero.get(), 7, 7, src.get(), 7, 7));
    EXPECT_TRUE(SamePixelAt(zero.get(), 0, 3, src.get(), 0, 3));
}

}  // namespace
