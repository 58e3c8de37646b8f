// The annotated picture of an analysed photo: faces (box, eyes, age, smile),
// attention areas (saliency or face direction) and the outlines of fingers
// in front of the lens, drawn with the image model's drawing functions.
#ifndef LUMICOR_TOOL_ANNOTATE_H
#define LUMICOR_TOOL_ANNOTATE_H

#include <lumicor/vond.h>
#include <lumicor/zbm_image.h>

namespace lumicor_tool {

// Longest side of the annotated picture: larger photos are reduced first so
// that the labels of the built-in 5 x 9 font stay readable.
constexpr int kAnnotateMaxSide = 1600;

// A new RGB picture: `photo` (RGB, the analysed photo at its full size),
// reduced to at most kAnnotateMaxSide pixels on its longest side, with the
// meta drawn on it. Null when out of memory.
ZbmImagePtr Annotate(const _zbm_Image* photo, const _VondMeta& meta);

}  // namespace lumicor_tool

#endif
