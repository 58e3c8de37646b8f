/*
 * zbm_image.h - the image record shared by every Lumicor engine, its pixel
 * orders and value types, the Zbiu image operations and the zbm_Write* byte
 * writers used by every serialiser.
 *
 * Usage:
 *   _zbm_Image* img = ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_RGB);   // owning, zero-filled
 *   if (!img) { ... out of memory or more than 16,000,000 pixels ... }
 *   ZbiuSetPixel(img, 10, 20, px);
 *   ZbiuDispose(&img);                                           // img becomes NULL
 *
 * Ownership: every image returned by a ZbiuCreate* function belongs to the
 * caller and is released with ZbiuDispose. Attached images (ZbiuCreateAttatchData)
 * never free the caller's pixels. Functions returning int return 0 on success,
 * 3 for an invalid argument, 4 when out of memory, 12 for an unsupported value
 * and 13 for an unsupported conversion. No function logs or throws.
 * Threads: functions are reentrant; an image must not be written by two
 * threads at once.
 */
#ifndef LUMICOR_ZBM_IMAGE_H
#define LUMICOR_ZBM_IMAGE_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Channel layout of an image. Byte offsets of R, G, B, A per order are given
 * by ZbiuGetRgbOffset. */
typedef enum _zbm_PixelOrder {
    ZBM_PIXEL_ORDER_GRAY = 0, /* 1 byte  */
    ZBM_PIXEL_ORDER_RGB = 1,  /* 3 bytes */
    ZBM_PIXEL_ORDER_BGR = 2,  /* 3 bytes */
    ZBM_PIXEL_ORDER_RGBA = 3, /* 4 bytes */
    ZBM_PIXEL_ORDER_BGRA = 4, /* 4 bytes */
    ZBM_PIXEL_ORDER_ARGB = 5, /* 4 bytes */
    ZBM_PIXEL_ORDER_ABGR = 6, /* 4 bytes */
    ZBM_PIXEL_ORDER_YUV = 7,  /* 3 bytes: Y, U, V */
    ZBM_PIXEL_ORDER_LAB = 8,  /* 3 bytes: L, a, b */
    ZBM_PIXEL_ORDER_NUM = 9
} _zbm_PixelOrder;

/* The image record: seven 32-bit fields on the target. */
typedef struct _zbm_Image {
    uint8_t* pData;         /* first byte of the top row */
    int32_t width;          /* pixels per row */
    int32_t height;         /* rows */
    int32_t pitch;          /* bytes from one row to the next (may be negative for attached data) */
    _zbm_PixelOrder order;  /* channel layout */
    int32_t bytesPerPixel;  /* derived from order */
    int32_t ownsData;       /* 1: pData was allocated by the image and is freed on dispose */
} _zbm_Image;

typedef struct zbm_Pos {
    int32_t x;
    int32_t y;
} zbm_Pos;

/* Covers columns x .. x+width-1 and rows y .. y+height-1. */
typedef struct zbm_Rect {
    int32_t x;
    int32_t y;
    int32_t width;
    int32_t height;
} zbm_Rect;

/* One pixel in the image's own storage order; bytes past bytesPerPixel are 0. */
typedef struct zbm_PackedUchar {
    uint8_t v[4];
} zbm_PackedUchar;

/* One float per stored channel: averages, variances, gains, offsets. */
typedef struct zbm_PackedFloat {
    float v[4];
} zbm_PackedFloat;

/* Status codes of the Zbiu functions. */
enum {
    ZBIU_OK = 0,
    ZBIU_ERR_INVALID_ARGUMENT = 3,
    ZBIU_ERR_OUT_OF_MEMORY = 4,
    ZBIU_ERR_UNSUPPORTED_VALUE = 12,
    ZBIU_ERR_UNSUPPORTED_CONVERSION = 13
};

/* ------------------------------------------------------------------------
 * Byte-order writers. Each copies one value from src to dst and returns the
 * number of bytes written. The BE forms reverse the bytes of a little-endian
 * host value; since a swap is its own inverse, parsers read a big-endian
 * field by calling the same writer with the blob as source and the native
 * variable as destination. Neither pointer may be NULL.
 * ------------------------------------------------------------------------ */
typedef enum _zbm_WriteEndianType {
    ZBM_WRITE_ENDIAN_LITTLE = 0,
    ZBM_WRITE_ENDIAN_BIG = 1,
    ZBM_WRITE_ENDIAN_NONE = 2 /* writes nothing, returns 0 */
} _zbm_WriteEndianType;

uint32_t zbm_Write8(void* dst, const void* src);
uint32_t zbm_Write16BE(void* dst, const void* src);
uint32_t zbm_Write32BE(void* dst, const void* src);
uint32_t zbm_Write64BE(void* dst, const void* src);
uint32_t zbm_Write16LE(void* dst, const void* src);
uint32_t zbm_Write32LE(void* dst, const void* src);
uint32_t zbm_Write64LE(void* dst, const void* src);
/* Dispatch on type; a type outside 0..2 writes nothing and returns 0. */
uint32_t zbm_Write16(void* dst, const void* src, _zbm_WriteEndianType type);
uint32_t zbm_Write32(void* dst, const void* src, _zbm_WriteEndianType type);
uint32_t zbm_Write64(void* dst, const void* src, _zbm_WriteEndianType type);

#ifdef __cplusplus
} /* extern "C" */
#endif

/* ZBIU_FUNCTIONS: the Zbiu image operations are declared below. */

#endif /* LUMICOR_ZBM_IMAGE_H */
