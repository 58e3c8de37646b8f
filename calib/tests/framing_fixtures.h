// Inputs shared by the framing tests: parameter records, area arrays and a
// small portable random generator (the same sequence on every target, unlike
// the standard distributions).
#ifndef LUMICOR_CALIB_TESTS_FRAMING_FIXTURES_H
#define LUMICOR_CALIB_TESTS_FRAMING_FIXTURES_H

#include <cstdint>
#include <vector>

#include <lumicor/calib.h>

namespace framing_test {

inline _CAParam DefaultParam() {
    _CAParam p;
    CAGetDefaultParam(&p);
    return p;
}

inline CAAttentionArea Area(float x, float y, float w, float h, int32_t value) {
    CAAttentionArea a;
    a.nx = x;
    a.ny = y;
    a.nw = w;
    a.nh = h;
    a.val.direction = value;
    return a;
}

// Owns the records an _CAAttentionAreaArray points to.
struct Areas {
    std::vector<CAAttentionArea> records;
    uint32_t isFace = 0;
    _CAAttentionAreaArray View() {
        _CAAttentionAreaArray a;
        a.isFace = isFace;
        a.numAreas = static_cast<uint32_t>(records.size());
        a.pAreaArray = records.empty() ? nullptr : records.data();
        return a;
    }
};

// SplitMix32-style generator; Uniform() has 24 random bits.
class Rng {
public:
    explicit Rng(uint32_t seed) : state_(seed) {}
    uint32_t Next() {
        uint32_t z = (state_ += 0x9E3779B9u);
        z = (z ^ (z >> 16)) * 0x85EBCA6Bu;
        z = (z ^ (z >> 13)) * 0xC2B2AE35u;
        return z ^ (z >> 16);
    }
    float Uniform() { return static_cast<float>(Next() >> 8) * (1.0f / 16777216.0f); }
    uint32_t Below(uint32_t n) { return Next() % n; }

private:
    uint32_t state_;
};

// A random valid case: photo size, parameters and up to 20 areas inside the photo.
struct RandomCase {
    uint32_t width;
    uint32_t height;
    _CAParam param;
    Areas areas;
};

inline RandomCase MakeRandomCase(Rng& rng) {
    RandomCase c;
    c.width = 240 + rng.Below(8000);
    c.height = 240 + rng.Below(8000);
    c.param = DefaultParam();
    c.param.composition_mode = static_cast<int32_t>(rng.Below(6));
    // As many crops taller than wide as wider than tall, the bounds now and then.
    const uint32_t pick = rng.Below(20);
    const float u = rng.Uniform();
    c.param.aspect_ratio = pick == 0   ? 0.1f
                           : pick == 1 ? 10.0f
                           : pick < 11 ? 0.1f + 0.9f * u
                                       : 1.0f + 9.0f * u;
    c.param.magnification_limit = 1.0f + 99.0f * rng.Uniform();
    c.param.consistency_weight_min = rng.Uniform();
    c.areas.isFace = rng.Below(3) == 0 ? 1u : 0u;
    const uint32_t n = rng.Below(21);
    for (uint32_t i = 0; i < n; ++i) {
        const float x = rng.Uniform();
        const float y = rng.Uniform();
        const float w = (1.0f - x) * rng.Uniform();
        const float h = (1.0f - y) * rng.Uniform();
        const int32_t v = static_cast<int32_t>(c.areas.isFace ? rng.Below(9) : rng.Below(256));
        c.areas.records.push_back(Area(x, y, w, h, v));
    }
    const uint32_t usable = n < 16 ? n : 16;
    c.param.force_main_number =
        (usable > 0 && rng.Below(4) == 0) ? static_cast<int32_t>(rng.Below(usable)) : CA_NONE_SPECIFIED;
    return c;
}

}  // namespace framing_test

#endif
