// Bad-exposure score of the representative meta: dark palette share of the
// similarity meta combined with the out-of-focus score.
#ifndef LUMICOR_KTLIB_BAD_EXPOSURE_H
#define LUMICOR_KTLIB_BAD_EXPOSURE_H

#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

// *badExposure = (e^2 + outOfFocus^2) / 2, where e rises from 0 to 0.5 as the
// near-black share p of the palette goes from 0 to 37 % and on to 1 at 100 %.
// `image` must be present (its pixels are not read). Returns 0; 3 when image,
// siml or badExposure is NULL; 4 when out of memory.
int CalcBadExposure(const _zbm_Image* image, const _KtMetaSimilarity* siml, float outOfFocus, float* badExposure);

#endif
