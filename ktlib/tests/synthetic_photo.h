// Deterministic RGB test photos for the similarity tests, benchmark and fuzz
// seeds: a sky gradient with a sun, striped and checkered patches of several
// frequencies and a little pseudo-random noise (integer arithmetic only, so
// the pixels are the same on every platform).
#ifndef LUMICOR_KTLIB_TESTS_SYNTHETIC_PHOTO_H
#define LUMICOR_KTLIB_TESTS_SYNTHETIC_PHOTO_H

#include <cstdint>
#include <vector>

namespace lumicor {
namespace test {

inline std::vector<uint8_t> SyntheticPhoto(int width, int height, uint32_t seed = 1) {
    std::vector<uint8_t> rgb(static_cast<size_t>(width) * height * 3);
    uint32_t state = seed;
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            int r = 40 + y * 120 / height, g = 90 + y * 60 / height, b = 210 - y * 100 / height;
            const int sx = x - width * 3 / 4, sy = y - height / 4;
            if (sx * sx + sy * sy < (height / 8) * (height / 8)) r = 250, g = 220, b = 90;
            if (y >= height / 2 && y < height * 15 / 16) {
                if (x < width * 2 / 5)
                    r = g = b = ((x / 2) % 2) ? 190 : 60;  // vertical stripes, period 4
                else if (x >= width / 2 && x < width * 9 / 10)
                    r = 30 + ((y / 4) % 2) * 150, g = 120, b = 40;  // horizontal stripes, period 8
                else
                    r = g = b = (((x / 3) + (y / 3)) % 2) ? 230 : 20;  // checker
            }
            state = state * 1664525u + 1013904223u;
            const int noise = static_cast<int>((state >> 24) % 17) - 8;
            uint8_t* p = &rgb[(static_cast<size_t>(y) * width + x) * 3];
            const int v[3] = {r + noise, g + noise, b + noise};
            for (int c = 0; c < 3; ++c) p[c] = static_cast<uint8_t>(v[c] < 0 ? 0 : (v[c] > 255 ? 255 : v[c]));
        }
    }
    return rgb;
}

}  // namespace test
}  // namespace lumicor

#endif
