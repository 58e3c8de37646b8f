// Network inputs from 8-bit photos: a crop of the photo placed on a
// zero-filled canvas, resized bilinearly (corner-aligned sampling without
// half-pixel offset) and normalised per channel, written as float RGB.
#ifndef ORIEL_ENGINE_NN_IMAGE_INPUT_H
#define ORIEL_ENGINE_NN_IMAGE_INPUT_H

#include <cstdint>

namespace oriel {
namespace nn {

struct ImageView {
    const uint8_t* p = nullptr;  // first byte of the top row
    int w = 0;
    int h = 0;
    int stride = 0;  // bytes between rows (may be negative)
    int bpp = 3;     // bytes per pixel
    int r = 0, g = 1, b = 2;  // byte offsets of the channels in a pixel
};

struct Crop {
    int x = 0, y = 0, w = 0, h = 0;  // region of the photo, inside it
};

struct Canvas {
    int w = 0, h = 0;        // canvas size (the crop plus zero padding)
    int offX = 0, offY = 0;  // where the crop's top-left lies on the canvas
};

// Writes outW x outH x 3 floats: ((value on the canvas) - mean[c]) / div.
void SampleCanvas(const ImageView& img, const Crop& crop, const Canvas& canvas, int outW, int outH,
                  const float mean[3], float div, float* out);

// Square canvas around a crop: the longer side, the crop centred (as the
// face networks expect) or at the top-left (as the detectors expect).
Canvas SquareCanvas(const Crop& crop, bool centred);

}  // namespace nn
}  // namespace oriel

#endif
