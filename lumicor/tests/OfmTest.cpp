#include <gtest/gtest.h>
#include <lumicor/ofm.h>

#include "lumicor/tests/face_meta_samples.h"
#include "testkit/fault.h"

#include <climits>
#include <functional>
#include <string>
#include <vector>

namespace {

using facemeta::Owner;
using Bytes = std::vector<uint8_t>;
constexpr uint16_t kBig = OFM_BYTE_ORDER_BIG;
constexpr uint16_t kLittle = 0x4949;  // "II"

using facemeta::V;
uint32_t Get16(const Bytes& b, size_t at) { return (b[at] << 8) | b[at + 1]; }
uint32_t Get32(const Bytes& b, size_t at) { return (Get16(b, at) << 16) | Get16(b, at + 2); }
void Put16(Bytes& b, size_t at, uint32_t v) {
    b[at] = static_cast<uint8_t>(v >> 8);
    b[at + 1] = static_cast<uint8_t>(v);
}
void Put32(Bytes& b, size_t at, uint32_t v) {
    Put16(b, at, v >> 16);
    Put16(b, at + 2, v & 0xFFFF);
}

Bytes Serialize(const _FaceMeta& meta, uint16_t order = kBig) {
    uint32_t size = 0, written = 0;
    EXPECT_EQ(OFM_GetOfmBufferSize(meta.pRegions, meta.regionCount, 259, &size), 0u);
    Bytes buf(size, 0xCC);
    EXPECT_EQ(OFM_SerializeOfm(order, buf.data(), size, &meta, &written), 0u);
    EXPECT_EQ(written, size);
    return buf;
}

enum Stage { kHeader, kSize, kParse, kDone };
struct Outcome {
    Stage stage;
    uint32_t status;
};

// Reads a container the way the face section does: header, list sizes,
// regions prepared with them, entries.
Outcome Read(const Bytes& bytes, Owner& out, uint16_t order = kBig) {
    OfmHeader h;
    uint32_t st = OFM_GetOfmHeader(order, bytes.data(), static_cast<uint32_t>(bytes.size()), &h);
    if (st != 0) return {kHeader, st};
    const uint8_t* entries = bytes.data() + h.headerSize;
    const uint32_t len = static_cast<uint32_t>(bytes.size()) - h.headerSize;
    uint8_t fixedBits[16], varBits[16];
    for (int i = 0; i < 16; ++i) {
        fixedBits[i] = h.fixedBits[i];
        varBits[i] = h.varBits[i];
    }
    uint16_t a, p, f;
    st = OFM_GetOfmSize(order, h.entrySize, h.fixedSize, h.faceNum, fixedBits, 16, varBits, 16, entries, len, &a, &p,
                        &f);
    if (st != 0) return {kSize, st};
    if (h.faceNum != 0) out.Allocate(h.faceNum, a, p, f);
    st = OFM_ParseOfm(&h, entries, len, &out.meta);
    return {st != 0 ? kParse : kDone, st};
}

// A one-face container of an older format version, built field by field:
// every field the version knows, plus a bitmap bit the version does not
// define (eyes in 256, auxBox in 257) that the reader must ignore.
struct Builder {
    Bytes b;
    void U8(uint32_t v) { b.push_back(static_cast<uint8_t>(v)); }
    void U16(uint32_t v) { U8(v >> 8), U8(v); }
    void U32(uint32_t v) { U16(v >> 16), U16(v & 0xFFFF); }
    void Zeros(size_t n) { b.insert(b.end(), n, 0); }
    void Text(const char* s, size_t n) {
        for (size_t i = 0; i < n; ++i) U8(i < std::strlen(s) ? s[i] : 0);
    }
};

Bytes BuildVersion(uint32_t version) {
    const bool v257 = version >= 257, v258 = version >= 258, v259 = version >= 259;
    const uint32_t fixedSize = 17 + (v257 ? 20 : 0) + (v258 ? 31 : 0) + (v259 ? 16 : 0);
    const uint32_t entrySize = fixedSize + (v258 ? 15 : 0) + (v259 ? 7 : 0);
    Builder w;
    w.U16(kBig);
    w.U16(v258 ? 94 : 72);
    w.U16(version);
    w.Text("2020:01:02 03:04:05", 20);
    w.U32(640u << 16 | 480);
    w.Zeros(2);
    w.U8(0x3A | 0x40 | (v257 ? 0x80 : 0));
    w.U8((v257 ? 0x03 | 0x04 : 0) | (v258 ? 0x3C : 0) | (v259 ? 0x40 : 0));
    w.Zeros(14);
    w.U16(1);
    w.U16(entrySize);
    w.Text("ORL_99", 16);
    w.Zeros(4);
    if (v258) {
        w.U32(facemeta::BitsOf(2.5f));
        w.U8(v259 ? 0x07 : 0x03);
        w.Zeros(15);
        w.U16(fixedSize);
    }
    w.U32(10u << 16 | 20), w.U32(30u << 16 | 40);  // faceArea
    w.U32(0xA1B2C3D4);                             // auxWord
    w.U8(0x40), w.Zeros(3);                        // flagB
    w.U8(9);                                       // auxFlag
    if (v257) {
        w.U32(15u << 16 | 25), w.U32(35u << 16 | 26);  // eyes
        w.U32(18u << 16 | 40), w.U32(32u << 16 | 41);  // mouth ends
        w.U8(0x80 | 0x20), w.U8(0x40), w.U8(0x80 | 0x40);
        w.U8(0x80 | 11);
    }
    if (v258) {
        w.U32(1), w.U32(2), w.U32(3), w.U32(4);
        w.U8(3);
        w.U32(facemeta::BitsOf(0.5f)), w.U32(facemeta::BitsOf(0.25f)), w.U32(facemeta::BitsOf(0.125f));
        w.U8(60), w.U8(50);
    }
    if (v259) w.Text("PDEC_C2", 16);
    if (v258) {
        w.U16(4), w.U8(1), w.U8(99);
        w.U16(11), w.U8('%'), w.U32(facemeta::BitsOf(1.5f)), w.U32(facemeta::BitsOf(2.5f));
    }
    if (v259) w.U32(7), w.U8(0xAA), w.U8(0xBB), w.U8(0xCC);
    return w.b;
}

// The region BuildVersion describes.
void ExpectedForVersion(uint32_t version, Owner& o) {
    o.Allocate(1, 1, 1, 3);
    _FaceRegion& r = o[0];
    r.faceArea = zbm_Rect{10, 20, 30, 40};
    r.auxWord = 0xA1B2C3D4, r.flagsValid = 1, r.flagB = 1, r.auxFlag = 9;
    if (version >= 257) {
        r.rightEye = zbm_Pos{15, 25}, r.leftEye = zbm_Pos{35, 26};
        r.rightMouthEnd = zbm_Pos{18, 40}, r.leftMouthEnd = zbm_Pos{32, 41};
        r.statesValid = 1, r.stateA = _FaceRegionState{1, 1}, r.stateB = _FaceRegionState{0, 2};
        r.stateC = _FaceRegionState{1, 3};
        r.codeValid = 1, r.codeFlag = 1, r.code = 11;
    }
    r.attributeCount = r.partCount = r.featureSize = 0;
    if (version >= 258) {
        for (int i = 0; i < 4; ++i) r.auxBox[i] = i + 1;
        r.orientation = 3, r.ageMax = 60, r.ageMin = 50;
        r.rotation[0] = 0.5f, r.rotation[1] = 0.25f, r.rotation[2] = 0.125f;
        r.attributeCount = 1, r.pAttributes[0] = 1, r.pAttributes[1] = 99;
        r.partCount = 1;
        facemeta::SetPart(r, 0, '%', 1.5f, 2.5f);
    }
    if (version >= 259) {
        std::strncpy(r.featureType, "PDEC_C2", 16);
        r.featureSize = 3, r.pFeature[0] = 0xAA, r.pFeature[1] = 0xBB, r.pFeature[2] = 0xCC;
    }
}

TEST(OfmTest, OneFaceWithBoxAndEyesOnly) {
    Owner o;
    o.Allocate(1);
    facemeta::SetHeader(o.meta);
    o[0].faceArea = zbm_Rect{10, 20, 30, 40};
    o[0].rightEye = zbm_Pos{15, 25};
    o[0].leftEye = zbm_Pos{35, 26};
    const Bytes b = Serialize(o.meta);
    ASSERT_EQ(b.size(), 111u);
    EXPECT_EQ(Get16(b, 0), 0x4D4Du);
    EXPECT_EQ(Get16(b, 2), 94u);
    EXPECT_EQ(Get16(b, 4), 259u);
    EXPECT_EQ(std::string(b.begin() + 6, b.begin() + 25), "2024:05:06 07:08:09");
    EXPECT_EQ(Get32(b, 26), 4000u << 16 | 3000);
    EXPECT_EQ(b[32], 0x42);
    EXPECT_EQ(b[33], 0x08);
    EXPECT_EQ(Get16(b, 48), 1u);
    EXPECT_EQ(Get16(b, 50), 17u);  // E
    EXPECT_EQ(std::string(b.begin() + 52, b.begin() + 60), "ORL_1234");
    EXPECT_EQ(Get16(b, 92), 17u);  // F
    for (size_t i : {34, 40, 47, 68, 76, 80, 91}) EXPECT_EQ(b[i], 0) << i;
    const Bytes entry = {0, 10, 0, 20, 0, 30, 0, 40, 0, 15, 0, 25, 0, 35, 0, 26, 0};
    EXPECT_EQ(Bytes(b.begin() + 94, b.end()), entry);
}

TEST(OfmTest, ListsArePaddedToTheLargest) {
    Owner o;
    o.Allocate(2, 3);
    facemeta::SetHeader(o.meta);
    o[0].attributeCount = 1;
    const uint8_t first[2] = {7, 70}, second[6] = {1, 10, 2, 20, 3, 30};
    std::memcpy(o[0].pAttributes, first, 2);
    std::memcpy(o[1].pAttributes, second, 6);
    const Bytes b = Serialize(o.meta);
    ASSERT_EQ(b.size(), 94u + 2 * 17);  // F = box + orientation = 9, attributes 2 + 3 x 2
    EXPECT_EQ(b[76], 0x01);
    EXPECT_EQ(Bytes(b.begin() + 94 + 9, b.begin() + 94 + 17), (Bytes{0, 4, 7, 70, 0, 0, 0, 0}));
    EXPECT_EQ(Bytes(b.begin() + 111 + 9, b.end()), (Bytes{0, 8, 1, 10, 2, 20, 3, 30}));

    Owner back;
    ASSERT_EQ(Read(b, back).stage, kDone);
    EXPECT_EQ(V(back[0].attributeCount), 1u);
    EXPECT_EQ(V(back[1].attributeCount), 3u);
    facemeta::ExpectSameFaceMeta(o.meta, back.meta);
    EXPECT_EQ(Serialize(back.meta), b);
}

TEST(OfmTest, SignOnlyValuesAndHalfMouthsAreNotStored) {
    Owner o;
    o.Allocate(1);
    facemeta::SetHeader(o.meta);
    o[0].rotation[0] = -0.0f;
    o[0].rotation[1] = 1.0f;
    o[0].rotation[2] = -0.0f;
    o[0].auxBox[0] = INT32_MIN;
    o[0].auxBox[1] = 7;
    o[0].rightMouthEnd = zbm_Pos{5, 6};  // the left corner stays missing
    const Bytes b = Serialize(o.meta);
    ASSERT_EQ(b[32], 0x82);
    ASSERT_EQ(b[33], 0x1C);  // auxBox, orientation, rotation
    EXPECT_EQ(Get32(b, 102), 0xFFFFFFFFu);
    EXPECT_EQ(Get32(b, 106), 0xFFFFFFFFu);
    EXPECT_EQ(Get32(b, 110), 0u);
    EXPECT_EQ(Get32(b, 114), 7u);
    EXPECT_EQ(Get32(b, 127), 0u);
    EXPECT_EQ(Get32(b, 131), 0x3F800000u);
    EXPECT_EQ(Get32(b, 135), 0u);

    Owner back;
    ASSERT_EQ(Read(b, back).stage, kDone);
    EXPECT_EQ(V(back[0].rightMouthEnd.x), -1);
    EXPECT_EQ(V(back[0].rightMouthEnd.y), -1);
    EXPECT_EQ(facemeta::BitsOf(back[0].rotation[0]), 0u);
    EXPECT_EQ(V(back[0].auxBox[0]), 0);
}

TEST(OfmTest, ByteOrderIsTheCallersNotTheMarks) {
    Owner o;
    facemeta::FillTwoFaces(o);
    const Bytes big = Serialize(o.meta, kBig);
    OfmHeader h;
    EXPECT_EQ(OFM_GetOfmHeader(kLittle, big.data(), static_cast<uint32_t>(big.size()), &h), 1u);
    EXPECT_EQ(V(h.byteOrder), 0x4D4Du);
    EXPECT_EQ(V(h.headerSize), 0x5E00u);  // swapped 94
    EXPECT_EQ(V(h.formatVersion), 0x0301u);

    Bytes little = Serialize(o.meta, kLittle);
    EXPECT_EQ(little[2], 94);
    little[0] = little[1] = 'M';
    ASSERT_EQ(OFM_GetOfmHeader(kLittle, little.data(), static_cast<uint32_t>(little.size()), &h), 0u);
    EXPECT_EQ(V(h.byteOrder), 0x4D4Du);
    EXPECT_EQ(V(h.faceNum), 2u);
    EXPECT_EQ(V(h.imageWidth), 4000u);
}

TEST(OfmTest, RoundTripsEveryFieldInBothByteOrders) {
    Bytes previous;
    for (uint16_t order : {kBig, kLittle}) {
        SCOPED_TRACE(order);
        Owner o;
        facemeta::FillTwoFaces(o);
        const Bytes b = Serialize(o.meta, order);
        EXPECT_NE(b, previous);
        previous = b;
        Owner back;
        ASSERT_EQ(Read(b, back, order).stage, kDone);
        facemeta::ExpectSameFaceMeta(o.meta, back.meta);
        EXPECT_EQ(Serialize(back.meta, order), b);
    }
}

TEST(OfmTest, ReadsEveryFormatVersion) {
    for (uint32_t version = 256; version <= 259; ++version) {
        SCOPED_TRACE(version);
        Owner expected, back, again;
        ExpectedForVersion(version, expected);
        ASSERT_EQ(Read(BuildVersion(version), back).stage, kDone);
        EXPECT_EQ(V(back.meta.formatVersion), version);
        EXPECT_EQ(V(back.meta.imageWidth), 640u);
        EXPECT_EQ(V(back.meta.imageHeight), 480u);
        EXPECT_EQ(V(back.meta.headerValue), version >= 258 ? 2.5f : 0.0f);
        facemeta::ExpectSameRegion(expected[0], back[0]);
        // Written again it becomes a 259 container with the same content.
        const Bytes rewritten = Serialize(back.meta);
        EXPECT_EQ(Get16(rewritten, 4), 259u);
        ASSERT_EQ(Read(rewritten, again).stage, kDone);
        facemeta::ExpectSameRegion(expected[0], again[0]);
    }
}

TEST(OfmTest, StateAndCodeBytes) {
    struct Row {
        uint32_t value;
        uint8_t abByte, cByte;
        uint32_t abBack, cBack;
    };
    const Row rows[] = {{0, 0x00, 0x00, 0, 0}, {1, 0x20, 0x10, 1, 1}, {2, 0x40, 0x20, 2, 2},
                        {3, 0x60, 0x40, 3, 3}, {4, 0x60, 0x70, 3, 4}, {9, 0x60, 0x70, 3, 4}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.value);
        Owner o, back;
        o.Allocate(1);
        o[0].statesValid = o[0].codeValid = o[0].codeFlag = 1;
        o[0].stateA = _FaceRegionState{1, row.value};
        o[0].stateC = _FaceRegionState{0, row.value};
        o[0].code = static_cast<uint8_t>(row.value + 9);  // low four bits stored; 12..15 read back as 0
        const Bytes b = Serialize(o.meta);
        ASSERT_EQ(b[33], 0x0B);  // states, code, orientation after the box
        EXPECT_EQ(b[102], 0x80 | row.abByte);
        EXPECT_EQ(b[104], row.cByte);
        EXPECT_EQ(b[105], 0x80 | ((row.value + 9) & 15));
        ASSERT_EQ(Read(b, back).stage, kDone);
        EXPECT_EQ(V(back[0].stateA.value), row.abBack);
        EXPECT_EQ(V(back[0].stateC.value), row.cBack);
        const uint32_t stored = (row.value + 9) & 15;
        EXPECT_EQ(V(back[0].code), stored < 12 ? stored : 0u);
    }
    // Any C pattern other than the four defined ones reads as 4.
    Owner o, back;
    o.Allocate(1);
    o[0].statesValid = 1;
    Bytes b = Serialize(o.meta);
    b[104] = 0x30;
    ASSERT_EQ(Read(b, back).stage, kDone);
    EXPECT_EQ(V(back[0].stateC.value), 4u);
}

TEST(OfmTest, ReaderRefusesMalformedContainers) {
    Owner o;
    facemeta::FillTwoFaces(o);
    const Bytes good = Serialize(o.meta);
    ASSERT_EQ(good.size(), 94u + 2 * 369);  // F = 84, lists 6 + 20 + 259
    const size_t attributesLength = 94 + 84, featureLength = attributesLength + 6 + 20;
    struct Row {
        const char* name;
        std::function<void(Bytes&)> corrupt;
        Stage stage;
    };
    const Row rows[] = {
        {"shorter than any header", [](Bytes& b) { b.resize(71); }, kHeader},
        {"cut inside the long header", [](Bytes& b) { b.resize(93); }, kHeader},
        {"header size of the other version", [](Bytes& b) { Put16(b, 2, 72); }, kHeader},
        {"version 255", [](Bytes& b) { Put16(b, 4, 255); }, kHeader},
        {"version 260", [](Bytes& b) { Put16(b, 4, 260); }, kHeader},
        {"F unlike the bitmap's", [](Bytes& b) { Put16(b, 92, 83); }, kHeader},
        {"E only covers F", [](Bytes& b) { Put16(b, 50, 84); }, kHeader},
        {"E zero", [](Bytes& b) { Put16(b, 50, 0); }, kHeader},
        {"unknown fixed bit", [](Bytes& b) { b[32] |= 0x01; }, kHeader},
        {"bit in an unused bitmap byte", [](Bytes& b) { b[40] = 0x10; }, kHeader},
        {"last entry cut short", [](Bytes& b) { b.pop_back(); }, kSize},
        {"more faces than entries", [](Bytes& b) { Put16(b, 48, 3); }, kSize},
        {"attribute length below its field", [](Bytes& b) { Put16(b, attributesLength, 1); }, kSize},
        {"attributes reaching into the next entry", [](Bytes& b) { Put16(b, attributesLength, 300); }, kSize},
        {"feature length below its field", [](Bytes& b) { Put32(b, featureLength, 3); }, kSize},
        {"feature longer than the buffer", [](Bytes& b) { Put32(b, featureLength, 0xFFFFFFF0u); }, kSize},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        Bytes b = good;
        row.corrupt(b);
        Owner back;
        const Outcome outcome = Read(b, back);
        EXPECT_EQ(outcome.stage, row.stage);
        EXPECT_EQ(outcome.status, 1u);
    }

    // Regions prepared with less room than the entries need, or too few.
    OfmHeader h;
    ASSERT_EQ(OFM_GetOfmHeader(kBig, good.data(), static_cast<uint32_t>(good.size()), &h), 0u);
    const uint8_t* entries = good.data() + 94;
    const uint32_t len = static_cast<uint32_t>(good.size()) - 94;
    Owner small;
    small.Allocate(2, 1, 2, 255);
    EXPECT_EQ(OFM_ParseOfm(&h, entries, len, &small.meta), 4u);
    small.Allocate(1, 2, 2, 255);
    EXPECT_EQ(OFM_ParseOfm(&h, entries, len, &small.meta), 1u);
    small.Allocate(2, 2, 2, 255);
    EXPECT_EQ(OFM_ParseOfmData(kBig, 369, 2, good.data() + 32, 16, good.data() + 76, 16, entries, len - 1,
                               small.meta.pRegions),
              1u);
    EXPECT_EQ(OFM_ParseOfm(&h, entries, len, &small.meta), 0u);
}

TEST(OfmTest, WriterRefusesWhatItCannotStore) {
    struct Row {
        const char* name;
        std::function<void(Owner&)> change;
        uint32_t status;
    };
    const Row rows[] = {
        {"x beyond 16 bits", [](Owner& o) { o[0].faceArea.x = 65536; }, 1},
        {"negative width", [](Owner& o) { o[0].faceArea.width = -1; }, 1},
        {"half an eye", [](Owner& o) { o[0].rightEye = zbm_Pos{-1, 5}; }, 1},
        {"attributes without a buffer",
         [](Owner& o) {
             o[0].attributeCount = 2;
             o[0].pAttributes = nullptr;
         },
         2},
        {"faceNum unlike regionCount", [](Owner& o) { o.meta.faceNum = 2; }, 1},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        Owner o;
        o.Allocate(1);
        row.change(o);
        Bytes buf(1000);
        uint32_t written = 1;
        EXPECT_EQ(OFM_SerializeOfm(kBig, buf.data(), 1000, &o.meta, &written), row.status);
        EXPECT_EQ(written, 0u);
    }
    Owner o;
    facemeta::FillTwoFaces(o);
    Bytes buf(Serialize(o.meta).size() - 1);
    uint32_t written = 0;
    EXPECT_EQ(OFM_SerializeOfm(kBig, buf.data(), static_cast<uint32_t>(buf.size()), &o.meta, &written), 1u);
}

TEST(OfmTest, CreateFaceRegionFreesEverythingWhenAnAllocationFails) {
    _FaceRegion r;
    uint32_t status = 0;
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] { status = CreateFaceRegion(2, 3, 4, &r); },
        [&](long, bool triggered) {
            EXPECT_EQ(status, triggered ? 1u : 0u);
            EXPECT_EQ(V(r.attributeCount) + V(r.partCount) + V(r.featureSize), triggered ? 0u : 9u);
            EXPECT_EQ(V(r.pParts) != nullptr, !triggered);
            delete[] r.pAttributes;
            delete[] r.pParts;
            delete[] r.pFeature;
        });
    EXPECT_EQ(allocations, 3);
    EXPECT_EQ(CreateFaceRegion(0, 0x20000000u, 0, &r), 1u);  // 9 x capacity beyond 32 bits
}

TEST(OfmTest, SeedCorpusMatchesTheWriter) {
    Owner one, two, none;
    one.Allocate(1);
    facemeta::SetHeader(one.meta);
    one[0].faceArea = zbm_Rect{10, 20, 30, 40};
    one[0].rightEye = zbm_Pos{15, 25};
    one[0].leftEye = zbm_Pos{35, 26};
    facemeta::FillTwoFaces(two);
    facemeta::SetHeader(none.meta);
    facemeta::ExpectSeed("ofm_reader", "one_face_box_eyes.ofm", Serialize(one.meta));
    facemeta::ExpectSeed("ofm_reader", "two_faces_be.ofm", Serialize(two.meta));
    facemeta::ExpectSeed("ofm_reader", "two_faces_le.ofm", Serialize(two.meta, kLittle));
    facemeta::ExpectSeed("ofm_reader", "no_faces.ofm", Serialize(none.meta));
    facemeta::ExpectSeed("ofm_reader", "version256.ofm", BuildVersion(256));
    facemeta::ExpectSeed("ofm_reader", "version258.ofm", BuildVersion(258));
}

}  // namespace
