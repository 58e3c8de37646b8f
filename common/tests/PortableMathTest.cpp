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

// The point of these functions: the same bits on every target. The value was
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
