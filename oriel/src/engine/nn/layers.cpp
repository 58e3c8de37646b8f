#include "oriel/src/engine/nn/layers.h"

#include <cstring>

namespace oriel {
namespace nn {

namespace {

const int kBlock = 8;  // output channels per weight block (see weights.h)
const int kPixels = 4;  // output pixels computed together

inline float Activate(float v, Act act) {
    switch (act) {
        case Act::Relu:
            return v > 0.0f ? v : 0.0f;
        case Act::Relu6:
            return v > 0.0f ? (v < 6.0f ? v : 6.0f) : 0.0f;
        case Act::Leaky:
            return v > 0.0f ? v : v * 0.1f;
        case Act::None:
        default:
            return v;
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

// Four-float vectors (SSE on x86-64, NEON on ARM) through the compiler's
// generic vector extension: element-wise multiply and add only, each
// rounded on its own, so every target computes the same values.
typedef float V4 __attribute__((vector_size(16)));
typedef float V4u __attribute__((vector_size(16), aligned(4)));

inline V4 Load(const float* p) { return *reinterpret_cast<const V4u*>(p); }
inline void Store(float* p, V4 v) { *reinterpret_cast<V4u*>(p) = v; }
inline V4 Splat(float a) { return V4{a, a, a, a}; }

// P output pixels, one block of 8 output channels. x[p] points at the first
// tap of pixel p; taps step by `rowStep` floats per kernel row and `cin` per
// kernel column. Accumulators stay in registers: P x 2 vectors.
template <int P>
inline void ConvKernel(const float* const* x, size_t rowStep, int kh, int kw, int cin, const float* w,
                       float (&out)[P][kBlock]) {
    V4 acc[P][2];
    for (int p = 0; p < P; ++p) acc[p][0] = acc[p][1] = Splat(0.0f);
    for (int ky = 0; ky < kh; ++ky) {
        for (int kx = 0; kx < kw; ++kx) {
            const size_t tap = ky * rowStep + static_cast<size_t>(kx) * cin;
            const float* wv = w + (static_cast<size_t>(ky) * kw + kx) * cin * kBlock;
            const float* xp[P];
            for (int p = 0; p < P; ++p) xp[p] = x[p] + tap;
            for (int ci = 0; ci < cin; ++ci, wv += kBlock) {
                const V4 w0 = Load(wv), w1 = Load(wv + 4);
                for (int p = 0; p < P; ++p) {
                    const V4 a = Splat(xp[p][ci]);
                    acc[p][0] += a * w0;
                    acc[p][1] += a * w1;
                }
            }
        }
    }
    for (int p = 0; p < P; ++p) {
        Store(out[p], acc[p][0]);
        Store(out[p] + 4, acc[p][1]);
    }
}

template <int P>
inline void StoreBlock(float* const* out, const float (&acc)[P][kBlock], const float* bias, int n, Act act) {
    for (int p = 0; p < P; ++p)
        for (int j = 0; j < n; ++j) out[p][j] = Activate(acc[p][j] + bias[j], act);
}

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

Tensor Conv2D(Arena& a, int slot, const Tensor& in, const ConvWeights& w, int stride, Pad pad, Act act) {
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
    const size_t rowStep = static_cast<size_t>(srcW) * in.c;
    const int blocks = (w.cout + kBlock - 1) / kBlock;
    const size_t blockFloats = static_cast<size_t>(w.kh) * w.kw * w.cin * kBlock;
    const bool flat = w.kh == 1 && w.kw == 1 && stride == 1 && !padded;

    for (int cb = 0; cb < blocks; ++cb) {
        const float* wb = w.w + cb * blockFloats;
        const float* bias = w.b + cb * kBlock;
        const int n = (w.cout - cb * kBlock) < kBlock ? (w.cout - cb * kBlock) : kBlock;
        if (flat) {
            // 1x1 stride 1: the image is one list of pixels.
            const int total = ho * wo;
            int p = 0;
            for (; p + kPixels <= total; p += kPixels) {
                const float* x[kPixels];
                float* o[kPixels];
                for (int k = 0; k < kPixels; ++k) {
                    x[k] = src + static_cast<size_t>(p + k) * in.c;
                    o[k] = out.d + static_cast<size_t>(p + k) * w.cout + cb * kBlock;
                }
                float acc[kPixels][kBlock];
                ConvKernel<kPixels>(x, 0, 1, 1, in.c, wb, acc);
                StoreBlock<kPixels>(o, acc, bias, n, act);
            }
            for (; p < total; ++p) {
                const float* x[1] = {src + static_cast<size_t>(p) * in.c};
                float* o[1] = {out.d + static_cast<size_t>(p) * w.cout + cb * kBlock};
                float acc[1][kBlock];
                ConvKernel<1>(x, 0, 1, 1, in.c, wb, acc);
                StoreBlock<1>(o, acc, bias, n, act);
            }
            continue;
        }
        for (int oy = 0; oy < ho; ++oy) {
            const float* row = src + static_cast<size_t>(oy) * stride * rowStep;
            float* orow = out.d + static_cast<size_t>(oy) * wo * w.cout + cb * kBlock;
            int ox = 0;
            for (; ox + kPixels <= wo; ox += kPixels) {
                const float* x[kPixels];
                float* o[kPixels];
                for (int k = 0; k < kPixels; ++k) {
                    x[k] = row + static_cast<size_t>(ox + k) * stride * in.c;
                    o[k] = orow + static_cast<size_t>(ox + k) * w.cout;
                }
                float acc[kPixels][kBlock];
                ConvKernel<kPixels>(x, rowStep, w.kh, w.kw, in.c, wb, acc);
                StoreBlock<kPixels>(o, acc, bias, n, act);
            }
            for (; ox < wo; ++ox) {
                const float* x[1] = {row + static_cast<size_t>(ox) * stride * in.c};
                float* o[1] = {orow + static_cast<size_t>(ox) * w.cout};
                float acc[1][kBlock];
                ConvKernel<1>(x, rowStep, w.kh, w.kw, in.c, wb, acc);
                StoreBlock<1>(o, acc, bias, n, act);
            }
        }
    }
    return out;
}

Tensor Depthwise(Arena& a, int slot, const Tensor& in, const DepthwiseWeights& w, int stride, Pad pad, Act act) {
    int ho, wo, top, left;
    PadFor(in.h, w.kh, stride, pad, &ho, &top);
    PadFor(in.w, w.kw, stride, pad, &wo, &left);
    const int hp = (ho - 1) * stride + w.kh;
    const int wp = (wo - 1) * stride + w.kw;
    const bool padded = top != 0 || left != 0 || hp > in.h || wp > in.w;
    const int hAlloc = hp > in.h + top ? hp : in.h + top;
    const int wAlloc = wp > in.w + left ? wp : in.w + left;
    float* pbuf = padded ? a.TakeRaw(Arena::kPadSlot, static_cast<size_t>(hAlloc) * wAlloc * in.c) : nullptr;
    Tensor out = a.Take(slot, ho, wo, in.c);
    if (a.Planning() || ho <= 0 || wo <= 0) return out;

    const float* src = in.d;
    int srcW = in.w;
    if (padded) {
        PadInto(pbuf, in, top, left, hAlloc, wAlloc);
        src = pbuf;
        srcW = wAlloc;
    }
    const int c = in.c;
    const size_t rowStep = static_cast<size_t>(srcW) * c;
    for (int oy = 0; oy < ho; ++oy) {
        for (int ox = 0; ox < wo; ++ox) {
            float* o = out.At(oy, ox);
            for (int ch = 0; ch < c; ++ch) o[ch] = 0.0f;
            const float* base = src + static_cast<size_t>(oy) * stride * rowStep + static_cast<size_t>(ox) * stride * c;
            for (int ky = 0; ky < w.kh; ++ky) {
                for (int kx = 0; kx < w.kw; ++kx) {
                    const float* x = base + ky * rowStep + static_cast<size_t>(kx) * c;
                    const float* wt = w.w + (static_cast<size_t>(ky) * w.kw + kx) * c;
                    for (int ch = 0; ch < c; ++ch) o[ch] += x[ch] * wt[ch];
                }
            }
            for (int ch = 0; ch < c; ++ch) o[ch] = Activate(o[ch] + w.b[ch], act);
        }
    }
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
