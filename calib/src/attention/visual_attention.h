// VisualAttention: the saliency map of one picture by the centre-surround
// model. The picture is split into feature planes (intensity, luma, colour
// opponents, Gabor and edge orientations, faces); each plane is reduced to a
// pyramid, centre-surround differences are normalised and combined per
// feature (by the learned network or by plain means) into feature maps, and
// the feature maps into the saliency map, from which the gradient saliency
// map and the salient rectangles are derived.
//
// Every map is allocated in iInit and reused for every feature; the maps
// handed out stay owned by the object.
#ifndef LUMICOR_CALIB_ATTENTION_VISUAL_ATTENTION_H
#define LUMICOR_CALIB_ATTENTION_VISUAL_ATTENTION_H

#include <cstdint>

#include "calib/src/attention/orientation_filter.h"
#include "calib/src/plane/image_plane.h"
#include "calib/src/segmentation/map_segment_index.h"
#include "common/src/internal/memory.h"

class ParamVA;
namespace orielcore_VA {
class PixDifTreeDetector;
class SPooledList;
}  // namespace orielcore_VA

enum : int32_t {
    VA_ERR_INIT = 0x3001000,            // bad initialisation or allocation
    VA_ERR_SALIENCY_CALL = 0x3001001,   // saliency requested twice or without parameters
    VA_ERR_NO_INPUT = 0x3002000,        // a feature's input picture is missing
    VA_ERR_NO_INPUT_PLANE = 0x3002001,
    VA_ERR_NO_FEATURE_PLANE = 0x3002002,
    VA_ERR_PYRAMID = 0x3003000,         // wrong level size or PyramidNumTap
    VA_ERR_MAP_TOO_SMALL = 0x3003005,   // saliency map smaller than 2 x 2
    VA_ERR_PLANE_SIZE = 0x3004000,      // conversion between planes of different sizes
    VA_ERR_COLOR_CONVERSION = 0x3005000,
    VA_ERR_SALIENCY_RECT = 0x3007001
};

// phi_T: the 513-entry table of the quantised sigmoid 1.716 tanh(2x / 3) on
// [-2, 2] in steps of 1/128.
float VaSigmoidTable(float x);
// floor((x + 1/(2n)) n) / n with truncation toward zero (n = 0: x unchanged).
float fApproximate(float x, int32_t n);
// fApproximate after clamping x to [lo, hi] when lo and hi are both non-zero.
float fApproximateRange(float x, int32_t n, float lo, float hi);

class VisualAttention {
public:
    static constexpr int kMaxLevels = 16;
    static constexpr int kMaxFeatures = 15;
    static constexpr int kMaxCSMaps = 36;

    enum FeatureKind { kIntensity, kLuma, kRedGreen, kBlueYellow, kCr, kCb, kGabor, kEdge, kFace };

    VisualAttention();
    virtual ~VisualAttention();
    VisualAttention(const VisualAttention&) = delete;
    VisualAttention& operator=(const VisualAttention&) = delete;

    // picture: chroma format 4 (RGB) or 2 (YCbCr). params stay the caller's
    // and must outlive the object.
    int32_t iInit(const MIPlane* picture, const ParamVA* params);
    // Face map from the given detections (detector and list); without them,
    // by running the object's own detector when FaceDetectionCallFlag is set.
    int32_t iCreateSaliency(orielcore_VA::PixDifTreeDetector* detector, orielcore_VA::SPooledList* detections);
    int32_t iCreateSaliency();

    int32_t iGetSaliencyMap(ImagePlane** plane);
    int32_t iGetGradientSaliencyMap(ImagePlane** plane);
    // 8-bit feature maps, one per feature.
    int32_t iGetFeatureMap(ImagePlane** planes, int32_t* count);
    // Copies of the centre-surround maps (OutputCSMap), feature by feature.
    int32_t iGetCSMap(ImagePlane** planes, int32_t* count);
    int32_t iGetSaliencyRect(float threshold, int32_t* count, tagVA_RECT** rects);
    int32_t iGetSaliencyRect(int32_t* count, tagVA_RECT** rects);

    static int32_t iRGB2YCbCr(const MIPlane* rgb, MIPlane* ycbcr);
    static int32_t iYCbCr2RGB(const MIPlane* ycbcr, MIPlane* rgb);

    void vReset();

    // Geometry and intermediate results, for inspection.
    int32_t LevelWidth(int l) const { return levelWidth_[l]; }
    int32_t LevelHeight(int l) const { return levelHeight_[l]; }
    int32_t SaliencyLevel() const { return salLevel_; }
    int32_t FeatureCount() const { return numFeatures_; }
    const ImagePlaneFloat* SaliencyMapFloat() const { return &salMapF_; }
    const ImagePlaneFloat* FeatureMapFloat(int f) const { return f >= 0 && f < numFeatures_ ? &featMapF_[f] : nullptr; }
    const ImagePlane* FaceMap() const { return &faceMap_; }
    const ImagePlane* CSMap(int k) const { return k >= 0 && k < numCS_ ? &csMap_[k] : nullptr; }

private:
    struct Feature {
        FeatureKind kind;
        int32_t orientation;
        int32_t weightGroup;  // learned centre-surround weights
    };

    int32_t iInitWeight();
    int32_t iInitPyramidSize(int32_t width, int32_t height);
    int32_t iInitInputImg(const MIPlane* picture);
    int32_t iInitInputFaceSize(int32_t width, int32_t height);
    int32_t iInitInputFaceImg(const MIPlane* picture);
    int32_t iInitFaceDetector();
    int32_t iInitGaborFilter();
    int32_t iInitSailency();
    int32_t iInitMapSegmentIndex();

    int32_t iCreateSaliencyCore(orielcore_VA::PixDifTreeDetector* detector, orielcore_VA::SPooledList* detections,
                                bool given);
    int32_t iCreateIntensity();
    int32_t iCreateColorOpponents();
    int32_t iCreateGabor();
    int32_t iSelectGabor(int32_t o);
    int32_t iCreateEdge(int32_t o);
    int32_t iCreatePyramid(const uint8_t* src, int32_t stride);
    int32_t iCreateCenterSurroud();
    int32_t iCreateFeatureMap();
    int32_t iCreateFace(orielcore_VA::PixDifTreeDetector* detector, orielcore_VA::SPooledList* detections);
    int32_t iCreateFaceWithDetection();
    int32_t iCreateFaceFeatureMap();
    int32_t iCreateSaliencyMap();
    int32_t iCreateGradientSaliencyMap();
    void iNormalizeMap(uint8_t* map, int32_t width, int32_t height);
    void DumpPgm(const char* suffix, const uint8_t* data, int32_t width, int32_t height) const;
    float Sigmoid(float x) const;

    const ParamVA* prm_;
    int32_t numLevels_;
    int32_t levelWidth_[kMaxLevels];
    int32_t levelHeight_[kMaxLevels];
    int32_t salLevel_;
    int32_t numCS_;
    int32_t csCenter_[kMaxCSMaps];
    int32_t csSurround_[kMaxCSMaps];
    Feature features_[kMaxFeatures];
    int32_t numFeatures_;
    int32_t counter_;
    bool tableSigmoid_;

    MIPlane rgb_;
    MIPlane ycbcr_;
    bool haveRgb_, haveYcbcr_;
    ImagePlane intensity_;
    ImagePlane redGreen_, blueYellow_;
    ImagePlane edge_;
    ImagePlaneFloat edgeWork_;
    ImagePlaneFloat gaborPower_[4];
    ImagePlane gabor8_;
    GaborFilter gabor_;

    lmk::UniqueArray<ImagePlane> pyramid_;
    lmk::UniqueArray<uint8_t> pyramidWork_;
    lmk::UniqueArray<ImagePlane> csMap_;
    ImagePlane diff_;
    ImagePlane diffBuf_;
    lmk::UniqueArray<float> dogRow_, dogCol_;
    lmk::UniqueArray<float> attenuation_;
    lmk::UniqueArray<ImagePlane> featMap8_;
    lmk::UniqueArray<ImagePlaneFloat> featMapF_;
    lmk::UniqueArray<ImagePlane> csCopy_;
    ImagePlane salMap8_;
    ImagePlaneFloat salMapF_;
    ImagePlane gradSal_;

    int32_t faceWidth_, faceHeight_;
    ImagePlane faceMap_;
    ImagePlane faceGray_;
    orielcore_VA::PixDifTreeDetector* detector_;

    float wCS_[kMaxFeatures][6];
    float wF_[kMaxFeatures];
    float wS_;
    CMapSegmentIndex* segmenter_;
    bool saliencyReady_ = false;
    bool gradientReady_ = false;
};

#endif
