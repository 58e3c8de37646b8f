// Integer square root, used by the texture features where a float root
// could differ between platforms.
#include <lumicor/zbm_image.h>

// Digit-by-digit method in base 4: each round decides one bit of the root.
uint32_t isqrt(uint32_t n) {
    uint32_t root = 0;
    uint32_t bit = 1u << 30;  // highest power of four in 32 bits
    while (bit > n) bit >>= 2;
    while (bit != 0) {
        if (n >= root + bit) {
            n -= root + bit;
            root = (root >> 1) + bit;
        } else {
            root >>= 1;
        }
        bit >>= 2;
    }
    return root;
}

uint32_t isqrt1(uint32_t n) { return isqrt(n); }
uint32_t isqrt2(uint32_t n) { return isqrt(n); }
uint32_t isqrt3(uint32_t n) { return isqrt(n); }
uint32_t isqrt4(uint32_t n) { return isqrt(n); }
uint32_t isqrt5(uint32_t n) { return isqrt(n); }
uint32_t isqrt7(uint32_t n) { return isqrt(n); }
