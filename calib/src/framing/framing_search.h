// The framing search: the crop of the requested shape with the lowest energy,
// found on the framing grid by a coarse scan over 20 sizes and a local
// refinement, then converted to fractions of the photo.
#ifndef LUMICOR_CALIB_FRAMING_FRAMING_SEARCH_H
#define LUMICOR_CALIB_FRAMING_FRAMING_SEARCH_H

#include <cstdint>

#include <lumicor/calib.h>

#include "calib/src/framing/framing_energy.h"

class VAMarge;

// Framing grid: 40 cells on the photo's long side.
constexpr int kFramingGridLongSide = 40;

// Bounds of the search. The optimiser uses the position bounds and the
// smallest scale; the size bounds record what that scale allows.
struct SearchRegion {
    int32_t left;
    int32_t right;
    int32_t top;
    int32_t bottom;
    int32_t minWidth;
    int32_t maxWidth;
    int32_t minHeight;
    int32_t maxHeight;
    float minScale;
};

class FramingSearch {
public:
    // W x H photo pixels, gw x gh framing grid cells.
    FramingSearch(int width, int height, int gridWidth, int gridHeight)
        : W(width), H(height), gw(gridWidth), gh(gridHeight) {}

    // Grid for a W x H photo: 40 cells on the long side, the short side in
    // proportion, rounded; at least one cell a side however elongated the
    // photo.
    static void GridSize(uint32_t width, uint32_t height, int* gridWidth, int* gridHeight);

    // Chooses the crop and writes it to `result` as fractions of the photo.
    // Returns 0; 4 when an allocation fails (result untouched); 12 when the
    // result is not a proper crop inside the photo (result written).
    uint32_t Search(const _CAParam* param, VAMarge* va, _CAResult* result);

    // Largest crop scale for the aspect ratio a, relative to the grid side
    // the optimiser scales.
    static float calculateMaximumRegionMin(int width, int height, float a);

    // Forces the aspect ratio a on the normalised result: grows the side that
    // is short, centred and clipped at the photo edges, then fits the other
    // side to it again.
    void correct(float a, _CAResult* result) const;

    int32_t W;
    int32_t H;
    int32_t gw;
    int32_t gh;
};

namespace Opt {

// Coarse-to-fine search from the initial crop `crop` (whole grid, energy
// 100.0). On 0 the crop holds the winner in photo pixels, pulled inside the
// photo; 4 when an allocation fails.
uint32_t Coarse2Fine(FramingSearch* fs, VAMarge* va, CropRegion* crop, SearchRegion region,
                     ObjectFunction* of);

// Converts a winning grid crop to photo pixels with the crop's scales and
// pulls it inside the photo: while it reaches past the right or bottom edge
// it loses a pixel of width (aspect <= 1) or height, the other side following
// the aspect; left and top stay.
void ToPixels(const FramingSearch* fs, CropRegion* crop);

}  // namespace Opt

#endif
