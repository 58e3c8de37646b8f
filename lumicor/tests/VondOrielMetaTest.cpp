#include <gtest/gtest.h>
#include <lumicor/vond.h>

#include "lumicor/tests/face_meta_samples.h"
#include "testkit/fault.h"

#include <functional>
#include <string>
#include <vector>

namespace {

using facemeta::Owner;
using Bytes = std::vector<uint8_t>;

using facemeta::V;
uint32_t Get32(const Bytes& b, size_t at) {
    return static_cast<uint32_t>(b[at]) << 24 | b[at + 1] << 16 | b[at + 2] << 8 | b[at + 3];
}

// Parse output, released however the test ends.
struct Section {
    _FaceMeta meta;
    Oriel_ClusterSubject subject = 0;
    _VondOrielMetaArray scores = {0, nullptr};
    uint32_t consumed = 0;
    Section() { std::memset(static_cast<void*>(&meta), 0, sizeof meta); }
    ~Section() { VondOrielDisposeMeta(meta, scores); }
    _VondResult Parse(const Bytes& b, size_t size) {
        return VondOrielParse(b.data(), static_cast<uint32_t>(size), meta, subject, scores, consumed);
    }
    void ExpectEmpty() {
        EXPECT_EQ(V(meta.regionCount), 0u);
        EXPECT_EQ(V(meta.pRegions), nullptr);
        EXPECT_EQ(V(meta.faceNum), 0u);
        EXPECT_EQ(scores.count, 0u);
        EXPECT_EQ(scores.pScores, nullptr);
        EXPECT_EQ(subject, 0u);
        EXPECT_EQ(consumed, 0u);
    }
};

Bytes Serialize(const _FaceMeta& meta, Oriel_ClusterSubject subject, const _VondOrielMetaArray& scores) {
    const uint32_t size = VondOrielGetSerializedSize(meta);
    Bytes b(size);
    uint32_t written = 0;
    const _VondResult r = VondOrielSerialize(meta, subject, scores, b.data(), size, written);
    EXPECT_EQ(r.status, 0u);
    EXPECT_STREQ(r.function, "VondOrielSerialize");
    EXPECT_EQ(written, size);
    return b;
}

struct TwoFaces {
    Owner faces;
    _VondOrielScore pairs[2] = {{0.9f, 0.1f}, {0.75f, 0.5f}};
    _VondOrielMetaArray scores = {2, pairs};
    TwoFaces() { facemeta::FillTwoFaces(faces); }
    Bytes Serialized() { return Serialize(faces.meta, 0x10203, scores); }
};

TEST(VondOrielMetaTest, SectionWithoutFacesIs102Bytes) {
    _FaceMeta meta;
    std::memset(static_cast<void*>(&meta), 0, sizeof meta);
    meta.formatVersion = OFM_FORMAT_VERSION_CURRENT;
    const _VondOrielMetaArray none = {0, nullptr};
    meta.headerValue = 1.5f;
    Bytes b = Serialize(meta, 0, none);
    ASSERT_EQ(b.size(), 102u);
    EXPECT_EQ(Bytes(b.begin(), b.begin() + 8), Bytes(8, 0));
    EXPECT_EQ(Get32(b, 8), 0x4D4D005Eu);
    EXPECT_EQ(b[12] << 8 | b[13], 259);  // version
    EXPECT_EQ(Get32(b, 8 + 72), 0x3FC00000u);  // headerValue
    Bytes rest(b.begin() + 8 + 6, b.end());  // zero here but for headerValue: no date, bitmaps, E or F
    rest[72 - 6] = rest[73 - 6] = 0;
    EXPECT_EQ(rest, Bytes(rest.size(), 0));

    b.resize(130, 0xEE);  // the quality section follows
    Section s;
    const _VondResult r = s.Parse(b, b.size());
    EXPECT_EQ(r.status, 0u);
    EXPECT_STREQ(r.function, "VondOrielParse");
    EXPECT_EQ(r.message, nullptr);
    EXPECT_EQ(s.consumed, 102u);
    EXPECT_EQ(V(s.meta.formatVersion), 259u);
    EXPECT_EQ(V(s.meta.headerValue), 1.5f);
    EXPECT_EQ(V(s.meta.regionCount), 0u);
}

TEST(VondOrielMetaTest, RoundTripsTwoFaces) {
    TwoFaces in;
    const Bytes b = in.Serialized();
    ASSERT_EQ(b.size(), 8u + 16 + 94 + 2 * 369);
    EXPECT_EQ(Get32(b, 0), 0x10203u);
    EXPECT_EQ(Get32(b, 4), 2u);
    EXPECT_EQ(Get32(b, 8), facemeta::BitsOf(0.9f));
    EXPECT_EQ(Get32(b, 20), facemeta::BitsOf(0.5f));

    Section s;
    ASSERT_EQ(s.Parse(b, b.size()).status, 0u);
    EXPECT_EQ(s.consumed, b.size());
    EXPECT_EQ(s.subject, 0x10203u);
    ASSERT_EQ(s.scores.count, 2u);
    EXPECT_EQ(s.scores.pScores[1].detectionScore, 0.75f);
    EXPECT_EQ(s.scores.pScores[1].blurScore, 0.5f);
    facemeta::ExpectSameFaceMeta(in.faces.meta, s.meta);
    EXPECT_EQ(Serialize(s.meta, s.subject, s.scores), b);
}

TEST(VondOrielMetaTest, ParseRefusesTruncatedAndCorruptSections) {
    const Bytes good = TwoFaces().Serialized();
    for (size_t len = 0; len < good.size(); ++len) {
        SCOPED_TRACE(len);
        Section s;
        EXPECT_EQ(s.Parse(good, len).status, 3u);
        s.ExpectEmpty();
    }

    const size_t ofm = 24;  // after subject, count and two score pairs
    struct Row {
        const char* name;
        std::function<void(Bytes&)> corrupt;
        const char* message;
    };
    const Row rows[] = {
        {"score count beyond the buffer", [](Bytes& b) { b[4] = b[5] = b[6] = b[7] = 0xFF; },
         "Read buffer size is too small."},
        {"unknown OFM version", [=](Bytes& b) { b[ofm + 4] = 0; }, "OFM_GetOfmHeader() failed"},
        {"fewer faces than scores", [=](Bytes& b) { b[ofm + 49] = 1; }, "metaArray.count != faceNum"},
        {"attribute length below its field", [=](Bytes& b) { b[ofm + 94 + 84 + 1] = 1; }, "OFM_GetOfmSize() failed"},
        {"entries marked little-endian", [=](Bytes& b) { b[ofm] = b[ofm + 1] = 'I'; }, "OFM_ParseOfmData() failed"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        Bytes b = good;
        row.corrupt(b);
        Section s;
        const _VondResult r = s.Parse(b, b.size());
        EXPECT_EQ(r.status, 3u);
        EXPECT_STREQ(r.message, row.message);
        s.ExpectEmpty();
    }
    Section s;
    EXPECT_EQ(VondOrielParse(nullptr, 100, s.meta, s.subject, s.scores, s.consumed).status, 1u);
}

TEST(VondOrielMetaTest, SerializeChecksBufferAndScores) {
    TwoFaces in;
    const uint32_t size = VondOrielGetSerializedSize(in.faces.meta);
    struct Row {
        uint32_t bufSize, count, status;
        const char* message;
    };
    const Row rows[] = {{3, 2, 2, "Buffer size is not correctly allocated."},
                        {20, 2, 2, "Buffer size is not correctly allocated."},
                        {size - 1, 2, 3, "OFM_SerializeOfm() failed"},
                        {size, 1, 3, "metaArray.count != faceMeta.regionCount"}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.bufSize);
        Bytes b(size);
        uint32_t written = 7;
        const _VondOrielMetaArray scores = {row.count, in.pairs};
        const _VondResult r = VondOrielSerialize(in.faces.meta, 1, scores, b.data(), row.bufSize, written);
        EXPECT_EQ(r.status, row.status);
        EXPECT_STREQ(r.message, row.message);
        EXPECT_EQ(written, 0u);
    }
    in.faces.meta.faceNum = 1;  // not a serialisable meta: no size
    EXPECT_EQ(VondOrielGetSerializedSize(in.faces.meta), 0u);
}

TEST(VondOrielMetaTest, ParseReportsEveryAllocationFailure) {
    TwoFaces in;
    const Bytes good = in.Serialized();
    Section s;
    _VondResult r{};
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] { r = s.Parse(good, good.size()); },
        [&](long n, bool triggered) {
            SCOPED_TRACE(n);
            if (triggered) {
                EXPECT_EQ(r.status, 2u);
                EXPECT_STREQ(r.message, "VOND_NEW failed");
                s.ExpectEmpty();
                return;
            }
            EXPECT_EQ(r.status, 0u);
            facemeta::ExpectSameFaceMeta(in.faces.meta, s.meta);
        });
    EXPECT_EQ(allocations, 8);  // scores, regions, three lists per face
}

TEST(VondOrielMetaTest, DumpPrintsEveryField) {
    Owner o;
    o.Allocate(1, 1);
    _FaceRegion& r = o[0];
    r.faceArea = zbm_Rect{1, 2, 3, 4};
    r.leftEye = zbm_Pos{5, 6};
    r.rightEye = zbm_Pos{7, 8};
    r.orientation = 1;
    r.rotation[0] = 0.5f;  // yaw
    r.rotation[1] = 0.25f;
    r.rotation[2] = 0.125f;  // roll
    r.ageMin = 20;
    r.ageMax = 30;
    r.pAttributes[0] = 1;
    r.pAttributes[1] = 80;
    std::memcpy(r.featureType, "PDEC_C2_LONGTYPE", 16);  // fills the field: no terminator
    _VondOrielScore pair = {0.75f, 0.5f};
    testing::internal::CaptureStdout();
    VondOrielDump(o.meta, 0x10001, _VondOrielMetaArray{1, &pair});
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "\n*** VondOrielDump() ***\n"
              "subject : 65537\n"
              "faceNum : 1\n"
              "cnt  : 0\n"
              "face area : x=1, y=2, w=3, h=4\n"
              "left  eye : x=5, y=6\n"
              "right eye : x=7, y=8\n"
              "left  mouth end : x=-1, y=-1\n"
              "right mouth end : x=-1, y=-1\n"
              "orientation : 1\n"
              "rotation : 0.125000 0.250000 0.500000\n"
              "age : min=20, max=30\n"
              "attribute : id=1, score=80\n"
              "feature : size=0 type=PDEC_C2_LONGTYPE\n"
              "blurScore: 0.500000\n"
              "detectionScore: 0.750000\n"
              "\n\n");
}

TEST(VondOrielMetaTest, SeedCorpusMatchesTheWriter) {
    _FaceMeta empty;
    std::memset(static_cast<void*>(&empty), 0, sizeof empty);
    empty.formatVersion = OFM_FORMAT_VERSION_CURRENT;
    facemeta::ExpectSeed("vond_oriel_parse", "two_faces.bin", TwoFaces().Serialized());
    facemeta::ExpectSeed("vond_oriel_parse", "no_faces.bin", Serialize(empty, 0, _VondOrielMetaArray{0, nullptr}));
}

}  // namespace
