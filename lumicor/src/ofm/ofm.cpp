// Face region records and the layout facts of the OFM container that its
// writer and reader share.
#include "lumicor/src/ofm/ofm_layout.h"

#include "common/src/internal/memory.h"

#include <cstring>

namespace ofm {

const FixedFieldInfo kFixedFields[kFixedFieldCount] = {
    {0, 0x02, 8},   // faceArea: (x << 16) | y, (width << 16) | height
    {0, 0x08, 4},   // auxWord
    {0, 0x10, 4},   // flag byte and three zero bytes
    {0, 0x20, 1},   // auxFlag
    {0, 0x40, 8},   // right eye word, left eye word
    {0, 0x80, 8},   // right mouth end word, left mouth end word
    {1, 0x01, 3},   // state bytes A, B, C
    {1, 0x02, 1},   // code byte
    {1, 0x04, 16},  // auxBox
    {1, 0x08, 1},   // orientation
    {1, 0x10, 12},  // rotation, in memory order
    {1, 0x20, 2},   // ageMax, ageMin
    {1, 0x40, 16},  // featureType
};

uint32_t FixedPartSize(const uint8_t* fixedBits, uint32_t fixedLen, uint32_t* size) {
    uint32_t total = 0;
    for (uint32_t byteIndex = 0; byteIndex < fixedLen; ++byteIndex) {
        for (uint32_t bit = 1; bit <= 0x80; bit <<= 1) {
            if ((fixedBits[byteIndex] & bit) == 0) continue;
            const uint32_t fieldSize = GetOfmEntrySize(1, byteIndex, bit);
            if (fieldSize == 0) return OFM_ERR_INVALID;
            total += fieldSize;
        }
    }
    *size = total;
    return OFM_OK;
}

uint32_t MinVariablePartSize(const uint8_t* varBits) {
    if (!varBits) return 0;
    uint32_t size = 0;
    if (varBits[0] & kVarAttributes) size += kShortLengthField;
    if (varBits[0] & kVarParts) size += kShortLengthField;
    if (varBits[0] & kVarFeature) size += kLongLengthField;
    return size;
}

uint32_t CheckEntrySize(const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t entrySize,
                        uint32_t* fixedSize) {
    uint32_t f = 0;
    if (FixedPartSize(fixedBits, fixedLen, &f) != OFM_OK) return OFM_ERR_INVALID;
    // An entry that claims less than its fixed part and the block length
    // fields would make the next entry's bytes part of this one.
    if (entrySize == 0 || entrySize < f + MinVariablePartSize(varBits)) return OFM_ERR_INVALID;
    *fixedSize = f;
    return OFM_OK;
}

float UnsetRotation() {
    const uint32_t bits = 0xFFFFFFFFu;
    float value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

void SetFixedDefaults(_FaceRegion& region) {
    region.faceArea = zbm_Rect{0, 0, 0, 0};
    for (int i = 0; i < 4; ++i) region.auxBox[i] = -1;
    const float unset = UnsetRotation();
    for (int i = 0; i < 3; ++i) region.rotation[i] = unset;
    region.auxWord = 0;
    region.auxFlag = 0;
    region.rightEye = zbm_Pos{-1, -1};
    region.leftEye = zbm_Pos{-1, -1};
    region.rightMouthEnd = zbm_Pos{-1, -1};
    region.leftMouthEnd = zbm_Pos{-1, -1};
    region.codeValid = 0;
    region.codeFlag = 0;
    region.code = 0;
    for (int i = 0; i < 3; ++i) region.codeReserved[i] = 0;
    region.orientation = 0;
    region.flagsValid = 0;
    region.flagA = 0;
    region.flagB = 0;
    region.statesValid = 0;
    region.stateA = _FaceRegionState{0, 3};
    region.stateB = _FaceRegionState{0, 3};
    region.stateC = _FaceRegionState{0, 4};
    region.ageMin = 255;
    region.ageMax = 255;
    for (int i = 0; i < 16; ++i) region.featureType[i] = 0;
}

}  // namespace ofm

uint32_t GetOfmEntrySize(uint32_t kind, uint32_t byteIndex, uint32_t bit) {
    if (kind != 1) return 0;
    for (const ofm::FixedFieldInfo& field : ofm::kFixedFields) {
        if (field.byteIndex == byteIndex && field.bit == bit) return field.size;
    }
    return 0;
}

uint32_t OFM_GetOfmHeaderSize(uint32_t version, uint16_t* pSize) {
    if (!pSize) return OFM_ERR_NULL;
    if (version == 256 || version == 257) {
        *pSize = ofm::kHeaderSizeShort;
    } else if (version == 258 || version == 259) {
        *pSize = ofm::kHeaderSizeLong;
    } else {
        return OFM_ERR_VERSION;
    }
    return OFM_OK;
}

uint32_t CreateFaceRegion(uint32_t attributeCapacity, uint32_t partCapacity, uint32_t featureCapacity,
                          _FaceRegion* region) {
    if (!region) return OFM_OK;
    std::memset(static_cast<void*>(region), 0, sizeof *region);
    ofm::SetFixedDefaults(*region);

    uint32_t attributeBytes = 0;
    uint32_t partBytes = 0;
    if (!lmk::CheckedMul(attributeCapacity, ofm::kAttributeItemSize, &attributeBytes) ||
        !lmk::CheckedMul(partCapacity, ofm::kPartItemSize, &partBytes)) {
        return OFM_ERR_INVALID;
    }
    lmk::UniqueArray<uint8_t> attributes = lmk::NewArray<uint8_t>(attributeBytes);
    lmk::UniqueArray<uint8_t> parts = lmk::NewArray<uint8_t>(partBytes);
    lmk::UniqueArray<uint8_t> feature = lmk::NewArray<uint8_t>(featureCapacity);
    if ((attributeBytes && !attributes) || (partBytes && !parts) || (featureCapacity && !feature)) {
        return OFM_ERR_INVALID;
    }
    region->attributeCount = attributeCapacity;
    region->pAttributes = attributes.release();
    region->partCount = partCapacity;
    region->pParts = parts.release();
    region->featureSize = featureCapacity;
    region->pFeature = feature.release();
    return OFM_OK;
}

void ReleaseFaceRegionArray(_FaceMeta* faceMeta) {
    if (!faceMeta) return;
    _FaceRegion* regions = faceMeta->pRegions;
    if (!regions) return;
    const uint32_t count = faceMeta->regionCount;
    for (uint32_t i = 0; i < count; ++i) {
        delete[] regions[i].pParts;
        regions[i].pParts = nullptr;
        delete[] regions[i].pAttributes;
        regions[i].pAttributes = nullptr;
        delete[] regions[i].pFeature;
        regions[i].pFeature = nullptr;
    }
    delete[] regions;
    faceMeta->pRegions = nullptr;
    faceMeta->regionCount = 0;
}
