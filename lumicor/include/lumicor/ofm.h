/*
 * ofm.h - the face meta of a photo (_FaceMeta with its _FaceRegion records)
 * and OFM, the versioned, self-describing container it is stored in.
 *
 * Usage (writing):
 *   uint32_t size;
 *   OFM_GetOfmBufferSize(meta.pRegions, meta.regionCount, 259, &size);
 *   OFM_SerializeOfm(0x4D4D, buf, size, &meta, &written);      // "MM": big-endian
 * Usage (reading):
 *   OfmHeader h; OFM_GetOfmHeader(0x4D4D, buf, len, &h);
 *   OFM_GetOfmSize(...) gives the list capacities; CreateFaceRegion() for each
 *   region with them; then OFM_ParseOfm(&h, buf + h.headerSize, len - h.headerSize, &meta).
 *
 * Both records are packed: their layout is fixed (56 and 150 bytes on the
 * 32-bit target). Never take the address of one of their members.
 * OFM_ status codes: 0 success, 1 invalid size/count/version, 2 NULL pointer,
 * 3 unsupported version (header-size query), 4 a list longer than the
 * capacity the caller prepared, 16 no faces (block-info query).
 */
#ifndef LUMICOR_OFM_H
#define LUMICOR_OFM_H

#include <lumicor/zbm_image.h>

#include <stdint.h>

enum {
    OFM_OK = 0,
    OFM_ERR_INVALID = 1,
    OFM_ERR_NULL = 2,
    OFM_ERR_VERSION = 3,
    OFM_ERR_CAPACITY = 4,
    OFM_NO_FACE = 16
};

#define OFM_BYTE_ORDER_BIG 0x4D4D /* "MM" */
#define OFM_FORMAT_VERSION_CURRENT 259

#pragma pack(push, 1)

/* A state value with its present-flag byte. */
struct _FaceRegionState {
    uint8_t flag;
    uint32_t value;
};

/* One face, positions in host pixels. Defaults are those CreateFaceRegion sets. */
struct _FaceRegion {
    uint8_t faceTag;          /* low byte of the engine's tag; not stored in OFM */
    zbm_Rect faceArea;        /* default 0 */
    int32_t auxBox[4];        /* default -1 each */
    float rotation[3];        /* yaw, pitch, roll (reverse of the engine); default all bits set */
    uint32_t auxWord;         /* default 0 */
    uint8_t auxFlag;          /* default 0 */
    zbm_Pos rightEye;         /* default (-1, -1) */
    zbm_Pos leftEye;
    zbm_Pos rightMouthEnd;
    zbm_Pos leftMouthEnd;
    uint8_t codeValid;
    uint8_t codeFlag;
    uint8_t code;             /* 0..11 */
    uint8_t codeReserved[3];  /* zero */
    uint8_t orientation;
    uint8_t flagsValid;
    uint8_t flagA;
    uint8_t flagB;
    uint8_t statesValid;
    _FaceRegionState stateA;  /* default {0, 3} */
    _FaceRegionState stateB;  /* default {0, 3} */
    _FaceRegionState stateC;  /* default {0, 4} */
    uint8_t ageMin;           /* default 255 = unknown */
    uint8_t ageMax;
    uint32_t partCount;       /* items of 9 bytes in pParts: id, x (32 bits), y (32 bits) */
    uint8_t* pParts;
    uint32_t attributeCount;  /* items of 2 bytes in pAttributes: id, score */
    uint8_t* pAttributes;
    char featureType[16];     /* e.g. "PDEC_C2" or "na"; zero by default */
    uint32_t featureSize;     /* bytes in pFeature */
    uint8_t* pFeature;
};

/* The face meta of one photo. */
struct _FaceMeta {
    char engineVersion[16];   /* "ORL_" + engine version without dots, NUL-padded */
    float headerValue;
    uint16_t formatVersion;   /* 259 when written by this library */
    uint16_t imageWidth;      /* host photo size */
    uint16_t imageHeight;
    char dateTime[20];        /* "%04d:%02d:%02d %02d:%02d:%02d", NUL-terminated */
    uint16_t faceNum;         /* at most 32 */
    uint32_t regionCount;     /* equal to faceNum */
    _FaceRegion* pRegions;
};

/* Container header as read by OFM_GetOfmHeader (88 bytes). */
struct OfmHeader {
    char engineVersion[16];
    float headerValue;
    uint16_t formatVersion;
    uint16_t imageWidth;
    uint16_t imageHeight;
    char dateTime[20];
    uint16_t faceNum;
    uint16_t entrySize;       /* E: bytes per face entry */
    uint16_t headerSize;      /* 94 (versions 258, 259) or 72 (256, 257) */
    uint16_t fixedSize;       /* F: fixed part of an entry */
    uint16_t byteOrder;       /* the mark as stored */
    uint8_t fixedBits[16];
    uint8_t varBits[16];
};

#pragma pack(pop)

static_assert(sizeof(OfmHeader) == 88, "OfmHeader is 88 bytes");
static_assert(sizeof(void*) != 4 || sizeof(_FaceRegion) == 150, "_FaceRegion is 150 bytes on 32-bit targets");
static_assert(sizeof(void*) != 4 || sizeof(_FaceMeta) == 56, "_FaceMeta is 56 bytes on 32-bit targets");

/* OFM_FUNCTIONS: CreateFaceRegion, ReleaseFaceRegionArray and the OFM_ functions are declared below. */

#endif /* LUMICOR_OFM_H */
