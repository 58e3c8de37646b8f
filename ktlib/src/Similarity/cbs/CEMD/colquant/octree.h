// Colour octree of the similarity palette: five layers over the top four bits
// of R, G and B (layer k holds 8^k nodes; the children of node i of layer k
// are nodes 8i .. 8i+7 of layer k+1), and the palette extraction over it.
#ifndef LUMICOR_KTLIB_CBS_OCTREE_H
#define LUMICOR_KTLIB_CBS_OCTREE_H

#include <stdint.h>

struct _image_s;

#define OCTREE_LAYERS 5

struct _octnode {
    uint32_t sum[3];   // channel sums of the pixels below this node
    uint32_t count;    // pixels below this node
    uint32_t children; // non-empty children
};

struct _octlayer {
    int32_t size;      // 8^k nodes
    int32_t nonEmpty;  // non-empty nodes of this layer
    _octnode* nodes;
};

struct _octree {
    int32_t layers;    // OCTREE_LAYERS
    _octlayer* layer;
};

// One palette entry: channel 0 in bits 16..23, channel 1 in bits 8..15,
// channel 2 in bits 0..7, and its pixel count.
struct _colhist_s {
    uint32_t color;
    uint32_t count;
};

extern "C" {
// New empty tree; NULL when out of memory. Release with octree_kill.
_octree* octree_create(void);
// Frees the tree and its layers; NULL is ignored.
void octree_kill(_octree* tree);
// Leaf index (0..4095) of a colour: four 3-bit groups from channel bits 7, 6,
// 5 and 4 (bit 7 most significant); in a group c0 gives the high bit.
int octree_get_five_layer_index(int c0, int c1, int c2);
// Empties the tree and fills it with every pixel of image. -1 on a NULL or
// empty argument.
int octree_build(_octree* tree, const _image_s* image);
// Extracts at most n colours into out[0 .. n-1], merging colours held by
// fewer than t pixels into the nearest colour held by more than t pixels;
// kept colours are converted to 8-bit Lab and the unused slots are zeroed.
// Returns the number of colours kept (0 for an empty tree), or -1 for a bad
// argument or out of memory.
int octree_get_lab_palette(const _octree* tree, _colhist_s* out, int n, int t);
}

#endif
