#include "oriel/src/engine/nn/layers.h"

#include <cstring>

#if defined(__x86_64__) || defined(__i386__)
#include <immintrin.h>
#elif defined(__ARM_NEON)
#include <arm_neon.h>
#endif

namespace oriel {
namespace nn {

namespace {

const int kBlock = 8;  // output channels per weight block (see weights.h)

// o[i] = activation(o[i] + bias[i]) for n values, one loop per activation
// so that each one vectorises.
inline void BiasActivate(float* o, const float* bias, int n, Act act) {
    switch (act) {
        case Act::Relu:
            for (int i = 0; i < n; ++i) {
                const float v = o[i] + bias[i];
                o[i] = v > 0.0f ? v : 0.0f;
            }
            break;
        case Act::Relu6:
            for (int i = 0; i < n; ++i) {
                const float v = o[i] + bias[i];
                o[i] = v > 0.0f ? (v < 6.0f ? v : 6.0f) : 0.0f;
            }
            break;
        case Act::Leaky:
            for (int i = 0; i < n; ++i) {
                const float v = o[i] + bias[i];
                o[i] = v > 0.0f ? v : v * 0.1f;
            }
            break;
        case Act::None:
        default:
            for (int i = 0; i < n; ++i) o[i] += bias[i];
            break;
    }
}

// Copies `in` into a zero-bordered buffer so that the kernels need no bounds
// checks.
void PadInto(float* dst, const Tensor& in, int top, int left, int hp, int wp) {
    const size_t rowFloats = static_cast<size_t>(wp) * in.c;
    const size_t leftFloats = static_cast<size_t>(left) * in.c;
    const size_t inFloats = static_cast<size_t>(in.w) * in.c;
    const size_t rightFloats = rowFloats - leftFloats - inFloats;
    std::memset(dst, 0, rowFloats * static_cast<size_t>(top) * sizeof(float));
    for (int y = 0; y < in.h; ++y) {
        float* row = dst + static_cast<size_t>(y + top) * rowFloats;
        std::memset(row, 0, leftFloats * sizeof(float));
        std::memcpy(row + leftFloats, in.At(y, 0), inFloats * sizeof(float));
        std::memset(row + leftFloats + inFloats, 0, rightFloats * sizeof(float));
    }
    const int below = hp - top - in.h;
    std::memset(dst + static_cast<size_t>(top + in.h) * rowFloats, 0, rowFloats * static_cast<size_t>(below) * sizeof(float));
}

// Vectors through the compiler's generic vector extension (SSE or AVX2 on
// x86-64, NEON on ARM): element-wise multiply and add only, each rounded
// on its own, and every output channel accumulates over taps and input
// channels in the same order whatever the vector width. So every build and
// every kernel variant computes the same values.
#define ORIEL_INLINE inline __attribute__((always_inline))

template <int W>
struct Vec {
    typedef float T __attribute__((vector_size(W * 4)));
    typedef float U __attribute__((vector_size(W * 4), aligned(4)));
    static ORIEL_INLINE T Load(const float* p) { return *reinterpret_cast<const U*>(p); }
    static ORIEL_INLINE void Store(float* p, T v) { *reinterpret_cast<U*>(p) = v; }
    static ORIEL_INLINE T Splat(float a);
};
template <>
ORIEL_INLINE Vec<4>::T Vec<4>::Splat(float a) {
    return T{a, a, a, a};
}


// P output pixels, one block of 8 output channels (8 / W vectors). x[p]
// points at the first tap of pixel p; taps step by `rowStep` floats per
// kernel row and `cin` per kernel column. Accumulators stay in registers.
template <int W, int P>
ORIEL_INLINE void ConvKernel(const float* const* x, size_t rowStep, int kh, int kw, int cin, const float* w,
                             float (&out)[P][kBlock]) {
    typedef Vec<W> V;
    const int NV = kBlock / W;
    typename V::T acc[P][NV];
    for (int p = 0; p < P; ++p)
        for (int v = 0; v < NV; ++v) acc[p][v] = V::Splat(0.0f);
    for (int ky = 0; ky < kh; ++ky) {
        for (int kx = 0; kx < kw; ++kx) {
            const size_t tap = ky * rowStep + static_cast<size_t>(kx) * cin;
            const float* wv = w + (static_cast<size_t>(ky) * kw + kx) * cin * kBlock;
            const float* xp[P];
            for (int p = 0; p < P; ++p) xp[p] = x[p] + tap;
            for (int ci = 0; ci < cin; ++ci, wv += kBlock) {
                typename V::T wt[NV];
                for (int v = 0; v < NV; ++v) wt[v] = V::Load(wv + v * W);
                for (int p = 0; p < P; ++p) {
                    const typename V::T a = V::Splat(xp[p][ci]);
                    for (int v = 0; v < NV; ++v) acc[p][v] += a * wt[v];
                }
            }
        }
    }
    for (int p = 0; p < P; ++p)
        for (int v = 0; v < NV; ++v) V::Store(out[p] + v * W, acc[p][v]);
}

struct PortableKernel {
    template <int P>
    static ORIEL_INLINE void Run(const float* const* x, size_t rowStep, int kh, int kw, int cin, const float* w,
                                 float (&out)[P][kBlock]) {
        ConvKernel<4, P>(x, rowStep, kh, kw, cin, w, out);
    }
};

template <int P>
ORIEL_INLINE void StoreBlock(float* const* out, const float (&acc)[P][kBlock], const float* bias, int n, Act act) {
    for (int p = 0; p < P; ++p) {
        float v[kBlock];
        for (int j = 0; j < kBlock; ++j) v[j] = acc[p][j];
        BiasActivate(v, bias, kBlock, act);
        for (int j = 0; j < n; ++j) out[p][j] = v[j];
    }
}

// Accumulation by kernel K, then bias and activation into the outputs.
template <class K>
struct Stored : K {
    template <int P>
    static ORIEL_INLINE void RunStore(const float* const* x, size_t rowStep, int kh, int kw, int cin, const float* w,
                                      const float* bias, int n, Act act, float* const* out) {
        float acc[P][kBlock];
        K::template Run<P>(x, rowStep, kh, kw, cin, w, acc);
        StoreBlock<P>(out, acc, bias, n, act);
    }
};

struct ConvJob {
    const float* src;  // input (padded when needed)
    size_t rowStep;    // floats per input row
    int cin, ho, wo, stride;
    bool flat;         // 1x1 stride 1 without padding: one list of pixels
    const ConvWeights* w;
    float* out;
    Act act;
};

// Q (P or 1) output pixels of row oy starting at column ox, output
// channels [8 cb, 8 cb + 8).
template <class K, int Q>
ORIEL_INLINE void ConvPixels(const ConvJob& j, int cb, int oy, int ox) {
    const ConvWeights& w = *j.w;
    const int cols = j.flat ? j.ho * j.wo : j.wo;
    const int step = j.flat ? 1 : j.stride;
    const float* row = j.src + static_cast<size_t>(oy) * j.stride * j.rowStep;
    float* orow = j.out + static_cast<size_t>(oy) * cols * w.cout + cb * kBlock;
    const float* wb = w.w + static_cast<size_t>(cb) * w.kh * w.kw * w.cin * kBlock;
    const float* x[Q];
    float* o[Q];
    for (int k = 0; k < Q; ++k) {
        x[k] = row + static_cast<size_t>(ox + k) * step * j.cin;
        o[k] = orow + static_cast<size_t>(ox + k) * w.cout;
    }
    const int n = (w.cout - cb * kBlock) < kBlock ? (w.cout - cb * kBlock) : kBlock;
    K::template RunStore<Q>(x, j.rowStep, w.kh, w.kw, j.cin, wb, w.b + cb * kBlock, n, j.act, o);
}

// Every output value is computed on its own, so the loop order only
// matters for the caches: with small weights each block of input pixels
// is read once for all output channels; with large weights each block of
// weights is read once for all pixels.
template <class K, int P>
ORIEL_INLINE void ConvLoops(const ConvJob& j) {
    const ConvWeights& w = *j.w;
    const int blocks = (w.cout + kBlock - 1) / kBlock;
    const int rows = j.flat ? 1 : j.ho;  // a flat job is one row of ho * wo pixels
    const int cols = j.flat ? j.ho * j.wo : j.wo;
    const size_t weightBytes = static_cast<size_t>(blocks) * w.kh * w.kw * w.cin * kBlock * sizeof(float);
    if (weightBytes <= 64 * 1024) {
        for (int oy = 0; oy < rows; ++oy) {
            int ox = 0;
            for (; ox + P <= cols; ox += P)
                for (int cb = 0; cb < blocks; ++cb) ConvPixels<K, P>(j, cb, oy, ox);
            for (; ox < cols; ++ox)
                for (int cb = 0; cb < blocks; ++cb) ConvPixels<K, 1>(j, cb, oy, ox);
        }
        return;
    }
    for (int cb = 0; cb < blocks; ++cb) {
        for (int oy = 0; oy < rows; ++oy) {
            int ox = 0;
            for (; ox + P <= cols; ox += P) ConvPixels<K, P>(j, cb, oy, ox);
            for (; ox < cols; ++ox) ConvPixels<K, 1>(j, cb, oy, ox);
        }
    }
}

// Kernels over two blocks of output channels at once (K::RunStore with
// the weights of both): Q output pixels from pixel index q0 (row-major
// over the whole output, so that groups run on across rows), output
// channels [8 cb, 8 cb + 16). A last odd block is computed twice; only
// its own outputs are stored.
template <class K, int Q>
ORIEL_INLINE void ConvPairGroup(const ConvJob& j, int cb, int q0) {
    const ConvWeights& w = *j.w;
    const size_t blockFloats = static_cast<size_t>(w.kh) * w.kw * w.cin * kBlock;
    const float* w0 = w.w + static_cast<size_t>(cb) * blockFloats;
    const int left = w.cout - cb * kBlock;
    const float* w1 = left > kBlock ? w0 + blockFloats : w0;
    const int n = left < 2 * kBlock ? left : 2 * kBlock;
    const float* x[Q];
    float* o[Q];
    int oy = q0 / j.wo, ox = q0 - oy * j.wo;
    for (int k = 0; k < Q; ++k) {
        x[k] = j.flat ? j.src + static_cast<size_t>(q0 + k) * j.cin
                      : j.src + static_cast<size_t>(oy) * j.stride * j.rowStep +
                            static_cast<size_t>(ox) * j.stride * j.cin;
        o[k] = j.out + static_cast<size_t>(q0 + k) * w.cout + cb * kBlock;
        if (++ox == j.wo) {
            ox = 0;
            ++oy;
        }
    }
    K::template RunStore<Q>(x, j.rowStep, w.kh, w.kw, j.cin, w0, w1, w.b + cb * kBlock, n, j.act, o);
}

// Pixels [q0, q1) in groups of P, the rest in groups of 8, 4, 2 and 1 (a
// single accumulator would wait on each add in turn).
template <class K, int P>
ORIEL_INLINE void ConvPairRange(const ConvJob& j, int cb, int q0, int q1) {
    int q = q0;
    for (; q + P <= q1; q += P) ConvPairGroup<K, P>(j, cb, q);
    if (q + 8 <= q1) ConvPairGroup<K, 8>(j, cb, q), q += 8;
    if (q + 4 <= q1) ConvPairGroup<K, 4>(j, cb, q), q += 4;
    if (q + 2 <= q1) ConvPairGroup<K, 2>(j, cb, q), q += 2;
    if (q < q1) ConvPairGroup<K, 1>(j, cb, q);
}

// Loop order as in ConvLoops.
template <class K, int P>
ORIEL_INLINE void ConvPairLoops(const ConvJob& j) {
    const ConvWeights& w = *j.w;
    const int blocks = (w.cout + kBlock - 1) / kBlock;
    const int total = j.ho * j.wo;
    const size_t weightBytes = static_cast<size_t>(blocks) * w.kh * w.kw * w.cin * kBlock * sizeof(float);
    if (weightBytes <= 64 * 1024) {
        for (int q = 0; q < total; q += P) {
            const int end = total - q < P ? total : q + P;
            for (int cb = 0; cb < blocks; cb += 2) ConvPairRange<K, P>(j, cb, q, end);
        }
        return;
    }
    for (int cb = 0; cb < blocks; cb += 2) ConvPairRange<K, P>(j, cb, 0, total);
}
struct DepthwiseJob {
    const float* src;  // the unpadded input
    size_t rowStep;
    int c, ho, wo, stride;
    int inH, inW, top, left;  // input size and leading padding
    const DepthwiseWeights* w;
    float* out;
    Act act;
};

// Depthwise layer: inner pixels, whose taps all lie inside the input, in
// vectors (channels [0, cv)) and the rest of the channels one by one;
// border pixels add only their taps inside the input, which gives exactly
// what adding the zero padding would. Then bias and activation.
template <class K>
ORIEL_INLINE void DepthwiseLoops(const DepthwiseJob& j) {
    const DepthwiseWeights& w = *j.w;
    const int c = j.c;
    const int cv = c - c % K::kWidth;
    for (int oy = 0; oy < j.ho; ++oy) {
        const int iy0 = oy * j.stride - j.top;
        for (int ox = 0; ox < j.wo; ++ox) {
            const int ix0 = ox * j.stride - j.left;
            float* o = j.out + (static_cast<size_t>(oy) * j.wo + ox) * c;
            if (iy0 >= 0 && ix0 >= 0 && iy0 + w.kh <= j.inH && ix0 + w.kw <= j.inW) {
                const float* base = j.src + static_cast<size_t>(iy0) * j.rowStep + static_cast<size_t>(ix0) * c;
                for (int ch = 0; ch < cv; ch += K::kWidth)
                    K::Run(base + ch, j.rowStep, c, w.w + ch, w.kh, w.kw, w.b + ch, j.act, o + ch);
                for (int ch = cv; ch < c; ++ch) {
                    float acc = 0.0f;
                    for (int ky = 0; ky < w.kh; ++ky)
                        for (int kx = 0; kx < w.kw; ++kx)
                            acc += base[ky * j.rowStep + static_cast<size_t>(kx) * c + ch] *
                                   w.w[(static_cast<size_t>(ky) * w.kw + kx) * c + ch];
                    o[ch] = acc;
                }
                BiasActivate(o + cv, w.b + cv, c - cv, j.act);
            } else {
                for (int ch = 0; ch < c; ++ch) o[ch] = 0.0f;
                for (int ky = 0; ky < w.kh; ++ky) {
                    const int iy = iy0 + ky;
                    if (iy < 0 || iy >= j.inH) continue;
                    for (int kx = 0; kx < w.kw; ++kx) {
                        const int ix = ix0 + kx;
                        if (ix < 0 || ix >= j.inW) continue;
                        const float* x = j.src + static_cast<size_t>(iy) * j.rowStep + static_cast<size_t>(ix) * c;
                        const float* wt = w.w + (static_cast<size_t>(ky) * w.kw + kx) * c;
                        for (int ch = 0; ch < c; ++ch) o[ch] += x[ch] * wt[ch];
                    }
                }
                BiasActivate(o, w.b, c, j.act);
            }
        }
    }
}

struct PortableDepthwise {
    static const int kWidth = 4;
    static ORIEL_INLINE void Run(const float* x, size_t rowStep, int c, const float* w, int kh, int kw,
                                 const float* bias, Act act, float* out) {
        typedef Vec<4> V;
        V::T acc = V::Splat(0.0f);
        for (int ky = 0; ky < kh; ++ky)
            for (int kx = 0; kx < kw; ++kx)
                acc += V::Load(x + ky * rowStep + static_cast<size_t>(kx) * c) * V::Load(w + (static_cast<size_t>(ky) * kw + kx) * c);
        V::Store(out, acc);
        BiasActivate(out, bias, kWidth, act);
    }
};

void ConvPortable(const ConvJob& j) { ConvLoops<Stored<PortableKernel>, 4>(j); }
void DepthwisePortable(const DepthwiseJob& j) { DepthwiseLoops<PortableDepthwise>(j); }

#if defined(__x86_64__) || defined(__i386__)
// The values of BiasActivate (max and min return the zero or six where its
// comparisons pick them).
__attribute__((target("avx2"))) inline __m256 Avx2Activate(__m256 v, Act act) {
    const __m256 zero = _mm256_setzero_ps();
    switch (act) {
        case Act::Relu: return _mm256_max_ps(v, zero);
        case Act::Relu6: return _mm256_min_ps(_mm256_max_ps(v, zero), _mm256_set1_ps(6.0f));
        case Act::Leaky:
            return _mm256_blendv_ps(_mm256_mul_ps(v, _mm256_set1_ps(0.1f)), v, _mm256_cmp_ps(v, zero, _CMP_GT_OQ));
        case Act::None:
        default: return v;
    }
}
// Eight-float AVX2 variants, chosen at run time; same values as above.
// One 8-float register per block of output channels, the input values
// broadcast from memory; multiply and add stay separate instructions.
struct Avx2Kernel {
    template <int P>
    static __attribute__((target("avx2"))) inline void Run(const float* const* x, size_t rowStep, int kh,
                                                                          int kw, int cin, const float* w,
                                                                          float (&out)[P][kBlock]) {
        __m256 acc[P];
        for (int p = 0; p < P; ++p) acc[p] = _mm256_setzero_ps();
        for (int ky = 0; ky < kh; ++ky) {
            for (int kx = 0; kx < kw; ++kx) {
                const size_t tap = ky * rowStep + static_cast<size_t>(kx) * cin;
                const float* wv = w + (static_cast<size_t>(ky) * kw + kx) * cin * kBlock;
                const float* xp[P];
                for (int p = 0; p < P; ++p) xp[p] = x[p] + tap;
                for (int ci = 0; ci < cin; ++ci, wv += kBlock) {
                    const __m256 wt = _mm256_loadu_ps(wv);
                    for (int p = 0; p < P; ++p)
                        acc[p] = _mm256_add_ps(acc[p], _mm256_mul_ps(_mm256_broadcast_ss(xp[p] + ci), wt));
                }
            }
        }
        for (int p = 0; p < P; ++p) _mm256_storeu_ps(out[p], acc[p]);
    }
    // Bias and activation on the registers.
    template <int P>
    static __attribute__((target("avx2"))) inline void RunStore(const float* const* x, size_t rowStep, int kh, int kw,
                                                                int cin, const float* w, const float* bias, int n,
                                                                Act act, float* const* out) {
        float acc[P][kBlock];
        Run<P>(x, rowStep, kh, kw, cin, w, acc);
        const __m256 b = _mm256_loadu_ps(bias);
        for (int p = 0; p < P; ++p) {
            const __m256 v = Avx2Activate(_mm256_add_ps(_mm256_loadu_ps(acc[p]), b), act);
            if (n == kBlock) {
                _mm256_storeu_ps(out[p], v);
            } else {
                float t[kBlock];
                _mm256_storeu_ps(t, v);
                for (int k = 0; k < n; ++k) out[p][k] = t[k];
            }
        }
    }
};
__attribute__((target("avx2"), flatten)) void ConvWide(const ConvJob& j) { ConvLoops<Avx2Kernel, 8>(j); }
struct Avx2Depthwise {
    static const int kWidth = 8;
    static __attribute__((target("avx2"))) inline void Run(const float* x, size_t rowStep, int c, const float* w, int kh,
                                                           int kw, const float* bias, Act act, float* out) {
        __m256 acc = _mm256_setzero_ps();
        const size_t cs = static_cast<size_t>(c);
        if (kh == 3 && kw == 3) {
            // The common case, unrolled.
            for (int ky = 0; ky < 3; ++ky)
                for (int kx = 0; kx < 3; ++kx)
                    acc = _mm256_add_ps(acc, _mm256_mul_ps(_mm256_loadu_ps(x + ky * rowStep + kx * cs),
                                                           _mm256_loadu_ps(w + (ky * 3 + kx) * cs)));
        } else {
            for (int ky = 0; ky < kh; ++ky)
                for (int kx = 0; kx < kw; ++kx)
                    acc = _mm256_add_ps(acc, _mm256_mul_ps(_mm256_loadu_ps(x + ky * rowStep + kx * cs),
                                                           _mm256_loadu_ps(w + (ky * kw + kx) * cs)));
        }
        _mm256_storeu_ps(out, Avx2Activate(_mm256_add_ps(acc, _mm256_loadu_ps(bias)), act));
    }
};
__attribute__((target("avx2"), flatten)) void DepthwiseWide(const DepthwiseJob& j) { DepthwiseLoops<Avx2Depthwise>(j); }
bool UseWide(KernelChoice k) { return k != KernelChoice::Portable && __builtin_cpu_supports("avx2"); }

// Sixteen-float AVX-512 variant: one register holds two blocks of 8 output
// channels, each output still summed over taps and input channels in the
// same order, multiply and add separate.
#define ORIEL_AVX512 __attribute__((target("avx512f,avx512dq")))
// BiasActivate's comparisons on 16 lanes.
ORIEL_AVX512 inline __m512 Avx512Activate(__m512 v, Act act) {
    const __m512 zero = _mm512_setzero_ps();
    switch (act) {
        case Act::Relu: return _mm512_maskz_mov_ps(_mm512_cmp_ps_mask(v, zero, _CMP_GT_OQ), v);
        case Act::Relu6: {
            const __m512 six = _mm512_set1_ps(6.0f);
            const __m512 t = _mm512_mask_blend_ps(_mm512_cmp_ps_mask(v, six, _CMP_LT_OQ), six, v);
            return _mm512_maskz_mov_ps(_mm512_cmp_ps_mask(v, zero, _CMP_GT_OQ), t);
        }
        case Act::Leaky:
            return _mm512_mask_blend_ps(_mm512_cmp_ps_mask(v, zero, _CMP_GT_OQ), _mm512_mul_ps(v, _mm512_set1_ps(0.1f)),
                                        v);
        case Act::None:
        default: return v;
    }
}
struct Avx512Kernel {
    // Q pixels, output channels of blocks cb and cb + 1 (w0, w1 their weights).
    template <int Q>
    static ORIEL_AVX512 inline void RunStore(const float* const* x, size_t rowStep, int kh, int kw, int cin,
                                             const float* w0, const float* w1, const float* bias, int n, Act act,
                                             float* const* out) {
        __m512 acc[Q];
        for (int p = 0; p < Q; ++p) acc[p] = _mm512_setzero_ps();
        for (int ky = 0; ky < kh; ++ky) {
            for (int kx = 0; kx < kw; ++kx) {
                const size_t tap = ky * rowStep + static_cast<size_t>(kx) * cin;
                const size_t woff = (static_cast<size_t>(ky) * kw + kx) * cin * kBlock;
                const float* wa = w0 + woff;
                const float* wb = w1 + woff;
                const float* xp[Q];
                for (int p = 0; p < Q; ++p) xp[p] = x[p] + tap;
                for (int ci = 0; ci < cin; ++ci, wa += kBlock, wb += kBlock) {
                    const __m512 wt =
                        _mm512_insertf32x8(_mm512_castps256_ps512(_mm256_loadu_ps(wa)), _mm256_loadu_ps(wb), 1);
                    for (int p = 0; p < Q; ++p)
                        acc[p] = _mm512_add_ps(acc[p], _mm512_mul_ps(_mm512_set1_ps(xp[p][ci]), wt));
                }
            }
        }
        // The bias of an odd last block has 8 floats only.
        const __mmask16 keep = static_cast<__mmask16>(n >= 16 ? 0xFFFFu : ((1u << n) - 1u));
        const __m512 b = _mm512_maskz_loadu_ps(keep, bias);
        for (int p = 0; p < Q; ++p) {
            const __m512 v = Avx512Activate(_mm512_add_ps(acc[p], b), act);
            _mm512_mask_storeu_ps(out[p], keep, v);
        }
    }
};

struct Avx512Depthwise {
    static const int kWidth = 16;
    static ORIEL_AVX512 inline void Run(const float* x, size_t rowStep, int c, const float* w, int kh, int kw,
                                        const float* bias, Act act, float* out) {
        __m512 acc = _mm512_setzero_ps();
        const size_t cs = static_cast<size_t>(c);
        if (kh == 3 && kw == 3) {
            for (int ky = 0; ky < 3; ++ky)
                for (int kx = 0; kx < 3; ++kx)
                    acc = _mm512_add_ps(acc, _mm512_mul_ps(_mm512_loadu_ps(x + ky * rowStep + kx * cs),
                                                           _mm512_loadu_ps(w + (ky * 3 + kx) * cs)));
        } else {
            for (int ky = 0; ky < kh; ++ky)
                for (int kx = 0; kx < kw; ++kx)
                    acc = _mm512_add_ps(acc, _mm512_mul_ps(_mm512_loadu_ps(x + ky * rowStep + kx * cs),
                                                           _mm512_loadu_ps(w + (ky * kw + kx) * cs)));
        }
        _mm512_storeu_ps(out, Avx512Activate(_mm512_add_ps(acc, _mm512_loadu_ps(bias)), act));
    }
};
__attribute__((target("avx512f,avx512dq"), flatten)) void DepthwiseWidest(const DepthwiseJob& j) {
    DepthwiseLoops<Avx512Depthwise>(j);
}
__attribute__((target("avx512f,avx512dq"), flatten)) void ConvWidest(const ConvJob& j) {
    ConvPairLoops<Avx512Kernel, 16>(j);
}
bool UseWidest(KernelChoice k) {
    return k == KernelChoice::Best && __builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512dq");
}
#elif defined(__ARM_NEON)
// 32-bit ARM: the compiler keeps generic float vectors on the (IEEE) VFP
// unit, one lane at a time, because NEON flushes subnormal numbers to zero.
// These NEON variants do the same multiplies and adds in the same order,
// four lanes at once; they differ from the other kernels only where a
// value below 1.2e-38 occurs, which NEON treats as 0.
struct NeonKernel {
    template <int P>
    static ORIEL_INLINE void Run(const float* const* x, size_t rowStep, int kh, int kw, int cin, const float* w,
                                 float (&out)[P][kBlock]) {
        float32x4_t acc[P][2];
        for (int p = 0; p < P; ++p) acc[p][0] = acc[p][1] = vdupq_n_f32(0.0f);
        for (int ky = 0; ky < kh; ++ky) {
            for (int kx = 0; kx < kw; ++kx) {
                const size_t tap = ky * rowStep + static_cast<size_t>(kx) * cin;
                const float* wv = w + (static_cast<size_t>(ky) * kw + kx) * cin * kBlock;
                const float* xp[P];
                for (int p = 0; p < P; ++p) xp[p] = x[p] + tap;
                for (int ci = 0; ci < cin; ++ci, wv += kBlock) {
                    const float32x4_t w0 = vld1q_f32(wv), w1 = vld1q_f32(wv + 4);
                    for (int p = 0; p < P; ++p) {
                        const float32x4_t a = vdupq_n_f32(xp[p][ci]);
                        acc[p][0] = vaddq_f32(acc[p][0], vmulq_f32(a, w0));
                        acc[p][1] = vaddq_f32(acc[p][1], vmulq_f32(a, w1));
                    }
                }
            }
        }
        for (int p = 0; p < P; ++p) {
            vst1q_f32(out[p], acc[p][0]);
            vst1q_f32(out[p] + 4, acc[p][1]);
        }
    }
};
struct NeonDepthwise {
    static const int kWidth = 4;
    static ORIEL_INLINE void Run(const float* x, size_t rowStep, int c, const float* w, int kh, int kw,
                                 const float* bias, Act act, float* out) {
        float32x4_t acc = vdupq_n_f32(0.0f);
        for (int ky = 0; ky < kh; ++ky)
            for (int kx = 0; kx < kw; ++kx)
                acc = vaddq_f32(acc, vmulq_f32(vld1q_f32(x + ky * rowStep + static_cast<size_t>(kx) * c),
                                               vld1q_f32(w + (static_cast<size_t>(ky) * kw + kx) * c)));
        vst1q_f32(out, acc);
        BiasActivate(out, bias, kWidth, act);
    }
};
void ConvWide(const ConvJob& j) { ConvLoops<Stored<NeonKernel>, 4>(j); }
void DepthwiseWide(const DepthwiseJob& j) { DepthwiseLoops<NeonDepthwise>(j); }
bool UseWide(KernelChoice k) { return k != KernelChoice::Portable; }
#else
void ConvWide(const ConvJob& j) { ConvPortable(j); }
void DepthwiseWide(const DepthwiseJob& j) { DepthwisePortable(j); }
bool UseWide(KernelChoice) { return false; }
#endif

}  // namespace

void PadFor(int in, int k, int stride, Pad pad, int* out, int* before) {
    if (pad == Pad::Valid) {
        *out = in >= k ? (in - k) / stride + 1 : 0;
        *before = 0;
        return;
    }
    const int o = (in + stride - 1) / stride;
    int total = (o - 1) * stride + k - in;
    if (total < 0) total = 0;
    *out = o;
    *before = total / 2;
}

Tensor Conv2D(Arena& a, int slot, const Tensor& in, const ConvWeights& w, int stride, Pad pad, Act act,
              KernelChoice kernels) {
    int ho, wo, top, left;
    PadFor(in.h, w.kh, stride, pad, &ho, &top);
    PadFor(in.w, w.kw, stride, pad, &wo, &left);
    // Padded extent actually read by the kernel.
    const int hp = (ho - 1) * stride + w.kh;
    const int wp = (wo - 1) * stride + w.kw;
    const bool padded = top != 0 || left != 0 || hp > in.h || wp > in.w;
    const int hAlloc = hp > in.h + top ? hp : in.h + top;
    const int wAlloc = wp > in.w + left ? wp : in.w + left;
    float* pbuf = padded ? a.TakeRaw(Arena::kPadSlot, static_cast<size_t>(hAlloc) * wAlloc * in.c) : nullptr;
    Tensor out = a.Take(slot, ho, wo, w.cout);
    if (a.Planning() || ho <= 0 || wo <= 0) return out;

    const float* src = in.d;
    int srcW = in.w;
    if (padded) {
        PadInto(pbuf, in, top, left, hAlloc, wAlloc);
        src = pbuf;
        srcW = wAlloc;
    }
    ConvJob job;
    job.src = src;
    job.rowStep = static_cast<size_t>(srcW) * in.c;
    job.cin = in.c;
    job.ho = ho;
    job.wo = wo;
    job.stride = stride;
    job.flat = w.kh == 1 && w.kw == 1 && stride == 1 && !padded;
    job.w = &w;
    job.out = out.d;
    job.act = act;
#if defined(__x86_64__) || defined(__i386__)
    if (UseWidest(kernels)) {
        ConvWidest(job);
        return out;
    }
#endif
    if (UseWide(kernels))
        ConvWide(job);
    else
        ConvPortable(job);
    return out;
}

Tensor Depthwise(Arena& a, int slot, const Tensor& in, const DepthwiseWeights& w, int stride, Pad pad, Act act,
                 KernelChoice kernels) {
    int ho, wo, top, left;
    PadFor(in.h, w.kh, stride, pad, &ho, &top);
    PadFor(in.w, w.kw, stride, pad, &wo, &left);
    Tensor out = a.Take(slot, ho, wo, in.c);
    if (a.Planning() || ho <= 0 || wo <= 0) return out;
    DepthwiseJob job;
    job.src = in.d;
    job.rowStep = static_cast<size_t>(in.w) * in.c;
    job.c = in.c;
    job.ho = ho;
    job.wo = wo;
    job.stride = stride;
    job.inH = in.h;
    job.inW = in.w;
    job.top = top;
    job.left = left;
    job.w = &w;
    job.out = out.d;
    job.act = act;
#if defined(__x86_64__) || defined(__i386__)
    if (UseWidest(kernels)) {
        DepthwiseWidest(job);
        return out;
    }
#endif
    if (UseWide(kernels))
        DepthwiseWide(job);
    else
        DepthwisePortable(job);
    return out;
}

Tensor MaxPool(Arena& a, int slot, const Tensor& in, int k, int stride, Pad pad) {
    int ho, wo, top, left;
    PadFor(in.h, k, stride, pad, &ho, &top);
    PadFor(in.w, k, stride, pad, &wo, &left);
    Tensor out = a.Take(slot, ho, wo, in.c);
    if (a.Planning()) return out;
    const int c = in.c;
    for (int oy = 0; oy < ho; ++oy) {
        const int y0 = oy * stride - top;
        for (int ox = 0; ox < wo; ++ox) {
            const int x0 = ox * stride - left;
            float* o = out.At(oy, ox);
            bool first = true;
            for (int ky = 0; ky < k; ++ky) {
                const int y = y0 + ky;
                if (y < 0 || y >= in.h) continue;
                for (int kx = 0; kx < k; ++kx) {
                    const int x = x0 + kx;
                    if (x < 0 || x >= in.w) continue;
                    const float* s = in.At(y, x);
                    if (first) {
                        for (int ch = 0; ch < c; ++ch) o[ch] = s[ch];
                        first = false;
                    } else {
                        for (int ch = 0; ch < c; ++ch) o[ch] = s[ch] > o[ch] ? s[ch] : o[ch];
                    }
                }
            }
            if (first)
                for (int ch = 0; ch < c; ++ch) o[ch] = 0.0f;
        }
    }
    return out;
}

Tensor AvgPool(Arena& a, int slot, const Tensor& in, int k, int stride) {
    int ho, wo, top, left;
    PadFor(in.h, k, stride, Pad::Valid, &ho, &top);
    PadFor(in.w, k, stride, Pad::Valid, &wo, &left);
    Tensor out = a.Take(slot, ho, wo, in.c);
    if (a.Planning()) return out;
    const int c = in.c;
    const float inv = 1.0f / static_cast<float>(k * k);
    for (int oy = 0; oy < ho; ++oy) {
        for (int ox = 0; ox < wo; ++ox) {
            float* o = out.At(oy, ox);
            for (int ch = 0; ch < c; ++ch) o[ch] = 0.0f;
            for (int ky = 0; ky < k; ++ky)
                for (int kx = 0; kx < k; ++kx) {
                    const float* s = in.At(oy * stride + ky, ox * stride + kx);
                    for (int ch = 0; ch < c; ++ch) o[ch] += s[ch];
                }
            for (int ch = 0; ch < c; ++ch) o[ch] *= inv;
        }
    }
    return out;
}

void Dense(const float* x, const DenseWeights& w, float* out) {
    for (int j = 0; j < w.nout; ++j) out[j] = 0.0f;
    for (int i = 0; i < w.nin; ++i) {
        const float a = x[i];
        const float* row = w.w + static_cast<size_t>(i) * w.nout;
        for (int j = 0; j < w.nout; ++j) out[j] += a * row[j];
    }
    for (int j = 0; j < w.nout; ++j) out[j] += w.b[j];
}

void GlobalMean(const Tensor& in, float* out) {
    for (int ch = 0; ch < in.c; ++ch) out[ch] = 0.0f;
    const int n = in.h * in.w;
    for (int p = 0; p < n; ++p) {
        const float* s = in.d + static_cast<size_t>(p) * in.c;
        for (int ch = 0; ch < in.c; ++ch) out[ch] += s[ch];
    }
    const float inv = 1.0f / static_cast<float>(n > 0 ? n : 1);
    for (int ch = 0; ch < in.c; ++ch) out[ch] *= inv;
}

void AddInto(const Tensor& dst, const Tensor& src) {
    const size_t n = dst.Size();
    for (size_t i = 0; i < n; ++i) dst.d[i] += src.d[i];
}

void ReluInto(const Tensor& dst, const Tensor& src) {
    const size_t n = dst.Size();
    for (size_t i = 0; i < n; ++i) dst.d[i] = src.d[i] > 0.0f ? src.d[i] : 0.0f;
}

void ReluInPlace(const Tensor& t) {
    const size_t n = t.Size();
    for (size_t i = 0; i < n; ++i) t.d[i] = t.d[i] > 0.0f ? t.d[i] : 0.0f;
}

void Copy(const Tensor& dst, const Tensor& src) { std::memcpy(dst.d, src.d, src.Size() * sizeof(float)); }

}  // namespace nn
}  // namespace oriel
