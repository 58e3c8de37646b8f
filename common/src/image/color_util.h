// Per-pixel colour helpers shared by the single-pixel conversions and the
// whole-image conversion loops.
#ifndef LUMICOR_COMMON_IMAGE_COLOR_UTIL_H
#define LUMICOR_COMMON_IMAGE_COLOR_UTIL_H

#include <cstdint>

namespace lmk {
namespace image {

inline int Clamp255(int v) { return v < 0 ? 0 : (v > 255 ? 255 : v); }

// Luma with 10-bit weights (0.299, 0.587, 0.114), rounded.
inline uint8_t Gray(uint32_t r, uint32_t g, uint32_t b) {
    return static_cast<uint8_t>((306u * r + 601u * g + 117u * b + 512u) >> 10);
}

}  // namespace image
}  // namespace lmk

#endif
