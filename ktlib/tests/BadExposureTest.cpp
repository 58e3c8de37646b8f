// Bad-exposure score from the near-black share of the palette and the
// out-of-focus score.
#include <gtest/gtest.h>
#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

#include "ktlib/src/representative/bad_exposure.h"

namespace {

// A palette with `percent` % near-black and the rest white pixels.
_KtMetaSimilarity DarkShare(uint32_t percent) {
    _KtMetaSimilarity m = {};
    m.ncol32 = 2;
    m.colHist32[0].lab.l = 10, m.colHist32[0].lab.a = 128, m.colHist32[0].lab.b = 128;
    m.colHist32[0].count = percent;
    m.colHist32[1].lab.l = 99, m.colHist32[1].lab.a = 128, m.colHist32[1].lab.b = 128;
    m.colHist32[1].count = 100 - percent;
    return m;
}

}  // namespace

TEST(BadExposureTest, DarknessAndBlurCombine) {
    _zbm_Image image = {};
    const struct {
        uint32_t percent;
        float outOfFocus;
        float want;
    } cases[] = {
        {0, 0.0f, 0.0f},
        {100, 1.0f, 1.0f},
        {36, 0.0f, (36.0f / 37.0f * 0.5f) * (36.0f / 37.0f * 0.5f) * 0.5f},  // e = 36 / 74
        {37, 0.0f, 0.125f},                                                  // e = 0.5 exactly
        {100, 0.0f, 0.5f},
        {0, -1.0f, 0.5f},  // not measured: (e^2 + 1) / 2
        {100, -1.0f, 1.0f},
        {68, 0.5f, ((0.5f + 31.0f / 63.0f * 0.5f) * (0.5f + 31.0f / 63.0f * 0.5f) + 0.25f) * 0.5f},
    };
    for (const auto& c : cases) {
        const _KtMetaSimilarity siml = DarkShare(c.percent);
        float score = -7.0f;
        ASSERT_EQ(CalcBadExposure(&image, &siml, c.outOfFocus, &score), KT_OK);
        EXPECT_EQ(score, c.want) << c.percent << " % dark, out of focus " << c.outOfFocus;
    }
}

TEST(BadExposureTest, MissingInputsAreRefused) {
    _zbm_Image image = {};
    const _KtMetaSimilarity siml = DarkShare(50);
    float score = -7.0f;
    EXPECT_EQ(CalcBadExposure(nullptr, &siml, 0.0f, &score), KT_ERR_STATE);
    EXPECT_EQ(CalcBadExposure(&image, nullptr, 0.0f, &score), KT_ERR_STATE);
    EXPECT_EQ(CalcBadExposure(&image, &siml, 0.0f, nullptr), KT_ERR_STATE);
    EXPECT_EQ(score, -7.0f);
}
