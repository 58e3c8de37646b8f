// Kernel throughput of the face engine's runtime: a pointwise and a 3x3
// convolution and a depthwise layer of typical sizes, with the portable
// 4-float kernels and with the best ones of this processor.
#include <benchmark/benchmark.h>

#include <vector>

#include "oriel/src/engine/nn/layers.h"

namespace {

using oriel::nn::Act;
using oriel::nn::Arena;
using oriel::nn::KernelChoice;
using oriel::nn::Pad;
using oriel::nn::Tensor;

// 0: portable kernels, 1: the best of this processor, 2: the best without AVX-512.
KernelChoice Choice(int64_t k) {
    return k == 0 ? KernelChoice::Portable : (k == 1 ? KernelChoice::Best : KernelChoice::NoAvx512);
}

void BM_Conv(benchmark::State& state) {
    const int size = static_cast<int>(state.range(0)), cin = static_cast<int>(state.range(1));
    const int stride = state.range(5) ? static_cast<int>(state.range(5)) : 1;
    const int cout = static_cast<int>(state.range(2)), k = static_cast<int>(state.range(3));
    const KernelChoice kc = Choice(state.range(4));
    std::vector<float> wts(static_cast<size_t>(k) * k * cin * ((cout + 7) / 8 * 8) + (cout + 7) / 8 * 8, 0.01f);
    oriel::nn::ConvWeights w;
    w.w = wts.data();
    w.b = wts.data() + wts.size() - (cout + 7) / 8 * 8;
    w.kh = w.kw = k;
    w.cin = cin;
    w.cout = cout;
    Arena a;
    Tensor in = a.Take(1, size, size, cin);
    oriel::nn::Conv2D(a, 2, in, w, stride, Pad::Same, Act::Relu, kc);
    a.Allocate();
    in = a.Take(1, size, size, cin);
    for (size_t i = 0; i < in.Size(); ++i) in.d[i] = 0.5f;
    for (auto _ : state) benchmark::DoNotOptimize(oriel::nn::Conv2D(a, 2, in, w, stride, Pad::Same, Act::Relu, kc).d);
    state.counters["GMAC/s"] = benchmark::Counter(static_cast<double>(size) * size * cin * cout * k * k * 1e-9 / (stride * stride),
                                                  benchmark::Counter::kIsIterationInvariantRate);
}
// size, cin, cout, kernel, kernel choice, stride: a late, the last and an
// early SSD pointwise layer, a recognition 3x3 layer and the SSD's first
// layer.
BENCHMARK(BM_Conv)
    ->Args({22, 512, 512, 1, 0, 1})
    ->Args({22, 512, 512, 1, 1, 1})
    ->Args({22, 512, 512, 1, 2, 1})
    ->Args({9, 1024, 1024, 1, 1, 1})
    ->Args({140, 32, 64, 1, 1, 1})
    ->Args({140, 32, 64, 1, 2, 1})
    ->Args({35, 32, 32, 3, 0, 1})
    ->Args({35, 32, 32, 3, 1, 1})
    ->Args({280, 3, 32, 3, 1, 2});

void BM_Depthwise(benchmark::State& state) {
    const int size = 88, c = 128;
    const KernelChoice kc = Choice(state.range(0));
    std::vector<float> wts(9 * c + c, 0.01f);
    oriel::nn::DepthwiseWeights w;
    w.w = wts.data();
    w.b = wts.data() + 9 * c;
    w.kh = w.kw = 3;
    w.c = c;
    Arena a;
    Tensor in = a.Take(1, size, size, c);
    oriel::nn::Depthwise(a, 2, in, w, 1, Pad::Same, Act::Relu6, kc);
    a.Allocate();
    in = a.Take(1, size, size, c);
    for (size_t i = 0; i < in.Size(); ++i) in.d[i] = 0.5f;
    for (auto _ : state) benchmark::DoNotOptimize(oriel::nn::Depthwise(a, 2, in, w, 1, Pad::Same, Act::Relu6, kc).d);
}
BENCHMARK(BM_Depthwise)->Arg(0)->Arg(1)->Arg(2);

}  // namespace
