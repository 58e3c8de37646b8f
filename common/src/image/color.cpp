// Single-pixel colour conversions. The YUV and gray formulas are integer
// only; Lab uses double precision, rounding by adding 0.5 and truncating,
// which matches the stored palettes and labels computed from them.
#include <lumicor/zbm_image.h>

#include <cmath>

#include "common/src/image/color_util.h"

namespace {

using lmk::image::Clamp255;

// Floor division by 2^n for negative values too.
inline int32_t ShiftDown(int32_t v, int n) { return v >= 0 ? v >> n : -((-v + (1 << n) - 1) >> n); }

inline int RoundClamp(double v, int hi) {
    const double r = v + 0.5;
    if (!(r > 0.0)) return 0;  // also NaN
    if (r >= hi) return hi;
    return static_cast<int>(r);
}

inline void Put(int* out, int v) {
    if (out) *out = v;
}
inline void Put(uint8_t* out, int v) {
    if (out) *out = static_cast<uint8_t>(v);
}

// CIE f(t) and its inverse.
inline double LabF(double t) { return t > 0.008856 ? std::cbrt(t) : 7.787 * t + 16.0 / 116.0; }
inline double LabFInverse(double f) {
    const double t = f * f * f;
    return t > 0.008856 ? t : (f - 16.0 / 116.0) / 7.787;
}

// Shared tail of the Lab conversions: X, Y, Z already divided by the white.
void XyzToLab(double x, double y, double z, int* l, int* a, int* b) {
    const double fx = LabF(x), fy = LabF(y), fz = LabF(z);
    Put(l, RoundClamp(116.0 * fy - 16.0, 99));
    Put(a, RoundClamp(128.0 + 500.0 * (fx - fy), 255));
    Put(b, RoundClamp(128.0 + 200.0 * (fy - fz), 255));
}

// X, Y, Z relative to the white from L, a, b (a and b offset by 128).
void LabToXyz(int l, int a, int b, double* x, double* y, double* z) {
    const double fy = (l + 16.0) / 116.0;
    *x = LabFInverse(fy + (a - 128) / 500.0);
    *y = LabFInverse(fy);
    *z = LabFInverse(fy - (b - 128) / 200.0);
}

// sRGB primaries, D65 white.
void RgbToXyz(double r, double g, double b, double* x, double* y, double* z) {
    *x = 0.412453 * r + 0.357580 * g + 0.180423 * b;
    *y = 0.212671 * r + 0.715160 * g + 0.072169 * b;
    *z = 0.019334 * r + 0.119193 * g + 0.950227 * b;
}
void XyzToRgb(double x, double y, double z, double* r, double* g, double* b) {
    *r = 3.240479 * x - 1.537150 * y - 0.498535 * z;
    *g = -0.969256 * x + 1.875992 * y + 0.041556 * z;
    *b = 0.055648 * x - 0.204043 * y + 1.057311 * z;
}

// Scale of X, Y, Z for channels 0..255 without linearisation: 256 × white.
constexpr double kWhiteX255 = 243.32032;
constexpr double kWhiteY255 = 256.0;
constexpr double kWhiteZ255 = 278.74048;
constexpr double kWhiteX = 0.95047;
constexpr double kWhiteZ = 1.08883;

inline double Linearise(int c) {
    const double v = c / 256.0;
    return v <= 0.018 ? v / 4.5 : std::pow((v + 0.099) / 1.099, 1.0 / 0.45);
}
inline double Delinearise(double v) { return v <= 0.004 ? 4.5 * v : 1.099 * std::pow(v, 0.45) - 0.099; }

}  // namespace

void rgb2yuv(int r, int g, int b, int* y, int* u, int* v) {
    r = Clamp255(r), g = Clamp255(g), b = Clamp255(b);
    Put(y, lmk::image::Gray(r, g, b));
    Put(u, (-173 * r - 340 * g + 512 * b + 131583) >> 10);
    Put(v, (512 * r - 429 * g - 83 * b + 131583) >> 10);
}

void yuv2rgb(int y, int u, int v, int* r, int* g, int* b) {
    y = Clamp255(y), u = Clamp255(u), v = Clamp255(v);
    Put(r, Clamp255(y + ShiftDown(1441 * v - 184448, 10)));
    Put(g, Clamp255(y + ShiftDown(-734 * v + 93952 + 354 * (128 - u), 10)));
    Put(b, Clamp255(y + ShiftDown(1822 * u - 232192, 10)));
}

void rgb2lab(int r, int g, int b, int* l, int* a, int* bb) {
    double x, y, z;
    RgbToXyz(Clamp255(r), Clamp255(g), Clamp255(b), &x, &y, &z);
    XyzToLab(x / kWhiteX255, y / kWhiteY255, z / kWhiteZ255, l, a, bb);
}

void lab2rgb(int l, int a, int bb, int* r, int* g, int* b) {
    double x, y, z, rr, gg, bl;
    LabToXyz(Clamp255(l), Clamp255(a), Clamp255(bb), &x, &y, &z);
    XyzToRgb(x * kWhiteX255, y * kWhiteY255, z * kWhiteZ255, &rr, &gg, &bl);
    Put(r, RoundClamp(rr, 255));
    Put(g, RoundClamp(gg, 255));
    Put(b, RoundClamp(bl, 255));
}

void srgb2lab(int r, int g, int b, int* l, int* a, int* bb) {
    double x, y, z;
    RgbToXyz(Linearise(Clamp255(r)), Linearise(Clamp255(g)), Linearise(Clamp255(b)), &x, &y, &z);
    XyzToLab(x / kWhiteX, y, z / kWhiteZ, l, a, bb);
}

void lab2srgb(int l, int a, int bb, int* r, int* g, int* b) {
    double x, y, z, rr, gg, bl;
    LabToXyz(Clamp255(l), Clamp255(a), Clamp255(bb), &x, &y, &z);
    XyzToRgb(x * kWhiteX, y, z * kWhiteZ, &rr, &gg, &bl);
    Put(r, RoundClamp(256.0 * Delinearise(rr), 255));
    Put(g, RoundClamp(256.0 * Delinearise(gg), 255));
    Put(b, RoundClamp(256.0 * Delinearise(bl), 255));
}

void rgb2hsv(int r, int g, int b, int* h, int* s, int* v) {
    r = Clamp255(r), g = Clamp255(g), b = Clamp255(b);
    const int mx = r > g ? (r > b ? r : b) : (g > b ? g : b);
    const int mn = r < g ? (r < b ? r : b) : (g < b ? g : b);
    const int delta = mx - mn;
    Put(v, mx);
    if (mx == mn || mx == 0) {
        Put(s, 0);
        Put(h, -1);
        return;
    }
    Put(s, delta * 255 / mx);
    int hue;
    if (mx == r) {
        hue = 60 * (g - b) / delta;
    } else if (mx == g) {
        hue = 120 + 60 * (b - r) / delta;
    } else {
        hue = 240 + 60 * (r - g) / delta;
    }
    Put(h, hue < 0 ? hue + 360 : hue);
}

void fhsv2rgb(float h, float s, float v, int* r, int* g, int* b) {
    if (!(s > 0.0f) || !(h >= 0.0f)) {
        const int gray = RoundClamp(v, 255);
        Put(r, gray);
        Put(g, gray);
        Put(b, gray);
        return;
    }
    const float hue = std::fmod(h, 360.0f) / 60.0f;
    int sector = static_cast<int>(hue);
    float f = hue - static_cast<float>(sector);
    if (sector > 5) sector = 0, f = 0.0f;  // a hue that rounded up to 360
    const float sn = s / 255.0f;
    const float p = v * (1.0f - sn);
    const float q = v * (1.0f - sn * f);
    const float t = v * (1.0f - sn * (1.0f - f));
    float rr, gg, bl;
    switch (sector) {
        case 0: rr = v, gg = t, bl = p; break;
        case 1: rr = q, gg = v, bl = p; break;
        case 2: rr = p, gg = v, bl = t; break;
        case 3: rr = p, gg = q, bl = v; break;
        case 4: rr = t, gg = p, bl = v; break;
        default: rr = v, gg = p, bl = q; break;
    }
    Put(r, RoundClamp(rr, 255));
    Put(g, RoundClamp(gg, 255));
    Put(b, RoundClamp(bl, 255));
}

uint8_t ZbiuRgb2Gray(uint8_t r, uint8_t g, uint8_t b) { return lmk::image::Gray(r, g, b); }

void ZbiuGray2Rgb(uint8_t gray, uint8_t* r, uint8_t* g, uint8_t* b) {
    Put(r, gray);
    Put(g, gray);
    Put(b, gray);
}

namespace {
// Runs an int conversion and narrows its three results.
template <typename F>
void Narrow(F convert, uint8_t i0, uint8_t i1, uint8_t i2, uint8_t* o0, uint8_t* o1, uint8_t* o2) {
    int a, b, c;
    convert(i0, i1, i2, &a, &b, &c);
    Put(o0, a);
    Put(o1, b);
    Put(o2, c);
}
}  // namespace

void ZbiuRgb2Yuv(uint8_t r, uint8_t g, uint8_t b, uint8_t* y, uint8_t* u, uint8_t* v) { Narrow(rgb2yuv, r, g, b, y, u, v); }
void ZbiuYuv2Rgb(uint8_t y, uint8_t u, uint8_t v, uint8_t* r, uint8_t* g, uint8_t* b) { Narrow(yuv2rgb, y, u, v, r, g, b); }
void ZbiuRgb2Lab(uint8_t r, uint8_t g, uint8_t b, uint8_t* l, uint8_t* a, uint8_t* bb) { Narrow(rgb2lab, r, g, b, l, a, bb); }
void ZbiuLab2Rgb(uint8_t l, uint8_t a, uint8_t bb, uint8_t* r, uint8_t* g, uint8_t* b) { Narrow(lab2rgb, l, a, bb, r, g, b); }
