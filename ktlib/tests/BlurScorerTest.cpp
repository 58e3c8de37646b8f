// Blur scoring: the lifting transform, energies, block maps and the scorer's
// sizes, scores and failures.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/blur/blur.h"
#include "testkit/fault.h"
#include "testkit/images.h"

#include <cmath>
#include <vector>

using blur::BlurScores;
using blur::CalcBlurScorer;

namespace {

ZbmImagePtr Flat(int32_t w, int32_t h, uint8_t value) {
    return ZbmImagePtr(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_GRAY, lumicor::test::Pixel(value)));
}

// Box-blurs a gray image with a (2r+1)^2 window, edges clamped.
ZbmImagePtr BoxBlur(const _zbm_Image* src, int32_t r) {
    ZbmImagePtr out(ZbiuCreate(src->width, src->height, ZBM_PIXEL_ORDER_GRAY));
    for (int32_t y = 0; y < src->height; ++y) {
        for (int32_t x = 0; x < src->width; ++x) {
            int32_t sum = 0, n = 0;
            for (int32_t dy = -r; dy <= r; ++dy)
                for (int32_t dx = -r; dx <= r; ++dx) {
                    const int32_t xx = std::min(std::max(x + dx, 0), src->width - 1);
                    const int32_t yy = std::min(std::max(y + dy, 0), src->height - 1);
                    sum += ZbiuGetConstPointer(src, xx, yy)[0], ++n;
                }
            ZbiuGetPointer(out.get(), x, y)[0] = static_cast<uint8_t>(sum / n);
        }
    }
    return out;
}

}  // namespace

TEST(BlurScorerTest, LiftingKillsCubicsAndPutsTheLastDetailAtTheEndOfOddRows) {
    // The 9/7 analysis has four vanishing moments: away from the borders a
    // cubic leaves no detail, so a wrong lifting constant shows at once.
    std::vector<double> x(32), scratch(32);
    for (int i = 0; i < 32; ++i) x[i] = 0.01 * i * i * i - 0.5 * i * i + 3.0 * i + 7.0;
    blur::Cohen::Transform1D(x.data(), 32, 1, scratch.data());
    // (The ten-digit constants leave about 1e-7 of a signal in the hundreds.)
    for (int i = 16 + 3; i < 32 - 3; ++i) EXPECT_NEAR(x[i], 0.0, 1e-5) << i;
    // A constant signal keeps its level: the smooth half is the input times
    // a fixed gain and the details vanish up to the constants' precision.
    std::vector<double> c(7, 10.0);
    blur::Cohen::Transform1D(c.data(), 7, 1, scratch.data());
    for (int i = 0; i < 3; ++i) EXPECT_NEAR(c[i], c[0], 1e-6);
    for (int i = 3; i < 6; ++i) EXPECT_NEAR(c[i], 0.0, 1e-3);
    EXPECT_EQ(c[6], c[5]);  // odd length: the last detail is written twice
    std::vector<double> one(1, 5.0);
    blur::Cohen::Transform1D(one.data(), 1, 1, scratch.data());
    EXPECT_EQ(one[0], 5.0);
}

TEST(BlurScorerTest, TwoLevelsAreRowsThenColumnsOfEachRegion) {
    ZbmImagePtr gray = lumicor::test::MakeNoiseImage(37, 29, ZBM_PIXEL_ORDER_GRAY, 8);
    std::vector<double> expected(37 * 29), line(37), scratch(37);
    for (int32_t i = 0; i < 37 * 29; ++i) expected[i] = gray->pData[i];
    int32_t w = 37, h = 29;
    for (int level = 0; level < 2; ++level, w /= 2, h /= 2) {
        for (int32_t y = 0; y < h; ++y) blur::Cohen::Transform1D(&expected[y * 37], w, 1, scratch.data());
        for (int32_t x = 0; x < w; ++x) blur::Cohen::Transform1D(&expected[x], h, 37, scratch.data());
    }
    blur::Cohen cohen;
    ASSERT_EQ(cohen.Initialize(gray->pData, 37, 29), KT_OK);
    EXPECT_EQ(cohen.Levels(), 4);
    ASSERT_EQ(cohen.ForwardTransform(2), KT_OK);
    for (int32_t i = 0; i < 37 * 29; ++i) ASSERT_EQ(cohen.Data()[i], expected[i]) << i;
}

TEST(BlurScorerTest, SubbandBlockMapDividesByTheNumberOfCells) {
    std::vector<double> ones(12 * 12, 1.0);
    blur::Subband subband(blur::kDirectionDiagonal);
    ASSERT_EQ(subband.SetData(ones.data(), 12, 12, 12), KT_OK);
    const blur::EnergyMap* map = nullptr;
    ASSERT_EQ(subband.CalcBlockEnergyMap(8, 0.5, map), KT_OK);
    ASSERT_EQ(map->Width(), 2);  // (12 - 4) / 4
    ASSERT_EQ(map->Height(), 2);
    for (int32_t i = 0; i < 4; ++i) EXPECT_DOUBLE_EQ(map->Values()[i], std::log(64.0 / 4.0 + 1.0));
    double e = 0.0;
    subband.CalcLogEnergy(e);
    EXPECT_DOUBLE_EQ(e, std::log(2.0));
}

TEST(BlurScorerTest, FlatImageScoresAndZeroMap) {
    struct Case {
        uint8_t level;
        double tolerance;  // a non-zero level leaves rounding-sized details
    } cases[] = {{0, 0.0}, {128, 1e-4}};
    for (const Case& c : cases) {
        ZbmImagePtr gray = Flat(640, 480, c.level);
        _zbm_Image* map = nullptr;
        BlurScores scores;
        ASSERT_EQ(CalcBlurScorer(gray.get(), &map, &scores), KT_OK);
        ZbmImagePtr owned(map);
        EXPECT_NEAR(scores.cameraShake, 1.0 / (1.0 + std::exp(-14.2742 / 8.0)), c.tolerance + 1e-12);
        EXPECT_NEAR(scores.outOfFocus, 1.0 / (1.0 + std::exp(-1.0504)), c.tolerance + 1e-12);
        EXPECT_NEAR(scores.cameraShake, 0.8562, 1e-4);
        EXPECT_NEAR(scores.outOfFocus, 0.7409, 1e-4);
        ASSERT_TRUE(map);
        EXPECT_EQ(map->width, 79);
        EXPECT_EQ(map->height, 59);
        EXPECT_EQ(lumicor::test::CountPixels(map, lumicor::test::Pixel(0)), 79 * 59);
    }
}

TEST(BlurScorerTest, SmallestMeasuredSize) {
    struct Case {
        int32_t w, h;
        bool measured;
    } cases[] = {{24, 24, true}, {23, 100, false}, {100, 23, false}, {24, 200, true}};
    for (const Case& c : cases) {
        ZbmImagePtr gray = lumicor::test::MakeNoiseImage(c.w, c.h, ZBM_PIXEL_ORDER_GRAY, 3);
        _zbm_Image* map = nullptr;
        BlurScores scores;
        ASSERT_EQ(CalcBlurScorer(gray.get(), &map, &scores), KT_OK);
        ZbmImagePtr owned(map);
        SCOPED_TRACE(c.w * 1000 + c.h);
        EXPECT_EQ(map != nullptr, c.measured);
        if (c.measured) {
            EXPECT_GT(scores.outOfFocus, 0.0);
            EXPECT_LT(scores.outOfFocus, 1.0);
            EXPECT_GT(scores.cameraShake, 0.0);
            EXPECT_LT(scores.cameraShake, 1.0);
        } else {
            EXPECT_EQ(scores.outOfFocus, -1.0);
            EXPECT_EQ(scores.cameraShake, -1.0);
        }
    }
}

TEST(BlurScorerTest, BlurRaisesBothScoresAndDarkensTheMap) {
    ZbmImagePtr sharp = lumicor::test::MakeNoiseImage(640, 480, ZBM_PIXEL_ORDER_GRAY, 9);
    ZbmImagePtr soft = BoxBlur(sharp.get(), 3);
    _zbm_Image* sharpMap = nullptr;
    _zbm_Image* softMap = nullptr;
    BlurScores a, b;
    ASSERT_EQ(CalcBlurScorer(sharp.get(), &sharpMap, &a), KT_OK);
    ASSERT_EQ(CalcBlurScorer(soft.get(), &softMap, &b), KT_OK);
    ZbmImagePtr ownedA(sharpMap), ownedB(softMap);
    EXPECT_LT(a.outOfFocus, b.outOfFocus);
    EXPECT_LT(a.cameraShake, b.cameraShake);
    zbm_PackedFloat meanA, meanB;
    ZbiuCalcAverage(sharpMap, &meanA);
    ZbiuCalcAverage(softMap, &meanB);
    EXPECT_GT(meanA.v[0], meanB.v[0]);
}

TEST(BlurScorerTest, TopEnergyOfSmallMapsTakesTheLargestCell) {
    // A 32 x 24 image gives a 3 x 2 map: 5 % of 6 cells is no cell at all.
    ZbmImagePtr gray = lumicor::test::MakeNoiseImage(32, 24, ZBM_PIXEL_ORDER_GRAY, 5);
    blur::Cohen cohen;
    ASSERT_EQ(cohen.Initialize(gray->pData, 32, 24), KT_OK);
    ASSERT_EQ(cohen.ForwardTransform(3), KT_OK);
    blur::Coefficient coefficient;
    ASSERT_EQ(cohen.GetCoefficient(3, coefficient), KT_OK);
    ASSERT_EQ(coefficient.CalcBlockEnergyMap(3, 0.5f), KT_OK);
    const blur::EnergyMap& map = coefficient.GetEnergyMap();
    ASSERT_EQ(map.Count(), 6);
    double top = 0.0, largest = 0.0;
    ASSERT_EQ(coefficient.CalcBlockEnergy(5, top), KT_OK);
    for (int32_t i = 0; i < map.Count(); ++i) largest = std::max(largest, map.Values()[i]);
    EXPECT_DOUBLE_EQ(top, largest);
    EXPECT_EQ(cohen.GetCoefficient(cohen.Levels(), coefficient), KT_ERR_STATE);  // past the highest usable level
}

TEST(BlurScorerTest, RefusedArguments) {
    ZbmImagePtr gray = Flat(64, 64, 10);
    BlurScores scores;
    _zbm_Image* map = nullptr;
    _zbm_Image noPixels = *gray;
    noPixels.pData = nullptr;
    EXPECT_EQ(CalcBlurScorer(&noPixels, &map, &scores), KT_ERR_NO_PIXELS);
    EXPECT_EQ(map, nullptr);
    _zbm_Image* set = gray.get();
    EXPECT_EQ(CalcBlurScorer(gray.get(), &set, &scores), KT_ERR_STATE);
    EXPECT_EQ(CalcBlurScorer(nullptr, &map, &scores), KT_ERR_NULL);
    ZbmImagePtr rgb(ZbiuCreate(64, 64, ZBM_PIXEL_ORDER_RGB));
    EXPECT_EQ(CalcBlurScorer(rgb.get(), &map, &scores), KT_ERR_STATE);
    EXPECT_EQ(map, nullptr);
}

TEST(BlurScorerTest, EveryFailingAllocationIsReported) {
    ZbmImagePtr gray = lumicor::test::MakeNoiseImage(96, 64, ZBM_PIXEL_ORDER_GRAY, 2);
    _zbm_Image* map = nullptr;
    BlurScores scores;
    int status = -1;
    const long n = lumicor::test::ForEachAllocationFailure(
        [&] { status = CalcBlurScorer(gray.get(), &map, &scores); },
        [&](long, bool triggered) {
            if (triggered) {
                EXPECT_EQ(status, KT_ERR_NO_MEMORY);
                EXPECT_EQ(map, nullptr);
            } else {
                EXPECT_EQ(status, KT_OK);
                EXPECT_NE(map, nullptr);
            }
        });
    EXPECT_GT(n, 10);
    ZbiuDispose(&map);
}
