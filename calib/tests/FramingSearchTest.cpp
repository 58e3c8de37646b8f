// The framing search end to end: crop size range, optimiser, conversion to
// pixels, aspect correction, properties over random inputs, identical bits
// across targets and allocation failures.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <string>

#include <lumicor/calib.h>

#include "calib/src/framing/framing_search.h"
#include "calib/tests/framing_fixtures.h"
#include "testkit/fault.h"

namespace {

using framing_test::Area;
using framing_test::Areas;
using framing_test::DefaultParam;

double PixelAspect(const _CAResult& r, uint32_t w, uint32_t h) {
    return (static_cast<double>(r.height) * h) / (static_cast<double>(r.width) * w);
}

TEST(FramingSearchTest, CorrectGrowsTheShortSideCentredAndClipped) {
    const FramingSearch fs(4000, 3000, 40, 30);
    struct {
        float a;
        _CAResult in, out;
    } const rows[] = {
        {0.75f, {0, 0, 1, 1}, {0, 0, 1, 1}},                        // image-filling stays
        {0.75f, {0.25f, 0.4f, 0.5f, 0.2f}, {0.25f, 0.25f, 0.5f, 0.5f}},   // too wide: taller, centred
        {0.75f, {0.25f, 0.05f, 0.5f, 0.2f}, {0.25f, 0.0f, 0.5f, 0.5f}},   // clipped at the top
        {1.0f, {0.0f, 0.4f, 1.0f, 0.2f}, {0.125f, 0.0f, 0.75f, 1.0f}},    // too tall to fit: narrower
        {1.5f, {0.4f, 0.0f, 0.2f, 0.6f}, {0.35f, 0.0f, 0.3f, 0.6f}},      // too tall: wider, centred
    };
    for (const auto& r : rows) {
        _CAResult res = r.in;
        fs.correct(r.a, &res);
        EXPECT_NEAR(res.x, r.out.x, 1e-6f);
        EXPECT_NEAR(res.y, r.out.y, 1e-6f);
        EXPECT_NEAR(res.width, r.out.width, 1e-6f);
        EXPECT_NEAR(res.height, r.out.height, 1e-6f);
    }
}

TEST(FramingSearchTest, PixelCropPastTheEdgeShrinksUntilItFits) {
    const FramingSearch fs(241, 241, 40, 40);  // 6.025 pixels a cell
    struct {
        float a;
        int l, t, w, h;           // grid cells
        int pl, pt, pw, ph;       // pixels
    } const rows[] = {
        {1.0f, 20, 0, 20, 20, 121, 0, 120, 120},  // 121 + 121 > 241: width first
        {2.0f, 0, 20, 10, 20, 0, 121, 60, 120},   // a > 1: height first, width follows
        {1.0f, 0, 0, 20, 20, 0, 0, 121, 121},     // fits: unchanged
    };
    for (const auto& r : rows) {
        CropRegion c = {};
        c.left = r.l;
        c.top = r.t;
        c.width = r.w;
        c.height = r.h;
        c.scaleX = c.scaleY = 241.0f / 40.0f;
        c.aspectRatio = r.a;
        Opt::ToPixels(&fs, &c);
        EXPECT_EQ(c.left, r.pl);
        EXPECT_EQ(c.top, r.pt);
        EXPECT_EQ(c.width, r.pw);
        EXPECT_EQ(c.height, r.ph);
    }
}

// The zoom limit 1.0, and a face of half the grid or more, leave only the
// largest crop of the aspect, wherever the subject is. For a = 1 on a 40 x 30
// grid that is 30 cells: the levels above scale 0.75 do not fit.
TEST(FramingSearchTest, NoZoomGivesTheLargestCrop) {
    Areas small;
    small.records = std::vector<CAAttentionArea>{Area(0.05f, 0.05f, 0.05f, 0.05f, 255)};
    Areas bigFace;
    bigFace.isFace = 1;
    bigFace.records = std::vector<CAAttentionArea>{Area(0.5f, 0.3f, 0.5f, 0.3f, 0)};
    struct {
        Areas* areas;
        float zoom, a, w, h;
    } const rows[] = {{&small, 1.0f, 1.0f, 0.75f, 1.0f},
                      {&small, 1.0f, 0.5f, 1.0f, 2.0f / 3.0f},
                      {&bigFace, 10.0f, 1.0f, 0.75f, 1.0f}};
    for (const auto& r : rows) {
        _CAParam p = DefaultParam();
        p.magnification_limit = r.zoom;
        p.aspect_ratio = r.a;
        _CAAttentionAreaArray array = r.areas->View();
        _CAResult res;
        ASSERT_EQ(CASearchFraming(4000, 3000, &p, &array, &res), 0u);
        EXPECT_NEAR(res.width, r.w, 1e-3f) << "a=" << r.a;
        EXPECT_NEAR(res.height, r.h, 1e-3f) << "a=" << r.a;
    }
    // With zoom allowed the small subject gets a much tighter crop.
    _CAParam p = DefaultParam();
    _CAAttentionAreaArray array = small.View();
    _CAResult res;
    ASSERT_EQ(CASearchFraming(4000, 3000, &p, &array, &res), 0u);
    EXPECT_LT(res.height, 0.5f);
}

// Degenerate inputs still give a proper crop of the requested shape.
TEST(FramingSearchTest, DegenerateInputsStillFrame) {
    Areas flat;
    flat.records = std::vector<CAAttentionArea>{Area(0.3f, 0.4f, 0.3f, 0.0f, 255)};  // no height
    Areas none;
    struct {
        const char* name;
        uint32_t w, h;
        Areas* areas;
        int32_t forceMain;
        float a;
    } const rows[] = {{"flat forced main", 4000, 3000, &flat, 0, 1.0f},
                      {"flat", 4000, 3000, &flat, -1, 0.3f},
                      {"no areas", 4000, 3000, &none, -1, 2.0f},
                      {"very tall photo", 240, 100000, &flat, -1, 1.0f},
                      {"very wide photo", 100000, 240, &none, -1, 0.1f}};
    for (const auto& r : rows) {
        SCOPED_TRACE(r.name);
        _CAParam p = DefaultParam();
        p.force_main_number = r.forceMain;
        p.aspect_ratio = r.a;
        _CAAttentionAreaArray array = r.areas->View();
        _CAResult res;
        ASSERT_EQ(CASearchFraming(r.w, r.h, &p, &array, &res), 0u);
        EXPECT_GT(res.width, 0.0f);
        EXPECT_NEAR(PixelAspect(res, r.w, r.h), r.a, 0.005 * r.a);
    }
}

TEST(FramingSearchTest, RandomValidInputsGiveAProperCropOfTheRequestedShape) {
    framing_test::Rng rng(20240611u);
    for (int i = 0; i < 2000; ++i) {
        framing_test::RandomCase c = framing_test::MakeRandomCase(rng);
        _CAAttentionAreaArray array = c.areas.View();
        _CAResult r;
        const uint32_t code = CASearchFraming(c.width, c.height, &c.param, &array, &r);
        ASSERT_EQ(code, 0u) << "case " << i;
        const float eps = 1e-6f;
        EXPECT_TRUE(r.x >= 0.0f && r.y >= 0.0f && r.width > 0.0f && r.height > 0.0f) << "case " << i;
        EXPECT_LE(r.x + r.width, 1.0f + eps) << "case " << i;
        EXPECT_LE(r.y + r.height, 1.0f + eps) << "case " << i;
        const double a = c.param.aspect_ratio;
        EXPECT_NEAR(PixelAspect(r, c.width, c.height), a, 0.005 * a)
            << "case " << i << ": " << c.width << "x" << c.height;
    }
}

// Hosts expect the same crop for the same blob on every device. The value
// below was recorded on x86-64 and is checked on every target.
TEST(FramingSearchTest, ResultBitsAreTheSameOnEveryTarget) {
    framing_test::Rng rng(77u);
    uint64_t hash = 1469598103934665603ull;  // FNV-1a
    auto mix = [&hash](uint32_t v) {
        for (int b = 0; b < 4; ++b) {
            hash ^= (v >> (8 * b)) & 0xFFu;
            hash *= 1099511628211ull;
        }
    };
    for (int i = 0; i < 400; ++i) {
        framing_test::RandomCase c = framing_test::MakeRandomCase(rng);
        _CAAttentionAreaArray array = c.areas.View();
        _CAResult r = {};
        mix(CASearchFraming(c.width, c.height, &c.param, &array, &r));
        uint32_t bits[4];
        std::memcpy(bits, &r, sizeof bits);
        for (uint32_t b : bits) mix(b);
    }
    EXPECT_EQ(hash, 0xb60e892f063ca708ull);
}

TEST(FramingSearchTest, EachFailingAllocationGivesOutOfMemory) {
    Areas areas;
    areas.records = std::vector<CAAttentionArea>{Area(0.2f, 0.3f, 0.2f, 0.3f, 200), Area(0.6f, 0.1f, 0.1f, 0.2f, 120)};
    _CAAttentionAreaArray array = areas.View();
    const _CAParam p = DefaultParam();
    _CAResult res;
    uint32_t code = 0;
    std::string err;
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            res = {-1.0f, -1.0f, -1.0f, -1.0f};
            testing::internal::CaptureStderr();
            code = CASearchFraming(4000, 3000, &p, &array, &res);
            err = testing::internal::GetCapturedStderr();
        },
        [&](long n, bool triggered) {
            if (!triggered) {
                EXPECT_EQ(code, 0u);
                return;
            }
            EXPECT_EQ(code, 4u) << "allocation " << n;
            EXPECT_EQ(res.x, -1.0f) << "allocation " << n;
            EXPECT_NE(err.find("CA_NEW failed"), std::string::npos) << err;
        });
    EXPECT_EQ(allocations, 3);  // summary, working crop, level crops
}

}  // namespace
