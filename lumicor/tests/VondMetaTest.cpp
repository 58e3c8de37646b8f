// The photo meta blob: round trip of the hand-made meta, header and footer
// layout, section sizes, refused blobs, the writer's own guards, the dump, the
// committed fuzz seeds and allocation failures.
#include "lumicor/src/driver/vond_meta_sections.h"
#include "testkit/fault.h"
#include "testkit/meta_builder.h"
#include "testkit/temp_dir.h"

#include <lumicor/vond.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

using lumicor::test::BuildEmptyMeta;
using lumicor::test::BuildHandMadeMeta;
using lumicor::test::IsZeroMeta;
using lumicor::test::MetaEqual;

// A _VondMeta that is disposed when the test ends.
struct Meta {
    _VondMeta m;
    Meta() { std::memset(&m, 0, sizeof m); }
    ~Meta() { VondDisposeMeta(&m); }
};

std::vector<uint8_t> Serialize(const _VondMeta& meta) {
    uint32_t size = 0;
    _VondResult r = VondGetSerializedSize(&meta, &size);
    EXPECT_EQ(r.status, 0u) << r.function << ": " << (r.message ? r.message : "");
    std::vector<uint8_t> blob(size);
    r = VondSerializeMeta(&meta, size, blob.data());
    EXPECT_EQ(r.status, 0u) << r.function << ": " << (r.message ? r.message : "");
    return blob;
}

uint32_t Be32(const std::vector<uint8_t>& b, size_t at) {
    return uint32_t(b[at]) << 24 | uint32_t(b[at + 1]) << 16 | uint32_t(b[at + 2]) << 8 | b[at + 3];
}

std::vector<uint8_t> HandMadeBlob() {
    Meta meta;
    EXPECT_TRUE(BuildHandMadeMeta(&meta.m));
    return Serialize(meta.m);
}

TEST(VondMetaTest, HandMadeMetaRoundTripsToAnEqualRecordAndIdenticalBytes) {
    Meta original;
    ASSERT_TRUE(BuildHandMadeMeta(&original.m));
    const std::vector<uint8_t> blob = Serialize(original.m);
    ASSERT_GT(blob.size(), 32u);

    Meta parsed;
    const _VondResult r = VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &parsed.m);
    ASSERT_EQ(r.status, 0u) << r.function << ": " << r.message;
    EXPECT_STREQ(r.function, "VondParseMeta");
    EXPECT_EQ(r.message, nullptr);
    std::string why;
    EXPECT_TRUE(MetaEqual(original.m, parsed.m, &why)) << why;
    EXPECT_EQ(Serialize(parsed.m), blob);
}

TEST(VondMetaTest, HeaderAndFooterLayout) {
    Meta meta;
    ASSERT_TRUE(BuildHandMadeMeta(&meta.m));
    const std::vector<uint8_t> blob = Serialize(meta.m);
    ASSERT_GE(blob.size(), 32u);
    const uint8_t header[28] = {'V', 'O', 'N', 'D', 0, 0, 0, 0, 1, 5, 8, 0, 0x13, 0x12, 0x17, 0x00,
                                0, 0, 0, 7, 0x3F, 0x80, 0, 0, 0, 0x01, 0x2C, 0x00};
    EXPECT_EQ(Be32(blob, 4), blob.size());
    EXPECT_EQ(std::memcmp(blob.data(), header, 4), 0);
    EXPECT_EQ(std::memcmp(blob.data() + 8, header + 8, 20), 0);
    EXPECT_EQ(std::memcmp(blob.data() + blob.size() - 4, "DNOV", 4), 0);

    // The sections follow each other with the sizes their glue announces.
    const uint32_t f = VondOrielGetSerializedSize(meta.m.faceMeta);
    const uint32_t q = VondKtLibGetSerializedSize(meta.m.similarity, meta.m.representative, meta.m.colorLabel);
    const uint32_t a = VondCALibGetSerializedSize(meta.m.attentionAreas);
    EXPECT_EQ(blob.size(), 32u + f + q + a);
    EXPECT_EQ(Be32(blob, 28), 0x20003u);  // cluster subject opens the face section
    EXPECT_EQ(std::memcmp(blob.data() + 28 + f, "SIML", 4), 0);
    EXPECT_EQ(std::memcmp(blob.data() + 28 + f + q, "CALib 2.1.0", 11), 0);
}

TEST(VondMetaTest, EmptyMetaHasMinimalFaceAndAttentionSections) {
    Meta meta;
    ASSERT_TRUE(BuildEmptyMeta(&meta.m));
    EXPECT_EQ(VondOrielGetSerializedSize(meta.m.faceMeta), 102u);
    EXPECT_EQ(VondCALibGetSerializedSize(meta.m.attentionAreas), 22u);
    const uint32_t q = VondKtLibGetSerializedSize(meta.m.similarity, meta.m.representative, meta.m.colorLabel);
    EXPECT_EQ(q, 676u + 16u + 44u + 32u);
    uint32_t size = 0;
    ASSERT_EQ(VondGetSerializedSize(&meta.m, &size).status, 0u);
    EXPECT_EQ(size, 32u + 102u + q + 22u);

    const std::vector<uint8_t> blob = Serialize(meta.m);
    Meta parsed;
    ASSERT_EQ(VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &parsed.m).status, 0u);
    std::string why;
    EXPECT_TRUE(MetaEqual(meta.m, parsed.m, &why)) << why;
}

TEST(VondMetaTest, OlderMetaVersionsAreReadWithTheSameSectionReaders) {
    for (uint8_t version : {6, 7, 8}) {
        SCOPED_TRACE(static_cast<int>(version));
        std::vector<uint8_t> blob = HandMadeBlob();
        blob[10] = version;
        Meta parsed;
        ASSERT_EQ(VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &parsed.m).status, 0u);
        EXPECT_EQ(parsed.m.version.metaVersion, version);
        EXPECT_EQ(parsed.m.faceMeta.regionCount, 2u);
        EXPECT_EQ(Serialize(parsed.m), blob);  // the version read is the version written
    }
}

TEST(VondMetaTest, ParseRefusesBrokenBlobs) {
    const std::vector<uint8_t> good = HandMadeBlob();
    ASSERT_GT(good.size(), 40u);
    struct Case {
        const char* name;
        void (*edit)(std::vector<uint8_t>&);
        uint32_t status;
        const char* message;
    };
    const Case cases[] = {
        {"empty buffer", [](std::vector<uint8_t>& b) { b.clear(); }, 1, "bufSize == 0 || pBuf == NULL"},
        {"shorter than header and footer", [](std::vector<uint8_t>& b) { b.resize(31); }, 3,
         "getSerializedHeaderFooterSize() > bufSize"},
        {"first byte changed", [](std::vector<uint8_t>& b) { b[0] = 'W'; }, 3, "invalid signature at the begining"},
        {"last byte changed", [](std::vector<uint8_t>& b) { b.back() ^= 1; }, 3, "invalid signature at the end"},
        {"truncated by one byte", [](std::vector<uint8_t>& b) { b.pop_back(); }, 3, "bufSize < totalSize"},
        {"total size below header and footer",
         [](std::vector<uint8_t>& b) {
             b[4] = b[5] = b[6] = 0;
             b[7] = 2;
         },
         3, "getSerializedHeaderFooterSize() > totalSize"},
        {"meta version 5", [](std::vector<uint8_t>& b) { b[10] = 5; }, 4, "invalid meta version"},
        {"meta version 9", [](std::vector<uint8_t>& b) { b[10] = 9; }, 4, "invalid meta version"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        std::vector<uint8_t> blob = good;
        c.edit(blob);
        Meta parsed;
        const _VondResult r =
            VondParseMeta(static_cast<uint32_t>(blob.size()), blob.empty() ? nullptr : blob.data(), &parsed.m);
        EXPECT_EQ(r.status, c.status);
        EXPECT_STREQ(r.message, c.message);
        EXPECT_STREQ(r.function, "VondParseMeta");
        _VondVersion seen = parsed.m.version;
        if (c.status == VOND_STATUS_UNSUPPORTED_VERSION) {
            // Only the version read survives, so a caller can report it.
            EXPECT_EQ(seen.metaVersion, blob[10]);
            EXPECT_EQ(seen.major, 1);
            EXPECT_EQ(seen.build, 0x13121700u);
            std::memset(&parsed.m.version, 0, sizeof parsed.m.version);
        }
        EXPECT_TRUE(IsZeroMeta(parsed.m));
    }
}

TEST(VondMetaTest, SerializeIntoATooSmallBufferLeavesItZeroed) {
    Meta meta;
    ASSERT_TRUE(BuildHandMadeMeta(&meta.m));
    uint32_t size = 0;
    ASSERT_EQ(VondGetSerializedSize(&meta.m, &size).status, 0u);

    std::vector<uint8_t> buf(size - 1, 0xAA);
    _VondResult r = VondSerializeMeta(&meta.m, size - 1, buf.data());
    EXPECT_EQ(r.status, 3u);
    EXPECT_STREQ(r.message, "bufSize < totalSize");
    EXPECT_EQ(buf, std::vector<uint8_t>(size - 1, 0));

    // A null argument leaves the buffer as it was.
    std::vector<uint8_t> untouched(16, 0xAA);
    r = VondSerializeMeta(nullptr, 16, untouched.data());
    EXPECT_EQ(untouched, std::vector<uint8_t>(16, 0xAA));

    // A larger buffer is fine: the blob is written at its start.
    std::vector<uint8_t> larger(size + 10, 0xAA);
    ASSERT_EQ(VondSerializeMeta(&meta.m, size + 10, larger.data()).status, 0u);
    EXPECT_EQ(std::vector<uint8_t>(larger.begin(), larger.begin() + size), Serialize(meta.m));
}

TEST(VondMetaTest, SerializeFailsWithTheSectionThatCannotBeSized) {
    Meta meta;
    ASSERT_TRUE(BuildEmptyMeta(&meta.m));
    meta.m.attentionAreas.numAreas = 0xFFFFFFFFu;  // 22 + 17 n overflows
    uint32_t size = 7;
    _VondResult r = VondGetSerializedSize(&meta.m, &size);
    EXPECT_EQ(r.status, 3u);
    EXPECT_STREQ(r.message, "VondCALibGetSerializedSize() failed");
    EXPECT_EQ(size, 0u);
    std::vector<uint8_t> buf(2048, 0xAA);
    r = VondSerializeMeta(&meta.m, 2048, buf.data());
    EXPECT_EQ(r.status, 3u);
    EXPECT_STREQ(r.message, "VondCALibGetSerializedSize() failed");
    EXPECT_EQ(buf, std::vector<uint8_t>(2048, 0));
    meta.m.attentionAreas.numAreas = 0;
}

// Section writers with deliberate faults, to show the blob writer's guards.
uint32_t Size22(const _VondMeta&) { return 22; }
uint32_t Size0(const _VondMeta&) { return 0; }
_VondResult Writes22(const _VondMeta&, uint8_t* p, uint32_t, uint32_t& written) {
    std::memset(p, 0x11, 22);
    written = 22;
    return _VondResult{0, "test", nullptr};
}
_VondResult WritesPastItsSize(const _VondMeta&, uint8_t* p, uint32_t, uint32_t& written) {
    std::memset(p, 0x11, 24);  // two bytes more than announced, ignoring the buffer size
    written = 22;
    return _VondResult{0, "test", nullptr};
}
_VondResult ReportsTooFew(const _VondMeta&, uint8_t* p, uint32_t, uint32_t& written) {
    std::memset(p, 0x11, 21);
    written = 21;
    return _VondResult{0, "test", nullptr};
}
_VondResult Refuses(const _VondMeta&, uint8_t*, uint32_t, uint32_t& written) {
    written = 0;
    return _VondResult{3, "SectionUnderTest", "refused"};
}

TEST(VondMetaTest, WriterGuardsAgainstFaultySections) {
    struct Case {
        const char* name;
        vond::MetaSectionWriter attention;
        const char* function;
        const char* message;
    };
    const Case cases[] = {
        {"writes past its size", {Size22, WritesPastItsSize, "size failed"}, "VondSerializeMeta",
         "*pWriteBufPtr != SIGNATURE[i]"},
        {"reports fewer bytes", {Size22, ReportsTooFew, "size failed"}, "VondSerializeMeta",
         "serializedSize != wroteSize"},
        {"section refuses", {Size22, Refuses, "size failed"}, "SectionUnderTest", "refused"},
        {"section cannot be sized", {Size0, Writes22, "attention size failed"}, "VondGetSerializedSize",
         "attention size failed"},
    };
    const vond::MetaSections& real = vond::DefaultSections();
    Meta meta;
    ASSERT_TRUE(BuildHandMadeMeta(&meta.m));
    const uint32_t size = 32u + VondOrielGetSerializedSize(meta.m.faceMeta) +
                          VondKtLibGetSerializedSize(meta.m.similarity, meta.m.representative, meta.m.colorLabel) + 22u;
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        const vond::MetaSections sections = {real.face, real.quality, c.attention};
        std::vector<uint8_t> buf(size, 0xAA);
        const _VondResult r = vond::SerializeMetaWith(sections, &meta.m, size, buf.data());
        EXPECT_EQ(r.status, 3u);
        EXPECT_STREQ(r.function, c.function);
        EXPECT_STREQ(r.message, c.message);
        EXPECT_EQ(buf, std::vector<uint8_t>(size, 0));
    }
    // With a correct attention writer the same table produces a valid blob.
    const vond::MetaSections good = {real.face, real.quality, {Size22, Writes22, "size failed"}};
    std::vector<uint8_t> buf(size);
    ASSERT_EQ(vond::SerializeMetaWith(good, &meta.m, size, buf.data()).status, 0u);
    EXPECT_EQ(std::memcmp(buf.data() + size - 4, "DNOV", 4), 0);
}

TEST(VondMetaTest, DumpPrintsEverySection) {
    Meta meta;
    ASSERT_TRUE(BuildHandMadeMeta(&meta.m));
    testing::internal::CaptureStdout();
    const _VondResult r = VondDumpMeta(&meta.m);
    std::fflush(stdout);
    const std::string out = testing::internal::GetCapturedStdout();
    EXPECT_EQ(r.status, 0u);
    const char* expected[] = {
        // face section
        "\n*** VondOrielDump() ***\n", "subject : 131075\n", "faceNum : 2\n", "cnt  : 0\n", "cnt  : 1\n",
        "face area : x=400, y=300, w=320, h=320\n", "face area : x=1100, y=500, w=200, h=210\n",
        "left  eye : x=620, y=402\n", "right eye : x=480, y=400\n", "left  mouth end : x=-1, y=-1\n",
        "orientation : 1\n", "age : min=20, max=29\n", "attribute : id=1, score=40\n",
        "attribute : id=2, score=15\n", "feature : size=255 type=PDEC_C2\n", "blurScore: 0.062500\n",
        "detectionScore: 0.875000\n",
        // quality section
        "\n*** VondKtLibDump() ***\n", "[KtMetaSimilarity]", "[KtMetaRepresentative]", "[KtMetaColorLabel]",
        "\t color variation = 0.250\n", "\t numFinger       = 2\n", "\t mapWidth        = 20\n",
        // attention section
        "\n*** VondCALibDump() ***\nisFace = false\nnumAreas = 4\n", "\t saliency = 255\n", "\t saliency = 12\n",
    };
    for (const char* line : expected) EXPECT_NE(out.find(line), std::string::npos) << "missing: " << line;
    // Sections in the order face, quality, attention.
    EXPECT_LT(out.find("VondOrielDump"), out.find("VondKtLibDump"));
    EXPECT_LT(out.find("VondKtLibDump"), out.find("VondCALibDump"));
}

// The fuzz target's seeds are blobs of this library: they must stay readable
// and round-trip, so a format change shows here and not only in the fuzzer.
TEST(VondMetaTest, CommittedFuzzSeedsParseAndRoundTrip) {
    // Named rather than listed: directory listings are unreliable for 32-bit
    // programs under qemu on large-hash file systems.
    const std::string dir = std::string(LUMICOR_SOURCE_DIR) + "/fuzz/corpus/vond_parse_meta/";
    for (const char* name : {"handmade.lmeta", "empty.lmeta", "face_areas.lmeta", "meta_v6.lmeta"}) {
        SCOPED_TRACE(name);
        const std::string bytes = lumicor::test::ReadFileBytes(dir + name);
        const std::vector<uint8_t> blob(bytes.begin(), bytes.end());
        ASSERT_FALSE(blob.empty());
        Meta parsed;
        const _VondResult r = VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &parsed.m);
        ASSERT_EQ(r.status, 0u) << r.function << ": " << r.message;
        EXPECT_EQ(Serialize(parsed.m), blob);
    }
    // The hand-made meta is written the same on every architecture and by
    // every build since the seed was made.
    const std::string stored = lumicor::test::ReadFileBytes(dir + "handmade.lmeta");
    EXPECT_EQ(std::vector<uint8_t>(stored.begin(), stored.end()), HandMadeBlob());
}

// Every allocation of serialise and parse failed in turn: each call reports
// its failure, a failed parse leaves a zeroed record, a failed serialisation
// an all-zero buffer, and nothing leaks (checked under the asan preset).
TEST(VondMetaTest, EveryAllocationFailureIsReported) {
    Meta meta;
    ASSERT_TRUE(BuildHandMadeMeta(&meta.m));
    const std::vector<uint8_t> blob = Serialize(meta.m);

    uint32_t size = 0;
    _VondResult r{};
    std::vector<uint8_t> out(blob.size());
    const long writeAllocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            r = VondGetSerializedSize(&meta.m, &size);
            if (r.status == 0) r = VondSerializeMeta(&meta.m, size, out.data());
        },
        [&](long n, bool triggered) {
            SCOPED_TRACE(n);
            if (!triggered) {
                EXPECT_EQ(r.status, 0u);
                EXPECT_EQ(out, blob);
                return;
            }
            EXPECT_TRUE(r.status == VOND_STATUS_OUT_OF_MEMORY || r.status == VOND_STATUS_FAILED) << r.status;
            EXPECT_EQ(out, std::vector<uint8_t>(out.size(), 0));
        });
    EXPECT_GE(writeAllocations, 0);

    _VondMeta parsed;
    const long readAllocations = lumicor::test::ForEachAllocationFailure(
        [&] { r = VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &parsed); },
        [&](long n, bool triggered) {
            SCOPED_TRACE(n);
            if (!triggered) {
                ASSERT_EQ(r.status, 0u);
                std::string why;
                EXPECT_TRUE(MetaEqual(meta.m, parsed, &why)) << why;
                VondDisposeMeta(&parsed);
                return;
            }
            EXPECT_TRUE(r.status == VOND_STATUS_OUT_OF_MEMORY || r.status == VOND_STATUS_FAILED)
                << r.status << " " << r.function << ": " << (r.message ? r.message : "");
            EXPECT_TRUE(IsZeroMeta(parsed));
            VondDisposeMeta(&parsed);
        });
    // The hand-made blob holds regions, buffers, scores, Kt records and areas.
    EXPECT_GT(readAllocations, 5);
}

}  // namespace
