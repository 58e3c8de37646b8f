// Reductions of one photo to several sizes.
#ifndef LUMICOR_COMMON_IMAGE_RESIZE_H
#define LUMICOR_COMMON_IMAGE_RESIZE_H

#include <lumicor/zbm_image.h>

#include <cstdint>

namespace lmk {
namespace image {

// Fills each of the `count` destinations with exactly what
// ZbiuResize(src, dsts[i]) gives, reading a large source once: destinations
// reduced through the halving pyramid share the levels they have in common
// (the smaller ones continue from the last level the larger ones need).
// Returns 0, or ZbiuResize's code of the first failure (3 for an invalid
// pair or a null list, 4 when scratch memory runs out); destinations not yet
// filled at a failure are left unspecified.
int ResizeEach(const _zbm_Image* src, _zbm_Image* const* dsts, int32_t count);

}  // namespace image
}  // namespace lmk

#endif
