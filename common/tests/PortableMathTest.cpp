#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>

#include "common/src/internal/portable_math.h"

namespace {

uint64_t Ulps(double a, double b) {
    int64_t ia, ib;
    std::memcpy(&ia, &a, 8);
    std::memcpy(&ib, &b, 8);
    return static_cast<uint64_t>(ia > ib ? ia - ib : ib - ia);
}

TEST(PortableMathTest, ExpIsWithinAFewUlpsOverTheRange) {
    uint64_t worst = 0;
    for (double x = -745.0; x < 709.7; x += 0.0137) {
        const double ref = std::exp(x);
        if (ref < 2.3e-308) continue;  // subnormal results carry fewer bits
        worst = std::max(worst, Ulps(lmk::Exp(x), ref));
    }
    EXPECT_LE(worst, 2u);
    EXPECT_EQ(lmk::Exp(0.0), 1.0);
    EXPECT_EQ(lmk::Exp(-800.0), 0.0);
    EXPECT_EQ(lmk::Exp(710.0), std::numeric_limits<double>::infinity());
    EXPECT_TRUE(std::isnan(lmk::Exp(std::nan(""))));
    EXPECT_GT(lmk::Exp(-744.0), 0.0);  // subnormal, not flushed
    EXPECT_NEAR(lmk::Exp(709.78) / std::exp(709.78), 1.0, 1e-15);
}

TEST(PortableMathTest, ExpFMatchesTheCorrectlyRoundedValueAlmostAlways) {
    int off = 0;
    int count = 0;
    for (float x = -103.0f; x < 88.7f; x += 0.00731f, ++count) {
        const float ref = static_cast<float>(std::exp(static_cast<double>(x)));
        const float got = lmk::ExpF(x);
        if (got != ref) {
            ++off;
            EXPECT_LE(Ulps(got, ref), Ulps(std::nextafter(ref, 0.0f), ref)) << x;
        }
    }
    EXPECT_LT(off, count / 1000);
    EXPECT_EQ(lmk::ExpF(0.0f), 1.0f);
    EXPECT_EQ(lmk::ExpF(-200.0f), 0.0f);
    EXPECT_EQ(lmk::ExpF(-std::numeric_limits<float>::infinity()), 0.0f);
    EXPECT_EQ(lmk::ExpF(100.0f), std::numeric_limits<float>::infinity());
    EXPECT_TRUE(std::isnan(lmk::ExpF(std::nanf(""))));
}

// The point of these functions: the same bits on every target. The values were
// recorded on x86-64.
TEST(PortableMathTest, BitsAreTheSameOnEveryTarget) {
    uint64_t hash = 1469598103934665603ull;
    for (int i = -200000; i < 200000; ++i) {
        const float x = static_cast<float>(i) * 0.000517f;
        const float f = lmk::ExpF(x);
        const double d = lmk::Exp(static_cast<double>(x) * 7.1);
        uint32_t fb;
        uint64_t db;
        std::memcpy(&fb, &f, 4);
        std::memcpy(&db, &d, 8);
        hash = (hash ^ fb) * 1099511628211ull;
        hash = (hash ^ db) * 1099511628211ull;
    }
    EXPECT_EQ(hash, 0x11071acfbbafa642ull);

    hash = 1469598103934665603ull;
    for (int i = 1; i < 100000; ++i) {
        const double t = static_cast<double>(i) * 0.0000731;
        const double v[3] = {lmk::Log(t * 91.0), lmk::Atan2(std::fmod(t * 37.0, 2.0) - 1.0, 0.5 - t),
                             lmk::Asin(std::fmod(t, 2.0) - 1.0)};
        for (double d : v) {
            uint64_t db;
            std::memcpy(&db, &d, 8);
            hash = (hash ^ db) * 1099511628211ull;
        }
    }
    EXPECT_EQ(hash, 0x10f88eea0a7a402eull);
}

}  // namespace

TEST(PortableMathTest, LogIsWithinAFewUlpsOverTheRange) {
    uint64_t worst = 0;
    for (double x = 1e-300; x < 1e300; x *= 1.0137) worst = std::max(worst, Ulps(lmk::Log(x), std::log(x)));
    for (double x = 0.5; x < 2.0; x += 0.000173) worst = std::max(worst, Ulps(lmk::Log(x), std::log(x)));
    EXPECT_LE(worst, 2u);
    EXPECT_EQ(lmk::Log(1.0), 0.0);
    EXPECT_NEAR(lmk::Log(4.9e-324), std::log(4.9e-324), 1e-12);  // subnormal argument
    EXPECT_EQ(lmk::Log(0.0), -std::numeric_limits<double>::infinity());
    EXPECT_EQ(lmk::Log(std::numeric_limits<double>::infinity()), std::numeric_limits<double>::infinity());
    EXPECT_TRUE(std::isnan(lmk::Log(-1.0)));
}

// Whole circle, both signs of zero, infinities and NaN, against the C library.
TEST(PortableMathTest, Atan2AndAsinAgreeWithTheCLibrary) {
    double worst = 0.0;
    for (int i = 0; i < 3600; ++i) {
        const double a = i * 0.001745329 - 3.14159;
        for (double r : {1e-300, 0.37, 1.0, 5e7}) {
            const double y = r * std::sin(a), x = r * std::cos(a);
            worst = std::max(worst, std::fabs(lmk::Atan2(y, x) - std::atan2(y, x)));
        }
    }
    EXPECT_LE(worst, 1e-15);
    const double inf = std::numeric_limits<double>::infinity();
    const double cases[][2] = {{0.0, 0.0}, {-0.0, 0.0}, {0.0, -0.0}, {-0.0, -0.0}, {1.0, 0.0}, {-1.0, -0.0},
                               {inf, 1.0}, {1.0, -inf}, {-1.0, inf}, {inf, inf}, {-inf, -inf}, {0.0, -2.0}};
    for (const auto& c : cases) {
        const double want = std::atan2(c[0], c[1]);
        EXPECT_NEAR(lmk::Atan2(c[0], c[1]), want, 1e-15) << c[0] << "," << c[1];
        EXPECT_EQ(std::signbit(lmk::Atan2(c[0], c[1])), std::signbit(want)) << c[0] << "," << c[1];
    }
    EXPECT_TRUE(std::isnan(lmk::Atan2(std::nan(""), 1.0)));
    EXPECT_TRUE(std::isnan(lmk::Atan2(1.0, std::nan(""))));

    worst = 0.0;
    for (double x = -1.0; x <= 1.0; x += 0.000731) worst = std::max(worst, std::fabs(lmk::Asin(x) - std::asin(x)));
    EXPECT_LE(worst, 1e-15);
    EXPECT_EQ(lmk::Asin(1.0), std::asin(1.0));
    EXPECT_EQ(lmk::Asin(-1.0), std::asin(-1.0));
    EXPECT_TRUE(std::isnan(lmk::Asin(1.0000001)));
    EXPECT_TRUE(std::isnan(lmk::Asin(std::nan(""))));
}
