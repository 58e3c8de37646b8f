// Two similarity payloads taken from the input, each wrapped in a "SIML" frame
// and parsed, are passed to every distance and to the consumers of a parsed
// meta (colour labels, bad exposure). Any meta the parser accepts must give
// defined results: no crash, no undefined behaviour, results in range.
#include <lumicor/ktlib.h>
#include <lumicor/ktsimilarity.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "ktlib/src/representative/bad_exposure.h"

namespace {

const unsigned int kPayload = 660;
const unsigned int kFrame = 16 + kPayload;

// Frame header of a version-2.0 similarity meta followed by the payload bytes
// at `offset` of the input (zero-filled past its end).
_KtMetaSimilarity* Parse(const uint8_t* data, size_t size, size_t offset) {
    uint8_t frame[kFrame] = {'S', 'I', 'M', 'L', 0, 0, 0x02, 0x94, 2, 0, 1, 4, 0x13, 0x12, 0x17, 0x00};
    if (offset < size) {
        const size_t n = size - offset < kPayload ? size - offset : kPayload;
        std::memcpy(frame + 16, data + offset, n);
    }
    KtFrameHeader header;
    _KtMetaSimilarity* meta = nullptr;
    if (KtSimlParse(frame, kFrame, &header, &meta) != KT_OK) std::abort();
    return meta;
}

#define Check(cond)                                                        \
    do {                                                                   \
        if (!(cond)) {                                                     \
            std::fprintf(stderr, "siml_distances: check failed: %s\n", #cond); \
            std::abort();                                                  \
        }                                                                  \
    } while (0)

_matrix_s* Row(const uint32_t* values, int n) {
    _matrix_s* m = matrix_create(1, n);
    if (m)
        for (int i = 0; i < n; ++i) m->data[i] = static_cast<int32_t>(values[i]);
    return m;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    _KtMetaSimilarity* a = Parse(data, size, 0);
    _KtMetaSimilarity* b = Parse(data, size, kPayload);
    const int bins = size > 2 * kPayload ? static_cast<int8_t>(data[2 * kPayload]) : 8;

    _texture_s ta, tb;
    Check(KtSimlGetTexture(a, &ta) == KT_OK && KtSimlGetTexture(b, &tb) == KT_OK);
    const int t1 = texture_distance(&ta, &tb);
    Check(t1 >= -1);
    Check(texture_distance_rotatable(&ta, &tb) <= t1 || t1 < 0);
    int va[8], ha[8], vb[8], hb[8];
    for (int i = 0; i < 8; ++i) {
        va[i] = static_cast<int>(a->verHist[i]), ha[i] = static_cast<int>(a->horHist[i]);
        vb[i] = static_cast<int>(b->verHist[i]), hb[i] = static_cast<int>(b->horHist[i]);
    }
    const int t2 = texture_distance(a->width, a->height, bins, va, ha, b->width, b->height, bins, vb, hb);
    // A size of 0 is reported before a bin count above 8.
    Check(bins > 8 ? (t2 == -1 || t2 == KT_TEXTURE_DISTANCE_NONE) : t2 >= 0);

    edge_s ea, eb;
    Check(KtSimlGetEdge(a, &ea) == KT_OK && KtSimlGetEdge(b, &eb) == KT_OK);
    Check(edge_distance(&ea, &eb) <= 10000u);
    Metric metric(ea.value, eb.value);
    const double size1 = metric.calculateSizeCorrelation(), angle = metric.calculateAngleCorrelation();
    Check(size1 >= -1.0 && size1 <= 1.0 && angle >= -1.0 && angle <= 1.0);

    _matrix_s* ma = Row(a->verHist, 8);
    _matrix_s* mb = Row(b->horHist, 8);
    uint32_t countsA[32], countsB[32];
    for (int i = 0; i < 32; ++i) countsA[i] = a->colHist32[i].count, countsB[i] = b->colHist32[i].count;
    _matrix_s* pa = Row(countsA, 32);
    _matrix_s* pb = Row(countsB, 32);
    if (ma && mb) Check(matrix_emd(ma, mb) >= -1);
    if (pa && pb) Check(matrix_emd(pa, pb) >= -1);
    Check(matrix_emd(ma, pa) == -1);
    matrix_kill(ma), matrix_kill(mb), matrix_kill(pa), matrix_kill(pb);

    float d = -1.0f, palette = -1.0f;
    int dup = -1;
    Check(KtSimlDistance(a, b, &d) == KT_OK && d >= 0.0f && d <= 1.0f);
    Check(KtSimlPaletteDistance(a, b, &palette) == KT_OK && palette >= 0.0f);
    Check(KtSimlIsNearDuplicate(a, b, KT_SIML_NEAR_DUPLICATE_THRESHOLD, &dup) == KT_OK && (dup == 0 || dup == 1));

    _KtMetaColorLabel* labels = nullptr;
    Check(KtClblExtract(a, &labels) == KT_OK);
    Check(labels->white <= 100 && labels->black <= 100 && labels->red <= 100 && labels->yellow <= 100 &&
          labels->green <= 100 && labels->blue <= 100);
    KtClblDisposeMeta(&labels);
    _zbm_Image image = {};
    float exposure = -1.0f;
    Check(CalcBadExposure(&image, b, 0.5f, &exposure) == KT_OK && exposure >= 0.125f && exposure <= 0.625f);

    KtSimlDisposeMeta(&a);
    KtSimlDisposeMeta(&b);
    return 0;
}
