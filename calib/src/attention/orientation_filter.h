// Convolutions of the orientation filter library and the Gabor filter bank
// of the attention engine. Kernels are row-major, kernelWidth x kernelHeight;
// the kernel's centre sits at column (kernelWidth - 1) / 2 and row
// (kernelHeight - 1) / 2, and out(x, y) = sum k(i, j) * in(x + j - cx, y + i - cy),
// summed row by row in float. Reads outside the plane follow the border mode:
// 0 zero, 1 mirror, 2 wrap around, 3 repeat the nearest edge sample, any
// other value zero. Planes are packed (rows `width` samples apart).
#ifndef LUMICOR_CALIB_ATTENTION_ORIENTATION_FILTER_H
#define LUMICOR_CALIB_ATTENTION_ORIENTATION_FILTER_H

#include <cstdint>

// 8-bit plane to float plane.
void Conv2(const uint8_t* src, int32_t width, int32_t height, const float* kernel, int32_t kernelWidth,
           int32_t kernelHeight, int32_t border, float* dst);
// 8-bit plane to 8-bit plane: |result| truncated, at most 255.
void Conv2UCABS(const uint8_t* src, int32_t width, int32_t height, const float* kernel, int32_t kernelWidth,
                int32_t kernelHeight, int32_t border, uint8_t* dst);
// Float plane to 8-bit plane: |result| truncated, at most 255.
void ConvF2UCABS(const float* src, int32_t width, int32_t height, const float* kernel, int32_t kernelWidth,
                 int32_t kernelHeight, int32_t border, uint8_t* dst);

// Gabor filter bank: one frequency, several orientations, square kernels.
// Each orientation has an even (cosine) kernel with its mean removed and an
// odd (sine) kernel under a Gaussian envelope of sigma = kernel size / 4.5.
class GaborFilter {
public:
    static constexpr int kMaxOrientations = 8;
    static constexpr int kMaxKernel = 15;

    GaborFilter();
    // frequency in cycles per sample; orientations in radians; size odd, 3..15.
    int32_t iInit(float frequency, int32_t numOrientations, const float* orientations, int32_t size, int32_t border);
    // Power sqrt(even^2 + odd^2) of the responses for orientation o.
    int32_t GaborPower(const uint8_t* src, int32_t width, int32_t height, int32_t o, float* dst, float* work) const;
    int32_t NumOrientations() const { return numOrientations_; }

private:
    int32_t numOrientations_;
    int32_t size_;
    int32_t border_;
    float even_[kMaxOrientations][kMaxKernel * kMaxKernel];
    float odd_[kMaxOrientations][kMaxKernel * kMaxKernel];
};

#endif
