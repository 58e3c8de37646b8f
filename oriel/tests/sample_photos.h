// The face networks' sample photos (decoded at configure time into the
// dependency cache) for the face engine's tests; tests skip when absent.
#ifndef ORIEL_TESTS_SAMPLE_PHOTOS_H
#define ORIEL_TESTS_SAMPLE_PHOTOS_H

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace oriel_test {

struct Photo {
    std::vector<uint8_t> rgb;
    int w = 0;
    int h = 0;
    bool Empty() const { return w == 0; }
};

inline Photo ReadPpm(const std::string& path) {
    Photo p;
    FILE* f = std::fopen(path.c_str(), "rb");
    if (!f) return p;
    char magic[3] = {0};
    int w = 0, h = 0, maxv = 0;
    if (std::fscanf(f, "%2s %d %d %d", magic, &w, &h, &maxv) == 4 && std::strcmp(magic, "P6") == 0 && maxv == 255 &&
        w > 0 && h > 0) {
        std::fgetc(f);
        p.rgb.resize(static_cast<size_t>(w) * h * 3);
        if (std::fread(p.rgb.data(), 1, p.rgb.size(), f) == p.rgb.size()) {
            p.w = w;
            p.h = h;
        }
    }
    std::fclose(f);
    if (p.w == 0) p.rgb.clear();
    return p;
}

// sample1 .. sample6
inline Photo Sample(int i) {
    return ReadPpm(std::string(LUMICOR_FACE_SAMPLES_DIR) + "/sample" + std::to_string(i) + ".ppm");
}

// Box-filter reduction to the given width (height keeps the aspect).
inline Photo Reduce(const Photo& s, int width) {
    Photo d;
    d.w = width;
    d.h = s.h * width / s.w;
    d.rgb.resize(static_cast<size_t>(d.w) * d.h * 3);
    for (int y = 0; y < d.h; ++y)
        for (int x = 0; x < d.w; ++x) {
            const int x0 = x * s.w / d.w, x1 = (x + 1) * s.w / d.w;
            const int y0 = y * s.h / d.h, y1 = (y + 1) * s.h / d.h;
            for (int c = 0; c < 3; ++c) {
                unsigned sum = 0, n = 0;
                for (int yy = y0; yy < y1; ++yy)
                    for (int xx = x0; xx < x1; ++xx, ++n) sum += s.rgb[(static_cast<size_t>(yy) * s.w + xx) * 3 + c];
                d.rgb[(static_cast<size_t>(y) * d.w + x) * 3 + c] = static_cast<uint8_t>((sum + n / 2) / n);
            }
        }
    return d;
}

// Bilinear enlargement by an integer factor.
inline Photo Enlarge(const Photo& s, int f) {
    Photo d;
    d.w = s.w * f;
    d.h = s.h * f;
    d.rgb.resize(static_cast<size_t>(d.w) * d.h * 3);
    for (int y = 0; y < d.h; ++y) {
        const float fy = (y + 0.5f) / f - 0.5f;
        const int y0 = fy < 0 ? 0 : static_cast<int>(fy), y1 = y0 + 1 < s.h ? y0 + 1 : s.h - 1;
        const float dy = fy < 0 ? 0.0f : fy - y0;
        for (int x = 0; x < d.w; ++x) {
            const float fx = (x + 0.5f) / f - 0.5f;
            const int x0 = fx < 0 ? 0 : static_cast<int>(fx), x1 = x0 + 1 < s.w ? x0 + 1 : s.w - 1;
            const float dx = fx < 0 ? 0.0f : fx - x0;
            for (int c = 0; c < 3; ++c) {
                auto at = [&](int xx, int yy) { return static_cast<float>(s.rgb[(static_cast<size_t>(yy) * s.w + xx) * 3 + c]); };
                const float v = (at(x0, y0) * (1 - dx) + at(x1, y0) * dx) * (1 - dy) + (at(x0, y1) * (1 - dx) + at(x1, y1) * dx) * dy;
                d.rgb[(static_cast<size_t>(y) * d.w + x) * 3 + c] = static_cast<uint8_t>(v + 0.5f);
            }
        }
    }
    return d;
}

inline Photo Mirror(const Photo& s) {
    Photo d = s;
    for (int y = 0; y < s.h; ++y)
        for (int x = 0; x < s.w; ++x)
            std::memcpy(&d.rgb[(static_cast<size_t>(y) * s.w + x) * 3], &s.rgb[(static_cast<size_t>(y) * s.w + s.w - 1 - x) * 3], 3);
    return d;
}

inline Photo Brighten(const Photo& s, int add) {
    Photo d = s;
    for (uint8_t& v : d.rgb) v = static_cast<uint8_t>(v + add > 255 ? 255 : v + add);
    return d;
}

}  // namespace oriel_test

#endif
