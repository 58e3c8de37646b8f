// CAGetDefaultParam, the argument checks of CASearchFraming, the framing grid
// and the loading of an area array onto it.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <functional>
#include <limits>
#include <string>

#include <lumicor/calib.h>

#include "calib/src/CALib/va.h"
#include "calib/src/framing/framing_search.h"
#include "calib/tests/framing_fixtures.h"

namespace {

using framing_test::Area;
using framing_test::Areas;
using framing_test::DefaultParam;

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

// One row: a change to a valid call, the expected code and, for a refusal,
// the expected line on standard error.
struct ValidationRow {
    const char* name;
    std::function<void(uint32_t&, uint32_t&, _CAParam&, Areas&, bool& nullParam, bool& nullArray,
                       bool& nullResult)>
        change;
    uint32_t code;
    const char* message;
};

std::string Invalid(int line, const char* condition) {
    return "[src/CALib(" + std::to_string(line) + ")] CASearchFraming recieved invalid params ( " +
           condition + " )\n";
}

TEST(FramingParamTest, ValidationAcceptsBoundsAndRefusesEachFault) {
    const float nan = std::numeric_limits<float>::quiet_NaN();
    const float inf = std::numeric_limits<float>::infinity();
    const ValidationRow rows[] = {
        {"240x240", [](uint32_t& w, uint32_t& h, _CAParam&, Areas&, bool&, bool&, bool&) { w = h = 240; }, 0, nullptr},
        {"aspect 0.1", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = 0.1f; }, 0, nullptr},
        {"aspect 10", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = 10.0f; }, 0, nullptr},
        {"zoom 1", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.magnification_limit = 1.0f; }, 0, nullptr},
        {"zoom 100", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.magnification_limit = 100.0f; }, 0, nullptr},
        {"no areas", [](uint32_t&, uint32_t&, _CAParam&, Areas& a, bool&, bool&, bool&) { a.records.clear(); }, 0, nullptr},
        {"last main", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.force_main_number = 2; }, 0, nullptr},
        {"side 2^24", [](uint32_t& w, uint32_t&, _CAParam&, Areas&, bool&, bool&, bool&) { w = 1u << 24; }, 0, nullptr},
        {"239x1000", [](uint32_t& w, uint32_t& h, _CAParam&, Areas&, bool&, bool&, bool&) { w = 239; h = 1000; }, 3, "134:width < MIN_LENGTH"},
        {"1000x239", [](uint32_t& w, uint32_t& h, _CAParam&, Areas&, bool&, bool&, bool&) { w = 1000; h = 239; }, 3, "135:height < MIN_LENGTH"},
        {"null param", [](uint32_t&, uint32_t&, _CAParam&, Areas&, bool& np, bool&, bool&) { np = true; }, 3, "136:pParam == NULL"},
        {"aspect low", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = 0.0999f; }, 3, "137:pParam->aspect_ratio < MIN_ASPECT_RATIO"},
        {"aspect NaN", [nan](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = nan; }, 3, "137:pParam->aspect_ratio < MIN_ASPECT_RATIO"},
        {"aspect high", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = 10.001f; }, 3, "138:pParam->aspect_ratio > MAX_ASPECT_RATIO"},
        {"aspect inf", [inf](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.aspect_ratio = inf; }, 3, "138:pParam->aspect_ratio > MAX_ASPECT_RATIO"},
        {"zoom low", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.magnification_limit = 0.999f; }, 3, "139:pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {"zoom high", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.magnification_limit = 100.5f; }, 3, "139:pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {"zoom NaN", [nan](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.magnification_limit = nan; }, 3, "139:pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit"},
        {"main = count", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.force_main_number = 3; }, 3, "140:pParam->force_main_number != CA_NONE_SPECIFIED && pAttentionAreaArray->numAreas <= pParam->force_main_number"},
        {"main -2", [](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.force_main_number = -2; }, 3, "140:pParam->force_main_number != CA_NONE_SPECIFIED && pAttentionAreaArray->numAreas <= pParam->force_main_number"},
        {"null array", [](uint32_t&, uint32_t&, _CAParam&, Areas&, bool&, bool& na, bool&) { na = true; }, 3, "141:pAttentionAreaArray == NULL"},
        {"null result", [](uint32_t&, uint32_t&, _CAParam&, Areas&, bool&, bool&, bool& nr) { nr = true; }, 3, "142:pResult == NULL"},
        {"side 2^24+1", [](uint32_t&, uint32_t& h, _CAParam&, Areas&, bool&, bool&, bool&) { h = (1u << 24) + 1; }, 3, "151:height > MAX_LENGTH"},
        {"weight NaN", [nan](uint32_t&, uint32_t&, _CAParam& p, Areas&, bool&, bool&, bool&) { p.consistency_weight_min = nan; }, 3, "152:!isfinite(pParam->consistency_weight_min)"},
        {"main beyond 16", [](uint32_t&, uint32_t&, _CAParam& p, Areas& a, bool&, bool&, bool&) {
             a.records.resize(20, Area(0.1f, 0.1f, 0.2f, 0.2f, 100));
             p.force_main_number = 17;
         }, 3, "153:pParam->force_main_number != CA_NONE_SPECIFIED && MAX_AREAS <= pParam->force_main_number"},
        // Damaged arrays are refused when they are loaded onto the grid.
        {"coordinate NaN", [nan](uint32_t&, uint32_t&, _CAParam&, Areas& a, bool&, bool&, bool&) { a.records[1].nw = nan; }, 3, "load"},
        {"coordinate huge", [](uint32_t&, uint32_t&, _CAParam&, Areas& a, bool&, bool&, bool&) { a.records[2].ny = -1e30f; }, 3, "load"},
    };
    for (const ValidationRow& row : rows) {
        SCOPED_TRACE(row.name);
        uint32_t w = 4000, h = 3000;
        _CAParam p = DefaultParam();
        Areas areas;
        areas.records = std::vector<CAAttentionArea>{Area(0.1f, 0.1f, 0.3f, 0.4f, 200), Area(0.6f, 0.5f, 0.2f, 0.2f, 90),
                         Area(0.4f, 0.2f, 0.1f, 0.1f, 30)};
        bool nullParam = false, nullArray = false, nullResult = false;
        row.change(w, h, p, areas, nullParam, nullArray, nullResult);
        _CAAttentionAreaArray array = areas.View();
        _CAResult result = {-7.0f, -7.0f, -7.0f, -7.0f};
        testing::internal::CaptureStderr();
        const uint32_t code = CASearchFraming(w, h, nullParam ? nullptr : &p, nullArray ? nullptr : &array,
                                              nullResult ? nullptr : &result);
        const std::string err = testing::internal::GetCapturedStderr();
        EXPECT_EQ(code, row.code);
        if (row.code == 0) {
            EXPECT_EQ(err, "");
            EXPECT_GT(result.width, 0.0f);
            continue;
        }
        const std::string m = row.message;
        if (m == "load") {
            EXPECT_EQ(err, "[CASearchFraming(168)] SetAttentionAreaArray failed\n");
        } else {
            const size_t colon = m.find(':');
            EXPECT_EQ(err, Invalid(std::stoi(m.substr(0, colon)), m.c_str() + colon + 1));
        }
        EXPECT_EQ(result.x, -7.0f);  // refused calls leave the result alone
        EXPECT_EQ(result.height, -7.0f);
    }
}

TEST(FramingParamTest, AnnouncedRecordsWithoutArrayAreRefused) {
    _CAParam p = DefaultParam();
    _CAAttentionAreaArray array = {0, 2, nullptr};
    _CAResult result = {};
    testing::internal::CaptureStderr();
    EXPECT_EQ(CASearchFraming(4000, 3000, &p, &array, &result), 3u);
    EXPECT_EQ(testing::internal::GetCapturedStderr(),
              "[CASearchFraming(168)] SetAttentionAreaArray failed\n");
}

TEST(FramingParamTest, GridHasFortyCellsOnTheLongSide) {
    struct {
        uint32_t w, h;
        int gw, gh;
    } const rows[] = {{4000, 3000, 40, 30}, {3000, 4000, 30, 40}, {1000, 999, 40, 40},
                      {240, 240, 40, 40},   {4000, 1000, 40, 10}, {240, 100000, 1, 40}};
    for (const auto& r : rows) {
        int gw = 0, gh = 0;
        FramingSearch::GridSize(r.w, r.h, &gw, &gh);
        EXPECT_EQ(gw, r.gw) << r.w << "x" << r.h;
        EXPECT_EQ(gh, r.gh) << r.w << "x" << r.h;
    }
}

TEST(FramingParamTest, LoadingRoundsToCellsAndMarksFaces) {
    Areas areas;
    areas.records = std::vector<CAAttentionArea>{Area(0.1f, 0.2f, 0.33f, 0.5f, 3), Area(0.0f, 0.0f, 0.012f, 0.0f, 200)};
    _CAAttentionAreaArray array = areas.View();
    VA va;
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.num, 2);
    EXPECT_EQ(va.x[0], 4);
    EXPECT_EQ(va.y[0], 6);
    EXPECT_EQ(va.width[0], 13);   // 0.5 + 13.2
    EXPECT_EQ(va.height[0], 15);  // 0.5 + 15
    EXPECT_EQ(va.width[1], 0);    // 0.5 + 0.48
    EXPECT_EQ(va.val[0], 3);
    EXPECT_EQ(va.isFace[0], 0);
    EXPECT_EQ(va.direction[0], 0);

    areas.isFace = 1;
    array = areas.View();
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.val[0], 255);
    EXPECT_EQ(va.isFace[1], 1);
    EXPECT_EQ(va.direction[0], 3);
    EXPECT_EQ(va.direction[1], 200);

    areas.records.assign(20, Area(0.1f, 0.1f, 0.1f, 0.1f, 5));
    array = areas.View();
    ASSERT_EQ(va.SetAttentionAreaArray(40, 30, &array), 0u);
    EXPECT_EQ(va.num, 16);
}

TEST(FramingParamTest, AreasAfterTheSixteenthAreIgnored) {
    Areas first;
    framing_test::Rng rng(7);
    for (int i = 0; i < 16; ++i) {
        first.records.push_back(Area(0.5f * rng.Uniform(), 0.5f * rng.Uniform(), 0.1f, 0.1f, 40));
    }
    Areas all = first;
    // Four strong, large areas that would dominate the crop if they counted.
    for (int i = 0; i < 4; ++i) all.records.push_back(Area(0.6f, 0.55f, 0.4f, 0.45f, 255));
    _CAParam p = DefaultParam();
    p.aspect_ratio = 0.5f;
    _CAAttentionAreaArray a16 = first.View();
    _CAAttentionAreaArray a20 = all.View();
    _CAResult r16, r20;
    ASSERT_EQ(CASearchFraming(4000, 3000, &p, &a16, &r16), 0u);
    ASSERT_EQ(CASearchFraming(4000, 3000, &p, &a20, &r20), 0u);
    EXPECT_EQ(0, std::memcmp(&r16, &r20, sizeof r16));

    // The same four areas in front do change the crop.
    Areas front;
    front.records.assign(all.records.begin() + 16, all.records.end());
    front.records.insert(front.records.end(), first.records.begin(), first.records.begin() + 12);
    _CAAttentionAreaArray af = front.View();
    _CAResult rf;
    ASSERT_EQ(CASearchFraming(4000, 3000, &p, &af, &rf), 0u);
    EXPECT_NE(0, std::memcmp(&r16, &rf, sizeof r16));
}

TEST(FramingParamTest, CreateAttentionAreaArrayNormalisesAndKeepsDirections) {
    VA va;
    va.num = 2;
    va.x[0] = 4;
    va.width[0] = 10;
    va.y[1] = 15;
    va.height[1] = 3;
    va.val[0] = 255;
    va.direction[0] = 6;
    va.isFace[0] = 1;
    _CAAttentionAreaArray out = {};
    ASSERT_EQ(va.CreateAttentionAreaArray(40, 30, &out), 0u);
    EXPECT_EQ(out.isFace, 1u);
    ASSERT_EQ(out.numAreas, 2u);
    EXPECT_EQ(out.pAreaArray[0].nx, 0.1f);
    EXPECT_EQ(out.pAreaArray[0].nw, 0.25f);
    EXPECT_EQ(out.pAreaArray[1].ny, 0.5f);
    EXPECT_EQ(out.pAreaArray[1].nh, 0.1f);
    EXPECT_EQ(out.pAreaArray[0].val.direction, 6);
    delete[] out.pAreaArray;
}

}  // namespace
