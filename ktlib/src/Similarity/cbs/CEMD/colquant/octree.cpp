#include "ktlib/src/Similarity/cbs/CEMD/colquant/octree.h"

#include <lumicor/zbm_image.h>

#include <cstdlib>
#include <cstring>

#include "ktlib/src/Similarity/cbs/CBSCommon/cbs_error.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"

namespace {

// The deepest layer whose nodes are listed; a split then reaches layer 4.
const int kDeepestListedLayer = OCTREE_LAYERS - 2;
const int kMaxListed = 512;  // 8^kDeepestListedLayer

// A listed node of the chosen layer.
struct node_index_s {
    int32_t index;
    uint32_t count;
};

// A palette colour while it is being formed: channel means and pixel count.
struct Colour {
    uint32_t c[3];
    uint32_t count;
};

int LayerSize(int k) { return 1 << (3 * k); }

int octlayer_init(_octlayer* layer, int k) {
    layer->size = LayerSize(k);
    layer->nonEmpty = 0;
    layer->nodes = static_cast<_octnode*>(std::calloc(static_cast<size_t>(layer->size), sizeof(_octnode)));
    if (!layer->nodes) {
        CBS_ERROR("octnode_s malloc failed.\n");
        return -1;
    }
    return 0;
}

void Clear(_octree* tree) {
    for (int k = 0; k < tree->layers; ++k) {
        std::memset(tree->layer[k].nodes, 0, static_cast<size_t>(tree->layer[k].size) * sizeof(_octnode));
        tree->layer[k].nonEmpty = 0;
    }
}

// Larger counts first; equal counts keep ascending node order, so the choice
// of nodes to split never depends on the sort algorithm.
int CompareListed(const void* pa, const void* pb) {
    const node_index_s* a = static_cast<const node_index_s*>(pa);
    const node_index_s* b = static_cast<const node_index_s*>(pb);
    if (a->count != b->count) return a->count > b->count ? -1 : 1;
    return a->index < b->index ? -1 : (a->index > b->index ? 1 : 0);
}

Colour MeanOf(const _octnode& node) {
    Colour c;
    for (int ch = 0; ch < 3; ++ch) c.c[ch] = node.sum[ch] / node.count;
    c.count = node.count;
    return c;
}

uint32_t SquaredDistance(const Colour& a, const Colour& b) {
    uint32_t d = 0;
    for (int ch = 0; ch < 3; ++ch) {
        const int32_t diff = static_cast<int32_t>(a.c[ch]) - static_cast<int32_t>(b.c[ch]);
        d += static_cast<uint32_t>(diff * diff);
    }
    return d;
}

// Merges every colour held by fewer than t pixels into its nearest colour
// held by more than t pixels (the earlier one on equal distance).
void MergeSmall(Colour* colours, int n, int t) {
    for (int i = 0; i < n; ++i) {
        if (static_cast<int64_t>(colours[i].count) >= t) continue;
        int target = -1;
        uint32_t best = 0;
        for (int j = 0; j < n; ++j) {
            if (j == i || static_cast<int64_t>(colours[j].count) <= t) continue;
            const uint32_t d = SquaredDistance(colours[i], colours[j]);
            if (target < 0 || d < best) {
                target = j;
                best = d;
            }
        }
        if (target < 0) continue;
        Colour& dst = colours[target];
        Colour& src = colours[i];
        const uint64_t total = static_cast<uint64_t>(dst.count) + src.count;
        for (int ch = 0; ch < 3; ++ch) {
            const uint64_t weighted = static_cast<uint64_t>(dst.c[ch]) * dst.count + static_cast<uint64_t>(src.c[ch]) * src.count;
            dst.c[ch] = static_cast<uint32_t>(weighted / total);
        }
        dst.count = static_cast<uint32_t>(total);
        src = Colour();
    }
}

}  // namespace

extern "C" _octree* octree_create(void) {
    _octree* tree = static_cast<_octree*>(std::malloc(sizeof(_octree)));
    if (!tree) {
        CBS_ERROR("octree_s malloc failed.\n");
        return nullptr;
    }
    tree->layers = OCTREE_LAYERS;
    tree->layer = static_cast<_octlayer*>(std::calloc(OCTREE_LAYERS, sizeof(_octlayer)));
    if (!tree->layer) {
        CBS_ERROR("octlayer_s malloc failed.\n");
        std::free(tree);
        return nullptr;
    }
    for (int k = 0; k < OCTREE_LAYERS; ++k) {
        if (octlayer_init(&tree->layer[k], k) != 0) {
            CBS_ERROR("octlayer_init() failed.\n");
            octree_kill(tree);
            return nullptr;
        }
    }
    return tree;
}

extern "C" void octree_kill(_octree* tree) {
    if (!tree) return;
    if (tree->layer) {
        for (int k = 0; k < tree->layers; ++k) std::free(tree->layer[k].nodes);
        std::free(tree->layer);
    }
    std::free(tree);
}

namespace {

// Bits 7..4 of a channel value spread to their places in the leaf index
// (bit 7 to bit 9 + shift, ..., bit 4 to bit shift), for shift 2, 1, 0.
struct SpreadTable {
    uint16_t bits[3][256];
};

constexpr SpreadTable MakeSpreadTable() {
    SpreadTable t{};
    for (int shift = 0; shift < 3; ++shift)
        for (int v = 0; v < 256; ++v) {
            int index = 0;
            for (int bit = 7; bit >= 4; --bit) index = (index << 3) | (((v >> bit) & 1) << shift);
            t.bits[2 - shift][v] = static_cast<uint16_t>(index);
        }
    return t;
}

constexpr SpreadTable kSpread = MakeSpreadTable();

int LeafIndex(uint8_t c0, uint8_t c1, uint8_t c2) { return kSpread.bits[0][c0] | kSpread.bits[1][c1] | kSpread.bits[2][c2]; }

}  // namespace

extern "C" int octree_get_five_layer_index(int c0, int c1, int c2) {
    return LeafIndex(static_cast<uint8_t>(c0), static_cast<uint8_t>(c1), static_cast<uint8_t>(c2));
}

extern "C" int octree_build(_octree* tree, const _image_s* image) {
    if (!tree || !tree->layer || tree->layers != OCTREE_LAYERS || !image || !image->data || image->width <= 0 ||
        image->height <= 0) {
        return -1;
    }
    Clear(tree);
    _octnode* leaves = tree->layer[OCTREE_LAYERS - 1].nodes;
    const size_t pixels = static_cast<size_t>(image->width) * static_cast<size_t>(image->height);
    const uint8_t* p = image->data;
    for (size_t i = 0; i < pixels; ++i, p += 4) {
        _octnode& leaf = leaves[LeafIndex(p[0], p[1], p[2])];
        leaf.sum[0] += p[0];
        leaf.sum[1] += p[1];
        leaf.sum[2] += p[2];
        ++leaf.count;
    }
    for (int k = OCTREE_LAYERS - 2; k >= 0; --k) {
        _octlayer& layer = tree->layer[k];
        _octlayer& below = tree->layer[k + 1];
        below.nonEmpty = 0;
        for (int i = 0; i < layer.size; ++i) {
            _octnode& node = layer.nodes[i];
            for (int c = 0; c < 8; ++c) {
                const _octnode& child = below.nodes[8 * i + c];
                if (child.count == 0) continue;
                node.sum[0] += child.sum[0];
                node.sum[1] += child.sum[1];
                node.sum[2] += child.sum[2];
                node.count += child.count;
                ++node.children;
                ++below.nonEmpty;
            }
        }
    }
    tree->layer[0].nonEmpty = 1;
    return 0;
}

extern "C" int octree_get_lab_palette(const _octree* tree, _colhist_s* out, int n, int t) {
    if (!tree || !tree->layer || tree->layers != OCTREE_LAYERS || !out || n <= 0) return -1;
    std::memset(out, 0, static_cast<size_t>(n) * sizeof(_colhist_s));
    if (tree->layer[0].nodes[0].count == 0) return 0;

    // The deepest layer (up to 3) whose next layer still fits into n colours.
    int level = 0;
    while (level < kDeepestListedLayer && tree->layer[level + 1].nonEmpty <= n) ++level;
    const _octlayer& layer = tree->layer[level];
    const _octlayer& children = tree->layer[level + 1];

    int listed = 0;
    for (int i = 0; i < layer.size; ++i)
        if (layer.nodes[i].count != 0) ++listed;
    node_index_s* list = static_cast<node_index_s*>(std::malloc(static_cast<size_t>(listed) * sizeof(node_index_s)));
    if (!list) {
        CBS_ERROR("node_index_s malloc failed.\n");
        CBS_ERROR("node_index_create() failed.\n");
        return -1;
    }
    listed = 0;
    for (int i = 0; i < layer.size; ++i) {
        if (layer.nodes[i].count == 0) continue;
        list[listed].index = i;
        list[listed].count = layer.nodes[i].count;
        ++listed;
    }
    std::qsort(list, static_cast<size_t>(listed), sizeof(node_index_s), CompareListed);

    // Split the largest nodes while the colours still fit.
    bool split[kMaxListed] = {};
    int total = listed;
    for (int i = 0; i < listed; ++i) {
        const int after = total - 1 + static_cast<int>(layer.nodes[list[i].index].children);
        if (after > n) break;
        split[list[i].index] = true;
        total = after;
    }
    std::free(list);

    Colour* colours = static_cast<Colour*>(std::malloc(static_cast<size_t>(total) * sizeof(Colour)));
    if (!colours) {
        CBS_ERROR("node_index_s malloc failed.\n");
        return -1;
    }
    int emitted = 0;
    for (int i = 0; i < layer.size; ++i) {
        const _octnode& node = layer.nodes[i];
        if (node.count == 0) continue;
        if (!split[i]) {
            colours[emitted++] = MeanOf(node);
            continue;
        }
        for (int c = 0; c < 8; ++c) {
            const _octnode& child = children.nodes[8 * i + c];
            if (child.count != 0) colours[emitted++] = MeanOf(child);
        }
    }

    MergeSmall(colours, emitted, t);

    int kept = 0;
    for (int i = 0; i < emitted; ++i) {
        if (colours[i].count == 0) continue;
        int l = 0, a = 0, b = 0;
        srgb2lab(static_cast<int>(colours[i].c[0]), static_cast<int>(colours[i].c[1]), static_cast<int>(colours[i].c[2]), &l, &a, &b);
        out[kept].color = (static_cast<uint32_t>(l & 0xff) << 16) | (static_cast<uint32_t>(a & 0xff) << 8) | static_cast<uint32_t>(b & 0xff);
        out[kept].count = colours[i].count;
        ++kept;
    }
    std::free(colours);
    return kept;
}
