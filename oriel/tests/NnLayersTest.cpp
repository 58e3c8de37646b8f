// Known-answer checks of the face engine's inference kernels against
// straightforward double-precision references, and of the SSD anchor grid
// against the anchors the detector was trained with.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "oriel/src/engine/nn/boxes.h"
#include "oriel/src/engine/nn/image_input.h"
#include "oriel/src/engine/nn/layers.h"
#include "oriel/src/engine/nn/weights.h"

namespace {

using oriel::nn::Act;
using oriel::nn::Arena;
using oriel::nn::KernelChoice;
using oriel::nn::Pad;
using oriel::nn::Tensor;

std::vector<float> Random(size_t n, unsigned seed) {
    std::mt19937 g(seed);
    std::uniform_real_distribution<float> d(-1.0f, 1.0f);
    std::vector<float> v(n);
    for (float& x : v) x = d(g);
    return v;
}

double Activate(double v, Act act) {
    switch (act) {
        case Act::Relu: return v > 0 ? v : 0;
        case Act::Relu6: return v > 0 ? (v < 6 ? v : 6) : 0;
        case Act::Leaky: return v > 0 ? v : 0.1 * v;
        default: return v;
    }
}

// The blob's convolution layout: [ceil(cout/8)][kh][kw][cin][8], then bias.
std::vector<float> BlockConv(const std::vector<float>& hwio, const std::vector<float>& bias, int kh, int kw, int cin,
                             int cout) {
    const int blocks = (cout + 7) / 8;
    std::vector<float> out(static_cast<size_t>(blocks) * kh * kw * cin * 8 + blocks * 8, 0.0f);
    for (int cb = 0; cb < blocks; ++cb)
        for (int y = 0; y < kh; ++y)
            for (int x = 0; x < kw; ++x)
                for (int ci = 0; ci < cin; ++ci)
                    for (int j = 0; j < 8 && cb * 8 + j < cout; ++j)
                        out[((((static_cast<size_t>(cb) * kh + y) * kw + x) * cin) + ci) * 8 + j] =
                            hwio[((static_cast<size_t>(y) * kw + x) * cin + ci) * cout + cb * 8 + j];
    const size_t b0 = static_cast<size_t>(blocks) * kh * kw * cin * 8;
    for (int co = 0; co < cout; ++co) out[b0 + co] = bias[co];
    return out;
}

struct ConvCase {
    int h, w, cin, cout, k, stride;
    Pad pad;
    Act act;
};

class ConvTest : public ::testing::TestWithParam<ConvCase> {};

TEST_P(ConvTest, MatchesDirectConvolution) {
    const ConvCase c = GetParam();
    const std::vector<float> input = Random(static_cast<size_t>(c.h) * c.w * c.cin, 1);
    const std::vector<float> hwio = Random(static_cast<size_t>(c.k) * c.k * c.cin * c.cout, 2);
    const std::vector<float> bias = Random(c.cout, 3);
    const std::vector<float> blocked = BlockConv(hwio, bias, c.k, c.k, c.cin, c.cout);
    oriel::nn::ConvWeights w;
    w.w = blocked.data();
    w.b = blocked.data() + (blocked.size() - (c.cout + 7) / 8 * 8);
    w.kh = w.kw = c.k;
    w.cin = c.cin;
    w.cout = c.cout;

    Arena a;
    Tensor in = a.Take(1, c.h, c.w, c.cin);
    Tensor plan = oriel::nn::Conv2D(a, 2, in, w, c.stride, c.pad, c.act);
    ASSERT_TRUE(a.Allocate());
    in = a.Take(1, c.h, c.w, c.cin);
    std::copy(input.begin(), input.end(), in.d);
    Tensor out = oriel::nn::Conv2D(a, 2, in, w, c.stride, c.pad, c.act);
    ASSERT_EQ(out.h, plan.h);
    ASSERT_EQ(out.w, plan.w);
    // Every kernel variant gives the very same values.
    const std::vector<float> best(out.d, out.d + out.Size());
    for (const KernelChoice k : {KernelChoice::Portable, KernelChoice::NoAvx512}) {
        Tensor other = oriel::nn::Conv2D(a, 2, in, w, c.stride, c.pad, c.act, k);
        ASSERT_EQ(std::memcmp(best.data(), other.d, best.size() * sizeof(float)), 0) << static_cast<int>(k);
    }

    int ho, top, wo, left;
    oriel::nn::PadFor(c.h, c.k, c.stride, c.pad, &ho, &top);
    oriel::nn::PadFor(c.w, c.k, c.stride, c.pad, &wo, &left);
    ASSERT_EQ(out.h, ho);
    ASSERT_EQ(out.w, wo);
    for (int oy = 0; oy < ho; ++oy)
        for (int ox = 0; ox < wo; ++ox)
            for (int co = 0; co < c.cout; ++co) {
                double s = 0;
                for (int ky = 0; ky < c.k; ++ky)
                    for (int kx = 0; kx < c.k; ++kx) {
                        const int iy = oy * c.stride - top + ky, ix = ox * c.stride - left + kx;
                        if (iy < 0 || ix < 0 || iy >= c.h || ix >= c.w) continue;
                        for (int ci = 0; ci < c.cin; ++ci)
                            s += static_cast<double>(input[(static_cast<size_t>(iy) * c.w + ix) * c.cin + ci]) *
                                 hwio[((static_cast<size_t>(ky) * c.k + kx) * c.cin + ci) * c.cout + co];
                    }
                const double want = Activate(s + bias[co], c.act);
                ASSERT_NEAR(out.At(oy, ox)[co], want, 1e-4) << oy << "," << ox << "," << co;
            }
}

INSTANTIATE_TEST_SUITE_P(
    Kinds, ConvTest,
    ::testing::Values(ConvCase{9, 11, 3, 16, 3, 2, Pad::Same, Act::Relu6},     // first layer, odd sizes
                      ConvCase{8, 8, 3, 5, 3, 2, Pad::Same, Act::Relu},        // even size: padding after only
                      ConvCase{7, 13, 12, 20, 1, 1, Pad::Same, Act::None},     // pointwise, channel tail
                      ConvCase{10, 10, 8, 9, 3, 1, Pad::Same, Act::Leaky},     // padded 3x3
                      ConvCase{15, 15, 3, 8, 7, 2, Pad::Valid, Act::Relu},     // 7x7 stride 2 without padding
                      ConvCase{6, 5, 16, 24, 1, 2, Pad::Same, Act::None},      // strided 1x1 projection
                      ConvCase{12, 19, 40, 25, 1, 1, Pad::Same, Act::None},    // many pixels, channel tail
                      ConvCase{7, 11, 300, 52, 1, 1, Pad::Same, Act::Relu6},   // weights past the cache: blocks outer
                      ConvCase{6, 5, 70, 33, 3, 2, Pad::Same, Act::Relu6}));   // few pixels per row, odd block count

TEST(NnLayersTest, DepthwiseMatchesDirectComputation) {
    // 37 channels: whole vectors of every width plus a tail; inputs up to 4
    // so that the clamp at 6 is reached.
    for (int stride = 1; stride <= 2; ++stride) {
        for (const Act act : {Act::Relu6, Act::Leaky}) {
            const int h = 9, w = 6, c = 37;
            std::vector<float> input = Random(h * w * c, 4);
            for (float& v : input) v *= 4.0f;
            std::vector<float> wb = Random(9 * c + c, 5);
            oriel::nn::DepthwiseWeights dw;
            dw.w = wb.data();
            dw.b = wb.data() + 9 * c;
            dw.kh = dw.kw = 3;
            dw.c = c;
            Arena a;
            Tensor in = a.Take(1, h, w, c);
            oriel::nn::Depthwise(a, 2, in, dw, stride, Pad::Same, act);
            ASSERT_TRUE(a.Allocate());
            in = a.Take(1, h, w, c);
            std::copy(input.begin(), input.end(), in.d);
            Tensor out = oriel::nn::Depthwise(a, 2, in, dw, stride, Pad::Same, act);
            const std::vector<float> best(out.d, out.d + out.Size());
            for (const KernelChoice k : {KernelChoice::Portable, KernelChoice::NoAvx512}) {
                oriel::nn::Depthwise(a, 2, in, dw, stride, Pad::Same, act, k);
                ASSERT_EQ(std::memcmp(best.data(), out.d, best.size() * sizeof(float)), 0) << static_cast<int>(k);
            }
            int ho, top, wo, left;
            oriel::nn::PadFor(h, 3, stride, Pad::Same, &ho, &top);
            oriel::nn::PadFor(w, 3, stride, Pad::Same, &wo, &left);
            ASSERT_EQ(out.h, ho);
            ASSERT_EQ(out.w, wo);
            for (int oy = 0; oy < ho; ++oy)
                for (int ox = 0; ox < wo; ++ox)
                    for (int ch = 0; ch < c; ++ch) {
                        double s = 0;
                        for (int ky = 0; ky < 3; ++ky)
                            for (int kx = 0; kx < 3; ++kx) {
                                const int iy = oy * stride - top + ky, ix = ox * stride - left + kx;
                                if (iy < 0 || ix < 0 || iy >= h || ix >= w) continue;
                                s += static_cast<double>(input[(iy * w + ix) * c + ch]) * wb[(ky * 3 + kx) * c + ch];
                            }
                        ASSERT_NEAR(out.At(oy, ox)[ch], Activate(s + dw.b[ch], act), 1e-4);
                    }
        }
    }
}

TEST(NnLayersTest, PoolingDenseAndMean) {
    // 3 x 3 input, one channel: 1..9.
    Arena a;
    Tensor in = a.Take(1, 3, 3, 1);
    oriel::nn::MaxPool(a, 2, in, 2, 2, Pad::Same);
    oriel::nn::AvgPool(a, 3, in, 2, 1);
    ASSERT_TRUE(a.Allocate());
    in = a.Take(1, 3, 3, 1);
    for (int i = 0; i < 9; ++i) in.d[i] = static_cast<float>(i + 1);
    // Same padding counts only pixels inside: the bottom-right window is {9}.
    Tensor mx = oriel::nn::MaxPool(a, 2, in, 2, 2, Pad::Same);
    ASSERT_EQ(mx.h, 2);
    EXPECT_EQ(mx.d[0], 5.0f);
    EXPECT_EQ(mx.d[1], 6.0f);
    EXPECT_EQ(mx.d[2], 8.0f);
    EXPECT_EQ(mx.d[3], 9.0f);
    Tensor av = oriel::nn::AvgPool(a, 3, in, 2, 1);
    ASSERT_EQ(av.h, 2);
    EXPECT_FLOAT_EQ(av.d[0], 3.0f);
    EXPECT_FLOAT_EQ(av.d[3], 7.0f);
    float mean = 0;
    oriel::nn::GlobalMean(in, &mean);
    EXPECT_FLOAT_EQ(mean, 5.0f);

    const float wts[2 * 3 + 3] = {1, 2, 3, 4, 5, 6, 0.5f, -1, 0};
    oriel::nn::DenseWeights d;
    d.w = wts;
    d.b = wts + 6;
    d.nin = 2;
    d.nout = 3;
    const float x[2] = {1, -1};
    float y[3];
    oriel::nn::Dense(x, d, y);
    EXPECT_FLOAT_EQ(y[0], -2.5f);
    EXPECT_FLOAT_EQ(y[1], -4.0f);
    EXPECT_FLOAT_EQ(y[2], -3.0f);
}

TEST(NnLayersTest, AnchorsOfTheTrainedInputSizeAreTheTrainedAnchors) {
    const uint8_t* data;
    uint32_t size;
    oriel::nn::WeightBlob blob;
    ASSERT_TRUE(oriel::nn::WeightBlob::Embedded(&data, &size));
    ASSERT_TRUE(blob.Open(data, size));
    oriel::nn::RawTensor trained;
    ASSERT_TRUE(blob.Raw("ssd/anchors", &trained));
    const int gh[6] = {32, 16, 8, 4, 2, 1};
    ASSERT_EQ(oriel::nn::SsdAnchorCount(gh, gh, 6) * 4, trained.count);
    std::vector<float> ours(trained.count);
    oriel::nn::SsdAnchors(gh, gh, 6, 512, 512, ours.data());
    for (uint32_t i = 0; i < trained.count; ++i) ASSERT_NEAR(ours[i], trained.d[i], 1e-4) << i;  // trained ones carry float32 rounding
}

TEST(NnLayersTest, WeightBlobRejectsDamage) {
    const uint8_t* data;
    uint32_t size;
    ASSERT_TRUE(oriel::nn::WeightBlob::Embedded(&data, &size));
    oriel::nn::WeightBlob* blob = new oriel::nn::WeightBlob();
    std::vector<uint8_t> head(data, data + 4096);
    // A record whose data would run past the end of a truncated blob.
    alignas(16) static uint8_t copy[4096];
    std::copy(head.begin(), head.end(), copy);
    EXPECT_FALSE(blob->Open(copy, sizeof copy));
    copy[0] = 'X';
    EXPECT_FALSE(blob->Open(copy, sizeof copy));
    EXPECT_FALSE(blob->Open(nullptr, 0));
    EXPECT_TRUE(blob->Open(data, size));
    oriel::nn::ConvWeights w;
    EXPECT_FALSE(blob->Conv("ssd/anchors", &w));  // wrong kind
    EXPECT_FALSE(blob->Conv("no/such", &w));
    delete blob;
}

TEST(NnLayersTest, SsdDecodeAndSuppression) {
    const float anchor[4] = {0.2f, 0.4f, 0.6f, 0.6f};  // centre (0.4, 0.5), size 0.4 x 0.2
    const float zero[4] = {0, 0, 0, 0};
    oriel::nn::Box b = oriel::nn::SsdDecode(anchor, zero);
    EXPECT_NEAR(b.ymin, 0.2f, 1e-6);
    EXPECT_NEAR(b.xmax, 0.6f, 1e-6);
    const float shift[4] = {10.0f, -10.0f, 5.0f * std::log(2.0f), 0.0f};  // one height down, one width left, twice as tall
    b = oriel::nn::SsdDecode(anchor, shift);
    EXPECT_NEAR((b.ymin + b.ymax) / 2, 0.8f, 1e-5);
    EXPECT_NEAR((b.xmin + b.xmax) / 2, 0.3f, 1e-5);
    EXPECT_NEAR(b.ymax - b.ymin, 0.8f, 1e-5);

    oriel::nn::Candidate c[4] = {{{0, 0, 1, 1}, 0.6f, 0},
                                 {{0, 0, 1, 0.9f}, 0.9f, 1},   // overlaps the first by 0.9
                                 {{2, 2, 3, 3}, 0.7f, 2},
                                 {{0, 0.5f, 1, 1.5f}, 0.8f, 3}};  // overlaps #1 by 0.4/1.1
    const size_t kept = oriel::nn::NonMaxSuppression(c, 4, 0.5f, 10);
    ASSERT_EQ(kept, 3u);
    EXPECT_EQ(c[0].index, 1);
    EXPECT_EQ(c[1].index, 3);
    EXPECT_EQ(c[2].index, 2);
    EXPECT_EQ(oriel::nn::NonMaxSuppression(c, 3, 0.5f, 1), 1u);
}

TEST(NnLayersTest, CanvasSamplingPadsWithZerosAndCentres) {
    // 2 x 1 photo (R = 10, 20) centred on a 2 x 2 canvas, sampled 2 x 2:
    // the crop lands on the top row (the larger padding half after it).
    const uint8_t px[6] = {10, 0, 0, 20, 0, 0};
    oriel::nn::ImageView v;
    v.p = px;
    v.w = 2;
    v.h = 1;
    v.stride = 6;
    oriel::nn::Crop crop;
    crop.w = 2;
    crop.h = 1;
    const oriel::nn::Canvas cv = oriel::nn::SquareCanvas(crop, true);
    EXPECT_EQ(cv.w, 2);
    EXPECT_EQ(cv.offY, 0);
    const float mean[3] = {0, 0, 0};
    float out[2 * 2 * 3];
    oriel::nn::SampleCanvas(v, crop, cv, 2, 2, mean, 1.0f, out);
    EXPECT_EQ(out[0], 10.0f);
    EXPECT_EQ(out[3], 20.0f);
    EXPECT_EQ(out[6], 0.0f);
    // Halving: output pixel 1 samples source 1.0 exactly; output of 4 x 4
    // interpolates half-way between 10 and 20.
    float big[4 * 4 * 3];
    oriel::nn::SampleCanvas(v, crop, cv, 4, 4, mean, 1.0f, big);
    EXPECT_FLOAT_EQ(big[3], 15.0f);
    EXPECT_FLOAT_EQ(big[(1 * 4 + 0) * 3], 5.0f);  // half-way to the zero padding row
}

}  // namespace
