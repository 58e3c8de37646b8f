// CASearchFraming with 1, 4 and 16 attention areas on a 4000 x 3000 photo.
// Goal: well under 200 us per call on one core.
#include <benchmark/benchmark.h>

#include <vector>

#include <lumicor/calib.h>

namespace {

std::vector<CAAttentionArea> Areas(int n) {
    std::vector<CAAttentionArea> areas(static_cast<size_t>(n));
    for (int i = 0; i < n; ++i) {
        CAAttentionArea& a = areas[static_cast<size_t>(i)];
        a.nx = 0.05f + 0.055f * static_cast<float>(i % 8) + 0.01f * static_cast<float>(i / 8);
        a.ny = 0.1f + 0.04f * static_cast<float>(i) ;
        a.nw = 0.08f + 0.01f * static_cast<float>(i % 5);
        a.nh = 0.1f + 0.012f * static_cast<float>(i % 3);
        a.val.direction = 255 - 9 * i;
    }
    return areas;
}

void BM_SearchFraming(benchmark::State& state) {
    std::vector<CAAttentionArea> records = Areas(static_cast<int>(state.range(0)));
    _CAAttentionAreaArray array = {0, static_cast<uint32_t>(records.size()), records.data()};
    _CAParam param;
    CAGetDefaultParam(&param);
    param.composition_mode = static_cast<int32_t>(state.range(1));
    param.aspect_ratio = 0.75f;
    _CAResult result;
    for (auto _ : state) {
        const uint32_t code = CASearchFraming(4000, 3000, &param, &array, &result);
        benchmark::DoNotOptimize(code);
        benchmark::DoNotOptimize(result);
    }
}

// Arguments: number of areas, composition mode (4 weighs every area, 0 the main one).
BENCHMARK(BM_SearchFraming)
    ->Args({1, 4})
    ->Args({4, 4})
    ->Args({16, 4})
    ->Args({16, 0})
    ->Unit(benchmark::kMicrosecond);

}  // namespace
