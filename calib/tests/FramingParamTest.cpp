// CAGetDefaultParam, the argument checks of CASearchFraming, the framing grid
// and the loading of an area array onto it.
#include <gtest/gtest.h>

#include <cstring>
#include <limits>
#include <string>

#include <lumicor/calib.h>

#include "calib/src/CALib/va.h"
#include "calib/src/framing/framing_search.h"
#include "calib/tests/framing_fixtures.h"

namespace {

using framing_test::Area;
using framing_test::Areas;

TEST(FramingParamTest, DefaultsAndNullRecord) {
    _CAParam p;
    std::memset(&p, 0x55, sizeof p);
    ASSERT_EQ(CAGetDefaultParam(&p), 0u);
    EXPECT_EQ(p.composition_mode, 4);
    EXPECT_EQ(p.aspect_ratio, 1.0f);
    EXPECT_EQ(p.magnification_limit, 10.0f);
    EXPECT_EQ(p.consistency_weight_min, 0.1f);
    EXPECT_EQ(p.force_main_number, -1);
    testing::internal::CaptureStderr();
    EXPECT_EQ(CAGetDefaultParam(nullptr), 3u);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "[CAGetDefaultParam(114)] Invalid params\n");
}

TEST(FramingParamTest, ValidationAcceptsBoundsAndRefusesEachFault) {
    const float nan = std::numeric_limits<float>::quiet_NaN();
    const float inf = std::numeric_limits<float>::infinity();
    enum { kNullParam = 1, kNullArray = 2, kNullResult = 4, kNullRecords = 8 };
    // Changes to a valid call (4000 x 3000, defaults, 3 areas), the code, and
    // for a refusal the line tag and condition printed (168: the array
    // failed to load).
    struct Row {
        uint32_t w, h;
        float aspect, zoom, wmin;
        int32_t main;
        int areas;  // record count; 3 unless given
        float bad;  // a coordinate put into record 1 unless 0
        int nulls;
        uint32_t code;
        int line;
        const char* condition;
    } const rows[] = {
        {240, 240, 1, 10, .1f, -1, 3, 0, 0, 0, 0, ""},
        {4000, 3000, .1f, 1, .1f, -1, 3, 0, 0, 0, 0, ""},
        {4000, 3000, 10, 100, .1f, 2, 3, 0, 0, 0, 0, ""},
        {4000, 3000, 1, 10, .1f, -1, 0, 0, 0, 0, 0, ""},  // no areas, main -1
        {1u << 24, 3000, 1, 10, .1f, -1, 3, 0, 0, 0, 0, ""},
        {239, 1000, 1, 10, .1f, -1, 3, 0, 0, 3, 134, "width < MIN_LENGTH"},
        {1000, 239, 1, 10, .1f, -1, 3, 0, 0, 3, 135, "height < MIN_LENGTH"},
        {4000, 3000, 1, 10, .1f, -1, 3, 0, kNullParam, 3, 136, "pParam == NULL"},
        {4000, 3000, .0999f, 10, .1f, -1, 3, 0, 0, 3, 137, "pParam->aspect_ratio < MIN_ASPECT_RATIO"},
        {4000, 3000, nan, 10, .1f, -1, 3, 0, 0, 3, 137, "pParam->aspect_ratio < MIN_ASPECT_RATIO"},
        {4000, 3000, 10.001f, 10, .1f, -1, 3, 0, 0, 3, 138, "pParam->aspect_ratio > MAX_ASPECT_RATIO"},
        {4000, 3000, inf, 10, .1f, -1, 3, 0, 0, 3, 138, "pParam->aspect_ratio > MAX_ASPECT_RATIO"},
        {4000, 3000, 1, .999f, .1f, -1, 3, 0, 0, 3, 139, "pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {4000, 3000, 1, 100.5f, .1f, -1, 3, 0, 0, 3, 139, "pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {4000, 3000, 1, nan, .1f, -1, 3, 0, 0, 3, 139, "pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {4000, 3000, 1, 10, .1f, 3, 3, 0, 0, 3, 140, "pParam->force_main_number != CA_NONE_SPECIFIED && pAttentionAreaArray->numAreas <= pParam->force_main_number"},
        {4000, 3000, 1, 10, .1f, -2, 3, 0, 0, 3, 140, "pParam->force_main_number != CA_NONE_SPECIFIED && pAttentionAreaArray->numAreas <= pParam->force_main_number"},
        {4000, 3000, 1, 10, .1f, -1, 3, 0, kNullArray, 3, 141, "pAttentionAreaArray == NULL"},
        {4000, 3000, 1, 10, .1f, -1, 3, 0, kNullResult, 3, 142, "pResult == NULL"},
        {(1u << 24) + 1, 3000, 1, 10, .1f, -1, 3, 0, 0, 3, 150, "width > MAX_LENGTH"},
        {4000, 3000, 1, 10, inf, -1, 3, 0, 0, 3, 152, "!isfinite(pParam->consistency_weight_min)"},
        {4000, 3000, 1, 10, .1f, 17, 20, 0, 0, 3, 153, "pParam->force_main_number != CA_NONE_SPECIFIED && MAX_AREAS <= pParam->force_main_number"},
        {4000, 3000, 1, 10, .1f, -1, 3, nan, 0, 3, 168, nullptr},
        {4000, 3000, 1, 10, .1f, -1, 3, -1e30f, 0, 3, 168, nullptr},
        {4000, 3000, 1, 10, .1f, -1, 3, 0, kNullRecords, 3, 168, nullptr},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(testing::Message() << "row with line " << r.line << ", aspect " << r.aspect);
        _CAParam p = framing_test::DefaultParam();
        p.aspect_ratio = r.aspect;
        p.magnification_limit = r.zoom;
        p.consistency_weight_min = r.wmin;
        p.force_main_number = r.main;
        Areas areas;
        for (int i = 0; i < r.areas; ++i) areas.records.push_back(Area(0.1f * i, 0.2f, 0.2f, 0.3f, 90));
        if (r.bad != 0.0f) areas.records[1].nw = r.bad;
        _CAAttentionAreaArray array = areas.View();
        if (r.nulls & kNullRecords) array.pAreaArray = nullptr;
        _CAResult result = {-7.0f, -7.0f, -7.0f, -7.0f};
        testing::internal::CaptureStderr();
        const uint32_t code = CASearchFraming(r.w, r.h, (r.nulls & kNullParam) ? nullptr : &p,
                                              (r.nulls & kNullArray) ? nullptr : &array,
                                              (r.nulls & kNullResult) ? nullptr : &result);
        const std::string err = testing::internal::GetCapturedStderr();
        EXPECT_EQ(code, r.code);
        if (r.code == 0) {
            EXPECT_EQ(err, "");
            EXPECT_GT(result.width, 0.0f);
            continue;
        }
        EXPECT_EQ(err, r.condition == nullptr
                           ? std::string("[CASearchFraming(168)] SetAttentionAreaArray failed\n")
                           : "[src/CALib(" + std::to_string(r.line) +
                                 ")] CASearchFraming recieved invalid params ( " + r.condition + " )\n");
        EXPECT_EQ(result.x, -7.0f);  // a refused call leaves the result alone
    }
}

TEST(FramingParamTest, GridHasFortyCellsOnTheLongSide) {
    struct {
        uint32_t w, h;
        int gw, gh;
    } const rows[] = {{4000, 3000, 40, 30}, {3000, 4000, 30, 40}, {1000, 999, 40, 40},
                      {4000, 1000, 40, 10}, {240, 100000, 1, 40}};
    for (const auto& r : rows) {
        int gw = 0, gh = 0;
        FramingSearch::GridSize(r.w, r.h, &gw, &gh);
        EXPECT_EQ(gw, r.gw) << r.w << "x" << r.h;
        EXPECT_EQ(gh, r.gh) << r.w << "x" << r.h;
    }
}

TEST(FramingParamTest, LoadingRoundsToCellsAndMarksFaces) {
    Areas areas;
    areas.records = std::vector<CAAttentionArea>{Area(0.1f, 0.2f, 0.33f, 0.5f, 3), Area(0, 0, 0.012f, 0, 200)};
    _CAAttentionAreaArray array = areas.View();
    VA va;
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.num, 2);
    EXPECT_EQ(va.x[0] * 1000 + va.y[0], 4006);
    EXPECT_EQ(va.width[0], 13);  // 0.5 + 13.2
    EXPECT_EQ(va.height[0], 15);  // 0.5 + 15
    EXPECT_EQ(va.width[1], 0);   // 0.5 + 0.48
    EXPECT_EQ(va.val[0] * 100 + va.isFace[0] * 10 + va.direction[0], 300);
    areas.isFace = 1;
    array = areas.View();
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.val[0] * 100 + va.isFace[0] * 10 + va.direction[0], 25513);
    areas.records.assign(20, Area(0.1f, 0.1f, 0.1f, 0.1f, 5));
    array = areas.View();
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.num, 16);

    // And back: fractions of the reference size, the direction for faces.
    _CAAttentionAreaArray out = {};
    va.num = 1;
    va.isFace[0] = 1;
    va.direction[0] = 6;
    ASSERT_EQ(va.CreateAttentionAreaArray(40, 30, &out), 0u);
    EXPECT_EQ(out.isFace + out.numAreas, 2u);
    EXPECT_EQ(out.pAreaArray[0].nx, 0.1f);
    EXPECT_EQ(out.pAreaArray[0].nh, 0.1f);
    EXPECT_EQ(out.pAreaArray[0].val.direction, 6);
    delete[] out.pAreaArray;
}

TEST(FramingParamTest, AreasAfterTheSixteenthAreIgnored) {
    framing_test::Rng rng(7);
    Areas first;
    for (int i = 0; i < 16; ++i) first.records.push_back(Area(0.5f * rng.Uniform(), 0.5f * rng.Uniform(), 0.1f, 0.1f, 40));
    // Strong large areas decide the crop when they count (in front), and do
    // not when they come after the sixteenth.
    const CAAttentionArea strong = Area(0.6f, 0.55f, 0.4f, 0.45f, 255);
    Areas all = first, front = first;
    all.records.insert(all.records.end(), 4, strong);
    front.records.insert(front.records.begin(), 4, strong);
    _CAParam p = framing_test::DefaultParam();
    p.aspect_ratio = 0.5f;
    _CAResult r[3];
    Areas* sets[3] = {&first, &all, &front};
    for (int i = 0; i < 3; ++i) {
        _CAAttentionAreaArray a = sets[i]->View();
        ASSERT_EQ(CASearchFraming(4000, 3000, &p, &a, &r[i]), 0u);
    }
    EXPECT_EQ(0, std::memcmp(&r[0], &r[1], sizeof r[0]));
    EXPECT_NE(0, std::memcmp(&r[0], &r[2], sizeof r[0]));
}

}  // namespace
