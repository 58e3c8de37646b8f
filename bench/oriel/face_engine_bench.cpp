// Face engine timings on one core, on the networks' sample photos scaled to
// a 640-pixel-wide working photo (as the photo analysis hands it over):
//   detection as the analysis configures it (working pixel count 76800),
//   landmarks + expression + age of one face, recognition of one face,
//   and the whole face analysis (VondOrielAnalyze) of the photo.
// Skipped when the sample photos are absent.
#include <benchmark/benchmark.h>
#include <lumicor/orielplus.h>
#include <lumicor/vond.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "oriel/src/engine/face_engine.h"

namespace {

struct Photo {
    std::vector<uint8_t> rgb;
    int w = 0, h = 0;
};

bool ReadPpm(const std::string& path, Photo* p) {
    FILE* f = std::fopen(path.c_str(), "rb");
    if (!f) return false;
    char magic[3] = {0};
    int maxv = 0;
    bool ok = std::fscanf(f, "%2s %d %d %d", magic, &p->w, &p->h, &maxv) == 4 && std::strcmp(magic, "P6") == 0;
    if (ok) {
        std::fgetc(f);
        p->rgb.resize(static_cast<size_t>(p->w) * p->h * 3);
        ok = std::fread(p->rgb.data(), 1, p->rgb.size(), f) == p->rgb.size();
    }
    std::fclose(f);
    return ok;
}

// Box-filter reduction to 640 pixels wide.
Photo Working(const Photo& src) {
    Photo d;
    d.w = 640;
    d.h = src.h * 640 / src.w;
    d.rgb.resize(static_cast<size_t>(d.w) * d.h * 3);
    for (int y = 0; y < d.h; ++y)
        for (int x = 0; x < d.w; ++x) {
            const int x0 = x * src.w / d.w, x1 = (x + 1) * src.w / d.w;
            const int y0 = y * src.h / d.h, y1 = (y + 1) * src.h / d.h;
            for (int c = 0; c < 3; ++c) {
                unsigned sum = 0, n = 0;
                for (int yy = y0; yy < y1; ++yy)
                    for (int xx = x0; xx < x1; ++xx, ++n) sum += src.rgb[(static_cast<size_t>(yy) * src.w + xx) * 3 + c];
                d.rgb[(static_cast<size_t>(y) * d.w + x) * 3 + c] = static_cast<uint8_t>((sum + n / 2) / n);
            }
        }
    return d;
}

const Photo* Sample() {
    static Photo working;
    static bool tried = false;
    if (!tried) {
        tried = true;
        Photo full;
        if (ReadPpm(std::string(LUMICOR_FACE_SAMPLES_DIR) + "/sample1.ppm", &full)) working = Working(full);
    }
    return working.w ? &working : nullptr;
}

void ConfigureAsAnalysis(OrielHandle e, uint32_t mode) {
    Oriel_engineConfig c;
    OrielPlus_GetEngineConfig(&c, e);
    c.workPixels = 76800;
    c.minFacePercent = 2;
    c.localScales = 2;
    c.dictionaryMode = mode;
    c.flags = 0x107E01F1u;
    OrielPlus_SetEngineConfig(&c, e);
}

void BM_DetectFace(benchmark::State& state) {
    const Photo* p = Sample();
    if (!p) {
        state.SkipWithError("sample photos absent");
        return;
    }
    OrielHandle e = nullptr;
    OrielPlus_Initialize(&e);
    ConfigureAsAnalysis(e, static_cast<uint32_t>(state.range(0)));
    OrielPlus_CreateCacheBuffer(p->rgb.data(), p->w, p->h, ORIEL_COLOR_RGB, p->w * 3, e);
    Oriel_faceAreaArray faces = {0, nullptr};
    for (auto _ : state) {
        OrielPlus_DetectFace(p->rgb.data(), p->w, p->h, ORIEL_COLOR_RGB, p->w * 3, &faces, e);
        benchmark::DoNotOptimize(faces.count);
    }
    state.counters["faces"] = faces.count;
    OrielPlus_ReleaseArrayMadeByDetectFace(&faces, e);
    OrielPlus_Finalize(&e);
}
// 0: detection only; 8: the tiny detector; 7: as the analysis runs it.
BENCHMARK(BM_DetectFace)->Arg(0)->Arg(8)->Arg(7)->Unit(benchmark::kMillisecond);

struct EngineFixture {
    oriel::FaceEngine engine;
    oriel::nn::ImageView img;
    Oriel_areaInfo face;
    bool ok = false;
    EngineFixture() {
        const Photo* p = Sample();
        if (!p || !engine.Load()) return;
        img.p = p->rgb.data();
        img.w = p->w;
        img.h = p->h;
        img.stride = p->w * 3;
        Oriel_faceAreaArray faces = {0, nullptr};
        engine.Config().dictionaryMode = ORIEL_D_MODE_PARTS;
        if (!engine.Detect(img, nullptr, 0, &faces) || faces.count == 0) return;
        face = faces.pInfo[0];
        std::free(faces.pInfo);
        ok = true;
    }
};

EngineFixture* Fixture() {
    static EngineFixture* f = new EngineFixture();
    return f->ok ? f : nullptr;
}

void BM_LandmarksExpressionAge(benchmark::State& state) {
    EngineFixture* f = Fixture();
    if (!f) {
        state.SkipWithError("sample photos absent");
        return;
    }
    for (auto _ : state) {
        oriel::Landmarks lm;
        bool located = false;
        f->engine.LocateLandmarks(f->img, f->face, &lm, &located);
        float p[7], age, male;
        f->engine.Expressions(f->img, lm, p);
        f->engine.Age(f->img, lm, &age, &male);
        benchmark::DoNotOptimize(age);
    }
}
BENCHMARK(BM_LandmarksExpressionAge)->Unit(benchmark::kMillisecond);

void BM_Recognition(benchmark::State& state) {
    EngineFixture* f = Fixture();
    if (!f) {
        state.SkipWithError("sample photos absent");
        return;
    }
    for (auto _ : state) {
        float d[128];
        bool aligned;
        f->engine.Descriptor(f->img, f->face, d, &aligned);
        benchmark::DoNotOptimize(d[0]);
    }
}
BENCHMARK(BM_Recognition)->Unit(benchmark::kMillisecond);

}  // namespace

namespace {

void BM_VondOrielAnalyze(benchmark::State& state) {
    const Photo* p = Sample();
    if (!p) {
        state.SkipWithError("sample photos absent");
        return;
    }
    _zbm_Image img;
    img.pData = const_cast<uint8_t*>(p->rgb.data());
    img.width = p->w;
    img.height = p->h;
    img.pitch = p->w * 3;
    img.order = ZBM_PIXEL_ORDER_RGB;
    img.bytesPerPixel = 3;
    img.ownsData = 0;
    uint32_t faces = 0;
    for (auto _ : state) {
        _FaceMeta meta;
        std::memset(static_cast<void*>(&meta), 0, sizeof meta);
        Oriel_ClusterSubject subject = 0;
        _VondOrielMetaArray scores = {0, nullptr};
        VondOrielAnalyze(&img, 1920, 1280, -1, nullptr, 7, 0.0f, 76800, meta, subject, scores);
        faces = meta.regionCount;
        VondOrielDisposeMeta(meta, scores);
    }
    state.counters["faces"] = faces;
}
BENCHMARK(BM_VondOrielAnalyze)->Unit(benchmark::kMillisecond);

}  // namespace
