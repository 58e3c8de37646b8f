// Elementary functions that give the same bits on every target.
//
// The C library's exp may take a fused multiply-add path on one CPU and not on
// another, so a result that is rounded to float can differ in its last bit
// between a phone and a desktop. These versions use only IEEE basic operations
// (with contraction off), so every target computes exactly the same value.
#ifndef LUMICOR_COMMON_INTERNAL_PORTABLE_MATH_H
#define LUMICOR_COMMON_INTERNAL_PORTABLE_MATH_H

namespace lmk {

// e^x within about 1 ulp; NaN for NaN, +inf above the double range, 0 below it.
double Exp(double x);

// e^x rounded to float from the double result above.
float ExpF(float x);

}  // namespace lmk

#endif
