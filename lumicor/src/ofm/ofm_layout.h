// Layout of the OFM container shared by its writer and reader: the header
// sizes, the fixed fields in wire order with their bitmap bits, the variable
// blocks, and the defaults a region takes for a field that is not stored.
#ifndef LUMICOR_OFM_LAYOUT_H
#define LUMICOR_OFM_LAYOUT_H

#include <lumicor/ofm.h>

#include <cstdint>

namespace ofm {

constexpr uint16_t kHeaderSizeShort = 72;  // versions 256 and 257
constexpr uint16_t kHeaderSizeLong = 94;   // versions 258 and 259
constexpr uint32_t kFirstVersion = 256;
constexpr uint32_t kLastVersion = 259;
constexpr uint32_t kBitmapBytes = 16;
constexpr uint32_t kMaxEntrySize = 0xFFFF;  // E travels in 16 bits

// The fixed fields in the order they follow one another in an entry.
enum FixedField {
    kFaceArea,
    kAuxWord,
    kFlags,
    kAuxFlag,
    kEyes,
    kMouth,
    kStates,
    kCode,
    kAuxBox,
    kOrientation,
    kRotation,
    kAge,
    kFeatureType,
    kFixedFieldCount
};

struct FixedFieldInfo {
    uint8_t byteIndex;  // byte of the fixed bitmap
    uint8_t bit;        // bit value within that byte
    uint8_t size;       // bytes on the wire
};

extern const FixedFieldInfo kFixedFields[kFixedFieldCount];

inline bool Has(const uint8_t* fixedBits, FixedField f) {
    return (fixedBits[kFixedFields[f].byteIndex] & kFixedFields[f].bit) != 0;
}
inline void Set(uint8_t* fixedBits, FixedField f) { fixedBits[kFixedFields[f].byteIndex] |= kFixedFields[f].bit; }

// Variable blocks, in wire order, in byte 0 of the variable bitmap. Each
// block starts with its own length, which counts the length field too.
enum : uint8_t { kVarAttributes = 0x01, kVarParts = 0x02, kVarFeature = 0x04 };
constexpr uint32_t kAttributeItemSize = 2;  // id, score
constexpr uint32_t kPartItemSize = 9;       // id, x (32 bits), y (32 bits)
constexpr uint32_t kShortLengthField = 2;   // attributes, parts
constexpr uint32_t kLongLengthField = 4;    // feature

// "MM" selects big-endian, every other mark little-endian.
inline _zbm_WriteEndianType EndianOf(uint16_t byteOrder) {
    return byteOrder == OFM_BYTE_ORDER_BIG ? ZBM_WRITE_ENDIAN_BIG : ZBM_WRITE_ENDIAN_LITTLE;
}

// F of a fixed bitmap (fixedLen bytes). 1 when a set bit names no known field.
uint32_t FixedPartSize(const uint8_t* fixedBits, uint32_t fixedLen, uint32_t* size);

// Bytes taken by the length fields of the blocks present: the least a
// variable part can occupy.
uint32_t MinVariablePartSize(const uint8_t* varBits);

// Checks that an entry of entrySize bytes can hold F and the length fields
// of the variable blocks present (varBits may be NULL), and is not empty.
// 1 otherwise, also for an unknown fixed bit. *fixedSize receives F.
uint32_t CheckEntrySize(const uint8_t* fixedBits, uint32_t fixedLen, const uint8_t* varBits, uint32_t entrySize,
                        uint32_t* fixedSize);

// The values CreateFaceRegion gives the container fields of a region
// (faceArea included); list counts, buffers and faceTag are left alone.
void SetFixedDefaults(_FaceRegion& region);

// Value of a rotation whose bits are all set: the "not estimated" default.
float UnsetRotation();

}  // namespace ofm

#endif
