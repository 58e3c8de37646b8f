/*
 * lmc.h - the exported interface of the Lumicor photo-analysis library.
 *
 * Usage:
 *   if (LmcInitializeLumicor("/data/lumicor/lmc.conf") != LMC_STATUS_OK) { ... }
 *   LmcImage image = {pixels, NULL, width, height, pitch, LMC_PIXEL_ORDER_RGB};
 *   LmcPhotoMeta meta = {0, NULL};
 *   if (LmcAnalyzePhoto(&image, -1, NULL, &meta) == LMC_STATUS_OK) {
 *       ... store meta.nBufferSize bytes at meta.pMeta beside the photo ...
 *       LmcDisposePhotoMeta(&meta);
 *   }
 *   LmcFinalizeLumicor();
 *
 * Later, a stored blob gives a crop of a wanted shape:
 *   LmcFramingParam param = {4, 1.0f, 10.0f};   (mode, height / width, zoom limit)
 *   LmcRect crop;
 *   LmcSearchFraming(&meta, &param, &crop);     (crop as fractions of the photo)
 *
 * Ownership: the host's pixel buffers are never written. A blob returned by
 * LmcAnalyzePhoto belongs to the host until LmcDisposePhotoMeta, which may be
 * called at any time, also after LmcFinalizeLumicor.
 * Threads: every call runs on the caller's thread; call the library from one
 * thread at a time.
 * Messages go to the log configured in lmc.conf (module and submodule "Lumicor").
 */
#ifndef LUMICOR_LMC_H
#define LUMICOR_LMC_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Status codes returned (as uint32_t) by every Lmc function. 3 to 5 are never returned. */
typedef enum LmcStatus {
    LMC_STATUS_OK = 0,
    LMC_STATUS_INVALID_PARAMETER = 1, /* a null pointer or an argument out of range */
    LMC_STATUS_OUT_OF_MEMORY = 2,     /* an allocation failed */
    LMC_STATUS_FILE_ERROR = 6,        /* the configuration file cannot be opened */
    LMC_STATUS_FAILED = 7             /* not initialised, already initialised, or any other failure */
} LmcStatus;

/* Channel layout of the host's buffer (a 32-bit signed value). Orders 0-6
 * describe the byte buffer pBuf, order 7 the 32-bit words of pBufInt32.
 * Note that 3-6 are numbered differently from the library's internal orders. */
typedef enum LmcPixelOrder {
    LMC_PIXEL_ORDER_GRAY = 0,       /* 1 byte: gray */
    LMC_PIXEL_ORDER_RGB = 1,        /* 3 bytes: R G B */
    LMC_PIXEL_ORDER_BGR = 2,        /* 3 bytes: B G R */
    LMC_PIXEL_ORDER_ARGB = 3,       /* 4 bytes: A R G B */
    LMC_PIXEL_ORDER_ABGR = 4,       /* 4 bytes: A B G R */
    LMC_PIXEL_ORDER_RGBA = 5,       /* 4 bytes: R G B A */
    LMC_PIXEL_ORDER_BGRA = 6,       /* 4 bytes: B G R A */
    LMC_PIXEL_ORDER_INT32_ARGB = 7, /* one 32-bit word per pixel: A bits 24-31, R 16-23, G 8-15, B 0-7 */
    LMC_PIXEL_ORDER_MAX = 8         /* number of orders; not a valid order */
} LmcPixelOrder;

/* The host's photo. */
typedef struct LmcImage {
    const uint8_t* pBuf;        /* pixels for orders 0-6; may be NULL for order 7 */
    const uint32_t* pBufInt32;  /* pixels for order 7; may be NULL for orders 0-6 */
    int32_t width;              /* pixels per row, > 0 */
    int32_t height;             /* rows, > 0 */
    int32_t pitch;              /* bytes from one row to the next, != 0 (bytes also for order 7) */
    LmcPixelOrder order;
} LmcImage;

/* A face box the host already knows, as fractions (0..1) of the photo's width and height. */
typedef struct LmcFaceRect {
    float x;
    float y;
    float width;
    float height;
} LmcFaceRect;

/* A photo meta blob. pMeta is allocated by the library (array new) and
 * released with LmcDisposePhotoMeta. */
typedef struct LmcPhotoMeta {
    uint32_t nBufferSize; /* bytes at pMeta */
    uint8_t* pMeta;
} LmcPhotoMeta;

/* The wanted crop. */
typedef struct LmcFramingParam {
    int32_t composition_mode;  /* composition rule of the framing search */
    float aspect_ratio;        /* crop height / crop width, in pixels */
    float magnification_limit; /* largest zoom the crop may imply */
} LmcFramingParam;

/* A crop as fractions of the analysed photo's width (x, width) and height (y, height). */
typedef struct LmcRect {
    float x;
    float y;
    float width;
    float height;
} LmcRect;

/* Starts the library: loads the configuration file configPath (which must
 * exist; the library keeps no pointer to the text), starts the log and logs
 * the version banner.
 * Returns 0; 1 when configPath is NULL; 6 when the file cannot be opened (also
 * for a directory); 2 or 7 when the configuration or log cannot be set up;
 * 7 when the library is already initialised (nothing changes then). After a
 * failure the library is left uninitialised. */
uint32_t LmcInitializeLumicor(const char* configPath);

/* Analyses one photo into a new photo meta blob.
 * nFaceRectCount: -1 detects faces automatically, 0 analyses without faces,
 * n >= 1 uses the n boxes of pFaceRectArray (copied; not kept; for -1 and 0
 * the array is not looked at). The host's pixels are read, never written; an
 * RGB buffer is used in place. On success *pMetaOut receives a blob owned by
 * the host; on every failure *pMetaOut is {0, NULL} (when pMetaOut is not NULL).
 * Every analysed photo advances the debug image counter of lmc.conf's [Debug]
 * output. Returns 0; 1 for an invalid argument; 2 out of memory; 7 when the
 * library is not initialised (pMetaOut untouched), the photo is refused by the
 * analysis (too small, a row longer than the pitch, ...), or the analysis or
 * debug output failed. */
uint32_t LmcAnalyzePhoto(const LmcImage* pImage, int32_t nFaceRectCount, const LmcFaceRect* pFaceRectArray,
                         LmcPhotoMeta* pMetaOut);

/* Finds the crop of the requested shape for a stored blob, from its attention
 * areas alone. Works in any state of the library; the blob is only read.
 * Returns 0 with *pRectOut filled; 1 for a NULL argument or an empty blob;
 * 7 when the blob cannot be parsed or the search fails. */
uint32_t LmcSearchFraming(const LmcPhotoMeta* pPhotoMeta, const LmcFramingParam* pParam, LmcRect* pRectOut);

/* Releases a blob returned by LmcAnalyzePhoto and sets it to {0, NULL}; a
 * NULL pMeta is fine. Works in any state of the library.
 * Returns 0; 1 when pPhotoMeta is NULL. */
uint32_t LmcDisposePhotoMeta(LmcPhotoMeta* pPhotoMeta);

/* Stops the log and unloads the configuration; may be called when not
 * initialised. Returns 0, or the first failure code of the configuration
 * release, the configuration unload and the log stop, in that priority. */
uint32_t LmcFinalizeLumicor(void);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* LUMICOR_LMC_H */
