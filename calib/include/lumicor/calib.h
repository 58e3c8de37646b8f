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

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* LUMICOR_CALIB_H */
