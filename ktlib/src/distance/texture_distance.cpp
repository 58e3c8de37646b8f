// Texture distances between two similarity signatures.
#include <lumicor/ktsimilarity.h>

#include <cstdint>

#include "ktlib/src/Similarity/cbs/CBSCommon/cbs_error.h"
#include "ktlib/src/distance/transport.h"

namespace {

const int32_t kNone = KT_TEXTURE_DISTANCE_NONE;

int32_t Saturate(int64_t v) { return v > 0x7fffffff ? 0x7fffffff : static_cast<int32_t>(v); }

}  // namespace

extern "C" int texture_distance(int width1, int height1, int bins1, int* vertical1, int* horizontal1, int width2,
                                int height2, int bins2, int* vertical2, int* horizontal2) {
    if (width1 <= 0 || height1 <= 0 || bins1 <= 0 || width2 <= 0 || height2 <= 0 || bins2 <= 0) return kNone;
    if (bins1 > KT_TEXTURE_BINS) {
        CBS_ERROR(
            "texture_distance: Array too small. Change the length of the arrays m1[8] and m2[8] to the number of "
            "texture bins");
        return -1;
    }
    if (!vertical1 || !horizontal1 || !vertical2 || !horizontal2) return kNone;

    int32_t horizontal = 0;
    int32_t vertical = 0;
    if (transport::TextureCost(horizontal1, horizontal2, bins1, &horizontal) != transport::kOk ||
        transport::TextureCost(vertical1, vertical2, bins1, &vertical) != transport::kOk) {
        return kNone;
    }
    const int64_t d = horizontal > vertical ? horizontal : vertical;
    // Normalise by the larger image: costs grow with the number of blocks.
    // The quotient is truncated before scaling, as the stored results were
    // computed; only a result beyond 32 bits (images far above the analysed
    // size) saturates instead of wrapping.
    const int64_t area1 = static_cast<int64_t>(width1) * height1;
    const int64_t area2 = static_cast<int64_t>(width2) * height2;
    if (area1 <= area2) return Saturate(d / width2 * 65536 / height2);
    return Saturate(d / width1 * 65536 / height1);
}

int texture_distance(_texture_s* t1, _texture_s* t2) {
    if (!t1 || !t2) return kNone;
    return texture_distance(t1->width, t1->height, t1->bins, t1->vertical, t1->horizontal, t2->width, t2->height,
                            t2->bins, t2->vertical, t2->horizontal);
}

extern "C" int texture_distance_rotatable(_texture_s* t1, _texture_s* t2) {
    if (!t1 || !t2) return kNone;
    const int plain = texture_distance(t1, t2);
    // t2 turned by 90 degrees: its rows become columns.
    const int turned = texture_distance(t1->width, t1->height, t1->bins, t1->vertical, t1->horizontal, t2->height,
                                        t2->width, t2->bins, t2->horizontal, t2->vertical);
    return turned < plain ? turned : plain;
}

extern "C" int KtSimlGetTexture(const _KtMetaSimilarity* m, _texture_s* t) {
    if (!m || !t) return KT_ERR_NULL;
    t->width = m->width;
    t->height = m->height;
    t->bins = KT_TEXTURE_BINS;
    for (int i = 0; i < KT_TEXTURE_BINS; ++i) {
        const uint32_t v = m->verHist[i];
        const uint32_t h = m->horHist[i];
        t->vertical[i] = v > 0x7fffffffu ? 0x7fffffff : static_cast<int32_t>(v);
        t->horizontal[i] = h > 0x7fffffffu ? 0x7fffffff : static_cast<int32_t>(h);
    }
    return KT_OK;
}
