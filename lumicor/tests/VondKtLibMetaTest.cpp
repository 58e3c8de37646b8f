// The quality section of the photo meta: three Kt frames back to back.
#include <gtest/gtest.h>

#include <lumicor/vond.h>

#include "testkit/fault.h"
#include "testkit/kt_meta_samples.h"

#include <cstring>
#include <string>
#include <vector>

using lumicor::test::Printed;
using lumicor::test::SampleRepresentative;
using Bytes = std::vector<uint8_t>;

namespace {

// The quality part of a _VondMeta.
struct Quality {
    _KtEngineVersion simlEngine, repmEngine, clblEngine;
    _KtMetaVersion simlMeta, repmMeta, clblMeta;
    _KtMetaSimilarity similarity;
    _KtMetaRepresentative representative;
    _KtMetaColorLabel colorLabel;

    Quality() { std::memset(static_cast<void*>(this), 0, sizeof *this); }

    _VondResult Serialize(Bytes& buf, uint32_t size, uint32_t& written) const {
        return VondKtLibSerialize(simlEngine, simlMeta, similarity, repmEngine, repmMeta, representative, clblEngine,
                                  clblMeta, colorLabel, buf.data(), size, written);
    }
    _VondResult Parse(const Bytes& buf, uint32_t size, uint32_t& consumed) {
        return VondKtLibParse(buf.data(), size, simlEngine, simlMeta, similarity, repmEngine, repmMeta,
                              representative, clblEngine, clblMeta, colorLabel, consumed);
    }
    uint32_t Size() const { return VondKtLibGetSerializedSize(similarity, representative, colorLabel); }
};

// A filled quality part whose representative points at `repm`'s arrays.
Quality Sample(const SampleRepresentative& repm) {
    Quality q;
    KtSimlGetVersion(&q.simlMeta, &q.simlEngine);
    KtRepmGetVersion(&q.repmMeta, &q.repmEngine);
    KtClblGetVersion(&q.clblMeta, &q.clblEngine);
    q.simlMeta.minor = 3;  // carried, never interpreted
    q.similarity = lumicor::test::SampleSimilarity();
    q.representative = repm.meta;
    q.colorLabel = lumicor::test::SampleColorLabel();
    return q;
}

Bytes Section(const Quality& q) {
    Bytes buf(q.Size());
    uint32_t written = 0;
    EXPECT_EQ(q.Serialize(buf, static_cast<uint32_t>(buf.size()), written).status, VOND_STATUS_OK);
    EXPECT_EQ(written, buf.size());
    return buf;
}

}  // namespace

TEST(VondKtLibMetaTest, SectionRoundTrip) {
    SampleRepresentative repm(2, 3, 2);
    const Quality q = Sample(repm);
    ASSERT_EQ(q.Size(), 676u + (16 + 44 + 24 + 12 + 6) + 32);

    Bytes buf(q.Size() + 7, 0xAA);  // the spare bytes stand for the attention section
    uint32_t written = 0;
    const _VondResult w = q.Serialize(buf, static_cast<uint32_t>(buf.size()), written);
    ASSERT_EQ(w.status, VOND_STATUS_OK);
    ASSERT_EQ(written, q.Size());
    EXPECT_EQ(buf[written], 0xAA);

    Quality back;
    uint32_t consumed = 0;
    const _VondResult r = back.Parse(buf, static_cast<uint32_t>(buf.size()), consumed);
    ASSERT_EQ(r.status, VOND_STATUS_OK);
    EXPECT_EQ(consumed, written);
    EXPECT_EQ(back.simlMeta.minor, 3);
    EXPECT_EQ(back.repmEngine.minor, 5);
    EXPECT_EQ(back.clblEngine.build, 0x13121700u);
    EXPECT_EQ(0, std::memcmp(&back.similarity, &q.similarity, sizeof q.similarity));
    EXPECT_EQ(0, std::memcmp(&back.colorLabel, &q.colorLabel, sizeof q.colorLabel));
    EXPECT_TRUE(lumicor::test::SameRepresentative(back.representative, q.representative));
    EXPECT_NE(back.representative.pBlurMap, repm.meta.pBlurMap);  // its own copy
    EXPECT_EQ(Section(back), Bytes(buf.begin(), buf.begin() + written));

    VondKtlibDisposeMeta(back.similarity, back.representative, back.colorLabel);
    EXPECT_EQ(back.representative.pFingers, nullptr);
    EXPECT_EQ(back.representative.numFinger, 0u);
}

TEST(VondKtLibMetaTest, SerializeFailures) {
    SampleRepresentative repm(1, 1, 1), eleven(11, 0, 0);
    Quality q = Sample(repm);
    const uint32_t size = q.Size();
    Bytes buf(size, 0);
    uint32_t written = 99;
    _VondResult r = q.Serialize(buf, size - 1, written);
    EXPECT_EQ(r.status, VOND_STATUS_INVALID_PARAMETER);
    EXPECT_STREQ(r.message, "bufSize < simlSize + repmSize + clblSize");
    EXPECT_EQ(written, 0u);

    q.repmMeta.major = 1;  // the legacy format cannot be written
    testing::internal::CaptureStderr();
    r = q.Serialize(buf, size, written);
    testing::internal::GetCapturedStderr();
    EXPECT_EQ(r.status, VOND_STATUS_FAILED);
    EXPECT_STREQ(r.message, "KtRempSerialize() failed");

    q.representative = eleven.meta;
    EXPECT_EQ(q.Size(), 0u);
    r = q.Serialize(buf, size, written);
    EXPECT_EQ(r.status, VOND_STATUS_FAILED);
    EXPECT_STREQ(r.message,
                 "KtSimlGetSerializedSize() or KtRepmGetSerializedSize() or KtClblGetSerializedSize() failed");
}

TEST(VondKtLibMetaTest, ParseFailuresNameTheFrameAndReleaseCopies) {
    SampleRepresentative repm(2, 2, 2);
    const Bytes good = Section(Sample(repm));
    const uint32_t n = static_cast<uint32_t>(good.size());
    const struct {
        size_t corruptAt;  // signature byte of the frame to spoil
        uint32_t length;
        const char* message;
    } rows[] = {{0, n, "KtSimlParse() failed"},
                {676, n, "KtRepmParse() failed"},
                {n - 32, n, "KtClblParse() failed"},
                {n, n - 1, "KtClblParse() failed"},  // buffer ends inside the last frame
                {n, 676 + 16, "KtRepmParse() failed"}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.message);
        Bytes bad = good;
        if (row.corruptAt < n) bad[row.corruptAt] ^= 0x20;
        Quality q;
        uint32_t consumed = 0;
        const _VondResult r = q.Parse(bad, row.length, consumed);
        EXPECT_EQ(r.status, VOND_STATUS_FAILED);
        EXPECT_STREQ(r.function, "VondKtLibParse");
        EXPECT_STREQ(r.message, row.message);
        EXPECT_EQ(q.representative.pFingers, nullptr);
        EXPECT_EQ(q.representative.pBlurMap, nullptr);
    }

    // A version 1 representative frame reads inside a section.
    const Bytes legacy = lumicor::test::MakeFrame("REPM", 1, 0, 16, Bytes(16, 0x80));
    Bytes mixed(good.begin(), good.begin() + 676);
    mixed.insert(mixed.end(), legacy.begin(), legacy.end());
    mixed.insert(mixed.end(), good.end() - 32, good.end());
    Quality q;
    uint32_t consumed = 0;
    ASSERT_EQ(q.Parse(mixed, static_cast<uint32_t>(mixed.size()), consumed).status, VOND_STATUS_OK);
    EXPECT_EQ(consumed, mixed.size());
    EXPECT_EQ(q.repmMeta.major, 1);
    EXPECT_EQ(q.representative.motionBlur, -1.0f);
}

TEST(VondKtLibMetaTest, ParseReportsEachFailedAllocation) {
    SampleRepresentative repm(2, 4, 4);
    const Bytes buf = Section(Sample(repm));
    Quality q;
    _VondResult r = {};
    uint32_t consumed = 0;
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            q = Quality();
            r = q.Parse(buf, static_cast<uint32_t>(buf.size()), consumed);
        },
        [&](long n, bool triggered) {
            if (triggered) {
                EXPECT_EQ(r.status, VOND_STATUS_OUT_OF_MEMORY) << n;
                EXPECT_STREQ(r.function, "VondKtLibParse");
                EXPECT_EQ(q.representative.pFingers, nullptr) << n;
                EXPECT_EQ(q.representative.pBlurMap, nullptr) << n;
            } else {
                EXPECT_EQ(r.status, VOND_STATUS_OK);
                VondKtlibDisposeMeta(q.similarity, q.representative, q.colorLabel);
            }
        });
    // Three library records, the library's representative arrays (fingers,
    // two point arrays, map) and the glue's copies of them.
    EXPECT_EQ(allocations, 3 + 4 + 4);
}

TEST(VondKtLibMetaTest, DumpPrintsTheThreeMetasInOrder) {
    SampleRepresentative repm(1, 2, 1);
    const Quality q = Sample(repm);
    testing::internal::CaptureStdout();
    VondKtLibDump(q.similarity, q.representative, q.colorLabel);
    const std::string out = testing::internal::GetCapturedStdout();
    const std::string expected = "\n*** VondKtLibDump() ***\n" +
                                 Printed([&](FILE* f) { KtSimlDump(&q.similarity, f); }) +
                                 Printed([&](FILE* f) { KtRepmDump(&q.representative, f); }) +
                                 Printed([&](FILE* f) { KtClblDump(&q.colorLabel, f); });
    EXPECT_EQ(out, expected);
}

namespace {

// The quality records of one analysis, released with the test.
struct KtAnalysis {
    _VondMeta m;
    KtAnalysis() { std::memset(&m, 0, sizeof m); }
    ~KtAnalysis() { VondDisposeMeta(&m); }
    _VondResult Run(const _zbm_Image* image) {
        return VondKtLibAnalyze(image, m.simlEngineVersion, m.simlMetaVersion, m.similarity, m.repmEngineVersion,
                                m.repmMetaVersion, m.representative, m.clblEngineVersion, m.clblMetaVersion,
                                m.colorLabel);
    }
};

ZbmImagePtr Gradient(int w, int h, _zbm_PixelOrder order) {
    ZbmImagePtr image(ZbiuCreate(w, h, order));
    for (int y = 0; image && y < h; ++y)
        for (int x = 0; x < w; ++x) {
            uint8_t* p = ZbiuGetPointer(image.get(), x, y);
            p[0] = static_cast<uint8_t>(x * 255 / w);
            p[1] = static_cast<uint8_t>(y * 255 / h);
            p[2] = static_cast<uint8_t>((x ^ y) & 0xFF);
        }
    return image;
}

}  // namespace

TEST(VondKtLibMetaTest, AnalyzeOnTheWorkingImageAndItsSmallCopy) {
    ZbmImagePtr bgr = Gradient(320, 240, ZBM_PIXEL_ORDER_BGR);
    KtAnalysis refused;
    _VondResult r = refused.Run(bgr.get());
    EXPECT_EQ(r.status, VOND_STATUS_INVALID_PARAMETER);
    EXPECT_STREQ(r.function, "VondKtLibAnalyze");
    EXPECT_STREQ(r.message, "invalid pImage->order");

    // A 640 x 480 working image: the similarity is made from 160 x 120, the
    // quality from the whole image, the colour labels from the similarity.
    ZbmImagePtr rgb = Gradient(640, 480, ZBM_PIXEL_ORDER_RGB);
    KtAnalysis a;
    r = a.Run(rgb.get());
    ASSERT_EQ(r.status, VOND_STATUS_OK) << r.message;
    EXPECT_EQ(a.m.similarity.width, 160);
    EXPECT_EQ(a.m.similarity.height, 120);
    EXPECT_EQ(a.m.simlMetaVersion.major, 2);
    EXPECT_EQ(a.m.repmMetaVersion.major, 2);
    EXPECT_EQ(a.m.clblMetaVersion.major, 1);
    EXPECT_GE(a.m.representative.colorVariation, 0.0f);
    _KtMetaColorLabel* labels = nullptr;
    ASSERT_EQ(KtClblExtract(&a.m.similarity, &labels), KT_OK);
    EXPECT_EQ(std::memcmp(labels, &a.m.colorLabel, sizeof *labels), 0);
    KtClblDisposeMeta(&labels);
    // The records are the glue's own copies: the section can be written.
    EXPECT_GT(VondKtLibGetSerializedSize(a.m.similarity, a.m.representative, a.m.colorLabel), 676u + 32u);
}

TEST(VondKtLibMetaTest, AnalyzeAllocationFailuresLeaveNothing) {
    ZbmImagePtr rgb = Gradient(320, 240, ZBM_PIXEL_ORDER_RGB);
    KtAnalysis a;
    _VondResult r{};
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            VondDisposeMeta(&a.m);
            r = a.Run(rgb.get());
        },
        [&](long n, bool triggered) {
            if (!triggered) {
                EXPECT_EQ(r.status, VOND_STATUS_OK) << n;
                return;
            }
            EXPECT_TRUE(r.status == VOND_STATUS_OUT_OF_MEMORY || r.status == VOND_STATUS_FAILED) << n;
            EXPECT_EQ(a.m.representative.pFingers, nullptr) << n;
            EXPECT_EQ(a.m.representative.pBlurMap, nullptr) << n;
        });
    EXPECT_GT(allocations, 3);
}
