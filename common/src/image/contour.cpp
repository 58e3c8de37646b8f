// Outline of the first region of a gray mask by border following.
#include <lumicor/zbm_image.h>

#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

// The eight neighbours in clockwise order (rows top-down), starting left.
const int32_t kDx[8] = {-1, -1, 0, 1, 1, 1, 0, -1};
const int32_t kDy[8] = {0, -1, -1, -1, 0, 1, 1, 1};

int32_t DirectionOf(int32_t dx, int32_t dy) {
    for (int32_t d = 0; d < 8; ++d)
        if (kDx[d] == dx && kDy[d] == dy) return d;
    return 0;
}

bool IsSet(const _zbm_Image* image, int32_t x, int32_t y) {
    return x >= 0 && y >= 0 && x < image->width && y < image->height && Row(image, y)[x] != 0;
}

}  // namespace

// Moore-neighbour tracing: from the current pixel, scan its neighbours
// clockwise starting just after the background pixel we came from; the first
// set pixel is the next border pixel and the neighbour scanned before it the
// new background pixel. The next move depends only on the pixel and that
// background pixel, so once the start pixel is left in the same direction as
// at the beginning the trace would repeat itself: that ends it. Pixels on
// one-pixel-wide parts therefore appear once per side.
int ZbiuGetContour(const _zbm_Image* image, zbmvector<zbm_Pos>& points) {
    points.Clear();
    if (!IsValidImage(image) || image->order != ZBM_PIXEL_ORDER_GRAY) return ZBIU_ERR_INVALID_ARGUMENT;

    zbm_Pos start = {-1, -1};
    for (int32_t y = 0; y < image->height && start.x < 0; ++y) {
        const uint8_t* row = Row(image, y);
        for (int32_t x = 0; x < image->width; ++x) {
            if (row[x] != 0) {
                start.x = x;
                start.y = y;
                break;
            }
        }
    }
    if (start.x < 0) return ZBIU_OK;

    // The first set pixel in raster order has background on its left.
    zbm_Pos p = start, back = {start.x - 1, start.y};
    int32_t firstMove = -1;
    // Each border pixel is left at most once towards each of its 8 sides.
    const uint64_t limit = 8ull * static_cast<uint64_t>(image->width) * static_cast<uint64_t>(image->height) + 8;
    for (uint64_t step = 0; step < limit; ++step) {
        const int32_t from = DirectionOf(back.x - p.x, back.y - p.y);
        int32_t move = -1;
        for (int32_t i = 1; i <= 8; ++i) {
            const int32_t d = (from + i) & 7;
            if (IsSet(image, p.x + kDx[d], p.y + kDy[d])) {
                move = d;
                break;
            }
        }
        const bool atStart = p.x == start.x && p.y == start.y;
        if (atStart && step > 0 && move == firstMove) break;
        if (!points.PushBack(p)) return ZBIU_ERR_OUT_OF_MEMORY;
        if (move < 0) break;  // an isolated pixel
        if (step == 0) firstMove = move;
        const int32_t scannedBefore = (move + 7) & 7;
        back.x = p.x + kDx[scannedBefore];
        back.y = p.y + kDy[scannedBefore];
        p.x += kDx[move];
        p.y += kDy[move];
    }
    return ZBIU_OK;
}
