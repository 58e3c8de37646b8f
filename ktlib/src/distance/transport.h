// One-dimensional transport (Earth Mover's) cost between two histograms of
// equal length, the core of texture_distance and matrix_emd. Mass moves from
// a bin of the first histogram to bins of the second at growing distances d
// = 0, 1, ...; moving f units over k bins costs f x k.
#ifndef LUMICOR_KTLIB_TRANSPORT_H
#define LUMICOR_KTLIB_TRANSPORT_H

#include <cstdint>

namespace transport {

enum Result { kOk, kIncomparable, kInvalid };

// Texture form: masses equalised in 4-bit fixed point (the lighter side's
// bins times 16 x heavier / lighter, the heavier side's times 16); stops once
// the mass left is within the equalisation error. n is 0..8. kInvalid for a
// negative bin or a sum above 2^24, kIncomparable when exactly one histogram
// is empty; two empty histograms cost 0.
Result TextureCost(const int32_t* m1, const int32_t* m2, int n, int32_t* cost);

// matrix_emd form: only the lighter histogram is scaled, by (256 x heavier /
// lighter) / 256 per bin; stops once the mass left is below the equalisation
// error. n is any positive length. kInvalid for a negative bin or a sum above
// 2^23 - 1, kIncomparable when exactly one histogram is empty. The cost
// saturates at 2^31 - 1.
Result EmdCost(const int32_t* m1, const int32_t* m2, int n, int32_t* cost);

}  // namespace transport

#endif
