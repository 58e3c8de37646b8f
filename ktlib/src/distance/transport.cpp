#include "ktlib/src/distance/transport.h"

#include <cstdint>

#include "common/src/internal/memory.h"

namespace transport {
namespace {

const int kMaxTextureBins = 8;

// Checks that every bin is non-negative and the sum stays within `limit`.
bool Sum(const int32_t* m, int n, int64_t limit, int64_t* sum) {
    int64_t s = 0;
    for (int i = 0; i < n; ++i) {
        if (m[i] < 0) return false;
        s += m[i];
        if (s > limit) return false;
    }
    *sum = s;
    return true;
}

void MoveTo(int32_t* m1, int32_t* m2, int i, int j, int k, int64_t* remaining, int64_t* cost) {
    const int32_t f = m1[i] < m2[j] ? m1[i] : m2[j];
    m1[i] -= f;
    m2[j] -= f;
    *remaining -= f;
    *cost += static_cast<int64_t>(f) * k;
}

// Moves mass at growing distances; `stop` decides after each distance
// whether the mass left is only the equalisation error.
template <typename Stop>
int64_t Run(int32_t* m1, int32_t* m2, int n, int64_t remaining, Stop stop) {
    int64_t cost = 0;
    for (int d = 0; d < n; ++d) {
        for (int i = 0; i < n; ++i) {
            for (int k = 0; k <= d; ++k) {
                if (i - k >= 0) MoveTo(m1, m2, i, i - k, k, &remaining, &cost);
                if (i + k < n) MoveTo(m1, m2, i, i + k, k, &remaining, &cost);
            }
        }
        if (stop(remaining)) break;
    }
    return cost;
}

int64_t Abs(int64_t v) { return v < 0 ? -v : v; }

}  // namespace

Result TextureCost(const int32_t* in1, const int32_t* in2, int n, int32_t* cost) {
    if (n < 0 || n > kMaxTextureBins) return kInvalid;
    int64_t s1, s2;
    if (!Sum(in1, n, int64_t(1) << 24, &s1) || !Sum(in2, n, int64_t(1) << 24, &s2)) return kInvalid;
    if (s1 == 0 && s2 == 0) {
        *cost = 0;
        return kOk;
    }
    if (s1 == 0 || s2 == 0) return kIncomparable;

    // With sums up to 2^24 every scaled bin stays below 2^28 and the cost
    // below 7 x 2^28: the 32-bit arithmetic of the stored results holds.
    int32_t m1[kMaxTextureBins];
    int32_t m2[kMaxTextureBins];
    int32_t f1 = 16, f2 = 16;
    if (s2 > s1)
        f1 = static_cast<int32_t>(16 * s2 / s1);
    else
        f2 = static_cast<int32_t>(16 * s1 / s2);
    int64_t t1 = 0, t2 = 0;
    for (int i = 0; i < n; ++i) {
        m1[i] = in1[i] * f1;
        m2[i] = in2[i] * f2;
        t1 += m1[i];
        t2 += m2[i];
    }
    const int64_t tolerance = Abs(t1 - t2);
    *cost = static_cast<int32_t>(Run(m1, m2, n, t1, [tolerance](int64_t remaining) { return tolerance >= remaining; }));
    return kOk;
}

Result EmdCost(const int32_t* in1, const int32_t* in2, int n, int32_t* cost) {
    if (n <= 0) return kInvalid;
    const int64_t limit = 8388607;
    int64_t s1, s2;
    if (!Sum(in1, n, limit, &s1) || !Sum(in2, n, limit, &s2)) return kInvalid;
    if (s1 == 0 && s2 == 0) {
        *cost = 0;
        return kOk;
    }
    if (s1 == 0 || s2 == 0) return kIncomparable;

    lmk::UniqueArray<int32_t> m1 = lmk::NewArray<int32_t>(static_cast<size_t>(n));
    lmk::UniqueArray<int32_t> m2 = lmk::NewArray<int32_t>(static_cast<size_t>(n));
    if (!m1 || !m2) return kInvalid;
    for (int i = 0; i < n; ++i) {
        m1[i] = in1[i];
        m2[i] = in2[i];
    }
    // Scale the lighter side up to the heavier one (8-bit fixed point); with
    // sums below 2^23 the products stay below 2^31.
    int32_t* light = s1 < s2 ? m1.get() : m2.get();
    const int64_t factor = s1 < s2 ? 256 * s2 / s1 : 256 * s1 / s2;
    if (s1 != s2)
        for (int i = 0; i < n; ++i) light[i] = static_cast<int32_t>(light[i] * factor / 256);
    int64_t t1 = 0, t2 = 0;
    for (int i = 0; i < n; ++i) {
        t1 += m1[i];
        t2 += m2[i];
    }
    const int64_t tolerance = Abs(t1 - t2);
    const int64_t c = Run(m1.get(), m2.get(), n, t1, [tolerance](int64_t remaining) { return tolerance > remaining; });
    *cost = c > 0x7fffffff ? 0x7fffffff : static_cast<int32_t>(c);
    return kOk;
}

}  // namespace transport
