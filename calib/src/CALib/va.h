// VA: the working list of up to 16 attention areas, with its conversions to
// and from the exported _CAAttentionAreaArray record.
//
// Subject detection fills it in pixels of its reduced image and turns it into
// the exported array; the framing search loads an exported array back into it
// in cells of its framing grid. The list classes of both derive from it.
#ifndef LUMICOR_CALIB_CALIB_VA_H
#define LUMICOR_CALIB_CALIB_VA_H

#include <cstdint>

#include <lumicor/calib.h>

class VA {
public:
    static constexpr int kMaxAreas = 16;
    // Largest reference size SetAttentionAreaArray accepts: the framing grid
    // has at most 40 cells a side, and this bound keeps every product of two
    // coordinates far inside 32 bits.
    static constexpr int kMaxReferenceSize = 256;
    // Largest magnitude of a normalised coordinate SetAttentionAreaArray
    // accepts: an area may reach beyond the image, but not without bound.
    static constexpr float kMaxNormalisedExtent = 64.0f;

    VA();
    virtual ~VA();

    // Writes "num = ..." and one line per entry to standard output.
    void vPrint() const;

    // Fills `out` with `num` records normalised by refWidth x refHeight. The
    // record array is allocated with array new (also for no entries) and
    // belongs to the caller. Returns 0, 3 for a null `out` or a reference size
    // below 1, 4 when the allocation fails (isFace and numAreas are written
    // then, pAreaArray is null).
    uint32_t CreateAttentionAreaArray(int refWidth, int refHeight, _CAAttentionAreaArray* out) const;

    // Loads at most the first 16 records of `in`, scaled by refWidth x
    // refHeight and rounded to whole units. Returns 0, or 3 (list unchanged)
    // for a null `in`, a null record pointer with records announced, a
    // reference size outside 1..kMaxReferenceSize, or a loaded record with a
    // coordinate that is not a finite number within +-kMaxNormalisedExtent.
    uint32_t SetAttentionAreaArray(int refWidth, int refHeight, const _CAAttentionAreaArray* in);

    int32_t num;
    int32_t x[kMaxAreas];
    int32_t y[kMaxAreas];
    int32_t width[kMaxAreas];
    int32_t height[kMaxAreas];
    int32_t val[kMaxAreas];
    uint8_t isFace[kMaxAreas];
    int32_t direction[kMaxAreas];
};

#endif
