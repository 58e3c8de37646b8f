// Scaling of one 8-bit plane given by pointer, size and stride: the routine
// the attention engine uses for its pyramids and centre-surround maps and the
// pixel-difference face detector for its scale pyramid.
#ifndef LUMICOR_COMMON_INTERNAL_PLANE_SCALE_H
#define LUMICOR_COMMON_INTERNAL_PLANE_SCALE_H

#include <cstdint>

// Scales the srcWidth x srcHeight plane at src (rows srcStride bytes apart)
// to dstWidth x dstHeight at dst (rows dstStride bytes apart). Equal sizes are
// copied. A source more than twice the target in either dimension is first
// reduced step by step: each step halves ((n + 1) / 2) every axis still more
// than twice its target and takes every other axis straight to its target;
// one final step then reaches the target. Every step samples bilinearly on the
// 10-bit grid of ZbiuResize (an exact halving gives the 2x2 mean).
// The two planes must not overlap. Returns 0; 3 for a null pointer, a size
// below 1, a stride shorter than a row or a plane whose span does not fit in
// 32 bits; 4 when the scratch planes of a multi-step reduction cannot be
// allocated (single steps allocate nothing).
int IIScaleImage(uint8_t* dst, int32_t dstWidth, int32_t dstHeight, int32_t dstStride, const uint8_t* src,
                 int32_t srcWidth, int32_t srcHeight, int32_t srcStride);

#endif
