// Small photo files made by the tool's tests: JPEGs (optionally with an EXIF
// orientation) and PNGs of a known pattern.
#ifndef LUMICOR_TOOL_TESTS_TOOL_TEST_FILES_H
#define LUMICOR_TOOL_TESTS_TOOL_TEST_FILES_H

#include <cstdint>
#include <string>
#include <vector>

namespace lumicor_tool_test {

// Packed RGB rows.
struct Rgb {
    int width = 0, height = 0;
    std::vector<uint8_t> pixels;
    const uint8_t* At(int x, int y) const { return &pixels[(static_cast<size_t>(y) * width + x) * 3]; }
};

// Four flat quadrants (red, green, blue, white) on a w x h picture, so that
// orientation and colour survive JPEG coding.
Rgb Quadrants(int width, int height);

// A JPEG of `image` at quality 95; orientation 0 writes no EXIF block.
std::vector<uint8_t> EncodeJpeg(const Rgb& image, int orientation = 0);

// An 8-bit RGB PNG of `image`; with `transparentFirst` an RGBA PNG whose first
// pixel is fully transparent.
std::vector<uint8_t> EncodePng(const Rgb& image, bool transparentFirst = false);

// Writes bytes to path (the test fails when it cannot).
void WriteBytes(const std::string& path, const std::vector<uint8_t>& bytes);

}  // namespace lumicor_tool_test

#endif
