// The FeRVL patch classifier: argument checks, the encoding against a small
// hand-made dictionary, pixel orders, the patch turning and failures.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/finger/fervl/fervl.h"
#include "ktlib/src/finger/fol.h"
#include "testkit/fault.h"
#include "testkit/images.h"

#include <cmath>
#include <vector>

namespace {

// A dictionary of K = 2 centroids on 10 x 10 patches with an identity
// whitening, unit standardisation and weights that pick single features.
struct SmallDictionary {
    static const uint32_t kK = 2, kD = 75;
    std::vector<double> c0, c1, w0, w1, mean, identity, fmean, fdev;
    std::vector<const double*> centroids, weights, rows;
    _FeRVLDictionary d;
    SmallDictionary() : c0(kD, 0.0), c1(kD, 0.0), w0(4 * kK + 1, 0.0), w1(4 * kK + 1, 0.0), mean(kD, 0.0),
                        identity(kD * kD, 0.0), fmean(4 * kK, 0.0), fdev(4 * kK, 1.0) {
        for (uint32_t i = 0; i < kD; ++i) identity[i * kD + i] = 1.0;
        for (uint32_t i = 0; i < 25; ++i) c1[i] = 1.0;  // bright red
        w0[0] = 1.0;           // quadrant 0, centroid 0
        w0[4 * kK] = 0.5;      // the constant
        w1[3 * kK + 1] = 2.0;  // quadrant 3, centroid 1
        centroids = {c0.data(), c1.data()};
        weights = {w0.data(), w1.data()};
        for (uint32_t j = 0; j < kD; ++j) rows.push_back(identity.data() + j * kD);
        d = {2, kK, kD, 10, 10, 5, 2, centroids.data(), weights.data(), mean.data(), rows.data(), fmean.data(),
             fdev.data()};
    }
};

// The same steps written out independently for one 10 x 10 RGB patch.
std::vector<double> Reference(const uint8_t* rgb, const _FeRVLDictionary& d) {
    std::vector<double> feature(4 * d.K + 1, 0.0);
    for (int r = 0; r < 3; ++r) {
        for (int c = 0; c < 3; ++c) {
            std::vector<double> v;
            for (int ch = 0; ch < 3; ++ch)
                for (int y = 0; y < 5; ++y)
                    for (int x = 0; x < 5; ++x) v.push_back(rgb[((r * 2 + y) * 10 + c * 2 + x) * 3 + ch]);
            double mu = 0, var = 0;
            for (double x : v) mu += x / 75.0;
            for (double x : v) var += (x - mu) * (x - mu) / 74.0;
            for (double& x : v) x = (x - mu) / std::sqrt(var + 10.0);
            std::vector<double> dist(d.K);
            double mean = 0;
            for (uint32_t k = 0; k < d.K; ++k) {
                double s = 0;
                for (int i = 0; i < 75; ++i) s += (v[i] - d.centroids[k][i]) * (v[i] - d.centroids[k][i]);
                dist[k] = std::sqrt(s);
                mean += dist[k] / d.K;
            }
            const int q = (r < 2 ? 0 : 2) + (c < 2 ? 0 : 1);
            for (uint32_t k = 0; k < d.K; ++k) feature[q * d.K + k] += std::max(0.0, mean - dist[k]);
        }
    }
    feature[4 * d.K] = 1.0;
    std::vector<double> scores;
    for (uint32_t cl = 0; cl < d.classCount; ++cl) {
        double s = 0;
        for (uint32_t i = 0; i <= 4 * d.K; ++i) s += feature[i] * d.classWeights[cl][i];
        scores.push_back(s);
    }
    return scores;
}

}  // namespace

TEST(FeRVLTest, ScoresMatchTheStepsWrittenOut) {
    SmallDictionary dict;
    ZbmImagePtr patch = lumicor::test::MakeNoiseImage(10, 10, ZBM_PIXEL_ORDER_RGB, 11);
    zbmvector<double> scores;
    scores.PushBack(42.0);  // scores are appended
    ASSERT_EQ(FeRVLClassify(patch->pData, 10, 10, 30, ZBM_PIXEL_ORDER_RGB, &dict.d, scores), KT_OK);
    const std::vector<double> expected = Reference(patch->pData, dict.d);
    ASSERT_EQ(scores.size(), 3);
    EXPECT_EQ(scores[0], 42.0);
    EXPECT_NEAR(scores[1], expected[0], 1e-9);
    EXPECT_NEAR(scores[2], expected[1], 1e-9);
    EXPECT_NE(scores[1], scores[2]);

    // The same pixels in BGRA with padded rows give the same scores.
    std::vector<uint8_t> bgra(10 * 48, 0);
    for (int y = 0; y < 10; ++y)
        for (int x = 0; x < 10; ++x)
            for (int c = 0; c < 3; ++c) bgra[y * 48 + x * 4 + (2 - c)] = patch->pData[(y * 10 + x) * 3 + c];
    zbmvector<double> again;
    ASSERT_EQ(FeRVLClassify(bgra.data(), 10, 10, 48, ZBM_PIXEL_ORDER_BGRA, &dict.d, again), KT_OK);
    EXPECT_EQ(again[0], scores[1]);
    EXPECT_EQ(again[1], scores[2]);
    // Another size is scaled to the dictionary's 10 x 10 first.
    ZbmImagePtr big = lumicor::test::MakeNoiseImage(20, 20, ZBM_PIXEL_ORDER_RGB, 11);
    ZbmImagePtr scaled(ZbiuCreate(10, 10, ZBM_PIXEL_ORDER_RGB));
    ASSERT_EQ(ZbiuResize(big.get(), scaled.get()), ZBIU_OK);
    zbmvector<double> fromBig;
    ASSERT_EQ(FeRVLClassify(big->pData, 20, 20, 60, ZBM_PIXEL_ORDER_RGB, &dict.d, fromBig), KT_OK);
    EXPECT_NEAR(fromBig[0], Reference(scaled->pData, dict.d)[0], 1e-9);
    for (auto* v : {&scores, &again, &fromBig}) v->Clear();
}

TEST(FeRVLTest, RefusedImagesAndDictionaries) {
    SmallDictionary dict;
    uint8_t px[10 * 10 * 4] = {0};
    zbmvector<double> scores;
    const struct {
        const uint8_t* pixels;
        uint32_t w, h, pitch;
        _zbm_PixelOrder order;
        int status;
    } images[] = {{nullptr, 10, 10, 30, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},
                  {px, 0, 10, 30, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},
                  {px, 10, 0, 30, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},
                  {px, 10, 10, 0, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},
                  {px, 11, 10, 10, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},
                  {px, 10, 10, 20, ZBM_PIXEL_ORDER_RGB, KT_ERR_STATE},  // rows shorter than 10 pixels
                  {px, 10, 10, 10, ZBM_PIXEL_ORDER_GRAY, KT_ERR_STATE},
                  {px, 10, 10, 30, ZBM_PIXEL_ORDER_YUV, KT_ERR_STATE},
                  {px, 10, 10, 40, ZBM_PIXEL_ORDER_ABGR, KT_OK}};
    for (const auto& c : images)
        EXPECT_EQ(FeRVLClassify(c.pixels, c.w, c.h, c.pitch, c.order, &dict.d, scores), c.status) << c.pitch;
    EXPECT_EQ(scores.size(), 2);
    scores.Clear();

    EXPECT_EQ(FeRVL::checkDictionary(nullptr), KT_ERR_NULL);
    EXPECT_EQ(FeRVL::checkDictionary(&dict.d), KT_OK);
    EXPECT_EQ(FeRVL::checkDictionary(&FERVL_DICTIONARY_DIAG), KT_OK);
    EXPECT_EQ(FeRVL::checkDictionary(&FERVL_DICTIONARY_HALF), KT_OK);
    const struct {
        uint32_t _FeRVLDictionary::*field;
        uint32_t value;
    } broken[] = {{&_FeRVLDictionary::resizeWidth, 0}, {&_FeRVLDictionary::resizeHeight, 0},
                  {&_FeRVLDictionary::P, 0},           {&_FeRVLDictionary::S, 0},
                  {&_FeRVLDictionary::P, 11},          {&_FeRVLDictionary::S, 11}};
    for (const auto& b : broken) {
        _FeRVLDictionary d = dict.d;
        d.*(b.field) = b.value;
        EXPECT_EQ(FeRVL::checkDictionary(&d), KT_ERR_STATE);
        EXPECT_EQ(FeRVLClassify(px, 10, 10, 30, ZBM_PIXEL_ORDER_RGB, &d, scores), KT_ERR_STATE);
    }
}

TEST(FeRVLTest, PatchesAreTurnedIntoTheDictionaryOrientation) {
    ZbmImagePtr image = lumicor::test::MakeNoiseImage(30, 20, ZBM_PIXEL_ORDER_RGB, 4);
    const zbm_Rect rect = {7, 5, 10, 10};
    ZbmImagePtr crop(ZbiuCreateCrop(image.get(), rect));
    FOL::FeRVLHandler handler;
    ASSERT_EQ(handler.Initialize(), KT_OK);
    const struct {
        int32_t pattern;
        int (*turn)(const _zbm_Image*, _zbm_Image*);
    } cases[] = {{0, ZbiuCopy},       {4, ZbiuCopy},       {1, ZbiuRotateLeft}, {7, ZbiuRotateLeft},
                 {2, ZbiuRotateRight}, {6, ZbiuRotateRight}, {3, ZbiuRotate180},  {5, ZbiuRotate180}};
    for (const auto& c : cases) {
        ZbmImagePtr expected(ZbiuCreate(10, 10, ZBM_PIXEL_ORDER_RGB));
        ASSERT_EQ(c.turn(crop.get(), expected.get()), ZBIU_OK);
        ASSERT_EQ(handler.PreparePatch(image.get(), rect, c.pattern), KT_OK);
        EXPECT_TRUE(lumicor::test::SameImage(handler.WorkImage(), expected.get())) << c.pattern;
    }
    // Outside the image the classifier is not asked; the float form reports
    // the lowest float.
    const zbm_Rect outside = {25, 5, 10, 10};
    EXPECT_EQ(handler.EvalImagePatch(image.get(), outside, 0), -3.4028235e38f);
    float score = 0.0f;
    EXPECT_EQ(handler.EvalImagePatch(image.get(), rect, 6, &score), KT_OK);
}

TEST(FeRVLTest, EveryFailingAllocationIsReported) {
    SmallDictionary dict;
    ZbmImagePtr patch = lumicor::test::MakeNoiseImage(12, 12, ZBM_PIXEL_ORDER_RGB, 1);
    zbmvector<double> scores;
    int status = -1;
    lumicor::test::ForEachAllocationFailure(
        [&] { status = FeRVLClassify(patch->pData, 12, 12, 36, ZBM_PIXEL_ORDER_RGB, &dict.d, scores); },
        [&](long, bool triggered) {
            EXPECT_EQ(status, triggered ? KT_ERR_NO_MEMORY : KT_OK);
            EXPECT_EQ(scores.size(), triggered ? 0 : 2);
            scores.Clear();
        });
}
