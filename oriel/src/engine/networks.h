// The face networks of the engine, run on our own kernels. Each network
// binds its layers to the weight blob once (Load) and then runs any number
// of times; a run plans its arena, allocates it once and computes.
//
// Input conventions (learned from the networks' published pipeline):
//   SSD MobileNet v1 detector   x / 127.5 - 1, canvas with the photo at the
//                               top-left, zero padded
//   tiny face detector          (x - mean) / 255, square canvas, 416 default
//   landmarks, expressions,     (x - mean) / 255 on a 112 x 112 square canvas
//   age                         with the face crop centred
//   recognition                 same on 150 x 150
#ifndef ORIEL_ENGINE_NETWORKS_H
#define ORIEL_ENGINE_NETWORKS_H

#include <cstddef>

#include "oriel/src/engine/nn/boxes.h"
#include "oriel/src/engine/nn/image_input.h"
#include "oriel/src/engine/nn/layers.h"
#include "oriel/src/engine/nn/weights.h"

namespace oriel {

// A detection in photo-relative coordinates (fractions of width and height).
struct Detection {
    float x, y, w, h;
    float score;
};

class SsdDetector {
public:
    bool Load(const nn::WeightBlob& blob);
    // Runs on `crop` of the photo scaled into an inW x inH canvas (keeping
    // its aspect; the rest of the canvas is zero). Keeps boxes above
    // minScore after suppression, at most maxOut, in the crop's relative
    // coordinates. False when out of memory.
    bool Detect(const nn::ImageView& img, const nn::Crop& crop, int inW, int inH, float minScore, Detection* out,
                size_t maxOut, size_t* count) const;

private:
    nn::Tensor Forward(nn::Arena& a, const nn::Tensor& x, const float* anchors, float minScore, nn::Candidate* cand,
                       size_t* nCand) const;
    nn::ConvWeights mb0_;
    nn::DepthwiseWeights dw_[14];
    nn::ConvWeights pw_[14];
    nn::ConvWeights pred_[8];
    nn::ConvWeights box_[6];
};

class TinyDetector {
public:
    bool Load(const nn::WeightBlob& blob);
    // inputSize: side of the square canvas, a multiple of 32.
    bool Detect(const nn::ImageView& img, const nn::Crop& crop, int inputSize, float minScore, Detection* out,
                size_t maxOut, size_t* count) const;

private:
    nn::ConvWeights conv0_;
    nn::DepthwiseWeights dw_[6];
    nn::ConvWeights pw_[6];
    nn::ConvWeights conv8_;
};

// Dense-block feature extractor (112 x 112 input) with one dense head; used
// by the 68-point landmark network and the expression network.
class DenseFaceNet {
public:
    bool Load(const nn::WeightBlob& blob, const char* prefix);
    // Runs on the crop centred on a square canvas; writes the head's
    // outputs (136 landmark coordinates, or 7 expression logits).
    bool Run(const nn::ImageView& img, const nn::Crop& crop, float* out) const;
    int Outputs() const { return fc_.nout; }

private:
    nn::ConvWeights conv0_;
    nn::DepthwiseWeights dw_[4][4];  // [block][conv], dw_[0][0] unused
    nn::ConvWeights pw_[4][4];
    nn::DenseWeights fc_;
};

class AgeNet {
public:
    bool Load(const nn::WeightBlob& blob);
    // Age in years and the probability that the face is male.
    bool Run(const nn::ImageView& img, const nn::Crop& crop, float* age, float* male) const;

private:
    struct Separable {
        nn::DepthwiseWeights dw;
        nn::ConvWeights pw;
    };
    struct Reduction {
        Separable sep0, sep1;
        nn::ConvWeights expand;
    };
    nn::ConvWeights convIn_;
    Reduction red_[3];
    Separable main_[2][3];
    Separable exit_;
    nn::DenseWeights fcAge_, fcGender_;
};

class RecognitionNet {
public:
    static const int kDim = 128;
    bool Load(const nn::WeightBlob& blob);
    // The 128-dimensional face descriptor (not normalised) of the crop, or
    // of its mirror image.
    bool Run(const nn::ImageView& img, const nn::Crop& crop, float* out, bool mirror = false) const;

private:
    nn::ConvWeights down_;
    nn::ConvWeights conv1_[14], conv2_[14];
    nn::DenseWeights fc_;
};

}  // namespace oriel

#endif
