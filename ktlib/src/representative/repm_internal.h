// Steps of KtRepmExtract, shared with its tests.
#ifndef LUMICOR_KTLIB_REPRESENTATIVE_REPM_INTERNAL_H
#define LUMICOR_KTLIB_REPRESENTATIVE_REPM_INTERNAL_H

#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

#include "ktlib/src/finger/fol.h"

#include <cstdint>

namespace ktrepm {

// Pixel-weighted mean Lab distance between the palette colours (lightness
// weighted 0.7), x 10 / pixels, capped at 255 and scaled to 0..1; 0 for a
// meta of zero size.
float ColorVariation(const _KtMetaSimilarity& siml);
// Size of about `pixels` pixels with the photo's aspect ratio; 3 when a side
// does not fit 31 bits.
int SizeForPixels(uint32_t width, uint32_t height, double pixels, int32_t* w, int32_t* h);
// The first KT_MAX_FINGERS fingers in analysed pixels; 4 out of memory (the
// record keeps what was stored, for its dispose).
int StoreFingers(const zbmvector<FOL::Finger>& fingers, uint32_t width, uint32_t height, _KtMetaRepresentative* m);
// The blur map scaled to a quarter (rounded) in each direction.
int StoreBlurMap(const _zbm_Image* map, _KtMetaRepresentative* m);
// -1.0 (not measured) or within [0, 1].
bool ScoreInRange(float v);
// The working copies of a photo: *small of about 80 x 60 pixels in the
// photo's order (resized from a copy of about 640 x 480) and *gray, that copy
// in gray. 3 when a size does not fit, 4 out of memory, image-function codes.
int MakeWorkingCopies(const _zbm_Image* photo, ZbmImagePtr* gray, ZbmImagePtr* small);

}  // namespace ktrepm

#endif
