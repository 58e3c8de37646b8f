#include "calib/src/attention/orientation_filter.h"

#include <cmath>
#include <cstddef>
#include <cstring>

#include "common/src/internal/portable_math.h"

namespace {

// Source index of position i on an axis of n samples, or -1 for a zero read.
inline int32_t BorderIndex(int32_t i, int32_t n, int32_t mode) {
    if (i >= 0 && i < n) return i;
    switch (mode) {
        case 1: {  // mirror: -x - 1 before the start, 2n - x - 1 past the end
            int32_t m = i < 0 ? -i - 1 : 2 * n - i - 1;
            return m >= 0 && m < n ? m : (m < 0 ? 0 : n - 1);
        }
        case 2: {
            const int32_t m = i % n;
            return m < 0 ? m + n : m;
        }
        case 3:
            return i < 0 ? 0 : n - 1;
        default:
            return -1;
    }
}

template <typename S, typename Out>
void Convolve(const S* src, int32_t w, int32_t h, const float* k, int32_t kw, int32_t kh, int32_t border, Out out) {
    const int32_t cx = (kw - 1) / 2, cy = (kh - 1) / 2;
    for (int32_t y = 0; y < h; ++y) {
        const bool innerY = y - cy >= 0 && y - cy + kh <= h;
        for (int32_t x = 0; x < w; ++x) {
            float sum = 0.0f;
            if (innerY && x - cx >= 0 && x - cx + kw <= w) {
                for (int32_t i = 0; i < kh; ++i) {
                    const S* row = src + static_cast<std::ptrdiff_t>(y + i - cy) * w + (x - cx);
                    const float* kr = k + i * kw;
                    for (int32_t j = 0; j < kw; ++j) sum += kr[j] * static_cast<float>(row[j]);
                }
            } else {
                for (int32_t i = 0; i < kh; ++i) {
                    const int32_t sy = BorderIndex(y + i - cy, h, border);
                    const float* kr = k + i * kw;
                    for (int32_t j = 0; j < kw; ++j) {
                        const int32_t sx = BorderIndex(x + j - cx, w, border);
                        const float v = sy < 0 || sx < 0 ? 0.0f : static_cast<float>(src[static_cast<std::ptrdiff_t>(sy) * w + sx]);
                        sum += kr[j] * v;
                    }
                }
            }
            out(static_cast<std::ptrdiff_t>(y) * w + x, sum);
        }
    }
}

inline uint8_t AbsByte(float v) {
    const float a = std::fabs(v);
    return a >= 255.0f ? 255 : static_cast<uint8_t>(a);
}

// sin and cos from their series after reduction to [-pi, pi]; only IEEE
// basic operations, so every target builds the same kernels.
void SinCos(double x, double* s, double* c) {
    const double kTwoPi = 6.283185307179586476925;
    const double kPi = 3.141592653589793238463;
    while (x > kPi) x -= kTwoPi;
    while (x < -kPi) x += kTwoPi;
    double term = x, sum = x;
    for (int n = 1; n < 20; ++n) {
        term *= -x * x / ((2.0 * n) * (2.0 * n + 1.0));
        sum += term;
    }
    *s = sum;
    term = 1.0;
    double csum = 1.0;
    for (int n = 1; n < 20; ++n) {
        term *= -x * x / ((2.0 * n - 1.0) * (2.0 * n));
        csum += term;
    }
    *c = csum;
}

}  // namespace

void Conv2(const uint8_t* src, int32_t w, int32_t h, const float* k, int32_t kw, int32_t kh, int32_t border,
           float* dst) {
    Convolve(src, w, h, k, kw, kh, border, [dst](std::ptrdiff_t at, float v) { dst[at] = v; });
}

void Conv2UCABS(const uint8_t* src, int32_t w, int32_t h, const float* k, int32_t kw, int32_t kh, int32_t border,
                uint8_t* dst) {
    Convolve(src, w, h, k, kw, kh, border, [dst](std::ptrdiff_t at, float v) { dst[at] = AbsByte(v); });
}

void ConvF2UCABS(const float* src, int32_t w, int32_t h, const float* k, int32_t kw, int32_t kh, int32_t border,
                 uint8_t* dst) {
    Convolve(src, w, h, k, kw, kh, border, [dst](std::ptrdiff_t at, float v) { dst[at] = AbsByte(v); });
}

GaborFilter::GaborFilter() : numOrientations_(0), size_(0), border_(3) {
    std::memset(even_, 0, sizeof even_);
    std::memset(odd_, 0, sizeof odd_);
}

int32_t GaborFilter::iInit(float frequency, int32_t numOrientations, const float* orientations, int32_t size,
                           int32_t border) {
    if (numOrientations < 1 || numOrientations > kMaxOrientations || orientations == nullptr || size < 3 ||
        size > kMaxKernel || size % 2 == 0 || !(frequency > 0.0f)) {
        return -1;
    }
    const int32_t c = size / 2;
    const double sigma = size / 4.5;
    for (int32_t o = 0; o < numOrientations; ++o) {
        double st, ct;
        SinCos(orientations[o], &st, &ct);
        double evenSum = 0.0, envSum = 0.0;
        double even[kMaxKernel * kMaxKernel], env[kMaxKernel * kMaxKernel];
        for (int32_t i = 0; i < size; ++i) {
            for (int32_t j = 0; j < size; ++j) {
                const double x = j - c, y = i - c;
                const double xr = x * ct + y * st;
                const double e = lmk::Exp(-(x * x + y * y) / (2.0 * sigma * sigma));
                double s, co;
                SinCos(2.0 * 3.141592653589793238463 * frequency * xr, &s, &co);
                even[i * size + j] = e * co;
                env[i * size + j] = e;
                odd_[o][i * size + j] = static_cast<float>(e * s);
                evenSum += e * co;
                envSum += e;
            }
        }
        // Remove the even kernel's response to a flat picture.
        for (int32_t t = 0; t < size * size; ++t) {
            even_[o][t] = static_cast<float>(even[t] - evenSum / envSum * env[t]);
        }
    }
    numOrientations_ = numOrientations;
    size_ = size;
    border_ = border;
    return 0;
}

int32_t GaborFilter::GaborPower(const uint8_t* src, int32_t w, int32_t h, int32_t o, float* dst, float* work) const {
    if (o < 0 || o >= numOrientations_ || src == nullptr || dst == nullptr || work == nullptr) return -1;
    Conv2(src, w, h, even_[o], size_, size_, border_, dst);
    Conv2(src, w, h, odd_[o], size_, size_, border_, work);
    const int64_t n = static_cast<int64_t>(w) * h;
    for (int64_t i = 0; i < n; ++i) dst[i] = std::sqrt(dst[i] * dst[i] + work[i] * work[i]);
    return 0;
}
