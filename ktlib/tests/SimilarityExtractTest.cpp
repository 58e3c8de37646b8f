// KtSimlExtract: argument checks, pixel formats and pitch, the palette rules,
// tiny and uniform images, platform-independent bytes, and out-of-memory paths.
#include <gtest/gtest.h>
#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "ktlib/tests/synthetic_photo.h"
#include "tests/testkit/fault.h"

namespace {

struct Meta {
    _KtMetaSimilarity* p = nullptr;
    ~Meta() { KtSimlDisposeMeta(&p); }
};

_KtMetaSimilarity::_Lab Lab(int r, int g, int b) {
    int l = 0, a = 0, bb = 0;
    srgb2lab(r, g, b, &l, &a, &bb);
    _KtMetaSimilarity::_Lab lab;
    lab.reserved = 0;
    lab.l = static_cast<uint8_t>(l);
    lab.a = static_cast<uint8_t>(a);
    lab.b = static_cast<uint8_t>(bb);
    return lab;
}

void ExpectLab(const _KtMetaSimilarity::_Lab& got, const _KtMetaSimilarity::_Lab& want) {
    EXPECT_EQ(got.reserved, 0);
    EXPECT_EQ(got.l, want.l);
    EXPECT_EQ(got.a, want.a);
    EXPECT_EQ(got.b, want.b);
}

std::vector<uint8_t> Uniform(int w, int h, uint8_t r, uint8_t g, uint8_t b) {
    std::vector<uint8_t> rgb(static_cast<size_t>(w) * h * 3);
    for (size_t i = 0; i < rgb.size(); i += 3) rgb[i] = r, rgb[i + 1] = g, rgb[i + 2] = b;
    return rgb;
}

}  // namespace

TEST(SimilarityExtractTest, RejectsBadArguments) {
    std::vector<uint8_t> rgb = Uniform(20, 10, 1, 2, 3);
    _KtMetaSimilarity dummy;
    struct Case {
        const char* name;
        const unsigned char* pixels;
        unsigned int w, h;
        int pitch;
        unsigned int format;
        bool nullOut, outSet;
        int want;
    } cases[] = {
        {"null pixels", nullptr, 20, 10, 60, 0, false, false, KT_ERR_NULL},
        {"null out", rgb.data(), 20, 10, 60, 0, true, false, KT_ERR_NULL},
        {"zero width", rgb.data(), 0, 10, 60, 0, false, false, KT_ERR_STATE},
        {"zero height", rgb.data(), 20, 0, 60, 0, false, false, KT_ERR_STATE},
        {"out already set", rgb.data(), 20, 10, 60, 0, false, true, KT_ERR_STATE},
        {"format 5", rgb.data(), 20, 10, 60, 5, false, false, KT_ERR_UNSUPPORTED},
        {"pitch one short", rgb.data(), 20, 10, 59, 0, false, false, KT_ERR_STATE},
        {"negative pitch one short", rgb.data() + 9 * 60, 20, 10, -59, 0, false, false, KT_ERR_STATE},
        {"4-byte format, 3-byte pitch", rgb.data(), 15, 10, 45, 2, false, false, KT_ERR_STATE},
        {"above 16,000,000 pixels", rgb.data(), 4001, 4000, 4001 * 3, 0, false, false, KT_ERR_FAILED},
        {"width times bytes beyond 32 bits", rgb.data(), 0x80000000u, 1, 60, 0, false, false, KT_ERR_STATE},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        _KtMetaSimilarity* out = c.outSet ? &dummy : nullptr;
        const int status = KtSimlExtract(c.pixels, c.w, c.h, c.pitch, c.format, c.nullOut ? nullptr : &out);
        EXPECT_EQ(status, c.want);
        if (!c.nullOut) {
            EXPECT_EQ(out, c.outSet ? &dummy : nullptr);
        }
    }
}

// Every pixel format and row direction of the same photo gives the same meta.
TEST(SimilarityExtractTest, FormatsAndPitchGiveTheSameMeta) {
    const int w = 48, h = 40;
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h);
    Meta reference;
    ASSERT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &reference.p), KT_OK);

    struct Layout {
        unsigned int format;
        int bytes, r, g, b, filler;
    } layouts[] = {{0, 3, 0, 1, 2, -1}, {1, 3, 2, 1, 0, -1}, {2, 4, 0, 1, 2, 3}, {3, 4, 2, 1, 0, 3}, {4, 4, 1, 2, 3, 0}};
    for (const Layout& l : layouts) {
        for (int direction : {1, -1}) {
            SCOPED_TRACE("format " + std::to_string(l.format) + (direction < 0 ? " bottom-up" : " top-down"));
            const int pitch = w * l.bytes + 5;  // padded rows
            std::vector<uint8_t> buf(static_cast<size_t>(pitch) * h, 0xee);
            for (int y = 0; y < h; ++y) {
                const int row = direction > 0 ? y : h - 1 - y;
                for (int x = 0; x < w; ++x) {
                    const uint8_t* s = &rgb[(static_cast<size_t>(y) * w + x) * 3];
                    uint8_t* d = &buf[static_cast<size_t>(row) * pitch + x * l.bytes];
                    d[l.r] = s[0], d[l.g] = s[1], d[l.b] = s[2];
                    if (l.filler >= 0) d[l.filler] = 0x5a;
                }
            }
            const unsigned char* start = direction > 0 ? buf.data() : buf.data() + static_cast<size_t>(h - 1) * pitch;
            Meta m;
            ASSERT_EQ(KtSimlExtract(start, w, h, direction * pitch, l.format, &m.p), KT_OK);
            EXPECT_EQ(std::memcmp(m.p, reference.p, sizeof(_KtMetaSimilarity)), 0);
        }
    }
}

TEST(SimilarityExtractTest, UniformImageIsOneColourWithoutTextureOrEdges) {
    const int w = 64, h = 48;
    std::vector<uint8_t> rgb = Uniform(w, h, 30, 140, 200);
    Meta m;
    ASSERT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m.p), KT_OK);
    EXPECT_EQ(m.p->width, w);
    EXPECT_EQ(m.p->height, h);
    ASSERT_EQ(m.p->ncol32, 1u);
    EXPECT_EQ(m.p->colHist32[0].count, static_cast<uint32_t>(w * h));
    ExpectLab(m.p->colHist32[0].lab, Lab(30, 140, 200));
    ExpectLab(m.p->mainColor, Lab(30, 140, 200));
    for (int i = 1; i < 32; ++i) EXPECT_EQ(m.p->colHist32[i].count, 0u);
    const uint32_t blocks = (w / 16) * (h / 16);
    EXPECT_EQ(m.p->verHist[0], blocks * 16);
    EXPECT_EQ(m.p->horHist[0], blocks * 16);
    for (int i = 1; i < 8; ++i) EXPECT_EQ(m.p->verHist[i] + m.p->horHist[i], 0u);
    for (float v : m.p->edge.value) EXPECT_EQ(v, 0.0f);
}

TEST(SimilarityExtractTest, TinyImagesHaveOneFlatTextureCount) {
    const struct {
        int w, h;
    } sizes[] = {{1, 1}, {15, 15}, {15, 64}, {64, 15}, {3, 2}};
    for (const auto& s : sizes) {
        SCOPED_TRACE(std::to_string(s.w) + " x " + std::to_string(s.h));
        const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(s.w, s.h);
        Meta m;
        ASSERT_EQ(KtSimlExtract(rgb.data(), s.w, s.h, s.w * 3, 0, &m.p), KT_OK);
        EXPECT_GE(m.p->ncol32, 1u);
        for (int i = 0; i < 8; ++i) {
            EXPECT_EQ(m.p->verHist[i], i == 0 ? 1u : 0u);
            EXPECT_EQ(m.p->horHist[i], i == 0 ? 1u : 0u);
        }
    }
}

// A colour held by fewer than width x height / 2000 + 1 pixels is folded into
// the nearest larger colour; one held by exactly that many survives.
TEST(SimilarityExtractTest, SmallColoursMergeIntoTheNearestLargeOne) {
    const int w = 200, h = 100;  // minimum count 11
    const struct {
        int blue;
        uint32_t colours;
    } cases[] = {{10, 1}, {11, 2}, {12, 2}};
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.blue) + " blue pixels");
        std::vector<uint8_t> rgb = Uniform(w, h, 255, 0, 0);
        for (int i = 0; i < c.blue; ++i) rgb[static_cast<size_t>(i) * 3] = 0, rgb[static_cast<size_t>(i) * 3 + 2] = 255;
        Meta m;
        ASSERT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m.p), KT_OK);
        ASSERT_EQ(m.p->ncol32, c.colours);
        if (c.colours == 1) {
            // Weighted mean of 19990 red and 10 blue pixels, truncated.
            EXPECT_EQ(m.p->colHist32[0].count, static_cast<uint32_t>(w * h));
            ExpectLab(m.p->colHist32[0].lab, Lab(255 * 19990 / 20000, 0, 255 * 10 / 20000));
        } else {
            // Palette order follows the octree: blue's node comes first.
            ExpectLab(m.p->colHist32[0].lab, Lab(0, 0, 255));
            EXPECT_EQ(m.p->colHist32[0].count, static_cast<uint32_t>(c.blue));
            EXPECT_EQ(m.p->colHist32[1].count, static_cast<uint32_t>(w * h - c.blue));
        }
        // The main colour is the mean of the whole image.
        ExpectLab(m.p->mainColor, Lab(255 * (w * h - c.blue) / (w * h), 0, 255 * c.blue / (w * h)));
    }
}

TEST(SimilarityExtractTest, PaletteCountsCoverEveryPixel) {
    const int w = 160, h = 120;
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h, 7);
    Meta m;
    ASSERT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m.p), KT_OK);
    ASSERT_GE(m.p->ncol32, 2u);
    ASSERT_LE(m.p->ncol32, 32u);
    uint64_t total = 0;
    for (uint32_t i = 0; i < 32; ++i) {
        if (i < m.p->ncol32) {
            EXPECT_GE(m.p->colHist32[i].count, static_cast<uint32_t>(w * h / 2000 + 1));
            EXPECT_LE(m.p->colHist32[i].lab.l, 99);
        } else {
            EXPECT_EQ(m.p->colHist32[i].count, 0u);
            EXPECT_EQ(std::memcmp(&m.p->colHist32[i].lab, "\0\0\0\0", 4), 0);
        }
        total += m.p->colHist32[i].count;
    }
    EXPECT_EQ(total, static_cast<uint64_t>(w * h));
    uint32_t ver = 0, hor = 0;
    for (int i = 0; i < 8; ++i) ver += m.p->verHist[i], hor += m.p->horHist[i];
    EXPECT_EQ(ver, (w / 16) * (h / 16) * 16u);
    EXPECT_EQ(hor, ver);
}

// The serialised frame of a fixed photo must be the same bytes on every
// platform and in every build; the reference was recorded once. Set
// LUMICOR_RECORD_GOLDEN=1 to record it again after a deliberate change.
TEST(SimilarityExtractTest, SerialisedFrameMatchesRecordedBytes) {
    const int w = 160, h = 120;
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h);
    Meta m;
    ASSERT_EQ(KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m.p), KT_OK);
    _KtMetaVersion mv;
    _KtEngineVersion ev;
    ASSERT_EQ(KtSimlGetVersion(&mv, &ev), KT_OK);
    unsigned int size = 0;
    ASSERT_EQ(KtSimlGetSerializedSize(&size), KT_OK);
    std::vector<uint8_t> frame(size);
    ASSERT_EQ(KtSimlSerialize(&mv, &ev, m.p, frame.data(), size), KT_OK);

    const std::string path = std::string(LUMICOR_TEST_DATA_DIR) + "/ktlib/siml_synthetic_160x120.bin";
    const char* record = std::getenv("LUMICOR_RECORD_GOLDEN");
    if (record && std::string(record) == "1") {
        std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(frame.data()), frame.size());
    }
    std::ifstream in(path, std::ios::binary);
    ASSERT_TRUE(in.good()) << "missing " << path;
    const std::vector<uint8_t> golden((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_EQ(golden.size(), frame.size());
    for (size_t i = 0; i < frame.size(); ++i) ASSERT_EQ(frame[i], golden[i]) << "first difference at byte " << i;
}

TEST(SimilarityExtractTest, EveryFailedAllocationReportsOutOfMemory) {
    const int w = 40, h = 34;
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h);
    _KtMetaSimilarity* out = nullptr;
    int status = -1;
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] { status = KtSimlExtract(rgb.data(), w, h, w * 3, 0, &out); },
        [&](long n, bool triggered) {
            SCOPED_TRACE("allocation " + std::to_string(n));
            if (triggered) {
                EXPECT_EQ(status, KT_ERR_NO_MEMORY);
                EXPECT_EQ(out, nullptr);
            } else {
                EXPECT_EQ(status, KT_OK);
            }
            KtSimlDisposeMeta(&out);
        });
    EXPECT_GT(allocations, 5);
}
