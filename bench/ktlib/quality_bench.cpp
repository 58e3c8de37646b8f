// Cost of the representative meta on a 640 x 480 photo and of its parts.
#include <benchmark/benchmark.h>

#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

#include "ktlib/src/blur/blur.h"
#include "ktlib/src/finger/fol.h"
#include "testkit/images.h"

#include <cstring>

namespace {

// A textured photo with a soft skin-coloured blob entering from the left.
ZbmImagePtr Photo(int32_t w, int32_t h) {
    ZbmImagePtr img = lumicor::test::MakeNoiseImage(w, h, ZBM_PIXEL_ORDER_RGB, 3);
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            uint8_t* p = ZbiuGetPointer(img.get(), x, y);
            const float dy = (y - h * 0.5f) / (h * 0.22f), dx = x / (w * 0.45f);
            if (dy * dy + dx * dx < 1.0f) {
                p[0] = 220;
                p[1] = 150;
                p[2] = 115;
            } else {
                p[0] = static_cast<uint8_t>(40 + p[0] / 2);
            }
        }
    }
    return img;
}

void BM_CalcBlurScorer_640x480(benchmark::State& state) {
    ZbmImagePtr rgb = Photo(640, 480);
    ZbmImagePtr gray(ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_GRAY));
    ZbiuConvertColorSpace(rgb.get(), gray.get());
    for (auto _ : state) {
        _zbm_Image* map = nullptr;
        blur::BlurScores scores;
        if (blur::CalcBlurScorer(gray.get(), &map, &scores) != KT_OK) state.SkipWithError("scorer failed");
        ZbiuDispose(&map);
        benchmark::DoNotOptimize(scores);
    }
}
BENCHMARK(BM_CalcBlurScorer_640x480)->Unit(benchmark::kMillisecond);

void BM_CalcFingerScore_80x60(benchmark::State& state) {
    ZbmImagePtr rgb = Photo(80, 60);
    for (auto _ : state) {
        zbmvector<FOL::Finger> fingers;
        float score = 0.0f;
        if (FOL::CalcFingerScore(rgb.get(), fingers, score) != KT_OK) state.SkipWithError("detection failed");
        fingers.Clear();
        benchmark::DoNotOptimize(score);
    }
}
BENCHMARK(BM_CalcFingerScore_80x60)->Unit(benchmark::kMillisecond);

void BM_KtRepmExtract_640x480(benchmark::State& state) {
    ZbmImagePtr rgb = Photo(640, 480);
    _KtMetaSimilarity siml;
    std::memset(&siml, 0, sizeof siml);
    siml.width = 160;
    siml.height = 120;
    siml.ncol32 = 32;
    for (uint32_t i = 0; i < 32; ++i) {
        siml.colHist32[i].lab = {0, static_cast<uint8_t>(3 * i), static_cast<uint8_t>(100 + 2 * i),
                                 static_cast<uint8_t>(160 - i)};
        siml.colHist32[i].count = 600;
    }
    for (auto _ : state) {
        _KtMetaRepresentative* meta = nullptr;
        if (KtRepmExtract(rgb->pData, 640, 480, 640 * 3, 0, &siml, &meta) != KT_OK)
            state.SkipWithError("extraction failed");
        KtRepmDisposeMeta(&meta);
    }
}
BENCHMARK(BM_KtRepmExtract_640x480)->Unit(benchmark::kMillisecond);

}  // namespace
