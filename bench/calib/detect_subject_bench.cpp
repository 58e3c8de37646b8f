// CADetectSubject on a 4000 x 3000 photo: the saliency path (no faces) and
// the face path (three host faces), plus the saliency path on a photo that is
// already at the working size, which isolates the saliency computation from
// the two reductions of the full photo.
#include <benchmark/benchmark.h>

#include <lumicor/calib.h>

#include "calib/tests/attention_fixtures.h"

namespace {

void Run(benchmark::State& state, int width, int height, const _CAFaceInfoArray* faces) {
    const std::vector<uint8_t> photo = attention_test::MakePhoto(width, height);
    for (auto _ : state) {
        _CAAttentionAreaArray out = {0, 0, nullptr};
        const uint32_t status = CADetectSubject(photo.data(), width, height, width * 3, CA_COLOR_ORDER_RGB, faces, &out);
        if (status != 0) state.SkipWithError("CADetectSubject failed");
        benchmark::DoNotOptimize(out.pAreaArray);
        CADisposeAttentionAreaArray(&out);
    }
}

void BM_DetectSubject_Saliency_4000x3000(benchmark::State& state) { Run(state, 4000, 3000, nullptr); }
void BM_DetectSubject_Saliency_640x480(benchmark::State& state) { Run(state, 640, 480, nullptr); }
void BM_DetectSubject_Faces_4000x3000(benchmark::State& state) {
    CAFaceInfo info[3] = {{0.1f, 0.1f, 0.1f, 0.13f, 0, 0, 0},
                          {0.5f, 0.2f, 0.08f, 0.1f, 0.1f, 0.2f, 0.3f},
                          {0.7f, 0.6f, 0.12f, 0.16f, 0, -0.4f, 0}};
    _CAFaceInfoArray faces = {3, info};
    Run(state, 4000, 3000, &faces);
}

}  // namespace

BENCHMARK(BM_DetectSubject_Saliency_4000x3000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_DetectSubject_Saliency_640x480)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_DetectSubject_Faces_4000x3000)->Unit(benchmark::kMillisecond);
