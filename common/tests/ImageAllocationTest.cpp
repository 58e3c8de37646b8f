// Every allocation of the creating and resizing paths fails in turn: the
// result is NULL or 4, the caller's data is intact, and nothing leaks (the
// asan preset checks leaks).
#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <functional>

#include "testkit/fault.h"
#include "testkit/images.h"

namespace {

using lumicor::test::ForEachAllocationFailure;
using lumicor::test::MakeNoiseImage;

// Runs make() under each failing allocation; it must return NULL then, and
// a complete image when nothing failed. Returns the number of allocations.
long CheckCreation(const std::function<_zbm_Image*()>& make) {
    _zbm_Image* image = nullptr;
    return ForEachAllocationFailure([&] { image = make(); },
                                    [&](long n, bool triggered) {
                                        if (triggered) {
                                            EXPECT_EQ(image, nullptr) << "allocation " << n;
                                        } else {
                                            EXPECT_NE(image, nullptr);
                                        }
                                        ZbiuDispose(&image);
                                    });
}

TEST(ImageAllocationTest, CreatingFunctionsReturnNullAndLeaveNothing) {
    ZbmImagePtr src = MakeNoiseImage(20, 10, ZBM_PIXEL_ORDER_RGB);
    EXPECT_EQ(CheckCreation([] { return ZbiuCreate(20, 10, ZBM_PIXEL_ORDER_RGB); }), 2);
    EXPECT_EQ(CheckCreation([] { return ZbiuCreate(20, 10, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(1, 2, 3)); }), 2);
    EXPECT_EQ(CheckCreation([&] { return ZbiuCreateClone(src.get()); }), 2);
    EXPECT_EQ(CheckCreation([&] { return ZbiuCreateCrop(src.get(), zbm_Rect{2, 3, 5, 4}); }), 2);
    EXPECT_EQ(CheckCreation([&] { return ZbiuCreateFromData(src->pData, 20, 10, 60, ZBM_PIXEL_ORDER_RGB); }), 2);
    EXPECT_EQ(CheckCreation([&] { return ZbiuCreateAttatchData(src->pData, 20, 10, 60, ZBM_PIXEL_ORDER_RGB); }), 1);
}

TEST(ImageAllocationTest, ResizeReportsOutOfMemory) {
    ZbmImagePtr src = MakeNoiseImage(203, 101, ZBM_PIXEL_ORDER_RGBA);
    const struct {
        int32_t w, h;
    } targets[] = {{20, 10}, {150, 80}, {300, 40}, {50, 150}};  // pyramid, bilinear, both two-pass kinds
    for (const auto& t : targets) {
        ZbmImagePtr expected(ZbiuCreate(t.w, t.h, ZBM_PIXEL_ORDER_RGBA)), dst(ZbiuCreate(t.w, t.h, ZBM_PIXEL_ORDER_RGBA));
        ASSERT_EQ(ZbiuResize(src.get(), expected.get()), ZBIU_OK);
        int status = -1;
        const long count = ForEachAllocationFailure([&] { status = ZbiuResize(src.get(), dst.get()); },
                                                    [&](long, bool triggered) {
                                                        EXPECT_EQ(status, triggered ? ZBIU_ERR_OUT_OF_MEMORY : ZBIU_OK);
                                                    });
        EXPECT_GT(count, 0) << t.w << "x" << t.h;
        EXPECT_TRUE(lumicor::test::SameImage(dst.get(), expected.get()));
    }
}

TEST(ImageAllocationTest, ExifAdjustmentKeepsTheLastGoodImage) {
    ZbmImagePtr original = MakeNoiseImage(6, 4, ZBM_PIXEL_ORDER_RGB);
    for (int orientation : {2, 5, 7}) {
        _zbm_Image* image = nullptr;
        int status = -1;
        ForEachAllocationFailure(
            [&] {
                image = ZbiuCreateClone(original.get());
                if (image) status = ZbiuAdjustToExifOrientation(image, orientation);
            },
            [&](long n, bool triggered) {
                if (triggered && image) {
                    EXPECT_EQ(status, ZBIU_ERR_OUT_OF_MEMORY) << "allocation " << n;
                    // Either the untouched clone or the result of the first step.
                    const bool asIs = lumicor::test::SameImage(image, original.get());
                    EXPECT_TRUE(asIs || (orientation >= 5 && image->width == 4)) << "allocation " << n;
                } else if (!triggered) {
                    EXPECT_EQ(status, ZBIU_OK);
                    EXPECT_EQ(image->width, orientation >= 5 ? 4 : 6);
                }
                ZbiuDispose(&image);
            });
    }
}

}  // namespace
