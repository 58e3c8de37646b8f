// Synthetic photos for the attention tests: a soft background with a few
// strong coloured shapes, the same bytes on every target.
#ifndef LUMICOR_CALIB_TESTS_ATTENTION_FIXTURES_H
#define LUMICOR_CALIB_TESTS_ATTENTION_FIXTURES_H

#include <cstdint>
#include <vector>

namespace attention_test {

// width x height RGB pixels (rows 3 x width bytes): a diagonal gradient
// background, a red disc, a blue bar and a small yellow square.
inline std::vector<uint8_t> MakePhoto(int width, int height) {
    std::vector<uint8_t> px(static_cast<size_t>(width) * height * 3);
    const int64_t cx = width * 2 / 3, cy = height / 3, r = (width < height ? width : height) / 6;
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            uint8_t* p = &px[(static_cast<size_t>(y) * width + x) * 3];
            uint8_t rr = static_cast<uint8_t>(90 + 40 * x / width);
            uint8_t gg = static_cast<uint8_t>(110 + 30 * y / height);
            uint8_t bb = static_cast<uint8_t>(100 + (x + y) % 7);
            const int64_t dx = x - cx, dy = y - cy;
            if (dx * dx + dy * dy <= r * r) rr = 230, gg = 30, bb = 40;
            if (x > width / 8 && x < width / 8 + width / 10 && y > height / 2 && y < height * 9 / 10) {
                rr = 20, gg = 40, bb = 220;
            }
            if (x > width / 2 && x < width / 2 + width / 20 && y > height * 3 / 4 && y < height * 3 / 4 + width / 20) {
                rr = 250, gg = 240, bb = 20;
            }
            p[0] = rr;
            p[1] = gg;
            p[2] = bb;
        }
    }
    return px;
}

}  // namespace attention_test

#endif
