/*
 * ktlib.h - the quality and similarity metas of a photo: records, versions
 * and the uniform entry-point family of each meta (get version, extract,
 * clone, dispose, dump, serialise, parse, get serialised size).
 *
 * Usage:
 *   _KtMetaSimilarity* siml = NULL;
 *   if (KtSimlExtract(rgb, w, h, pitch, 0, &siml) == KT_OK) {
 *       unsigned int size; KtSimlGetSerializedSize(&size);     // 676
 *       ... KtSimlSerialize(&metaVersion, &engineVersion, siml, buf, size);
 *       KtSimlDisposeMeta(&siml);                              // siml becomes NULL
 *   }
 *
 * Each meta travels in one frame: a 16-byte header (signature, payload
 * length, meta and engine versions; big-endian) followed by its payload.
 * Records returned through `out` parameters belong to the caller and are
 * released with the matching KtXxxDisposeMeta. On failure nothing is stored
 * in `*out`. Result codes: KT_OK (0), KT_ERR_FAILED (1), KT_ERR_NULL (2),
 * KT_ERR_STATE (3), KT_ERR_NO_MEMORY (4), KT_ERR_NO_PIXELS (7),
 * KT_ERR_RANGE (12), KT_ERR_UNSUPPORTED (13); image-function codes pass
 * through unchanged.
 */
#ifndef LUMICOR_KTLIB_H
#define LUMICOR_KTLIB_H

#include <stdint.h>
#include <stdio.h>

enum {
    KT_OK = 0,
    KT_ERR_FAILED = 1,
    KT_ERR_NULL = 2,
    KT_ERR_STATE = 3,
    KT_ERR_NO_MEMORY = 4,
    KT_ERR_NO_PIXELS = 7,
    KT_ERR_RANGE = 12,
    KT_ERR_UNSUPPORTED = 13
};

struct _KtMetaVersion {
    uint8_t major;
    uint8_t minor;
};

struct _KtEngineVersion {
    uint8_t major;
    uint8_t minor;
    uint32_t build; /* yymmddnn, shown in hexadecimal */
};

/* In-memory frame header; 16 bytes on the wire. */
struct KtFrameHeader {
    char metaSignature[4]; /* not terminated */
    uint32_t metaBytes;    /* payload length, header excluded */
    _KtMetaVersion metaVersion;
    _KtEngineVersion engineVersion;
};

/* Similarity signature of a photo: a flat 660-byte record whose layout is
 * the payload layout with host byte order. */
struct _KtMetaSimilarity {
    struct _Lab {
        uint8_t reserved; /* always 0 */
        uint8_t l;        /* 0..99 */
        uint8_t a;        /* offset by 128 */
        uint8_t b;        /* offset by 128 */
    };
    struct _ColHist {
        _Lab lab;
        uint32_t count; /* pixels of this palette colour */
    };
    struct _EdgeMeta {
        float value[81]; /* index = 27 * scale + 3 * region + orientation */
    };

    int32_t width;  /* size of the analysed image */
    int32_t height;
    _Lab mainColor;
    uint32_t ncol32; /* valid palette entries */
    _ColHist colHist32[32];
    uint32_t verHist[8];
    uint32_t horHist[8];
    _EdgeMeta edge;
};

/* Colour label percentages (0..100); 16 bytes. */
struct _KtMetaColorLabel {
    uint8_t white;
    uint8_t black;
    uint8_t red;
    uint8_t yellow;
    uint8_t green;
    uint8_t blue;
    uint8_t reserved[10]; /* always 0 */
};

/* One point of a finger outline, in analysed-image pixels. */
struct _KtFingerPoint {
    uint16_t x;
    uint16_t y;
};

/* One finger found in front of the lens (16 bytes on the 32-bit target). */
struct _KtFinger {
    float score;             /* detection score */
    uint32_t area;           /* in analysed pixels */
    uint32_t numPoint;       /* points in pPoints */
    _KtFingerPoint* pPoints; /* owned by the record */
};

/* Quality judgement of a photo. Scores are -1.0 (not measured) or in [0, 1].
 * The record owns pFingers (and each finger's points) and pBlurMap, all
 * allocated with array new (KtRepmDisposeMeta releases them with delete[]). */
struct _KtMetaRepresentative {
    float colorVariation;
    float badExposure;
    float fingerOnLens;
    float outOfFocus;
    float cameraShake;
    float motionBlur;
    uint32_t analyzedWidth;  /* size of the image the fingers were found in */
    uint32_t analyzedHeight;
    uint32_t numFinger;      /* at most KT_MAX_FINGERS */
    _KtFinger* pFingers;
    uint32_t mapWidth;       /* blur map size */
    uint32_t mapHeight;
    uint8_t* pBlurMap;       /* mapWidth * mapHeight gray values, row-major */
};

#define KT_MAX_FINGERS 10u

#ifdef __cplusplus
static_assert(sizeof(_KtMetaSimilarity) == 660, "similarity record is 660 bytes");
static_assert(sizeof(_KtMetaColorLabel) == 16, "colour label record is 16 bytes");
#endif

extern "C" {

/* ---- similarity meta ("SIML", meta version 2.0) ---- */
/* Fills both versions; 2 when either pointer is NULL. */
int KtSimlGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine);
/* Copies *src into a new record in *out (which must be NULL: else 2); 4 out of memory. */
int KtSimlCloneMeta(const _KtMetaSimilarity* src, _KtMetaSimilarity** out);
/* Frees *m and sets it to NULL; NULL m or *m is ignored. */
int KtSimlDisposeMeta(_KtMetaSimilarity** m);
/* Prints the meta to stream; does nothing when either is NULL. Returns 0. */
int KtSimlDump(const _KtMetaSimilarity* m, FILE* stream);
/* Stores 676 (16 + 660). */
int KtSimlGetSerializedSize(unsigned int* size);
/* Writes one frame; 2 null argument, 3 buffer too short, 1 short write. */
int KtSimlSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaSimilarity* m, unsigned char* buffer, unsigned int length);
/* Reads one frame into a new record in *out (must be NULL: else 3); header
 * is filled even when the payload is refused. 2 null argument, 3 length <= 16,
 * 1 malformed frame or unsupported meta major, 4 out of memory. The frame
 * is exactly 16 + metaBytes bytes and metaBytes must be the payload size;
 * bytes after it are ignored (the next frame). */
int KtSimlParse(const unsigned char* data, unsigned int length, KtFrameHeader* header,
                _KtMetaSimilarity** out);

/* ---- representative meta ("REPM", meta version 2.0 written, 1.x read) ----
 * Members without a comment behave as their similarity counterparts; the
 * dispose also frees the record's arrays. */
int KtRepmGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine);
/* Deep copy; 3 when *out is set, the meta has more than 10 fingers or a
 * count without its array, 4 out of memory. */
int KtRepmCloneMeta(const _KtMetaRepresentative* src, _KtMetaRepresentative** out);
int KtRepmDisposeMeta(_KtMetaRepresentative** m);
int KtRepmDump(const _KtMetaRepresentative* m, FILE* stream);
/* Stores 16 + the payload size of m; 2 null, 3 more than 10 fingers, a
 * count without its array or a size beyond 32 bits. */
int KtRepmGetSerializedSize(const _KtMetaRepresentative* m, unsigned int* size);
/* metaVersion->major 2 writes the current payload; 1 fails with 1 (read-only
 * legacy format, said on stderr); any other value 13. 2 null argument, 3
 * buffer too short or a meta GetSerializedSize refuses. */
int KtRepmSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaRepresentative* m, unsigned char* buffer, unsigned int length);
/* 2 null argument or *out set, 3 length <= 16, 1 malformed frame or payload
 * (also more than 10 fingers, so that every parsed meta can be written
 * again), 4 out of memory. Major 1 frames read the legacy 16-byte payload. */
int KtRepmParse(const unsigned char* data, unsigned int length, KtFrameHeader* header,
                _KtMetaRepresentative** out);

/* ---- colour label meta ("CLBL", meta version 1.0) ----
 * Members without a comment behave as their similarity counterparts. */
int KtClblGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine);
/* 2 null argument, 3 when *out is set, 4 out of memory. */
int KtClblCloneMeta(const _KtMetaColorLabel* src, _KtMetaColorLabel** out);
int KtClblDisposeMeta(_KtMetaColorLabel** m);
int KtClblDump(const _KtMetaColorLabel* m, FILE* stream);
/* Stores 32 (16 + 16). */
int KtClblGetSerializedSize(unsigned int* size);
int KtClblSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaColorLabel* m, unsigned char* buffer, unsigned int length);
/* 3 null argument, *out set or length <= 16; 1 malformed frame; 4 out of memory. */
int KtClblParse(const unsigned char* data, unsigned int length, KtFrameHeader* header,
                _KtMetaColorLabel** out);

/* KT_EXTRACT_FUNCTIONS: KtSimlExtract, KtRepmExtract, KtClblExtract are declared below. */

/* Computes the similarity meta of an image of width x height pixels (the
 * analysis passes about 160 x 120) into a new record in *out, which must be
 * NULL on entry. `pitch` is the signed distance in bytes between the starts of
 * consecutive rows (negative for bottom-up buffers: pixels then points at the
 * top row). `format`: 0 RGB, 1 BGR (3 bytes), 2 RGBA, 3 BGRA, 4 ARGB (4 bytes).
 * The pixels are only read. Returns 0; 2 when pixels or out is NULL; 3 for a
 * zero width or height, *out already set, or |pitch| < width x bytes per
 * pixel; 13 for a format above 4; 1 for more than 16,000,000 pixels; 4 when
 * out of memory. */
int KtSimlExtract(const unsigned char* pixels, unsigned int width, unsigned int height, int pitch,
                  unsigned int format, _KtMetaSimilarity** out);

/* Computes the representative (quality) meta of a photo into a new record in
 * *out, which must be NULL on entry: colour variation from siml's palette,
 * finger on lens (with up to KT_MAX_FINGERS finger outlines in the pixels of
 * a copy of about 80 x 60), out of focus and camera shake with a blur map
 * (from a gray copy of about 640 x 480; -1.0 and no map when that copy is
 * below 24 pixels in either direction), bad exposure, and motion blur 0.
 * `format`: 0 RGB, 1 BGR (3 bytes), 2 RGBA, 3 BGRA, 4 ARGB (4 bytes); `pitch`
 * is the signed distance between rows (negative: bottom-up, pixels at the top
 * row). The pixels are only read. Returns 0; 3 for a format above 4, a zero
 * size, *out already set or |pitch| < width x bytes per pixel; 2 when pixels,
 * siml or out is NULL; 4 out of memory; 12 when a score falls outside [0, 1];
 * image-function codes pass through. */
int KtRepmExtract(const unsigned char* pixels, unsigned int width, unsigned int height, int pitch,
                  unsigned int format, const _KtMetaSimilarity* siml, _KtMetaRepresentative** out);

/* Computes the colour labels (pixel-weighted share of white, black, red,
 * yellow, green and blue palette colours, 0..100 %) of a similarity meta into
 * a new record in *out, which must be NULL on entry. A meta without palette
 * counts (ncol32 0) gets 0 everywhere; ncol32 above 32 counts as 32. Returns 0;
 * 2 when siml or out is NULL; 3 when *out is set; 4 when out of memory. */
int KtClblExtract(const _KtMetaSimilarity* siml, _KtMetaColorLabel** out);

}  /* extern "C" */

#endif /* LUMICOR_KTLIB_H */
