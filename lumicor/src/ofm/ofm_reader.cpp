// OFM reader. Containers come from stored blobs and are untrusted: every
// size field is checked against the fields it has to cover and against the
// bytes actually present before anything is read or allocated from it, and
// each entry is read through a cursor limited to that entry.
#include "lumicor/src/ofm/ofm_layout.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstring>

namespace {

using namespace ofm;

zbm_Pos UnpackPosition(uint32_t word) {
    if (word == 0xFFFFFFFFu) return zbm_Pos{-1, -1};
    return zbm_Pos{static_cast<int32_t>(word >> 16), static_cast<int32_t>(word & 0xFFFF)};
}

_FaceRegionState StateAB(uint8_t b) {
    return _FaceRegionState{static_cast<uint8_t>(b >> 7), static_cast<uint32_t>((b >> 5) & 3)};
}

_FaceRegionState StateC(uint8_t b) {
    uint32_t value;
    switch ((b >> 4) & 7) {
        case 0: value = 0; break;
        case 1: value = 1; break;
        case 2: value = 2; break;
        case 4: value = 3; break;
        default: value = 4; break;
    }
    return _FaceRegionState{static_cast<uint8_t>(b >> 7), value};
}

void ReadFixedPart(lmk::ByteReader& r, _FaceRegion& region, const uint8_t* fixedBits) {
    SetFixedDefaults(region);
    for (int f = 0; f < kFixedFieldCount; ++f) {
        const FixedField field = static_cast<FixedField>(f);
        if (!Has(fixedBits, field)) continue;
        switch (field) {
            case kFaceArea: {
                const uint32_t position = r.U32();
                const uint32_t size = r.U32();
                region.faceArea = zbm_Rect{static_cast<int32_t>(position >> 16), static_cast<int32_t>(position & 0xFFFF),
                                           static_cast<int32_t>(size >> 16), static_cast<int32_t>(size & 0xFFFF)};
                break;
            }
            case kAuxWord: region.auxWord = r.U32(); break;
            case kFlags: {
                const uint8_t b = r.U8();
                r.Skip(3);
                region.flagsValid = 1;
                region.flagA = (b >> 7) & 1;
                region.flagB = (b >> 6) & 1;
                break;
            }
            case kAuxFlag: region.auxFlag = r.U8(); break;
            case kEyes:
                region.rightEye = UnpackPosition(r.U32());
                region.leftEye = UnpackPosition(r.U32());
                break;
            case kMouth:
                region.rightMouthEnd = UnpackPosition(r.U32());
                region.leftMouthEnd = UnpackPosition(r.U32());
                break;
            case kStates:
                region.statesValid = 1;
                region.stateA = StateAB(r.U8());
                region.stateB = StateAB(r.U8());
                region.stateC = StateC(r.U8());
                break;
            case kCode: {
                const uint8_t b = r.U8();
                region.codeValid = 1;
                region.codeFlag = b >> 7;
                region.code = (b & 15) < 12 ? (b & 15) : 0;
                break;
            }
            case kAuxBox:
                for (int i = 0; i < 4; ++i) region.auxBox[i] = r.I32();
                break;
            case kOrientation: region.orientation = r.U8(); break;
            case kRotation:
                for (int i = 0; i < 3; ++i) region.rotation[i] = r.F32();
                break;
            case kAge:
                region.ageMax = r.U8();
                region.ageMin = r.U8();
                break;
            case kFeatureType:
                for (int i = 0; i < 16; ++i) region.featureType[i] = static_cast<char>(r.U8());
                break;
            case kFixedFieldCount: break;
        }
    }
}

// Reads the length field of the block at the cursor. The length counts the
// field itself, so a non-zero length below the field size is refused; 0 is
// an empty block. The block must end within the bytes left.
uint32_t ReadBlockLength(lmk::ByteReader& r, uint32_t fieldSize, uint32_t* length) {
    const uint32_t left = r.remaining();
    const uint32_t l = fieldSize == kShortLengthField ? r.U16() : r.U32();
    if (!r.ok() || (l != 0 && l < fieldSize) || l > left) return OFM_ERR_INVALID;
    *length = l;
    return OFM_OK;
}

// Zeroes the prepared list items from `first` on.
uint32_t ClearItems(uint8_t* items, uint32_t capacity, uint32_t itemSize, uint32_t first) {
    uint32_t bytes;
    if (!lmk::CheckedMul(capacity - first, itemSize, &bytes)) return OFM_ERR_INVALID;
    if (bytes != 0) std::memset(items + first * itemSize, 0, bytes);
    return OFM_OK;
}

// Reads one list block into the region's prepared buffer and records how
// many items it held. Part points carry two 32-bit values that are stored
// in native order; attributes and feature bytes are copied as they are.
uint32_t ReadListBlock(lmk::ByteReader& r, bool present, uint32_t fieldSize, uint32_t itemSize, uint8_t* items,
                       uint32_t capacity, uint32_t* count) {
    if (capacity != 0 && !items) return OFM_ERR_NULL;
    uint32_t n = 0;
    if (present) {
        const uint32_t start = r.position();
        uint32_t length;
        const uint32_t status = ReadBlockLength(r, fieldSize, &length);
        if (status != OFM_OK) return status;
        n = length > fieldSize ? (length - fieldSize) / itemSize : 0;
        if (n > capacity) return OFM_ERR_CAPACITY;
        if (itemSize == kPartItemSize) {
            for (uint32_t i = 0; i < n; ++i) {
                uint8_t* item = items + i * kPartItemSize;
                item[0] = r.U8();
                const uint32_t x = r.U32();
                const uint32_t y = r.U32();
                std::memcpy(item + 1, &x, 4);
                std::memcpy(item + 5, &y, 4);
            }
        } else {
            r.Bytes(items, n * itemSize);
        }
        r.Seek(start + length);
        if (!r.ok()) return OFM_ERR_INVALID;
    }
    const uint32_t status = ClearItems(items, capacity, itemSize, n);
    if (status != OFM_OK) return status;
    *count = n;
    return OFM_OK;
}

uint32_t ReadVariablePart(lmk::ByteReader& r, _FaceRegion& region, const uint8_t* varBits) {
    const uint8_t bits = varBits ? varBits[0] : 0;
    uint32_t n = 0;
    uint32_t status = ReadListBlock(r, (bits & kVarAttributes) != 0, kShortLengthField, kAttributeItemSize,
                                    region.pAttributes, region.attributeCount, &n);
    if (status != OFM_OK) return status;
    region.attributeCount = n;
    status = ReadListBlock(r, (bits & kVarParts) != 0, kShortLengthField, kPartItemSize, region.pParts,
                           region.partCount, &n);
    if (status != OFM_OK) return status;
    region.partCount = n;
    status = ReadListBlock(r, (bits & kVarFeature) != 0, kLongLengthField, 1, region.pFeature, region.featureSize,
                           &n);
    if (status != OFM_OK) return status;
    region.featureSize = n;
    return OFM_OK;
}

}  // namespace

uint32_t OFM_GetOfmHeader(uint16_t byteOrder, const uint8_t* pBuf, uint32_t bufSize, OfmHeader* header) {
    if (!pBuf || !header) return OFM_ERR_NULL;
    // A 72-byte header with no faces is a complete container of versions 256 and 257.
    if (bufSize < kHeaderSizeShort) return OFM_ERR_INVALID;
    std::memset(static_cast<void*>(header), 0, sizeof *header);

    lmk::ByteReader r(pBuf, bufSize, EndianOf(byteOrder));
    header->byteOrder = r.U16();
    header->headerSize = r.U16();
    const uint16_t version = r.U16();
    header->formatVersion = version;
    uint16_t expectedSize = 0;
    if (OFM_GetOfmHeaderSize(version, &expectedSize) != OFM_OK) return OFM_ERR_INVALID;
    if (header->headerSize != expectedSize || bufSize < expectedSize) return OFM_ERR_INVALID;

    uint8_t dateTime[20], engineVersion[16];
    uint8_t fixedBits[kBitmapBytes], varBits[kBitmapBytes] = {};
    r.Bytes(dateTime, sizeof dateTime);
    const uint32_t imageSize = r.U32();
    r.Skip(2);
    r.Bytes(fixedBits, sizeof fixedBits);
    const uint16_t faceNum = r.U16();
    const uint16_t entrySize = r.U16();
    r.Bytes(engineVersion, sizeof engineVersion);
    r.Skip(4);
    uint16_t fixedSize = 0;
    if (version > 257) {
        header->headerValue = r.F32();
        r.Bytes(varBits, sizeof varBits);
        fixedSize = r.U16();
    }
    if (!r.ok()) return OFM_ERR_INVALID;

    // Bits a version did not define are ignored, not trusted.
    if (version <= 256) fixedBits[0] &= 0x02 | 0x08 | 0x10 | 0x20;
    if (version <= 257) {
        fixedBits[1] &= 0x01 | 0x02;
        std::memset(varBits, 0, sizeof varBits);
    }

    for (int i = 0; i < 20; ++i) header->dateTime[i] = static_cast<char>(dateTime[i]);
    for (int i = 0; i < 16; ++i) header->engineVersion[i] = static_cast<char>(engineVersion[i]);
    header->imageWidth = static_cast<uint16_t>(imageSize >> 16);
    header->imageHeight = static_cast<uint16_t>(imageSize & 0xFFFF);
    for (uint32_t i = 0; i < kBitmapBytes; ++i) {
        header->fixedBits[i] = fixedBits[i];
        header->varBits[i] = varBits[i];
    }
    header->faceNum = faceNum;
    header->entrySize = entrySize;

    if (faceNum != 0) {
        uint32_t bitmapFixedSize = 0;
        if (CheckEntrySize(fixedBits, kBitmapBytes, varBits, entrySize, &bitmapFixedSize) != OFM_OK) {
            return OFM_ERR_INVALID;
        }
        // Versions 256 and 257 store no F; later ones must agree with their bitmap.
        if (version > 257 && fixedSize != bitmapFixedSize) return OFM_ERR_INVALID;
        fixedSize = static_cast<uint16_t>(bitmapFixedSize);
    }
    header->fixedSize = fixedSize;
    return OFM_OK;
}

uint32_t ofm_getBblockVariableSize(_zbm_WriteEndianType endian, const uint8_t* p, uint32_t len,
                                   const uint8_t* varBits, uint32_t varLen, uint16_t* nAttributes,
                                   uint16_t* nParts, uint16_t* featureBytes) {
    if (!p || !varBits || !nAttributes || !nParts || !featureBytes) return OFM_ERR_NULL;
    *nAttributes = *nParts = *featureBytes = 0;
    if (varLen == 0 || (endian != ZBM_WRITE_ENDIAN_BIG && endian != ZBM_WRITE_ENDIAN_LITTLE)) return OFM_ERR_INVALID;

    lmk::ByteReader r(p, len, endian);
    struct Block {
        uint8_t bit;
        uint32_t fieldSize;
        uint32_t itemSize;
        uint16_t* out;
    };
    const Block blocks[] = {{kVarAttributes, kShortLengthField, kAttributeItemSize, nAttributes},
                            {kVarParts, kShortLengthField, kPartItemSize, nParts},
                            {kVarFeature, kLongLengthField, 1, featureBytes}};
    for (const Block& block : blocks) {
        if (!(varBits[0] & block.bit)) continue;
        const uint32_t start = r.position();
        uint32_t length;
        const uint32_t status = ReadBlockLength(r, block.fieldSize, &length);
        if (status != OFM_OK) return status;
        const uint32_t items = length > block.fieldSize ? (length - block.fieldSize) / block.itemSize : 0;
        if (items > 0xFFFF) return OFM_ERR_INVALID;
        *block.out = static_cast<uint16_t>(items);
        r.Seek(start + length);
    }
    return r.ok() ? OFM_OK : OFM_ERR_INVALID;
}

uint32_t OFM_GetOfmDataSize(uint16_t byteOrder, const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits,
                            uint32_t varLen, const uint8_t* entry, uint32_t entryLen, uint16_t* nAttributes,
                            uint16_t* nParts, uint16_t* featureBytes) {
    if (!entry || !nAttributes || !nParts || !featureBytes) return OFM_ERR_NULL;
    *nAttributes = *nParts = *featureBytes = 0;
    if (!fixedBits) return OFM_OK;
    if (fixedLen < 2 || (varBits && varLen == 0)) return OFM_ERR_INVALID;
    uint32_t fixedSize = 0;
    if (FixedPartSize(fixedBits, fixedLen, &fixedSize) != OFM_OK || fixedSize > entryLen) return OFM_ERR_INVALID;
    if (!varBits) return OFM_OK;
    return ofm_getBblockVariableSize(EndianOf(byteOrder), entry + fixedSize, entryLen - fixedSize, varBits, varLen,
                                     nAttributes, nParts, featureBytes);
}

uint32_t OFM_GetOfmSize(uint16_t byteOrder, uint16_t entrySize, uint16_t fixedSize, uint32_t count,
                        const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen,
                        const uint8_t* entries, uint32_t entriesLen, uint16_t* maxAttributes, uint16_t* maxParts,
                        uint16_t* maxFeature) {
    if (!maxAttributes || !maxParts || !maxFeature) return OFM_ERR_NULL;
    *maxAttributes = *maxParts = *maxFeature = 0;
    if (!fixedBits || !varBits) return OFM_OK;
    if (fixedLen <= 1 || varLen == 0) return OFM_ERR_INVALID;
    if (count == 0) return OFM_OK;
    if (!entries) return OFM_ERR_NULL;

    uint32_t bitmapFixedSize = 0;
    if (CheckEntrySize(fixedBits, fixedLen, varBits, entrySize, &bitmapFixedSize) != OFM_OK ||
        bitmapFixedSize != fixedSize) {
        return OFM_ERR_INVALID;
    }
    uint32_t total;
    if (!lmk::CheckedMul(count, entrySize, &total) || total > entriesLen) return OFM_ERR_INVALID;

    // Each entry's blocks must stay inside that entry: a block reaching into
    // the next entry would be read as both.
    for (uint32_t i = 0; i < count; ++i) {
        uint16_t attributes, parts, feature;
        const uint32_t status =
            ofm_getBblockVariableSize(EndianOf(byteOrder), entries + i * entrySize + fixedSize, entrySize - fixedSize,
                                      varBits, varLen, &attributes, &parts, &feature);
        if (status != OFM_OK) {
            *maxAttributes = *maxParts = *maxFeature = 0;
            return status;
        }
        if (attributes > *maxAttributes) *maxAttributes = attributes;
        if (parts > *maxParts) *maxParts = parts;
        if (feature > *maxFeature) *maxFeature = feature;
    }
    return OFM_OK;
}

uint32_t OFM_ParseOfmData(uint16_t byteOrder, uint16_t entrySize, uint32_t count, const uint8_t* fixedBits,
                          uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen, const uint8_t* entries,
                          uint32_t entriesLen, _FaceRegion* regions) {
    if (!entries || !regions || !fixedBits) return OFM_ERR_NULL;
    if (fixedLen < 2 || (varBits && varLen == 0)) return OFM_ERR_INVALID;
    if (count == 0) return OFM_OK;
    uint32_t fixedSize = 0, total = 0;
    if (CheckEntrySize(fixedBits, fixedLen, varBits, entrySize, &fixedSize) != OFM_OK) return OFM_ERR_INVALID;
    if (!lmk::CheckedMul(count, entrySize, &total) || total > entriesLen) return OFM_ERR_INVALID;

    const _zbm_WriteEndianType endian = EndianOf(byteOrder);
    for (uint32_t i = 0; i < count; ++i) {
        // The next entry starts entrySize bytes on, whatever this one's blocks used.
        lmk::ByteReader r(entries + i * entrySize, entrySize, endian);
        ReadFixedPart(r, regions[i], fixedBits);
        if (!r.ok()) return OFM_ERR_INVALID;
        const uint32_t status = ReadVariablePart(r, regions[i], varBits);
        if (status != OFM_OK) return status;
    }
    return OFM_OK;
}

uint32_t OFM_ParseOfm(const OfmHeader* header, const uint8_t* entries, uint32_t entriesLen, _FaceMeta* faceMeta) {
    if (!header || !entries || !faceMeta) return OFM_ERR_NULL;
    for (int i = 0; i < 16; ++i) faceMeta->engineVersion[i] = header->engineVersion[i];
    faceMeta->headerValue = header->headerValue;
    faceMeta->formatVersion = header->formatVersion;
    faceMeta->imageWidth = header->imageWidth;
    faceMeta->imageHeight = header->imageHeight;
    for (int i = 0; i < 20; ++i) faceMeta->dateTime[i] = header->dateTime[i];
    const uint16_t faceNum = header->faceNum;
    faceMeta->faceNum = faceNum;
    if (faceNum == 0) return OFM_OK;

    if (faceMeta->regionCount != faceNum) return OFM_ERR_INVALID;
    if (!faceMeta->pRegions) return OFM_ERR_NULL;
    uint8_t fixedBits[kBitmapBytes], varBits[kBitmapBytes];
    for (uint32_t i = 0; i < kBitmapBytes; ++i) {
        fixedBits[i] = header->fixedBits[i];
        varBits[i] = header->varBits[i];
    }
    return OFM_ParseOfmData(header->byteOrder, header->entrySize, faceNum, fixedBits, kBitmapBytes, varBits,
                            kBitmapBytes, entries, entriesLen, faceMeta->pRegions);
}
