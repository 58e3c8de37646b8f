// Frame header, similarity and colour label metas, and the behaviour every
// Kt parser and serialiser shares.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/frame/kt_handlers.h"
#include "testkit/kt_meta_samples.h"

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <iterator>
#include <string>
#include <vector>

using lumicor::test::MakeFrame;
using lumicor::test::Printed;
using Bytes = std::vector<uint8_t>;

namespace {

Bytes SimlFrame(const _KtMetaSimilarity& m, _KtMetaVersion v = {2, 0}) {
    const _KtEngineVersion e = {1, 4, 0x13121700u};
    Bytes b(676);
    EXPECT_EQ(KtSimlSerialize(&v, &e, &m, b.data(), 676), KT_OK);
    return b;
}
Bytes ClblFrame(const _KtMetaColorLabel& m) {
    const _KtMetaVersion v = {1, 0};
    const _KtEngineVersion e = {1, 2, 0x13121700u};
    Bytes b(32);
    EXPECT_EQ(KtClblSerialize(&v, &e, &m, b.data(), 32), KT_OK);
    return b;
}
Bytes RepmFrame(const _KtMetaRepresentative& m) {
    const _KtMetaVersion v = {2, 0};
    const _KtEngineVersion e = {2, 5, 0x13121700u};
    unsigned int size = 0;
    EXPECT_EQ(KtRepmGetSerializedSize(&m, &size), KT_OK);
    Bytes b(size);
    EXPECT_EQ(KtRepmSerialize(&v, &e, &m, b.data(), size), KT_OK);
    return b;
}

// Parses into a fresh or preset *out, checks that a failure leaves *out as
// it was, and releases a parsed record.
template <typename T, int (*Parse)(const unsigned char*, unsigned int, KtFrameHeader*, T**), int (*Dispose)(T**)>
int ParseOnce(const uint8_t* data, unsigned int length, KtFrameHeader* header, bool presetOut) {
    static T preset;
    T* out = presetOut ? &preset : nullptr;
    const int status = Parse(data, length, header, &out);
    if (status == KT_OK) {
        EXPECT_NE(out, nullptr);
        Dispose(&out);
    } else {
        EXPECT_EQ(out, presetOut ? &preset : nullptr);
    }
    return status;
}

struct MetaKind {
    const char* signature;
    uint8_t maxMajor;
    int (*parse)(const uint8_t*, unsigned int, KtFrameHeader*, bool);
    Bytes frame;
    int nullArgument;  // parse with a null pointer
    int outSet;        // parse with *out already set
};

std::vector<MetaKind> AllKinds() {
    static lumicor::test::SampleRepresentative repm(2, 3, 2);
    return {
        {"SIML", 2, ParseOnce<_KtMetaSimilarity, KtSimlParse, KtSimlDisposeMeta>,
         SimlFrame(lumicor::test::SampleSimilarity()), KT_ERR_NULL, KT_ERR_STATE},
        {"REPM", 2, ParseOnce<_KtMetaRepresentative, KtRepmParse, KtRepmDisposeMeta>, RepmFrame(repm.meta),
         KT_ERR_NULL, KT_ERR_NULL},
        {"CLBL", 1, ParseOnce<_KtMetaColorLabel, KtClblParse, KtClblDisposeMeta>,
         ClblFrame(lumicor::test::SampleColorLabel()), KT_ERR_STATE, KT_ERR_STATE},
    };
}

void SetU32(Bytes& b, size_t at, uint32_t v) {
    for (int i = 0; i < 4; ++i) b[at + i] = static_cast<uint8_t>(v >> (24 - 8 * i));
}

}  // namespace

TEST(KtFrameTest, HeaderIsSixteenBigEndianBytes) {
    KtFrameHeader h = {{'S', 'I', 'M', 'L'}, 660, {2, 1}, {1, 4, 0x13121700u}};
    uint8_t b[17] = {};
    EXPECT_EQ(KtFrameHeaderHandler(&h).Write(b, 15), 0u);
    ASSERT_EQ(KtFrameHeaderHandler(&h).Write(b, 17), 16u);
    const uint8_t expected[16] = {'S', 'I', 'M', 'L', 0, 0, 2, 0x94, 2, 1, 1, 4, 0x13, 0x12, 0x17, 0};
    EXPECT_EQ(0, std::memcmp(b, expected, 16));

    KtFrameHeader back = {};
    EXPECT_EQ(KtFrameHeaderHandler(&back).Read(b, 15), 0u);
    ASSERT_EQ(KtFrameHeaderHandler(&back).Read(b, 16), 16u);
    EXPECT_EQ(0, std::memcmp(back.metaSignature, "SIML", 4));
    EXPECT_EQ(back.metaBytes, 660u);
    EXPECT_EQ(back.engineVersion.build, 0x13121700u);
    EXPECT_EQ(Printed([&](FILE* f) { KtFrameHeaderHandler(&back).Dump(f); }),
              "MetaSignature = SIML\nMetaBytes = 660\nMetaVersion  = 2.1\nEngineVersion  = 1.4.13121700\n");
}

TEST(KtFrameTest, EveryParserRefusesMalformedFrames) {
    for (const MetaKind& k : AllKinds()) {
        SCOPED_TRACE(k.signature);
        const Bytes& good = k.frame;
        const unsigned int n = static_cast<unsigned int>(good.size());
        KtFrameHeader h;
        ASSERT_EQ(k.parse(good.data(), n, &h, false), KT_OK);

        // Trailing bytes belong to the next frame and are ignored.
        Bytes longer = good;
        longer.resize(n + 5, 0xEE);
        EXPECT_EQ(k.parse(longer.data(), n + 5, &h, false), KT_OK);

        // Exactly a header is too short, even when it announces no payload.
        Bytes empty = MakeFrame(k.signature, 1, 0, 0, {});
        EXPECT_EQ(k.parse(empty.data(), 16, &h, false), KT_ERR_STATE);

        EXPECT_EQ(k.parse(nullptr, n, &h, false), k.nullArgument);
        EXPECT_EQ(k.parse(good.data(), n, nullptr, false), k.nullArgument);
        EXPECT_EQ(k.parse(good.data(), n, &h, true), k.outSet);

        struct Mutation {
            const char* what;
            size_t at;
            uint8_t value;
        } mutations[] = {{"signature", 3, 'X'},
                         {"major 0", 8, 0},
                         {"major above the highest read", 8, static_cast<uint8_t>(k.maxMajor + 1)}};
        for (const Mutation& m : mutations) {
            SCOPED_TRACE(m.what);
            Bytes bad = good;
            bad[m.at] = m.value;
            std::memset(&h, 0, sizeof h);
            EXPECT_EQ(k.parse(bad.data(), n, &h, false), KT_ERR_FAILED);
            EXPECT_EQ(h.metaVersion.major, bad[8]);  // the header is filled all the same
        }

        const uint32_t payload = n - 16;
        for (uint32_t metaBytes : {payload + 1, payload - 1, 0xFFFFFFFFu, 0xFFFFFFF0u}) {
            SCOPED_TRACE(metaBytes);
            Bytes bad = longer;  // five spare bytes after the frame
            SetU32(bad, 4, metaBytes);
            EXPECT_EQ(k.parse(bad.data(), n + 5, &h, false), KT_ERR_FAILED);
        }
        EXPECT_EQ(k.parse(good.data(), n - 1, &h, false), KT_ERR_FAILED);
    }
}

TEST(KtFrameTest, SerialisersRefuseAShortBufferBeforeWriting) {
    const _KtMetaVersion v = {2, 0};
    const _KtEngineVersion e = {1, 0, 7};
    const _KtMetaSimilarity siml = lumicor::test::SampleSimilarity();
    const _KtMetaColorLabel clbl = lumicor::test::SampleColorLabel();
    lumicor::test::SampleRepresentative repm(1, 2, 2);
    const struct {
        const char* name;
        std::function<int(unsigned char*, unsigned int)> write;
        unsigned int size;
    } rows[] = {
        {"siml", [&](unsigned char* b, unsigned int n) { return KtSimlSerialize(&v, &e, &siml, b, n); }, 676},
        {"clbl", [&](unsigned char* b, unsigned int n) { return KtClblSerialize(&v, &e, &clbl, b, n); }, 32},
        {"repm", [&](unsigned char* b, unsigned int n) { return KtRepmSerialize(&v, &e, &repm.meta, b, n); }, 80},
    };
    for (const auto& r : rows) {
        SCOPED_TRACE(r.name);
        Bytes buf(r.size + 8, 0xAA);
        EXPECT_EQ(r.write(nullptr, r.size), KT_ERR_NULL);
        EXPECT_EQ(r.write(buf.data(), r.size - 1), KT_ERR_STATE);
        EXPECT_EQ(buf, Bytes(r.size + 8, 0xAA));
        ASSERT_EQ(r.write(buf.data(), r.size + 8), KT_OK);
        EXPECT_EQ(buf[r.size], 0xAA);
        EXPECT_EQ(buf[6] << 8 | buf[7], static_cast<int>(r.size - 16));  // metaBytes
    }
    EXPECT_EQ(KtSimlSerialize(&v, &e, nullptr, nullptr, 0), KT_ERR_NULL);
    unsigned int size = 0;
    EXPECT_EQ(KtSimlGetSerializedSize(&size), KT_OK);
    EXPECT_EQ(size, 676u);
    EXPECT_EQ(KtClblGetSerializedSize(&size), KT_OK);
    EXPECT_EQ(size, 32u);
}

TEST(KtFrameTest, SimilarityPayloadLayoutAndRoundTrip) {
    const _KtMetaSimilarity m = lumicor::test::SampleSimilarity();
    const Bytes frame = SimlFrame(m);
    const uint8_t* p = frame.data() + 16;
    auto u32 = [&](size_t at) { return uint32_t(p[at]) << 24 | uint32_t(p[at + 1]) << 16 | p[at + 2] << 8 | p[at + 3]; };
    EXPECT_EQ(u32(4), 0xFFFFFF88u);  // -120
    EXPECT_EQ(u32(8), 0x00368278u);  // reserved, l, a, b as raw bytes
    EXPECT_EQ(u32(24), 0x00148C64u);
    EXPECT_EQ(u32(272 + 4), 100u);
    EXPECT_EQ(u32(304), 0x01020304u);
    EXPECT_EQ(u32(336 + 4), 0x7FC00001u);  // NaN carried by its bits
    EXPECT_EQ(u32(336 + 4 * 80), 0x42200000u);  // 40.0

    // Meta version 1.x reads with the same layout and comes back unchanged.
    for (_KtMetaVersion v : {_KtMetaVersion{2, 0}, _KtMetaVersion{1, 7}}) {
        const Bytes in = SimlFrame(m, v);
        KtFrameHeader h;
        _KtMetaSimilarity* parsed = nullptr;
        ASSERT_EQ(KtSimlParse(in.data(), 676, &h, &parsed), KT_OK);
        EXPECT_EQ(0, std::memcmp(parsed, &m, sizeof m));
        EXPECT_EQ(h.metaVersion.minor, v.minor);
        EXPECT_EQ(SimlFrame(*parsed, h.metaVersion), in);
        KtSimlDisposeMeta(&parsed);
        EXPECT_EQ(parsed, nullptr);
    }
}

TEST(KtFrameTest, ClonesAndTheirPerMetaCodes) {
    const _KtMetaSimilarity siml = lumicor::test::SampleSimilarity();
    _KtMetaSimilarity* s = nullptr;
    ASSERT_EQ(KtSimlCloneMeta(&siml, &s), KT_OK);
    EXPECT_EQ(0, std::memcmp(s, &siml, sizeof siml));
    _KtMetaSimilarity* kept = s;
    EXPECT_EQ(KtSimlCloneMeta(&siml, &s), KT_ERR_NULL);
    EXPECT_EQ(s, kept);
    KtSimlDisposeMeta(&s);

    const _KtMetaColorLabel clbl = lumicor::test::SampleColorLabel();
    _KtMetaColorLabel* c = nullptr;
    ASSERT_EQ(KtClblCloneMeta(&clbl, &c), KT_OK);
    EXPECT_EQ(0, std::memcmp(c, &clbl, sizeof clbl));
    EXPECT_EQ(KtClblCloneMeta(&clbl, &c), KT_ERR_STATE);
    KtClblDisposeMeta(&c);
    EXPECT_EQ(c, nullptr);
}

TEST(KtFrameTest, ColourLabelPayloadAndDump) {
    const _KtMetaColorLabel m = lumicor::test::SampleColorLabel();
    const Bytes frame = ClblFrame(m);
    EXPECT_EQ(Bytes(frame.begin(), frame.begin() + 16),
              Bytes({'C', 'L', 'B', 'L', 0, 0, 0, 16, 1, 0, 1, 2, 0x13, 0x12, 0x17, 0}));
    EXPECT_EQ(0, std::memcmp(frame.data() + 16, &m, 16));  // the record's bytes as they are

    EXPECT_EQ(Printed([&](FILE* f) { KtClblDump(&m, f); }),
              "[KtMetaColorLabel]---------\n"
              "white  = 100\nblack  = 0\nred    = 7\nyellow = 55\ngreen  = 99\nblue   = 1\n"
              "-------------------------------\n\n");
    EXPECT_EQ(Printed([&](FILE* f) { KtClblDump(nullptr, f); }), "");
    EXPECT_EQ(KtClblDump(&m, nullptr), KT_OK);
}

TEST(KtFrameTest, SimilarityDump) {
    _KtMetaSimilarity m;
    std::memset(&m, 0, sizeof m);
    m.width = 4;
    m.height = 3;
    m.mainColor = {0, 50, 128, 127};
    m.ncol32 = 1;
    m.colHist32[0] = {{0, 50, 128, 127}, 12};
    m.verHist[0] = 12;
    m.horHist[7] = 3;
    m.edge.value[0] = 1.5f;
    m.edge.value[80] = -2.25f;

    std::string expected =
        "[KtMetaSimilarity]-------------\n"
        "width x height        = 4 x 3\n"
        "mainColor (l, a, b)   = (50, 128, 127)\n"
        "ncol32                = 1\n"
        "\t colHist32[0] = (50, 128, 127), 12\n";
    for (int i = 1; i < 32; ++i) expected += "\t colHist32[" + std::to_string(i) + "] = (0, 0, 0), 0\n";
    const std::string zeros = "{     0.000,      0.000,      0.000}, ";
    const std::string zeroRow = "\t" + zeros + zeros + zeros + "\n";
    expected += "verHist = {12, 0, 0, 0, 0, 0, 0, 0, }\n"
                "horHist = {0, 0, 0, 0, 0, 0, 0, 3, }\n"
                "edge =\n"
                "{\n\t{     1.500,      0.000,      0.000}, " + zeros + zeros + "\n" + zeroRow + zeroRow + "},\n" +
                "{\n" + zeroRow + zeroRow + zeroRow + "},\n" +
                "{\n" + zeroRow + zeroRow + "\t" + zeros + zeros + "{     0.000,      0.000,     -2.250}, \n},\n" +
                "-------------------------------\n\n";
    EXPECT_EQ(Printed([&](FILE* f) { KtSimlDump(&m, f); }), expected);
}

// The fuzz seeds are small valid frames made from the sample records. Set
// LUMICOR_WRITE_FUZZ_SEEDS=1 to rewrite them after a format change.
TEST(KtFrameTest, FuzzSeedsAreCurrentValidFrames) {
    lumicor::test::SampleRepresentative none(0, 0, 0), some(2, 3, 2), full(10, 4, 1);
    _KtMetaSimilarity zero;
    std::memset(&zero, 0, sizeof zero);
    _KtMetaColorLabel blank = {}, saturated = {100, 100, 100, 100, 100, 100, {}};
    const Bytes legacy = MakeFrame("REPM", 1, 0, 16, {255, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14});
    const struct {
        const char* dir;
        std::vector<Bytes> frames;
    } seeds[] = {
        {"kt_siml_parse", {SimlFrame(lumicor::test::SampleSimilarity()), SimlFrame(zero, {1, 3}),
                           SimlFrame(lumicor::test::SampleSimilarity(), {2, 9})}},
        {"kt_repm_parse", {RepmFrame(none.meta), RepmFrame(some.meta), RepmFrame(full.meta), legacy}},
        {"kt_clbl_parse", {ClblFrame(lumicor::test::SampleColorLabel()), ClblFrame(blank), ClblFrame(saturated)}},
    };
    const bool write = std::getenv("LUMICOR_WRITE_FUZZ_SEEDS") != nullptr;
    for (const auto& s : seeds) {
        for (size_t i = 0; i < s.frames.size(); ++i) {
            const std::string path =
                std::string(LUMICOR_SOURCE_DIR) + "/fuzz/corpus/" + s.dir + "/seed" + std::to_string(i);
            if (write) {
                std::ofstream(path, std::ios::binary)
                    .write(reinterpret_cast<const char*>(s.frames[i].data()), s.frames[i].size());
            }
            std::ifstream in(path, std::ios::binary);
            const Bytes committed((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
            EXPECT_EQ(committed, s.frames[i]) << path;
        }
    }
}
