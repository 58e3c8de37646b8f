/*
 * calib.h - the attention library: attention areas of a photo and the
 * framing search that composes a crop around them.
 *
 * Records crossing this interface are plain C structures of 32-bit fields.
 * Arrays returned by the library are allocated with array new and released
 * with CADisposeAttentionAreaArray.
 */
#ifndef LUMICOR_CALIB_H
#define LUMICOR_CALIB_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Pixel layout of a buffer handed to CADetectSubject. */
typedef enum _CAColorOrder {
    CA_COLOR_ORDER_RGB = 0,
    CA_COLOR_ORDER_BGR = 1,
    CA_COLOR_ORDER_RGBA = 2,
    CA_COLOR_ORDER_BGRA = 3,
    CA_COLOR_ORDER_ARGB = 4
} _CAColorOrder;

/* A face the host already knows, as fractions of the image size; angles in radians. */
typedef struct CAFaceInfo {
    float nx, ny, nw, nh;
    float roll, pitch, yaw;
} CAFaceInfo;

typedef struct _CAFaceInfoArray {
    int32_t numFaces;
    CAFaceInfo* pInfoArray;
} _CAFaceInfoArray;

/* One attention area, as fractions of the reference width and height. `val`
 * is the gaze direction code (0..8) of a face array, else the saliency (0..255). */
typedef struct CAAttentionArea {
    float nx, ny, nw, nh;
    union {
        int32_t direction;
        uint32_t saliency;
    } val;
} CAAttentionArea;

typedef struct _CAAttentionAreaArray {
    uint32_t isFace;             /* 1: the areas are faces */
    uint32_t numAreas;           /* records in pAreaArray */
    CAAttentionArea* pAreaArray; /* array new; CADisposeAttentionAreaArray frees it */
} _CAAttentionAreaArray;

/* The library version text, NUL-padded to 16 bytes. */
typedef struct _CALibVersion {
    char text[16];
} _CALibVersion;

/* Framing parameters; the first three fields are the host's (LmcFramingParam). */
typedef struct _CAParam {
    int32_t composition_mode;     /* default 4 */
    float aspect_ratio;           /* crop height / crop width, pixels; default 1.0 */
    float magnification_limit;    /* default 10.0 */
    float consistency_weight_min; /* default 0.1 */
    int32_t force_main_number;    /* default CA_NONE_SPECIFIED */
} _CAParam;

#define CA_NONE_SPECIFIED (-1)

/* The chosen crop as fractions of the image width (x, width) and height (y, height). */
typedef struct _CAResult {
    float x, y, width, height;
} _CAResult;

/* CA_FUNCTIONS: the attention and framing entry points are declared below. */

/* Writes the default framing parameters into *pParam: composition_mode 4
 * (importance-weighted composition of all areas), aspect_ratio 1.0,
 * magnification_limit 10.0, consistency_weight_min 0.1, force_main_number
 * CA_NONE_SPECIFIED. Returns 0, or 3 for a null pointer. */
uint32_t CAGetDefaultParam(_CAParam* pParam);

/* Chooses the crop of shape pParam->aspect_ratio (height / width in pixels)
 * that best composes the attention areas of a width x height photo, and
 * writes it to *pResult as fractions of the photo. Only the areas are read,
 * never pixels; only the first 16 areas count. The caller owns all records;
 * nothing is kept between calls, and calls on different records may run
 * concurrently. The same inputs give the same bits on every device.
 *
 * Returns 0 on success; 3 for invalid parameters (a side below 240 or above
 * 2^24 pixels, a null pointer, aspect_ratio outside 0.1..10,
 * magnification_limit outside 1..100, a non-finite consistency_weight_min,
 * force_main_number neither CA_NONE_SPECIFIED nor the index of one of the
 * first 16 areas, an area with a coordinate that is not a finite number
 * within +-64, or areas announced without records), with *pResult untouched;
 * 4 when memory runs out (*pResult untouched); 12 when no proper crop inside
 * the photo results (*pResult written, but not to be used). Every failure
 * prints one line on standard error. */
uint32_t CASearchFraming(uint32_t width, uint32_t height, const _CAParam* pParam,
                         const _CAAttentionAreaArray* pAttentionAreaArray, _CAResult* pResult);

/* Attention areas of one photo: up to 16 rectangles as fractions of a
 * reduced reference image (longer side at most 40 pixels). With faces given
 * (pFaceInfoArray non-null, numFaces not 0) the first 16 faces become the
 * areas, each with its gaze direction code, and isFace is 1; otherwise the
 * areas are the salient regions of the photo, each with its saliency 0..255.
 * pBuf (rows rowstride bytes apart, negative for bottom-up) is only read;
 * |rowstride| must be at least 3 x width for every order. On success the
 * caller owns pAttentionAreaArray->pAreaArray and releases it with
 * CADisposeAttentionAreaArray. The same pixels give the same areas on every
 * device; nothing is kept between calls.
 * Returns 0; 3 for invalid arguments (null buffer or output, a side below
 * 240, a short row stride, faces announced without records), before anything
 * is allocated; 2 when a reduced image or the plane cannot be made (also for
 * an order outside _CAColorOrder); 4 out of memory; 1 when a step of the
 * saliency computation fails; 11 when a debug file cannot be opened. On
 * failure the output is left as it was, except when the record array cannot
 * be allocated: isFace and numAreas are written and pAreaArray is null. Every
 * failure prints one line on standard error. */
uint32_t CADetectSubject(const uint8_t* pBuf, uint32_t width, uint32_t height, int32_t rowstride,
                         _CAColorOrder order, const _CAFaceInfoArray* pFaceInfoArray,
                         _CAAttentionAreaArray* pAttentionAreaArray);

/* Frees the record array of an array made by CADetectSubject and sets isFace
 * and numAreas to 0 and pAreaArray to NULL; an array without records is left
 * unchanged. Returns 0, or 3 for a null array. */
uint32_t CADisposeAttentionAreaArray(_CAAttentionAreaArray* array);

/* The library version, "1.2.2.1217" NUL-padded to 16 bytes. */
_CALibVersion CAGetLibVersion(void);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* LUMICOR_CALIB_H */
