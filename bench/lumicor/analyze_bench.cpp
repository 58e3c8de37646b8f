// The whole analysis of a 12-megapixel photo through the exported interface,
// with and without face detection, the framing of its blob, and each stage
// of the analysis on its own (conversion to the working image, faces,
// quality and similarity, attention areas), so that the figures break down
// by engine. Photos: the face networks' sample photo with three faces,
// enlarged to 4000 x 2667; benchmarks needing it are skipped without it.
#include "oriel/tests/sample_photos.h"

#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

constexpr int kWidth = 4000, kHeight = 2667;  // about 12 megapixels

// The sample photo with three faces at 12 megapixels (RGB, packed rows), or
// empty when the sample photos are not available.
const std::vector<uint8_t>& TwelveMegapixels() {
    static const std::vector<uint8_t> pixels = [] {
        std::vector<uint8_t> out;
        const oriel_test::Photo sample = oriel_test::Sample(1);
        if (sample.Empty()) return out;
        _zbm_Image* src = ZbiuCreateAttatchData(const_cast<uint8_t*>(sample.rgb.data()), sample.w, sample.h,
                                                sample.w * 3, ZBM_PIXEL_ORDER_RGB);
        _zbm_Image* dst = ZbiuCreate(kWidth, kHeight, ZBM_PIXEL_ORDER_RGB);
        if (src && dst && ZbiuResize(src, dst) == 0) out.assign(dst->pData, dst->pData + dst->pitch * kHeight);
        ZbiuDispose(&src);
        ZbiuDispose(&dst);
        return out;
    }();
    return pixels;
}

// The library, started once with a configuration that logs nothing.
bool StartLibrary() {
    static const bool started = [] {
        const char* path = "/tmp/lumicor_bench_lmc.conf";
        std::FILE* f = std::fopen(path, "w");
        if (!f) return false;
        std::fputs("{Lumicor}\n", f);
        std::fclose(f);
        return LmcInitializeLumicor(path) == LMC_STATUS_OK;
    }();
    return started;
}

void AnalyzePhoto(benchmark::State& state, int32_t faces) {
    const std::vector<uint8_t>& rgb = TwelveMegapixels();
    if (rgb.empty() || !StartLibrary()) {
        state.SkipWithError("sample photos not available");
        return;
    }
    const LmcImage image = {rgb.data(), nullptr, kWidth, kHeight, kWidth * 3, LMC_PIXEL_ORDER_RGB};
    uint32_t faceCount = 0;
    for (auto _ : state) {
        LmcPhotoMeta meta = {0, nullptr};
        if (LmcAnalyzePhoto(&image, faces, nullptr, &meta) != LMC_STATUS_OK) {
            state.SkipWithError("analysis failed");
            return;
        }
        state.PauseTiming();
        _VondMeta parsed;
        if (VondParseMeta(meta.nBufferSize, meta.pMeta, &parsed).status == VOND_STATUS_OK)
            faceCount = parsed.faceMeta.regionCount;
        VondDisposeMeta(&parsed);
        LmcDisposePhotoMeta(&meta);
        state.ResumeTiming();
    }
    state.counters["faces"] = faceCount;
}

void BM_AnalyzePhotoWithoutFaces(benchmark::State& state) { AnalyzePhoto(state, 0); }
void BM_AnalyzePhotoWithFaces(benchmark::State& state) { AnalyzePhoto(state, -1); }

void BM_SearchFraming(benchmark::State& state) {
    const std::vector<uint8_t>& rgb = TwelveMegapixels();
    if (rgb.empty() || !StartLibrary()) {
        state.SkipWithError("sample photos not available");
        return;
    }
    const LmcImage image = {rgb.data(), nullptr, kWidth, kHeight, kWidth * 3, LMC_PIXEL_ORDER_RGB};
    LmcPhotoMeta meta = {0, nullptr};
    if (LmcAnalyzePhoto(&image, -1, nullptr, &meta) != LMC_STATUS_OK) {
        state.SkipWithError("analysis failed");
        return;
    }
    const LmcFramingParam param = {4, 9.0f / 16.0f, 10.0f};
    for (auto _ : state) {
        LmcRect crop;
        benchmark::DoNotOptimize(LmcSearchFraming(&meta, &param, &crop));
    }
    LmcDisposePhotoMeta(&meta);
}

// ---- the stages on their own ----

// The working image of the 12-megapixel photo (what the driver makes).
_zbm_Image* WorkingImage() {
    static _zbm_Image* working = [] {
        const std::vector<uint8_t>& rgb = TwelveMegapixels();
        if (rgb.empty()) return static_cast<_zbm_Image*>(nullptr);
        _zbm_Image* src =
            ZbiuCreateAttatchData(const_cast<uint8_t*>(rgb.data()), kWidth, kHeight, kWidth * 3, ZBM_PIXEL_ORDER_RGB);
        _zbm_Image* dst = ZbiuCreate(678, 452, ZBM_PIXEL_ORDER_RGB);
        if (!src || !dst || ZbiuResize(src, dst) != 0) ZbiuDispose(&dst);
        ZbiuDispose(&src);
        return dst;
    }();
    return working;
}

void BM_StageWorkingImage(benchmark::State& state) {
    const std::vector<uint8_t>& rgb = TwelveMegapixels();
    if (rgb.empty()) {
        state.SkipWithError("sample photos not available");
        return;
    }
    _zbm_Image* src =
        ZbiuCreateAttatchData(const_cast<uint8_t*>(rgb.data()), kWidth, kHeight, kWidth * 3, ZBM_PIXEL_ORDER_RGB);
    _zbm_Image* dst = ZbiuCreate(678, 452, ZBM_PIXEL_ORDER_RGB);
    for (auto _ : state) benchmark::DoNotOptimize(ZbiuResize(src, dst));
    ZbiuDispose(&src);
    ZbiuDispose(&dst);
}

void BM_StageFaces(benchmark::State& state) {
    _zbm_Image* working = WorkingImage();
    if (!working) {
        state.SkipWithError("sample photos not available");
        return;
    }
    for (auto _ : state) {
        _VondMeta meta;
        std::memset(&meta, 0, sizeof meta);
        const _VondResult r = VondOrielAnalyze(working, kWidth, kHeight, -1, nullptr, 7, 1.0f, 76800, meta.faceMeta,
                                               meta.clusterSubject, meta.faceMetaArray);
        if (r.status != VOND_STATUS_OK) state.SkipWithError("face analysis failed");
        VondDisposeMeta(&meta);
    }
}

void BM_StageQuality(benchmark::State& state) {
    _zbm_Image* working = WorkingImage();
    if (!working) {
        state.SkipWithError("sample photos not available");
        return;
    }
    for (auto _ : state) {
        _VondMeta m;
        std::memset(&m, 0, sizeof m);
        const _VondResult r = VondKtLibAnalyze(working, m.simlEngineVersion, m.simlMetaVersion, m.similarity,
                                               m.repmEngineVersion, m.repmMetaVersion, m.representative,
                                               m.clblEngineVersion, m.clblMetaVersion, m.colorLabel);
        if (r.status != VOND_STATUS_OK) state.SkipWithError("quality analysis failed");
        VondDisposeMeta(&m);
    }
}

// With faces the attention areas are the faces; without, the saliency map.
void BM_StageAttention(benchmark::State& state) {
    _zbm_Image* working = WorkingImage();
    if (!working) {
        state.SkipWithError("sample photos not available");
        return;
    }
    _VondMeta faces;
    std::memset(&faces, 0, sizeof faces);
    if (state.range(0) != 0)
        VondOrielAnalyze(working, kWidth, kHeight, -1, nullptr, 7, 1.0f, 76800, faces.faceMeta, faces.clusterSubject,
                         faces.faceMetaArray);
    for (auto _ : state) {
        _CAAttentionAreaArray areas;
        _CALibVersion version;
        const _VondResult r = VondCALibAnalyze(working, faces.faceMeta, areas, version);
        if (r.status != VOND_STATUS_OK) state.SkipWithError("attention analysis failed");
        VondCALibDisposeMeta(areas);
    }
    VondDisposeMeta(&faces);
}

void BM_StageSerialize(benchmark::State& state) {
    const std::vector<uint8_t>& rgb = TwelveMegapixels();
    if (rgb.empty()) {
        state.SkipWithError("sample photos not available");
        return;
    }
    _zbm_Image host;
    std::memset(&host, 0, sizeof host);
    host.pData = const_cast<uint8_t*>(rgb.data());
    host.width = kWidth;
    host.height = kHeight;
    host.pitch = kWidth * 3;
    host.order = static_cast<_zbm_PixelOrder>(LMC_PIXEL_ORDER_RGB);
    _VondMeta meta;
    const _VondConfig config = {7, 1.0f, 76800};
    if (VondAnalyze(&host, -1, nullptr, &config, &meta).status != VOND_STATUS_OK) {
        state.SkipWithError("analysis failed");
        return;
    }
    std::vector<uint8_t> blob;
    for (auto _ : state) {
        uint32_t size = 0;
        VondGetSerializedSize(&meta, &size);
        blob.resize(size);
        benchmark::DoNotOptimize(VondSerializeMeta(&meta, size, blob.data()));
    }
    VondDisposeMeta(&meta);
}

}  // namespace

BENCHMARK(BM_AnalyzePhotoWithoutFaces)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_AnalyzePhotoWithFaces)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_SearchFraming)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_StageWorkingImage)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_StageFaces)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_StageQuality)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_StageAttention)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_StageSerialize)->Unit(benchmark::kMicrosecond);
