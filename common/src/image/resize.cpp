// Resizing. Every stored result downstream (working images, similarity
// signatures, blur maps) is computed from images made here, so the sampling
// positions, the 10-bit weights and the order of the passes are fixed:
// bilinear sampling on a 10-bit grid, exact 2×2 means for exact halvings, and
// a halving pyramid for strong reductions so that every output pixel averages
// all the input pixels it covers.
//
// The reductions of camera photos dominate the analysis time, so every pass
// runs row by row and a pyramid level never exists as a whole image: each
// level keeps the two rows its consumer read last and makes the next row on
// demand from the level above. A 12-megapixel photo is thus read once and
// every intermediate row stays in the cache.
#include <lumicor/zbm_image.h>

#include <cstdlib>

#if defined(__SSE2__)
#include <emmintrin.h>
#elif defined(__ARM_NEON)
#include <arm_neon.h>
#endif

#include "common/src/image/image_util.h"
#include "common/src/image/resize.h"
#include "common/src/internal/memory.h"

using namespace lmk::image;

namespace {

// ---------------------------------------------------------------- row kernels

// Exact halving of output pixels from .. width - 1: each is the truncated
// mean of its 2×2 block in rows a and b.
template <int32_t Bpp>
void HalveTail(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t from, int32_t width) {
    a += 2 * Bpp * from;
    b += 2 * Bpp * from;
    d += Bpp * from;
    for (int32_t x = from; x < width; ++x, a += 2 * Bpp, b += 2 * Bpp, d += Bpp) {
        for (int32_t c = 0; c < Bpp; ++c) d[c] = static_cast<uint8_t>((a[c] + a[c + Bpp] + b[c] + b[c + Bpp]) >> 2);
    }
}

// Vector halving of the leading output pixels of a row; returns how many it
// made (the rest goes through HalveTail). The sums take 10 bits, so they are
// formed in 16-bit lanes and narrowed after the shift.
#if defined(__SSE2__)
int32_t HalveHead3(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t width) {
    const __m128i zero = _mm_setzero_si128();
    const __m128i firstPixel = _mm_set_epi32(0, 0, 0x0000FFFF, -1);  // 16-bit lanes 0..2
    int32_t x = 0;
    // Two output pixels a turn: 16 bytes read at 6x (12 used), 8 written at
    // 3x (6 used, the other 2 rewritten by the next turn or the tail).
    for (; x + 3 <= width; x += 2) {
        const __m128i va = _mm_loadu_si128(reinterpret_cast<const __m128i*>(a + 6 * x));
        const __m128i vb = _mm_loadu_si128(reinterpret_cast<const __m128i*>(b + 6 * x));
        const __m128i lo = _mm_add_epi16(_mm_unpacklo_epi8(va, zero), _mm_unpacklo_epi8(vb, zero));  // bytes 0..7
        const __m128i hi = _mm_add_epi16(_mm_unpackhi_epi8(va, zero), _mm_unpackhi_epi8(vb, zero));  // bytes 8..15
        const __m128i first = _mm_add_epi16(lo, _mm_srli_si128(lo, 6));
        const __m128i rest = _mm_or_si128(_mm_srli_si128(lo, 12), _mm_slli_si128(hi, 4));  // bytes 6..13
        const __m128i second = _mm_add_epi16(rest, _mm_srli_si128(rest, 6));
        const __m128i both = _mm_or_si128(_mm_and_si128(first, firstPixel), _mm_slli_si128(second, 6));
        _mm_storel_epi64(reinterpret_cast<__m128i*>(d + 3 * x), _mm_packus_epi16(_mm_srli_epi16(both, 2), zero));
    }
    return x;
}

int32_t HalveHead4(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t width) {
    const __m128i zero = _mm_setzero_si128();
    int32_t x = 0;
    for (; x + 4 <= width; x += 4) {
        __m128i sums[2];
        for (int32_t k = 0; k < 2; ++k) {
            const __m128i va = _mm_loadu_si128(reinterpret_cast<const __m128i*>(a + 8 * x + 16 * k));
            const __m128i vb = _mm_loadu_si128(reinterpret_cast<const __m128i*>(b + 8 * x + 16 * k));
            const __m128i lo = _mm_add_epi16(_mm_unpacklo_epi8(va, zero), _mm_unpacklo_epi8(vb, zero));  // pixels 0, 1
            const __m128i hi = _mm_add_epi16(_mm_unpackhi_epi8(va, zero), _mm_unpackhi_epi8(vb, zero));  // pixels 2, 3
            sums[k] = _mm_srli_epi16(_mm_add_epi16(_mm_unpacklo_epi64(lo, hi), _mm_unpackhi_epi64(lo, hi)), 2);
        }
        _mm_storeu_si128(reinterpret_cast<__m128i*>(d + 4 * x), _mm_packus_epi16(sums[0], sums[1]));
    }
    return x;
}
#elif defined(__ARM_NEON)
int32_t HalveHead3(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t width) {
    int32_t x = 0;
    for (; x + 8 <= width; x += 8) {
        const uint8x16x3_t pa = vld3q_u8(a + 6 * x), pb = vld3q_u8(b + 6 * x);
        uint8x8x3_t out;
        out.val[0] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[0]), vpaddlq_u8(pb.val[0])), 2);
        out.val[1] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[1]), vpaddlq_u8(pb.val[1])), 2);
        out.val[2] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[2]), vpaddlq_u8(pb.val[2])), 2);
        vst3_u8(d + 3 * x, out);
    }
    return x;
}

int32_t HalveHead4(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t width) {
    int32_t x = 0;
    for (; x + 8 <= width; x += 8) {
        const uint8x16x4_t pa = vld4q_u8(a + 8 * x), pb = vld4q_u8(b + 8 * x);
        uint8x8x4_t out;
        out.val[0] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[0]), vpaddlq_u8(pb.val[0])), 2);
        out.val[1] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[1]), vpaddlq_u8(pb.val[1])), 2);
        out.val[2] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[2]), vpaddlq_u8(pb.val[2])), 2);
        out.val[3] = vshrn_n_u16(vaddq_u16(vpaddlq_u8(pa.val[3]), vpaddlq_u8(pb.val[3])), 2);
        vst4_u8(d + 4 * x, out);
    }
    return x;
}
#else
int32_t HalveHead3(const uint8_t*, const uint8_t*, uint8_t*, int32_t) { return 0; }
int32_t HalveHead4(const uint8_t*, const uint8_t*, uint8_t*, int32_t) { return 0; }
#endif

void HalveRow(const uint8_t* a, const uint8_t* b, uint8_t* d, int32_t width, int32_t bpp) {
    switch (bpp) {
        case 1: HalveTail<1>(a, b, d, 0, width); break;  // the compiler vectorises this one
        case 3: HalveTail<3>(a, b, d, HalveHead3(a, b, d, width), width); break;
        default: HalveTail<4>(a, b, d, HalveHead4(a, b, d, width), width); break;
    }
}

template <int32_t Bpp>
void BilinearRowT(const uint8_t* top, const uint8_t* bottom, uint32_t fy, const AxisSample* columns, uint8_t* d,
                  int32_t width) {
    for (int32_t x = 0; x < width; ++x, d += Bpp) {
        const AxisSample& col = columns[x];
        const uint8_t* tl = top + col.offset0;
        const uint8_t* tr = top + col.offset1;
        const uint8_t* bl = bottom + col.offset0;
        const uint8_t* br = bottom + col.offset1;
        for (int32_t c = 0; c < Bpp; ++c) {
            d[c] = static_cast<uint8_t>(Bilinear(tl[c], tr[c], bl[c], br[c], col.weight, fy));
        }
    }
}

// Bilinear sampling of a row whose width is exactly halved: every column
// then samples the pair (2x, 2x + 1) with weight 512, and the blend
// ((1024 - fy)·(512·tl + 512·tr) + fy·(512·bl + 512·br)) >> 20 equals
// (s(2x) + s(2x + 1)) >> 11 with s = top·(1024 − fy) + bottom·fy per byte.
// The row blend runs over whole rows and vectorises. This is the step taken
// by photos with an odd height (4000 × 2667 halves to 2000 × 1334).
void BlendRows(const uint8_t* top, const uint8_t* bottom, uint32_t fy, int32_t n, uint32_t* sums) {
    const uint32_t wt = 1024u - fy, wb = fy;
    for (int32_t i = 0; i < n; ++i) sums[i] = top[i] * wt + bottom[i] * wb;
}

template <int32_t Bpp>
void BlendPairsT(const uint32_t* sums, uint8_t* d, int32_t width) {
    for (int32_t x = 0; x < width; ++x, sums += 2 * Bpp, d += Bpp) {
        for (int32_t c = 0; c < Bpp; ++c) d[c] = static_cast<uint8_t>((sums[c] + sums[c + Bpp]) >> 11);
    }
}

// ---------------------------------------------------------------- one pass

// How an image is made from the one before it, one row at a time: the exact
// 2×2 mean, or bilinear sampling with the sample tables of both axes.
class Pass {
public:
    // False when a sample table cannot be allocated.
    bool Init(int32_t srcWidth, int32_t srcHeight, int32_t width, int32_t height, int32_t bpp, bool exact) {
        width_ = width;
        bpp_ = bpp;
        exact_ = exact;
        if (exact) return true;
        pairs_ = srcWidth == 2 * width;
        if (pairs_) {
            sums_ = lmk::NewUninitializedArray<uint32_t>(static_cast<size_t>(srcWidth) * static_cast<size_t>(bpp));
            if (!sums_) return false;
        }
        columns_ = lmk::NewArray<AxisSample>(static_cast<size_t>(width));
        rows_ = lmk::NewArray<AxisSample>(static_cast<size_t>(height));
        if (!columns_ || !rows_) return false;
        const AxisSampler xs(srcWidth, width), ys(srcHeight, height);
        for (int32_t x = 0; x < width; ++x) columns_[x] = xs.At(x, bpp);
        for (int32_t y = 0; y < height; ++y) rows_[y] = ys.At(y, 1);
        return true;
    }

    // The two source rows of output row y and the weight of the second.
    AxisSample SourceRows(int32_t y) const { return exact_ ? AxisSample{2 * y, 2 * y + 1, 0} : rows_[y]; }

    void MakeRow(const uint8_t* top, const uint8_t* bottom, uint32_t fy, uint8_t* d) {
        if (exact_) return HalveRow(top, bottom, d, width_, bpp_);
        if (pairs_) {
            BlendRows(top, bottom, fy, 2 * width_ * bpp_, sums_.get());
            switch (bpp_) {
                case 1: BlendPairsT<1>(sums_.get(), d, width_); break;
                case 3: BlendPairsT<3>(sums_.get(), d, width_); break;
                default: BlendPairsT<4>(sums_.get(), d, width_); break;
            }
            return;
        }
        switch (bpp_) {
            case 1: BilinearRowT<1>(top, bottom, fy, columns_.get(), d, width_); break;
            case 3: BilinearRowT<3>(top, bottom, fy, columns_.get(), d, width_); break;
            default: BilinearRowT<4>(top, bottom, fy, columns_.get(), d, width_); break;
        }
    }

private:
    int32_t width_ = 0;
    int32_t bpp_ = 0;
    bool exact_ = false;
    bool pairs_ = false;  // bilinear with the width exactly halved
    lmk::UniqueArray<uint32_t> sums_;
    lmk::UniqueArray<AxisSample> columns_;
    lmk::UniqueArray<AxisSample> rows_;
};

// An image of a reduction chain: either the caller's source or a pyramid
// level made from its parent, of which only the two rows last asked for are
// kept. Consumers ask for rows in non-decreasing order and for the two rows
// of one output row one after the other; replacing the row not asked for
// last therefore never drops a row still in use.
class Level {
public:
    int32_t width = 0;
    int32_t height = 0;

    void InitSource(const _zbm_Image* src) {
        source_ = src;
        width = src->width;
        height = src->height;
    }

    // Level of width × height made from `parent` (the exact mean when the
    // parent is exactly twice as large, else bilinear). False on allocation
    // failure.
    bool Init(Level* parent, int32_t w, int32_t h, int32_t bpp) {
        parent_ = parent;
        width = w;
        height = h;
        rowBytes_ = static_cast<size_t>(w) * static_cast<size_t>(bpp);
        rows_ = lmk::NewUninitializedArray<uint8_t>(2 * rowBytes_);
        const bool exact = IsHalving(parent->width, parent->height, w, h);
        return rows_ && pass_.Init(parent->width, parent->height, w, h, bpp, exact);
    }

    const uint8_t* RowAt(int32_t y) {
        if (parent_ == nullptr) return Row(source_, y);
        if (key_[last_] != y) {
            last_ ^= 1;
            if (key_[last_] != y) {
                const AxisSample s = pass_.SourceRows(y);
                const uint8_t* top = parent_->RowAt(s.offset0);
                const uint8_t* bottom = parent_->RowAt(s.offset1);
                pass_.MakeRow(top, bottom, s.weight, Slot(last_));
                key_[last_] = y;
            }
        }
        return Slot(last_);
    }

    static bool IsHalving(int32_t srcWidth, int32_t srcHeight, int32_t width, int32_t height) {
        return srcWidth == 2 * width && srcHeight == 2 * height;
    }

private:
    uint8_t* Slot(int32_t i) { return rows_.get() + i * rowBytes_; }

    const _zbm_Image* source_ = nullptr;
    Level* parent_ = nullptr;
    Pass pass_;
    size_t rowBytes_ = 0;
    lmk::UniqueArray<uint8_t> rows_;
    int32_t key_[2] = {-1, -1};
    int32_t last_ = 0;
};

// Fills dst from `from`, row by row. Enlargements always sample; reductions
// take the exact mean when `from` is exactly twice dst.
int Finish(Level* from, _zbm_Image* dst, bool mayHalve) {
    Pass pass;
    const bool exact = mayHalve && Level::IsHalving(from->width, from->height, dst->width, dst->height);
    if (!pass.Init(from->width, from->height, dst->width, dst->height, dst->bytesPerPixel, exact))
        return ZBIU_ERR_OUT_OF_MEMORY;
    for (int32_t y = 0; y < dst->height; ++y) {
        const AxisSample s = pass.SourceRows(y);
        const uint8_t* top = from->RowAt(s.offset0);
        const uint8_t* bottom = from->RowAt(s.offset1);
        pass.MakeRow(top, bottom, s.weight, Row(dst, y));
    }
    return ZBIU_OK;
}

int ResizeBilinear(const _zbm_Image* src, _zbm_Image* dst) {
    Level source;
    source.InitSource(src);
    return Finish(&source, dst, false);
}

// A reduction to at most 2× in each dimension: exact halving when the
// source is exactly twice the destination in both, else bilinear.
int Reduce(const _zbm_Image* src, _zbm_Image* dst) {
    Level source;
    source.InitSource(src);
    return Finish(&source, dst, true);
}

// Entry into the pyramid: the source is more than twice the destination in
// either dimension.
bool MoreThanTwice(int32_t w, int32_t h, const _zbm_Image* dst) {
    return w > 2 * static_cast<int64_t>(dst->width) || h > 2 * static_cast<int64_t>(dst->height);
}

// Whether the pyramid halves once more: the whole-number ratio of either
// dimension to the destination is still above 2. A level only slightly
// above twice the destination (51 for 25) is therefore not halved again but
// reduced by the final bilinear step, as the stored results expect.
bool HalveAgain(int32_t w, int32_t h, const _zbm_Image* dst) { return w / dst->width > 2 || h / dst->height > 2; }

// Every level roughly halves a dimension of at most 2^31 pixels.
constexpr int32_t kMaxLevels = 32;

// Continues a pyramid whose last level is levels[n]: halves while HalveAgain
// holds, then one final reduction produces dst.
int ContinuePyramid(Level* levels, int32_t n, int32_t bpp, _zbm_Image* dst) {
    while (HalveAgain(levels[n].width, levels[n].height, dst)) {
        if (n == kMaxLevels) return ZBIU_ERR_INVALID_ARGUMENT;
        const Level& above = levels[n];
        if (!levels[n + 1].Init(&levels[n], (above.width + 1) / 2, (above.height + 1) / 2, bpp))
            return ZBIU_ERR_OUT_OF_MEMORY;
        ++n;
    }
    return Finish(&levels[n], dst, true);
}

// Strong reduction: halve both dimensions to ((n + 1) / 2) with the
// reduction rule, and repeat while HalveAgain holds; one final reduction then
// produces dst. The levels are made row by row as the final pass needs them.
int ResizePyramid(const _zbm_Image* src, _zbm_Image* dst) {
    Level levels[kMaxLevels + 1];
    levels[0].InitSource(src);
    const int32_t bpp = src->bytesPerPixel;
    if (!levels[1].Init(&levels[0], (src->width + 1) / 2, (src->height + 1) / 2, bpp)) return ZBIU_ERR_OUT_OF_MEMORY;
    return ContinuePyramid(levels, 1, bpp, dst);
}

// Number of pyramid levels ZbiuResize makes for this pair, 0 when it takes
// another path.
int32_t PyramidDepth(const _zbm_Image* src, const _zbm_Image* dst) {
    const int32_t sw = src->width, sh = src->height, dw = dst->width, dh = dst->height;
    if (dw > sw || dh > sh || !MoreThanTwice(sw, sh, dst)) return 0;
    int32_t w = sw, h = sh, n = 0;
    do {
        w = (w + 1) / 2;
        h = (h + 1) / 2;
        ++n;
    } while (HalveAgain(w, h, dst) && n < kMaxLevels);
    return n;
}

// Image of the given size and pixel layout over a caller buffer.
_zbm_Image ScratchImage(uint8_t* data, int32_t width, int32_t height, const _zbm_Image* like) {
    _zbm_Image image;
    image.pData = data;
    image.width = width;
    image.height = height;
    image.pitch = width * like->bytesPerPixel;
    image.order = like->order;
    image.bytesPerPixel = like->bytesPerPixel;
    image.ownsData = 0;
    return image;
}

}  // namespace

int ZbiuResize(const _zbm_Image* src, _zbm_Image* dst) {
    if (!IsValidPair(src, dst)) return ZBIU_ERR_INVALID_ARGUMENT;
    const int32_t sw = src->width, sh = src->height, dw = dst->width, dh = dst->height;

    if (sw == dw && sh == dh) return ZbiuCopy(src, dst);

    // One dimension grows while the other shrinks: first change only the
    // shrinking one (reduction rules), then only the growing one.
    if ((dw > sw && dh < sh) || (dw < sw && dh > sh)) {
        ZbmImagePtr temp(dw > sw ? ZbiuCreate(sw, dh, src->order) : ZbiuCreate(dw, sh, src->order));
        if (!temp) return ZBIU_ERR_OUT_OF_MEMORY;
        const int status = ZbiuResize(src, temp.get());
        return status != ZBIU_OK ? status : ZbiuResize(temp.get(), dst);
    }

    if (dw > sw || dh > sh) return ResizeBilinear(src, dst);
    if (!MoreThanTwice(sw, sh, dst)) return Reduce(src, dst);
    return ResizePyramid(src, dst);
}

int lmk::image::ResizeEach(const _zbm_Image* src, _zbm_Image* const* dsts, int32_t count) {
    if (dsts == nullptr && count > 0) return ZBIU_ERR_INVALID_ARGUMENT;
    // The level every pyramid destination passes through: the shallowest
    // depth among them.
    int32_t shared = 0, pyramids = 0;
    for (int32_t i = 0; i < count; ++i) {
        if (!IsValidPair(src, dsts[i])) return ZBIU_ERR_INVALID_ARGUMENT;
        const int32_t depth = PyramidDepth(src, dsts[i]);
        if (depth == 0) continue;
        shared = pyramids == 0 || depth < shared ? depth : shared;
        ++pyramids;
    }
    if (pyramids < 2) {
        for (int32_t i = 0; i < count; ++i) {
            const int status = ZbiuResize(src, dsts[i]);
            if (status != ZBIU_OK) return status;
        }
        return ZBIU_OK;
    }

    // Make the shared level once, as a whole image.
    const int32_t bpp = src->bytesPerPixel;
    int32_t w = src->width, h = src->height;
    for (int32_t n = 0; n < shared; ++n) w = (w + 1) / 2, h = (h + 1) / 2;
    lmk::MallocPtr<uint8_t> buffer(static_cast<uint8_t*>(
        std::malloc(static_cast<size_t>(w) * static_cast<size_t>(h) * static_cast<size_t>(bpp))));
    if (!buffer) return ZBIU_ERR_OUT_OF_MEMORY;
    _zbm_Image level = ScratchImage(buffer.get(), w, h, src);
    {
        Level levels[kMaxLevels + 1];
        levels[0].InitSource(src);
        for (int32_t n = 1; n < shared; ++n) {
            if (!levels[n].Init(&levels[n - 1], (levels[n - 1].width + 1) / 2, (levels[n - 1].height + 1) / 2, bpp))
                return ZBIU_ERR_OUT_OF_MEMORY;
        }
        const int status = Finish(&levels[shared - 1], &level, true);
        if (status != ZBIU_OK) return status;
    }

    for (int32_t i = 0; i < count; ++i) {
        int status;
        if (PyramidDepth(src, dsts[i]) == 0) {
            status = ZbiuResize(src, dsts[i]);
        } else {
            Level levels[kMaxLevels + 1];
            levels[0].InitSource(&level);
            status = ContinuePyramid(levels, 0, bpp, dsts[i]);
        }
        if (status != ZBIU_OK) return status;
    }
    return ZBIU_OK;
}
