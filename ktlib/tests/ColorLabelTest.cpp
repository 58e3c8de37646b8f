// Colour labels from a similarity palette.
#include <gtest/gtest.h>
#include <lumicor/ktlib.h>

#include <initializer_list>
#include <string>

#include "ktlib/src/colorlabel/color_labeling.h"
#include "tests/testkit/fault.h"

namespace {

struct Entry {
    int l, a, b;
    uint32_t count;
};

_KtMetaSimilarity Palette(std::initializer_list<Entry> entries) {
    _KtMetaSimilarity m = {};
    for (const Entry& e : entries) {
        _KtMetaSimilarity::_ColHist& c = m.colHist32[m.ncol32++];
        c.lab.l = static_cast<uint8_t>(e.l);
        c.lab.a = static_cast<uint8_t>(e.a);
        c.lab.b = static_cast<uint8_t>(e.b);
        c.count = e.count;
    }
    return m;
}

struct Labels {
    int white, black, red, yellow, green, blue;
};

Labels Extract(const _KtMetaSimilarity& m) {
    _KtMetaColorLabel* out = nullptr;
    EXPECT_EQ(KtClblExtract(&m, &out), KT_OK);
    if (!out) return Labels{-1, -1, -1, -1, -1, -1};
    const Labels l = {out->white, out->black, out->red, out->yellow, out->green, out->blue};
    for (uint8_t r : out->reserved) EXPECT_EQ(r, 0);
    KtClblDisposeMeta(&out);
    return l;
}

}  // namespace

TEST(ColorLabelTest, PalettesGiveTheirLabels) {
    const struct {
        const char* name;
        _KtMetaSimilarity palette;
        Labels want;
    } cases[] = {
        {"pure white (L 99 inside the white ellipsoid)", Palette({{99, 128, 128, 500}}), {100, 0, 0, 0, 0, 0}},
        {"black", Palette({{0, 128, 128, 10}}), {0, 100, 0, 0, 0, 0}},
        {"sRGB red", Palette({{53, 208, 195, 10}}), {0, 0, 100, 0, 0, 0}},
        {"yellow", Palette({{97, 107, 222, 10}}), {0, 0, 0, 100, 0, 0}},
        {"green", Palette({{87, 42, 211, 10}}), {0, 0, 0, 0, 100, 0}},
        {"blue at hue 249 degrees", Palette({{40, 97, 47, 10}}), {0, 0, 0, 0, 0, 100}},
        {"sRGB blue lies at hue 306, beyond the blue wedge", Palette({{32, 207, 20, 10}}), {0, 0, 0, 0, 0, 0}},
        {"thirds, truncated", Palette({{99, 128, 128, 1}, {0, 128, 128, 1}, {53, 208, 195, 1}}), {33, 33, 33, 0, 0, 0}},
        {"99.9 % is stored as 99", Palette({{99, 128, 128, 999}, {50, 128, 128, 1}}), {99, 0, 0, 0, 0, 0}},
        {"grey below the chroma radius in the red hue", Palette({{50, 144, 144, 5}}), {0, 0, 0, 0, 0, 0}},
        {"same hue just beyond the chroma radius", Palette({{50, 145, 145, 5}}), {0, 0, 100, 0, 0, 0}},
        {"red hue too dark", Palette({{24, 208, 195, 5}}), {0, 0, 0, 0, 0, 0}},
        {"no palette (ncol32 0)", Palette({}), {0, 0, 0, 0, 0, 0}},
        {"counts all zero", Palette({{99, 128, 128, 0}}), {0, 0, 0, 0, 0, 0}},
        {"huge counts do not overflow", Palette({{99, 128, 128, 0xffffffffu}, {0, 128, 128, 0xffffffffu}}), {50, 50, 0, 0, 0, 0}},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        const Labels got = Extract(c.palette);
        EXPECT_EQ(got.white, c.want.white);
        EXPECT_EQ(got.black, c.want.black);
        EXPECT_EQ(got.red, c.want.red);
        EXPECT_EQ(got.yellow, c.want.yellow);
        EXPECT_EQ(got.green, c.want.green);
        EXPECT_EQ(got.blue, c.want.blue);
    }
}

TEST(ColorLabelTest, NcolAbove32CountsThe32Slots) {
    _KtMetaSimilarity m = Palette({{0, 128, 128, 3}});
    m.ncol32 = 0xffffffffu;
    const Labels got = Extract(m);
    EXPECT_EQ(got.black, 100);
}

// Colours exactly on a hue line belong to the label; one step beyond does not.
// Lines at 0 and 90 degrees have exact slopes (0 and the steep 255).
TEST(ColorLabelTest, HueLinesAreInclusive) {
    const _chromaticModuleParam quadrant = {100, 0, 0, 0, 90};
    const ColorLabelingModuleChromatic module(quadrant);
    const struct {
        int da, db, want;
    } cases[] = {
        {10, 0, 1},    // on the start line
        {10, -1, 0},   // just below it
        {1, 255, 1},   // on the end line (slope 255)
        {1, 256, 0},   // just beyond it
        {10, 10, 1},   // inside
        {-10, 10, 0},  // second quadrant
    };
    for (const auto& c : cases)
        EXPECT_EQ(module.JudgeColor(50, 127 + c.da, 127 + c.db), c.want) << "da " << c.da << " db " << c.db;
}

TEST(ColorLabelTest, NegativeHueWrapsAround) {
    int signA = 0, signB = 0;
    double slopeA = 0, slopeB = 0;
    ColorLabelingModuleChromatic::SetParam(-35, &signA, &slopeA, 1);
    ColorLabelingModuleChromatic::SetParam(325, &signB, &slopeB, 1);
    EXPECT_EQ(signA, signB);
    EXPECT_EQ(slopeA, slopeB);
    // Sign flips between 90 and 91 and back between 270 and 271.
    const struct {
        int angle, sign;
    } cases[] = {{0, -1}, {90, -1}, {91, 1}, {270, 1}, {271, -1}, {359, -1}, {450, -1}};
    for (const auto& c : cases) {
        int sign = 0;
        double slope = 0;
        ColorLabelingModuleChromatic::SetParam(c.angle, &sign, &slope, 1);
        EXPECT_EQ(sign, c.sign) << c.angle;
    }
}

TEST(ColorLabelTest, RejectsBadArguments) {
    const _KtMetaSimilarity m = Palette({{99, 128, 128, 1}});
    _KtMetaColorLabel* out = nullptr;
    EXPECT_EQ(KtClblExtract(nullptr, &out), KT_ERR_NULL);
    EXPECT_EQ(KtClblExtract(&m, nullptr), KT_ERR_NULL);
    _KtMetaColorLabel existing = {};
    out = &existing;
    EXPECT_EQ(KtClblExtract(&m, &out), KT_ERR_STATE);
    EXPECT_EQ(out, &existing);
}

TEST(ColorLabelTest, EveryFailedAllocationReportsOutOfMemory) {
    const _KtMetaSimilarity m = Palette({{99, 128, 128, 3}, {53, 208, 195, 1}});
    _KtMetaColorLabel* out = nullptr;
    int status = -1;
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] { status = KtClblExtract(&m, &out); },
        [&](long n, bool triggered) {
            SCOPED_TRACE("allocation " + std::to_string(n));
            EXPECT_EQ(status, triggered ? KT_ERR_NO_MEMORY : KT_OK);
            if (triggered) {
                EXPECT_EQ(out, nullptr);
            } else if (out) {
                EXPECT_EQ(out->white, 75);
            }
            KtClblDisposeMeta(&out);
        });
    EXPECT_GE(allocations, 8);
}
