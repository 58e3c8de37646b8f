#include "calib/src/attention/visual_attention.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <new>

#include <lumicor/zbm_image.h>

#include "calib/src/CALib/param_va.h"
#include "common/src/internal/plane_scale.h"
#include "common/src/internal/portable_math.h"
#include "oriel/src/pixdif/pixdif_detector.h"

using orielcore_VA::PixDifTreeDetector;
using orielcore_VA::SPooledList;
using orielcore_VA::SPooledListNode;

namespace {

// fApproximate(1.716 tanh(2 (-2 + i/128) / 3), 128) for i = 0..512, as
// written with six decimals.
const float kSigmoidTable[513] = {
    -1.484375f, -1.484375f, -1.484375f, -1.476562f, -1.476562f, -1.476562f, -1.468750f, -1.468750f,
    -1.468750f, -1.468750f, -1.460938f, -1.460938f, -1.460938f, -1.453125f, -1.453125f, -1.453125f,
    -1.445312f, -1.445312f, -1.445312f, -1.437500f, -1.437500f, -1.437500f, -1.429688f, -1.429688f,
    -1.429688f, -1.421875f, -1.421875f, -1.421875f, -1.414062f, -1.414062f, -1.414062f, -1.406250f,
    -1.406250f, -1.398438f, -1.398438f, -1.398438f, -1.390625f, -1.390625f, -1.390625f, -1.382812f,
    -1.382812f, -1.375000f, -1.375000f, -1.375000f, -1.367188f, -1.367188f, -1.359375f, -1.359375f,
    -1.351562f, -1.351562f, -1.351562f, -1.343750f, -1.343750f, -1.335938f, -1.335938f, -1.328125f,
    -1.328125f, -1.328125f, -1.320312f, -1.320312f, -1.312500f, -1.312500f, -1.304688f, -1.304688f,
    -1.296875f, -1.296875f, -1.289062f, -1.289062f, -1.281250f, -1.281250f, -1.273438f, -1.273438f,
    -1.265625f, -1.265625f, -1.257812f, -1.257812f, -1.250000f, -1.250000f, -1.242188f, -1.242188f,
    -1.234375f, -1.234375f, -1.226562f, -1.218750f, -1.218750f, -1.210938f, -1.210938f, -1.203125f,
    -1.203125f, -1.195312f, -1.187500f, -1.187500f, -1.179688f, -1.179688f, -1.171875f, -1.164062f,
    -1.164062f, -1.156250f, -1.156250f, -1.148438f, -1.140625f, -1.140625f, -1.132812f, -1.125000f,
    -1.125000f, -1.117188f, -1.117188f, -1.109375f, -1.101562f, -1.101562f, -1.093750f, -1.085938f,
    -1.085938f, -1.078125f, -1.070312f, -1.062500f, -1.062500f, -1.054688f, -1.046875f, -1.046875f,
    -1.039062f, -1.031250f, -1.023438f, -1.023438f, -1.015625f, -1.007812f, -1.007812f, -1.000000f,
    -0.992188f, -0.984375f, -0.976562f, -0.976562f, -0.968750f, -0.960938f, -0.953125f, -0.953125f,
    -0.945312f, -0.937500f, -0.929688f, -0.921875f, -0.921875f, -0.914062f, -0.906250f, -0.898438f,
    -0.890625f, -0.890625f, -0.882812f, -0.875000f, -0.867188f, -0.859375f, -0.851562f, -0.843750f,
    -0.843750f, -0.835938f, -0.828125f, -0.820312f, -0.812500f, -0.804688f, -0.796875f, -0.789062f,
    -0.789062f, -0.781250f, -0.773438f, -0.765625f, -0.757812f, -0.750000f, -0.742188f, -0.734375f,
    -0.726562f, -0.718750f, -0.710938f, -0.703125f, -0.695312f, -0.687500f, -0.679688f, -0.679688f,
    -0.671875f, -0.664062f, -0.656250f, -0.648438f, -0.640625f, -0.632812f, -0.625000f, -0.617188f,
    -0.609375f, -0.601562f, -0.593750f, -0.585938f, -0.578125f, -0.570312f, -0.562500f, -0.554688f,
    -0.546875f, -0.539062f, -0.531250f, -0.523438f, -0.507812f, -0.500000f, -0.492188f, -0.484375f,
    -0.476562f, -0.468750f, -0.460938f, -0.453125f, -0.445312f, -0.437500f, -0.429688f, -0.421875f,
    -0.414062f, -0.406250f, -0.398438f, -0.390625f, -0.375000f, -0.367188f, -0.359375f, -0.351562f,
    -0.343750f, -0.335938f, -0.328125f, -0.320312f, -0.312500f, -0.304688f, -0.289062f, -0.281250f,
    -0.273438f, -0.265625f, -0.257812f, -0.250000f, -0.242188f, -0.234375f, -0.226562f, -0.210938f,
    -0.203125f, -0.195312f, -0.187500f, -0.179688f, -0.171875f, -0.164062f, -0.156250f, -0.140625f,
    -0.132812f, -0.125000f, -0.117188f, -0.109375f, -0.101562f, -0.093750f, -0.078125f, -0.070312f,
    -0.062500f, -0.054688f, -0.046875f, -0.039062f, -0.031250f, -0.015625f, -0.007812f, 0.000000f,
    0.000000f, 0.007812f, 0.015625f, 0.023438f, 0.039062f, 0.046875f, 0.054688f, 0.062500f,
    0.070312f, 0.078125f, 0.085938f, 0.101562f, 0.109375f, 0.117188f, 0.125000f, 0.132812f,
    0.140625f, 0.148438f, 0.164062f, 0.171875f, 0.179688f, 0.187500f, 0.195312f, 0.203125f,
    0.210938f, 0.218750f, 0.234375f, 0.242188f, 0.250000f, 0.257812f, 0.265625f, 0.273438f,
    0.281250f, 0.289062f, 0.296875f, 0.312500f, 0.320312f, 0.328125f, 0.335938f, 0.343750f,
    0.351562f, 0.359375f, 0.367188f, 0.375000f, 0.382812f, 0.398438f, 0.406250f, 0.414062f,
    0.421875f, 0.429688f, 0.437500f, 0.445312f, 0.453125f, 0.460938f, 0.468750f, 0.476562f,
    0.484375f, 0.492188f, 0.500000f, 0.507812f, 0.515625f, 0.531250f, 0.539062f, 0.546875f,
    0.554688f, 0.562500f, 0.570312f, 0.578125f, 0.585938f, 0.593750f, 0.601562f, 0.609375f,
    0.617188f, 0.625000f, 0.632812f, 0.640625f, 0.648438f, 0.656250f, 0.664062f, 0.671875f,
    0.679688f, 0.687500f, 0.687500f, 0.695312f, 0.703125f, 0.710938f, 0.718750f, 0.726562f,
    0.734375f, 0.742188f, 0.750000f, 0.757812f, 0.765625f, 0.773438f, 0.781250f, 0.789062f,
    0.796875f, 0.796875f, 0.804688f, 0.812500f, 0.820312f, 0.828125f, 0.835938f, 0.843750f,
    0.851562f, 0.851562f, 0.859375f, 0.867188f, 0.875000f, 0.882812f, 0.890625f, 0.898438f,
    0.898438f, 0.906250f, 0.914062f, 0.921875f, 0.929688f, 0.929688f, 0.937500f, 0.945312f,
    0.953125f, 0.960938f, 0.960938f, 0.968750f, 0.976562f, 0.984375f, 0.984375f, 0.992188f,
    1.000000f, 1.007812f, 1.015625f, 1.015625f, 1.023438f, 1.031250f, 1.031250f, 1.039062f,
    1.046875f, 1.054688f, 1.054688f, 1.062500f, 1.070312f, 1.070312f, 1.078125f, 1.085938f,
    1.093750f, 1.093750f, 1.101562f, 1.109375f, 1.109375f, 1.117188f, 1.125000f, 1.125000f,
    1.132812f, 1.132812f, 1.140625f, 1.148438f, 1.148438f, 1.156250f, 1.164062f, 1.164062f,
    1.171875f, 1.171875f, 1.179688f, 1.187500f, 1.187500f, 1.195312f, 1.195312f, 1.203125f,
    1.210938f, 1.210938f, 1.218750f, 1.218750f, 1.226562f, 1.226562f, 1.234375f, 1.242188f,
    1.242188f, 1.250000f, 1.250000f, 1.257812f, 1.257812f, 1.265625f, 1.265625f, 1.273438f,
    1.273438f, 1.281250f, 1.281250f, 1.289062f, 1.289062f, 1.296875f, 1.296875f, 1.304688f,
    1.304688f, 1.312500f, 1.312500f, 1.320312f, 1.320312f, 1.328125f, 1.328125f, 1.335938f,
    1.335938f, 1.335938f, 1.343750f, 1.343750f, 1.351562f, 1.351562f, 1.359375f, 1.359375f,
    1.359375f, 1.367188f, 1.367188f, 1.375000f, 1.375000f, 1.382812f, 1.382812f, 1.382812f,
    1.390625f, 1.390625f, 1.398438f, 1.398438f, 1.398438f, 1.406250f, 1.406250f, 1.406250f,
    1.414062f, 1.414062f, 1.421875f, 1.421875f, 1.421875f, 1.429688f, 1.429688f, 1.429688f,
    1.437500f, 1.437500f, 1.437500f, 1.445312f, 1.445312f, 1.445312f, 1.453125f, 1.453125f,
    1.453125f, 1.460938f, 1.460938f, 1.460938f, 1.468750f, 1.468750f, 1.468750f, 1.476562f,
    1.476562f, 1.476562f, 1.476562f, 1.484375f, 1.484375f, 1.484375f, 1.492188f, 1.492188f,
    1.492188f,};

inline uint8_t ClampByte(float v) {
    if (!(v > 0.0f)) return 0;
    if (v >= 255.0f) return 255;
    return static_cast<uint8_t>(v);
}

// tanh from the portable exp, so that every target gets the same bits.
float Tanh(float x) {
    const double ax = std::fabs(static_cast<double>(x));
    const double e = lmk::Exp(-2.0 * ax);
    const double t = (1.0 - e) / (1.0 + e);
    return static_cast<float>(x < 0.0f ? -t : t);
}

inline float Phi(float x) { return 1.716f * Tanh(2.0f * x / 3.0f); }

// Linear stretch of an 8-bit map to 0..255; a constant map becomes 127.
// Only 256 inputs exist, so the stretch is tabulated.
void LinearStretch(uint8_t* map, int32_t n) {
    uint8_t mn = 255, mx = 0;
    for (int32_t i = 0; i < n; ++i) {
        if (map[i] < mn) mn = map[i];
        if (map[i] > mx) mx = map[i];
    }
    if (mn == mx) {
        std::memset(map, 127, static_cast<size_t>(n));
        return;
    }
    const float range = static_cast<float>(mx - mn);
    uint8_t table[256];
    for (int32_t v = mn; v <= mx; ++v) {
        table[v] = ClampByte(std::floor(static_cast<float>(v - mn) / range * 255.0f));
    }
    for (int32_t i = 0; i < n; ++i) map[i] = table[map[i]];
}

// Float to byte with stretching: min starts at 255 and max at 0.
void FloatToByteStretch(const float* src, uint8_t* dst, int32_t n) {
    float mn = 255.0f, mx = 0.0f;
    for (int32_t i = 0; i < n; ++i) {
        if (src[i] < mn) mn = src[i];
        if (src[i] > mx) mx = src[i];
    }
    if (mn != mx) {
        const float range = mx - mn;
        for (int32_t i = 0; i < n; ++i) dst[i] = ClampByte(std::floor((src[i] - mn) / range * 255.0f));
    } else {
        for (int32_t i = 0; i < n; ++i) dst[i] = ClampByte(std::floor(src[i] - mn + 127.5f));
    }
}

// One axis of a pyramid reduction: n inputs `inStep` apart into m outputs.
void Reduce1D(const uint8_t* in, int32_t n, int32_t inStep, uint8_t* out, int32_t m, int32_t outStep, int32_t taps) {
    if (n == 1) {
        out[0] = in[0];
        return;
    }
    if (taps == 2) {
        for (int32_t i = 0; i < m; ++i) {
            if (i == m - 1 && (n & 1)) {
                out[i * outStep] =
                    static_cast<uint8_t>((in[(n - 3) * inStep] + in[(n - 2) * inStep] + in[(n - 1) * inStep]) / 3);
            } else {
                out[i * outStep] = static_cast<uint8_t>((in[2 * i * inStep] + in[(2 * i + 1) * inStep]) / 2);
            }
        }
        return;
    }
    if (n == 2) {
        out[0] = static_cast<uint8_t>((in[0] + in[inStep]) / 2);
        return;
    }
    if (n == 3) {
        out[0] = static_cast<uint8_t>((in[0] + 2 * in[inStep] + in[2 * inStep]) / 4);
        return;
    }
    static const int32_t kWeights[6] = {1, 5, 10, 10, 5, 1};
    for (int32_t i = 0; i < m; ++i) {
        int32_t sum = 0, weight = 0;
        for (int32_t t = 0; t < 6; ++t) {
            const int32_t at = 2 * i + t - 2;
            if (at < 0 || at >= n) continue;
            sum += kWeights[t] * in[at * inStep];
            weight += kWeights[t];
        }
        out[i * outStep] = static_cast<uint8_t>(sum / weight);
    }
}

// Radius of the normalisation kernels: floor(sigma 3.0349), but at most
// min(width, height) / 2 - 1 on maps of at least 2 x 2.
int32_t GaussRadius(float sigma, int32_t width, int32_t height) {
    int32_t r = static_cast<int32_t>(std::floor(sigma * 3.0349f));
    const int32_t half = (width < height ? width : height) / 2 - 1;
    if (width >= 2 && height >= 2 && half > 0 && half < r) r = half;
    return r < 0 ? 0 : r;
}

// g_i = amplitude / (sigma 2.5066) exp(-0.5 (i / sigma)^2).
float GaussTap(float amplitude, float sigma, int32_t i) {
    const float q = static_cast<float>(i) / sigma;
    return amplitude / (sigma * 2.5066f) * lmk::ExpF(-0.5f * q * q);
}

}  // namespace

float fApproximate(float x, int32_t n) {
    if (n == 0) return x;
    const float nf = static_cast<float>(n);
    const float v = (x + 1.0f / (2.0f * nf)) * nf;
    if (!(v > -2147483648.0f && v < 2147483648.0f)) return x;
    return static_cast<float>(static_cast<int32_t>(v)) / nf;
}

float fApproximateRange(float x, int32_t n, float lo, float hi) {
    if (lo != 0.0f && hi != 0.0f) {
        if (x < lo) x = lo;
        if (x > hi) x = hi;
    }
    return fApproximate(x, n);
}

float VaSigmoidTable(float x) {
    if (x != x) x = 0.0f;
    const float q = fApproximateRange(x, 128, -2.0f, 2.0f);
    const int32_t index = static_cast<int32_t>(std::floor(128.0f * q + 256.0f));
    return kSigmoidTable[index < 0 ? 0 : (index > 512 ? 512 : index)];
}

// ------------------------------------------------------------------ lifecycle

VisualAttention::VisualAttention()
    : prm_(nullptr), numLevels_(0), salLevel_(0), numCS_(0), numFeatures_(0), counter_(0), tableSigmoid_(false),
      haveRgb_(false), haveYcbcr_(false), faceWidth_(0), faceHeight_(0), detector_(nullptr), wS_(1.0f),
      segmenter_(nullptr) {
    std::memset(levelWidth_, 0, sizeof levelWidth_);
    std::memset(levelHeight_, 0, sizeof levelHeight_);
    std::memset(csCenter_, 0, sizeof csCenter_);
    std::memset(csSurround_, 0, sizeof csSurround_);
    std::memset(features_, 0, sizeof features_);
    std::memset(wCS_, 0, sizeof wCS_);
    std::memset(wF_, 0, sizeof wF_);
}

VisualAttention::~VisualAttention() { vReset(); }

void VisualAttention::vReset() {
    rgb_.iReset();
    ycbcr_.iReset();
    haveRgb_ = haveYcbcr_ = false;
    intensity_.iReset();
    redGreen_.iReset();
    blueYellow_.iReset();
    edge_.iReset();
    edgeWork_.iReset();
    for (ImagePlaneFloat& p : gaborPower_) p.iReset();
    gabor8_.iReset();
    pyramid_.reset();
    pyramidWork_.reset();
    csMap_.reset();
    diff_.iReset();
    diffBuf_.iReset();
    dogRow_.reset();
    dogCol_.reset();
    attenuation_.reset();
    featMap8_.reset();
    featMapF_.reset();
    csCopy_.reset();
    salMap8_.iReset();
    salMapF_.iReset();
    gradSal_.iReset();
    faceMap_.iReset();
    faceGray_.iReset();
    delete detector_;
    detector_ = nullptr;
    delete segmenter_;
    segmenter_ = nullptr;
    prm_ = nullptr;
    numLevels_ = numCS_ = numFeatures_ = counter_ = 0;
    gradientReady_ = saliencyReady_ = false;
}

int32_t VisualAttention::iInit(const MIPlane* picture, const ParamVA* params) {
    if (picture == nullptr || params == nullptr || picture->planes[0] == nullptr) return VA_ERR_INIT;
    vReset();
    prm_ = params;
    int32_t status = iInitWeight();
    if (status == 0) status = iInitPyramidSize(picture->width, picture->height);
    if (status == 0) status = iInitInputImg(picture);
    if (status == 0) status = iInitInputFaceSize(picture->width, picture->height);
    if (status == 0 && prm_->FaceDetectionCallFlag) {
        status = iInitInputFaceImg(picture);
        if (status == 0) status = iInitFaceDetector();
    }
    if (status == 0 && prm_->FeatureOriGabor) status = iInitGaborFilter();
    if (status == 0) status = iInitSailency();
    if (status == 0 && prm_->SalRectFlag) status = iInitMapSegmentIndex();
    if (status != 0) {
        vReset();
        return status;
    }
    counter_ = 0;
    return 0;
}

int32_t VisualAttention::iInitWeight() {
    const ParamVA& p = *prm_;
    const bool learn = p.WeightLearningFlag != 0;
    if (p.NumCSMap < 1 || p.NumCSMap > kMaxCSMaps) return VA_ERR_INIT;
    // Only six learned centre-surround weights exist per feature.
    if (learn && (p.WeightNumCS < 5 || p.WeightNumCS < p.NumCSMap || p.NumCSMap > 6)) return VA_ERR_INIT;
    numFeatures_ = 0;
    auto add = [&](FeatureKind kind, int32_t o, int32_t group, float learned, float plain) {
        Feature& f = features_[numFeatures_];
        f.kind = kind;
        f.orientation = o;
        f.weightGroup = group;
        wF_[numFeatures_] = learn ? learned : plain;
        for (int32_t k = 0; k < 6; ++k) {
            float w = 1.0f;
            if (learn) w = k < 5 || p.WeightNumCS == 6 ? p.fWeightCS(group, k) : 0.0f;
            wCS_[numFeatures_][k] = w;
        }
        ++numFeatures_;
    };
    const float fo[4] = {p.WeightFO1, p.WeightFO2, p.WeightFO3, p.WeightFO4};
    const float gabor[4] = {p.FeatureWeightOriGabor1, p.FeatureWeightOriGabor2, p.FeatureWeightOriGabor3,
                            p.FeatureWeightOriGabor4};
    const float edge[4] = {p.FeatureWeightOriEdge1, p.FeatureWeightOriEdge2, p.FeatureWeightOriEdge3,
                           p.FeatureWeightOriEdge4};
    if (p.FeatureIntensity) add(kIntensity, 0, 0, p.WeightFI, p.FeatureWeightIntensity);
    if (p.FeatureIntensityY) add(kLuma, 0, 0, p.WeightFI, p.FeatureWeightIntensityY);
    if (p.FeatureColorRGB) {
        add(kRedGreen, 0, 1, p.WeightFRG, p.FeatureWeightColorRG);
        add(kBlueYellow, 0, 2, p.WeightFBY, p.FeatureWeightColorBY);
    }
    if (p.FeatureColorCrCb) {
        add(kCr, 0, 1, p.WeightFRG, p.FeatureWeightColorCr);
        add(kCb, 0, 2, p.WeightFBY, p.FeatureWeightColorCb);
    }
    if (p.FeatureOriGabor) {
        for (int32_t o = 0; o < 4; ++o) add(kGabor, o, 3 + o, fo[o], gabor[o]);
    }
    if (p.FeatureOriEdge) {
        for (int32_t o = 0; o < 4; ++o) add(kEdge, o, 3 + o, fo[o], edge[o]);
    }
    if (p.FeatureFace) add(kFace, 0, 0, p.WeightFFace, p.FeatureWeightFace);
    wS_ = learn ? p.WeightS : 1.0f;
    tableSigmoid_ = p.SigmoidApxMin == -2.0f && p.SigmoidApxMax == 2.0f && p.SigmoidApxStep == 128;
    return 0;
}

int32_t VisualAttention::iInitPyramidSize(int32_t width, int32_t height) {
    const ParamVA& p = *prm_;
    if (p.NumPyramid < 1 || p.NumPyramid > kMaxLevels) return VA_ERR_INIT;
    int32_t w = width, h = height;
    if (p.ImgFixFlag) {
        if (p.ImgFixWidth < 1 || p.ImgFixHeight < 1) return VA_ERR_INIT;
        w = p.ImgFixWidth;
        h = p.ImgFixHeight;
    } else {
        if (p.ImgMaxSize < 1) return VA_ERR_INIT;
        while (h > p.ImgMaxSize) {
            w = (w + 1) / 2;
            h = (h + 1) / 2;
        }
    }
    numLevels_ = p.NumPyramid;
    for (int32_t l = 0; l < numLevels_; ++l) {
        levelWidth_[l] = w;
        levelHeight_[l] = h;
        w = w / 2 > 1 ? w / 2 : 1;
        h = h / 2 > 1 ? h / 2 : 1;
    }
    if (p.OutputDebugInfo) {
        std::printf("Pyramid Size:\n");
        for (int32_t l = 0; l < numLevels_; ++l) {
            std::printf("Level%d: W%d x H%d\n", l + 1, levelWidth_[l], levelHeight_[l]);
        }
    }
    // Centre-surround pairs; every level they use must exist.
    salLevel_ = p.CSSaliencyMapLevel;
    if (salLevel_ < 0 || salLevel_ >= numLevels_) return VA_ERR_INIT;
    numCS_ = 0;
    for (int32_t c = p.CSCenterLevelFrom; c <= p.CSCenterLevelTo && numCS_ < p.NumCSMap; ++c) {
        for (int32_t d = p.CSDiffLevelFrom; d <= p.CSDiffLevelTo && numCS_ < p.NumCSMap; ++d) {
            if (c < 0 || d < 0 || c + d >= numLevels_) return VA_ERR_INIT;
            csCenter_[numCS_] = c;
            csSurround_[numCS_] = c + d;
            ++numCS_;
        }
    }
    return numCS_ == p.NumCSMap ? 0 : VA_ERR_INIT;
}

namespace {
int32_t ScalePlane(ImagePlane* dst, const ImagePlane* src) {
    return IIScaleImage(dst->pPixel, dst->width, dst->height, dst->stride, src->pConstPixel, src->width,
                        src->height, src->stride);
}
}  // namespace

int32_t VisualAttention::iInitInputImg(const MIPlane* picture) {
    const ParamVA& p = *prm_;
    const int32_t w = levelWidth_[0], h = levelHeight_[0];
    const bool orientation = p.FeatureOriGabor || p.FeatureOriEdge;
    if (picture->format == 4) {
        if (rgb_.iInit(w, h, 4) != 0) return VA_ERR_INIT;
        for (int i = 0; i < 3; ++i) {
            if (ScalePlane(rgb_.planes[i], picture->planes[i]) != 0) return VA_ERR_INIT;
        }
        haveRgb_ = true;
        if (p.FeatureIntensityY || p.FeatureColorCrCb) {
            if (ycbcr_.iInit(w, h, 2) != 0 || iRGB2YCbCr(&rgb_, &ycbcr_) != 0) return VA_ERR_INIT;
            haveYcbcr_ = true;
        }
    } else if (picture->format == 2) {
        if (ycbcr_.iInit(w, h, 2) != 0) return VA_ERR_INIT;
        for (int i = 0; i < 3; ++i) {
            if (ScalePlane(ycbcr_.planes[i], picture->planes[i]) != 0) return VA_ERR_INIT;
        }
        haveYcbcr_ = true;
        if (p.FeatureIntensity || p.FeatureColorRGB || (!p.FeatureIntensityY && orientation)) {
            if (rgb_.iInit(w, h, 4) != 0 || iYCbCr2RGB(&ycbcr_, &rgb_) != 0) return VA_ERR_INIT;
            haveRgb_ = true;
        }
    } else {
        return VA_ERR_INIT;
    }
    if (p.OutputDebugDump) {
        char name[512];
        if (haveRgb_) {
            std::snprintf(name, sizeof name, "%s_resize_in.ppm", p.outputPath);
            rgb_.iSavePPM(name);
        }
        if (haveYcbcr_) {
            std::snprintf(name, sizeof name, "%s_resize_in_ycbcr.ppm", p.outputPath);
            ycbcr_.iSavePPM(name);
        }
    }
    return 0;
}

int32_t VisualAttention::iInitInputFaceSize(int32_t width, int32_t height) {
    if (prm_->FaceImgMaxSize < 1) return VA_ERR_INIT;
    while (height > prm_->FaceImgMaxSize) {
        width = (width + 1) / 2;
        height = (height + 1) / 2;
    }
    faceWidth_ = width;
    faceHeight_ = height;
    return 0;
}

int32_t VisualAttention::iInitInputFaceImg(const MIPlane* picture) {
    if (faceGray_.iInit(faceWidth_, faceHeight_) != 0) return VA_ERR_INIT;
    if (picture->format == 2) return ScalePlane(&faceGray_, picture->planes[0]) == 0 ? 0 : VA_ERR_INIT;
    // RGB: gray at the picture size, then scaled.
    ImagePlane gray;
    if (gray.iInit(picture->width, picture->height) != 0) return VA_ERR_INIT;
    const ImagePlane& g = *picture->planes[0];
    const ImagePlane& b = *picture->planes[1];
    const ImagePlane& r = *picture->planes[2];
    for (int32_t y = 0; y < picture->height; ++y) {
        for (int32_t x = 0; x < picture->width; ++x) {
            gray.pPixel[y * gray.stride + x] =
                ZbiuRgb2Gray(r.pConstPixel[y * r.stride + x], g.pConstPixel[y * g.stride + x],
                             b.pConstPixel[y * b.stride + x]);
        }
    }
    return ScalePlane(&faceGray_, &gray) == 0 ? 0 : VA_ERR_INIT;
}

int32_t VisualAttention::iInitFaceDetector() {
    detector_ = new (std::nothrow) PixDifTreeDetector();
    if (detector_ == nullptr) return VA_ERR_INIT;
    const bool ok = prm_->FaceLoadDataFlag ? detector_->LoadData(prm_->FaceDatafile)
                                           : detector_->AttachData(orielcore_VA::PixDifTreeData_MV09_M2R_X5());
    if (!ok || !detector_->AllocateMemory(2048, 2048, 20, 1024)) return VA_ERR_INIT;
    detector_->SetEndThresholdBias(prm_->FaceThresh);
    detector_->stepX = detector_->stepY = prm_->FaceStep;
    detector_->stabilize = prm_->FaceStabilize;
    return 0;
}

int32_t VisualAttention::iInitGaborFilter() {
    const float pi = 3.14159265f;
    const float orientations[4] = {pi / 2.0f, 3.0f * pi / 4.0f, pi, 5.0f * pi / 4.0f};
    return gabor_.iInit(1.0f / 7.0f, 4, orientations, 9, prm_->ConvBndHandle) == 0 ? 0 : VA_ERR_INIT;
}

int32_t VisualAttention::iInitSailency() {
    const ParamVA& p = *prm_;
    const int32_t w0 = levelWidth_[0], h0 = levelHeight_[0];
    const int32_t sw = levelWidth_[salLevel_], sh = levelHeight_[salLevel_];
    const size_t n0 = static_cast<size_t>(w0) * static_cast<size_t>(h0);
    const bool orientation = p.FeatureOriGabor || p.FeatureOriEdge;
    if ((p.FeatureIntensity || (!p.FeatureIntensityY && orientation)) && intensity_.iInit(w0, h0) != 0) {
        return VA_ERR_INIT;
    }
    if (p.FeatureColorRGB && (redGreen_.iInit(w0, h0) != 0 || blueYellow_.iInit(w0, h0) != 0)) return VA_ERR_INIT;
    if (orientation && edgeWork_.iInit(w0, h0) != 0) return VA_ERR_INIT;
    if (p.FeatureOriEdge && (edge_.iInit(w0, h0) != 0 || edge_.iResetPxlVal(0) != 0)) return VA_ERR_INIT;
    if (p.FeatureOriGabor) {
        for (ImagePlaneFloat& g : gaborPower_) {
            if (g.iInit(w0, h0) != 0) return VA_ERR_INIT;
        }
        if (gabor8_.iInit(w0, h0) != 0) return VA_ERR_INIT;
    }
    pyramid_ = lmk::NewArray<ImagePlane>(static_cast<size_t>(numLevels_));
    pyramidWork_ = lmk::NewArray<uint8_t>(n0);
    if (!pyramid_ || !pyramidWork_) return VA_ERR_INIT;
    for (int32_t l = 0; l < numLevels_; ++l) {
        if (pyramid_[l].iInit(levelWidth_[l], levelHeight_[l]) != 0) return VA_ERR_INIT;
    }
    csMap_ = lmk::NewArray<ImagePlane>(static_cast<size_t>(numCS_));
    if (!csMap_) return VA_ERR_INIT;
    for (int32_t k = 0; k < numCS_; ++k) {
        if (csMap_[k].iInit(sw, sh) != 0) return VA_ERR_INIT;
    }
    if (diff_.iInit(w0, h0) != 0 || diffBuf_.iInit(w0, h0) != 0) return VA_ERR_INIT;
    if (!p.NormReductionFlag) {
        dogRow_ = lmk::NewArray<float>(n0);
        dogCol_ = lmk::NewArray<float>(n0);
        if (!dogRow_ || !dogCol_) return VA_ERR_INIT;
    }
    attenuation_ = lmk::NewArray<float>(static_cast<size_t>((sw > sh ? sw : sh) / 20 + 1));
    if (!attenuation_) return VA_ERR_INIT;
    if (numFeatures_ > 0) {
        featMap8_ = lmk::NewArray<ImagePlane>(static_cast<size_t>(numFeatures_));
        featMapF_ = lmk::NewArray<ImagePlaneFloat>(static_cast<size_t>(numFeatures_));
        if (!featMap8_ || !featMapF_) return VA_ERR_INIT;
        for (int32_t f = 0; f < numFeatures_; ++f) {
            if (featMap8_[f].iInit(sw, sh) != 0 || featMapF_[f].iInit(sw, sh) != 0) return VA_ERR_INIT;
        }
        if (p.OutputCSMap) {
            csCopy_ = lmk::NewArray<ImagePlane>(static_cast<size_t>(numFeatures_) * static_cast<size_t>(numCS_));
            if (!csCopy_) return VA_ERR_INIT;
            for (int32_t i = 0; i < numFeatures_ * numCS_; ++i) {
                if (csCopy_[i].iInit(sw, sh) != 0) return VA_ERR_INIT;
            }
        }
    }
    if (salMap8_.iInit(sw, sh) != 0 || salMapF_.iInit(sw, sh) != 0 || gradSal_.iInit(sw, sh) != 0) {
        return VA_ERR_INIT;
    }
    if (faceMap_.iInit(faceWidth_, faceHeight_) != 0 || faceMap_.iResetPxlVal(0) != 0) return VA_ERR_INIT;
    return 0;
}

int32_t VisualAttention::iInitMapSegmentIndex() {
    segmenter_ = new (std::nothrow) CMapSegmentIndex();
    if (segmenter_ == nullptr) return VA_ERR_INIT;
    const int32_t sw = levelWidth_[salLevel_], sh = levelHeight_[salLevel_];
    return segmenter_->Initialize(sw, sh, sw, prm_) == 0 ? 0 : VA_ERR_INIT;
}

// ------------------------------------------------------------------ colour

int32_t VisualAttention::iRGB2YCbCr(const MIPlane* rgb, MIPlane* ycbcr) {
    if (rgb == nullptr || ycbcr == nullptr || rgb->format != 4 || ycbcr->format != 2 || rgb->planes[0] == nullptr ||
        ycbcr->planes[0] == nullptr || rgb->width != ycbcr->width || rgb->height != ycbcr->height ||
        ycbcr->planes[0]->pPixel == nullptr) {
        return VA_ERR_COLOR_CONVERSION;
    }
    const ImagePlane &g = *rgb->planes[0], &b = *rgb->planes[1], &r = *rgb->planes[2];
    ImagePlane &py = *ycbcr->planes[0], &pcb = *ycbcr->planes[1], &pcr = *ycbcr->planes[2];
    for (int32_t y = 0; y < rgb->height; ++y) {
        const uint8_t* pr = r.pConstPixel + static_cast<ptrdiff_t>(y) * r.stride;
        const uint8_t* pg = g.pConstPixel + static_cast<ptrdiff_t>(y) * g.stride;
        const uint8_t* pb = b.pConstPixel + static_cast<ptrdiff_t>(y) * b.stride;
        uint8_t* oy = py.pPixel + static_cast<ptrdiff_t>(y) * py.stride;
        uint8_t* ocb = pcb.pPixel + static_cast<ptrdiff_t>(y) * pcb.stride;
        uint8_t* ocr = pcr.pPixel + static_cast<ptrdiff_t>(y) * pcr.stride;
        for (int32_t x = 0; x < rgb->width; ++x) {
            const int32_t R = pr[x], G = pg[x], B = pb[x];
            const int32_t cb = -169 * R - 331 * G + 500 * B;
            const int32_t cr = 500 * R - 419 * G - 81 * B;
            oy[x] = static_cast<uint8_t>((299 * R + 587 * G + 114 * B) / 1000);
            ocb[x] = static_cast<uint8_t>(cb >= 127000 ? 255 : cb / 1000 + 128);
            ocr[x] = static_cast<uint8_t>(cr >= 127000 ? 255 : cr / 1000 + 128);
        }
    }
    return 0;
}

int32_t VisualAttention::iYCbCr2RGB(const MIPlane* ycbcr, MIPlane* rgb) {
    if (rgb == nullptr || ycbcr == nullptr || rgb->format != 4 || ycbcr->format != 2 || rgb->planes[0] == nullptr ||
        ycbcr->planes[0] == nullptr || rgb->width != ycbcr->width || rgb->height != ycbcr->height ||
        rgb->planes[0]->pPixel == nullptr) {
        return VA_ERR_COLOR_CONVERSION;
    }
    const ImagePlane &py = *ycbcr->planes[0], &pcb = *ycbcr->planes[1], &pcr = *ycbcr->planes[2];
    ImagePlane &g = *rgb->planes[0], &b = *rgb->planes[1], &r = *rgb->planes[2];
    for (int32_t y = 0; y < rgb->height; ++y) {
        for (int32_t x = 0; x < rgb->width; ++x) {
            const int32_t Y = py.pConstPixel[y * py.stride + x];
            const int32_t Cb = pcb.pConstPixel[y * pcb.stride + x];
            const int32_t Cr = pcr.pConstPixel[y * pcr.stride + x];
            const int32_t rv = 1000 * Y + 1402 * Cr;
            const int32_t gv = 1000 * Y - 344 * Cb - 714 * Cr + 135424;
            const int32_t bv = 1000 * Y + 1772 * Cb;
            r.pPixel[y * r.stride + x] =
                static_cast<uint8_t>(rv >= 434456 ? 255 : (rv > 180455 ? (rv - 179456) / 1000 : 0));
            g.pPixel[y * g.stride + x] = static_cast<uint8_t>(gv >= 255000 ? 255 : (gv < 1000 ? 0 : gv / 1000));
            b.pPixel[y * b.stride + x] =
                static_cast<uint8_t>(bv > 481815 ? 255 : (bv > 227815 ? (bv - 226816) / 1000 : 0));
        }
    }
    return 0;
}

// ------------------------------------------------------------------ features

void VisualAttention::DumpPgm(const char* suffix, const uint8_t* data, int32_t width, int32_t height) const {
    char name[512];
    std::snprintf(name, sizeof name, "%s%s", prm_->outputPath, suffix);
    save_pgm(data, width, height, name);
}

int32_t VisualAttention::iCreateIntensity() {
    if (!haveRgb_ || intensity_.pPixel == nullptr) return VA_ERR_NO_INPUT;
    const ImagePlane &g = *rgb_.planes[0], &b = *rgb_.planes[1], &r = *rgb_.planes[2];
    for (int32_t y = 0; y < intensity_.height; ++y) {
        for (int32_t x = 0; x < intensity_.width; ++x) {
            intensity_.pPixel[y * intensity_.stride + x] = static_cast<uint8_t>(
                (r.pConstPixel[y * r.stride + x] + g.pConstPixel[y * g.stride + x] + b.pConstPixel[y * b.stride + x]) / 3);
        }
    }
    return 0;
}

int32_t VisualAttention::iCreateColorOpponents() {
    if (!haveRgb_ || redGreen_.pPixel == nullptr) return VA_ERR_NO_INPUT;
    const ImagePlane &g = *rgb_.planes[0], &b = *rgb_.planes[1], &r = *rgb_.planes[2];
    for (int32_t y = 0; y < redGreen_.height; ++y) {
        for (int32_t x = 0; x < redGreen_.width; ++x) {
            const int32_t R = r.pConstPixel[y * r.stride + x];
            const int32_t G = g.pConstPixel[y * g.stride + x];
            const int32_t B = b.pConstPixel[y * b.stride + x];
            const int32_t m = R > G ? (R > B ? R : B) : (G > B ? G : B);
            uint8_t rg = 127, by = 127;
            if (m >= 26) {
                const float mf = static_cast<float>(m);
                rg = ClampByte(std::floor(127.5f + 127.5f * static_cast<float>(R - G) / mf));
                by = ClampByte(std::floor(127.5f + 127.5f * static_cast<float>(B - (R < G ? R : G)) / mf));
            }
            redGreen_.pPixel[y * redGreen_.stride + x] = rg;
            blueYellow_.pPixel[y * blueYellow_.stride + x] = by;
        }
    }
    return 0;
}

namespace {
// Packs a plane into a contiguous buffer (row length = width).
void PackPlane(const ImagePlane& p, uint8_t* out) {
    for (int32_t y = 0; y < p.height; ++y) {
        std::memcpy(out + static_cast<size_t>(y) * p.width, p.pConstPixel + static_cast<ptrdiff_t>(y) * p.stride,
                    static_cast<size_t>(p.width));
    }
}
}  // namespace

int32_t VisualAttention::iCreateGabor() {
    const ImagePlane* src = prm_->FeatureIntensityY ? (haveYcbcr_ ? ycbcr_.planes[0] : nullptr) : &intensity_;
    if (src == nullptr || src->pConstPixel == nullptr) return VA_ERR_NO_INPUT_PLANE;
    const int32_t w = src->width, h = src->height;
    uint8_t* packed = pyramidWork_.get();
    PackPlane(*src, packed);
    for (int32_t o = 0; o < 4; ++o) {
        if (gabor_.GaborPower(packed, w, h, o, gaborPower_[o].pBuf, edgeWork_.pBuf) != 0) return VA_ERR_NO_INPUT_PLANE;
    }
    // One stretch over all four responses, so that they stay comparable.
    const int32_t n = w * h;
    float mn = 255.0f, mx = -255.0f;
    for (const ImagePlaneFloat& g : gaborPower_) {
        for (int32_t i = 0; i < n; ++i) {
            if (g.pBuf[i] < mn) mn = g.pBuf[i];
            if (g.pBuf[i] > mx) mx = g.pBuf[i];
        }
    }
    for (ImagePlaneFloat& g : gaborPower_) {
        for (int32_t i = 0; i < n; ++i) {
            float v = mx != mn ? (g.pBuf[i] - mn) / (mx - mn) * 255.0f : g.pBuf[i] - mn + 127.0f;
            if (v < 0.0f) v = 0.0f;
            if (v > 255.0f) v = 255.0f;
            g.pBuf[i] = v;
        }
    }
    return 0;
}

int32_t VisualAttention::iSelectGabor(int32_t o) {
    const int32_t n = levelWidth_[0] * levelHeight_[0];
    for (int32_t i = 0; i < n; ++i) gabor8_.pBuf[i] = static_cast<uint8_t>(gaborPower_[o].pBuf[i]);
    return 0;
}

int32_t VisualAttention::iCreateEdge(int32_t o) {
    const ImagePlane* src = prm_->FeatureIntensityY ? (haveYcbcr_ ? ycbcr_.planes[0] : nullptr) : &intensity_;
    if (src == nullptr || src->pConstPixel == nullptr || edge_.pBuf == nullptr) return VA_ERR_NO_INPUT_PLANE;
    const int32_t w = src->width, h = src->height, bnd = prm_->ConvBndHandle;
    uint8_t* packed = pyramidWork_.get();
    PackPlane(*src, packed);
    uint8_t* out = edge_.pBuf;
    static const float kV9[9] = {-1 / 16.f, -2 / 16.f, -1 / 16.f, 2 / 16.f, 4 / 16.f, 2 / 16.f, -1 / 16.f, -2 / 16.f, -1 / 16.f};
    static const float kS8[8] = {1 / 16.f, 3 / 16.f, 3 / 16.f, 1 / 16.f, 1 / 16.f, 3 / 16.f, 3 / 16.f, 1 / 16.f};
    static const float kDiag1[9] = {0, 1 / 8.f, 1 / 4.f, -1 / 8.f, 0, 1 / 8.f, -1 / 4.f, -1 / 8.f, 0};
    static const float kDiag3[9] = {1 / 4.f, 1 / 8.f, 0, 1 / 8.f, 0, -1 / 8.f, 0, -1 / 8.f, -1 / 4.f};
    static const float kA1o0[9] = {1 / 8.f, 1 / 4.f, 1 / 8.f, 0, 0, 0, -1 / 8.f, -1 / 4.f, -1 / 8.f};
    static const float kA1o1[4] = {0, 1 / 2.f, -1 / 2.f, 0};
    static const float kA1o2[9] = {1 / 8.f, 0, -1 / 8.f, 1 / 4.f, 0, -1 / 4.f, 1 / 8.f, 0, -1 / 8.f};
    static const float kA1o3[4] = {1 / 2.f, 0, 0, -1 / 2.f};
    if (prm_->EdgeAlgo == 2) {
        switch (o) {
            case 0:
                Conv2(packed, w, h, kV9, 1, 9, bnd, edgeWork_.pBuf);
                ConvF2UCABS(edgeWork_.pBuf, w, h, kS8, 8, 1, bnd, out);
                break;
            case 1: Conv2UCABS(packed, w, h, kDiag1, 3, 3, bnd, out); break;
            case 2:
                Conv2(packed, w, h, kS8, 1, 8, bnd, edgeWork_.pBuf);
                ConvF2UCABS(edgeWork_.pBuf, w, h, kV9, 9, 1, bnd, out);
                break;
            default: Conv2UCABS(packed, w, h, kDiag3, 3, 3, bnd, out); break;
        }
    } else if (prm_->EdgeAlgo == 1) {
        switch (o) {
            case 0: Conv2UCABS(packed, w, h, kA1o0, 3, 3, bnd, out); break;
            case 1: Conv2UCABS(packed, w, h, kA1o1, 2, 2, bnd, out); break;
            case 2: Conv2UCABS(packed, w, h, kA1o2, 3, 3, bnd, out); break;
            default: Conv2UCABS(packed, w, h, kA1o3, 2, 2, bnd, out); break;
        }
    }
    LinearStretch(out, w * h);
    return 0;
}

int32_t VisualAttention::iCreatePyramid(const uint8_t* src, int32_t stride) {
    const int32_t taps = prm_->PyramidNumTap;
    if (taps != 2 && taps != 6) return VA_ERR_PYRAMID;
    const int32_t w0 = levelWidth_[0], h0 = levelHeight_[0];
    for (int32_t y = 0; y < h0; ++y) {
        std::memcpy(pyramid_[0].pBuf + static_cast<size_t>(y) * w0, src + static_cast<ptrdiff_t>(y) * stride,
                    static_cast<size_t>(w0));
    }
    char name[64];
    const int32_t number = counter_ + 1;
    if (prm_->OutputDebugDump) {
        std::snprintf(name, sizeof name, "_pyramid%d_l1.pgm", number);
        DumpPgm(name, pyramid_[0].pBuf, w0, h0);
    }
    for (int32_t l = 1; l < numLevels_; ++l) {
        const int32_t w = levelWidth_[l - 1], h = levelHeight_[l - 1];
        const int32_t nw = levelWidth_[l], nh = levelHeight_[l];
        if (nw != (w / 2 > 1 ? w / 2 : 1) || nh != (h / 2 > 1 ? h / 2 : 1)) return VA_ERR_PYRAMID;
        const uint8_t* in = pyramid_[l - 1].pBuf;
        uint8_t* work = pyramidWork_.get();
        uint8_t* out = pyramid_[l].pBuf;
        for (int32_t y = 0; y < h; ++y) Reduce1D(in + y * w, w, 1, work + y * nw, nw, 1, taps);
        if (prm_->OutputDebugDump) {
            std::snprintf(name, sizeof name, "_pyramid%d_resize_x.pgm", number);
            DumpPgm(name, work, nw, h);
        }
        for (int32_t x = 0; x < nw; ++x) Reduce1D(work + x, h, nw, out + x, nh, nw, taps);
        if (prm_->OutputDebugDump) {
            std::snprintf(name, sizeof name, "_pyramid%d_resize_y.pgm", number);
            DumpPgm(name, out, nw, nh);
            std::snprintf(name, sizeof name, "_pyramid%d_l%d.pgm", number, l + 1);
            DumpPgm(name, out, nw, nh);
        }
    }
    return 0;
}

void VisualAttention::iNormalizeMap(uint8_t* map, int32_t w, int32_t h) {
    const int32_t n = w * h;
    LinearStretch(map, n);
    const float big = static_cast<float>(w > h ? w : h);
    if (prm_->NormReductionFlag) {
        int64_t sum = 0;
        for (int32_t i = 0; i < n; ++i) sum += map[i];
        const float mean = static_cast<float>(sum) / static_cast<float>(n);
        const float sigma = big * 0.25f;
        const int32_t r = GaussRadius(sigma, w, h);
        float g = 0.0f;
        for (int32_t i = -r; i <= r; ++i) g += GaussTap(1.5f, sigma, i);
        const float inhibition = mean * g;
        for (int32_t i = 0; i < n; ++i) map[i] = ClampByte(static_cast<float>(map[i]) - inhibition - 5.1f);
        return;
    }
    // Full difference of Gaussians, each filtered separably: rows, then
    // columns; taps outside the map are left out and the rest rescaled.
    float* rows = dogRow_.get();
    float* result = dogCol_.get();
    for (int32_t i = 0; i < n; ++i) result[i] = static_cast<float>(map[i]);
    const float sigmas[2] = {0.02f * big, 0.25f * big};
    const float amplitudes[2] = {0.5f, 1.5f};
    const float signs[2] = {1.0f, -1.0f};
    float taps[2][512];
    int32_t radius[2];
    for (int e = 0; e < 2; ++e) {
        radius[e] = GaussRadius(sigmas[e], w, h);
        if (radius[e] > 255) radius[e] = 255;
        for (int32_t i = -radius[e]; i <= radius[e]; ++i) taps[e][i + radius[e]] = GaussTap(amplitudes[e], sigmas[e], i);
    }
    for (int e = 0; e < 2; ++e) {
        const int32_t r = radius[e];
        const float* k = taps[e] + r;
        float total = 0.0f;
        for (int32_t i = -r; i <= r; ++i) total += k[i];
        for (int32_t y = 0; y < h; ++y) {
            for (int32_t x = 0; x < w; ++x) {
                float s = 0.0f, used = 0.0f;
                for (int32_t i = -r; i <= r; ++i) {
                    if (x + i < 0 || x + i >= w) continue;
                    s += k[i] * static_cast<float>(map[y * w + x + i]);
                    used += k[i];
                }
                rows[y * w + x] = s * (total / used);
            }
        }
        for (int32_t y = 0; y < h; ++y) {
            for (int32_t x = 0; x < w; ++x) {
                float s = 0.0f, used = 0.0f;
                for (int32_t i = -r; i <= r; ++i) {
                    if (y + i < 0 || y + i >= h) continue;
                    s += k[i] * rows[(y + i) * w + x];
                    used += k[i];
                }
                result[y * w + x] += signs[e] * s * (total / used);
            }
        }
    }
    for (int32_t i = 0; i < n; ++i) map[i] = ClampByte(result[i] - 5.1f);
}

int32_t VisualAttention::iCreateCenterSurroud() {
    const int32_t sw = levelWidth_[salLevel_], sh = levelHeight_[salLevel_];
    const int32_t border = (sw > sh ? sw : sh) / 20;
    const int32_t f = counter_;
    for (int32_t k = 0; k < numCS_; ++k) {
        const int32_t c = csCenter_[k], s = csSurround_[k];
        const int32_t wc = levelWidth_[c], hc = levelHeight_[c];
        const int32_t ws = levelWidth_[s], hs = levelHeight_[s];
        uint8_t* scaled = diffBuf_.pBuf;
        uint8_t* diff = diff_.pBuf;
        const int32_t n = wc * hc;
        if (ws == 1 || hs == 1) {
            std::memset(scaled, pyramid_[s].pBuf[0], static_cast<size_t>(n));
        } else if (IIScaleImage(scaled, wc, hc, wc, pyramid_[s].pBuf, ws, hs, ws) != 0) {
            return VA_ERR_INIT;
        }
        const uint8_t* center = pyramid_[c].pBuf;
        for (int32_t i = 0; i < n; ++i) {
            const int32_t d = static_cast<int32_t>(center[i]) - scaled[i];
            diff[i] = static_cast<uint8_t>(d < 0 ? -d : d);
        }
        int32_t b = border;
        const int32_t half = (wc < hc ? wc : hc) / 2;
        if (half < 2 * border) b = half;
        float* weight = attenuation_.get();
        for (int32_t i = 0; i < b; ++i) weight[i] = static_cast<float>(i + 1) / static_cast<float>(b + 1);
        for (int32_t i = 0; i < b; ++i) {
            uint8_t* top = diff + i * wc;
            uint8_t* bottom = diff + (hc - 1 - i) * wc;
            for (int32_t x = 0; x < wc; ++x) {
                top[x] = static_cast<uint8_t>(static_cast<float>(top[x]) * weight[i]);
                bottom[x] = static_cast<uint8_t>(static_cast<float>(bottom[x]) * weight[i]);
            }
        }
        for (int32_t y = 0; y < hc; ++y) {
            uint8_t* row = diff + y * wc;
            for (int32_t i = 0; i < b; ++i) {
                row[i] = static_cast<uint8_t>(static_cast<float>(row[i]) * weight[i]);
                row[wc - 1 - i] = static_cast<uint8_t>(static_cast<float>(row[wc - 1 - i]) * weight[i]);
            }
        }
        iNormalizeMap(diff, wc, hc);
        if (IIScaleImage(csMap_[k].pBuf, sw, sh, sw, diff, wc, hc, wc) != 0) return VA_ERR_INIT;
        if (csCopy_) {
            std::memcpy(csCopy_[f * numCS_ + k].pBuf, csMap_[k].pBuf, static_cast<size_t>(sw) * sh);
        }
        if (prm_->OutputDebugDump && prm_->OutputCSMap) {
            char name[64];
            std::snprintf(name, sizeof name, "_csmap%d_%d.pgm", f + 1, k + 1);
            DumpPgm(name, csMap_[k].pBuf, sw, sh);
        }
    }
    return 0;
}

float VisualAttention::Sigmoid(float x) const {
    return tableSigmoid_ ? VaSigmoidTable(x) : Phi(x);
}

int32_t VisualAttention::iCreateFeatureMap() {
    const int32_t f = counter_;
    const int32_t n = levelWidth_[salLevel_] * levelHeight_[salLevel_];
    float* out = featMapF_[f].pBuf;
    uint8_t* out8 = featMap8_[f].pBuf;
    const float* wcs = wCS_[f];
    const int32_t step = prm_->SigmoidApxStep;
    const float lo = prm_->SigmoidApxMin, hi = prm_->SigmoidApxMax;
    if (prm_->WeightLearningFlag) {
        for (int32_t i = 0; i < n; ++i) {
            float sum = 0.0f;
            for (int32_t k = 0; k < numCS_; ++k) {
                const float x = static_cast<float>(csMap_[k].pBuf[i]) / 255.0f * wcs[k];
                sum += tableSigmoid_ ? VaSigmoidTable(x) : fApproximate(Phi(fApproximateRange(x, step, lo, hi)), step);
            }
            out[i] = tableSigmoid_ ? VaSigmoidTable(wF_[f] * sum) : Phi(wF_[f] * sum);
        }
        if (prm_->OutputFeatureMap) FloatToByteStretch(out, out8, n);
    } else {
        float total = 0.0f;
        for (int32_t k = 0; k < numCS_; ++k) total += wcs[k];
        for (int32_t i = 0; i < n; ++i) {
            float sum = 0.0f;
            for (int32_t k = 0; k < numCS_; ++k) sum += wcs[k] * static_cast<float>(csMap_[k].pBuf[i]);
            out8[i] = ClampByte(std::floor(sum / total));
        }
        iNormalizeMap(out8, levelWidth_[salLevel_], levelHeight_[salLevel_]);
        for (int32_t i = 0; i < n; ++i) out[i] = static_cast<float>(out8[i]);
    }
    if (prm_->OutputDebugDump && prm_->OutputFeatureMap) {
        char name[64];
        std::snprintf(name, sizeof name, "_featuremap%d.pgm", f + 1);
        DumpPgm(name, out8, levelWidth_[salLevel_], levelHeight_[salLevel_]);
    }
    return 0;
}

int32_t VisualAttention::iCreateFace(PixDifTreeDetector* detector, SPooledList* detections) {
    if (detector == nullptr || detections == nullptr) return 0;
    const orielcore_VA::PixDifTreeData* data = detector->data();
    const float scale = data != nullptr ? static_cast<float>(data->scoreScale) : 1.0f;
    const int32_t W = faceWidth_, H = faceHeight_;
    const float fw = static_cast<float>(W), fh = static_cast<float>(H);
    auto toInt = [](float v, int32_t hi) -> int32_t {
        if (!(v > 0.0f)) return 0;
        return v >= static_cast<float>(hi) ? hi : static_cast<int32_t>(v);
    };
    for (SPooledListNode* p = detections->Begin(); p != detections->End(); p = p->next) {
        const orielcore_VA::FaceDetectionResult& r = p->result;
        const int32_t x0 = toInt(std::floor(fw * r.x), W), y0 = toInt(std::floor(fh * r.y), H);
        const int32_t x1 = std::min(x0 + toInt(std::floor(fw * r.width), W), W);
        const int32_t y1 = std::min(y0 + toInt(std::floor(fh * r.height), H), H);
        const float normalised = static_cast<float>(r.maxScore) / scale;
        const uint8_t value = ClampByte(std::fmin(255.0f, normalised / prm_->FaceMaxScore * 255.0f));
        std::printf("Map X[%4d-%4d] Y[%4d-%4d] Score[%8.3f]\n", x0, x1, y0, y1, static_cast<double>(normalised));
        for (int32_t y = y0; y < y1; ++y) {
            uint8_t* row = faceMap_.pPixel + static_cast<ptrdiff_t>(y) * faceMap_.stride;
            for (int32_t x = x0; x < x1; ++x) {
                if (row[x] < value) row[x] = value;
            }
        }
    }
    if (prm_->OutputDebugDump) {
        char name[512];
        std::snprintf(name, sizeof name, "%s_facemap_in.pgm", prm_->outputPath);
        faceMap_.iSavePGM(name);
    }
    return 0;
}

int32_t VisualAttention::iCreateFaceWithDetection() {
    if (detector_ == nullptr || faceGray_.pConstPixel == nullptr) return 0;
    SPooledList results;
    detector_->CreateEmptyResultHolder(&results);
    detector_->EvalPixDifTreeMultiLayer(faceGray_.pConstPixel, faceGray_.width, faceGray_.height, faceGray_.stride,
                                        1.0f, prm_->FaceScale, 0.0f, &results);
    if (prm_->OutputDebugInfo) {
        static const char* const kModes[3] = {"STABILIZE_NONE", "STABILIZE_MERGE_RESULT", "STABILIZE_LOCAL_SEARCH_MERGE"};
        const int32_t mode = detector_->stabilize;
        std::printf("\nFace:\n");
        std::printf("# step %d, scale %f, thresh %f, %s\n", detector_->stepX, static_cast<double>(prm_->FaceScale),
                    static_cast<double>(prm_->FaceThresh), mode >= 0 && mode < 3 ? kModes[mode] : "");
        const float scale = static_cast<float>(detector_->data()->scoreScale);
        const double toDegrees = 180.0 / 3.14159265358979;
        for (SPooledListNode* p = results.Begin(); p != results.End(); p = p->next) {
            const orielcore_VA::FaceDetectionResult& r = p->result;
            std::printf("%8.3f %8.3f %8.3f %8.3f  %lf %d  %3.0f %3.0f %3.0f\n",
                        static_cast<double>(r.x * faceGray_.width), static_cast<double>(r.y * faceGray_.height),
                        static_cast<double>(r.width * faceGray_.width), static_cast<double>(r.height * faceGray_.height),
                        static_cast<double>(static_cast<float>(r.maxScore) / scale), r.label - 1,
                        r.roll * toDegrees, r.pitch * toDegrees, r.yaw * toDegrees);
        }
    }
    const int32_t status = iCreateFace(detector_, &results);
    results.Clear();
    return status;
}

int32_t VisualAttention::iCreateFaceFeatureMap() {
    const int32_t f = counter_;
    const int32_t sw = levelWidth_[salLevel_], sh = levelHeight_[salLevel_];
    const int32_t n = sw * sh;
    uint8_t* out8 = featMap8_[f].pBuf;
    float* out = featMapF_[f].pBuf;
    if (IIScaleImage(out8, sw, sh, sw, faceMap_.pConstPixel, faceWidth_, faceHeight_, faceMap_.stride) != 0) {
        return VA_ERR_INIT;
    }
    if (prm_->WeightLearningFlag) {
        const int32_t step = prm_->SigmoidApxStep;
        for (int32_t i = 0; i < n; ++i) {
            const float v = static_cast<float>(out8[i]);
            out[i] = tableSigmoid_
                         ? VaSigmoidTable(v)
                         : fApproximate(Phi(fApproximateRange(v, step, prm_->SigmoidApxMin, prm_->SigmoidApxMax) /
                                            255.0f * wF_[f]),
                                        step);
        }
        if (prm_->OutputFeatureMap) FloatToByteStretch(out, out8, n);
    } else {
        for (int32_t i = 0; i < n; ++i) out[i] = static_cast<float>(out8[i]);
    }
    return 0;
}

int32_t VisualAttention::iCreateSaliencyMap() {
    const int32_t sw = levelWidth_[salLevel_], sh = levelHeight_[salLevel_];
    const int32_t n = sw * sh;
    float* outF = salMapF_.pBuf;
    uint8_t* out8 = salMap8_.pBuf;
    if (prm_->WeightLearningFlag) {
        const int32_t step = prm_->SigmoidApxStep;
        for (int32_t i = 0; i < n; ++i) {
            float sum = 0.0f;
            for (int32_t f = 0; f < numFeatures_; ++f) sum += featMapF_[f].pBuf[i];
            const float x = wS_ * sum;
            outF[i] = tableSigmoid_
                          ? VaSigmoidTable(x)
                          : fApproximate(Phi(fApproximateRange(x, step, prm_->SigmoidApxMin, prm_->SigmoidApxMax)), step);
        }
        FloatToByteStretch(outF, out8, n);
    } else {
        float total = 0.0f;
        for (int32_t f = 0; f < numFeatures_; ++f) total += wF_[f];
        for (int32_t i = 0; i < n; ++i) {
            float sum = 0.0f;
            for (int32_t f = 0; f < numFeatures_; ++f) sum += wF_[f] * static_cast<float>(featMap8_[f].pBuf[i]);
            out8[i] = total != 0.0f ? ClampByte(std::floor(sum / total)) : 0;
        }
        iNormalizeMap(out8, sw, sh);
        for (int32_t i = 0; i < n; ++i) outF[i] = static_cast<float>(out8[i]);
    }
    saliencyReady_ = true;
    if (prm_->OutputDebugDump) DumpPgm("_salmap.pgm", out8, sw, sh);
    return 0;
}

int32_t VisualAttention::iCreateGradientSaliencyMap() {
    const int32_t W = levelWidth_[salLevel_], H = levelHeight_[salLevel_];
    if (W < 2 || H < 2) return VA_ERR_MAP_TOO_SMALL;
    const uint8_t* S = salMap8_.pBuf;
    uint8_t* G = gradSal_.pBuf;
    auto absDiff = [](int32_t a, int32_t b) { return a > b ? a - b : b - a; };
    for (int32_t y = 0; y < H; ++y) {
        for (int32_t x = 0; x < W; ++x) {
            int32_t g;
            if (y == 0) {
                g = absDiff(S[W + x], S[x]);
            } else if (y == H - 1) {
                g = absDiff(S[(H - 1) * W + x], S[(H - 2) * W + x]);
            } else {
                g = absDiff(S[(y + 1) * W + x], S[(y - 1) * W + x]) / 2;
            }
            G[y * W + x] = static_cast<uint8_t>(g);
        }
    }
    if (prm_->OutputDebugDump) DumpPgm("_gradcolumn.pgm", G, W, H);
    for (int32_t y = 0; y < H; ++y) {
        const uint8_t* row = S + y * W;
        for (int32_t x = 0; x < W; ++x) {
            int32_t g;
            if (x == 0) {
                g = absDiff(row[1], row[0]);
            } else if (x == W - 1) {
                g = absDiff(row[W - 1], row[W - 2]);
            } else {
                g = absDiff(row[x + 1], row[x - 1]) / 2;
            }
            // Edge rows and columns can add two full differences: saturate
            // rather than wrap.
            const int32_t sum = G[y * W + x] + g;
            G[y * W + x] = static_cast<uint8_t>(sum > 255 ? 255 : sum);
        }
    }
    if (prm_->OutputDebugDump) DumpPgm("_gradline.pgm", G, W, H);
    LinearStretch(G, W * H);
    gradientReady_ = true;
    if (prm_->OutputDebugDump) DumpPgm("_gradsalmap.pgm", G, W, H);
    return 0;
}

// ------------------------------------------------------------------ entry

int32_t VisualAttention::iCreateSaliency(PixDifTreeDetector* detector, SPooledList* detections) {
    return iCreateSaliencyCore(detector, detections, true);
}

int32_t VisualAttention::iCreateSaliency() { return iCreateSaliencyCore(nullptr, nullptr, false); }

int32_t VisualAttention::iCreateSaliencyCore(PixDifTreeDetector* detector, SPooledList* detections, bool given) {
    if (prm_ == nullptr || counter_ != 0 || saliencyReady_) return VA_ERR_SALIENCY_CALL;
    const ParamVA& p = *prm_;
    const bool orientation = p.FeatureOriGabor || p.FeatureOriEdge;
    int32_t status = 0;
    auto run = [&](const uint8_t* src, int32_t stride) {
        int32_t s = iCreatePyramid(src, stride);
        if (s == 0) s = iCreateCenterSurroud();
        if (s == 0) s = iCreateFeatureMap();
        if (s == 0) ++counter_;
        return s;
    };
    if (p.FeatureIntensity || (!p.FeatureIntensityY && orientation)) {
        status = iCreateIntensity();
        if (status == 0 && p.FeatureIntensity) status = run(intensity_.pConstPixel, intensity_.stride);
    }
    if (status == 0 && p.FeatureIntensityY) {
        if (!haveYcbcr_) return VA_ERR_NO_INPUT;
        status = run(ycbcr_.planes[0]->pConstPixel, ycbcr_.planes[0]->stride);
    }
    if (status == 0 && p.FeatureColorRGB) {
        status = iCreateColorOpponents();
        if (status == 0) status = run(redGreen_.pConstPixel, redGreen_.stride);
        if (status == 0) status = run(blueYellow_.pConstPixel, blueYellow_.stride);
    }
    if (status == 0 && p.FeatureColorCrCb) {
        if (!haveYcbcr_) return VA_ERR_NO_INPUT;
        status = run(ycbcr_.planes[2]->pConstPixel, ycbcr_.planes[2]->stride);
        if (status == 0) status = run(ycbcr_.planes[1]->pConstPixel, ycbcr_.planes[1]->stride);
    }
    if (status == 0 && p.FeatureOriGabor) {
        status = iCreateGabor();
        for (int32_t o = 0; o < 4 && status == 0; ++o) {
            status = iSelectGabor(o);
            if (status == 0) status = run(gabor8_.pConstPixel, levelWidth_[0]);
        }
    }
    if (status == 0 && p.FeatureOriEdge) {
        for (int32_t o = 0; o < 4 && status == 0; ++o) {
            status = iCreateEdge(o);
            if (status == 0) status = run(edge_.pConstPixel, levelWidth_[0]);
        }
    }
    if (status == 0 && p.FeatureFace) {
        if (given) {
            status = iCreateFace(detector, detections);
        } else if (p.FaceDetectionCallFlag) {
            status = iCreateFaceWithDetection();
        }
        if (status == 0) status = iCreateFaceFeatureMap();
        if (status == 0) ++counter_;
    }
    if (status == 0) status = iCreateSaliencyMap();
    if (status == 0 && p.SalRectFlag && p.SalRectGradFlag) status = iCreateGradientSaliencyMap();
    return status;
}

int32_t VisualAttention::iGetSaliencyMap(ImagePlane** plane) {
    if (plane == nullptr || !saliencyReady_) return VA_ERR_SALIENCY_CALL;
    *plane = &salMap8_;
    return 0;
}

int32_t VisualAttention::iGetGradientSaliencyMap(ImagePlane** plane) {
    if (plane == nullptr || !gradientReady_) return VA_ERR_SALIENCY_CALL;
    *plane = &gradSal_;
    return 0;
}

int32_t VisualAttention::iGetFeatureMap(ImagePlane** planes, int32_t* count) {
    if (planes == nullptr || count == nullptr || !featMap8_) return VA_ERR_SALIENCY_CALL;
    *planes = featMap8_.get();
    *count = numFeatures_;
    return 0;
}

int32_t VisualAttention::iGetCSMap(ImagePlane** planes, int32_t* count) {
    if (planes == nullptr || count == nullptr || !csCopy_) return VA_ERR_SALIENCY_CALL;
    *planes = csCopy_.get();
    *count = numFeatures_ * numCS_;
    return 0;
}

int32_t VisualAttention::iGetSaliencyRect(float threshold, int32_t* count, tagVA_RECT** rects) {
    if (segmenter_ == nullptr || prm_ == nullptr) return VA_ERR_SALIENCY_RECT;
    if (!prm_->SalRectFlag) return 0;
    const bool gradient = prm_->SalRectGradFlag != 0;
    if (gradient ? !gradientReady_ : !saliencyReady_) return VA_ERR_SALIENCY_RECT;
    const uint8_t* map = gradient ? gradSal_.pBuf : salMap8_.pBuf;
    const int32_t w = levelWidth_[salLevel_], h = levelHeight_[salLevel_];
    const int32_t status = prm_->SalRectThreshMode != VA_SEGIDX_THRESHOLD_MODE_0
                               ? segmenter_->Indexing(map, w, h, w)
                               : segmenter_->Indexing(threshold, map, w, h, w);
    if (status != 0) return status;
    segmenter_->GetSegmentIndex(rects, count);
    return 0;
}

int32_t VisualAttention::iGetSaliencyRect(int32_t* count, tagVA_RECT** rects) {
    if (prm_ != nullptr && prm_->SalRectThreshMode == VA_SEGIDX_THRESHOLD_MODE_0) return VA_ERR_SALIENCY_RECT;
    return iGetSaliencyRect(0.0f, count, rects);
}
