// Integer square root, used by the texture features.
#include <lumicor/zbm_image.h>

#include <cmath>

// floor(sqrt(n)) for every 32-bit n. IEEE-754 square root is correctly
// rounded on every target, and a double holds n exactly; since
// sqrt(k*k - 1) lies at least 1/(2k) > 2^-17 below k, the rounded root never
// reaches the next integer, so truncation gives the exact integer root. This
// is several times faster than the digit-by-digit method in the texture loop.
uint32_t isqrt(uint32_t n) { return static_cast<uint32_t>(std::sqrt(static_cast<double>(n))); }

uint32_t isqrt1(uint32_t n) { return isqrt(n); }
uint32_t isqrt2(uint32_t n) { return isqrt(n); }
uint32_t isqrt3(uint32_t n) { return isqrt(n); }
uint32_t isqrt4(uint32_t n) { return isqrt(n); }
uint32_t isqrt5(uint32_t n) { return isqrt(n); }
uint32_t isqrt7(uint32_t n) { return isqrt(n); }
