// VAArrange: brings the detected rectangles (saliency-map or face-plane
// pixels) onto the small reference image in which the attention areas are
// expressed: faces are enlarged, every rectangle is scaled, salient
// rectangles grow into neighbouring pixels of the same dominant hue and merge
// when close and alike, and the list is ordered by saliency and clipped.
#ifndef LUMICOR_CALIB_ARRANGE_VA_ARRANGE_H
#define LUMICOR_CALIB_ARRANGE_VA_ARRANGE_H

#include <cstdint>

#include <lumicor/zbm_image.h>

#include "calib/src/CALib/va.h"

class VAArrange : public VA {
public:
    VAArrange();
    ~VAArrange() override;

    // Counts the valid slots, enlarges faces by half around their centre (in
    // saliency-map coordinates) and scales every slot to the reference image.
    void AdjustVa(const _zbm_Image* reference, const _zbm_Image* saliencyMap);
    // Growth along colour edges and merging of salient (non-face) slots.
    // 0, or 2 when the HSV copy of the reference cannot be created.
    uint32_t RectCombine(const _zbm_Image* reference);
    // Recount, order by val (largest first, stable) and clip to the reference.
    void ReAdjustVa(const _zbm_Image* reference);

    float scaleX;
    float scaleY;
};

#endif
