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

/* ------------------------------------------------------------------ records */

/* Sets every default of *region (box 0, auxBox -1, rotation all bits set,
 * eyes and mouth ends (-1, -1), states {0,3} {0,3} {0,4}, age 255/255, the
 * rest 0), stores the capacities as attributeCount, partCount and
 * featureSize and allocates zero-filled buffers of 2 x attributeCapacity,
 * 9 x partCapacity and featureCapacity bytes (array new; none for 0).
 * Whatever *region held before is overwritten, not freed.
 * Returns 0, also for a NULL region; 1 when an allocation failed or a
 * buffer size does not fit 32 bits (nothing stays allocated, the counts
 * are 0 and the pointers NULL). */
uint32_t CreateFaceRegion(uint32_t attributeCapacity, uint32_t partCapacity, uint32_t featureCapacity,
                          _FaceRegion* region);

/* Frees pParts, pAttributes and pFeature of each of the regionCount regions,
 * then the region array itself (array new), and sets pRegions to NULL and
 * regionCount to 0. Takes the whole face meta rather than its packed count
 * member, whose address must not be taken. Does nothing for NULL or when
 * pRegions is NULL. */
void ReleaseFaceRegionArray(_FaceMeta* faceMeta);

/* ------------------------------------------------------------------ sizes */

/* Header bytes of a format version: 94 for 258 and 259, 72 for 256 and 257.
 * Returns 0; 2 for NULL pSize; 3 for any other version. */
uint32_t OFM_GetOfmHeaderSize(uint32_t version, uint16_t* pSize);

/* Scans count regions and sets the fixed and variable presence bitmaps
 * (fixedLen and varLen bytes, zeroed first) and the largest attribute count,
 * part count and feature size of the variable blocks present (0 for absent
 * blocks), as the writer of `version` decides them.
 * Returns 0; 2 NULL bitmap or output, or NULL regions with count != 0;
 * 16 count 0 (bitmaps untouched; callers treat it as empty bitmaps);
 * 1 fixedLen < 2, varLen 0, version < 256, or a largest list that does not
 * fit 16 bits. */
uint32_t OFM_GetOfmBlockInfo(const _FaceRegion* regions, uint32_t count, uint32_t version, uint8_t* fixedBits,
                             uint32_t fixedLen, uint8_t* varBits, uint32_t varLen, uint16_t* maxAttributes,
                             uint16_t* maxParts, uint16_t* maxFeature);

/* Fixed-part size F of the fixed bitmap and variable-part size of the
 * blocks present in varBits (may be NULL: no blocks) with the given largest
 * lists. Returns 0; 2 NULL fixedBits or output; 1 fixedLen < 2, varBits
 * given with varLen 0, an unknown fixed bit, or an entry (F + variable part)
 * larger than 65535 bytes. */
uint32_t OFM_GetOfmBlockSize(const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen,
                             uint16_t maxAttributes, uint16_t maxParts, uint16_t maxFeature, uint16_t* fixedSize,
                             uint16_t* varSize);

/* Bytes of the container for count regions at `version`: header size
 * (94 above 257, else 72) + count x entry size. Returns 0; 2 NULL pSize or
 * NULL regions with count != 0; 1 version < 256, an unrepresentable entry
 * or a size beyond 32 bits. OFM_SerializeOfm always writes version 259:
 * pass 259 to size its buffer. */
uint32_t OFM_GetOfmBufferSize(const _FaceRegion* regions, uint32_t count, uint32_t version, uint32_t* pSize);

/* ------------------------------------------------------------------ writer */

/* Writes *faceMeta as a format-259 container into pBuf (bufSize bytes,
 * at least OFM_GetOfmBufferSize(..., 259, ...)); byteOrder 0x4D4D ("MM")
 * writes big-endian, any other mark little-endian, and the mark itself is
 * written first. *written = bytes written (0 on failure). The caller keeps
 * ownership of everything. Returns 0; 2 NULL pBuf, faceMeta or written, or
 * a region claiming a list without its buffer; 1 faceNum != regionCount,
 * buffer too small, a box, eye or mouth coordinate outside 0..65535 (a
 * position (-1, -1) means missing) or an entry larger than 65535 bytes. */
uint32_t OFM_SerializeOfm(uint16_t byteOrder, uint8_t* pBuf, uint32_t bufSize, const _FaceMeta* faceMeta,
                          uint32_t* written);

/* Writes count entries (fixed fields of the set bits, variable blocks,
 * zero padding up to the largest lists) into pBuf. Returns 0; 2 NULL pBuf,
 * regions or fixedBits, or a list without its buffer; 1 fixedLen < 2,
 * varBits given with varLen 0, bufSize < count x entry size, a list longer
 * than its maximum, or an unrepresentable coordinate (see OFM_SerializeOfm). */
uint32_t OFM_SerializeOfmData(uint16_t byteOrder, uint8_t* pBuf, uint32_t bufSize, const _FaceRegion* regions,
                              uint32_t count, const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits,
                              uint32_t varLen, uint16_t maxAttributes, uint16_t maxParts, uint16_t maxFeature);

/* ------------------------------------------------------------------ reader (untrusted bytes) */

/* Reads and checks the container header at pBuf (bufSize bytes available)
 * into *header. The endianness comes from byteOrder (0x4D4D big, else
 * little); the stored mark is kept in header->byteOrder but not compared.
 * Versions 256 and 257 keep only the bitmap bits they define, and since they
 * store no F, header->fixedSize is derived from their bitmap.
 * Returns 0; 2 NULL argument; 1 when bufSize is below the header size, the
 * version is not 256..259, the header-size field does not match the version,
 * or (with faces) the fixed bitmap has an unknown bit, the stored F differs
 * from the bitmap's, or E is too small for F and the length fields of the
 * variable blocks. On failure the record holds what was read so far (the
 * mark, header size and version are always read first). */
uint32_t OFM_GetOfmHeader(uint16_t byteOrder, const uint8_t* pBuf, uint32_t bufSize, OfmHeader* header);

/* Largest attribute count, part count and feature size found in the
 * variable blocks of count entries of entrySize bytes, used to prepare the
 * regions (CreateFaceRegion) before OFM_ParseOfm. Each entry's blocks must
 * lie inside that entry. Returns 0 (also for count 0, or for NULL bitmaps
 * with zero maxima); 2 NULL output, or NULL entries with count != 0;
 * 1 fixedLen < 2, varLen 0, fixedSize differing from the bitmap's F, an
 * entry size too small, count x entrySize > entriesLen, or a bad block. */
uint32_t OFM_GetOfmSize(uint16_t byteOrder, uint16_t entrySize, uint16_t fixedSize, uint32_t count,
                        const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen,
                        const uint8_t* entries, uint32_t entriesLen, uint16_t* maxAttributes, uint16_t* maxParts,
                        uint16_t* maxFeature);

/* Reads the block lengths of one entry's variable part (p, len bytes) for
 * the blocks set in varBits: items = (L - 2) / 2 attributes, (L - 2) / 9
 * part points, L - 4 feature bytes; a length field of 0 counts as an empty
 * block. Returns 0; 2 NULL argument; 1 varLen 0, an endian type other than
 * little or big, a length field beyond len, a length smaller than its own
 * field (but not 0), a block longer than the bytes left, or a feature
 * larger than 65535 bytes. */
uint32_t ofm_getBblockVariableSize(_zbm_WriteEndianType endian, const uint8_t* p, uint32_t len,
                                   const uint8_t* varBits, uint32_t varLen, uint16_t* nAttributes,
                                   uint16_t* nParts, uint16_t* featureBytes);

/* Copies the header fields into *faceMeta and, when the header has faces,
 * parses them into faceMeta->pRegions, which the caller prepared: regionCount
 * must equal the header's faceNum and each region must come from
 * CreateFaceRegion with capacities from OFM_GetOfmSize. Entries are read in
 * the byte order of the header's stored mark. Returns 0; 2 NULL argument or
 * NULL regions; 1 regionCount != faceNum or malformed entries; 4 a list
 * longer than a region's prepared capacity. */
uint32_t OFM_ParseOfm(const OfmHeader* header, const uint8_t* entries, uint32_t entriesLen, _FaceMeta* faceMeta);

/* Parses count entries of entrySize bytes into the prepared regions. A field
 * whose bit is clear gets its default (faceArea zero). Each list is read into
 * the region's prepared buffer; afterwards attributeCount, partCount and
 * featureSize hold the numbers actually read and the rest of each buffer is
 * zero. Returns 0 (also for count 0); 2 NULL entries, regions or fixedBits,
 * or a prepared count without its buffer; 1 fixedLen < 2, varBits given with
 * varLen 0, an unknown fixed bit, an entry size too small for its fields,
 * count x entrySize > entriesLen, or a bad block length; 4 a list longer than
 * the region's prepared capacity. */
uint32_t OFM_ParseOfmData(uint16_t byteOrder, uint16_t entrySize, uint32_t count, const uint8_t* fixedBits,
                          uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen, const uint8_t* entries,
                          uint32_t entriesLen, _FaceRegion* regions);

/* Fixed-part size from the bitmap and the variable block lengths of one
 * entry (entry, entryLen bytes). Returns 0 (outputs zero when fixedBits is
 * NULL; no blocks read when varBits is NULL); 2 NULL entry or output;
 * 1 fixedLen < 2, varBits given with varLen 0, an unknown fixed bit, F larger
 * than the entry, or a bad block (see ofm_getBblockVariableSize). */
uint32_t OFM_GetOfmDataSize(uint16_t byteOrder, const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits,
                            uint32_t varLen, const uint8_t* entry, uint32_t entryLen, uint16_t* nAttributes,
                            uint16_t* nParts, uint16_t* featureBytes);

/* Size in bytes of one fixed field: kind must be 1, byteIndex 0 or 1, bit a
 * single bit value of the fixed bitmap. 0 for anything unknown. */
uint32_t GetOfmEntrySize(uint32_t kind, uint32_t byteIndex, uint32_t bit);

#endif /* LUMICOR_OFM_H */
