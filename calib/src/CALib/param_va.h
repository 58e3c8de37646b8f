// The visual-attention parameter set (ParamVA), its text writer (ParamIO) and
// the built-in values (ParamMem).
//
// Booleans are 32-bit integers. The level keys (CSCenterLevelFrom/To,
// CSDiffLevelFrom/To, CSSaliencyMapLevel) are level indices counted from 0
// in the built-in set; a file gives them counted from 1 and iPrmCheck shifts
// them.
#ifndef LUMICOR_CALIB_CALIB_PARAM_VA_H
#define LUMICOR_CALIB_CALIB_PARAM_VA_H

#include <cstdint>
#include <cstdio>

class ParamVA {
public:
    static constexpr int kTextSize = 256;

    ParamVA();
    virtual ~ParamVA();

    // Adjusts a set read from a file and checks it: 1 when valid, else 0.
    int iPrmCheck();

    // Learned centre-surround weight k (0..5) of a weight group:
    // 0 intensity, 1 red-green, 2 blue-yellow, 3..6 orientations 1..4.
    float fWeightCS(int group, int k) const;

    char outputPath[kTextSize];

    int32_t OutputDebugInfo;
    int32_t OutputDebugDump;
    int32_t OutputCSMap;
    int32_t OutputFeatureMap;
    int32_t OutputConspicuityMap;

    int32_t FeatureIntensity;
    int32_t FeatureIntensityY;
    int32_t FeatureColorRGB;
    int32_t FeatureColorCrCb;
    int32_t FeatureOriGabor;
    int32_t FeatureOriEdge;
    int32_t FeatureFace;

    float FeatureWeightIntensity;
    float FeatureWeightIntensityY;
    float FeatureWeightColorRG;
    float FeatureWeightColorBY;
    float FeatureWeightColorCr;
    float FeatureWeightColorCb;
    float FeatureWeightOriGabor1;
    float FeatureWeightOriGabor2;
    float FeatureWeightOriGabor3;
    float FeatureWeightOriGabor4;
    float FeatureWeightOriEdge1;
    float FeatureWeightOriEdge2;
    float FeatureWeightOriEdge3;
    float FeatureWeightOriEdge4;
    float FeatureWeightFace;

    int32_t WeightLearningFlag;
    int32_t WeightNumCS;
    float WeightS;
    float WeightFI;
    float WeightFRG;
    float WeightFBY;
    float WeightFO1;
    float WeightFO2;
    float WeightFO3;
    float WeightFO4;
    float WeightFFace;
    float WeightCS1I, WeightCS2I, WeightCS3I, WeightCS4I, WeightCS5I, WeightCS6I;
    float WeightCS1RG, WeightCS2RG, WeightCS3RG, WeightCS4RG, WeightCS5RG, WeightCS6RG;
    float WeightCS1BY, WeightCS2BY, WeightCS3BY, WeightCS4BY, WeightCS5BY, WeightCS6BY;
    float WeightCS1O1, WeightCS2O1, WeightCS3O1, WeightCS4O1, WeightCS5O1, WeightCS6O1;
    float WeightCS1O2, WeightCS2O2, WeightCS3O2, WeightCS4O2, WeightCS5O2, WeightCS6O2;
    float WeightCS1O3, WeightCS2O3, WeightCS3O3, WeightCS4O3, WeightCS5O3, WeightCS6O3;
    float WeightCS1O4, WeightCS2O4, WeightCS3O4, WeightCS4O4, WeightCS5O4, WeightCS6O4;

    int32_t NumPyramid;
    int32_t PyramidNumTap;
    int32_t NumCSMap;
    int32_t CSCenterLevelFrom;
    int32_t CSCenterLevelTo;
    int32_t CSDiffLevelFrom;
    int32_t CSDiffLevelTo;
    int32_t CSSaliencyMapLevel;
    int32_t NormReductionFlag;
    int32_t ConvBndHandle;
    float SigmoidApxMin;
    float SigmoidApxMax;
    int32_t SigmoidApxStep;
    int32_t EdgeAlgo;

    int32_t FaceDetectionCallFlag;
    float FaceThresh;
    float FaceScale;
    int32_t FaceStep;
    int32_t FaceStabilize;
    int32_t FaceLoadDataFlag;
    char FaceDatafile[kTextSize];
    float FaceMaxScore;
    int32_t FaceImgMaxSize;

    int32_t ImgFixFlag;
    int32_t ImgMaxSize;
    int32_t ImgFixWidth;
    int32_t ImgFixHeight;

    int32_t SalRectFlag;
    int32_t SalRectGradFlag;
    int32_t SalRectThreshMode;
    float SalRectThreshStart;
    float SalRectThreshEnd;
    float SalRectThreshStep;
    float SalRectThreshLow;
    float SalRectThreshHigh;
    float SalRectHistTop;
    int32_t SalRectHistTopBin;
    float SalRectHistTop2;
    int32_t SalRectLocalThreshFlag;
    float SalRectLocalMaxThresh;
    float SalRectLocalThreshLow;
    float SalRectLocalThreshHigh;
    int32_t SalRectSortMode;
    int32_t SalRectAdjacentMode;
    int32_t SalRectMinArea;
    int32_t SalRectAvgFilterStep;
    int32_t SalRectPosSpecifyFlag;
    int32_t SalRectXPos;
    int32_t SalRectYPos;
};

// Threshold modes of the segmenter (SalRectThreshMode).
enum {
    VA_SEGIDX_THRESHOLD_MODE_0 = 0,  // one given threshold
    VA_SEGIDX_THRESHOLD_MODE_1 = 1,  // SalRectThreshLow / High
    VA_SEGIDX_THRESHOLD_MODE_2 = 2,  // histogram top fraction and top bin count
    VA_SEGIDX_THRESHOLD_MODE_3 = 3   // two histogram top fractions
};

class ParamIO : public ParamVA {
public:
    ParamIO();
    ~ParamIO() override;

    // Writes the whole set as the "param.txt" text to an open stream.
    void vOutputParam(FILE* stream) const;

    char InputFile[kTextSize];
    char OutputDir[kTextSize];
    char OutputPrefix[kTextSize];
    int32_t TestInputImgFormat;
    FILE* stream;
};

// The built-in parameter set.
class ParamMem : public ParamIO {
public:
    ParamMem();
    ~ParamMem() override;
};

#endif
