// Layer kernels of the face networks (float32, NHWC, one image).
//
// Every kernel accumulates each output value in one fixed order (taps, then
// input channels, each from first to last; bias added last), whatever the
// vector width, so x86-64 and 32-bit ARM give the same results (the library
// is built without fused multiply-add) up to NEON's flushing of subnormal
// values. Kernels never
// allocate: they write into arena slots planned beforehand.
#ifndef ORIEL_ENGINE_NN_LAYERS_H
#define ORIEL_ENGINE_NN_LAYERS_H

#include "oriel/src/engine/nn/tensor.h"
#include "oriel/src/engine/nn/weights.h"

namespace oriel {
namespace nn {

enum class Act { None, Relu, Relu6, Leaky };
// Same: output ceil(in / stride), zero padding split as in the usual
// convention (the smaller half before). Valid: no padding.
enum class Pad { Same, Valid };

// Output size and leading padding of one axis.
void PadFor(int in, int k, int stride, Pad pad, int* out, int* before);

// Kernel variants: Best picks the widest vectors the processor has
// (AVX-512 or AVX2 on x86-64 when present, NEON on ARM); Portable forces
// the generic 4-float kernels; NoAvx512 is Best without the AVX-512
// kernels. They give identical results, except that NEON treats subnormal
// values (below 1.2e-38) as 0.
enum class KernelChoice { Best, Portable, NoAvx512 };

Tensor Conv2D(Arena& a, int slot, const Tensor& in, const ConvWeights& w, int stride, Pad pad, Act act,
              KernelChoice kernels = KernelChoice::Best);
Tensor Depthwise(Arena& a, int slot, const Tensor& in, const DepthwiseWeights& w, int stride, Pad pad, Act act,
                 KernelChoice kernels = KernelChoice::Best);
// Max pooling; with Same padding only the values inside the image count.
Tensor MaxPool(Arena& a, int slot, const Tensor& in, int k, int stride, Pad pad);
// Average pooling without padding.
Tensor AvgPool(Arena& a, int slot, const Tensor& in, int k, int stride);

// out[j] = bias[j] + sum_i x[i] * W[i][j].
void Dense(const float* x, const DenseWeights& w, float* out);
// Mean over all pixels, one value per channel.
void GlobalMean(const Tensor& in, float* out);

// Elementwise helpers; shapes must match (checked while planning by the callers).
void AddInto(const Tensor& dst, const Tensor& src);        // dst += src
void ReluInto(const Tensor& dst, const Tensor& src);       // dst = max(src, 0)
void ReluInPlace(const Tensor& t);
void Copy(const Tensor& dst, const Tensor& src);

}  // namespace nn
}  // namespace oriel

#endif
