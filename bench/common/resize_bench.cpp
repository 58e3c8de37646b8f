// Resize and colour-conversion throughput on camera-sized inputs.
#include <benchmark/benchmark.h>

#include <lumicor/zbm_image.h>

#include "testkit/images.h"

namespace {

void BM_Resize_RGB_4000x3000_to_640x480(benchmark::State& state) {
    ZbmImagePtr src = lumicor::test::MakeNoiseImage(4000, 3000, ZBM_PIXEL_ORDER_RGB);
    ZbmImagePtr dst(ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_RGB));
    if (!src || !dst) {
        state.SkipWithError("image creation failed");
        return;
    }
    for (auto _ : state) {
        if (ZbiuResize(src.get(), dst.get()) != ZBIU_OK) state.SkipWithError("resize failed");
        benchmark::DoNotOptimize(dst->pData);
    }
    state.SetItemsProcessed(state.iterations() * 4000LL * 3000LL);
}
BENCHMARK(BM_Resize_RGB_4000x3000_to_640x480)->Unit(benchmark::kMillisecond);

void BM_ConvertColorSpace_RGBA_to_RGB_4000x3000(benchmark::State& state) {
    ZbmImagePtr src = lumicor::test::MakeNoiseImage(4000, 3000, ZBM_PIXEL_ORDER_RGBA);
    ZbmImagePtr dst(ZbiuCreate(4000, 3000, ZBM_PIXEL_ORDER_RGB));
    if (!src || !dst) {
        state.SkipWithError("image creation failed");
        return;
    }
    for (auto _ : state) {
        if (ZbiuConvertColorSpace(src.get(), dst.get()) != ZBIU_OK) state.SkipWithError("conversion failed");
        benchmark::DoNotOptimize(dst->pData);
    }
    state.SetItemsProcessed(state.iterations() * 4000LL * 3000LL);
}
BENCHMARK(BM_ConvertColorSpace_RGBA_to_RGB_4000x3000)->Unit(benchmark::kMillisecond);

}  // namespace
