// Ready-made look-alike distance between two similarity signatures.
#include <lumicor/ktsimilarity.h>

#include <cmath>
#include <cstdint>

namespace {

const int kPaletteSlots = 32;
// Palette distance (delta E) at which colours count as entirely different.
const double kPaletteScale = 40.0;
// Texture distance at which textures count as entirely different.
const double kTextureScale = 65536.0;
const double kPaletteWeight = 0.45;
const double kEdgeWeight = 0.35;
const double kTextureWeight = 0.20;
// Distance between a palette and an empty one.
const double kEmptyPalette = 100.0;

struct Palette {
    int n;
    double l[kPaletteSlots], a[kPaletteSlots], b[kPaletteSlots], w[kPaletteSlots];
    double total;
};

void Load(const _KtMetaSimilarity& m, Palette* p) {
    const int n = m.ncol32 > kPaletteSlots ? kPaletteSlots : static_cast<int>(m.ncol32);
    p->n = 0;
    p->total = 0;
    for (int i = 0; i < n; ++i) {
        const _KtMetaSimilarity::_ColHist entry = m.colHist32[i];
        if (entry.count == 0) continue;
        p->l[p->n] = entry.lab.l;
        p->a[p->n] = entry.lab.a - 128.0;
        p->b[p->n] = entry.lab.b - 128.0;
        p->w[p->n] = entry.count;
        p->total += entry.count;
        ++p->n;
    }
}

// Pixel-weighted mean distance from the colours of `from` to their nearest
// colour in `to` (both non-empty).
double Directed(const Palette& from, const Palette& to) {
    double sum = 0;
    for (int i = 0; i < from.n; ++i) {
        double best = 0;
        for (int j = 0; j < to.n; ++j) {
            const double dl = from.l[i] - to.l[j];
            const double da = from.a[i] - to.a[j];
            const double db = from.b[i] - to.b[j];
            const double d2 = dl * dl + da * da + db * db;
            if (j == 0 || d2 < best) best = d2;
        }
        sum += from.w[i] * std::sqrt(best);
    }
    return sum / from.total;
}

double PaletteDistance(const _KtMetaSimilarity& a, const _KtMetaSimilarity& b) {
    Palette pa, pb;
    Load(a, &pa);
    Load(b, &pb);
    if (pa.n == 0 || pb.n == 0) return pa.n == pb.n ? 0.0 : kEmptyPalette;
    return (Directed(pa, pb) + Directed(pb, pa)) / 2.0;
}

bool Flat(const _KtMetaSimilarity& m) {
    for (int i = 0; i < KT_EDGE_VALUES; ++i)
        if (m.edge.value[i] != 0.0f) return false;
    return true;
}

double Capped(double v) { return v < 1.0 ? v : 1.0; }

}  // namespace

extern "C" int KtSimlPaletteDistance(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float* distance) {
    if (!a || !b || !distance) return KT_ERR_NULL;
    *distance = static_cast<float>(PaletteDistance(*a, *b));
    return KT_OK;
}

extern "C" int KtSimlDistance(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float* distance) {
    if (!a || !b || !distance) return KT_ERR_NULL;
    const double palette = Capped(PaletteDistance(*a, *b) / kPaletteScale);

    // Two flat photos share their (empty) edge layout.
    double edge = 0.0;
    if (!(Flat(*a) && Flat(*b))) {
        edge_s ea, eb;
        KtSimlGetEdge(a, &ea);
        KtSimlGetEdge(b, &eb);
        edge = edge_distance(&ea, &eb) / 10000.0;
    }

    _texture_s ta, tb;
    KtSimlGetTexture(a, &ta);
    KtSimlGetTexture(b, &tb);
    const int t = texture_distance(&ta, &tb);
    const double texture = t < 0 ? 1.0 : Capped(t / kTextureScale);

    *distance = static_cast<float>(kPaletteWeight * palette + kEdgeWeight * edge + kTextureWeight * texture);
    return KT_OK;
}

extern "C" int KtSimlIsNearDuplicate(const _KtMetaSimilarity* a, const _KtMetaSimilarity* b, float threshold,
                                     int* isDuplicate) {
    if (!a || !b || !isDuplicate) return KT_ERR_NULL;
    float d = 0;
    KtSimlDistance(a, b, &d);
    *isDuplicate = d <= threshold ? 1 : 0;
    return KT_OK;
}
