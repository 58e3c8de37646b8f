// Connected-component labelling of gray masks (4-adjacency) in two raster
// passes with an equivalence table.
#include <lumicor/zbm_image.h>

#include <cstdint>
#include <cstring>

#include "common/src/image/image_util.h"
#include "common/src/internal/memory.h"

using namespace lmk::image;

namespace {

// Equivalence table over provisional labels 1..ZBIU_LABELING_MAX_PROVISIONAL.
// parent[l] is 0 for a label without a record, otherwise a smaller label it
// is equivalent to, so following records always ends at the smallest label
// of a component.
class Equivalences {
public:
    bool Init() {
        parent_ = lmk::NewArray<int32_t>(ZBIU_LABELING_MAX_PROVISIONAL + 1);
        return static_cast<bool>(parent_);
    }

    int32_t Root(int32_t label) {
        while (parent_[label] != 0) {
            const int32_t up = parent_[label];
            if (parent_[up] != 0) parent_[label] = parent_[up];  // path halving keeps records pointing down
            label = up;
        }
        return label;
    }

    // Records that `larger` and `smaller` touch. Replacing larger's record
    // outright would forget what it was joined to before and split a region
    // whose arms meet more than once (a comb or a spiral); joining the two
    // components' smallest labels keeps every earlier equivalence, and for
    // every image without such a second meeting the result is unchanged.
    void Join(int32_t larger, int32_t smaller) {
        const int32_t a = Root(larger), b = Root(smaller);
        if (a == b) return;
        if (a > b) {
            parent_[a] = b;
        } else {
            parent_[b] = a;
        }
    }

    // Walks labels 1..n in increasing order: a label without a record gets
    // the next compact number; a recorded label takes the number of the
    // (smaller, already resolved) label it records. Returns the last number.
    int32_t Resolve(int32_t n) {
        int32_t next = 0;
        for (int32_t l = 1; l <= n; ++l) parent_[l] = parent_[l] == 0 ? ++next : parent_[parent_[l]];
        return next;
    }

    int32_t Resolved(int32_t label) const { return parent_[label]; }

private:
    lmk::UniqueArray<int32_t> parent_;
};

}  // namespace

int ZbiuLabeling(const _zbm_Image* image, int32_t* labels, int32_t* count) {
    if (!IsValidImage(image) || !labels || !count || image->order != ZBM_PIXEL_ORDER_GRAY) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    const int32_t w = image->width, h = image->height;
    // A valid gray layout keeps width × height below 2^31, but the label
    // array must also be addressable.
    const uint64_t pixels = static_cast<uint64_t>(w) * static_cast<uint64_t>(h);
    if (pixels > SIZE_MAX / sizeof(int32_t)) return ZBIU_ERR_INVALID_ARGUMENT;
    const size_t total = static_cast<size_t>(pixels);
    std::memset(labels, 0, total * sizeof(int32_t));
    *count = 0;
    Equivalences table;
    if (!table.Init()) return ZBIU_ERR_OUT_OF_MEMORY;

    int32_t provisional = 0;
    for (int32_t y = 0; y < h; ++y) {
        const uint8_t* p = Row(image, y);
        int32_t* row = labels + static_cast<size_t>(y) * w;
        const int32_t* above = y > 0 ? row - w : nullptr;
        for (int32_t x = 0; x < w; ++x) {
            if (p[x] == 0) continue;
            const int32_t up = above ? above[x] : 0;
            const int32_t left = x > 0 ? row[x - 1] : 0;
            int32_t label;
            if (up == 0 && left == 0) {
                if (provisional == ZBIU_LABELING_MAX_PROVISIONAL) {
                    std::memset(labels, 0, total * sizeof(int32_t));
                    return ZBIU_ERR_UNSUPPORTED_VALUE;
                }
                label = ++provisional;
            } else if (up == 0 || left == 0 || up == left) {
                label = up != 0 ? up : left;
            } else {
                label = up < left ? up : left;
                table.Join(up < left ? left : up, label);
            }
            row[x] = label;
        }
    }

    *count = table.Resolve(provisional);
    for (size_t i = 0; i < total; ++i) {
        if (labels[i] != 0) labels[i] = table.Resolved(labels[i]);
    }
    return ZBIU_OK;
}
