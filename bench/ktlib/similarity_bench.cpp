// Similarity signature extraction on a 160 x 120 photo (the size the
// analysis passes) and every distance between two signatures.
#include <benchmark/benchmark.h>
#include <lumicor/ktlib.h>
#include <lumicor/ktsimilarity.h>

#include <vector>

#include "ktlib/tests/synthetic_photo.h"

namespace {

_KtMetaSimilarity Meta(uint32_t seed, int w, int h) {
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(w, h, seed);
    _KtMetaSimilarity* m = nullptr;
    KtSimlExtract(rgb.data(), w, h, w * 3, 0, &m);
    _KtMetaSimilarity copy = *m;
    KtSimlDisposeMeta(&m);
    return copy;
}

struct Pair {
    _KtMetaSimilarity a = Meta(1, 160, 120);
    _KtMetaSimilarity b = Meta(9, 120, 160);
};
const Pair& Metas() {
    static const Pair pair;
    return pair;
}

void BM_KtSimlExtract_160x120(benchmark::State& state) {
    const std::vector<uint8_t> rgb = lumicor::test::SyntheticPhoto(160, 120);
    for (auto _ : state) {
        _KtMetaSimilarity* m = nullptr;
        benchmark::DoNotOptimize(KtSimlExtract(rgb.data(), 160, 120, 480, 0, &m));
        KtSimlDisposeMeta(&m);
    }
}
BENCHMARK(BM_KtSimlExtract_160x120)->Unit(benchmark::kMicrosecond);

void BM_texture_distance(benchmark::State& state) {
    _texture_s a, b;
    KtSimlGetTexture(&Metas().a, &a);
    KtSimlGetTexture(&Metas().b, &b);
    for (auto _ : state) benchmark::DoNotOptimize(texture_distance(&a, &b));
}
BENCHMARK(BM_texture_distance);

void BM_texture_distance_rotatable(benchmark::State& state) {
    _texture_s a, b;
    KtSimlGetTexture(&Metas().a, &a);
    KtSimlGetTexture(&Metas().b, &b);
    for (auto _ : state) benchmark::DoNotOptimize(texture_distance_rotatable(&a, &b));
}
BENCHMARK(BM_texture_distance_rotatable);

void BM_edge_distance(benchmark::State& state) {
    edge_s a, b;
    KtSimlGetEdge(&Metas().a, &a);
    KtSimlGetEdge(&Metas().b, &b);
    for (auto _ : state) benchmark::DoNotOptimize(edge_distance(&a, &b));
}
BENCHMARK(BM_edge_distance);

void BM_matrix_emd_8(benchmark::State& state) {
    _matrix_s* a = matrix_create(1, 8);
    _matrix_s* b = matrix_create(1, 8);
    for (int i = 0; i < 8; ++i) a->data[i] = static_cast<int>(Metas().a.verHist[i]), b->data[i] = static_cast<int>(Metas().b.verHist[i]);
    for (auto _ : state) benchmark::DoNotOptimize(matrix_emd(a, b));
    matrix_kill(a);
    matrix_kill(b);
}
BENCHMARK(BM_matrix_emd_8);

void BM_KtSimlPaletteDistance(benchmark::State& state) {
    float d;
    for (auto _ : state) benchmark::DoNotOptimize(KtSimlPaletteDistance(&Metas().a, &Metas().b, &d));
}
BENCHMARK(BM_KtSimlPaletteDistance);

void BM_KtSimlDistance(benchmark::State& state) {
    float d;
    for (auto _ : state) benchmark::DoNotOptimize(KtSimlDistance(&Metas().a, &Metas().b, &d));
}
BENCHMARK(BM_KtSimlDistance);

void BM_KtClblExtract(benchmark::State& state) {
    for (auto _ : state) {
        _KtMetaColorLabel* labels = nullptr;
        benchmark::DoNotOptimize(KtClblExtract(&Metas().a, &labels));
        KtClblDisposeMeta(&labels);
    }
}
BENCHMARK(BM_KtClblExtract);

}  // namespace
