#include "common/src/internal/portable_math.h"

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>

namespace lmk {
namespace detail {

const double kExp2Table[64] = {
    0x1.0000000000000p+0, 0x1.02c9a3e778061p+0,
    0x1.059b0d3158574p+0, 0x1.0874518759bc8p+0,
    0x1.0b5586cf9890fp+0, 0x1.0e3ec32d3d1a2p+0,
    0x1.11301d0125b51p+0, 0x1.1429aaea92de0p+0,
    0x1.172b83c7d517bp+0, 0x1.1a35beb6fcb75p+0,
    0x1.1d4873168b9aap+0, 0x1.2063b88628cd6p+0,
    0x1.2387a6e756238p+0, 0x1.26b4565e27cddp+0,
    0x1.29e9df51fdee1p+0, 0x1.2d285a6e4030bp+0,
    0x1.306fe0a31b715p+0, 0x1.33c08b26416ffp+0,
    0x1.371a7373aa9cbp+0, 0x1.3a7db34e59ff7p+0,
    0x1.3dea64c123422p+0, 0x1.4160a21f72e2ap+0,
    0x1.44e086061892dp+0, 0x1.486a2b5c13cd0p+0,
    0x1.4bfdad5362a27p+0, 0x1.4f9b2769d2ca7p+0,
    0x1.5342b569d4f82p+0, 0x1.56f4736b527dap+0,
    0x1.5ab07dd485429p+0, 0x1.5e76f15ad2148p+0,
    0x1.6247eb03a5585p+0, 0x1.6623882552225p+0,
    0x1.6a09e667f3bcdp+0, 0x1.6dfb23c651a2fp+0,
    0x1.71f75e8ec5f74p+0, 0x1.75feb564267c9p+0,
    0x1.7a11473eb0187p+0, 0x1.7e2f336cf4e62p+0,
    0x1.82589994cce13p+0, 0x1.868d99b4492edp+0,
    0x1.8ace5422aa0dbp+0, 0x1.8f1ae99157736p+0,
    0x1.93737b0cdc5e5p+0, 0x1.97d829fde4e50p+0,
    0x1.9c49182a3f090p+0, 0x1.a0c667b5de565p+0,
    0x1.a5503b23e255dp+0, 0x1.a9e6b5579fdbfp+0,
    0x1.ae89f995ad3adp+0, 0x1.b33a2b84f15fbp+0,
    0x1.b7f76f2fb5e47p+0, 0x1.bcc1e904bc1d2p+0,
    0x1.c199bdd85529cp+0, 0x1.c67f12e57d14bp+0,
    0x1.cb720dcef9069p+0, 0x1.d072d4a07897cp+0,
    0x1.d5818dcfba487p+0, 0x1.da9e603db3285p+0,
    0x1.dfc97337b9b5fp+0, 0x1.e502ee78b3ff6p+0,
    0x1.ea4afa2a490dap+0, 0x1.efa1bee615a27p+0,
    0x1.f50765b6e4540p+0, 0x1.fa7c1819e90d8p+0,
};

}  // namespace detail

namespace {
const double kLn2HiN = 0x1.62e42fee00000p-7;  // ln 2 / 64, upper part (k * hi is exact)
const double kLn2LoN = 0x1.a39ef35793c76p-39; // ln 2 / 64 - kLn2HiN
const double kLn2Hi = 0x1.62e42fee00000p-1;   // ln 2, upper part (e * hi is exact)
const double kLn2Lo = 0x1.a39ef35793c76p-33;  // ln 2 - kLn2Hi
// 2 / (2k + 3) for k = 0..12.
const double kLogSeries[13] = {2.0 / 3,  2.0 / 5,  2.0 / 7,  2.0 / 9,  2.0 / 11, 2.0 / 13, 2.0 / 15,
                               2.0 / 17, 2.0 / 19, 2.0 / 21, 2.0 / 23, 2.0 / 25, 2.0 / 27};
}  // namespace

double Exp(double x) {
    if (x != x) return x;
    if (x > 709.782712893384) return std::numeric_limits<double>::infinity();
    if (x < -745.2) return 0.0;

    // x = (64 m + j) ln2/64 + r with |r| <= ln2/128.
    using detail::kExp2Table;
    using detail::Pow2;
    double kd = x * detail::kInvLn2N + detail::kRoundShift;
    uint64_t bits;
    std::memcpy(&bits, &kd, sizeof bits);
    const int32_t k = static_cast<int32_t>(static_cast<uint32_t>(bits));
    kd -= detail::kRoundShift;
    const double r = (x - kd * kLn2HiN) - kd * kLn2LoN;

    // Taylor polynomial to r^5: the remainder is below half an ulp for |r| <= ln2/128.
    const double p =
        1.0 + r * (1.0 + r * (0.5 + r * (1.0 / 6.0 + r * (1.0 / 24.0 + r * (1.0 / 120.0)))));

    const int32_t j = k & 63;
    const int32_t m = (k - j) / 64;
    const double y = kExp2Table[j] * p;
    if (m > 1023) return (y * Pow2(m - 1)) * 2.0;
    if (m >= -1022) return y * Pow2(m);
    // Subnormal result: scale in two steps so that no step leaves the normal range early.
    return (y * Pow2(m + 960)) * Pow2(-960);
}

namespace {

constexpr double kPi = 3.14159265358979323846;

// atan on [0, 1]: atan(k/8) from a table plus the series of the small rest
// (|u| <= 1/16 after the addition formula, so eleven terms reach double precision).
double Atan01(double t) {
    static const double kAtanEighths[9] = {0x0.0p+0,
                                           0x1.fd5ba9aac2f6ep-4,
                                           0x1.f5b75f92c80ddp-3,
                                           0x1.6f61941e4def1p-2,
                                           0x1.dac670561bb4fp-2,
                                           0x1.1e00babdefeb4p-1,
                                           0x1.4978fa3269ee1p-1,
                                           0x1.700a7c5784634p-1,
                                           0x1.921fb54442d18p-1};
    const int k = static_cast<int>(t * 8.0 + 0.5);
    const double c = k / 8.0;
    const double u = (t - c) / (1.0 + t * c);
    const double u2 = u * u;
    double sum = 0.0;
    for (int n = 21; n >= 3; n -= 2) sum = (sum + ((n / 2) % 2 ? -1.0 : 1.0) / n) * u2;
    return kAtanEighths[k] + u + u * sum;
}

}  // namespace

double Atan2(double y, double x) {
    if (x != x || y != y) return std::numeric_limits<double>::quiet_NaN();
    const double ay = std::fabs(y), ax = std::fabs(x);
    if (ay == 0.0 && ax == 0.0) return std::signbit(x) ? std::copysign(kPi, y) : y;
    double t;
    if (std::isinf(ay) && std::isinf(ax)) {
        t = kPi / 4;
    } else {
        t = ay <= ax ? Atan01(ay / ax) : kPi / 2 - Atan01(ax / ay);
    }
    if (std::signbit(x)) t = kPi - t;
    return std::copysign(t, y);
}

double Asin(double x) {
    if (!(x >= -1.0 && x <= 1.0)) return std::numeric_limits<double>::quiet_NaN();
    // sqrt is exactly rounded everywhere, so the whole path is portable.
    return Atan2(x, std::sqrt((1.0 - x) * (1.0 + x)));
}

double Log(double x) {
    if (x != x || x < 0.0) return std::numeric_limits<double>::quiet_NaN();
    if (x == 0.0) return -std::numeric_limits<double>::infinity();
    if (x == std::numeric_limits<double>::infinity()) return x;

    // x = 2^e * m with m in [sqrt(1/2), sqrt(2)).
    int32_t e = 0;
    if (x < 0x1p-1022) {
        x *= 0x1p54;
        e = -54;
    }
    uint64_t bits;
    std::memcpy(&bits, &x, sizeof bits);
    e += static_cast<int32_t>((bits >> 52) & 0x7FF) - 1023;
    bits = (bits & 0x000FFFFFFFFFFFFFull) | 0x3FF0000000000000ull;
    double m;
    std::memcpy(&m, &bits, sizeof m);
    if (m > 1.4142135623730951) {
        m *= 0.5;
        ++e;
    }

    // log(1 + f) = 2 atanh(s) with s = f / (2 + f), |s| <= 0.1716, written as
    // f - (f^2/2 - s (f^2/2 + R)) with R = sum 2 s^(2k) / (2k + 1): the series
    // to s^26 leaves a remainder far below half an ulp.
    const double f = m - 1.0;
    const double s = f / (2.0 + f);
    const double z = s * s;
    double p = kLogSeries[12];
    for (int k = 11; k >= 0; --k) p = kLogSeries[k] + z * p;
    const double r = z * p;
    const double hfsq = 0.5 * f * f;
    const double logm = f - (hfsq - s * (hfsq + r));
    const double ed = static_cast<double>(e);
    return (ed * kLn2Hi + logm) + ed * kLn2Lo;
}

}  // namespace lmk
