// Hand-built face metas for the OFM and face-section tests, and a field-by-
// field comparison (the records are packed, so no memberwise operator==).
#ifndef LUMICOR_TESTS_FACE_META_SAMPLES_H
#define LUMICOR_TESTS_FACE_META_SAMPLES_H

#include <gtest/gtest.h>
#include <lumicor/ofm.h>

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace facemeta {

// Owns a _FaceMeta whose regions come from CreateFaceRegion.
struct Owner {
    _FaceMeta meta;
    Owner() { std::memset(static_cast<void*>(&meta), 0, sizeof meta); }
    ~Owner() { ReleaseFaceRegionArray(&meta); }
    Owner(const Owner&) = delete;
    Owner& operator=(const Owner&) = delete;

    // count regions with the given list capacities, all defaults.
    void Allocate(uint32_t count, uint32_t attributes = 0, uint32_t parts = 0, uint32_t feature = 0) {
        ReleaseFaceRegionArray(&meta);
        meta.pRegions = new _FaceRegion[count]();
        meta.regionCount = count;
        meta.faceNum = static_cast<uint16_t>(count);
        for (uint32_t i = 0; i < count; ++i) {
            EXPECT_EQ(CreateFaceRegion(attributes, parts, feature, &meta.pRegions[i]), 0u);
        }
    }
    _FaceRegion& operator[](uint32_t i) { return meta.pRegions[i]; }
};

// Copies a packed member: gtest's macros bind references, which a packed
// member cannot safely give.
template <typename T>
T V(T v) {
    return v;
}

inline float Bits(uint32_t bits) {
    float f;
    std::memcpy(&f, &bits, 4);
    return f;
}
inline uint32_t BitsOf(float f) {
    uint32_t b;
    std::memcpy(&b, &f, 4);
    return b;
}

inline void SetHeader(_FaceMeta& m) {
    std::strncpy(m.engineVersion, "ORL_1234", sizeof m.engineVersion);
    std::strncpy(m.dateTime, "2024:05:06 07:08:09", sizeof m.dateTime);
    m.headerValue = 0.0f;
    m.formatVersion = OFM_FORMAT_VERSION_CURRENT;
    m.imageWidth = 4000;
    m.imageHeight = 3000;
}

// Puts part point i (id, x, y as native 32-bit float bits).
inline void SetPart(_FaceRegion& r, uint32_t i, uint8_t id, float x, float y) {
    uint8_t* item = r.pParts + 9 * i;
    item[0] = id;
    std::memcpy(item + 1, &x, 4);
    std::memcpy(item + 5, &y, 4);
}

// Two faces that use every field of the container; the first has two
// attributes, two parts and a feature, the second one attribute, no parts
// and a zero feature of type "na".
inline void FillTwoFaces(Owner& o) {
    ReleaseFaceRegionArray(&o.meta);
    o.meta.pRegions = new _FaceRegion[2]();
    o.meta.regionCount = 2;
    o.meta.faceNum = 2;
    SetHeader(o.meta);
    ASSERT_EQ(CreateFaceRegion(2, 2, 255, &o[0]), 0u);
    ASSERT_EQ(CreateFaceRegion(1, 0, 255, &o[1]), 0u);

    _FaceRegion& a = o[0];
    a.faceArea = zbm_Rect{100, 200, 300, 400};
    for (int i = 0; i < 4; ++i) a.auxBox[i] = i + 1;
    a.rotation[0] = 0.25f, a.rotation[1] = -0.5f, a.rotation[2] = 1.0f;  // yaw, pitch, roll
    a.auxWord = 0x01020304, a.auxFlag = 5;
    a.rightEye = zbm_Pos{150, 250}, a.leftEye = zbm_Pos{250, 251};
    a.rightMouthEnd = zbm_Pos{160, 350}, a.leftMouthEnd = zbm_Pos{240, 351};
    a.codeValid = 1, a.codeFlag = 1, a.code = 9, a.orientation = 2;
    a.flagsValid = 1, a.flagA = 1;
    a.statesValid = 1, a.stateA = _FaceRegionState{1, 2}, a.stateB = _FaceRegionState{0, 1};
    a.stateC = _FaceRegionState{1, 3};
    a.ageMin = 20, a.ageMax = 30;
    const uint8_t attributes[4] = {1, 80, 2, 15};
    std::memcpy(a.pAttributes, attributes, 4);
    SetPart(a, 0, '%', 123.5f, 200.25f);
    SetPart(a, 1, '=', 180.0f, 310.75f);
    std::strncpy(a.featureType, "PDEC_C2", sizeof a.featureType);
    for (uint32_t i = 0; i < 255; ++i) a.pFeature[i] = static_cast<uint8_t>(i * 7 + 1);

    _FaceRegion& b = o[1];
    b.faceArea = zbm_Rect{2000, 1000, 500, 600};
    b.rotation[0] = 0.0f, b.rotation[1] = 0.125f, b.rotation[2] = -1.5f;
    b.rightEye = zbm_Pos{2100, 1200}, b.leftEye = zbm_Pos{2300, 1210};
    // The container has no per-face present flags: a field stored for one
    // face is read back as present for all, so set them on both.
    b.flagsValid = 1, b.flagB = 1, b.statesValid = 1, b.codeValid = 1;
    b.ageMin = 40, b.ageMax = 50;
    b.pAttributes[0] = 2;
    b.pAttributes[1] = 60;
    std::strncpy(b.featureType, "na", sizeof b.featureType);
}

// Compares everything the container carries (not faceTag).
inline void ExpectSameRegion(const _FaceRegion& x, const _FaceRegion& y) {
    // faceArea .. partCount are plain fixed-size fields laid out back to back.
    const size_t from = offsetof(_FaceRegion, faceArea), to = offsetof(_FaceRegion, pParts);
    EXPECT_EQ(std::memcmp(reinterpret_cast<const uint8_t*>(&x) + from, reinterpret_cast<const uint8_t*>(&y) + from,
                          to - from),
              0);
    EXPECT_EQ(V(x.attributeCount), V(y.attributeCount));
    if (x.attributeCount == y.attributeCount && x.attributeCount != 0) {
        EXPECT_EQ(std::memcmp(x.pAttributes, y.pAttributes, 2 * x.attributeCount), 0);
    }
    if (x.partCount == y.partCount && x.partCount != 0) {
        EXPECT_EQ(std::memcmp(x.pParts, y.pParts, 9 * x.partCount), 0);
    }
    EXPECT_EQ(std::memcmp(x.featureType, y.featureType, 16), 0);
    EXPECT_EQ(V(x.featureSize), V(y.featureSize));
    if (x.featureSize == y.featureSize && x.featureSize != 0) {
        EXPECT_EQ(std::memcmp(x.pFeature, y.pFeature, x.featureSize), 0);
    }
}

inline void ExpectSameFaceMeta(const _FaceMeta& x, const _FaceMeta& y) {
    const size_t headerBytes = offsetof(_FaceMeta, regionCount);  // engineVersion .. faceNum
    EXPECT_EQ(std::memcmp(&x, &y, headerBytes), 0);
    ASSERT_EQ(V(x.regionCount), V(y.regionCount));
    for (uint32_t i = 0; i < x.regionCount; ++i) {
        SCOPED_TRACE(i);
        ExpectSameRegion(x.pRegions[i], y.pRegions[i]);
    }
}

// The fuzz seeds are the writers' own output, checked here so that a format
// change shows up; regenerate them with LUMICOR_UPDATE_CORPUS=1 when the
// format changes on purpose.
inline void ExpectSeed(const char* target, const char* name, const std::vector<uint8_t>& bytes) {
    const std::string path = std::string(LUMICOR_SOURCE_DIR) + "/fuzz/corpus/" + target + "/" + name;
    if (std::getenv("LUMICOR_UPDATE_CORPUS")) {
        std::ofstream(path, std::ios::binary)
            .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    }
    std::ifstream in(path, std::ios::binary);
    EXPECT_EQ(std::vector<uint8_t>(std::istreambuf_iterator<char>(in), {}), bytes) << path;
}

}  // namespace facemeta

#endif
