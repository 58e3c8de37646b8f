// Integer matrices of the similarity building blocks. The record and the
// functions a host uses (matrix_init/create/free/kill/get/set, matrix_emd)
// are declared in lumicor/ktsimilarity.h; the rest serve the extraction.
// Every function returns -1 (or NULL) on failure after reporting through
// cbs_error, 0 on success unless it returns a value.
#ifndef LUMICOR_KTLIB_CBS_IMATRIX_H
#define LUMICOR_KTLIB_CBS_IMATRIX_H

#include <stdint.h>
#include <stdio.h>

#include <lumicor/ktsimilarity.h>

struct _image_s;

extern "C" {
int64_t matrix_sum(const _matrix_s* m);  // 0 for an empty matrix
int matrix_max(const _matrix_s* m);      // -1 for an empty matrix
int matrix_min(const _matrix_s* m);      // -1 for an empty matrix
// Element-wise m += c and m *= c (two's-complement wrap on overflow).
int matrix_add_const(_matrix_s* m, int c);
int matrix_scale(_matrix_s* m, int c);
// out = a x b; out must already have a's rows and b's columns.
int matrix_mul(const _matrix_s* a, const _matrix_s* b, _matrix_s* out);
// out = a .* b; all three of one size.
int matrix_mul_el_by_el(const _matrix_s* a, const _matrix_s* b, _matrix_s* out);
// Writes src into dst with its top-left corner at (row, col); src must fit.
int matrix_insert(_matrix_s* dst, const _matrix_s* src, int row, int col);
// Fills dst (its own size) from src starting at (row, col); must lie inside.
int matrix_extract(const _matrix_s* src, _matrix_s* dst, int row, int col);
// Copies src into dst of the same size.
int matrix_copy(_matrix_s* dst, const _matrix_s* src);
void matrix_make_0(_matrix_s* m);
void matrix_print(const _matrix_s* m, FILE* stream);  // stdout when stream is NULL
// Transposes a square matrix in place; other shapes are refused.
int matrix_transpose(_matrix_s* m);
// Fills m with the luma (306 R + 601 G + 117 B + 512) >> 10 of the pixels
// whose top-left corner is (x, y); pixels outside the image give 0.
int matrix_crop_image_y(_matrix_s* m, const _image_s* image, int x, int y);
// Replaces every row of a 16-column matrix by its DFT magnitudes (fft16).
int matrix_dft_hor(_matrix_s* m);
// In-place magnitudes of frequencies 0..8 of 16 samples in x[0..8] (x[9..15]
// keep their values), fixed-point with 8-bit twiddle factors. Exact for
// samples within +-4095 (luma is 0..255); beyond that a magnitude may
// saturate at 65535.
void fft16(int32_t x[16]);
}

#endif
