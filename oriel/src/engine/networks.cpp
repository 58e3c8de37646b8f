#include "oriel/src/engine/networks.h"

#include <cmath>
#include <cstdio>
#include <cstring>

#include "common/src/internal/portable_math.h"

namespace oriel {

using nn::Act;
using nn::Arena;
using nn::Pad;
using nn::Tensor;

namespace {

// Arena slots (slot 0 is the layers' padding buffer).
enum { kIn = 1, kS2 = 2, kS3 = 3, kS4 = 4, kS5 = 5, kS6 = 6, kS7 = 7 };

const float kFaceMean[3] = {122.782f, 117.001f, 104.298f};

// Depthwise (no activation) then pointwise with bias and activation.
Tensor SeparableConv(Arena& a, int dwSlot, int outSlot, const Tensor& in, const nn::DepthwiseWeights& dw,
                 const nn::ConvWeights& pw, int stride, Act act) {
    Tensor t = nn::Depthwise(a, dwSlot, in, dw, stride, Pad::Same, Act::None);
    return nn::Conv2D(a, outSlot, t, pw, 1, Pad::Same, act);
}

bool Name(char* buf, size_t n, const char* fmt, const char* a, int i, int j = 0) {
    const int r = std::snprintf(buf, n, fmt, a, i, j);
    return r > 0 && static_cast<size_t>(r) < n;
}

}  // namespace

// ---------------------------------------------------------------- SSD

bool SsdDetector::Load(const nn::WeightBlob& blob) {
    char name[64];
    if (!blob.Conv("ssd/mb0", &mb0_)) return false;
    for (int i = 1; i <= 13; ++i) {
        if (!Name(name, sizeof name, "%s/mb%d/dw", "ssd", i) || !blob.Depthwise(name, &dw_[i])) return false;
        if (!Name(name, sizeof name, "%s/mb%d/pw", "ssd", i) || !blob.Conv(name, &pw_[i])) return false;
    }
    for (int i = 0; i <= 7; ++i)
        if (!Name(name, sizeof name, "%s/pred%d", "ssd", i) || !blob.Conv(name, &pred_[i])) return false;
    for (int i = 0; i <= 5; ++i)
        if (!Name(name, sizeof name, "%s/box%d", "ssd", i) || !blob.Conv(name, &box_[i])) return false;
    return true;
}

namespace {

struct SsdMaps {
    int gh[6], gw[6];
    size_t anchorBase[6];
    int anchorsPerCell[6];
};

// Decodes one feature map's predictions into candidates above minScore.
void DecodeSsdMap(const Tensor& t, int anchorsPerCell, const float* anchors, float minScore, size_t base,
                  nn::Candidate* cand, size_t* n) {
    const int A = anchorsPerCell;
    const int cells = t.h * t.w;
    for (int cell = 0; cell < cells; ++cell) {
        const float* v = t.d + static_cast<size_t>(cell) * t.c;
        for (int k = 0; k < A; ++k) {
            const float score = nn::Sigmoid(v[4 * A + 3 * k + 1]);
            if (!(score > minScore)) continue;
            const size_t idx = base + static_cast<size_t>(cell) * A + k;
            nn::Candidate& c = cand[(*n)++];
            c.box = nn::SsdDecode(anchors + 4 * idx, v + 4 * k);
            c.score = score;
            c.index = static_cast<int>(idx);
        }
    }
}

}  // namespace

bool SsdDetector::Detect(const nn::ImageView& img, const nn::Crop& crop, int inW, int inH, float minScore,
                         Detection* out, size_t maxOut, size_t* count) const {
    *count = 0;
    if (crop.w <= 0 || crop.h <= 0 || inW < 32 || inH < 32 || inW > 4096 || inH > 4096) return false;
    // The crop keeps its aspect: it fills the canvas along one side.
    nn::Canvas cv;
    const double s = std::fmin(static_cast<double>(inW) / crop.w, static_cast<double>(inH) / crop.h);
    cv.w = static_cast<int>(std::lround(inW / s));
    cv.h = static_cast<int>(std::lround(inH / s));
    if (cv.w < crop.w) cv.w = crop.w;
    if (cv.h < crop.h) cv.h = crop.h;

    SsdMaps maps;
    Arena a;
    lmk::UniqueArray<float> anchors;
    lmk::UniqueArray<nn::Candidate> cand;
    size_t nCand = 0;
    for (int pass = 0; pass < 2; ++pass) {
        const bool run = pass == 1;
        Tensor x = a.Take(kIn, inH, inW, 3);
        if (run) {
            const float mean[3] = {127.5f, 127.5f, 127.5f};
            nn::SampleCanvas(img, crop, cv, inW, inH, mean, 127.5f, x.d);
        }
        // MobileNet v1 backbone; box predictors on the stride-16 map (after
        // the 11th separable pair), the final map and four extra maps.
        Tensor t = nn::Conv2D(a, kS2, x, mb0_, 2, Pad::Same, Act::Relu6);
        int cur = kS2, other = kS3;
        int m = 0;
        auto predict = [&](const Tensor& f) {
            Tensor p = nn::Conv2D(a, kS4, f, box_[m], 1, Pad::Same, Act::None);
            if (!run) {
                maps.gh[m] = p.h;
                maps.gw[m] = p.w;
                maps.anchorsPerCell[m] = box_[m].cout / 7;
            } else {
                DecodeSsdMap(p, maps.anchorsPerCell[m], anchors.get(), minScore, maps.anchorBase[m], cand.get(), &nCand);
            }
            ++m;
        };
        for (int i = 1; i <= 13; ++i) {
            const int stride = (i == 2 || i == 4 || i == 6 || i == 12) ? 2 : 1;
            Tensor d = nn::Depthwise(a, other, t, dw_[i], stride, Pad::Same, Act::Relu6);
            t = nn::Conv2D(a, cur, d, pw_[i], 1, Pad::Same, Act::Relu6);
            if (i == 11) predict(t);
        }
        predict(t);
        for (int i = 0; i <= 7; ++i) {
            const int stride = (i % 2 == 1) ? 2 : 1;
            Tensor n = nn::Conv2D(a, other, t, pred_[i], stride, Pad::Same, Act::Relu6);
            const int tmp = cur;
            cur = other;
            other = tmp;
            t = n;
            if (i % 2 == 1) predict(t);
        }
        if (!run) {
            size_t base = 0;
            for (int k = 0; k < 6; ++k) {
                maps.anchorBase[k] = base;
                base += static_cast<size_t>(maps.gh[k]) * maps.gw[k] * maps.anchorsPerCell[k];
            }
            if (!a.Allocate()) return false;
            anchors = lmk::NewArray<float>(base * 4);
            cand = lmk::NewArray<nn::Candidate>(base);
            if (!anchors || !cand) return false;
            nn::SsdAnchors(maps.gh, maps.gw, 6, inW, inH, anchors.get());
        }
    }
    const size_t kept = nn::NonMaxSuppression(cand.get(), nCand, 0.5f, maxOut);
    // Boxes are relative to the canvas; clip there, then express them
    // relative to the crop, which covers the canvas' first round(crop x
    // scale) input pixels (the convention the detector's boxes were made
    // with).
    const float fx = static_cast<float>(inW) / static_cast<float>(std::lround(static_cast<double>(crop.w) * inW / cv.w));
    const float fy = static_cast<float>(inH) / static_cast<float>(std::lround(static_cast<double>(crop.h) * inH / cv.h));
    for (size_t i = 0; i < kept; ++i) {
        const nn::Box& b = cand[i].box;
        const float top = std::fmax(0.0f, b.ymin) * fy, bottom = std::fmin(1.0f, b.ymax) * fy;
        const float left = std::fmax(0.0f, b.xmin) * fx, right = std::fmin(1.0f, b.xmax) * fx;
        out[i].x = left;
        out[i].y = top;
        out[i].w = right - left;
        out[i].h = bottom - top;
        out[i].score = cand[i].score;
    }
    *count = kept;
    return true;
}

// ---------------------------------------------------------------- tiny detector

bool TinyDetector::Load(const nn::WeightBlob& blob) {
    char name[64];
    if (!blob.Conv("tfd/conv0", &conv0_) || !blob.Conv("tfd/conv8", &conv8_)) return false;
    for (int i = 1; i <= 5; ++i) {
        if (!Name(name, sizeof name, "%s/conv%d/dw", "tfd", i) || !blob.Depthwise(name, &dw_[i])) return false;
        if (!Name(name, sizeof name, "%s/conv%d/pw", "tfd", i) || !blob.Conv(name, &pw_[i])) return false;
    }
    return true;
}

bool TinyDetector::Detect(const nn::ImageView& img, const nn::Crop& crop, int inputSize, float minScore,
                          Detection* out, size_t maxOut, size_t* count) const {
    static const float kAnchors[5][2] = {
        {1.603231f, 2.094468f}, {6.041143f, 7.080126f}, {2.882459f, 3.518061f}, {4.266906f, 5.178857f}, {9.041765f, 10.66308f}};
    static const float kMean[3] = {117.001f, 114.697f, 97.404f};
    *count = 0;
    if (crop.w <= 0 || crop.h <= 0 || inputSize < 64 || inputSize > 2048 || inputSize % 32 != 0) return false;
    const nn::Canvas cv = nn::SquareCanvas(crop, false);
    Arena a;
    Tensor t;
    for (int pass = 0; pass < 2; ++pass) {
        Tensor x = a.Take(kIn, inputSize, inputSize, 3);
        if (!a.Planning()) nn::SampleCanvas(img, crop, cv, inputSize, inputSize, kMean, 255.0f, x.d);
        t = nn::Conv2D(a, kS2, x, conv0_, 1, Pad::Valid, Act::Leaky);
        t = nn::MaxPool(a, kS3, t, 2, 2, Pad::Same);
        for (int i = 1; i <= 5; ++i) {
            t = SeparableConv(a, kS4, kS2, t, dw_[i], pw_[i], 1, Act::Leaky);
            t = nn::MaxPool(a, kS3, t, 2, i < 5 ? 2 : 1, Pad::Same);
        }
        t = nn::Conv2D(a, kS5, t, conv8_, 1, Pad::Valid, Act::None);
        if (a.Planning() && !a.Allocate()) return false;
    }
    // Cells: 5 anchors x (x, y, w, h, score). The photo occupies the
    // top-left of the square canvas; boxes are made relative to the crop.
    const int cells = t.h;
    const float corrX = static_cast<float>(inputSize) / static_cast<float>(std::lround(static_cast<double>(crop.w) * inputSize / cv.w));
    const float corrY = static_cast<float>(inputSize) / static_cast<float>(std::lround(static_cast<double>(crop.h) * inputSize / cv.h));
    const size_t maxCand = static_cast<size_t>(t.h) * t.w * 5;
    lmk::UniqueArray<nn::Candidate> cand = lmk::NewArray<nn::Candidate>(maxCand);
    if (!cand) return false;
    size_t n = 0;
    for (int row = 0; row < t.h; ++row) {
        for (int col = 0; col < t.w; ++col) {
            const float* v = t.At(row, col);
            for (int k = 0; k < 5; ++k) {
                const float* e = v + 5 * k;
                const float score = nn::Sigmoid(e[4]);
                if (!(score > minScore)) continue;
                const float cx = (col + nn::Sigmoid(e[0])) / cells * corrX;
                const float cy = (row + nn::Sigmoid(e[1])) / cells * corrY;
                const float w = lmk::ExpF(e[2]) * kAnchors[k][0] / cells * corrX;
                const float h = lmk::ExpF(e[3]) * kAnchors[k][1] / cells * corrY;
                nn::Candidate& c = cand[n++];
                c.box.xmin = cx - w / 2;
                c.box.ymin = cy - h / 2;
                c.box.xmax = c.box.xmin + w;
                c.box.ymax = c.box.ymin + h;
                c.score = score;
                c.index = static_cast<int>(n);
            }
        }
    }
    const size_t kept = nn::NonMaxSuppression(cand.get(), n, 0.4f, maxOut);
    for (size_t i = 0; i < kept; ++i) {
        const nn::Box& b = cand[i].box;
        out[i].x = b.xmin;
        out[i].y = b.ymin;
        out[i].w = b.xmax - b.xmin;
        out[i].h = b.ymax - b.ymin;
        out[i].score = cand[i].score;
    }
    *count = kept;
    return true;
}

// ---------------------------------------------------------------- dense-block face net

bool DenseFaceNet::Load(const nn::WeightBlob& blob, const char* prefix) {
    char name[64];
    if (!Name(name, sizeof name, "%s/dense%d/conv0", prefix, 0) || !blob.Conv(name, &conv0_)) return false;
    for (int d = 0; d < 4; ++d) {
        for (int c = (d == 0 ? 1 : 0); c < 4; ++c) {
            if (!Name(name, sizeof name, "%s/dense%d/conv%d/dw", prefix, d, c) || !blob.Depthwise(name, &dw_[d][c]))
                return false;
            if (!Name(name, sizeof name, "%s/dense%d/conv%d/pw", prefix, d, c) || !blob.Conv(name, &pw_[d][c]))
                return false;
        }
    }
    if (!Name(name, sizeof name, "%s/fc%.0d", prefix, 0) || !blob.Dense(name, &fc_)) return false;
    return fc_.nin == 256;
}

bool DenseFaceNet::Run(const nn::ImageView& img, const nn::Crop& crop, float* out) const {
    if (crop.w <= 0 || crop.h <= 0) return false;
    const nn::Canvas cv = nn::SquareCanvas(crop, true);
    Arena a;
    float pooled[256];
    for (int pass = 0; pass < 2; ++pass) {
        const bool run = pass == 1;
        Tensor x = a.Take(kIn, 112, 112, 3);
        if (run) nn::SampleCanvas(img, crop, cv, 112, 112, kFaceMean, 255.0f, x.d);
        // Four dense blocks: out1 = relu(conv0(x)), then each further
        // separable convolution reads relu(sum of the previous outputs).
        Tensor in = x;
        for (int d = 0; d < 4; ++d) {
            Tensor s = d == 0 ? nn::Conv2D(a, kS3, in, conv0_, 2, Pad::Same, Act::Relu)
                              : SeparableConv(a, kS6, kS3, in, dw_[d][0], pw_[d][0], 2, Act::Relu);
            for (int c = 1; c < 4; ++c) {
                Tensor src = s;
                if (c > 1) {
                    src = a.Take(kS4, s.h, s.w, s.c);
                    if (run) nn::ReluInto(src, s);
                }
                Tensor u = SeparableConv(a, kS6, kS5, src, dw_[d][c], pw_[d][c], 1, Act::None);
                if (run) nn::AddInto(s, u);
            }
            Tensor o = a.Take(kS2, s.h, s.w, s.c);
            if (run) nn::ReluInto(o, s);
            in = o;
        }
        // 7 x 7 x 256 averaged to one vector.
        Tensor p = nn::AvgPool(a, kS7, in, 7, 2);
        if (!run) {
            if (p.h != 1 || p.w != 1 || p.c != 256) return false;
            if (!a.Allocate()) return false;
        } else {
            std::memcpy(pooled, p.d, sizeof pooled);
        }
    }
    nn::Dense(pooled, fc_, out);
    return true;
}

// ---------------------------------------------------------------- age

bool AgeNet::Load(const nn::WeightBlob& blob) {
    char name[64];
    auto sep = [&](Separable* s, const char* base) {
        return Name(name, sizeof name, "%s/dw%.0d", base, 0) && blob.Depthwise(name, &s->dw) &&
               Name(name, sizeof name, "%s/pw%.0d", base, 0) && blob.Conv(name, &s->pw);
    };
    char base[64];
    if (!blob.Conv("age/conv_in", &convIn_)) return false;
    for (int r = 0; r < 3; ++r) {
        if (!Name(base, sizeof base, "%s/red%d/sep0", "age", r) || !sep(&red_[r].sep0, base)) return false;
        if (!Name(base, sizeof base, "%s/red%d/sep1", "age", r) || !sep(&red_[r].sep1, base)) return false;
        if (!Name(base, sizeof base, "%s/red%d/expand", "age", r) || !blob.Conv(base, &red_[r].expand)) return false;
    }
    for (int b = 0; b < 2; ++b)
        for (int s = 0; s < 3; ++s)
            if (!Name(base, sizeof base, "%s/main%d/sep%d", "age", b, s) || !sep(&main_[b][s], base)) return false;
    if (!sep(&exit_, "age/exit")) return false;
    if (!blob.Dense("age/fc_age", &fcAge_) || !blob.Dense("age/fc_gender", &fcGender_)) return false;
    return fcAge_.nin == 512 && fcAge_.nout == 1 && fcGender_.nin == 512 && fcGender_.nout == 2;
}

bool AgeNet::Run(const nn::ImageView& img, const nn::Crop& crop, float* age, float* male) const {
    if (crop.w <= 0 || crop.h <= 0) return false;
    const nn::Canvas cv = nn::SquareCanvas(crop, true);
    Arena a;
    float pooled[512];
    for (int pass = 0; pass < 2; ++pass) {
        const bool run = pass == 1;
        Tensor x = a.Take(kIn, 112, 112, 3);
        if (run) nn::SampleCanvas(img, crop, cv, 112, 112, kFaceMean, 255.0f, x.d);
        Tensor cur = nn::Conv2D(a, kS2, x, convIn_, 2, Pad::Same, Act::Relu);
        // Reduction blocks: two separable convolutions (the second on a
        // rectified input), 3x3 max pooling by 2, plus a strided 1x1
        // projection of the block input.
        for (int r = 0; r < 3; ++r) {
            if (r == 2) {
                // Middle flow: residual blocks of three rectified separable convolutions.
                for (int b = 0; b < 2; ++b) {
                    Tensor t = cur;
                    for (int s = 0; s < 3; ++s) {
                        Tensor rl = a.Take(s % 2 == 0 ? kS3 : kS4, t.h, t.w, t.c);
                        if (run) nn::ReluInto(rl, t);
                        t = SeparableConv(a, kS6, s % 2 == 0 ? kS4 : kS3, rl, main_[b][s].dw, main_[b][s].pw, 1, Act::None);
                    }
                    if (run) nn::AddInto(cur, t);
                }
            }
            const Reduction& rb = red_[r];
            Tensor in = cur;
            if (r > 0) {
                in = a.Take(kS3, cur.h, cur.w, cur.c);
                if (run) nn::ReluInto(in, cur);
            }
            Tensor t = SeparableConv(a, kS6, kS4, in, rb.sep0.dw, rb.sep0.pw, 1, Act::Relu);
            t = SeparableConv(a, kS6, kS3, t, rb.sep1.dw, rb.sep1.pw, 1, Act::None);
            Tensor pool = nn::MaxPool(a, kS4, t, 3, 2, Pad::Same);
            Tensor e = nn::Conv2D(a, kS5, cur, rb.expand, 2, Pad::Same, Act::None);
            if (!run && (e.h != pool.h || e.w != pool.w || e.c != pool.c)) return false;
            Tensor next = a.Take(kS2, pool.h, pool.w, pool.c);
            if (run) {
                nn::Copy(next, pool);
                nn::AddInto(next, e);
            }
            cur = next;
        }
        Tensor f = SeparableConv(a, kS6, kS3, cur, exit_.dw, exit_.pw, 1, Act::Relu);
        Tensor p = nn::AvgPool(a, kS7, f, 7, 2);
        if (!run) {
            if (p.h != 1 || p.w != 1 || p.c != 512) return false;
            if (!a.Allocate()) return false;
        } else {
            std::memcpy(pooled, p.d, sizeof pooled);
        }
    }
    float g[2];
    nn::Dense(pooled, fcAge_, age);
    nn::Dense(pooled, fcGender_, g);
    // Softmax of the two gender logits.
    const float mx = g[0] > g[1] ? g[0] : g[1];
    const float e0 = lmk::ExpF(g[0] - mx), e1 = lmk::ExpF(g[1] - mx);
    *male = e0 / (e0 + e1);
    return true;
}

// ---------------------------------------------------------------- recognition

namespace {
const char* const kResBlocks[14] = {"conv32_1",  "conv32_2",  "conv32_3",     "conv64_down",
                                    "conv64_1",  "conv64_2",  "conv64_3",     "conv128_down",
                                    "conv128_1", "conv128_2", "conv256_down", "conv256_1",
                                    "conv256_2", "conv256_down_out"};
bool IsDown(int i) { return i == 3 || i == 7 || i == 10 || i == 13; }
}  // namespace

bool RecognitionNet::Load(const nn::WeightBlob& blob) {
    char name[64];
    if (!blob.Conv("rec/conv32_down", &down_)) return false;
    for (int i = 0; i < 14; ++i) {
        if (!Name(name, sizeof name, "rec/%s/conv%d", kResBlocks[i], 1) || !blob.Conv(name, &conv1_[i])) return false;
        if (!Name(name, sizeof name, "rec/%s/conv%d", kResBlocks[i], 2) || !blob.Conv(name, &conv2_[i])) return false;
    }
    if (!blob.Dense("rec/fc", &fc_)) return false;
    return fc_.nin == 256 && fc_.nout == kDim;
}

bool RecognitionNet::Run(const nn::ImageView& img, const nn::Crop& crop, float* out, bool mirror) const {
    if (crop.w <= 0 || crop.h <= 0) return false;
    const nn::Canvas cv = nn::SquareCanvas(crop, true);
    Arena a;
    float mean[256];
    for (int pass = 0; pass < 2; ++pass) {
        const bool run = pass == 1;
        Tensor x = a.Take(kIn, 150, 150, 3);
        if (run) {
            nn::SampleCanvas(img, crop, cv, 150, 150, kFaceMean, 255.0f, x.d);
            if (mirror) {
                for (int y = 0; y < 150; ++y)
                    for (int l = 0, r = 149; l < r; ++l, --r)
                        for (int c = 0; c < 3; ++c) {
                            const float t = x.At(y, l)[c];
                            x.At(y, l)[c] = x.At(y, r)[c];
                            x.At(y, r)[c] = t;
                        }
            }
        }
        Tensor t = nn::Conv2D(a, kS3, x, down_, 2, Pad::Valid, Act::Relu);
        Tensor cur = nn::MaxPool(a, kS2, t, 3, 2, Pad::Valid);
        for (int i = 0; i < 14; ++i) {
            if (!IsDown(i)) {
                // relu(conv2(relu(conv1(x))) + x)
                Tensor t1 = nn::Conv2D(a, kS3, cur, conv1_[i], 1, Pad::Same, Act::Relu);
                Tensor t2 = nn::Conv2D(a, kS4, t1, conv2_[i], 1, Pad::Same, Act::None);
                if (run) {
                    nn::AddInto(cur, t2);
                    nn::ReluInPlace(cur);
                }
                continue;
            }
            // Down-sampling block: strided unpadded convolution; the
            // shortcut is 2x2 average pooling, zero-extended to the new
            // channel count; a convolution output one row or column short
            // of the pooled map is zero-extended as well.
            Tensor t1 = nn::Conv2D(a, kS3, cur, conv1_[i], 2, Pad::Valid, Act::Relu);
            Tensor t2 = nn::Conv2D(a, kS4, t1, conv2_[i], 1, Pad::Same, Act::None);
            Tensor p = nn::AvgPool(a, kS3, cur, 2, 2);
            if (!run && (t2.h > p.h || t2.w > p.w || t2.c < p.c)) return false;
            Tensor next = a.Take(kS2, p.h, p.w, t2.c);
            if (run) {
                for (int y = 0; y < p.h; ++y) {
                    for (int xx = 0; xx < p.w; ++xx) {
                        float* o = next.At(y, xx);
                        const float* ps = p.At(y, xx);
                        const bool inside = y < t2.h && xx < t2.w;
                        const float* ts = inside ? t2.At(y, xx) : nullptr;
                        for (int c = 0; c < t2.c; ++c) {
                            float v = inside ? ts[c] : 0.0f;
                            if (c < p.c) v += ps[c];
                            o[c] = v > 0.0f ? v : 0.0f;
                        }
                    }
                }
            }
            cur = next;
        }
        if (!run) {
            if (cur.c != 256) return false;
            if (!a.Allocate()) return false;
        } else {
            nn::GlobalMean(cur, mean);
        }
    }
    nn::Dense(mean, fc_, out);
    return true;
}

}  // namespace oriel
