// VAArrange: face enlargement, scaling to the reference image, growth along
// colour edges, merging, ordering and clipping.
#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include "calib/src/CALib/ca_interface.h"
#include "calib/src/arrange/va_arrange.h"

namespace {

void SetSlot(VA& va, int i, int x, int y, int w, int h, int val, bool face = false) {
    va.x[i] = x;
    va.y[i] = y;
    va.width[i] = w;
    va.height[i] = h;
    va.val[i] = val;
    va.isFace[i] = face ? 1 : 0;
}

ZbmImagePtr Flat(int w, int h, uint8_t r, uint8_t g, uint8_t b) {
    return ZbmImagePtr(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_RGB, zbm_PackedUchar{{r, g, b, 0}}));
}

TEST(VAArrangeTest, FacesGrowByHalfAndTheOutsideQuarterIsCut) {
    VAArrange va;
    SetSlot(va, 0, 0, 100, 100, 80, 255, true);
    SetSlot(va, 1, 560, 440, 80, 40, 255, true);
    ZbmImagePtr map(ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_GRAY));
    ZbmImagePtr ref = Flat(640, 480, 10, 10, 10);  // same size: scale 1
    va.AdjustVa(ref.get(), map.get());
    EXPECT_EQ(va.num, 2);
    EXPECT_EQ(va.x[0], 0);
    EXPECT_EQ(va.width[0], 125);
    EXPECT_EQ(va.y[0], 80);
    EXPECT_EQ(va.height[0], 120);
    EXPECT_EQ(va.x[1], 540);
    EXPECT_EQ(va.width[1], 100);  // 120 wide, cut at the right edge
    EXPECT_EQ(va.height[1], 50);  // 60 high, cut at the bottom
}

TEST(VAArrangeTest, ScalesRoundingToTheReference) {
    VAArrange va;
    SetSlot(va, 0, 3, 5, 7, 9, 200);
    SetSlot(va, 1, 0, 0, 0, 4, 200);  // empty: not counted
    SetSlot(va, 2, 1, 1, 2, 2, 0);    // val 0: not counted
    ZbmImagePtr map(ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_GRAY));
    ZbmImagePtr ref = Flat(13, 40, 10, 10, 10);
    va.AdjustVa(ref.get(), map.get());
    EXPECT_EQ(va.num, 1);
    EXPECT_FLOAT_EQ(va.scaleX, 13.0f / 40.0f);
    EXPECT_EQ(va.x[0], 1);       // 0.975 + 0.5
    EXPECT_EQ(va.y[0], 7);       // 6.67 + 0.5
    EXPECT_EQ(va.width[0], 2);   // 2.275 + 0.5
    EXPECT_EQ(va.height[0], 12);
}

TEST(VAArrangeTest, AlikeConcentricRectanglesMergeIntoTheirUnion) {
    VAArrange va;
    SetSlot(va, 0, 10, 10, 4, 4, 200);
    SetSlot(va, 1, 9, 9, 6, 6, 100);
    // Hue 0; neither the saturation (102) nor the red (150) reaches 180, so no growth.
    ZbmImagePtr ref = Flat(40, 30, 150, 90, 90);
    va.num = 2;
    ASSERT_EQ(va.RectCombine(ref.get()), 0u);
    EXPECT_EQ(va.val[0], 0);
    EXPECT_EQ(va.val[1], (200 * 16 + 100 * 36) / 52);
    va.ReAdjustVa(ref.get());
    EXPECT_EQ(va.num, 1);
    EXPECT_EQ(va.x[0], 9);
    EXPECT_EQ(va.width[0], 6);
    EXPECT_EQ(va.val[0], 130);
}

TEST(VAArrangeTest, CloseRectanglesOfDifferentHueStaySeparate) {
    // Columns 0..11 hue 0, columns 12.. hue 120; both too pale to grow.
    ZbmImagePtr ref = Flat(40, 30, 150, 90, 90);
    for (int y = 0; y < 30; ++y)
        for (int x = 12; x < 40; ++x) ZbiuSetPixel(ref.get(), x, y, zbm_PackedUchar{{90, 150, 90, 0}});
    // Centres 4 apart, half the larger diagonal 4.47: close enough.
    VAArrange va;
    SetSlot(va, 0, 6, 10, 8, 4, 200);   // six columns of hue 0
    SetSlot(va, 1, 10, 10, 8, 4, 100);  // six columns of hue 120
    va.num = 2;
    ASSERT_EQ(va.RectCombine(ref.get()), 0u);
    EXPECT_EQ(va.val[0], 200);
    EXPECT_EQ(va.val[1], 100);
    // The same pair on one hue merges.
    ZbmImagePtr one = Flat(40, 30, 150, 90, 90);
    ASSERT_EQ(va.RectCombine(one.get()), 0u);
    EXPECT_EQ(va.val[0], 0);
    EXPECT_EQ(va.val[1], 150);
}

TEST(VAArrangeTest, GrowthFollowsSaturatedPixelsOfTheSameHueButNeverIntoRowOrColumnZero) {
    // A saturated green field: every examined pixel passes, so the slot grows
    // until the examined row or column would be 0.
    ZbmImagePtr ref = Flat(20, 16, 20, 230, 20);
    VAArrange va;
    SetSlot(va, 0, 6, 5, 4, 4, 150);
    va.num = 1;
    ASSERT_EQ(va.RectCombine(ref.get()), 0u);
    EXPECT_EQ(va.y[0], 0);  // grew up to the top row (row 1 was the last examined)
    EXPECT_EQ(va.x[0], 0);
    EXPECT_EQ(va.x[0] + va.width[0], 20);
    EXPECT_EQ(va.y[0] + va.height[0], 16);
    // A gray field never passes the saturation criterion.
    ZbmImagePtr gray = Flat(20, 16, 100, 100, 100);
    SetSlot(va, 0, 6, 5, 4, 4, 150);
    ASSERT_EQ(va.RectCombine(gray.get()), 0u);
    EXPECT_EQ(va.x[0], 6);
    EXPECT_EQ(va.width[0], 4);
}

TEST(VAArrangeTest, SortsByValueStablyAndClips) {
    VAArrange va;
    SetSlot(va, 0, 1, 1, 50, 50, 10);
    SetSlot(va, 1, 2, 2, 2, 2, 0);
    SetSlot(va, 2, 3, 3, 3, 3, 90);
    SetSlot(va, 3, 4, 4, 4, 4, 90);
    ZbmImagePtr ref = Flat(40, 30, 1, 2, 3);
    va.ReAdjustVa(ref.get());
    EXPECT_EQ(va.num, 3);
    EXPECT_EQ(va.x[0], 3);  // equal values keep their order
    EXPECT_EQ(va.x[1], 4);
    EXPECT_EQ(va.x[2], 1);
    EXPECT_EQ(va.width[2], 39);
    EXPECT_EQ(va.height[2], 29);
    EXPECT_EQ(va.val[3], 0);  // the empty slot sorts behind
}

}  // namespace

namespace {

TEST(VAArrangeTest, FaceListsAreNeverGrownOrMerged) {
    CAinterface ca;
    ca.saliencyMap = ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_GRAY);
    ZbmImagePtr field = Flat(40, 30, 20, 230, 20);  // would grow any salient slot
    VAArrange va;
    SetSlot(va, 0, 10, 10, 4, 4, 255, true);
    SetSlot(va, 1, 11, 11, 4, 4, 255, true);
    ASSERT_EQ(ca.ArrangeVa(field.get(), &va), 0u);
    EXPECT_EQ(va.num, 2);
    EXPECT_EQ(va.x[0], 9);  // only the enlargement by half
    EXPECT_EQ(va.width[0], 6);
    EXPECT_EQ(va.val[1], 255);
}

}  // namespace
