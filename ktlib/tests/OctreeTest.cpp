// Colour octree: leaf indices and the palette's choice of nodes to split.
#include <gtest/gtest.h>
#include <lumicor/zbm_image.h>

#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"
#include "ktlib/src/Similarity/cbs/CEMD/colquant/octree.h"

namespace {

uint32_t Packed(int r, int g, int b) {
    int l = 0, a = 0, bb = 0;
    srgb2lab(r, g, b, &l, &a, &bb);
    return (static_cast<uint32_t>(l) << 16) | (static_cast<uint32_t>(a) << 8) | static_cast<uint32_t>(bb);
}

}  // namespace

TEST(OctreeTest, LeafIndexTakesTheTopFourBitsOfEachChannel) {
    const struct {
        int c0, c1, c2, index;
    } cases[] = {
        {0, 0, 0, 0},
        {255, 255, 255, 4095},
        {255, 0, 0, 04444},      // c0 is the high bit of every group
        {0, 0, 255, 01111},      // c2 the low bit
        {0x80, 0x40, 0x20, 04210},  // one bit per group, bit 7 group first
        {0x0f, 0x0f, 0x0f, 0},   // the low nibble is ignored
        {0x10, 0x00, 0x10, 00005},
    };
    for (const auto& c : cases) EXPECT_EQ(octree_get_five_layer_index(c.c0, c.c1, c.c2), c.index) << c.c0 << "," << c.c1 << "," << c.c2;
}

// Two nodes of equal count compete for the last free palette slot: the one
// with the lower node index is split, on every platform.
TEST(OctreeTest, EqualCountsSplitTheLowerNodeFirst) {
    _image_s* image = image_create(4, 1);
    ASSERT_NE(image, nullptr);
    // Layer-1 node 0 holds two layer-2 children, layer-1 node 7 too.
    const uint8_t colours[4][3] = {{0, 0, 0}, {0, 0, 64}, {255, 255, 255}, {255, 255, 191}};
    for (int x = 0; x < 4; ++x) ASSERT_EQ(image_pset(image, x, 0, colours[x]), 0);
    _octree* tree = octree_create();
    ASSERT_NE(tree, nullptr);
    ASSERT_EQ(octree_build(tree, image), 0);

    _colhist_s palette[3];
    ASSERT_EQ(octree_get_lab_palette(tree, palette, 3, 0), 3);
    EXPECT_EQ(palette[0].color, Packed(0, 0, 0));
    EXPECT_EQ(palette[1].color, Packed(0, 0, 64));
    EXPECT_EQ(palette[2].color, Packed(255, 255, 223));  // the unsplit node's mean
    for (const _colhist_s& c : palette) EXPECT_EQ(c.count, c.color == Packed(255, 255, 223) ? 2u : 1u);

    // Room for everything: all four colours, in node order.
    _colhist_s four[5];
    ASSERT_EQ(octree_get_lab_palette(tree, four, 5, 0), 4);
    EXPECT_EQ(four[3].color, Packed(255, 255, 255));
    EXPECT_EQ(four[4].count, 0u);

    // One colour: the mean of the image.
    _colhist_s one[1];
    ASSERT_EQ(octree_get_lab_palette(tree, one, 1, 0), 1);
    EXPECT_EQ(one[0].color, Packed(127, 127, 127));
    EXPECT_EQ(one[0].count, 4u);

    octree_kill(tree);
    image_kill(image);
}

TEST(OctreeTest, EmptyTreeHasNoPalette) {
    _octree* tree = octree_create();
    ASSERT_NE(tree, nullptr);
    _colhist_s palette[2] = {{7, 7}, {7, 7}};
    EXPECT_EQ(octree_get_lab_palette(tree, palette, 2, 1), 0);
    EXPECT_EQ(palette[0].count + palette[1].count + palette[0].color, 0u);
    EXPECT_EQ(octree_get_lab_palette(tree, palette, 0, 1), -1);
    octree_kill(tree);
}
