#include "ktlib/src/Similarity/cbs/CBSCommon/imatrix/imatrix.h"

#include <lumicor/zbm_image.h>

#include <cstdlib>
#include <cstdio>
#include <cstring>

#include "common/src/internal/memory.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/cbs_error.h"
#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"

namespace {

bool Valid(const _matrix_s* m) { return m && m->data && m->rows > 0 && m->cols > 0; }

size_t Count(const _matrix_s* m) { return static_cast<size_t>(m->rows) * static_cast<size_t>(m->cols); }

bool Inside(const _matrix_s* m, int row, int col) {
    return Valid(m) && row >= 0 && col >= 0 && row < m->rows && col < m->cols;
}

int32_t& At(const _matrix_s* m, int row, int col) {
    return m->data[static_cast<size_t>(row) * static_cast<size_t>(m->cols) + static_cast<size_t>(col)];
}

// Wrapping arithmetic: the values are plain integers to the callers; defined
// wrap-around keeps hostile inputs from being undefined behaviour.
int32_t WrapAdd(int32_t a, int32_t b) { return static_cast<int32_t>(static_cast<uint32_t>(a) + static_cast<uint32_t>(b)); }
int32_t WrapMul(int32_t a, int32_t b) { return static_cast<int32_t>(static_cast<uint32_t>(a) * static_cast<uint32_t>(b)); }

// round(256 cos(2 pi i / 16)) and round(256 sin(2 pi i / 16)).
constexpr int32_t kCos[16] = {256, 237, 181, 98, 0, -98, -181, -237, -256, -237, -181, -98, 0, 98, 181, 237};
constexpr int32_t kSin[16] = {0, 98, 181, 237, 256, 237, 181, 98, 0, -98, -181, -237, -256, -237, -181, -98};

// Byte samples (luma) take a faster path with the same truncated terms: the
// texture feature runs this DFT some 2,000 times per photo. Every twiddle
// factor is +-256, 237, 181, 98 or 0, so each term is +-trunc(f x / 256) for
// one of four magnitudes f (a floor for x >= 0). Samples n and n + 8 meet
// the same factor at even frequencies and its negation at odd ones, so their
// already truncated terms are added (or subtracted) first.
struct TwiddleCodes {
    uint8_t cosMagnitude[9][8];  // 0: factor 0; 1..4: 98, 181, 237, 256
    int8_t cosSign[9][8];
    uint8_t sinMagnitude[9][8];
    int8_t sinSign[9][8];
};

constexpr int MagnitudeCode(int32_t f) {
    return f == 0 ? 0 : ((f < 0 ? -f : f) == 98 ? 1 : ((f < 0 ? -f : f) == 181 ? 2 : ((f < 0 ? -f : f) == 237 ? 3 : 4)));
}

constexpr TwiddleCodes MakeTwiddleCodes() {
    TwiddleCodes t{};
    for (int k = 0; k <= 8; ++k)
        for (int n = 0; n < 8; ++n) {
            const int32_t c = kCos[(n * k) % 16], s = kSin[(n * k) % 16];
            t.cosMagnitude[k][n] = static_cast<uint8_t>(MagnitudeCode(c));
            t.cosSign[k][n] = static_cast<int8_t>(c < 0 ? -1 : 1);
            t.sinMagnitude[k][n] = static_cast<uint8_t>(MagnitudeCode(s));
            t.sinSign[k][n] = static_cast<int8_t>(s < 0 ? -1 : 1);
        }
    return t;
}

constexpr TwiddleCodes kCodes = MakeTwiddleCodes();

bool AllBytes(const int32_t x[16]) {
    uint32_t any = 0;
    for (int n = 0; n < 16; ++n) any |= static_cast<uint32_t>(x[n]);
    return any <= 255;
}

void Fft16Bytes(int32_t x[16]) {
    const int32_t factor[5] = {0, 98, 181, 237, 256};
    // pair[parity][n][code]: term of sample n plus (even) or minus (odd) the
    // term of sample n + 8.
    int32_t pair[2][8][5];
    for (int n = 0; n < 8; ++n) {
        for (int q = 0; q < 5; ++q) {
            const int32_t a = (factor[q] * x[n]) >> 8;
            const int32_t b = (factor[q] * x[n + 8]) >> 8;
            pair[0][n][q] = a + b;
            pair[1][n][q] = a - b;
        }
    }
    uint32_t magnitude2[9];
    for (int k = 0; k <= 8; ++k) {
        const int32_t(*terms)[5] = pair[k & 1];
        int32_t re = 0, im = 0;
        for (int n = 0; n < 8; ++n) {
            re += kCodes.cosSign[k][n] * terms[n][kCodes.cosMagnitude[k][n]];
            im += kCodes.sinSign[k][n] * terms[n][kCodes.sinMagnitude[k][n]];
        }
        magnitude2[k] = static_cast<uint32_t>(re * re + im * im);
    }
    for (int k = 0; k <= 8; ++k) x[k] = static_cast<int32_t>(isqrt(magnitude2[k]));
}

}  // namespace

extern "C" int matrix_init(_matrix_s* m, int rows, int cols) {
    if (!m) return -1;
    m->rows = 0;
    m->cols = 0;
    m->data = nullptr;
    uint32_t bytes;
    if (rows <= 0 || cols <= 0 ||
        !lmk::CheckedMul(static_cast<uint32_t>(rows), static_cast<uint32_t>(cols), 4u, &bytes) ||
        bytes > 0x7fffffffu) {
        return -1;
    }
    int32_t* data = static_cast<int32_t*>(std::calloc(bytes / 4u, 4));
    if (!data) return -1;
    m->rows = rows;
    m->cols = cols;
    m->data = data;
    return 0;
}

extern "C" _matrix_s* matrix_create(int rows, int cols) {
    _matrix_s* m = static_cast<_matrix_s*>(std::malloc(sizeof(_matrix_s)));
    if (!m) return nullptr;
    if (matrix_init(m, rows, cols) != 0) {
        std::free(m);
        return nullptr;
    }
    return m;
}

extern "C" void matrix_free(_matrix_s* m) {
    if (!m) return;
    std::free(m->data);
    m->data = nullptr;
    m->rows = 0;
    m->cols = 0;
}

extern "C" void matrix_kill(_matrix_s* m) {
    if (!m) return;
    matrix_free(m);
    std::free(m);
}

extern "C" int matrix_get(const _matrix_s* m, int row, int col) {
    if (!Inside(m, row, col)) {
        CBS_ERROR("matrix_get: invalid row / column");
        return -1;
    }
    return At(m, row, col);
}

extern "C" int matrix_set(_matrix_s* m, int row, int col, int value) {
    if (!Inside(m, row, col)) {
        CBS_ERROR("matrix_set: invalid row / column");
        return -1;
    }
    At(m, row, col) = value;
    return 0;
}

extern "C" int64_t matrix_sum(const _matrix_s* m) {
    if (!Valid(m)) return 0;
    int64_t sum = 0;
    for (size_t i = 0; i < Count(m); ++i) sum += m->data[i];
    return sum;
}

extern "C" int matrix_max(const _matrix_s* m) {
    if (!Valid(m)) return -1;
    int32_t best = m->data[0];
    for (size_t i = 1; i < Count(m); ++i)
        if (m->data[i] > best) best = m->data[i];
    return best;
}

extern "C" int matrix_min(const _matrix_s* m) {
    if (!Valid(m)) return -1;
    int32_t best = m->data[0];
    for (size_t i = 1; i < Count(m); ++i)
        if (m->data[i] < best) best = m->data[i];
    return best;
}

extern "C" int matrix_add_const(_matrix_s* m, int c) {
    if (!Valid(m)) return -1;
    for (size_t i = 0; i < Count(m); ++i) m->data[i] = WrapAdd(m->data[i], c);
    return 0;
}

extern "C" int matrix_scale(_matrix_s* m, int c) {
    if (!Valid(m)) return -1;
    for (size_t i = 0; i < Count(m); ++i) m->data[i] = WrapMul(m->data[i], c);
    return 0;
}

extern "C" int matrix_mul(const _matrix_s* a, const _matrix_s* b, _matrix_s* out) {
    if (!Valid(a) || !Valid(b) || !Valid(out) || a->cols != b->rows || out->rows != a->rows ||
        out->cols != b->cols || out == a || out == b) {
        CBS_ERROR("matrix_mul: Matrix sizes do no not match");
        return -1;
    }
    for (int r = 0; r < a->rows; ++r) {
        for (int c = 0; c < b->cols; ++c) {
            int32_t sum = 0;
            for (int k = 0; k < a->cols; ++k) sum = WrapAdd(sum, WrapMul(At(a, r, k), At(b, k, c)));
            At(out, r, c) = sum;
        }
    }
    return 0;
}

extern "C" int matrix_mul_el_by_el(const _matrix_s* a, const _matrix_s* b, _matrix_s* out) {
    if (!Valid(a) || !Valid(b) || !Valid(out) || a->rows != b->rows || a->cols != b->cols ||
        out->rows != a->rows || out->cols != a->cols) {
        CBS_ERROR("mul_el_by_el: Matrix sizes do no not match");
        return -1;
    }
    for (size_t i = 0; i < Count(a); ++i) out->data[i] = WrapMul(a->data[i], b->data[i]);
    return 0;
}

extern "C" int matrix_insert(_matrix_s* dst, const _matrix_s* src, int row, int col) {
    if (!Valid(dst) || !Valid(src) || row < 0 || col < 0 || src->rows > dst->rows - row ||
        src->cols > dst->cols - col || dst == src) {
        return -1;
    }
    for (int r = 0; r < src->rows; ++r)
        for (int c = 0; c < src->cols; ++c) At(dst, row + r, col + c) = At(src, r, c);
    return 0;
}

extern "C" int matrix_extract(const _matrix_s* src, _matrix_s* dst, int row, int col) {
    if (!Valid(dst) || !Valid(src) || row < 0 || col < 0 || dst->rows > src->rows - row ||
        dst->cols > src->cols - col || dst == src) {
        CBS_ERROR("matrix_extract: Invalid row / column");
        return -1;
    }
    for (int r = 0; r < dst->rows; ++r)
        for (int c = 0; c < dst->cols; ++c) At(dst, r, c) = At(src, row + r, col + c);
    return 0;
}

extern "C" int matrix_copy(_matrix_s* dst, const _matrix_s* src) {
    if (!Valid(dst) || !Valid(src) || dst->rows != src->rows || dst->cols != src->cols) {
        CBS_ERROR("matrix_copy: Invalid row / column");
        return -1;
    }
    if (dst != src) std::memcpy(dst->data, src->data, Count(src) * 4);
    return 0;
}

extern "C" void matrix_make_0(_matrix_s* m) {
    if (Valid(m)) std::memset(m->data, 0, Count(m) * 4);
}

extern "C" void matrix_print(const _matrix_s* m, FILE* stream) {
    if (!stream) stream = stdout;
    if (!Valid(m)) return;
    for (int r = 0; r < m->rows; ++r) {
        for (int c = 0; c < m->cols; ++c) std::fprintf(stream, "%d ", static_cast<int>(At(m, r, c)));
        std::fprintf(stream, "\n");
    }
}

extern "C" int matrix_transpose(_matrix_s* m) {
    if (!Valid(m) || m->rows != m->cols) {
        CBS_ERROR("matrix_transpose: Not finished yet");
        return -1;
    }
    for (int r = 0; r < m->rows; ++r) {
        for (int c = r + 1; c < m->cols; ++c) {
            const int32_t t = At(m, r, c);
            At(m, r, c) = At(m, c, r);
            At(m, c, r) = t;
        }
    }
    return 0;
}

extern "C" int matrix_crop_image_y(_matrix_s* m, const _image_s* image, int x, int y) {
    if (!Valid(m) || !image || !image->data) return -1;
    if (x >= 0 && y >= 0 && m->cols <= image->width - x && m->rows <= image->height - y) {
        // Wholly inside: no per-pixel checks.
        for (int r = 0; r < m->rows; ++r) {
            const uint8_t* p = image->data + (static_cast<size_t>(y + r) * image->width + static_cast<size_t>(x)) * 4;
            int32_t* out = &At(m, r, 0);
            for (int c = 0; c < m->cols; ++c, p += 4) out[c] = (306 * p[0] + 601 * p[1] + 117 * p[2] + 512) >> 10;
        }
        return 0;
    }
    for (int r = 0; r < m->rows; ++r) {
        const int64_t iy = static_cast<int64_t>(y) + r;
        for (int c = 0; c < m->cols; ++c) {
            const int64_t ix = static_cast<int64_t>(x) + c;
            int32_t luma = 0;
            if (ix >= 0 && iy >= 0 && ix < image->width && iy < image->height) {
                const uint8_t* p = image->data + (static_cast<size_t>(iy) * image->width + static_cast<size_t>(ix)) * 4;
                luma = (306 * p[0] + 601 * p[1] + 117 * p[2] + 512) >> 10;
            }
            At(m, r, c) = luma;
        }
    }
    return 0;
}

extern "C" void fft16(int32_t x[16]) {
    if (AllBytes(x)) {
        Fft16Bytes(x);
        return;
    }
    uint32_t magnitude2[9];
    for (int k = 0; k <= 8; ++k) {
        // Each term is divided on its own (truncating toward zero) before it is
        // summed; 64-bit terms keep any input free of overflow.
        int64_t re = 0;
        int64_t im = 0;
        for (int n = 0; n < 16; ++n) {
            const int i = (n * k) % 16;
            re += static_cast<int64_t>(kCos[i]) * x[n] / 256;
            im += static_cast<int64_t>(kSin[i]) * x[n] / 256;
        }
        // |re|, |im| < 2^35 for any int32 input; their squares would not fit a
        // 64-bit sum, so saturate before squaring.
        const uint64_t limit = 0xffffffffull;
        const uint64_t are = static_cast<uint64_t>(re < 0 ? -re : re);
        const uint64_t aim = static_cast<uint64_t>(im < 0 ? -im : im);
        uint64_t sum = limit;
        if (are <= 65536 && aim <= 65536) sum = are * are + aim * aim;
        magnitude2[k] = static_cast<uint32_t>(sum > limit ? limit : sum);
    }
    for (int k = 0; k <= 8; ++k) x[k] = static_cast<int32_t>(isqrt(magnitude2[k]));
}

extern "C" int matrix_dft_hor(_matrix_s* m) {
    if (!Valid(m) || m->cols != 16) return -1;
    for (int r = 0; r < m->rows; ++r) fft16(&At(m, r, 0));
    return 0;
}
