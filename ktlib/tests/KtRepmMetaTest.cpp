// The representative meta: its variable payload, the legacy version 1 and
// the ten-finger limit.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/frame/kt_handlers.h"
#include "testkit/fault.h"
#include "testkit/kt_meta_samples.h"

#include <algorithm>
#include <cstring>
#include <vector>

using lumicor::test::MakeFrame;
using lumicor::test::Printed;
using lumicor::test::SampleRepresentative;
using Bytes = std::vector<uint8_t>;

namespace {

const _KtMetaVersion kV2 = {2, 0};
const _KtEngineVersion kEngine = {2, 5, 0x13121700u};

Bytes Serialise(const _KtMetaRepresentative& m) {
    unsigned int size = 0;
    EXPECT_EQ(KtRepmGetSerializedSize(&m, &size), KT_OK);
    Bytes b(size);
    EXPECT_EQ(KtRepmSerialize(&kV2, &kEngine, &m, b.data(), size), KT_OK);
    return b;
}

int Parse(const Bytes& frame, _KtMetaRepresentative** out, KtFrameHeader* header = nullptr) {
    KtFrameHeader h;
    return KtRepmParse(frame.data(), static_cast<unsigned int>(frame.size()), header ? header : &h, out);
}

}  // namespace

TEST(KtRepmMetaTest, PayloadLayoutAndRoundTrip) {
    SampleRepresentative sample(2, 3, 2);
    const Bytes frame = Serialise(sample.meta);
    // 44 fixed + 2 x 12 per finger + 4 x (1 + 2) points + 3 x 2 map bytes
    ASSERT_EQ(frame.size(), 16u + 44 + 24 + 12 + 6);
    const Bytes expectedPayload = {
        0x3E, 0x80, 0, 0,  0xBF, 0x80, 0, 0,  0x3F, 0x40, 0, 0,  0x3F, 0x80, 0, 0,  0xFF, 0xC0, 0, 2,  0, 0, 0, 0,
        0, 0, 0, 80,  0, 0, 0, 60,  0, 0, 0, 2,
        0x3F, 0, 0, 0,  0, 0, 1, 0x2C,  0, 0, 0, 1,  0, 0, 0xFF, 0,
        0x3F, 0x20, 0, 0,  0, 0, 1, 0x2D,  0, 0, 0, 2,  0, 0, 0xFF, 1,  0, 1, 0xFF, 1,
        0, 0, 0, 3,  0, 0, 0, 2,  1, 2, 3, 4, 5, 6};
    EXPECT_EQ(Bytes(frame.begin() + 16, frame.end()), expectedPayload);

    _KtMetaRepresentative* parsed = nullptr;
    ASSERT_EQ(Parse(frame, &parsed), KT_OK);
    EXPECT_TRUE(lumicor::test::SameRepresentative(*parsed, sample.meta));
    EXPECT_EQ(Serialise(*parsed), frame);
    KtRepmDisposeMeta(&parsed);
    EXPECT_EQ(parsed, nullptr);

    // No fingers and no map: the 44-byte fixed part only.
    SampleRepresentative empty(0, 0, 0);
    unsigned int size = 0;
    EXPECT_EQ(KtRepmGetSerializedSize(&empty.meta, &size), KT_OK);
    EXPECT_EQ(size, 16u + 44);
    ASSERT_EQ(Parse(Serialise(empty.meta), &parsed), KT_OK);
    EXPECT_EQ(parsed->pFingers, nullptr);
    EXPECT_EQ(parsed->pBlurMap, nullptr);
    KtRepmDisposeMeta(&parsed);
}

TEST(KtRepmMetaTest, TruncatedPayloadsFailAtEveryLength) {
    SampleRepresentative sample(3, 4, 3);
    const Bytes frame = Serialise(sample.meta);
    const uint32_t payload = static_cast<uint32_t>(frame.size() - 16);
    for (uint32_t n = 1; n < payload; ++n) {
        // A consistent frame whose payload simply ends early.
        Bytes cut = MakeFrame("REPM", 2, 0, n, Bytes(frame.begin() + 16, frame.begin() + 16 + n));
        _KtMetaRepresentative* out = nullptr;
        ASSERT_EQ(Parse(cut, &out), KT_ERR_FAILED) << n;
        ASSERT_EQ(out, nullptr);
    }
}

TEST(KtRepmMetaTest, HostileCountsAreRefusedBeforeAllocating) {
    // Six scores and the analysed size, then the counts under test.
    auto payload = [](std::initializer_list<uint8_t> rest) {
        Bytes p(32 + rest.size(), 0);
        std::copy(rest.begin(), rest.end(), p.begin() + 32);
        return p;
    };
    const struct {
        const char* what;
        Bytes payload;
    } rows[] = {
        {"eleven fingers", payload({0, 0, 0, 11})},
        {"2^32 - 1 fingers", payload({0xFF, 0xFF, 0xFF, 0xFF, 0, 0, 0, 0, 0, 0, 0, 0})},
        {"point count overflows", payload({0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0, 0, 0x40, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0})},
        {"map 65536 x 65536 wraps to 0", payload({0, 0, 0, 0, 0, 1, 0, 0, 0, 1, 0, 0})},
        {"map larger than the payload", payload({0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0xFF, 0, 0, 0, 1, 7, 7})},
    };
    for (const auto& r : rows) {
        const Bytes frame = MakeFrame("REPM", 2, 0, static_cast<uint32_t>(r.payload.size()), r.payload);
        _KtMetaRepresentative* out = nullptr;
        lumicor::test::FaultScope count(0);
        EXPECT_EQ(Parse(frame, &out), KT_ERR_FAILED) << r.what;
        // The record and at most a finger array; nothing sized by a refused count.
        EXPECT_LE(count.Count(), 2) << r.what;
    }
}

TEST(KtRepmMetaTest, TenFingersAtMost) {
    SampleRepresentative ten(10, 1, 1), eleven(11, 1, 1);
    unsigned int size = 0;
    _KtMetaRepresentative* out = nullptr;
    ASSERT_EQ(Parse(Serialise(ten.meta), &out), KT_OK);
    EXPECT_EQ(KtRepmCloneMeta(&ten.meta, &out), KT_ERR_STATE);  // *out already set
    KtRepmDisposeMeta(&out);

    EXPECT_EQ(KtRepmGetSerializedSize(&eleven.meta, &size), KT_ERR_STATE);
    EXPECT_EQ(KtRepmCloneMeta(&eleven.meta, &out), KT_ERR_STATE);
    EXPECT_EQ(out, nullptr);
    Bytes buf(4096, 0);
    EXPECT_EQ(KtRepmSerialize(&kV2, &kEngine, &eleven.meta, buf.data(), 4096), KT_ERR_STATE);

    // A record that claims more than it holds cannot be written or copied.
    SampleRepresentative hollow(1, 2, 2);
    delete[] hollow.meta.pBlurMap;
    hollow.meta.pBlurMap = nullptr;
    EXPECT_EQ(KtRepmGetSerializedSize(&hollow.meta, &size), KT_ERR_STATE);
    EXPECT_EQ(KtRepmCloneMeta(&hollow.meta, &out), KT_ERR_STATE);
}

TEST(KtRepmMetaTest, LegacyVersionOneIsReadOnly) {
    const struct {
        uint8_t variation, sharpness;
        float colorVariation, outOfFocus;
    } rows[] = {{255, 0, 1.0f, 1.0f}, {0, 255, 0.0f, 0.0f}, {51, 204, 51 / 255.0f, 1.0f - 204 / 255.0f}};
    for (const auto& r : rows) {
        const Bytes frame = MakeFrame("REPM", 1, 3, 16, {r.variation, r.sharpness, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9});
        _KtMetaRepresentative* m = nullptr;
        KtFrameHeader h;
        ASSERT_EQ(Parse(frame, &m, &h), KT_OK);
        EXPECT_EQ(h.metaVersion.minor, 3);
        EXPECT_EQ(m->colorVariation, r.colorVariation);
        EXPECT_EQ(m->outOfFocus, r.outOfFocus);
        for (float s : {m->badExposure, m->fingerOnLens, m->cameraShake, m->motionBlur}) EXPECT_EQ(s, -1.0f);
        EXPECT_EQ(m->numFinger + m->analyzedWidth + m->analyzedHeight + m->mapWidth + m->mapHeight, 0u);
        KtRepmDisposeMeta(&m);
    }
    // Only a 16-byte payload is version 1.
    const Bytes longer = MakeFrame("REPM", 1, 0, 17, Bytes(17, 0));
    _KtMetaRepresentative* m = nullptr;
    EXPECT_EQ(Parse(longer, &m), KT_ERR_FAILED);

    SampleRepresentative sample(0, 0, 0);
    const _KtMetaVersion v1 = {1, 0}, v3 = {3, 0};
    Bytes buf(64, 0);
    testing::internal::CaptureStderr();
    EXPECT_EQ(KtRepmSerialize(&v1, &kEngine, &sample.meta, buf.data(), 64), KT_ERR_FAILED);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "Write method is not supported in this meta version\n");
    EXPECT_EQ(KtRepmSerialize(&v1, &kEngine, &sample.meta, buf.data(), 31), KT_ERR_STATE);
    EXPECT_EQ(KtRepmSerialize(&v3, &kEngine, &sample.meta, buf.data(), 64), KT_ERR_UNSUPPORTED);

    testing::internal::CaptureStderr();
    EXPECT_EQ(Printed([&](FILE* f) { KtMetaRepresentativeLegacyHandler(&sample.meta).Dump(f); }), "");
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "Dump method is not supported in this meta version\n");
}

TEST(KtRepmMetaTest, Dump) {
    SampleRepresentative sample(2, 3, 2);
    sample.meta.cameraShake = 0.5f;
    EXPECT_EQ(Printed([&](FILE* f) { KtRepmDump(&sample.meta, f); }),
              "[KtMetaRepresentative]---------\n"
              "# scores\n"
              "\t color variation = 0.250\n"
              "\t bad exposure    = -1.000\n"
              "\t finger on lens  = 0.750\n"
              "\t out of focus    = 1.000\n"
              "\t camera shake    = 0.500\n"
              "\t motion blur     = 0.000\n"
              "\n"
              "# finger\n"
              "\t analyzedWidth   = 80\n"
              "\t analyzedHeight  = 60\n"
              "\t numFinger       = 2\n"
              "\t detection score = 0.500\n"
              "\t area            = 300\n"
              "\t numPoint        = 1\n"
              "\t (0,65280), \n"
              "\t detection score = 0.625\n"
              "\t area            = 301\n"
              "\t numPoint        = 2\n"
              "\t (0,65281), (1,65281), \n"
              "\n"
              "# blurMap\n"
              "\t mapWidth        = 3\n"
              "\t mapHeight       = 2\n"
              "\t 1 2 3 \n"
              "\t 4 5 6 \n"
              "\n"
              "-------------------------------\n\n");
}

TEST(KtRepmMetaTest, OutOfMemoryInParseAndClone) {
    SampleRepresentative sample(3, 5, 4);
    const Bytes frame = Serialise(sample.meta);
    _KtMetaRepresentative* out = nullptr;
    int status = -1;
    const long parseAllocations = lumicor::test::ForEachAllocationFailure(
        [&] { status = Parse(frame, &out); },
        [&](long n, bool triggered) {
            if (triggered) {
                EXPECT_EQ(status, KT_ERR_NO_MEMORY) << n;
                EXPECT_EQ(out, nullptr) << n;
            } else {
                EXPECT_EQ(status, KT_OK);
                KtRepmDisposeMeta(&out);
            }
        });
    EXPECT_EQ(parseAllocations, 1 + 1 + 3 + 1);  // record, fingers, points, map

    const long cloneAllocations = lumicor::test::ForEachAllocationFailure(
        [&] { status = KtRepmCloneMeta(&sample.meta, &out); },
        [&](long n, bool triggered) {
            if (triggered) {
                EXPECT_EQ(status, KT_ERR_NO_MEMORY) << n;
                EXPECT_EQ(out, nullptr) << n;
            } else {
                EXPECT_EQ(status, KT_OK);
                EXPECT_TRUE(lumicor::test::SameRepresentative(*out, sample.meta));
                KtRepmDisposeMeta(&out);
            }
        });
    EXPECT_EQ(cloneAllocations, 6);
}
