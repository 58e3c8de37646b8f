// Finger region detection: model, tables, region acceptance and outline
// tracing.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/finger/fol_region.h"
#include "testkit/fault.h"
#include "testkit/images.h"

#include <cmath>
#include <string>
#include <vector>

using namespace FOL;

namespace {

// A likelihood table of w x h: 0.5 inside the listed rectangles, 0 elsewhere.
zbmvector<float> Table(int32_t w, int32_t h, std::initializer_list<zbm_Rect> rects) {
    zbmvector<float> t;
    t.Resize(w * h);
    for (const zbm_Rect& r : rects)
        for (int32_t y = r.y; y < r.y + r.height; ++y)
            for (int32_t x = r.x; x < r.x + r.width; ++x) t[y * w + x] = 0.5f;
    return t;
}

// Runs labelling and acceptance on a table; returns the accepted count.
int32_t Accepted(zbmvector<float>& table, int32_t w, int32_t h, zbmvector<int32_t>& labels,
                 zbmvector<RegionInfo>& regions) {
    int32_t count = 0, accepted = 0;
    EXPECT_EQ(CalcLabeledFingerTable(table, w, h, 0.1f, count, labels), KT_OK);
    EXPECT_EQ(UpdateLabeledTable(labels, count, w, h, accepted, regions), KT_OK);
    return accepted;
}

}  // namespace

TEST(FingerRegionTest, ModelInUse) {
    // Values from an independent evaluation of the model's formula.
    const struct {
        float f[4];
        float p;
    } cases[] = {{{200, 120, 90, 0}, 0.4257025f},
                 {{52, 52, 52, 3}, 0.1361822f},
                 {{50, 100, 200, 10}, -0.2713085f},
                 {{0, 0, 0, 20}, -0.1788720f},
                 {{255, 255, 255, 0}, 0.2050450f}};
    for (const auto& c : cases)
        EXPECT_NEAR(CalcFingerProbability_rc4800_RGBT_r1_step20_LINEAR_REGRESSION_GK_GEN(c.f), c.p, 2e-7f);
    EXPECT_EQ(DefaultFingerLiklihood().threshold, 0.1f);
}

TEST(FingerRegionTest, TextureAndEdgeTables) {
    // Columns alternate 0 and 200 in all channels: the texture of an inner
    // pixel is the deviation of {0, 200, 0} (x3 rows), clamped to 20.
    ZbmImagePtr img(ZbiuCreate(6, 5, ZBM_PIXEL_ORDER_RGB));
    for (int32_t y = 0; y < 5; ++y)
        for (int32_t x = 0; x < 6; ++x) ZbiuSetPixel(img.get(), x, y, lumicor::test::Pixel(x % 2 ? 200 : 0, x % 2 ? 200 : 0, x % 2 ? 200 : 0));
    zbmvector<float> texture;
    ASSERT_EQ(CalcTextureTable(img.get(), texture), KT_OK);
    EXPECT_EQ(texture[2 * 6 + 2], 20.0f);
    ZbmImagePtr flat(ZbiuCreate(6, 5, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(90, 50, 30)));
    zbmvector<float> none;
    ASSERT_EQ(CalcTextureTable(flat.get(), none), KT_OK);
    for (int32_t i = 0; i < 30; ++i) EXPECT_EQ(none[i], 0.0f);

    // A vertical step of 1 between columns 2 and 3: H = 10 + 3 + 3 beside it,
    // nothing vertical, and the outer frame stays 0.
    zbmvector<float> p = Table(6, 5, {{3, 0, 3, 5}});
    for (int32_t i = 0; i < 30; ++i) p[i] *= 2.0f;
    zbmvector<float> h, v, mag;
    ASSERT_EQ(CalcHVEdgeTable(p, 6, 5, h, v), KT_OK);
    ASSERT_EQ(CalcEdgeMagTable(p, 6, 5, mag), KT_OK);
    EXPECT_EQ(h[2 * 6 + 2], 16.0f);
    EXPECT_EQ(h[2 * 6 + 3], 16.0f);
    EXPECT_EQ(v[2 * 6 + 2], 0.0f);
    EXPECT_EQ(mag[2 * 6 + 2], 16.0f);
    EXPECT_EQ(mag[0 * 6 + 2], 0.0f);
    EXPECT_EQ(mag[2 * 6 + 5], 0.0f);
    for (auto* t : {&texture, &none, &p, &h, &v, &mag}) t->Clear();
}

TEST(FingerRegionTest, RegionAcceptance) {
    const int32_t w = 40, h = 30;
    const struct {
        const char* name;
        std::vector<zbm_Rect> rects;
        int32_t accepted;
    } cases[] = {
        {"blob entering from the left", {{0, 10, 8, 8}}, 1},
        {"corner region", {{0, 0, 9, 9}}, 1},
        {"middle of the picture", {{15, 10, 8, 8}}, 0},
        {"left to right only", {{0, 12, 40, 3}}, 0},
        {"top to bottom only", {{18, 0, 3, 30}}, 0},
        {"49 pixels", {{0, 0, 7, 7}}, 0},
        {"50 pixels", {{0, 0, 10, 5}}, 1},
        {"more than 70 % of the picture", {{0, 0, 40, 22}}, 0},
        {"all four edges", {{0, 0, 40, 1}, {0, 29, 40, 1}, {0, 0, 1, 30}, {39, 0, 1, 30}}, 0},
        // 120 pixels need trunc(sqrt(120) x 0.7071) = 7 border pixels; the
        // neck to the border is 6 wide.
        {"thin neck to the border", {{0, 10, 2, 6}, {2, 5, 12, 9}}, 0},
        {"neck just wide enough", {{0, 10, 2, 7}, {2, 5, 12, 9}}, 1},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        zbmvector<float> table;
        table.Resize(w * h);
        for (const zbm_Rect& r : c.rects)
            for (int32_t y = r.y; y < r.y + r.height; ++y)
                for (int32_t x = r.x; x < r.x + r.width; ++x) table[y * w + x] = 0.5f;
        zbmvector<int32_t> labels;
        zbmvector<RegionInfo> regions;
        EXPECT_EQ(Accepted(table, w, h, labels, regions), c.accepted);
        for (int32_t i = 0; i < w * h; ++i) ASSERT_LE(labels[i], c.accepted);
        table.Clear();
        labels.Clear();
        regions.Clear();
    }
}

TEST(FingerRegionTest, OutlineRunsFromBorderToBorderThroughTheRegion) {
    // Regions on every side: the outline starts and ends on the border, steps
    // between 8-neighbours and never leaves the region.
    const int32_t w = 30, h = 20;
    const zbm_Rect shapes[] = {{0, 5, 10, 8}, {10, 0, 8, 9}, {20, 6, 10, 7}, {8, 11, 9, 9}, {0, 0, 8, 8}};
    for (const zbm_Rect& shape : shapes) {
        zbmvector<float> table = Table(w, h, {shape});
        zbmvector<int32_t> labels;
        zbmvector<RegionInfo> regions;
        ASSERT_EQ(Accepted(table, w, h, labels, regions), 1);
        zbmvector<zbm_Pos> contour;
        ASSERT_EQ(FindContourOfRegion(labels, w, h, 1, regions[0], contour), KT_OK);
        const ImageBound bound(w, h);
        ASSERT_GE(contour.size(), 2);
        EXPECT_TRUE(bound.IsOnImageEdge(contour[0]));
        EXPECT_TRUE(bound.IsOnImageEdge(contour[contour.size() - 1]));
        for (int32_t i = 0; i < contour.size(); ++i) {
            EXPECT_EQ(labels[contour[i].y * w + contour[i].x], 1);
            if (i > 0) {
                EXPECT_TRUE(ImageBound::IsNeighbour8(contour[i - 1], contour[i]));
            }
        }
        // The outline goes round the region: it reaches the far side.
        int32_t reach = 0;
        for (int32_t i = 0; i < contour.size(); ++i)
            reach = std::max(reach, std::abs(contour[i].x - contour[0].x) + std::abs(contour[i].y - contour[0].y));
        EXPECT_GE(reach, std::min(shape.width, shape.height) - 1);
        table.Clear();
        labels.Clear();
        regions.Clear();
        contour.Clear();
    }
}

TEST(FingerRegionTest, OutlineTracedPixelByPixel) {
    // Traced by hand on a 6 x 5 picture: the border walks from the chosen
    // corners find the two crossings, the start edge sets the first search
    // direction, and the outline follows the region's inner side.
    struct Case {
        zbm_Rect region;
        std::vector<zbm_Pos> outline;
    };
    const Case cases[] = {
        // Left and bottom: corners (0, 0) and (5, 0); first search upwards.
        {{0, 2, 3, 3}, {{0, 2}, {1, 2}, {2, 2}, {2, 3}, {2, 4}}},
        // Top and right, no left: corners (0, 4) and (0, 0); first search down.
        {{3, 0, 3, 2}, {{5, 1}, {4, 1}, {3, 0}}},
        // Left and top, no right: corners (5, 0) and (5, 4); first search right.
        {{0, 0, 3, 2}, {{2, 0}, {2, 1}, {1, 1}, {0, 1}}},
        // Left, top and right: corners (5, 4) and (0, 4).
        {{0, 0, 6, 2}, {{5, 1}, {4, 1}, {3, 1}, {2, 1}, {1, 1}, {0, 1}}},
    };
    const int32_t w = 6, h = 5;
    for (const Case& c : cases) {
        const zbm_Rect& r = c.region;
        zbmvector<int32_t> labels;
        labels.Resize(w * h);
        RegionInfo info = {r.width * r.height, 0, 0, 0, 0, 1, 1};
        for (int32_t y = r.y; y < r.y + r.height; ++y) {
            for (int32_t x = r.x; x < r.x + r.width; ++x) {
                labels[y * w + x] = 1;
                info.left += x == 0;
                info.top += y == 0;
                info.right += x == w - 1;
                info.bottom += y == h - 1;
            }
        }
        zbmvector<zbm_Pos> contour;
        ASSERT_EQ(FindContourOfRegion(labels, w, h, 1, info, contour), KT_OK);
        std::string got, want;
        for (int32_t i = 0; i < contour.size(); ++i)
            got += "(" + std::to_string(contour[i].x) + "," + std::to_string(contour[i].y) + ")";
        for (const zbm_Pos& p : c.outline) want += "(" + std::to_string(p.x) + "," + std::to_string(p.y) + ")";
        EXPECT_EQ(got, want) << "region at " << r.x << "," << r.y;
        labels.Clear();
        contour.Clear();
    }
}

TEST(FingerRegionTest, BorderWalksAreInverse) {
    const ImageBound bound(7, 4);
    zbm_Pos p = {0, 0};
    for (int32_t i = 0; i < 2 * (7 + 4) - 4; ++i) {
        const zbm_Pos next = bound.NextPointOnImageEdgeClockwise(p);
        EXPECT_TRUE(bound.IsOnImageEdge(next));
        const zbm_Pos back = bound.NextPointOnImageEdgeCounterClockwise(next);
        EXPECT_TRUE(back.x == p.x && back.y == p.y) << i;
        p = next;
    }
    EXPECT_TRUE(p.x == 0 && p.y == 0);  // once round
    EXPECT_EQ(bound.NextPointOnImageEdgeClockwise(zbm_Pos{6, 0}).y, 1);
}

TEST(FingerRegionTest, DetectionKeepsEveryFourthPointAndTheLast) {
    // A skin-coloured blob on the left of a blue picture.
    ZbmImagePtr img(ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(40, 80, 200)));
    for (int32_t y = 8; y < 22; ++y)
        for (int32_t x = 0; x < 12; ++x) ZbiuSetPixel(img.get(), x, y, lumicor::test::Pixel(200, 120, 90));
    Detector detector;
    zbmvector<zbmvector<zbm_Pos>> contours;
    ASSERT_EQ(detector.DetectInitialRegions(img.get(), DefaultFingerLiklihood(), contours), KT_OK);
    ASSERT_EQ(contours.size(), 1);
    const RegionInfo& region = detector.Regions()[0];
    zbmvector<zbm_Pos> full;
    ASSERT_EQ(FindContourOfRegion(detector.LabelTable(), 40, 30, region.newLabel, region, full), KT_OK);
    const int32_t n = full.size();
    ASSERT_EQ(contours[0].size(), (n - 2 + 3) / 4 + 1);
    for (int32_t k = 0; k + 1 < contours[0].size(); ++k) {
        EXPECT_EQ(contours[0][k].x, full[4 * k].x);
        EXPECT_EQ(contours[0][k].y, full[4 * k].y);
    }
    EXPECT_EQ(contours[0][contours[0].size() - 1].y, full[n - 1].y);

    // No pixel reaches the threshold: no region at all.
    ZbmImagePtr blue(ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(40, 80, 200)));
    ASSERT_EQ(detector.DetectInitialRegions(blue.get(), DefaultFingerLiklihood(), contours), KT_OK);
    EXPECT_EQ(contours.size(), 0);
    full.Clear();
    contours.Clear();
}

TEST(FingerRegionTest, EveryFailingAllocationIsReported) {
    ZbmImagePtr img(ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(40, 80, 200)));
    for (int32_t y = 8; y < 22; ++y)
        for (int32_t x = 0; x < 12; ++x) ZbiuSetPixel(img.get(), x, y, lumicor::test::Pixel(200, 120, 90));
    zbmvector<zbmvector<zbm_Pos>> contours;
    int status = -1;
    lumicor::test::ForEachAllocationFailure(
        [&] {
            Detector detector;
            status = detector.DetectInitialRegions(img.get(), DefaultFingerLiklihood(), contours);
        },
        [&](long, bool triggered) {
            EXPECT_EQ(status, triggered ? KT_ERR_NO_MEMORY : KT_OK);
            EXPECT_EQ(contours.size(), triggered ? 0 : 1);
            contours.Clear();
        });
}
