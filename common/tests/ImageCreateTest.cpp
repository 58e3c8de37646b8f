#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <vector>

#include "testkit/images.h"

namespace {

using lumicor::test::MakeNoiseImage;
using lumicor::test::Pixel;
using lumicor::test::SameImage;

TEST(ImageCreateTest, SizeLimitsAndOrders) {
    struct Case {
        int32_t width, height, order;
        bool ok;
    } cases[] = {
        {4000, 4000, ZBM_PIXEL_ORDER_GRAY, true},   // exactly 16,000,000 pixels
        {4001, 4000, ZBM_PIXEL_ORDER_GRAY, false},  // one column too many
        {1, 1, ZBM_PIXEL_ORDER_ABGR, true},
        {0, 10, ZBM_PIXEL_ORDER_RGB, false},
        {10, -1, ZBM_PIXEL_ORDER_RGB, false},
        {65536, 65536, ZBM_PIXEL_ORDER_RGB, false},  // product wraps to 0 in 32 bits
        {10, 10, 9, false},
        {10, 10, -1, false},
    };
    for (const Case& c : cases) {
        _zbm_Image* image = ZbiuCreate(c.width, c.height, static_cast<_zbm_PixelOrder>(c.order));
        EXPECT_EQ(image != nullptr, c.ok) << c.width << "x" << c.height << " order " << c.order;
        if (image) {
            EXPECT_EQ(image->pitch, c.width * image->bytesPerPixel);
            EXPECT_EQ(image->ownsData, 1);
            EXPECT_EQ(ZbiuGetPixel(image, c.width - 1, c.height - 1).v[0], 0);
        }
        ZbiuDispose(&image);
        EXPECT_EQ(image, nullptr);
    }
}

TEST(ImageCreateTest, FillWritesOnlyStoredBytes) {
    ZbmImagePtr rgb(ZbiuCreate(3, 2, ZBM_PIXEL_ORDER_RGB, Pixel(1, 2, 3, 99)));
    ASSERT_TRUE(rgb);
    EXPECT_EQ(lumicor::test::CountPixels(rgb.get(), Pixel(1, 2, 3)), 6);
    EXPECT_EQ(ZbiuGetPixel(rgb.get(), 2, 1).v[3], 0);  // past bytesPerPixel reads as zero
    EXPECT_EQ(ZbiuClear(rgb.get(), Pixel(7, 7, 7)), ZBIU_OK);
    EXPECT_EQ(lumicor::test::CountPixels(rgb.get(), Pixel(7, 7, 7)), 6);
    EXPECT_EQ(ZbiuClear(nullptr), ZBIU_ERR_INVALID_ARGUMENT);
}

TEST(ImageCreateTest, AttachedImagesNeverOwnCallerMemory) {
    std::vector<uint8_t> a(4 * 3 * 2), b(4 * 3 * 2);
    EXPECT_EQ(ZbiuCreateAttatchData(nullptr, 4, 2, 12, ZBM_PIXEL_ORDER_RGB), nullptr);
    EXPECT_EQ(ZbiuCreateAttatchData(a.data(), 4, 2, 11, ZBM_PIXEL_ORDER_RGB), nullptr);  // pitch below one row
    _zbm_Image* image = ZbiuCreateAttatchData(a.data(), 4, 2, 12, ZBM_PIXEL_ORDER_RGB);
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->ownsData, 0);
    EXPECT_EQ(ZbiuReplaceAttatchedData(image, b.data(), 2, 2, 12, ZBM_PIXEL_ORDER_RGBA), ZBIU_OK);
    EXPECT_EQ(image->pData, b.data());
    EXPECT_EQ(image->bytesPerPixel, 4);
    EXPECT_EQ(ZbiuReplaceAttatchedData(image, nullptr, 2, 2, 12, ZBM_PIXEL_ORDER_RGBA), ZBIU_ERR_INVALID_ARGUMENT);
    ZbiuDispose(&image);  // must not free the vector's storage (asan would report it)

    ZbmImagePtr owning(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB));
    EXPECT_EQ(ZbiuReplaceAttatchedData(owning.get(), a.data(), 2, 2, 6, ZBM_PIXEL_ORDER_RGB), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_NE(owning->pData, a.data());
}

// A host may hand over a bottom-up buffer: the top row at the highest address
// and a negative pitch. Access and copies must follow the pitch.
TEST(ImageCreateTest, NegativePitchSourcesReadTopRowFirst) {
    const int32_t w = 5, h = 4, pitch = 16;  // 15 bytes of pixels plus padding
    std::vector<uint8_t> buffer(pitch * h);
    for (int32_t row = 0; row < h; ++row)
        for (int32_t i = 0; i < w * 3; ++i) buffer[row * pitch + i] = static_cast<uint8_t>(10 * row + i);
    uint8_t* top = buffer.data() + (h - 1) * pitch;  // memory row h-1 is image row 0

    ZbmImagePtr view(ZbiuCreateAttatchData(top, w, h, -pitch, ZBM_PIXEL_ORDER_RGB));
    ASSERT_TRUE(view);
    EXPECT_EQ(ZbiuGetPixel(view.get(), 1, 0).v[0], 10 * (h - 1) + 3);
    EXPECT_EQ(ZbiuGetPixel(view.get(), 0, h - 1).v[0], 0);

    ZbmImagePtr copy(ZbiuCreateFromData(top, w, h, -pitch, ZBM_PIXEL_ORDER_RGB));
    ASSERT_TRUE(copy);
    EXPECT_EQ(copy->pitch, w * 3);
    EXPECT_TRUE(SameImage(copy.get(), view.get()));
    ZbmImagePtr clone(ZbiuCreateClone(view.get()));
    EXPECT_TRUE(SameImage(clone.get(), view.get()));
    ZbmImagePtr fromView(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_BGRA)), fromCopy(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_BGRA));
    ASSERT_EQ(ZbiuConvertColorSpace(view.get(), fromView.get()), ZBIU_OK);
    ASSERT_EQ(ZbiuConvertColorSpace(copy.get(), fromCopy.get()), ZBIU_OK);
    EXPECT_TRUE(SameImage(fromView.get(), fromCopy.get()));
    EXPECT_EQ(ZbiuGetPixel(fromView.get(), 1, 0).v[2], 10 * (h - 1) + 3);  // red moved to offset 2

    // Pointer writes are bounded by the rows, whichever way they run.
    ZbiuSetPixel(view.get(), ZbiuGetPointer(view.get(), 0, h - 1), Pixel(200, 201, 202));
    EXPECT_EQ(buffer[0], 200);
    ZbiuSetPixel(view.get(), buffer.data() - 1, Pixel(9, 9, 9));  // just below the bottom row: skipped
    ZbiuSetPixel(view.get(), top + w * 3 - 2, Pixel(9, 9, 9));    // pixel would run past the top row
    EXPECT_EQ(top[w * 3 - 2], 10 * (h - 1) + w * 3 - 2);
}

TEST(ImageCreateTest, SetPixelClipsToTheImage) {
    ZbmImagePtr image(ZbiuCreate(4, 3, ZBM_PIXEL_ORDER_GRAY));
    const struct {
        int32_t x, y;
        bool written;
    } cases[] = {{-1, 0, false}, {4, 0, false}, {0, -1, false}, {0, 3, false}, {0, 0, true}, {3, 2, true}};
    for (const auto& c : cases) {
        ZbiuClear(image.get());
        ZbiuSetPixel(image.get(), c.x, c.y, Pixel(255));
        EXPECT_EQ(lumicor::test::CountPixels(image.get(), Pixel(255)), c.written ? 1 : 0) << c.x << "," << c.y;
    }
    ZbiuSetPixel(nullptr, 0, 0, Pixel(1));  // no crash
    EXPECT_EQ(ZbiuGetPointer(nullptr, 0, 0), nullptr);
}

TEST(ImageCreateTest, CropKeepsInsideRectanglesOnly) {
    ZbmImagePtr image = MakeNoiseImage(10, 8, ZBM_PIXEL_ORDER_RGBA);
    const struct {
        zbm_Rect rect;
        bool ok;
    } cases[] = {
        {{0, 0, 10, 8}, true},  {{9, 7, 1, 1}, true},   {{-1, 0, 2, 2}, false}, {{0, -1, 2, 2}, false},
        {{5, 0, 6, 1}, false},  {{0, 4, 1, 5}, false},  {{2, 2, 0, 3}, false},
        {{2147483647, 0, 2, 1}, false},  // x + width overflows 32 bits
    };
    for (const auto& c : cases) {
        ZbmImagePtr crop(ZbiuCreateCrop(image.get(), c.rect));
        ASSERT_EQ(crop != nullptr, c.ok) << c.rect.x << "," << c.rect.y << " " << c.rect.width << "x" << c.rect.height;
        if (!crop) continue;
        for (int32_t y = 0; y < c.rect.height; ++y)
            for (int32_t x = 0; x < c.rect.width; ++x)
                ASSERT_EQ(std::memcmp(ZbiuGetConstPointer(crop.get(), x, y),
                                      ZbiuGetConstPointer(image.get(), c.rect.x + x, c.rect.y + y), 4),
                          0);
    }
    EXPECT_EQ(ZbiuCreateCrop(nullptr, zbm_Rect{0, 0, 1, 1}), nullptr);
}

}  // namespace
