// IIScaleImage: single steps, the step-by-step reduction of strong
// reductions, argument checks and scratch allocation failures.
#include <gtest/gtest.h>

#include <vector>

#include "common/src/internal/plane_scale.h"
#include "testkit/fault.h"

namespace {

std::vector<uint8_t> Noise(int w, int h, uint32_t seed) {
    std::vector<uint8_t> v(static_cast<size_t>(w) * h);
    for (uint8_t& b : v) b = static_cast<uint8_t>((seed = seed * 1103515245u + 12345u) >> 23);
    return v;
}

std::vector<uint8_t> Scale(const std::vector<uint8_t>& src, int sw, int sh, int dw, int dh) {
    std::vector<uint8_t> dst(static_cast<size_t>(dw) * dh);
    EXPECT_EQ(IIScaleImage(dst.data(), dw, dh, dw, src.data(), sw, sh, sw), 0);
    return dst;
}

TEST(PlaneScaleTest, ExactHalvingIsTheBlockMeanAndEqualSizesCopy) {
    const std::vector<uint8_t> src = {10, 20, 30, 41, 0, 0, 255, 254};
    const std::vector<uint8_t> half = Scale(src, 4, 2, 2, 1);
    EXPECT_EQ(half, (std::vector<uint8_t>{7, 145}));  // (10+20+0+0)/4, (30+41+255+254)/4
    EXPECT_EQ(Scale(src, 4, 2, 4, 2), src);
}

// Strong reductions halve ((n + 1) / 2) every axis still more than twice its
// target and take the other straight to its target, then one final step.
TEST(PlaneScaleTest, StrongReductionGoesStepByStep) {
    const std::vector<uint8_t> src = Noise(20, 6, 3);
    // 20 x 6 -> 10 x 5 -> 5 x 5 -> 4 x 5.
    const std::vector<uint8_t> steps = Scale(Scale(Scale(src, 20, 6, 10, 5), 10, 5, 5, 5), 5, 5, 4, 5);
    EXPECT_EQ(Scale(src, 20, 6, 4, 5), steps);
    const std::vector<uint8_t> row = Noise(9, 1, 5);
    // 9 -> 5 -> 3 -> 2.
    EXPECT_EQ(Scale(row, 9, 1, 2, 1), Scale(Scale(Scale(row, 9, 1, 5, 1), 5, 1, 3, 1), 3, 1, 2, 1));
}

TEST(PlaneScaleTest, StridesAndRefusals) {
    const std::vector<uint8_t> src = {1, 2, 99, 3, 4, 99};
    uint8_t dst[8] = {0, 0, 0, 77, 0, 0, 0, 77};
    ASSERT_EQ(IIScaleImage(dst, 3, 2, 4, src.data(), 2, 2, 3), 0);
    EXPECT_EQ(dst[3], 77);  // padding untouched
    EXPECT_EQ(dst[0], 1);
    EXPECT_EQ(IIScaleImage(dst, 3, 2, 2, src.data(), 2, 2, 3), 3);
    EXPECT_EQ(IIScaleImage(dst, 0, 2, 4, src.data(), 2, 2, 3), 3);
    EXPECT_EQ(IIScaleImage(nullptr, 3, 2, 4, src.data(), 2, 2, 3), 3);
}

TEST(PlaneScaleTest, ScratchFailureReportsOutOfMemory) {
    const std::vector<uint8_t> src = Noise(64, 64, 9);
    std::vector<uint8_t> dst(16);
    int status = 0;
    const long n = lumicor::test::ForEachAllocationFailure(
        [&] { status = IIScaleImage(dst.data(), 4, 4, 4, src.data(), 64, 64, 64); },
        [&](long, bool triggered) { EXPECT_EQ(status, triggered ? 4 : 0); });
    EXPECT_EQ(n, 2);
}

}  // namespace
