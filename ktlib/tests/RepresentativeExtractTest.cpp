// The representative meta extraction: its steps, argument checks, the limits
// the meta keeps, and identical results on every target.
#include <gtest/gtest.h>

#include <lumicor/ktlib.h>

#include "ktlib/src/blur/blur.h"
#include "ktlib/src/finger/fol.h"
#include "ktlib/src/representative/repm_internal.h"
#include "testkit/fault.h"
#include "testkit/images.h"

#include <cmath>
#include <cstring>
#include <vector>

namespace {

// A fixed photo: warm gradient, stripes, noise and a soft skin-coloured blob
// entering from the lower left (integer arithmetic only).
std::vector<uint8_t> QualityPhoto(int32_t w, int32_t h) {
    std::vector<uint8_t> rgb(static_cast<size_t>(w) * h * 3);
    uint32_t state = 12345u;
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            state = state * 1664525u + 1013904223u;
            const int32_t noise = static_cast<int32_t>((state >> 24) % 21) - 10;
            // Coarse texture (blocks of w / 80 pixels) that survives the
            // reduction to 80 x 60, so that only the blob looks smooth.
            const uint32_t block = static_cast<uint32_t>((x * 80 / w) * 7919 + (y * 80 / w) * 104729) * 2654435761u;
            const int32_t texture = static_cast<int32_t>(block >> 26) - 32;
            int32_t r = 60 + 120 * y / h + texture, g = 90 + 60 * x / w - texture, b = 170 - 80 * y / h + texture;
            if ((x / 6) % 2 == 0 && y < h / 3) r = g = b = 220;
            // Blob: inside d2 < 100, blended out to d2 = 300 (a defocused edge).
            const int32_t dx = x * 100 / (w * 2 / 5), dy = (y - h * 3 / 4) * 100 / (h / 3);
            const int32_t d2 = (dx * dx + dy * dy) / 100;
            if (d2 < 300) {
                const int32_t a = d2 < 100 ? 256 : (300 - d2) * 256 / 200;
                r = (a * (225 - d2 / 8) + (256 - a) * r) / 256;
                g = (a * (150 - d2 / 10) + (256 - a) * g) / 256;
                b = (a * (115 - d2 / 12) + (256 - a) * b) / 256;
            }
            uint8_t* p = &rgb[(static_cast<size_t>(y) * w + x) * 3];
            const int32_t v[3] = {r + noise, g + noise, b + noise};
            for (int c = 0; c < 3; ++c) p[c] = static_cast<uint8_t>(v[c] < 0 ? 0 : (v[c] > 255 ? 255 : v[c]));
        }
    }
    return rgb;
}

uint64_t Fnv(uint64_t hash, const void* data, size_t n) {
    const uint8_t* p = static_cast<const uint8_t*>(data);
    for (size_t i = 0; i < n; ++i) hash = (hash ^ p[i]) * 1099511628211ull;
    return hash;
}

_KtMetaSimilarity Palette(std::initializer_list<_KtMetaSimilarity::_ColHist> colours, int32_t w, int32_t h) {
    _KtMetaSimilarity s;
    std::memset(&s, 0, sizeof s);
    s.width = w;
    s.height = h;
    for (const auto& c : colours) s.colHist32[s.ncol32++] = c;
    return s;
}

}  // namespace

TEST(RepresentativeExtractTest, ColourVariation) {
    const struct {
        _KtMetaSimilarity siml;
        float expected;
    } cases[] = {
        {Palette({{{0, 50, 128, 128}, 100}}, 10, 10), 0.0f},
        // d = 10 between the two halves: 10 x 50 x 50 / 100 x 10 / 100 = 25.
        {Palette({{{0, 50, 120, 128}, 50}, {{0, 50, 130, 128}, 50}}, 10, 10), 25.0f / 255.0f},
        // Lightness counts 0.7: a step of 10 in L is 7.
        {Palette({{{0, 40, 128, 128}, 50}, {{0, 50, 128, 128}, 50}}, 10, 10), 17.5f / 255.0f},
        {Palette({{{0, 0, 0, 0}, 50}, {{0, 99, 255, 255}, 50}}, 10, 10), 1.0f},  // capped at 255
        {Palette({{{0, 0, 0, 0}, 50}, {{0, 99, 255, 255}, 50}}, 0, 10), 0.0f},   // no pixels
    };
    for (const auto& c : cases) EXPECT_FLOAT_EQ(ktrepm::ColorVariation(c.siml), c.expected);
}

TEST(RepresentativeExtractTest, WorkingSizes) {
    const struct {
        uint32_t w, h;
        int32_t aw, ah, bw, bh;
    } cases[] = {{4000, 3000, 640, 480, 80, 60}, {640, 480, 640, 480, 80, 60}, {3000, 4000, 480, 640, 60, 80},
                 {1920, 1080, 739, 416, 92, 52},  {10000, 10, 17527, 18, 2191, 2}};
    for (const auto& c : cases) {
        int32_t aw, ah, bw, bh;
        ASSERT_EQ(ktrepm::SizeForPixels(c.w, c.h, 307200.0, &aw, &ah), KT_OK);
        ASSERT_EQ(ktrepm::SizeForPixels(c.w, c.h, 4800.0, &bw, &bh), KT_OK);
        EXPECT_EQ(aw, c.aw);
        EXPECT_EQ(ah, c.ah);
        EXPECT_EQ(bw, c.bw);
        EXPECT_EQ(bh, c.bh);
    }
}

TEST(RepresentativeExtractTest, TenFingersAreKeptInAnalysedPixels) {
    zbmvector<FOL::Finger> fingers;
    for (int i = 0; i < 11; ++i) {
        FOL::Finger f = {};
        const FOL::FingerPoint pts[3] = {{0.0f, 0.5f}, {0.5f, 0.25f}, {0.999f, 0.0f}};
        for (const auto& p : pts) f.points.PushBack(p);
        f.area = i == 0 ? -0.1f : 0.25f;  // an outline closed the other way round
        f.score = 0.05f * i;
        fingers.PushBack(f);
    }
    _KtMetaRepresentative meta = {};
    ASSERT_EQ(ktrepm::StoreFingers(fingers, 80, 60, &meta), KT_OK);
    EXPECT_EQ(meta.numFinger, 10u);
    EXPECT_EQ(meta.analyzedWidth, 80u);
    EXPECT_EQ(meta.pFingers[0].area, 0u);
    EXPECT_EQ(meta.pFingers[1].area, 1200u);
    EXPECT_FLOAT_EQ(meta.pFingers[9].score, 0.45f);
    ASSERT_EQ(meta.pFingers[3].numPoint, 3u);
    EXPECT_EQ(meta.pFingers[3].pPoints[1].x, 40);
    EXPECT_EQ(meta.pFingers[3].pPoints[1].y, 15);
    EXPECT_EQ(meta.pFingers[3].pPoints[2].x, 79);
    unsigned int size = 0;
    EXPECT_EQ(KtRepmGetSerializedSize(&meta, &size), KT_OK);
    EXPECT_EQ(size, 16u + 44u + 10u * 12u + 10u * 3u * 4u);
    _KtMetaRepresentative* pointer = new _KtMetaRepresentative(meta);
    KtRepmDisposeMeta(&pointer);
    fingers.Clear();
}

TEST(RepresentativeExtractTest, BlurMapIsAQuarterInEachDirection) {
    ZbmImagePtr map(ZbiuCreate(79, 59, ZBM_PIXEL_ORDER_GRAY, lumicor::test::Pixel(37)));
    _KtMetaRepresentative meta = {};
    ASSERT_EQ(ktrepm::StoreBlurMap(map.get(), &meta), KT_OK);
    EXPECT_EQ(meta.mapWidth, 20u);
    EXPECT_EQ(meta.mapHeight, 15u);
    for (uint32_t i = 0; i < 20 * 15; ++i) ASSERT_EQ(meta.pBlurMap[i], 37);
    delete[] meta.pBlurMap;
}

TEST(RepresentativeExtractTest, ScoreRange) {
    EXPECT_TRUE(ktrepm::ScoreInRange(-1.0f));
    EXPECT_TRUE(ktrepm::ScoreInRange(0.0f));
    EXPECT_TRUE(ktrepm::ScoreInRange(1.0f));
    EXPECT_FALSE(ktrepm::ScoreInRange(-0.5f));
    EXPECT_FALSE(ktrepm::ScoreInRange(1.0001f));
    EXPECT_FALSE(ktrepm::ScoreInRange(std::nanf("")));
}

// The blur scorer and the finger detection give the same bits on every
// target (recorded on x86-64).
TEST(RepresentativeExtractTest, WorkingResultsAreTheSameOnEveryTarget) {
    std::vector<uint8_t> rgb = QualityPhoto(800, 600);
    ZbmImagePtr photo(ZbiuCreateFromData(rgb.data(), 800, 600, 2400, ZBM_PIXEL_ORDER_RGB));
    ZbmImagePtr gray, small;
    ASSERT_EQ(ktrepm::MakeWorkingCopies(photo.get(), &gray, &small), KT_OK);
    _zbm_Image* map = nullptr;
    blur::BlurScores scores;
    ASSERT_EQ(blur::CalcBlurScorer(gray.get(), &map, &scores), KT_OK);
    ZbmImagePtr owned(map);
    uint64_t hash = 1469598103934665603ull;
    hash = Fnv(hash, &scores.outOfFocus, 8);
    hash = Fnv(hash, &scores.cameraShake, 8);
    for (int32_t y = 0; y < map->height; ++y) hash = Fnv(hash, ZbiuGetConstPointer(map, 0, y), map->width);
    EXPECT_EQ(hash, 0xa6c9c5367b405997ull) << std::hex << hash;

    // The detector's tables (the model's exponentials), the traced and the
    // smoothed outline, and the finger list.
    FOL::Detector detector;
    zbmvector<zbmvector<zbm_Pos>> contours;
    ASSERT_EQ(detector.DetectInitialRegions(small.get(), FOL::DefaultFingerLiklihood(), contours), KT_OK);
    ASSERT_EQ(contours.size(), 1);
    const int32_t cells = small->width * small->height;
    uint64_t fingerHash = 1469598103934665603ull;
    fingerHash = Fnv(fingerHash, detector.TextureTable().data, 4 * cells);
    fingerHash = Fnv(fingerHash, detector.FingerTable().data, 4 * cells);
    fingerHash = Fnv(fingerHash, detector.EdgeMagnitudeTable().data, 4 * cells);
    zbmvector<zbm_Pos> adjusted;
    ASSERT_EQ(detector.AdjustContour(contours[0], adjusted), KT_OK);
    fingerHash = Fnv(fingerHash, contours[0].data, 8 * contours[0].size());
    fingerHash = Fnv(fingerHash, adjusted.data, 8 * adjusted.size());
    zbmvector<FOL::Finger> fingers;
    float score = 0.0f;
    ASSERT_EQ(FOL::CalcFingerScore(small.get(), fingers, score), KT_OK);
    fingerHash = Fnv(fingerHash, &score, 4);
    for (const FOL::Finger& f : fingers) {
        fingerHash = Fnv(fingerHash, &f.score, 4);
        fingerHash = Fnv(fingerHash, &f.area, 4);
        for (const FOL::FingerPoint& p : f.points) fingerHash = Fnv(fingerHash, &p, 8);
    }
    EXPECT_EQ(fingerHash, 0x2742a86d16a71628ull) << std::hex << fingerHash;

    // The trained patch classifier: patches along the traced outline, every
    // turning of both dictionaries.
    FOL::FeRVLHandler handler;
    ASSERT_EQ(handler.Initialize(), KT_OK);
    uint64_t patchHash = 1469598103934665603ull;
    int32_t scored = 0;
    for (int32_t i = 0; i < contours[0].size(); ++i) {
        const zbm_Rect rect = {contours[0][i].x - 5, contours[0][i].y - 5, 10, 10};
        if (!FOL::ImageBound(small->width, small->height).IsRectInImage(rect)) continue;
        float value = 0.0f;
        ASSERT_EQ(handler.EvalImagePatch(small.get(), rect, i % 8, &value), KT_OK);
        patchHash = Fnv(patchHash, &value, 4);
        ++scored;
    }
    EXPECT_GE(scored, 8) << "too few patches to compare";
    EXPECT_EQ(patchHash, 0xafd26d3e66397d5aull) << std::hex << patchHash;
    contours.Clear();
    adjusted.Clear();
    fingers.Clear();
}


TEST(RepresentativeExtractTest, RefusedArguments) {
    std::vector<uint8_t> rgb(64 * 48 * 4, 100);
    const _KtMetaSimilarity siml = Palette({{{0, 50, 128, 128}, 100}}, 10, 10);
    _KtMetaRepresentative* out = nullptr;
    _KtMetaRepresentative existing = {};
    _KtMetaRepresentative* set = &existing;
    const struct {
        const uint8_t* pixels;
        unsigned w, h;
        int pitch;
        unsigned format;
        const _KtMetaSimilarity* siml;
        _KtMetaRepresentative** out;
        int status;
    } cases[] = {{rgb.data(), 64, 48, 192, 5, &siml, &out, KT_ERR_STATE},
                 {nullptr, 64, 48, 192, 0, &siml, &out, KT_ERR_NULL},
                 {rgb.data(), 64, 48, 192, 0, nullptr, &out, KT_ERR_NULL},
                 {rgb.data(), 64, 48, 192, 0, &siml, nullptr, KT_ERR_NULL},
                 {rgb.data(), 0, 48, 192, 0, &siml, &out, KT_ERR_STATE},
                 {rgb.data(), 64, 0, 192, 0, &siml, &out, KT_ERR_STATE},
                 {rgb.data(), 64, 48, 192, 0, &siml, &set, KT_ERR_STATE},
                 {rgb.data(), 64, 48, 191, 0, &siml, &out, KT_ERR_STATE},
                 {rgb.data(), 64, 48, 255, 2, &siml, &out, KT_ERR_STATE},  // RGBA needs 256 bytes a row
                 {rgb.data() + 47 * 192, 64, 48, -192, 0, &siml, &out, KT_OK}};
    for (const auto& c : cases) {
        EXPECT_EQ(KtRepmExtract(c.pixels, c.w, c.h, c.pitch, c.format, c.siml, c.out), c.status) << c.pitch;
        KtRepmDisposeMeta(&out);
    }
    EXPECT_EQ(set, &existing);
}

TEST(RepresentativeExtractTest, ExtremeAspectRatioIsNotMeasuredForBlur) {
    // 6000 x 10 gives a working copy of 13576 x 23.
    std::vector<uint8_t> rgb(6000 * 10 * 3, 90);
    const _KtMetaSimilarity siml = Palette({{{0, 50, 128, 128}, 100}}, 10, 10);
    _KtMetaRepresentative* meta = nullptr;
    ASSERT_EQ(KtRepmExtract(rgb.data(), 6000, 10, 18000, 0, &siml, &meta), KT_OK);
    EXPECT_EQ(meta->outOfFocus, -1.0f);
    EXPECT_EQ(meta->cameraShake, -1.0f);
    EXPECT_EQ(meta->mapWidth, 0u);
    EXPECT_EQ(meta->pBlurMap, nullptr);
    EXPECT_GE(meta->badExposure, 0.5f);  // (e^2 + 1) / 2
    EXPECT_EQ(meta->motionBlur, 0.0f);
    EXPECT_EQ(meta->colorVariation, 0.0f);
    KtRepmDisposeMeta(&meta);
}

// The serialised frame of a fixed photo, recorded once on x86-64.
TEST(RepresentativeExtractTest, FrameIsTheSameOnEveryTarget) {
    std::vector<uint8_t> rgb = QualityPhoto(800, 600);
    const _KtMetaSimilarity siml =
        Palette({{{0, 60, 140, 150}, 9000}, {{0, 30, 120, 100}, 6000}, {{0, 80, 128, 128}, 4200}}, 160, 120);
    _KtMetaRepresentative* meta = nullptr;
    ASSERT_EQ(KtRepmExtract(rgb.data(), 800, 600, 2400, 0, &siml, &meta), KT_OK);
    EXPECT_EQ(meta->mapWidth, 20u);
    EXPECT_EQ(meta->mapHeight, 15u);
    EXPECT_EQ(meta->analyzedWidth, 80u);
    EXPECT_EQ(meta->motionBlur, 0.0f);
    unsigned int size = 0;
    ASSERT_EQ(KtRepmGetSerializedSize(meta, &size), KT_OK);
    std::vector<uint8_t> frame(size);
    const _KtMetaVersion version = {2, 0};
    const _KtEngineVersion engine = {2, 5, 0x13121700u};
    ASSERT_EQ(KtRepmSerialize(&version, &engine, meta, frame.data(), size), KT_OK);
    EXPECT_EQ(Fnv(1469598103934665603ull, frame.data(), frame.size()), 0x20d8add1813477fdull)
        << std::hex << Fnv(1469598103934665603ull, frame.data(), frame.size());
    KtRepmDisposeMeta(&meta);
}

TEST(RepresentativeExtractTest, FailingAllocationsAreReported) {
    std::vector<uint8_t> rgb = QualityPhoto(160, 120);
    const _KtMetaSimilarity siml = Palette({{{0, 60, 140, 150}, 100}, {{0, 30, 120, 100}, 60}}, 16, 10);
    _KtMetaRepresentative* meta = nullptr;
    long total = 0;
    {
        lumicor::test::FaultScope count(0);
        ASSERT_EQ(KtRepmExtract(rgb.data(), 160, 120, 480, 0, &siml, &meta), KT_OK);
        total = count.Count();
    }
    KtRepmDisposeMeta(&meta);
    // Every run repeats the whole 640 x 480 analysis: the extraction's own
    // allocations come first and last, the stages' own tests cover every one
    // of theirs, so here the first and last 30 and every fifth between.
    for (long n = 1; n <= total; ++n) {
        if (n > 30 && n <= total - 30 && n % 5 != 0) continue;
        int status;
        {
            lumicor::test::FaultScope fault(n);
            status = KtRepmExtract(rgb.data(), 160, 120, 480, 0, &siml, &meta);
            ASSERT_TRUE(fault.Triggered()) << n;
        }
        EXPECT_EQ(status, KT_ERR_NO_MEMORY) << n;
        EXPECT_EQ(meta, nullptr) << n;
        KtRepmDisposeMeta(&meta);
    }
}

