// Texture histograms (fft16 and the dominant-frequency bins) and the Haar
// edge feature.
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <string>

#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/imatrix/imatrix.h"
#include "ktlib/src/Similarity/cbs/Texture/texture/texture.h"

namespace {

// An image painted by a gray-level function of (x, y).
struct Gray {
    _image_s* image;
    Gray(int w, int h, const std::function<int(int, int)>& f) : image(image_create(w, h)) {
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x) {
                const uint8_t v = static_cast<uint8_t>(f(x, y));
                const uint8_t rgb[3] = {v, v, v};
                image_pset(image, x, y, rgb);
            }
    }
    ~Gray() { image_kill(image); }
};

}  // namespace

// Reference values from an independent implementation of the same fixed-point
// rule (each term truncated toward zero before it is summed).
TEST(TextureTest, Fft16MagnitudesOfKnownSignals) {
    const struct {
        int32_t in[16];
        int32_t out[16];
    } cases[] = {
        {{0, 2, 2}, {4, 2, 3, 2, 2, 1, 1, 1, 0, 0, 0, 0, 0, 0, 0, 0}},
        {{0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15},
         {120, 42, 21, 13, 11, 9, 7, 8, 8, 9, 10, 11, 12, 13, 14, 15}},
        {{255, 0, 255, 0, 255, 0, 255, 0, 255, 0, 255, 0, 255, 0, 255, 0},
         {2040, 0, 0, 0, 0, 0, 0, 0, 2040, 0, 255, 0, 255, 0, 255, 0}},
        {{0, 37, 74, 111, 148, 185, 222, 3, 40, 77, 114, 151, 188, 225, 6, 43},
         {1624, 219, 664, 185, 219, 249, 67, 290, 40, 77, 114, 151, 188, 225, 6, 43}},
        // Samples beyond a byte take the general path.
        {{-5, 300, 1000, -1000, 255, 0, 7, -7, 3, 0, 0, 0, 0, 0, 0, 256},
         {809, 834, 898, 971, 1293, 1850, 2145, 1957, 1711, 0, 0, 0, 0, 0, 0, 256}},
    };
    for (const auto& c : cases) {
        int32_t x[16];
        std::memcpy(x, c.in, sizeof(x));
        fft16(x);
        for (int k = 0; k < 16; ++k) EXPECT_EQ(x[k], c.out[k]) << "k = " << k;
    }
}

// Stripes put every row (or column) of a block into the bin of their
// frequency; frequency 8 shares bin 7; weak stripes count as flat.
TEST(TextureTest, StripesFillTheBinOfTheirFrequency) {
    const struct {
        const char* name;
        std::function<int(int, int)> f;
        int horizontalBin, verticalBin;
    } cases[] = {
        {"vertical stripes, period 4", [](int x, int) { return (x / 2) % 2 ? 200 : 0; }, 4, 0},
        {"vertical stripes, period 2", [](int x, int) { return x % 2 ? 200 : 0; }, 7, 0},
        {"horizontal stripes, period 8", [](int, int y) { return (y / 4) % 2 ? 200 : 0; }, 0, 2},
        {"amplitude 5 reaches the threshold", [](int x, int) { return (x / 2) % 2 ? 105 : 100; }, 4, 0},
        {"amplitude 4 stays flat", [](int x, int) { return (x / 2) % 2 ? 104 : 100; }, 0, 0},
        {"flat", [](int, int) { return 77; }, 0, 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        Gray g(40, 35, c.f);  // 2 x 2 complete blocks; the rest is ignored
        _texture_s t;
        ASSERT_EQ(texture_init(&t, 8), 0);
        ASSERT_EQ(texture_histogram_t2(&t, g.image), 0);
        EXPECT_EQ(t.width, 40);
        EXPECT_EQ(t.height, 35);
        for (int b = 0; b < 8; ++b) {
            EXPECT_EQ(t.horizontal[b], b == c.horizontalBin ? 64 : 0) << "horizontal bin " << b;
            EXPECT_EQ(t.vertical[b], b == c.verticalBin ? 64 : 0) << "vertical bin " << b;
        }
    }
}

TEST(TextureTest, PerBlockVariantCountsOncePerBlock) {
    Gray g(32, 16, [](int x, int) { return (x / 2) % 2 ? 200 : 0; });
    _texture_s t;
    ASSERT_EQ(texture_init(&t, 8), 0);
    ASSERT_EQ(texture_histogram_t(&t, g.image), 0);
    EXPECT_EQ(t.horizontal[4], 2);
    EXPECT_EQ(t.vertical[0], 2);
}

TEST(TextureTest, UniformImageHasNoEdges) {
    Gray g(37, 23, [](int, int) { return 140; });
    float edge[81];
    ASSERT_EQ(edge_feature(g.image, edge), 0);
    for (float v : edge) EXPECT_EQ(v, 0.0f);
}

// A vertical edge between columns 80 and 81 shows in the horizontal-detail
// band (orientation 1) of the middle region column at every grid row; the
// only other energy at the finest scale comes from element (0, 0), which is
// replaced by the image mean before the transform.
TEST(TextureTest, VerticalEdgeLandsInItsBandAndRegions) {
    Gray g(160, 120, [](int x, int) { return x <= 80 ? 0 : 255; });
    float edge[81];
    ASSERT_EQ(edge_feature(g.image, edge), 0);
    for (int region = 0; region < 9; ++region) {
        for (int o = 0; o < 3; ++o) {
            const bool edgeRegion = o == 1 && region % 3 == 1;
            const bool meanCorner = region == 0;
            SCOPED_TRACE("region " + std::to_string(region) + " orientation " + std::to_string(o));
            if (edgeRegion || meanCorner)
                EXPECT_GT(edge[3 * region + o], 0.0f);
            else
                EXPECT_EQ(edge[3 * region + o], 0.0f);
        }
    }
    // 20 rows of one coefficient (0 - 255) x 0.707106781^2 x 2 each.
    EXPECT_NEAR(edge[3 * 4 + 1], 20 * 255.0, 0.01);
}
