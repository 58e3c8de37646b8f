// OFM writer. An optional field is stored for every face as soon as one face
// of the photo has a value for it, and the variable lists are padded to the
// photo-wide maximum, so all entries share one size and can be found by index.
#include "lumicor/src/ofm/ofm_layout.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstring>

namespace {

using namespace ofm;

constexpr uint32_t kMissingWord = 0xFFFFFFFFu;  // a position (-1, -1)
constexpr uint32_t kNegativeZero = 0x80000000u;

uint32_t FloatBits(float value) {
    uint32_t bits;
    std::memcpy(&bits, &value, sizeof bits);
    return bits;
}

// Two values share one word; each must fit its 16 bits or it would spill
// into the other.
bool PackPair(int32_t high, int32_t low, uint32_t* word) {
    if (high < 0 || high > 0xFFFF || low < 0 || low > 0xFFFF) return false;
    *word = (static_cast<uint32_t>(high) << 16) | static_cast<uint32_t>(low);
    return true;
}

bool PackPosition(const zbm_Pos& pos, uint32_t* word) {
    if (pos.x == -1 && pos.y == -1) {
        *word = kMissingWord;
        return true;
    }
    return PackPair(pos.x, pos.y, word);
}

uint8_t StateByteAB(const _FaceRegionState& state) {
    uint8_t b = state.flag ? 0x80 : 0;
    switch (state.value) {
        case 0: break;
        case 1: b |= 0x20; break;
        case 2: b |= 0x40; break;
        default: b |= 0x60; break;
    }
    return b;
}

uint8_t StateByteC(const _FaceRegionState& state) {
    uint8_t b = state.flag ? 0x80 : 0;
    switch (state.value) {
        case 0: break;
        case 1: b |= 0x10; break;
        case 2: b |= 0x20; break;
        case 3: b |= 0x40; break;
        default: b |= 0x70; break;
    }
    return b;
}

// The reader cannot tell -0.0 or INT32_MIN from "no value" in older
// containers, so both are stored as 0.
uint32_t WithoutSignOnlyValue(uint32_t bits) { return bits == kNegativeZero ? 0 : bits; }

uint32_t WriteFixedPart(lmk::ByteWriter& w, const _FaceRegion& r, const uint8_t* fixedBits) {
    for (int f = 0; f < kFixedFieldCount; ++f) {
        const FixedField field = static_cast<FixedField>(f);
        if (!Has(fixedBits, field)) continue;
        switch (field) {
            case kFaceArea: {
                const zbm_Rect area = r.faceArea;
                uint32_t position, size;
                if (!PackPair(area.x, area.y, &position) || !PackPair(area.width, area.height, &size)) {
                    return OFM_ERR_INVALID;
                }
                w.U32(position);
                w.U32(size);
                break;
            }
            case kAuxWord: w.U32(r.auxWord); break;
            case kFlags:
                w.U8(static_cast<uint8_t>((r.flagA ? 0x80 : 0) | (r.flagB ? 0x40 : 0)));
                w.Zeros(3);
                break;
            case kAuxFlag: w.U8(r.auxFlag); break;
            case kEyes: {
                const zbm_Pos rightPos = r.rightEye;
                const zbm_Pos leftPos = r.leftEye;
                uint32_t right, left;
                if (!PackPosition(rightPos, &right) || !PackPosition(leftPos, &left)) return OFM_ERR_INVALID;
                w.U32(right);
                w.U32(left);
                break;
            }
            case kMouth: {
                // Half a mouth is stored as no mouth.
                const zbm_Pos rightPos = r.rightMouthEnd;
                const zbm_Pos leftPos = r.leftMouthEnd;
                uint32_t right = kMissingWord, left = kMissingWord;
                const bool rightOk = PackPosition(rightPos, &right);
                const bool leftOk = PackPosition(leftPos, &left);
                if ((rightOk && right == kMissingWord) || (leftOk && left == kMissingWord)) {
                    right = left = kMissingWord;
                } else if (!rightOk || !leftOk) {
                    return OFM_ERR_INVALID;
                }
                w.U32(right);
                w.U32(left);
                break;
            }
            case kStates: {
                const _FaceRegionState a = r.stateA, b = r.stateB, c = r.stateC;
                w.U8(StateByteAB(a));
                w.U8(StateByteAB(b));
                w.U8(StateByteC(c));
                break;
            }
            case kCode: w.U8(static_cast<uint8_t>((r.codeFlag ? 0x80 : 0) | (r.code & 15))); break;
            case kAuxBox:
                for (int i = 0; i < 4; ++i) w.U32(WithoutSignOnlyValue(static_cast<uint32_t>(r.auxBox[i])));
                break;
            case kOrientation: w.U8(r.orientation); break;
            case kRotation:
                for (int i = 0; i < 3; ++i) w.U32(WithoutSignOnlyValue(FloatBits(r.rotation[i])));
                break;
            case kAge:
                w.U8(r.ageMax);
                w.U8(r.ageMin);
                break;
            case kFeatureType:
                for (int i = 0; i < 16; ++i) w.U8(static_cast<uint8_t>(r.featureType[i]));
                break;
            case kFixedFieldCount: break;
        }
    }
    return w.ok() ? OFM_OK : OFM_ERR_INVALID;
}

uint32_t WriteVariablePart(lmk::ByteWriter& w, const _FaceRegion& r, const uint8_t* varBits, uint16_t maxAttributes,
                           uint16_t maxParts, uint16_t maxFeature) {
    if (!varBits) return OFM_OK;
    if (varBits[0] & kVarAttributes) {
        const uint32_t n = r.attributeCount;
        const uint8_t* items = r.pAttributes;
        if (n != 0 && !items) return OFM_ERR_NULL;
        if (n > maxAttributes) return OFM_ERR_INVALID;
        w.U16(static_cast<uint16_t>((n + 1) * kAttributeItemSize));
        w.Bytes(items, n * kAttributeItemSize);
    }
    if (varBits[0] & kVarParts) {
        const uint32_t n = r.partCount;
        const uint8_t* items = r.pParts;
        if (n != 0 && !items) return OFM_ERR_NULL;
        if (n > maxParts) return OFM_ERR_INVALID;
        w.U16(static_cast<uint16_t>(n * kPartItemSize + kShortLengthField));
        for (uint32_t i = 0; i < n; ++i) {
            // Items hold x and y as native 32-bit values.
            const uint8_t* item = items + i * kPartItemSize;
            uint32_t x, y;
            std::memcpy(&x, item + 1, 4);
            std::memcpy(&y, item + 5, 4);
            w.U8(item[0]);
            w.U32(x);
            w.U32(y);
        }
    }
    if (varBits[0] & kVarFeature) {
        const uint8_t* feature = r.pFeature;
        const uint32_t size = feature ? r.featureSize : 0;
        if (size > maxFeature) return OFM_ERR_INVALID;
        w.U32(size + kLongLengthField);
        w.Bytes(feature, size);
    }
    return w.ok() ? OFM_OK : OFM_ERR_INVALID;
}

uint32_t VariablePartSize(const uint8_t* varBits, uint16_t maxAttributes, uint16_t maxParts, uint16_t maxFeature) {
    if (!varBits) return 0;
    uint32_t size = 0;
    if (varBits[0] & kVarAttributes) size += (maxAttributes + 1u) * kAttributeItemSize;
    if (varBits[0] & kVarParts) size += maxParts * kPartItemSize + kShortLengthField;
    if (varBits[0] & kVarFeature) size += maxFeature + kLongLengthField;
    return size;
}

bool AnyBits(const int32_t* values, int n, int32_t unset) {
    for (int i = 0; i < n; ++i) {
        if (values[i] != unset) return true;
    }
    return false;
}

}  // namespace

uint32_t OFM_GetOfmBlockInfo(const _FaceRegion* regions, uint32_t count, uint32_t version, uint8_t* fixedBits,
                             uint32_t fixedLen, uint8_t* varBits, uint32_t varLen, uint16_t* maxAttributes,
                             uint16_t* maxParts, uint16_t* maxFeature) {
    if (!fixedBits || !varBits || !maxAttributes || !maxParts || !maxFeature || (!regions && count != 0)) {
        return OFM_ERR_NULL;
    }
    if (count == 0) return OFM_NO_FACE;
    if (fixedLen < 2 || varLen == 0 || version < kFirstVersion) return OFM_ERR_INVALID;

    std::memset(fixedBits, 0, fixedLen);
    std::memset(varBits, 0, varLen);
    Set(fixedBits, kFaceArea);
    if (version >= 258) Set(fixedBits, kOrientation);

    bool anyAttributes = false, anyParts = false, anyFeature = false;
    uint32_t largestAttributes = 0, largestParts = 0, largestFeature = 0;
    for (uint32_t i = 0; i < count; ++i) {
        const _FaceRegion& r = regions[i];
        if (r.auxWord != 0) Set(fixedBits, kAuxWord);
        if (r.flagsValid != 0) Set(fixedBits, kFlags);
        if (r.auxFlag != 0) Set(fixedBits, kAuxFlag);
        if (version >= 257) {
            const zbm_Pos re = r.rightEye, le = r.leftEye, rm = r.rightMouthEnd, lm = r.leftMouthEnd;
            const int32_t eyes[4] = {re.x, re.y, le.x, le.y};
            const int32_t mouth[4] = {rm.x, rm.y, lm.x, lm.y};
            if (AnyBits(eyes, 4, -1)) Set(fixedBits, kEyes);
            if (AnyBits(mouth, 4, -1)) Set(fixedBits, kMouth);
            if (r.statesValid != 0) Set(fixedBits, kStates);
            if (r.codeValid != 0) Set(fixedBits, kCode);
        }
        if (version >= 258) {
            const int32_t box[4] = {r.auxBox[0], r.auxBox[1], r.auxBox[2], r.auxBox[3]};
            if (AnyBits(box, 4, -1)) Set(fixedBits, kAuxBox);
            for (int k = 0; k < 3; ++k) {
                if (FloatBits(r.rotation[k]) != 0xFFFFFFFFu) Set(fixedBits, kRotation);
            }
            if (r.ageMin < 255 || r.ageMax < 255) Set(fixedBits, kAge);
            anyAttributes = anyAttributes || r.attributeCount != 0;
            anyParts = anyParts || r.partCount != 0;
        }
        if (version >= 259) {
            for (int k = 0; k < 16; ++k) {
                if (r.featureType[k] != 0) Set(fixedBits, kFeatureType);
            }
        }
        const uint32_t featureSize = r.pFeature ? r.featureSize : 0;
        anyFeature = anyFeature || featureSize != 0;
        if (r.attributeCount > largestAttributes) largestAttributes = r.attributeCount;
        if (r.partCount > largestParts) largestParts = r.partCount;
        if (featureSize > largestFeature) largestFeature = featureSize;
    }
    if (anyAttributes) varBits[0] |= kVarAttributes;
    if (anyParts) varBits[0] |= kVarParts;
    // A feature is only meaningful with its type, so the block needs that field.
    if (version >= 259 && Has(fixedBits, kFeatureType) && anyFeature) varBits[0] |= kVarFeature;

    if (!(varBits[0] & kVarAttributes)) largestAttributes = 0;
    if (!(varBits[0] & kVarParts)) largestParts = 0;
    if (!(varBits[0] & kVarFeature)) largestFeature = 0;
    if (largestAttributes > 0xFFFF || largestParts > 0xFFFF || largestFeature > 0xFFFF) return OFM_ERR_INVALID;
    *maxAttributes = static_cast<uint16_t>(largestAttributes);
    *maxParts = static_cast<uint16_t>(largestParts);
    *maxFeature = static_cast<uint16_t>(largestFeature);
    return OFM_OK;
}

uint32_t OFM_GetOfmBlockSize(const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t varLen,
                             uint16_t maxAttributes, uint16_t maxParts, uint16_t maxFeature, uint16_t* fixedSize,
                             uint16_t* varSize) {
    if (!fixedBits || !fixedSize || !varSize) return OFM_ERR_NULL;
    if (fixedLen < 2 || (varBits && varLen == 0)) return OFM_ERR_INVALID;
    uint32_t f = 0;
    if (FixedPartSize(fixedBits, fixedLen, &f) != OFM_OK) return OFM_ERR_INVALID;
    const uint32_t v = VariablePartSize(varBits, maxAttributes, maxParts, maxFeature);
    if (f + v > kMaxEntrySize) return OFM_ERR_INVALID;
    *fixedSize = static_cast<uint16_t>(f);
    *varSize = static_cast<uint16_t>(v);
    return OFM_OK;
}

uint32_t OFM_GetOfmBufferSize(const _FaceRegion* regions, uint32_t count, uint32_t version, uint32_t* pSize) {
    if (!pSize) return OFM_ERR_NULL;
    if (version < kFirstVersion) return OFM_ERR_INVALID;
    const uint32_t headerSize = version > 257 ? kHeaderSizeLong : kHeaderSizeShort;
    if (count == 0) {
        *pSize = headerSize;
        return OFM_OK;
    }
    uint8_t fixedBits[kBitmapBytes], varBits[kBitmapBytes];
    uint16_t maxAttributes, maxParts, maxFeature, fixedSize, varSize;
    uint32_t status = OFM_GetOfmBlockInfo(regions, count, version, fixedBits, kBitmapBytes, varBits, kBitmapBytes,
                                          &maxAttributes, &maxParts, &maxFeature);
    if (status != OFM_OK) return status;
    status = OFM_GetOfmBlockSize(fixedBits, kBitmapBytes, varBits, kBitmapBytes, maxAttributes, maxParts, maxFeature,
                                 &fixedSize, &varSize);
    if (status != OFM_OK) return status;
    uint32_t entries, total;
    if (!lmk::CheckedMul(count, static_cast<uint32_t>(fixedSize) + varSize, &entries) ||
        !lmk::CheckedAdd(headerSize, entries, &total)) {
        return OFM_ERR_INVALID;
    }
    *pSize = total;
    return OFM_OK;
}

uint32_t OFM_SerializeOfmData(uint16_t byteOrder, uint8_t* pBuf, uint32_t bufSize, const _FaceRegion* regions,
                              uint32_t count, const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits,
                              uint32_t varLen, uint16_t maxAttributes, uint16_t maxParts, uint16_t maxFeature) {
    if (!pBuf || !regions || !fixedBits) return OFM_ERR_NULL;
    if (fixedLen < 2 || (varBits && varLen == 0)) return OFM_ERR_INVALID;
    uint16_t fixedSize, varSize;
    const uint32_t status = OFM_GetOfmBlockSize(fixedBits, fixedLen, varBits, varLen, maxAttributes, maxParts,
                                                maxFeature, &fixedSize, &varSize);
    if (status != OFM_OK) return status;
    const uint32_t entrySize = static_cast<uint32_t>(fixedSize) + varSize;
    uint32_t total;
    if (!lmk::CheckedMul(count, entrySize, &total) || total > bufSize) return OFM_ERR_INVALID;
    // The reader refuses empty entries, so never write them.
    if (count != 0 && entrySize == 0) return OFM_ERR_INVALID;

    const _zbm_WriteEndianType endian = EndianOf(byteOrder);
    for (uint32_t i = 0; i < count; ++i) {
        lmk::ByteWriter w(pBuf + i * entrySize, entrySize, endian);
        uint32_t st = WriteFixedPart(w, regions[i], fixedBits);
        if (st == OFM_OK) st = WriteVariablePart(w, regions[i], varBits, maxAttributes, maxParts, maxFeature);
        if (st != OFM_OK) return st;
        w.Zeros(w.remaining());
    }
    return OFM_OK;
}

uint32_t OFM_SerializeOfm(uint16_t byteOrder, uint8_t* pBuf, uint32_t bufSize, const _FaceMeta* faceMeta,
                          uint32_t* written) {
    if (!pBuf || !faceMeta || !written) return OFM_ERR_NULL;
    *written = 0;
    const uint16_t faceNum = faceMeta->faceNum;
    const uint32_t count = faceMeta->regionCount;
    const _FaceRegion* regions = faceMeta->pRegions;
    if (faceNum != count) return OFM_ERR_INVALID;

    // Every container this library writes is version 259, whatever version
    // the meta was read from: 259 holds every field of the older versions.
    const uint32_t version = OFM_FORMAT_VERSION_CURRENT;
    const uint16_t headerSize = kHeaderSizeLong;
    uint8_t fixedBits[kBitmapBytes] = {};
    uint8_t varBits[kBitmapBytes] = {};
    uint16_t maxAttributes = 0, maxParts = 0, maxFeature = 0, fixedSize = 0, varSize = 0;
    if (count != 0) {
        uint32_t status = OFM_GetOfmBlockInfo(regions, count, version, fixedBits, kBitmapBytes, varBits, kBitmapBytes,
                                              &maxAttributes, &maxParts, &maxFeature);
        if (status != OFM_OK) return status;
        status = OFM_GetOfmBlockSize(fixedBits, kBitmapBytes, varBits, kBitmapBytes, maxAttributes, maxParts,
                                     maxFeature, &fixedSize, &varSize);
        if (status != OFM_OK) return status;
    }
    const uint16_t entrySize = static_cast<uint16_t>(fixedSize + varSize);

    lmk::ByteWriter w(pBuf, bufSize, EndianOf(byteOrder));
    w.U16(byteOrder);
    w.U16(headerSize);
    w.U16(static_cast<uint16_t>(version));
    for (int i = 0; i < 20; ++i) w.U8(static_cast<uint8_t>(faceMeta->dateTime[i]));
    w.U32((static_cast<uint32_t>(faceMeta->imageWidth) << 16) | faceMeta->imageHeight);
    w.U16(0);
    w.Bytes(fixedBits, kBitmapBytes);
    w.U16(faceNum);
    w.U16(entrySize);
    for (int i = 0; i < 16; ++i) w.U8(static_cast<uint8_t>(faceMeta->engineVersion[i]));
    w.U32(0);
    w.F32(faceMeta->headerValue);
    w.Bytes(varBits, kBitmapBytes);
    w.U16(fixedSize);
    if (!w.ok()) return OFM_ERR_INVALID;

    if (count != 0) {
        const uint32_t status =
            OFM_SerializeOfmData(byteOrder, pBuf + headerSize, bufSize - headerSize, regions, count, fixedBits,
                                 kBitmapBytes, varBits, kBitmapBytes, maxAttributes, maxParts, maxFeature);
        if (status != OFM_OK) return status;
    }
    *written = headerSize + count * entrySize;  // fits: the data writer checked count x E <= bufSize
    return OFM_OK;
}
