// VisualAttention: working sizes, colour conversions, the quantised sigmoid,
// constant pictures, call order, the gradient map of a one-row map, the face
// feature with and without detection, and the bits of every intermediate map
// of a fixed picture.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "calib/src/CALib/param_va.h"
#include "calib/src/attention/visual_attention.h"
#include "calib/tests/attention_fixtures.h"
#include "oriel/src/pixdif/pixdif_detector.h"
#include "oriel/tests/pixdif_fixtures.h"
#include "testkit/temp_dir.h"

namespace {

constexpr uint64_t RECORDED_MAP_HASH = 9310472128566257264ull;

// An RGB plane (format 4) from packed RGB pixels.
void Fill(MIPlane& plane, const std::vector<uint8_t>& rgb, int w, int h) {
    ASSERT_EQ(plane.iInit(w, h, 4), 0);
    ASSERT_EQ(plane.iCopyPixel(rgb.data(), w, h), 0);
}

TEST(VisualAttentionTest, WorkingSizes) {
    struct Row {
        int w, h, l0w, l0h, sw, sh;
    } const rows[] = {{640, 480, 320, 240, 40, 30}, {480, 640, 120, 160, 15, 20}, {256, 256, 256, 256, 32, 32}};
    ParamMem p;
    for (const Row& r : rows) {
        MIPlane plane;
        Fill(plane, std::vector<uint8_t>(static_cast<size_t>(r.w) * r.h * 3, 90), r.w, r.h);
        VisualAttention va;
        ASSERT_EQ(va.iInit(&plane, &p), 0);
        EXPECT_EQ(va.LevelWidth(0), r.l0w);
        EXPECT_EQ(va.LevelHeight(0), r.l0h);
        EXPECT_EQ(va.LevelWidth(va.SaliencyLevel()), r.sw);
        EXPECT_EQ(va.LevelHeight(va.SaliencyLevel()), r.sh);
        EXPECT_EQ(va.FeatureCount(), 8);
    }
    // 640 x 480: all seven levels.
    MIPlane plane;
    Fill(plane, std::vector<uint8_t>(640 * 480 * 3, 90), 640, 480);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&plane, &p), 0);
    const int expected[7][2] = {{320, 240}, {160, 120}, {80, 60}, {40, 30}, {20, 15}, {10, 7}, {5, 3}};
    for (int l = 0; l < 7; ++l) {
        EXPECT_EQ(va.LevelWidth(l), expected[l][0]);
        EXPECT_EQ(va.LevelHeight(l), expected[l][1]);
    }
}

TEST(VisualAttentionTest, ColourConversionsBothWays) {
    struct Row {
        uint8_t r, g, b, y, cb, cr;
    } const rows[] = {
        {255, 255, 255, 255, 128, 128}, {0, 0, 0, 0, 128, 128},   {255, 0, 0, 76, 85, 255},
        {0, 0, 255, 29, 255, 108},      {0, 255, 0, 149, 44, 22}, {10, 200, 30, 123, 76, 47},
    };
    MIPlane rgb, ycc, back;
    ASSERT_EQ(rgb.iInit(6, 1, 4), 0);
    ASSERT_EQ(ycc.iInit(6, 1, 2), 0);
    ASSERT_EQ(back.iInit(6, 1, 4), 0);
    std::vector<uint8_t> packed;
    for (const Row& r : rows) packed.insert(packed.end(), {r.r, r.g, r.b});
    ASSERT_EQ(rgb.iCopyPixel(packed.data(), 6, 1), 0);
    ASSERT_EQ(VisualAttention::iRGB2YCbCr(&rgb, &ycc), 0);
    ASSERT_EQ(VisualAttention::iYCbCr2RGB(&ycc, &back), 0);
    for (int i = 0; i < 6; ++i) {
        SCOPED_TRACE(i);
        EXPECT_EQ(ycc.planes[0]->pPixel[i], rows[i].y);
        EXPECT_EQ(ycc.planes[1]->pPixel[i], rows[i].cb);
        EXPECT_EQ(ycc.planes[2]->pPixel[i], rows[i].cr);
        // Back within the rounding of the integer formulas.
        EXPECT_NEAR(back.planes[2]->pPixel[i], rows[i].r, 3);
        EXPECT_NEAR(back.planes[0]->pPixel[i], rows[i].g, 3);
        EXPECT_NEAR(back.planes[1]->pPixel[i], rows[i].b, 3);
    }
    MIPlane small;
    ASSERT_EQ(small.iInit(5, 1, 2), 0);
    EXPECT_EQ(VisualAttention::iRGB2YCbCr(&rgb, &small), static_cast<int32_t>(VA_ERR_COLOR_CONVERSION));
}

TEST(VisualAttentionTest, QuantisedSigmoid) {
    EXPECT_EQ(VaSigmoidTable(0.0f), 0.0f);
    EXPECT_EQ(VaSigmoidTable(2.0f), 1.492188f);
    EXPECT_EQ(VaSigmoidTable(100.0f), 1.492188f);  // clamped
    EXPECT_EQ(VaSigmoidTable(-2.0f), -1.484375f);  // (-2 + 1/256) * 128 truncates toward zero to -255
    EXPECT_EQ(VaSigmoidTable(1.0f), 1.0f);  // 1.716 tanh(2/3) = 1.00009
    EXPECT_EQ(fApproximate(-0.005f, 128), 0.0f);
    EXPECT_EQ(fApproximate(0.3f, 128), 38.0f / 128.0f);
    EXPECT_EQ(fApproximateRange(5.0f, 4, -2.0f, 2.0f), 2.0f);
    EXPECT_EQ(fApproximateRange(5.0f, 4, 0.0f, 2.0f), 5.0f);  // no clamp unless both bounds are set
}

TEST(VisualAttentionTest, ConstantPictureGivesConstantMaps) {
    ParamMem p;
    MIPlane plane;
    Fill(plane, std::vector<uint8_t>(320 * 240 * 3, 140), 320, 240);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&plane, &p), 0);
    orielcore_VA::PixDifTreeDetector detector;
    ASSERT_TRUE(detector.AllocateMemory(320, 240, 20, 16));
    orielcore_VA::SPooledList none;
    detector.CreateEmptyResultHolder(&none);
    ASSERT_EQ(va.iCreateSaliency(&detector, &none), 0);
    // Differences of 0, stretched to 127, then the same inhibition everywhere.
    for (int k = 0; k < 5; ++k) {
        const ImagePlane* cs = va.CSMap(k);
        ASSERT_NE(cs, nullptr);
        const int n = cs->width * cs->height;
        for (int i = 1; i < n; ++i) ASSERT_EQ(cs->pBuf[i], cs->pBuf[0]) << "map " << k;
        EXPECT_LT(cs->pBuf[0], 127);
    }
    // The face feature (last) is phi_T(0) = 0 everywhere without detections.
    const ImagePlaneFloat* face = va.FeatureMapFloat(va.FeatureCount() - 1);
    for (int i = 0; i < face->width * face->height; ++i) ASSERT_EQ(face->pBuf[i], 0.0f);
    ImagePlane* sal = nullptr;
    ASSERT_EQ(va.iGetSaliencyMap(&sal), 0);
    for (int i = 0; i < sal->width * sal->height; ++i) ASSERT_EQ(sal->pBuf[i], sal->pBuf[0]);
    // Once only.
    EXPECT_EQ(va.iCreateSaliency(&detector, &none), static_cast<int32_t>(VA_ERR_SALIENCY_CALL));
}

TEST(VisualAttentionTest, OneRowSaliencyMapFailsTheGradient) {
    ParamMem p;
    p.ImgFixFlag = 1;
    p.ImgFixWidth = 64;
    p.ImgFixHeight = 8;  // levels 64x8, 32x4, 16x2, 8x1: the saliency map is one row
    MIPlane plane;
    Fill(plane, attention_test::MakePhoto(128, 96), 128, 96);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&plane, &p), 0);
    EXPECT_EQ(va.iCreateSaliency(), static_cast<int32_t>(VA_ERR_MAP_TOO_SMALL));
    int32_t count = 0;
    tagVA_RECT* rects = nullptr;
    EXPECT_EQ(va.iGetSaliencyRect(&count, &rects), static_cast<int32_t>(VA_ERR_SALIENCY_RECT));
}

TEST(VisualAttentionTest, RefusesParameterSetsItCannotRun) {
    MIPlane plane;
    Fill(plane, std::vector<uint8_t>(64 * 64 * 3, 1), 64, 64);
    struct Row {
        const char* what;
        void (*change)(ParamMem&);
    } const rows[] = {
        {"surround level past the pyramid", [](ParamMem& p) { p.NumPyramid = 6; }},
        {"too few weights", [](ParamMem& p) { p.WeightNumCS = 4; }},
        {"more maps than pairs", [](ParamMem& p) { p.NumCSMap = 7; }},
        {"no size limit", [](ParamMem& p) { p.ImgMaxSize = 0; }},
    };
    for (const Row& r : rows) {
        ParamMem p;
        r.change(p);
        VisualAttention va;
        EXPECT_EQ(va.iInit(&plane, &p), static_cast<int32_t>(VA_ERR_INIT)) << r.what;
    }
    VisualAttention va;
    EXPECT_EQ(va.iCreateSaliency(), static_cast<int32_t>(VA_ERR_SALIENCY_CALL));
}

// FNV-1a over the bits of every float and byte map of the fixed picture:
// identical on every target.
TEST(VisualAttentionTest, IntermediateMapBitsOfFixedPicture) {
    ParamMem p;
    MIPlane rgb, ycc;
    Fill(rgb, attention_test::MakePhoto(640, 480), 640, 480);
    ASSERT_EQ(ycc.iInit(640, 480, 2), 0);
    ASSERT_EQ(VisualAttention::iRGB2YCbCr(&rgb, &ycc), 0);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&ycc, &p), 0);
    ASSERT_EQ(va.iCreateSaliency(), 0);
    uint64_t hash = 1469598103934665603ull;
    auto add = [&](const void* data, size_t n) {
        const uint8_t* b = static_cast<const uint8_t*>(data);
        for (size_t i = 0; i < n; ++i) hash = (hash ^ b[i]) * 1099511628211ull;
    };
    const size_t n = static_cast<size_t>(va.LevelWidth(3)) * va.LevelHeight(3);
    for (int f = 0; f < va.FeatureCount(); ++f) add(va.FeatureMapFloat(f)->pBuf, n * sizeof(float));
    add(va.SaliencyMapFloat()->pBuf, n * sizeof(float));
    ImagePlane* planes = nullptr;
    int32_t count = 0;
    ASSERT_EQ(va.iGetCSMap(&planes, &count), 0);
    for (int i = 0; i < count; ++i) add(planes[i].pBuf, n);
    ImagePlane* grad = nullptr;
    ASSERT_EQ(va.iGetGradientSaliencyMap(&grad), 0);
    add(grad->pBuf, n);
    EXPECT_EQ(hash, RECORDED_MAP_HASH);
}

// FaceDetectionCallFlag: the object's own detector (here a dictionary file
// written by the test) finds the bright square and paints the face map.
TEST(VisualAttentionTest, FaceDetectionInsideTheSaliencyComputation) {
    pixdif_test::Dictionary dict(20, false);
    pixdif_test::BrightCentre(dict);
    const orielcore_VA::PixDifTreeData* data = dict.Data();
    std::vector<uint8_t> bytes(orielcore_VA::PixDifTreeData_SerializedSize(data));
    ASSERT_FALSE(bytes.empty());
    ASSERT_TRUE(orielcore_VA::PixDifTreeData_Save(data, bytes.data(), static_cast<uint32_t>(bytes.size())));
    lumicor::test::TempDir dir;
    const std::string path = dir.Write("bright.pd3", std::string(bytes.begin(), bytes.end()));

    ParamMem p;
    p.FaceDetectionCallFlag = 1;
    p.FaceLoadDataFlag = 1;
    std::snprintf(p.FaceDatafile, sizeof p.FaceDatafile, "%s", path.c_str());
    p.FaceThresh = 0.0f;
    p.FaceStabilize = orielcore_VA::STABILIZE_NONE;
    // A dark picture with one bright 12 x 12 square at (100, 60).
    std::vector<uint8_t> px(320 * 240 * 3, 20);
    for (int y = 60; y < 72; ++y)
        for (int x = 100; x < 112; ++x)
            for (int c = 0; c < 3; ++c) px[(y * 320 + x) * 3 + c] = 230;
    MIPlane plane;
    Fill(plane, px, 320, 240);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&plane, &p), 0);
    testing::internal::CaptureStdout();
    ASSERT_EQ(va.iCreateSaliency(), 0);
    const std::string printed = testing::internal::GetCapturedStdout();
    EXPECT_NE(printed.find("Map X["), std::string::npos);
    // score 100 / scale 100 / FaceMaxScore 3.75 * 255 = 68 where a window was kept.
    const ImagePlane* face = va.FaceMap();
    int painted = 0;
    for (int y = 0; y < face->height; ++y)
        for (int x = 0; x < face->width; ++x) {
            const uint8_t v = face->pConstPixel[y * face->stride + x];
            ASSERT_TRUE(v == 0 || v == 68) << v;
            painted += v == 68;
        }
    EXPECT_GT(painted, 0);
    EXPECT_EQ(face->pConstPixel[66 * face->stride + 106], 68);  // inside the square's windows
    EXPECT_EQ(face->pConstPixel[200 * face->stride + 300], 0);
}

// Every other feature kind and the plain (unlearned) combination: intensity
// from RGB, red-green and blue-yellow, Gabor orientations, the first edge
// algorithm, 6-tap pyramids and the full difference of Gaussians. The most
// salient rectangle lies on the strongest object (the yellow square).
TEST(VisualAttentionTest, OtherFeatureKindsAndPlainWeights) {
    ParamMem p;
    p.FeatureIntensity = 1;
    p.FeatureIntensityY = 0;
    p.FeatureColorRGB = 1;
    p.FeatureColorCrCb = 0;
    p.FeatureOriGabor = 1;
    p.EdgeAlgo = 1;
    p.PyramidNumTap = 6;
    p.NormReductionFlag = 0;
    p.WeightLearningFlag = 0;
    p.ConvBndHandle = 1;
    p.SalRectGradFlag = 0;
    p.SalRectThreshMode = 1;
    MIPlane plane;
    Fill(plane, attention_test::MakePhoto(320, 240), 320, 240);
    VisualAttention va;
    ASSERT_EQ(va.iInit(&plane, &p), 0);
    EXPECT_EQ(va.FeatureCount(), 12);
    ASSERT_EQ(va.iCreateSaliency(), 0);
    ImagePlane* sal = nullptr;
    ASSERT_EQ(va.iGetSaliencyMap(&sal), 0);
    int lo = 255, hi = 0;
    for (int i = 0; i < sal->width * sal->height; ++i) lo = std::min<int>(lo, sal->pBuf[i]), hi = std::max<int>(hi, sal->pBuf[i]);
    EXPECT_LT(lo, hi);
    int32_t count = 0;
    tagVA_RECT* rects = nullptr;
    ASSERT_EQ(va.iGetSaliencyRect(&count, &rects), 0);
    ASSERT_GT(count, 0);
    // No gradient map was asked for.
    ImagePlane* grad = nullptr;
    EXPECT_EQ(va.iGetGradientSaliencyMap(&grad), static_cast<int32_t>(VA_ERR_SALIENCY_CALL));
    // The same picture in YCbCr runs the RGB features from the converted planes.
    MIPlane ycc;
    ASSERT_EQ(ycc.iInit(320, 240, 2), 0);
    ASSERT_EQ(VisualAttention::iRGB2YCbCr(&plane, &ycc), 0);
    VisualAttention va2;
    ASSERT_EQ(va2.iInit(&ycc, &p), 0);
    ASSERT_EQ(va2.iCreateSaliency(), 0);
}

}  // namespace
