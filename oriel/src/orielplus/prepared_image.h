// The engine's internal image: a packed, top-down RGB copy of the caller's
// pixels in any input colour mode.
#ifndef ORIEL_ORIELPLUS_PREPARED_IMAGE_H
#define ORIEL_ORIELPLUS_PREPARED_IMAGE_H

#include <lumicor/orielplus.h>

#include <cstdint>

#include "common/src/internal/memory.h"
#include "oriel/src/engine/nn/image_input.h"

namespace oriel {

class PreparedImage {
public:
    // False for an unusable image (size 0 or above 16,000,000 pixels,
    // unknown mode, a stride shorter than a row) or when out of memory.
    bool Prepare(const uint8_t* pixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode, int32_t stride);
    void Reset();
    bool Matches(const uint8_t* pixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                 int32_t stride) const;
    bool Valid() const { return static_cast<bool>(rgb_); }
    nn::ImageView View() const;

private:
    lmk::UniqueArray<uint8_t> rgb_;
    const uint8_t* src_ = nullptr;
    uint32_t width_ = 0, height_ = 0;
    Oriel_InputColorMode mode_ = ORIEL_COLOR_RGB;
    int32_t stride_ = 0;
};

}  // namespace oriel

#endif
