/*
 * ktsimilarity.h - comparing two photos by their similarity metas.
 *
 * A similarity meta (_KtMetaSimilarity, lumicor/ktlib.h) holds a photo's
 * 32-colour Lab palette, two texture histograms and an 81-value edge
 * feature. This header offers:
 *
 *   - the distance of each part: texture_distance (two forms),
 *     texture_distance_rotatable, edge_distance (with its Metric), and the
 *     general one-dimensional Earth Mover's Distance matrix_emd;
 *   - the records these take and the calls that fill them from a meta
 *     (KtSimlGetTexture, KtSimlGetEdge) or build them (matrix_*);
 *   - one ready-made ranking distance, KtSimlDistance, that combines palette,
 *     texture and edge, and a near-duplicate decision on top of it.
 *
 * Usage, ranking a library of photos against a query:
 *   float d;
 *   if (KtSimlDistance(query, candidate, &d) == KT_OK) { ... smaller d = more alike ... }
 *   int dup;
 *   KtSimlIsNearDuplicate(query, candidate, KT_SIML_NEAR_DUPLICATE_THRESHOLD, &dup);
 *
 * Every function is a pure computation without state: safe to call from any
 * thread. Any meta that KtSimlParse accepts may be passed, including hostile
 * values (ncol32 above 32 or 0, NaN or infinite edge values, huge counts);
 * such input yields a defined result, never a fault. The header is C++ (the
 * two texture_distance forms are overloads).
 */
#ifndef LUMICOR_KTSIMILARITY_H
#define LUMICOR_KTSIMILARITY_H

#include <stdint.h>
#include <stdio.h>

#include <lumicor/ktlib.h>

/* Number of texture bins of a similarity meta, and the largest supported. */
#define KT_TEXTURE_BINS 8
/* Values of an edge feature: 3 scales x 3 x 3 regions x 3 orientations. */
#define KT_EDGE_VALUES 81
/* texture_distance result when the two textures cannot be compared (a size of
 * 0, or a histogram without counts compared with one that has counts). */
#define KT_TEXTURE_DISTANCE_NONE 2147483647
/* edge_distance result for edge layouts without any correlation. */
#define KT_EDGE_DISTANCE_MAX 10000u

/* Texture histograms of one photo: per row and column of 16 x 16 luma blocks
 * the dominant spatial frequency (bins 0..7; bin 0 = flat). */
struct _texture_s {
    int32_t width;  /* size of the analysed image */
    int32_t height;
    int32_t bins;   /* always KT_TEXTURE_BINS in a meta */
    int32_t vertical[KT_TEXTURE_BINS];
    int32_t horizontal[KT_TEXTURE_BINS];
};

/* Edge feature of one photo: absolute Haar detail energy, index
 * 27 x scale + 3 x region + orientation. */
struct edge_s {
    float value[KT_EDGE_VALUES];
};

/* Row-major matrix of signed 32-bit values; owns `data` once initialised. */
struct _matrix_s {
    int32_t rows;
    int32_t cols;
    int32_t* data;
};

extern "C" {

/* ---- records from a meta ---- */

/* Fills *t with the size and both texture histograms of m (counts above
 * 2147483647 are stored as 2147483647). KT_ERR_NULL when either is NULL. */
int KtSimlGetTexture(const _KtMetaSimilarity* m, _texture_s* t);
/* Copies the 81 edge values of m into *e. KT_ERR_NULL when either is NULL. */
int KtSimlGetEdge(const _KtMetaSimilarity* m, edge_s* e);

/* ---- texture ---- */

/* Empties *t and sets its number of bins; -1 when t is NULL or bins is not
 * 1..KT_TEXTURE_BINS. */
int texture_init(_texture_s* t, int bins);
/* Zeroes both histograms of *t (size and bins are kept); NULL is ignored. */
void texture_clear(_texture_s* t);
/* Prints *t to stream (stdout when NULL). */
void texture_print(const _texture_s* t, FILE* stream);

/* Distance between two texture histogram pairs and their image sizes:
 * 0 for identical textures, larger for more different ones, normalised by the
 * larger image area. Returns KT_TEXTURE_DISTANCE_NONE when a size or bin count
 * is 0 or negative, when a histogram holds a negative bin or more than
 * 16,777,216 counts, or when one histogram of a pair is empty and the other is
 * not (two empty histograms are at distance 0); -1 when bins1 is above
 * KT_TEXTURE_BINS. Only the first bins1 bins of the four arrays are read; the
 * arrays are not changed. The result saturates at 2147483647. */
int texture_distance(int width1, int height1, int bins1, int* vertical1, int* horizontal1,
                     int width2, int height2, int bins2, int* vertical2, int* horizontal2);

/* Ranks photos by similarity with the Earth Mover's Distance of two single-row
 * matrices of equal length (histograms of any length): the raw transport cost
 * after equalising both masses. -1 when either is NULL or empty, has more than
 * one row, the lengths differ, a value is negative, a sum exceeds 8,388,607,
 * one histogram is empty while the other is not, or out of memory. The cost
 * saturates at 2147483647. The matrices are not changed. */
int matrix_emd(_matrix_s* m1, _matrix_s* m2);

/* Allocates a zeroed rows x cols array into *m; -1 for a NULL m, a
 * non-positive size, a size above 2^31 - 1 bytes or out of memory. */
int matrix_init(_matrix_s* m, int rows, int cols);
/* New zeroed matrix owned by the caller (release with matrix_kill); NULL on
 * the failures of matrix_init. */
_matrix_s* matrix_create(int rows, int cols);
/* Frees the values of *m and empties it (the record stays). */
void matrix_free(_matrix_s* m);
/* Frees a matrix made by matrix_create; NULL is ignored. */
void matrix_kill(_matrix_s* m);
/* Value at (row, col); -1 when outside (indistinguishable from a stored -1). */
int matrix_get(const _matrix_s* m, int row, int col);
/* Stores value at (row, col); -1 when outside, else 0. */
int matrix_set(_matrix_s* m, int row, int col, int value);

/* ---- edge ---- */

/* Distance between two edge layouts, from 0 (same layout) to 10000. Built from
 * the correlation of the per-region energy shares and of the per-orientation
 * shares (see Metric); an edge feature without energy (a flat photo) has no
 * correlation with anything, not even itself, and is at 10000. */
unsigned int edge_distance(const edge_s* e1, const edge_s* e2);

/* ---- combined ---- */

/* Look-alike distance between two photos in [0, 1]: 0 for identical metas,
 * small for the same scene re-encoded, resized, slightly cropped or
 * re-exposed, larger for different photos. It is the weighted sum
 *   0.45 x palette + 0.35 x edge + 0.20 x texture
 * of three parts, each in [0, 1]:
 *   palette: KtSimlPaletteDistance / 40, capped at 1;
 *   edge:    edge_distance / 10000, and 0 when both photos are flat;
 *   texture: texture_distance / 65536, capped at 1 (1 when not comparable).
 * KT_ERR_NULL when an argument is NULL. */
int KtSimlDistance(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float* distance);

/* Suggested KtSimlIsNearDuplicate threshold: on real photos, copies that were
 * re-encoded, halved, cropped by 5 % or brightened by 25 % stayed below 0.11
 * while different photos stayed above 0.16 (tools/siml_rank). */
#define KT_SIML_NEAR_DUPLICATE_THRESHOLD 0.13f

/* *isDuplicate = 1 when KtSimlDistance(a, b) <= threshold, else 0.
 * KT_ERR_NULL when an argument is NULL. */
int KtSimlIsNearDuplicate(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float threshold,
                          int* isDuplicate);

/* Colour distance of two palettes in CIE Lab units (delta E): the
 * pixel-weighted mean distance from each palette colour to the nearest colour
 * of the other palette, averaged over both directions; 0 for identical
 * palettes. A palette without colours or counts (ncol32 0) is at distance 100
 * from any other palette and 0 from another empty one; ncol32 above 32 counts
 * as 32. KT_ERR_NULL when an argument is NULL. */
int KtSimlPaletteDistance(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float* distance);

}  /* extern "C" */

/* Same as the array form, over two records (widths, heights, bins and
 * histograms of t1 and t2); KT_TEXTURE_DISTANCE_NONE when either is NULL. */
int texture_distance(_texture_s* t1, _texture_s* t2);

/* The smaller of texture_distance(t1, t2) and the distance between t1 and t2
 * turned by 90 degrees (t2's width and height exchanged and its vertical and
 * horizontal histograms swapped). The records are not changed. */
extern "C" int texture_distance_rotatable(_texture_s* t1, _texture_s* t2);

/* Correlations of two edge features (81 values each, not owned; they must
 * outlive the Metric). Each correlation is in [-1, 1]; -1 when one side has
 * no usable energy (all zero, or not finite). */
class Metric {
public:
    Metric(const float* edge1, const float* edge2);
    virtual ~Metric();
    /* Correlation of the regions' shares of their scale's energy. */
    double calculateSizeCorrelation();
    /* Correlation of the orientations' shares of their region's energy. */
    double calculateAngleCorrelation();

private:
    const float* edge1_;
    const float* edge2_;
};

#endif /* LUMICOR_KTSIMILARITY_H */
