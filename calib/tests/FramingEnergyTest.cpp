// The attention summary (importance, order, main area, merged box, subject
// factors), the term weights and the four energy terms.
#include <gtest/gtest.h>

#include <array>
#include <cfloat>
#include <cmath>

#include <lumicor/calib.h>

#include "calib/src/framing/framing_energy.h"
#include "calib/src/framing/framing_search.h"
#include "calib/src/framing/va_marge.h"
#include "calib/tests/framing_fixtures.h"

namespace {

using framing_test::DefaultParam;

struct Rect {
    int x, y, w, h, value;
};

// A summary of the given grid areas on a gw x gh grid, as CASearchFraming builds it.
void Summarise(VAMarge* va, int gw, int gh, std::initializer_list<Rect> rects,
               unsigned forceMain = 0xFFFFFFFFu) {
    va->num = 0;
    for (const Rect& r : rects) {
        const int i = va->num++;
        va->x[i] = r.x;
        va->y[i] = r.y;
        va->width[i] = r.w;
        va->height[i] = r.h;
        va->val[i] = r.value;
    }
    va->ReAdjust(gw, gh, forceMain);
    va->Marge(gw, gh);
}

std::array<int, 5> Box(const VAMarge& va) {
    return {va.mergeLeft, va.mergeTop, va.mergeRight, va.mergeBottom, va.mergeArea};
}

CropRegion Crop(int l, int t, int w, int h) {
    CropRegion c = {};
    c.left = l;
    c.top = t;
    c.width = w;
    c.height = h;
    c.energy = 100.0;
    return c;
}

TEST(FramingEnergyTest, ImportanceOrdersAreasStablyAndForcedMainCounts) {
    const _CAParam p = DefaultParam();
    VAMarge va(&p);
    // Grid 40 x 30: reach 0.35 * 50 = 17.5 cells, size unit 1200 / 64 = 18.75.
    // A centred area of 8 x 8 has every factor 1; a far corner area gets the
    // position floor 0.1; two half-value areas 5 cells either side of the
    // centre tie; a centred 2 x 2 area gets its size share.
    Summarise(&va, 40, 30,
              {{0, 0, 8, 8, 255}, {10, 10, 10, 10, 128}, {19, 14, 2, 2, 255}, {20, 10, 10, 10, 128},
               {16, 11, 8, 8, 255}});
    const float tie = (128.0f / 255.0f) * (12.5f / 17.5f);
    EXPECT_FLOAT_EQ(va.importance[0], 1.0f);
    EXPECT_EQ(va.x[0], 16);
    EXPECT_FLOAT_EQ(va.importance[1], tie);
    EXPECT_FLOAT_EQ(va.importance[2], tie);
    EXPECT_EQ(va.x[1], 10);  // equal importances keep their order
    EXPECT_EQ(va.x[2], 20);
    EXPECT_FLOAT_EQ(va.importance[3], 4.0f / 18.75f);
    EXPECT_NEAR(va.importance[4], 0.1f, 1e-7f);
    EXPECT_EQ(va.mainIndex, 0);

    // A forced main area is an index into that order and is raised to present.
    VAMarge forced(&p);
    Summarise(&forced, 40, 30, {{10, 10, 10, 10, 255}, {0, 0, 0, 5, 255}}, 1);
    EXPECT_EQ(forced.mainIndex, 1);
    EXPECT_FLOAT_EQ(forced.importance[1], VAMarge::kImportanceFloor);
    EXPECT_TRUE(forced.IsPresent(1));
}

TEST(FramingEnergyTest, MergedBoxFollowsTheCompositionMode) {
    _CAParam p = DefaultParam();
    const std::initializer_list<Rect> rects = {{14, 10, 10, 10, 255}, {26, 12, 6, 6, 255},
                                               {0, 0, 1, 1, 0}};
    VAMarge all(&p);  // every present area
    Summarise(&all, 40, 30, rects);
    EXPECT_EQ(Box(all), (std::array<int, 5>{14, 10, 32, 20, 180}));
    EXPECT_FLOAT_EQ(all.aspect[2], 18.0f / 10.0f);  // absent area: the box's aspect

    p.composition_mode = 0;  // the main area alone
    VAMarge single(&p);
    Summarise(&single, 40, 30, rects);
    EXPECT_EQ(single.mergeArea, 100);

    p.composition_mode = 1;  // main and second; an absent second counts as (0,0,0,0)
    VAMarge two(&p);
    Summarise(&two, 40, 30, {{14, 10, 10, 10, 255}, {26, 12, 6, 6, 0}});
    EXPECT_EQ(Box(two), (std::array<int, 5>{0, 0, 24, 20, 480}));

    p.composition_mode = 4;  // no present area: the untouched start box spans the grid
    VAMarge none(&p);
    Summarise(&none, 40, 30, {{14, 10, 10, 10, 0}});
    EXPECT_EQ(none.mergeArea, 1200);
    EXPECT_FLOAT_EQ(none.subjectRatio, 1.0f);
}

TEST(FramingEnergyTest, SubjectFactorsAndShapeFactorAtTheLimits) {
    const _CAParam p = DefaultParam();
    struct {
        int w, h;
        float shape;
    } const shapes[] = {{30, 10, 0.0f},  // aspect exactly 3.0
                        {29, 10, 1.0f},  {31, 10, 1.0f - 0.1f / 0.33f}, {34, 10, 0.0f},
                        {10, 30, 1.0f},  {3, 10, 0.3f / 0.33f}};
    for (const auto& s : shapes) {
        VAMarge va(&p);
        Summarise(&va, 40, 40, {{2, 2, s.w, s.h, 255}});
        EXPECT_NEAR(va.shapeFactor, s.shape, 1e-6f) << s.w << "x" << s.h;
    }
    struct {
        int w, h;
        float small, size;
    } const sizes[] = {{2, 3, 1.0f, (6.0f / 1200.0f) / 0.015625f},
                       {10, 7, 1.0f, 1.0f},
                       {20, 15, (0.5f - 0.25f) / 0.4375f, 1.0f},
                       {30, 20, 0.0f, 1.0f}};
    for (const auto& s : sizes) {
        VAMarge va(&p);
        Summarise(&va, 40, 30, {{5, 5, s.w, s.h, 255}}, 0);
        EXPECT_NEAR(va.smallSubjectFactor, s.small, 1e-6f) << s.w << "x" << s.h;
        EXPECT_NEAR(va.sizeFactor, s.size, 1e-6f) << s.w << "x" << s.h;
    }
}

TEST(FramingEnergyTest, ZeroHeightAreaHasADefinedAspect) {
    EXPECT_EQ(VAMarge::AspectOf(5, 0), FLT_MAX);
    EXPECT_EQ(VAMarge::AspectOf(-5, 0), -FLT_MAX);
    EXPECT_EQ(VAMarge::AspectOf(0, 0), 0.0f);
    const _CAParam p = DefaultParam();
    VAMarge va(&p);
    Summarise(&va, 40, 30, {{10, 10, 8, 0, 255}}, 0);  // forced present although flat
    EXPECT_EQ(va.shapeFactor, 0.0f);
    EXPECT_FALSE(std::isnan(va.aspect[0]));
    // Likewise a crop without extent earns no composition or consistency.
    const FramingSearch fs(4000, 3000, 40, 30);
    const CropRegion empty = Crop(5, 5, 0, 0);
    EXPECT_EQ(CA::CalcCompEnergy(&fs, &va, &empty), 0.0f);
    EXPECT_EQ(CA::CalcConsEnergy(&fs, &va, &empty), 0.0f);
}

TEST(FramingEnergyTest, WeightsFollowTheSubjectRatio) {
    struct {
        float ratio, wmin, consistency, composition;
    } const rows[] = {{0.01f, 0.1f, 0.1f, 1.9f},  {0.0625f, 0.1f, 0.1f, 1.9f},
                      {0.5f, 0.1f, 1.0f, 1.0f},   {0.9f, 0.1f, 1.0f, 1.0f},
                      {0.28125f, 0.1f, 0.55f, 1.45f}, {0.0f, 1.5f, 1.0f, 1.0f}};
    const _CAParam p = DefaultParam();
    for (const auto& r : rows) {
        VAMarge va(&p);
        va.subjectRatio = r.ratio;
        ObjectFunction of(r.wmin);
        CA::SetFuncCoef(&of, &va);
        EXPECT_FLOAT_EQ(of.consistencyWeight, r.consistency) << r.ratio;
        EXPECT_FLOAT_EQ(of.compositionWeight, r.composition) << r.ratio;
        EXPECT_EQ(of.insideWeight, 1.0f);
        EXPECT_EQ(of.mainCutWeight, 1.0f);
    }
}

TEST(FramingEnergyTest, OverlapIgnoresATallRectangleAcrossOneSideEdge) {
    const CropRegion crop = Crop(10, 10, 10, 10);  // [10,20) x [10,20)
    struct {
        int l, t, r, b, overlap;
    } const rows[] = {
        {15, 5, 25, 25, 0},    // taller, crosses only the right edge
        {5, 5, 15, 25, 0},     // taller, crosses only the left edge
        {5, 5, 25, 25, 100},   // covers both edges
        {15, 10, 25, 25, 50},  // not strictly above the crop
        {15, 12, 25, 18, 30},  // inside vertically
        {30, 0, 40, 40, 0},    // beside
    };
    for (const auto& r : rows) {
        EXPECT_EQ(CA::Overlap(&crop, r.l, r.t, r.r, r.b), r.overlap) << r.l << "," << r.t;
    }
}

TEST(FramingEnergyTest, MainCutCountsTheWholeMainWhenItCrossesOneEdge) {
    _CAParam p = DefaultParam();
    p.composition_mode = 0;
    VAMarge va(&p);
    FramingSearch fs(4000, 3000, 40, 30);
    Summarise(&va, 40, 30, {{15, 5, 10, 20, 255}});  // taller than the crop below
    ASSERT_GT(va.smallSubjectFactor, 0.0f);
    const CropRegion crossing = Crop(10, 10, 10, 10);
    // Overlap 0: the cut is the whole main area, P = 1.
    EXPECT_FLOAT_EQ(CA::CalcPenMCEnergy(&fs, &va, &crossing), va.smallSubjectFactor);

    // Box ratio 200 / 400 = 0.5 with the main area inside: no penalty.
    const CropRegion around = Crop(10, 5, 20, 20);
    EXPECT_EQ(CA::CalcPenMCEnergy(&fs, &va, &around), 0.0f);

    // A subject over half the grid: small-subject factor 0, so never a penalty.
    VAMarge big(&p);
    Summarise(&big, 40, 30, {{0, 0, 30, 25, 255}});
    EXPECT_EQ(big.smallSubjectFactor, 0.0f);
    EXPECT_EQ(CA::CalcPenMCEnergy(&fs, &big, &crossing), 0.0f);
}

TEST(FramingEnergyTest, EveryAreaIsAPointOnARealPhoto) {
    // A wide area is a horizontal line only when it spans a quarter of the
    // photo's pixels, which grid cells never do for a photo of 240 or more.
    _CAParam p = DefaultParam();
    p.composition_mode = 0;
    VAMarge va(&p);
    Summarise(&va, 40, 30, {{4, 12, 32, 4, 255}});  // aspect 8
    const CropRegion crop = Crop(0, 0, 30, 30);
    FramingSearch photo(4000, 3000, 40, 30);
    FramingSearch tiny(40, 30, 40, 30);  // pixels = cells: the area is a line here
    const float asPoint = CA::CalcCompEnergy(&photo, &va, &crop);
    const float asLine = CA::CalcCompEnergy(&tiny, &va, &crop);
    // Anchor (20,14); nearest power point (20,10) at distance 4 of a 42.43 diagonal.
    const float diag = std::sqrt(1800.0f);
    EXPECT_NEAR(asPoint, std::exp(-8.0f / diag), 1e-6f);
    // Line: nearer horizontal third line y = 10 at 4, plus the mean distance
    // to its power points (10,10) and (20,10): (10.77 + 4) / 2.
    const float lh = 4.0f + (std::sqrt(116.0f) + 4.0f) / 2.0f;
    EXPECT_NEAR(asLine, std::exp(-2.0f * lh / diag), 1e-6f);
}

}  // namespace
