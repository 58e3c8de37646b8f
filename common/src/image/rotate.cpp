// Free rotation in fixed point. Angles are counted in steps of 1/1024
// radian; sine and cosine come from one quarter-wave table so the result
// does not depend on the platform's trigonometric functions.
#include <lumicor/zbm_image.h>

#include <cmath>

#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

constexpr int32_t kQuarterTurn = 1608;  // pi/2 × 1024, truncated
constexpr int32_t kHalfTurn = 2 * kQuarterTurn;
constexpr int32_t kFullTurn = 6433;     // 2 pi × 1024, truncated

// v[i] = round(1024 × sin(i / 1024)) for i = 0 .. 1608, built once. No
// entry lies within 3e-4 of a .5 tie, so a last-bit difference between
// platforms' sin() cannot change the table.
struct QuarterSine {
    int16_t v[kQuarterTurn + 1];
    QuarterSine() {
        for (int32_t i = 0; i <= kQuarterTurn; ++i) {
            v[i] = static_cast<int16_t>(std::floor(1024.0 * std::sin(i / 1024.0) + 0.5));
        }
    }
};

const QuarterSine& Table() {
    static const QuarterSine table;
    return table;
}

// 1024 × sin(t / 1024) for t in 0 .. kFullTurn - 1. The full turn has one
// step more than four quarters; that last step maps to -sin(0) = 0.
int32_t FixedSin(int32_t t) {
    const int16_t* q = Table().v;
    if (t <= kQuarterTurn) return q[t];
    if (t <= kHalfTurn) return q[kHalfTurn - t];
    if (t <= kHalfTurn + kQuarterTurn) return -q[t - kHalfTurn];
    if (t <= 2 * kHalfTurn) return -q[2 * kHalfTurn - t];
    return 0;
}

int32_t FixedCos(int32_t t) { return FixedSin((t + kQuarterTurn) % kFullTurn); }

// The angle in table steps, 0 .. kFullTurn - 1: -angle × 1024 truncated
// (the minus turns the forward rotation into the inverse mapping).
int32_t AngleSteps(float angle) {
    const float scaled = -angle * 1024.0f;
    int64_t steps;
    if (std::fabs(scaled) < 2147483648.0f) {
        steps = static_cast<int32_t>(scaled);
    } else {
        // Beyond int32 every float is an integer, so reducing first is exact.
        steps = static_cast<int64_t>(std::fmod(static_cast<double>(scaled), static_cast<double>(kFullTurn)));
    }
    steps %= kFullTurn;
    if (steps < 0) steps += kFullTurn;
    return static_cast<int32_t>(steps);
}

template <int32_t Bpp>
void RotateT(const _zbm_Image* src, _zbm_Image* dst, int32_t cosA, int32_t sinA) {
    const int64_t srcCx = static_cast<int64_t>(src->width / 2) << 10;
    const int64_t srcCy = static_cast<int64_t>(src->height / 2) << 10;
    const int64_t limitX = static_cast<int64_t>(src->width - 1) << 10;
    const int64_t limitY = static_cast<int64_t>(src->height - 1) << 10;
    const int32_t dstCx = dst->width / 2, dstCy = dst->height / 2;
    for (int32_t y = 0; y < dst->height; ++y) {
        const int64_t oy = y - dstCy;
        uint8_t* d = Row(dst, y);
        for (int32_t x = 0; x < dst->width; ++x, d += Bpp) {
            const int64_t ox = x - dstCx;
            const int64_t sx = ox * cosA - oy * sinA + srcCx;
            const int64_t sy = ox * sinA + oy * cosA + srcCy;
            if (sx < 0 || sy < 0 || sx >= limitX || sy >= limitY) continue;
            const uint32_t fx = static_cast<uint32_t>(sx & 1023), fy = static_cast<uint32_t>(sy & 1023);
            const uint8_t* top = Row(src, static_cast<int32_t>(sy >> 10)) + (sx >> 10) * Bpp;
            const uint8_t* bottom = top + src->pitch;
            for (int32_t c = 0; c < Bpp; ++c) {
                d[c] = static_cast<uint8_t>(Bilinear(top[c], top[c + Bpp], bottom[c], bottom[c + Bpp], fx, fy));
            }
        }
    }
}

}  // namespace

int ZbiuRotate(const _zbm_Image* src, _zbm_Image* dst, float angle) {
    if (!IsValidPair(src, dst) || !std::isfinite(angle)) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t steps = AngleSteps(angle);
    const int32_t cosA = FixedCos(steps), sinA = FixedSin(steps);
    switch (src->bytesPerPixel) {
        case 1: RotateT<1>(src, dst, cosA, sinA); break;
        case 3: RotateT<3>(src, dst, cosA, sinA); break;
        default: RotateT<4>(src, dst, cosA, sinA); break;
    }
    return ZBIU_OK;
}
