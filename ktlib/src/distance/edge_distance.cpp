// Edge-layout distance between two similarity signatures.
#include <lumicor/ktsimilarity.h>

#include <cmath>
#include <cstring>

namespace {

const int kScales = 3;
const int kRegions = 9;
const int kOrientations = 3;

struct Energies {
    double region[kScales][kRegions];  // sum over orientations
    double band[kScales];              // sum over regions
};

void Accumulate(const float* edge, Energies* e) {
    for (int s = 0; s < kScales; ++s) {
        e->band[s] = 0;
        for (int r = 0; r < kRegions; ++r) {
            double sum = 0;
            for (int o = 0; o < kOrientations; ++o) sum += static_cast<double>(edge[27 * s + 3 * r + o]);
            e->region[s][r] = sum;
            e->band[s] += sum;
        }
    }
}

// Share of a part in its whole, centred on the even share; a whole without
// energy (or not a finite positive number) contributes nothing.
double CentredShare(double part, double whole, double even) { return whole > 0 ? part / whole - even : 0.0; }

class Correlation {
public:
    Correlation() : pq_(0), pp_(0), qq_(0) {}
    void Add(double p, double q) {
        pq_ += p * q;
        pp_ += p * p;
        qq_ += q * q;
    }
    // In [-1, 1]; -1 when a side has no spread (or is not finite).
    double Value() const {
        if (!(pp_ > 0) || !(qq_ > 0)) return -1.0;
        const double c = pq_ / (std::sqrt(pp_) * std::sqrt(qq_));
        if (std::isnan(c)) return -1.0;
        return c > 1.0 ? 1.0 : (c < -1.0 ? -1.0 : c);
    }

private:
    double pq_, pp_, qq_;
};

}  // namespace

Metric::Metric(const float* edge1, const float* edge2) : edge1_(edge1), edge2_(edge2) {}
Metric::~Metric() {}

double Metric::calculateSizeCorrelation() {
    Energies e1, e2;
    if (!edge1_ || !edge2_) return -1.0;
    Accumulate(edge1_, &e1);
    Accumulate(edge2_, &e2);
    Correlation c;
    for (int s = 0; s < kScales; ++s)
        for (int r = 0; r < kRegions; ++r)
            c.Add(CentredShare(e1.region[s][r], e1.band[s], 1.0 / 9.0), CentredShare(e2.region[s][r], e2.band[s], 1.0 / 9.0));
    return c.Value();
}

double Metric::calculateAngleCorrelation() {
    Energies e1, e2;
    if (!edge1_ || !edge2_) return -1.0;
    Accumulate(edge1_, &e1);
    Accumulate(edge2_, &e2);
    Correlation c;
    for (int i = 0; i < kScales * kRegions * kOrientations; ++i) {
        const int s = i / 27, r = (i % 27) / 3;
        c.Add(CentredShare(edge1_[i], e1.region[s][r], 1.0 / 3.0), CentredShare(edge2_[i], e2.region[s][r], 1.0 / 3.0));
    }
    return c.Value();
}

extern "C" unsigned int edge_distance(const edge_s* e1, const edge_s* e2) {
    if (!e1 || !e2) return KT_EDGE_DISTANCE_MAX;
    Metric metric(e1->value, e2->value);
    const double size = metric.calculateSizeCorrelation();
    const double angle = metric.calculateAngleCorrelation();
    // Both correlations lie in [-1, 1], so the product lies in [0, 1].
    const double d = 10000.0 * std::sqrt(((1.0 - angle) / 2.0) * ((1.0 - size) / 2.0));
    return static_cast<unsigned int>(d);
}

extern "C" int KtSimlGetEdge(const _KtMetaSimilarity* m, edge_s* e) {
    if (!m || !e) return KT_ERR_NULL;
    std::memcpy(e->value, m->edge.value, sizeof(e->value));
    return KT_OK;
}
