/*
 * vond.h - the analysis driver and the photo meta.
 *
 * The driver turns one photo into a _VondMeta record (faces, quality and
 * similarity, attention areas); the meta functions turn that record into the
 * photo meta blob and back, print it and release it.
 *
 * Usage:
 *   _VondMeta meta; memset(&meta, 0, sizeof meta);
 *   _VondResult r = VondParseMeta(size, blob, &meta);
 *   if (r.status == VOND_STATUS_OK) { ... use meta ...; }
 *   VondDisposeMeta(&meta);                      // harmless on a zeroed record
 *
 * Every Vond function returns a _VondResult by value: status (VOND_STATUS_*),
 * the static name of the innermost function that set it, and a static
 * message (NULL on success). The record owns every heap block hung on it
 * until VondDisposeMeta, which frees them and zeroes the record. A failed
 * fill leaves the record disposed; a failed serialisation leaves the output
 * buffer all zero. Records for different photos may be used on different
 * threads; one record must not be used by two threads at once.
 */
#ifndef LUMICOR_VOND_H
#define LUMICOR_VOND_H

#include <lumicor/calib.h>
#include <lumicor/ktlib.h>
#include <lumicor/ofm.h>
#include <lumicor/orielplus.h>
#include <lumicor/zbm_image.h>

#include <stdint.h>

enum {
    VOND_STATUS_OK = 0,
    VOND_STATUS_INVALID_PARAMETER = 1,
    VOND_STATUS_OUT_OF_MEMORY = 2,
    VOND_STATUS_FAILED = 3,              /* processing or format error */
    VOND_STATUS_UNSUPPORTED_VERSION = 4, /* meta version other than 6, 7, 8 */
    VOND_STATUS_ENGINE_CONFIG = 5        /* the face engine refused its configuration */
};

struct _VondResult {
    uint32_t status;
    const char* function; /* static name of the function that set status */
    const char* message;  /* static text, NULL on success */
};

struct _VondVersion {
    uint8_t major;       /* 1 */
    uint8_t minor;       /* 5 */
    uint8_t metaVersion; /* 8 */
    uint8_t flags;       /* 0 */
    uint32_t build;      /* 0x13121700 */
};

struct _VondConfig {
    uint32_t faceDetectDicMode; /* 0..15 */
    float faceEngineParam;
    uint32_t faceRcSize;        /* the face engine's working pixel count, != 0 */
};

/* A face box the host already knows, as fractions of the photo size. */
struct _VondFaceRect {
    float x;
    float y;
    float width;
    float height;
};

/* Per-face scores kept beside the face meta, in region order. */
struct _VondOrielScore {
    float detectionScore;
    float blurScore;
};

struct _VondOrielMetaArray {
    uint32_t count;
    _VondOrielScore* pScores; /* count pairs, array new */
};

/* The in-memory photo meta of one photo. Zero it as a whole before use. */
struct _VondMeta {
    _VondVersion version;
    uint32_t faceDetectDicMode;
    float faceEngineParam;
    uint32_t faceRcSize;
    _FaceMeta faceMeta;
    Oriel_ClusterSubject clusterSubject;
    _VondOrielMetaArray faceMetaArray;
    _KtEngineVersion simlEngineVersion;
    _KtMetaVersion simlMetaVersion;
    _KtMetaSimilarity similarity;
    _KtEngineVersion repmEngineVersion;
    _KtMetaVersion repmMetaVersion;
    _KtMetaRepresentative representative;
    _KtEngineVersion clblEngineVersion;
    _KtMetaVersion clblMetaVersion;
    _KtMetaColorLabel colorLabel;
    _CALibVersion caLibVersion;
    uint16_t analyzedWidth;  /* size of the working image */
    uint16_t analyzedHeight;
    _CAAttentionAreaArray attentionAreas;
};

/* ------------------------------------------------------------------ driver */

/* The constant version record of this build (1.5, meta version 8, flags 0, build 0x13121700). */
const _VondVersion* VondGetVersion();

/* Analyses one photo into *pMetaOut (zeroed first). pImage->order is an
 * LmcPixelOrder value 0..7 (not a _zbm_PixelOrder); the host pixels are
 * never written. pConfig NULL uses {4, 0.0, 307200}. On failure the record
 * is left disposed. Status 1 invalid argument, 2 out of memory, 3 engine
 * failure, 5 face engine configuration refused. */
_VondResult VondAnalyze(const _zbm_Image* pImage, int32_t faceRectCount, const _VondFaceRect* pFaceRectArray,
                        const _VondConfig* pConfig, _VondMeta* pMetaOut);

/* ------------------------------------------------------------------ photo meta blob */

/* Exact byte size of the blob VondSerializeMeta writes; 1 NULL argument,
 * 3 a section size cannot be computed (then *pSizeOut = 0). */
_VondResult VondGetSerializedSize(const _VondMeta* pMeta, uint32_t* pSizeOut);
/* Writes the blob into pBuf (bufSize >= the serialised size). 1 NULL or empty
 * buffer (untouched), 3 too small or a section failed (buffer zeroed). */
_VondResult VondSerializeMeta(const _VondMeta* pMeta, uint32_t bufSize, uint8_t* pBuf);
/* Reads a blob into *pMeta (zeroed first; the caller disposes it). 1 NULL
 * argument, 3 malformed, 4 unsupported meta version (the record keeps the
 * version read, everything else zeroed). */
_VondResult VondParseMeta(uint32_t bufSize, const uint8_t* pBuf, _VondMeta* pMeta);
/* Frees everything the record owns and zeroes it; 1 for NULL. */
_VondResult VondDisposeMeta(_VondMeta* pMeta);
/* Prints the face, quality and attention sections to standard output; 1 for NULL. */
_VondResult VondDumpMeta(const _VondMeta* pMeta);

/* ------------------------------------------------------------------ face section */

/* Runs the face engine on the working RGB image and fills the face meta in
 * host pixels (width, height: the host photo's size). */
_VondResult VondOrielAnalyze(const _zbm_Image* pImage, uint32_t width, uint32_t height, int32_t faceRectCount,
                             const _VondFaceRect* pFaceRectArray, Oriel_DetectDictionaryMode dicMode,
                             float faceEngineParam, uint32_t faceRcSize, _FaceMeta& faceMeta,
                             Oriel_ClusterSubject& subject, _VondOrielMetaArray& metaArray);
/* Bytes of the face section (8 + 8 per face + a version-259 OFM container),
 * exactly what VondOrielSerialize writes; 0 when the meta cannot be written
 * (faceNum != regionCount, an unrepresentable region, a size beyond 32 bits). */
uint32_t VondOrielGetSerializedSize(const _FaceMeta& faceMeta);
/* Writes subject, the score pairs and the OFM container ("MM", big-endian)
 * into pBuf; written = bytes written (0 on failure). Nothing changes owner.
 * Status 2 "Buffer size is not correctly allocated." for a buffer too small
 * for the prefix and scores (or <= 3 bytes); 1 NULL pBuf or NULL scores with
 * a count; 3 a score count other than regionCount, or the container failed
 * ("OFM_SerializeOfm() failed"). */
_VondResult VondOrielSerialize(const _FaceMeta& faceMeta, Oriel_ClusterSubject subject,
                               const _VondOrielMetaArray& metaArray, uint8_t* pBuf, uint32_t bufSize,
                               uint32_t& written);
/* Reads a face section of at most bufSize bytes (the rest of the blob may
 * follow). The outputs must be zeroed or hold an earlier result: they are
 * released first. On success the caller owns the regions and scores
 * (VondOrielDisposeMeta) and consumed = the section's bytes; on failure the
 * outputs are empty and consumed is 0. Status 1 NULL pBuf; 2 "VOND_NEW
 * failed"; 3 malformed ("Read buffer size is too small.", "OFM_GetOfmHeader()
 * failed", "metaArray.count != faceNum", "OFM_GetOfmSize() failed",
 * "OFM_ParseOfmData() failed"). */
_VondResult VondOrielParse(const uint8_t* pBuf, uint32_t bufSize, _FaceMeta& faceMeta, Oriel_ClusterSubject& subject,
                           _VondOrielMetaArray& metaArray, uint32_t& consumed);
/* Prints the face section to standard output. */
void VondOrielDump(const _FaceMeta& faceMeta, Oriel_ClusterSubject subject, const _VondOrielMetaArray& metaArray);
/* Frees the regions with their lists and the score array; leaves both empty. */
void VondOrielDisposeMeta(_FaceMeta& faceMeta, _VondOrielMetaArray& metaArray);

/* ------------------------------------------------------------------ quality section */

_VondResult VondKtLibAnalyze(const _zbm_Image* pImage, _KtEngineVersion& simlEngine, _KtMetaVersion& simlMeta,
                             _KtMetaSimilarity& similarity, _KtEngineVersion& repmEngine, _KtMetaVersion& repmMeta,
                             _KtMetaRepresentative& representative, _KtEngineVersion& clblEngine,
                             _KtMetaVersion& clblMeta, _KtMetaColorLabel& colorLabel);
/* Bytes of the three Kt frames, 0 on failure. */
uint32_t VondKtLibGetSerializedSize(const _KtMetaSimilarity& similarity, const _KtMetaRepresentative& representative,
                                    const _KtMetaColorLabel& colorLabel);
/* Writes the similarity, representative and colour label frames back to back
 * into pBuf; written = their total size (0 on failure). 1 bufSize below the
 * total, 3 a size or a frame cannot be written. */
_VondResult VondKtLibSerialize(const _KtEngineVersion& simlEngine, const _KtMetaVersion& simlMeta,
                               const _KtMetaSimilarity& similarity, const _KtEngineVersion& repmEngine,
                               const _KtMetaVersion& repmMeta, const _KtMetaRepresentative& representative,
                               const _KtEngineVersion& clblEngine, const _KtMetaVersion& clblMeta,
                               const _KtMetaColorLabel& colorLabel, uint8_t* pBuf, uint32_t bufSize,
                               uint32_t& written);
/* Reads the three frames from pBuf (bufSize: bytes to the end of the buffer)
 * into the records, which receive copies of their own; consumed = bytes of
 * the three frames. 2 out of memory, 3 a frame is refused (the message names
 * it); on failure the representative's arrays are released. */
_VondResult VondKtLibParse(const uint8_t* pBuf, uint32_t bufSize, _KtEngineVersion& simlEngine,
                           _KtMetaVersion& simlMeta, _KtMetaSimilarity& similarity, _KtEngineVersion& repmEngine,
                           _KtMetaVersion& repmMeta, _KtMetaRepresentative& representative,
                           _KtEngineVersion& clblEngine, _KtMetaVersion& clblMeta, _KtMetaColorLabel& colorLabel,
                           uint32_t& consumed);
/* Prints the three metas to standard output. */
void VondKtLibDump(const _KtMetaSimilarity& similarity, const _KtMetaRepresentative& representative,
                   const _KtMetaColorLabel& colorLabel);
/* Frees the representative's arrays and clears their pointers and counts. */
void VondKtlibDisposeMeta(_KtMetaSimilarity& similarity, _KtMetaRepresentative& representative,
                          _KtMetaColorLabel& colorLabel);

/* ------------------------------------------------------------------ attention section */

_VondResult VondCALibAnalyze(const _zbm_Image* pImage, const _FaceMeta& faceMeta, _CAAttentionAreaArray& areas,
                             _CALibVersion& version);
/* 22 + 17 per area. */
uint32_t VondCALibGetSerializedSize(const _CAAttentionAreaArray& areas);
_VondResult VondCALibSerialize(const _CAAttentionAreaArray& areas, const _CALibVersion& version, uint16_t width,
                               uint16_t height, uint8_t* pBuf, uint32_t bufSize, uint32_t& written);
_VondResult VondCALibParse(const uint8_t* pBuf, uint32_t bufSize, _CAAttentionAreaArray& areas,
                           _CALibVersion& version, uint16_t& width, uint16_t& height, uint32_t& consumed);
void VondCALibDump(const _CAAttentionAreaArray& areas);
void VondCALibDisposeMeta(_CAAttentionAreaArray& areas);

#endif /* LUMICOR_VOND_H */
