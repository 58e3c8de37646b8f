// Attention section of the photo meta: the areas of an analysed photo, and
// the section's layout, round trip, refusals and dump.
#include <lumicor/vond.h>

#include "testkit/fault.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

_CALibVersion Version(const char* text) {
    _CALibVersion v;
    std::memset(&v, 0, sizeof v);
    std::memcpy(v.text, text, std::strlen(text));
    return v;
}

// Owns the area records of an array built in a test.
struct Areas {
    std::vector<CAAttentionArea> records;
    _CAAttentionAreaArray array{};
    Areas(uint32_t isFace, std::vector<CAAttentionArea> r) : records(std::move(r)) {
        array.isFace = isFace;
        array.numAreas = static_cast<uint32_t>(records.size());
        array.pAreaArray = records.empty() ? nullptr : records.data();
    }
};

CAAttentionArea Area(float nx, float ny, float nw, float nh, int32_t value) {
    CAAttentionArea a;
    a.nx = nx;
    a.ny = ny;
    a.nw = nw;
    a.nh = nh;
    a.val.direction = value;
    return a;
}

std::vector<uint8_t> Serialize(const _CAAttentionAreaArray& areas, uint16_t w, uint16_t h, _VondResult* r) {
    std::vector<uint8_t> buf(VondCALibGetSerializedSize(areas));
    uint32_t written = 0;
    *r = VondCALibSerialize(areas, Version("CALib 2.1.0"), w, h, buf.data(), static_cast<uint32_t>(buf.size()), written);
    buf.resize(written);
    return buf;
}

TEST(VondCALibMetaTest, WritesAndReadsTheSectionLayout) {
    // isFace 5 is written as 1.
    Areas areas(5, {Area(0.5f, 0.25f, 1.0f, 2.0f, 3), Area(0.0f, 0.0f, 0.0f, 0.0f, -1)});
    _VondResult r;
    const std::vector<uint8_t> bytes = Serialize(areas.array, 640, 480, &r);
    ASSERT_EQ(r.status, 0u) << r.message;
    ASSERT_EQ(bytes.size(), 22u + 2 * 17u);

    std::vector<uint8_t> expected(16, 0);
    std::memcpy(expected.data(), "CALib 2.1.0", 11);
    const uint8_t tail[] = {
        1, 2, 0x02, 0x80, 0x01, 0xE0,                        // isFace, count, 640, 480
        0x3F, 0x00, 0x00, 0x00, 0x3E, 0x80, 0x00, 0x00,      // 0.5, 0.25
        0x3F, 0x80, 0x00, 0x00, 0x40, 0x00, 0x00, 0x00, 3,   // 1.0, 2.0, direction 3
        0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xFF  // zero box, direction -1 as its low byte
    };
    expected.insert(expected.end(), tail, tail + sizeof tail);
    EXPECT_EQ(bytes, expected);

    // Read back with trailing bytes that belong to whatever follows.
    std::vector<uint8_t> longer = bytes;
    longer.resize(bytes.size() + 9, 0x77);
    _CAAttentionAreaArray parsed{};
    _CALibVersion version;
    uint16_t w = 0, h = 0;
    uint32_t consumed = 0;
    r = VondCALibParse(longer.data(), static_cast<uint32_t>(longer.size()), parsed, version, w, h, consumed);
    ASSERT_EQ(r.status, 0u) << r.message;
    EXPECT_EQ(consumed, bytes.size());
    EXPECT_EQ(std::memcmp(version.text, expected.data(), 16), 0);
    EXPECT_EQ(w, 640);
    EXPECT_EQ(h, 480);
    EXPECT_EQ(parsed.isFace, 1u);
    ASSERT_EQ(parsed.numAreas, 2u);
    EXPECT_EQ(std::memcmp(&parsed.pAreaArray[0], &areas.records[0], sizeof(CAAttentionArea)), 0);
    EXPECT_EQ(parsed.pAreaArray[1].val.direction, 255);  // the byte widened, not sign-extended
    VondCALibDisposeMeta(parsed);
    EXPECT_EQ(parsed.pAreaArray, nullptr);
    EXPECT_EQ(parsed.numAreas, 0u);
}

TEST(VondCALibMetaTest, SerializeRefusals) {
    struct Case {
        const char* name;
        uint32_t isFace;
        uint32_t count;       // areas in the array
        int32_t value;        // value of the last area
        int32_t bufDelta;     // buffer size relative to the section size
        bool nullBuffer;
        uint32_t status;
        const char* message;
    };
    const Case cases[] = {
        {"null buffer", 0, 1, 0, 0, true, 1, "pBuf == NULL"},
        {"one byte short", 0, 2, 0, -1, false, 1, "pBuf < serializedSize"},
        {"256 areas", 0, 256, 0, 0, false, 3, "areaArray.numAreas > 255"},
        {"direction 256", 1, 2, 256, 0, false, 3, "pArea->val.direction > 255"},
        {"saliency 256", 0, 2, 256, 0, false, 3, "pArea->val.saliency > 255"},
        {"saliency 0xFFFFFFFF", 0, 1, -1, 0, false, 3, "pArea->val.saliency > 255"},
        {"255 areas fit", 0, 255, 255, 0, false, 0, nullptr},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        Areas areas(c.isFace, std::vector<CAAttentionArea>(c.count, Area(0.1f, 0.1f, 0.1f, 0.1f, 1)));
        areas.records.back().val.direction = c.value;
        const uint32_t size = VondCALibGetSerializedSize(areas.array);
        std::vector<uint8_t> buf(size + 4);
        uint32_t written = 99;
        const _VondResult r = VondCALibSerialize(areas.array, Version("v"), 1, 1, c.nullBuffer ? nullptr : buf.data(),
                                                 static_cast<uint32_t>(static_cast<int32_t>(size) + c.bufDelta), written);
        EXPECT_EQ(r.status, c.status);
        if (c.message) {
            EXPECT_STREQ(r.message, c.message);
        }
        EXPECT_EQ(written, c.status == 0 ? size : 0u);
    }
}

TEST(VondCALibMetaTest, ParseRefusals) {
    Areas three(0, {Area(0, 0, 0, 0, 1), Area(0, 0, 0, 0, 2), Area(0, 0, 0, 0, 3)});
    _VondResult r;
    const std::vector<uint8_t> bytes = Serialize(three.array, 320, 240, &r);
    ASSERT_EQ(bytes.size(), 73u);

    struct Case {
        const char* name;
        uint32_t size;
        bool nullBuffer;
        const char* message;
        uint16_t width, height;
    };
    const Case cases[] = {
        {"null buffer", 73, true, "pBuf == NULL", 0, 0},
        {"shorter than the fixed part", 21, false, "bufSize < VondCALibGetSerializedSizeMax(0)", 0, 0},
        // Three areas announced in a 60-byte section: the header stays read.
        {"areas cut off", 60, false, "bufSize < VondCALibGetSerializedSizeMax(areaArray.numAreas)", 320, 240},
        {"last area one byte short", 72, false, "bufSize < VondCALibGetSerializedSizeMax(areaArray.numAreas)", 320,
         240},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        _CAAttentionAreaArray parsed{};
        _CALibVersion version;
        uint16_t w = 7, h = 7;
        uint32_t consumed = 7;
        r = VondCALibParse(c.nullBuffer ? nullptr : bytes.data(), c.size, parsed, version, w, h, consumed);
        EXPECT_EQ(r.status, 1u);
        EXPECT_STREQ(r.message, c.message);
        EXPECT_STREQ(r.function, "VondCALibParse");
        EXPECT_EQ(w, c.width);
        EXPECT_EQ(h, c.height);
        EXPECT_EQ(consumed, 0u);
        // No records, so no count that would claim them.
        EXPECT_EQ(parsed.pAreaArray, nullptr);
        EXPECT_EQ(parsed.numAreas, 0u);
    }
}

TEST(VondCALibMetaTest, DumpPrintsEveryArea) {
    Areas faces(1, {Area(0.25f, 0.5f, 0.125f, 0.75f, -1)});
    Areas salient(0, {Area(0.0f, 1.0f, 0.5f, 0.5f, 200)});
    testing::internal::CaptureStdout();
    VondCALibDump(faces.array);
    VondCALibDump(salient.array);
    std::fflush(stdout);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "\n*** VondCALibDump() ***\nisFace = true\nnumAreas = 1\n"
              "\t nx = 0.250000\n\t ny = 0.500000\n\t nw = 0.125000\n\t nh = 0.750000\n\t direction = -1\n"
              "\n*** VondCALibDump() ***\nisFace = false\nnumAreas = 1\n"
              "\t nx = 0.000000\n\t ny = 1.000000\n\t nw = 0.500000\n\t nh = 0.500000\n\t saliency = 200\n");
}

// A picture with three bright discs of different sizes on a textured ground.
ZbmImagePtr Discs(int w, int h) {
    ZbmImagePtr image(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_RGB));
    if (!image) return image;
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            uint8_t* p = ZbiuGetPointer(image.get(), x, y);
            p[0] = static_cast<uint8_t>(60 + (x * 7 + y * 3) % 23);
            p[1] = static_cast<uint8_t>(70 + (x * 5 + y * 11) % 19);
            p[2] = 90;
            const int cx[3] = {w / 4, w / 2, 3 * w / 4}, cy[3] = {h / 3, 2 * h / 3, h / 4}, r[3] = {h / 6, h / 9, h / 12};
            for (int i = 0; i < 3; ++i)
                if ((x - cx[i]) * (x - cx[i]) + (y - cy[i]) * (y - cy[i]) < r[i] * r[i]) {
                    p[0] = static_cast<uint8_t>(250 - 40 * i);
                    p[1] = static_cast<uint8_t>(200 + 20 * i);
                    p[2] = static_cast<uint8_t>(30 * i);
                }
        }
    return image;
}

struct AnalyzeOutput {
    _CAAttentionAreaArray areas;
    _CALibVersion version;
    AnalyzeOutput() {
        std::memset(&areas, 0, sizeof areas);
        std::memset(&version, 0, sizeof version);
    }
    ~AnalyzeOutput() { VondCALibDisposeMeta(areas); }
};

TEST(VondCALibMetaTest, AnalyzeRefusesOtherThanRgbAndSkipsSmallImages) {
    _FaceMeta noFaces{};
    ZbmImagePtr bgr(ZbiuCreate(320, 240, ZBM_PIXEL_ORDER_BGR));
    AnalyzeOutput out;
    _VondResult r = VondCALibAnalyze(bgr.get(), noFaces, out.areas, out.version);
    EXPECT_EQ(r.status, VOND_STATUS_INVALID_PARAMETER);
    EXPECT_STREQ(r.function, "VondCALibAnalyze");
    EXPECT_STREQ(r.message, "invalid pImage->order");
    EXPECT_STREQ(out.version.text, "1.2.2.1217");  // recorded before the checks

    // Below 240 pixels a side there are no areas, and that is not a failure.
    const zbm_Pos sizes[2] = {{239, 320}, {320, 239}};
    for (const zbm_Pos& size : sizes) {
        ZbmImagePtr small(ZbiuCreate(size.x, size.y, ZBM_PIXEL_ORDER_RGB));
        AnalyzeOutput skipped;
        r = VondCALibAnalyze(small.get(), noFaces, skipped.areas, skipped.version);
        EXPECT_EQ(r.status, VOND_STATUS_OK);
        EXPECT_STREQ(r.message, "analyze process is skipped since image size is too small");
        EXPECT_EQ(skipped.areas.numAreas, 0u);
        EXPECT_STREQ(skipped.version.text, "1.2.2.1217");
    }
}

TEST(VondCALibMetaTest, AnalyzeKeepsSalientAreasLargestFirstOrTheFaces) {
    ZbmImagePtr picture = Discs(640, 480);
    ASSERT_TRUE(picture);
    _FaceMeta faces{};
    AnalyzeOutput salient;
    _VondResult r = VondCALibAnalyze(picture.get(), faces, salient.areas, salient.version);
    ASSERT_EQ(r.status, VOND_STATUS_OK) << r.message;
    EXPECT_EQ(r.message, nullptr);
    EXPECT_EQ(salient.areas.isFace, 0u);
    ASSERT_GE(salient.areas.numAreas, 2u);
    EXPECT_LE(salient.areas.numAreas, 32u);
    for (uint32_t i = 1; i < salient.areas.numAreas; ++i) {
        const CAAttentionArea& a = salient.areas.pAreaArray[i - 1];
        const CAAttentionArea& b = salient.areas.pAreaArray[i];
        EXPECT_GE(a.nw * a.nh, b.nw * b.nh) << i;
    }

    // One face, in the pixels of a 1280 x 960 photo: it becomes the one area.
    _FaceRegion region{};
    region.faceArea = zbm_Rect{320, 240, 160, 200};
    const float rotation[3] = {0.0f, 0.0f, 0.0f};
    std::memcpy(reinterpret_cast<uint8_t*>(&region) + offsetof(_FaceRegion, rotation), rotation, sizeof rotation);
    faces.imageWidth = 1280;
    faces.imageHeight = 960;
    faces.faceNum = 1;
    faces.regionCount = 1;
    faces.pRegions = &region;
    AnalyzeOutput face;
    r = VondCALibAnalyze(picture.get(), faces, face.areas, face.version);
    ASSERT_EQ(r.status, VOND_STATUS_OK) << r.message;
    EXPECT_EQ(face.areas.isFace, 1u);
    ASSERT_EQ(face.areas.numAreas, 1u);
    EXPECT_NEAR(face.areas.pAreaArray[0].nx, 0.25f, 0.05f);
    EXPECT_NEAR(face.areas.pAreaArray[0].ny, 0.25f, 0.05f);
}

TEST(VondCALibMetaTest, AnalyzeAllocationFailuresLeaveNoAreas) {
    ZbmImagePtr picture = Discs(320, 240);
    ASSERT_TRUE(picture);
    _FaceMeta faces{};
    _VondResult r{};
    AnalyzeOutput out;
    testing::internal::CaptureStderr();  // the attention library's diagnostics
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            VondCALibDisposeMeta(out.areas);
            r = VondCALibAnalyze(picture.get(), faces, out.areas, out.version);
        },
        [&](long n, bool triggered) {
            if (!triggered) {
                EXPECT_EQ(r.status, VOND_STATUS_OK) << n;
                return;
            }
            EXPECT_TRUE(r.status == VOND_STATUS_OUT_OF_MEMORY || r.status == VOND_STATUS_FAILED) << n;
            EXPECT_EQ(out.areas.numAreas, 0u) << n;
            EXPECT_EQ(out.areas.pAreaArray, nullptr) << n;
        });
    testing::internal::GetCapturedStderr();
    EXPECT_GT(allocations, 1);
}

}  // namespace
