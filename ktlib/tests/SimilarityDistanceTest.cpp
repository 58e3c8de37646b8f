// Texture, edge and transport distances, and the combined look-alike distance.
#include <gtest/gtest.h>
#include <lumicor/ktlib.h>
#include <lumicor/ktsimilarity.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "ktlib/tests/synthetic_photo.h"

namespace {

_texture_s Texture(int w, int h, std::vector<int> horizontal, std::vector<int> vertical) {
    _texture_s t = {};
    t.width = w;
    t.height = h;
    t.bins = 8;
    for (size_t i = 0; i < horizontal.size(); ++i) t.horizontal[i] = horizontal[i];
    for (size_t i = 0; i < vertical.size(); ++i) t.vertical[i] = vertical[i];
    return t;
}

edge_s Edges(float seed) {
    edge_s e;
    for (int i = 0; i < 81; ++i) e.value[i] = seed + static_cast<float>((i * 37) % 23);
    return e;
}

_KtMetaSimilarity Extracted(uint32_t seed, int w = 96, int h = 72) {
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h, seed);
    _KtMetaSimilarity* m = nullptr;
    EXPECT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m), KT_OK);
    _KtMetaSimilarity copy = {};
    if (m) copy = *m;
    KtSimlDisposeMeta(&m);
    return copy;
}

}  // namespace

TEST(SimilarityDistanceTest, TextureDistanceCases) {
    const int kNone = KT_TEXTURE_DISTANCE_NONE;
    const struct {
        const char* name;
        _texture_s a, b;
        int want;
    } cases[] = {
        {"identical", Texture(16, 16, {16}, {16}), Texture(16, 16, {16}, {16}), 0},
        // 16 counts move one bin: 16 x 16 (fixed point) x 1, normalised by 16 x 16.
        {"one bin apart", Texture(16, 16, {16}, {16}), Texture(16, 16, {0, 16}, {16}), 65536},
        {"larger first image normalises", Texture(32, 32, {16}, {16}), Texture(16, 16, {0, 16}, {16}), 16384},
        {"larger second image normalises", Texture(16, 16, {16}, {16}), Texture(32, 32, {0, 16}, {16}), 16384},
        {"the worse direction counts", Texture(16, 16, {16}, {16, 0, 0}), Texture(16, 16, {0, 16}, {0, 0, 16}), 131072},
        // 3 vs 7 counts: 3 x (16 x 7 / 3) = 111 move two bins, 1 unit stays as error.
        {"unequal masses", Texture(16, 16, {3}, {1}), Texture(16, 16, {0, 0, 7}, {1}), 53248},
        {"zero width", Texture(0, 16, {1}, {1}), Texture(16, 16, {1}, {1}), kNone},
        {"zero height", Texture(16, 16, {1}, {1}), Texture(16, 0, {1}, {1}), kNone},
        {"negative width", Texture(-16, 16, {1}, {1}), Texture(16, 16, {1}, {1}), kNone},
        {"empty against counts", Texture(16, 16, {}, {1}), Texture(16, 16, {1}, {1}), kNone},
        {"both empty", Texture(16, 16, {}, {}), Texture(16, 16, {}, {}), 0},
        {"negative bin", Texture(16, 16, {-1, 2}, {1}), Texture(16, 16, {1}, {1}), kNone},
        {"more counts than any image", Texture(16, 16, {1 << 25}, {1}), Texture(16, 16, {1}, {1}), kNone},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        _texture_s a = c.a, b = c.b;
        EXPECT_EQ(texture_distance(&a, &b), c.want);
        EXPECT_EQ(std::memcmp(&a, &c.a, sizeof(a)), 0);  // inputs are left alone
    }
}

TEST(SimilarityDistanceTest, TextureBinCountIsChecked) {
    _texture_s a = Texture(16, 16, {1}, {1}), b = a;
    a.bins = 9;
    EXPECT_EQ(texture_distance(&a, &b), -1);
    a.bins = 0;
    EXPECT_EQ(texture_distance(&a, &b), KT_TEXTURE_DISTANCE_NONE);
    // Only the first bins1 bins are compared.
    a = Texture(16, 16, {5, 0, 0, 9}, {5}), b = Texture(16, 16, {5}, {5});
    a.bins = 3;
    EXPECT_EQ(texture_distance(&a, &b), 0);
}

TEST(SimilarityDistanceTest, RotatableMatchesATurnedPhoto) {
    _texture_s landscape = Texture(64, 32, {30, 2}, {4, 20, 8});
    _texture_s portrait = Texture(32, 64, {4, 20, 8}, {30, 2});
    EXPECT_GT(texture_distance(&landscape, &portrait), 0);
    EXPECT_EQ(texture_distance_rotatable(&landscape, &portrait), 0);
    _texture_s other = Texture(64, 32, {0, 2, 30}, {4, 20, 8});
    EXPECT_LE(texture_distance_rotatable(&landscape, &other), texture_distance(&landscape, &other));
}

TEST(SimilarityDistanceTest, EdgeDistanceCases) {
    const edge_s zero = {};
    edge_s nan = Edges(1), inf = Edges(1), huge = Edges(1);
    nan.value[5] = std::numeric_limits<float>::quiet_NaN();
    inf.value[40] = std::numeric_limits<float>::infinity();
    huge.value[0] = std::numeric_limits<float>::max();
    huge.value[1] = std::numeric_limits<float>::max();
    edge_s doubled = Edges(1);
    for (float& v : doubled.value) v *= 2;
    edge_s negative = Edges(1);
    for (float& v : negative.value) v = -v;
    const struct {
        const char* name;
        edge_s a, b;
        bool exact;
        unsigned int want;
    } cases[] = {
        {"identical", Edges(1), Edges(1), true, 0},
        {"scaled energy, same layout", Edges(1), doubled, true, 0},
        {"all zero against a layout", zero, Edges(1), true, 10000},
        {"all zero against all zero", zero, zero, true, 10000},
        {"different layouts", Edges(1), Edges(30), false, 0},
        {"NaN value", nan, Edges(1), false, 0},
        {"infinite value", inf, Edges(1), false, 0},
        {"values near FLT_MAX", huge, Edges(1), false, 0},
        {"negative energies", negative, Edges(1), false, 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        const unsigned int d = edge_distance(&c.a, &c.b);
        if (c.exact)
            EXPECT_EQ(d, c.want);
        else
            EXPECT_LE(d, 10000u);
        EXPECT_EQ(d, edge_distance(&c.b, &c.a));  // symmetric
    }
    EXPECT_GT(edge_distance(&cases[0].a, &cases[4].b), 0u);
}

TEST(SimilarityDistanceTest, MetricCorrelationsOfKnownLayouts) {
    // All energy in orientation 0 versus all in orientation 1 of every region:
    // the orientation shares are perfectly anti-aligned (p = 2/3, -1/3, -1/3
    // against -1/3, 2/3, -1/3), correlation -1/2; the region shares agree.
    float a[81] = {}, b[81] = {};
    for (int i = 0; i < 27; ++i) a[3 * i] = 1.0f + static_cast<float>(i % 9), b[3 * i + 1] = 1.0f + static_cast<float>(i % 9);
    Metric metric(a, b);
    EXPECT_NEAR(metric.calculateAngleCorrelation(), -0.5, 1e-12);
    EXPECT_NEAR(metric.calculateSizeCorrelation(), 1.0, 1e-12);
    // sqrt(((1 + 1/2) / 2) x 0) = 0 ...
    edge_s ea, eb;
    std::memcpy(ea.value, a, sizeof(a));
    std::memcpy(eb.value, b, sizeof(b));
    EXPECT_EQ(edge_distance(&ea, &eb), 0u);
}

TEST(SimilarityDistanceTest, MatrixEmdCases) {
    struct M {
        std::vector<int> values;
        int rows;
    };
    const struct {
        const char* name;
        M a, b;
        int want;
    } cases[] = {
        {"identical", {{1, 2, 3}, 1}, {{1, 2, 3}, 1}, 0},
        {"mass moves two bins", {{1, 0, 0}, 1}, {{0, 0, 1}, 1}, 2},
        {"lighter side is scaled up", {{2, 0}, 1}, {{0, 1}, 1}, 2},
        {"lengths differ", {{1, 0}, 1}, {{1, 0, 0}, 1}, -1},
        {"two rows", {{1, 0, 1, 0}, 2}, {{1, 0, 1, 0}, 2}, -1},
        {"empty against mass", {{0, 0}, 1}, {{0, 1}, 1}, -1},
        {"both empty", {{0, 0}, 1}, {{0, 0}, 1}, 0},
        {"negative value", {{-1, 3}, 1}, {{0, 1}, 1}, -1},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        _matrix_s* a = matrix_create(c.a.rows, static_cast<int>(c.a.values.size()) / c.a.rows);
        _matrix_s* b = matrix_create(c.b.rows, static_cast<int>(c.b.values.size()) / c.b.rows);
        ASSERT_TRUE(a && b);
        for (size_t i = 0; i < c.a.values.size(); ++i) a->data[i] = c.a.values[i];
        for (size_t i = 0; i < c.b.values.size(); ++i) b->data[i] = c.b.values[i];
        EXPECT_EQ(matrix_emd(a, b), c.want);
        EXPECT_EQ(a->data[0], c.a.values[0]);  // inputs are left alone
        matrix_kill(a);
        matrix_kill(b);
    }
    EXPECT_EQ(matrix_emd(nullptr, nullptr), -1);
}

TEST(SimilarityDistanceTest, CombinedDistanceRanksAndDecides) {
    const _KtMetaSimilarity a = Extracted(1), a2 = Extracted(2), b = Extracted(3, 96, 96);
    float same = -1, noise = -1, other = -1;
    ASSERT_EQ(KtSimlDistance(&a, &a, &same), KT_OK);
    ASSERT_EQ(KtSimlDistance(&a, &a2, &noise), KT_OK);  // same picture, other noise
    _KtMetaSimilarity flat = {};
    flat.width = 10, flat.height = 10, flat.ncol32 = 1, flat.colHist32[0].count = 100, flat.verHist[0] = flat.horHist[0] = 1;
    ASSERT_EQ(KtSimlDistance(&a, &flat, &other), KT_OK);
    EXPECT_EQ(same, 0.0f);
    EXPECT_LT(noise, other);
    EXPECT_LE(other, 1.0f);
    float flatToFlat = -1;
    ASSERT_EQ(KtSimlDistance(&flat, &flat, &flatToFlat), KT_OK);
    EXPECT_EQ(flatToFlat, 0.0f);

    int dup = -1;
    ASSERT_EQ(KtSimlIsNearDuplicate(&a, &a2, KT_SIML_NEAR_DUPLICATE_THRESHOLD, &dup), KT_OK);
    EXPECT_EQ(dup, 1);
    ASSERT_EQ(KtSimlIsNearDuplicate(&a, &flat, KT_SIML_NEAR_DUPLICATE_THRESHOLD, &dup), KT_OK);
    EXPECT_EQ(dup, 0);
    EXPECT_EQ(KtSimlDistance(&a, nullptr, &same), KT_ERR_NULL);
    EXPECT_EQ(KtSimlIsNearDuplicate(&a, &b, 0.1f, nullptr), KT_ERR_NULL);
}

TEST(SimilarityDistanceTest, PaletteDistanceCases) {
    _KtMetaSimilarity a = {}, b = {}, empty = {};
    a.ncol32 = 1, a.colHist32[0] = {{0, 50, 128, 128}, 10};
    b.ncol32 = 2, b.colHist32[0] = {{0, 50, 128, 128}, 10}, b.colHist32[1] = {{0, 60, 131, 124}, 10};
    float d = -1;
    ASSERT_EQ(KtSimlPaletteDistance(&a, &a, &d), KT_OK);
    EXPECT_EQ(d, 0.0f);
    // a -> b: 0; b -> a: half the pixels 5 x sqrt(5) ... (10^2 + 3^2 + 4^2 = 125) away.
    ASSERT_EQ(KtSimlPaletteDistance(&a, &b, &d), KT_OK);
    EXPECT_FLOAT_EQ(d, static_cast<float>(std::sqrt(125.0) / 4));
    ASSERT_EQ(KtSimlPaletteDistance(&a, &empty, &d), KT_OK);
    EXPECT_EQ(d, 100.0f);
    ASSERT_EQ(KtSimlPaletteDistance(&empty, &empty, &d), KT_OK);
    EXPECT_EQ(d, 0.0f);
    a.ncol32 = 1000;  // only the 32 slots count
    ASSERT_EQ(KtSimlPaletteDistance(&a, &a, &d), KT_OK);
    EXPECT_EQ(d, 0.0f);
}
