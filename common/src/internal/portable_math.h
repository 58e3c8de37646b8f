// Elementary functions that give the same bits on every target.
//
// The C library's exp may take a fused multiply-add path on one CPU and not on
// another, so a result that is rounded to float can differ in its last bit
// between a phone and a desktop. These versions use only IEEE basic operations
// (with contraction off), so every target computes exactly the same value.
#ifndef LUMICOR_COMMON_INTERNAL_PORTABLE_MATH_H
#define LUMICOR_COMMON_INTERNAL_PORTABLE_MATH_H

#include <cstdint>
#include <cstring>
#include <limits>

namespace lmk {

namespace detail {
// 2^(j/64) for j = 0..63, each the double nearest to the exact value.
extern const double kExp2Table[64];
constexpr double kInvLn2N = 0x1.71547652b82fep+6;  // 64 / ln 2
constexpr double kLn2N = 0x1.62e42fefa39efp-7;     // ln 2 / 64
constexpr double kRoundShift = 0x1.8p52;           // adding it rounds to an integer

// 2^e for -1022 <= e <= 1023.
inline double Pow2(int32_t e) {
    const uint64_t bits = static_cast<uint64_t>(e + 1023) << 52;
    double d;
    std::memcpy(&d, &bits, sizeof d);
    return d;
}
}  // namespace detail

// e^x within about 1 ulp; NaN for NaN, +inf above the double range, 0 below it.
double Exp(double x);

// Natural logarithm within about 1 ulp; NaN for NaN and negative x, -inf
// for 0, +inf for +inf. Subnormal arguments are scaled into the normal range.
double Log(double x);

// atan2(y, x) in radians within about 2 ulps, with the C library's signs
// for zeros and infinities; NaN when either argument is NaN.
double Atan2(double y, double x);

// asin(x) in radians within about 2 ulps; NaN outside [-1, 1] and for NaN.
double Asin(double x);

// e^x for float arguments, evaluated in double with a relative error below
// 4e-11 before the one rounding to float; NaN for NaN, +inf and 0 beyond the
// float range. Inline: it sits in the innermost loops of the framing search.
inline float ExpF(float x) {
    if (x != x) return x;
    if (x > 89.0f) return std::numeric_limits<float>::infinity();
    if (x < -104.0f) return 0.0f;
    const double xd = static_cast<double>(x);
    // x = (64 m + j) ln2/64 + r with |r| <= ln2/128.
    double kd = xd * detail::kInvLn2N + detail::kRoundShift;
    uint64_t bits;
    std::memcpy(&bits, &kd, sizeof bits);
    const int32_t k = static_cast<int32_t>(static_cast<uint32_t>(bits));
    kd -= detail::kRoundShift;
    const double r = xd - kd * detail::kLn2N;
    // Taylor polynomial to r^3: the remainder is below r^4 / 24 < 4e-11.
    const double p = 1.0 + r * (1.0 + r * (0.5 + r * (1.0 / 6.0)));
    const int32_t j = k & 63;
    const int32_t m = (k - j) / 64;
    return static_cast<float>(detail::kExp2Table[j] * p * detail::Pow2(m));
}

}  // namespace lmk

#endif
