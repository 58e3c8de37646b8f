// Finger-on-lens detection: border closing, areas, merging, outline
// patterns, the score mapping, snakes and the whole detection.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/finger/fol.h"
#include "testkit/fault.h"
#include "testkit/images.h"

#include <cmath>
#include <string>
#include <vector>

using namespace FOL;

namespace {

zbmvector<zbm_Pos> Points(std::initializer_list<zbm_Pos> list) {
    zbmvector<zbm_Pos> v;
    for (const zbm_Pos& p : list) v.PushBack(p);
    return v;
}

std::string Str(const zbmvector<zbm_Pos>& v, int32_t from) {
    std::string s;
    for (int32_t i = from; i < v.size(); ++i) s += "(" + std::to_string(v[i].x) + "," + std::to_string(v[i].y) + ")";
    return s;
}

Finger Square(float x0, float y0, float x1, float y1, float score) {
    Finger f = {};
    const FingerPoint pts[4] = {{x0, y0}, {x1, y0}, {x1, y1}, {x0, y1}};
    for (const FingerPoint& p : pts) f.points.PushBack(p);
    f.score = score;
    return f;
}

// A finger on the lens at 80 x 60: a large, strongly defocused, softly
// shaded skin-coloured blob entering from the left over a textured
// background, its edge fading over a sixth of the picture height.
ZbmImagePtr FingerPhoto(int32_t w, int32_t h) {
    ZbmImagePtr img = lumicor::test::MakeNoiseImage(w, h, ZBM_PIXEL_ORDER_RGB, 7);
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            uint8_t* p = ZbiuGetPointer(img.get(), x, y);
            p[0] = static_cast<uint8_t>(40 + p[0] / 3);
            p[1] = static_cast<uint8_t>(70 + p[1] / 3);
            p[2] = static_cast<uint8_t>(90 + p[2] / 3);
            const float dy = (y - h * 0.5f) / (h * 0.35f), dx = x / (w * 0.4f);
            const float r = std::sqrt(dy * dy + dx * dx);
            const float soft = 0.45f;
            float a = (1.0f + soft - r) / (2.0f * soft);
            a = a < 0.0f ? 0.0f : (a > 1.0f ? 1.0f : a);
            a = a * a * (3.0f - 2.0f * a);
            const float shade = 1.0f - 0.2f * r * r;
            const float skin[3] = {225 * shade, 130 * shade, 95 * shade};
            for (int c = 0; c < 3; ++c) p[c] = static_cast<uint8_t>(a * skin[c] + (1 - a) * p[c]);
        }
    }
    return img;
}

}  // namespace

TEST(FingerOnLensTest, CornersCloseTheOutlineClockwiseAlongTheBorder) {
    const int32_t w = 10, h = 8;
    const zbm_Pos left = {0, 4}, top = {5, 0}, right = {9, 3}, bottom = {6, 7};
    const struct {
        zbm_Pos first, last;
        const char* corners;
    } cases[] = {
        {left, top, "(9,0)(9,7)(0,7)"},    {left, right, "(9,7)(0,7)"},       {left, bottom, "(0,7)"},
        {top, left, "(0,0)"},              {top, right, "(9,7)(0,7)(0,0)"},   {top, bottom, "(0,7)(0,0)"},
        {right, top, "(9,0)"},             {right, bottom, "(0,7)(0,0)(9,0)"}, {right, left, "(0,0)(9,0)"},
        {bottom, left, "(0,0)(9,0)(9,7)"}, {bottom, top, "(9,0)(9,7)"},       {bottom, right, "(9,7)"},
        {left, zbm_Pos{0, 1}, ""},         {zbm_Pos{0, 0}, top, ""},  // same edge: the top-left corner is on both
    };
    for (const auto& c : cases) {
        zbmvector<zbm_Pos> pts = Points({c.first, zbm_Pos{4, 4}, c.last});
        ASSERT_EQ(AppendCornerPointsOnEdge(w, h, pts), KT_OK);
        EXPECT_EQ(Str(pts, 3), c.corners) << Str(pts, 0);
        pts.Clear();
    }
}

TEST(FingerOnLensTest, AreaOfAClockwiseOutlineIsPositive) {
    zbmvector<zbm_Pos> square = Points({{0, 0}, {4, 0}, {4, 3}, {0, 3}});
    EXPECT_EQ(CalcSurroundedArea(square), 12.0f);
    zbmvector<zbm_Pos> reverse = Points({{0, 3}, {4, 3}, {4, 0}, {0, 0}});
    EXPECT_EQ(CalcSurroundedArea(reverse), -12.0f);
    square.Clear();
    reverse.Clear();
}

TEST(FingerOnLensTest, OverlapDecidesWhetherTwoOutlinesAreOneFinger) {
    Finger big = Square(0.0f, 0.0f, 0.9f, 0.9f, 0.7f);
    Finger inside = Square(0.1f, 0.1f, 0.4f, 0.4f, 0.8f);  // half of it (all) inside big
    Finger apart = Square(0.0f, 0.0f, 0.3f, 0.3f, 0.9f);
    Finger far = Square(0.6f, 0.6f, 0.95f, 0.95f, 0.9f);
    EXPECT_EQ(CalcFingerAcceptance(big, inside), 1);  // the better score replaces
    EXPECT_EQ(CalcFingerAcceptance(inside, big), 0);
    Finger twin = Square(0.0f, 0.0f, 0.9f, 0.9f, 0.7f);
    EXPECT_EQ(CalcFingerAcceptance(big, twin), 0);  // equal scores: the earlier one stays
    EXPECT_EQ(CalcFingerAcceptance(apart, far), 2);
    for (Finger* f : {&big, &inside, &apart, &far, &twin}) f->Clear();
}

TEST(FingerOnLensTest, OutlinePatternsBySector) {
    const double d = 3.14159265358979 / 180.0;
    const struct {
        double degrees;
        int32_t pattern;
    } cases[] = {{180, 4}, {-180, 4}, {157.6, 4}, {-157.4, 0}, {-120, 0}, {-112.4, 6}, {-90, 6}, {-45, 2},
                 {-22.4, 5}, {0, 5}, {22.6, 3}, {45, 3}, {90, 7}, {112.6, 1}, {135, 1}};
    for (const auto& c : cases) EXPECT_EQ(FingerPatternOfAngle(c.degrees * d), c.pattern) << c.degrees;
}

TEST(FingerOnLensTest, MeanPatchScoreToFingerScore) {
    EXPECT_FLOAT_EQ(FingerScoreOfMean(0.4175f), 0.6f);
    EXPECT_EQ(FingerScoreOfMean(2.5f), 1.0f);
    EXPECT_EQ(FingerScoreOfMean(40.0f), 1.0f);
    EXPECT_EQ(FingerScoreOfMean(-1.0f), 0.0f);
    EXPECT_EQ(FingerScoreOfMean(0.0f), 0.0f);
    EXPECT_FLOAT_EQ(FingerScoreOfMean(1.0f), (0.4f - 0.167f) * 0.4f / 0.833f + 0.6f);
}

TEST(FingerOnLensTest, SnakesCutDetoursAndKeepTheEndsOnTheBorder) {
    // Out and back along the same column, then on: the detour is cut.
    zbmvector<zbm_Pos> pts = Points({{0, 5}, {4, 5}, {8, 5}, {4, 5}, {0, 6}, {4, 9}});
    Snakes snakes(20, 12, [](const Snakes&, int32_t, zbm_Pos, const void*) { return 0.0f; }, nullptr);
    ASSERT_EQ(snakes.SetPoints(pts), KT_OK);
    snakes.Truncate(4, 5.0f);
    ASSERT_LT(snakes.Size(), 6);
    EXPECT_EQ(snakes.Point(0).x, 0);

    // The detector's error: ends that leave the border cost the largest float,
    // so optimisation keeps them there.
    ZbmImagePtr img(ZbiuCreate(40, 30, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(40, 80, 200)));
    for (int32_t y = 8; y < 22; ++y)
        for (int32_t x = 0; x < 14; ++x) ZbiuSetPixel(img.get(), x, y, lumicor::test::Pixel(200, 120, 90));
    Detector detector;
    zbmvector<zbmvector<zbm_Pos>> contours;
    ASSERT_EQ(detector.DetectInitialRegions(img.get(), DefaultFingerLiklihood(), contours), KT_OK);
    ASSERT_EQ(contours.size(), 1);
    zbmvector<zbm_Pos> adjusted;
    ASSERT_EQ(detector.AdjustContour(contours[0], adjusted), KT_OK);
    ASSERT_GE(adjusted.size(), 2);
    const ImageBound bound(40, 30);
    EXPECT_TRUE(bound.IsOnImageEdge(adjusted[0]));
    EXPECT_TRUE(bound.IsOnImageEdge(adjusted[adjusted.size() - 1]));
    Snakes probe(40, 30, Detector::CalcSnakesError, &detector);
    ASSERT_EQ(probe.SetPoints(adjusted), KT_OK);
    EXPECT_EQ(Detector::CalcSnakesError(probe, 0, zbm_Pos{5, 15}, &detector), 3.4028235e38f);
    // The outline sits on the strong edges of the likelihood step.
    float edge = 0.0f;
    for (int32_t i = 1; i + 1 < adjusted.size(); ++i)
        edge += detector.EdgeMagnitudeTable()[adjusted[i].y * 40 + adjusted[i].x];
    EXPECT_GT(edge / std::max(1, adjusted.size() - 2), 1.0f);
    for (auto* v : {&pts, &adjusted}) v->Clear();
    contours.Clear();
}

TEST(FingerOnLensTest, PhotosWithoutFingers) {
    zbmvector<Finger> fingers;
    float score = 1.0f;
    // Every pixel below the likelihood threshold: no region.
    ZbmImagePtr blue(ZbiuCreate(80, 60, ZBM_PIXEL_ORDER_RGB, lumicor::test::Pixel(40, 80, 200)));
    ASSERT_EQ(CalcFingerScore(blue.get(), fingers, score), KT_OK);
    EXPECT_EQ(fingers.size(), 0);
    EXPECT_EQ(score, 0.0f);
    // Below 10 x 10 nothing is measured, even a finger photo.
    ZbmImagePtr tiny = FingerPhoto(9, 30);
    score = 1.0f;
    ASSERT_EQ(CalcFingerScore(tiny.get(), fingers, score), KT_OK);
    EXPECT_EQ(score, 0.0f);
}

TEST(FingerOnLensTest, FingerPhotoIsFound) {
    ZbmImagePtr img = FingerPhoto(80, 60);
    zbmvector<Finger> fingers;
    float score = 0.0f;
    ASSERT_EQ(CalcFingerScore(img.get(), fingers, score), KT_OK);
    // How well it scores is the trained dictionaries' business (measured by
    // the training tool); here the outline must be found and kept.
    ASSERT_GE(fingers.size(), 1);
    EXPECT_GT(score, 0.0f);
    float best = 0.0f;
    for (const Finger& f : fingers) {
        best = std::max(best, f.score);
        EXPECT_GT(f.area, 0.0f);
        for (const FingerPoint& p : f.points) {
            EXPECT_GE(p.x, 0.0f);
            EXPECT_LT(p.x, 1.0f);
            EXPECT_GE(p.y, 0.0f);
            EXPECT_LT(p.y, 1.0f);
        }
    }
    EXPECT_EQ(best, score);
    fingers.Clear();
}

TEST(FingerOnLensTest, EveryFailingAllocationIsReported) {
    ZbmImagePtr img = FingerPhoto(40, 30);
    zbmvector<Finger> fingers;
    float score = 0.0f;
    int status = -1;
    const long n = lumicor::test::ForEachAllocationFailure(
        [&] { status = CalcFingerScore(img.get(), fingers, score); },
        [&](long, bool triggered) {
            if (triggered) {
                EXPECT_EQ(status, KT_ERR_NO_MEMORY);
                EXPECT_EQ(fingers.size(), 0);
                EXPECT_EQ(score, 0.0f);
            } else {
                EXPECT_EQ(status, KT_OK);
            }
            fingers.Clear();
        });
    EXPECT_GT(n, 20);
}
