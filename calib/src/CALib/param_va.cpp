#include "calib/src/CALib/param_va.h"

#include <cstring>

namespace {

void SetText(char (&dst)[ParamVA::kTextSize], const char* text) {
    std::strncpy(dst, text, ParamVA::kTextSize - 1);
    dst[ParamVA::kTextSize - 1] = '\0';
}

}  // namespace

ParamVA::ParamVA() {
    std::memset(outputPath, 0, sizeof outputPath);
    std::memset(FaceDatafile, 0, sizeof FaceDatafile);
    OutputDebugInfo = OutputDebugDump = OutputCSMap = OutputFeatureMap = OutputConspicuityMap = 0;
    FeatureIntensity = FeatureIntensityY = FeatureColorRGB = FeatureColorCrCb = 0;
    FeatureOriGabor = FeatureOriEdge = FeatureFace = 0;
    FeatureWeightIntensity = FeatureWeightIntensityY = 1.0f;
    FeatureWeightColorRG = FeatureWeightColorBY = FeatureWeightColorCr = FeatureWeightColorCb = 1.0f;
    FeatureWeightOriGabor1 = FeatureWeightOriGabor2 = FeatureWeightOriGabor3 = FeatureWeightOriGabor4 = 1.0f;
    FeatureWeightOriEdge1 = FeatureWeightOriEdge2 = FeatureWeightOriEdge3 = FeatureWeightOriEdge4 = 1.0f;
    FeatureWeightFace = 1.0f;
    WeightLearningFlag = 0;
    WeightNumCS = -1;
    WeightS = WeightFI = WeightFRG = WeightFBY = -1.0f;
    WeightFO1 = WeightFO2 = WeightFO3 = WeightFO4 = WeightFFace = -1.0f;
    WeightCS1I = WeightCS2I = WeightCS3I = WeightCS4I = WeightCS5I = WeightCS6I = -1.0f;
    WeightCS1RG = WeightCS2RG = WeightCS3RG = WeightCS4RG = WeightCS5RG = WeightCS6RG = -1.0f;
    WeightCS1BY = WeightCS2BY = WeightCS3BY = WeightCS4BY = WeightCS5BY = WeightCS6BY = -1.0f;
    WeightCS1O1 = WeightCS2O1 = WeightCS3O1 = WeightCS4O1 = WeightCS5O1 = WeightCS6O1 = -1.0f;
    WeightCS1O2 = WeightCS2O2 = WeightCS3O2 = WeightCS4O2 = WeightCS5O2 = WeightCS6O2 = -1.0f;
    WeightCS1O3 = WeightCS2O3 = WeightCS3O3 = WeightCS4O3 = WeightCS5O3 = WeightCS6O3 = -1.0f;
    WeightCS1O4 = WeightCS2O4 = WeightCS3O4 = WeightCS4O4 = WeightCS5O4 = WeightCS6O4 = -1.0f;
    NumPyramid = PyramidNumTap = NumCSMap = -1;
    CSCenterLevelFrom = CSCenterLevelTo = CSDiffLevelFrom = CSDiffLevelTo = CSSaliencyMapLevel = -1;
    NormReductionFlag = 0;
    ConvBndHandle = -1;
    SigmoidApxMin = SigmoidApxMax = 0.0f;
    SigmoidApxStep = 0;
    EdgeAlgo = -1;
    FaceDetectionCallFlag = 0;
    FaceThresh = FaceScale = -1.0f;
    FaceStep = FaceStabilize = -1;
    FaceLoadDataFlag = 0;
    FaceMaxScore = -1.0f;
    FaceImgMaxSize = -1;
    ImgFixFlag = 0;
    ImgMaxSize = ImgFixWidth = ImgFixHeight = -1;
    SalRectFlag = SalRectGradFlag = 0;
    SalRectThreshMode = -1;
    SalRectThreshStart = SalRectThreshEnd = SalRectThreshStep = -1.0f;
    SalRectThreshLow = SalRectThreshHigh = SalRectHistTop = -1.0f;
    SalRectHistTopBin = -1;
    SalRectHistTop2 = -1.0f;
    SalRectLocalThreshFlag = 0;
    SalRectLocalMaxThresh = SalRectLocalThreshLow = SalRectLocalThreshHigh = -1.0f;
    SalRectSortMode = SalRectAdjacentMode = -1;
    SalRectMinArea = SalRectAvgFilterStep = 0;
    SalRectPosSpecifyFlag = 0;
    SalRectXPos = SalRectYPos = -1;
}

ParamVA::~ParamVA() = default;

float ParamVA::fWeightCS(int group, int k) const {
    typedef float ParamVA::*Field;
    static const Field kFields[7][6] = {
        {&ParamVA::WeightCS1I, &ParamVA::WeightCS2I, &ParamVA::WeightCS3I, &ParamVA::WeightCS4I,
         &ParamVA::WeightCS5I, &ParamVA::WeightCS6I},
        {&ParamVA::WeightCS1RG, &ParamVA::WeightCS2RG, &ParamVA::WeightCS3RG, &ParamVA::WeightCS4RG,
         &ParamVA::WeightCS5RG, &ParamVA::WeightCS6RG},
        {&ParamVA::WeightCS1BY, &ParamVA::WeightCS2BY, &ParamVA::WeightCS3BY, &ParamVA::WeightCS4BY,
         &ParamVA::WeightCS5BY, &ParamVA::WeightCS6BY},
        {&ParamVA::WeightCS1O1, &ParamVA::WeightCS2O1, &ParamVA::WeightCS3O1, &ParamVA::WeightCS4O1,
         &ParamVA::WeightCS5O1, &ParamVA::WeightCS6O1},
        {&ParamVA::WeightCS1O2, &ParamVA::WeightCS2O2, &ParamVA::WeightCS3O2, &ParamVA::WeightCS4O2,
         &ParamVA::WeightCS5O2, &ParamVA::WeightCS6O2},
        {&ParamVA::WeightCS1O3, &ParamVA::WeightCS2O3, &ParamVA::WeightCS3O3, &ParamVA::WeightCS4O3,
         &ParamVA::WeightCS5O3, &ParamVA::WeightCS6O3},
        {&ParamVA::WeightCS1O4, &ParamVA::WeightCS2O4, &ParamVA::WeightCS3O4, &ParamVA::WeightCS4O4,
         &ParamVA::WeightCS5O4, &ParamVA::WeightCS6O4},
    };
    if (group < 0 || group >= 7 || k < 0 || k >= 6) return 0.0f;
    return this->*kFields[group][k];
}

int ParamVA::iPrmCheck() {
    if (!WeightLearningFlag) OutputFeatureMap = 1;
    if (NumCSMap == -1) {
        NumCSMap = (CSCenterLevelTo - CSCenterLevelFrom + 1) * (CSDiffLevelTo - CSDiffLevelFrom + 1);
    }
    CSCenterLevelFrom -= 1;
    CSCenterLevelTo -= 1;
    CSSaliencyMapLevel -= 1;
    if (ImgFixFlag) ImgMaxSize = ImgFixWidth > ImgFixHeight ? ImgFixWidth : ImgFixHeight;

    bool ok = WeightNumCS >= 1 && NumPyramid > 0 && NumCSMap > 0 && (PyramidNumTap == 2 || PyramidNumTap == 6) &&
              CSDiffLevelFrom > 0 && CSCenterLevelTo > 0 && CSDiffLevelTo > 0 && ConvBndHandle >= 0 &&
              ConvBndHandle <= 4 && CSSaliencyMapLevel > 0 && SigmoidApxStep >= 0 && FaceScale > 0.0f &&
              FaceStep >= 1 && FaceImgMaxSize >= 1 && ImgMaxSize > 0 && ImgFixWidth >= 1 && ImgFixHeight >= 1;
    if (ok && SalRectFlag) {
        switch (SalRectThreshMode) {
            case VA_SEGIDX_THRESHOLD_MODE_0:
                ok = SalRectThreshStart <= SalRectThreshEnd && SalRectThreshStep > 0.0f;
                break;
            case VA_SEGIDX_THRESHOLD_MODE_1:
                ok = SalRectThreshLow <= SalRectThreshHigh;
                break;
            case VA_SEGIDX_THRESHOLD_MODE_2:
                ok = SalRectHistTopBin >= 0 && SalRectHistTop >= 0.0f;
                break;
            case VA_SEGIDX_THRESHOLD_MODE_3:
                ok = SalRectHistTop >= 0.0f && SalRectHistTop2 >= 0.0f;
                break;
            default:
                ok = false;
        }
        if (ok && SalRectLocalThreshFlag) {
            ok = SalRectLocalMaxThresh >= 0.0f && SalRectLocalThreshLow <= SalRectLocalThreshHigh;
        }
        ok = ok && SalRectSortMode >= 0 && SalRectSortMode <= 3 && SalRectAvgFilterStep >= 0 &&
             (SalRectAdjacentMode == 4 || SalRectAdjacentMode == 8);
        if (ok && SalRectPosSpecifyFlag) ok = SalRectXPos >= 0 && SalRectYPos >= 0;
    }
    return ok ? 1 : 0;
}

// ------------------------------------------------------------------ ParamIO

namespace {

enum class Kind { kSection, kComment, kBool, kInt, kFloat, kText, kBlank };

// One line group of the parameter file. Fields of the ParamVA part and the
// file-only fields of ParamIO are reached through member pointers of ParamIO.
struct Entry {
    Kind kind;
    const char* text;  // key, section title or comment line
    int32_t ParamIO::*i;
    float ParamIO::*f;
    char (ParamIO::*s)[ParamVA::kTextSize];
};

constexpr Entry Section(const char* title) { return {Kind::kSection, title, nullptr, nullptr, nullptr}; }
constexpr Entry Comment(const char* line) { return {Kind::kComment, line, nullptr, nullptr, nullptr}; }
constexpr Entry Blank() { return {Kind::kBlank, nullptr, nullptr, nullptr, nullptr}; }
constexpr Entry B(const char* key, int32_t ParamIO::*m) { return {Kind::kBool, key, m, nullptr, nullptr}; }
constexpr Entry I(const char* key, int32_t ParamIO::*m) { return {Kind::kInt, key, m, nullptr, nullptr}; }
constexpr Entry F(const char* key, float ParamIO::*m) { return {Kind::kFloat, key, nullptr, m, nullptr}; }
constexpr Entry S(const char* key, char (ParamIO::*m)[ParamVA::kTextSize]) {
    return {Kind::kText, key, nullptr, nullptr, m};
}

#define PB(name) B(#name, &ParamIO::name)
#define PI(name) I(#name, &ParamIO::name)
#define PF(name) F(#name, &ParamIO::name)
#define PS(name) S(#name, &ParamIO::name)

const Entry kEntries[] = {
    Section("# input/output file parameters\n"),
    PS(InputFile), PS(OutputDir), PS(OutputPrefix), PB(OutputDebugInfo), PB(OutputDebugDump), Blank(),
    Section("# test parameters\n"),
    PI(TestInputImgFormat), Blank(),
    Section("# map output parameters\n"),
    PB(OutputCSMap), PB(OutputFeatureMap), PB(OutputConspicuityMap), Blank(),
    Section("# feature parameters\n"),
    PB(FeatureIntensity), PB(FeatureIntensityY), PB(FeatureColorRGB), PB(FeatureColorCrCb), PB(FeatureOriGabor),
    PB(FeatureOriEdge), PB(FeatureFace), Blank(),
    Section("# feature weight parameters\n"),
    PF(FeatureWeightIntensity), PF(FeatureWeightIntensityY), PF(FeatureWeightColorRG), PF(FeatureWeightColorBY),
    PF(FeatureWeightColorCr), PF(FeatureWeightColorCb), PF(FeatureWeightOriGabor1), PF(FeatureWeightOriGabor2),
    PF(FeatureWeightOriGabor3), PF(FeatureWeightOriGabor4), PF(FeatureWeightOriEdge1), PF(FeatureWeightOriEdge2),
    PF(FeatureWeightOriEdge3), PF(FeatureWeightOriEdge4), PF(FeatureWeightFace), Blank(),
    Section("# feature learning weight parameters\n"),
    PB(WeightLearningFlag), PI(WeightNumCS), PF(WeightS), PF(WeightFI), PF(WeightFRG), PF(WeightFBY),
    PF(WeightFO1), PF(WeightFO2), PF(WeightFO3), PF(WeightFO4), PF(WeightFFace),
    PF(WeightCS1I), PF(WeightCS2I), PF(WeightCS3I), PF(WeightCS4I), PF(WeightCS5I), PF(WeightCS6I),
    PF(WeightCS1RG), PF(WeightCS2RG), PF(WeightCS3RG), PF(WeightCS4RG), PF(WeightCS5RG), PF(WeightCS6RG),
    PF(WeightCS1BY), PF(WeightCS2BY), PF(WeightCS3BY), PF(WeightCS4BY), PF(WeightCS5BY), PF(WeightCS6BY),
    PF(WeightCS1O1), PF(WeightCS2O1), PF(WeightCS3O1), PF(WeightCS4O1), PF(WeightCS5O1), PF(WeightCS6O1),
    PF(WeightCS1O2), PF(WeightCS2O2), PF(WeightCS3O2), PF(WeightCS4O2), PF(WeightCS5O2), PF(WeightCS6O2),
    PF(WeightCS1O3), PF(WeightCS2O3), PF(WeightCS3O3), PF(WeightCS4O3), PF(WeightCS5O3), PF(WeightCS6O3),
    PF(WeightCS1O4), PF(WeightCS2O4), PF(WeightCS3O4), PF(WeightCS4O4), PF(WeightCS5O4), PF(WeightCS6O4),
    Blank(),
    Section("# pyramid parameters\n"),
    PI(NumPyramid), PI(PyramidNumTap), Blank(),
    Section("# center-surround parameters\n"),
    PI(NumCSMap), PI(CSCenterLevelFrom), PI(CSCenterLevelTo), PI(CSDiffLevelFrom), PI(CSDiffLevelTo),
    PI(CSSaliencyMapLevel), Blank(),
    Section("# normalize parameters\n"),
    PB(NormReductionFlag),
    Section("# convolution parameters\n"),
    PI(ConvBndHandle), Blank(),
    Section("# sigmoid function\n"),
    PF(SigmoidApxMin), PF(SigmoidApxMax), PI(SigmoidApxStep), Blank(),
    Section("# edge filter parameters\n"),
    PI(EdgeAlgo),
    Section("# face parameters\n"),
    PB(FaceDetectionCallFlag), PF(FaceThresh), PF(FaceScale), PI(FaceStep), PI(FaceStabilize),
    PB(FaceLoadDataFlag), PS(FaceDatafile), PF(FaceMaxScore), PI(FaceImgMaxSize), Blank(),
    Section("# image parameters\n"),
    PB(ImgFixFlag), PI(ImgMaxSize), PI(ImgFixWidth), PI(ImgFixHeight), Blank(),
    Section("# saliency rectangle parameters\n"),
    PB(SalRectFlag), PB(SalRectGradFlag), PI(SalRectThreshMode),
    Comment("### VA_SEGIDX_THRESHOLD_MODE_0\n"),
    PF(SalRectThreshStart), PF(SalRectThreshEnd), PF(SalRectThreshStep),
    Comment("###  VA_SEGIDX_THRESHOLD_MODE_1\n"),
    PF(SalRectThreshLow), PF(SalRectThreshHigh),
    Comment("### VA_SEGIDX_THRESHOLD_MODE_2, VA_SEGIDX_THRESHOLD_MODE_3\n"),
    PF(SalRectHistTop), PI(SalRectHistTopBin), PF(SalRectHistTop2),
    Comment("### local threshold\n"),
    PB(SalRectLocalThreshFlag), PF(SalRectLocalMaxThresh), PF(SalRectLocalThreshLow), PF(SalRectLocalThreshHigh),
    Comment("### parameters\n"),
    PI(SalRectSortMode), PI(SalRectAdjacentMode), PI(SalRectMinArea), PI(SalRectAvgFilterStep),
    PB(SalRectPosSpecifyFlag), PI(SalRectXPos), PI(SalRectYPos), Blank(),
};

#undef PB
#undef PI
#undef PF
#undef PS

const char kHashRule[] = "###################################################################\n";
const char kSectionRule[] = "#==================================================================\n";

}  // namespace

ParamIO::ParamIO() : TestInputImgFormat(-1), stream(nullptr) {
    std::memset(InputFile, 0, sizeof InputFile);
    std::memset(OutputDir, 0, sizeof OutputDir);
    std::memset(OutputPrefix, 0, sizeof OutputPrefix);
}

ParamIO::~ParamIO() = default;

void ParamIO::vOutputParam(FILE* out) const {
    if (out == nullptr) return;
    std::fputs(kHashRule, out);
    std::fputs("#   Parameter for Visual Attention \n", out);
    std::fputs("#   written by the attention library\n", out);
    std::fputs(kHashRule, out);
    std::fputs("\n", out);
    for (const Entry& e : kEntries) {
        switch (e.kind) {
            case Kind::kSection:
                std::fputs(kSectionRule, out);
                std::fputs(e.text, out);
                std::fputs(kSectionRule, out);
                break;
            case Kind::kComment:
                std::fputs(e.text, out);
                break;
            case Kind::kBlank:
                std::fputs("\n", out);
                break;
            case Kind::kBool:
                std::fprintf(out, this->*e.i ? "%-25s = true\n" : "%-25s = false\n", e.text);
                break;
            case Kind::kInt:
                std::fprintf(out, "%-25s = %d\n", e.text, this->*e.i);
                break;
            case Kind::kFloat:
                std::fprintf(out, "%-25s = %f\n", e.text, static_cast<double>(this->*e.f));
                break;
            case Kind::kText: {
                const char* value = this->*e.s;
                if (value[0] == '\0') std::fputs("# ", out);
                std::fprintf(out, "%-25s = %s\n", e.text, value);
                break;
            }
        }
    }
}

// ------------------------------------------------------------------ ParamMem

ParamMem::ParamMem() {
    SetText(InputFile, "in_filename");
    SetText(OutputDir, "./log");
    SetText(OutputPrefix, "out");
    SetText(outputPath, "./out");
    TestInputImgFormat = 2;

    OutputDebugInfo = 0;
    OutputDebugDump = 0;
    OutputCSMap = 1;
    OutputFeatureMap = 1;
    OutputConspicuityMap = 1;
    FeatureIntensity = 0;
    FeatureIntensityY = 1;
    FeatureColorRGB = 0;
    FeatureColorCrCb = 1;
    FeatureOriGabor = 0;
    FeatureOriEdge = 1;
    FeatureFace = 1;
    FeatureWeightIntensity = 4.0f;
    FeatureWeightIntensityY = 4.0f;
    FeatureWeightColorRG = FeatureWeightColorBY = FeatureWeightColorCr = FeatureWeightColorCb = 2.0f;
    FeatureWeightOriGabor1 = FeatureWeightOriGabor2 = FeatureWeightOriGabor3 = FeatureWeightOriGabor4 = 1.0f;
    FeatureWeightOriEdge1 = FeatureWeightOriEdge2 = FeatureWeightOriEdge3 = FeatureWeightOriEdge4 = 1.0f;
    FeatureWeightFace = 8.0f;

    WeightLearningFlag = 1;
    WeightNumCS = 5;
    WeightS = 1.242401f;
    WeightFI = 0.26785f;
    WeightFRG = 0.262262f;
    WeightFBY = 0.231684f;
    WeightFO1 = 0.121275f;
    WeightFO2 = 0.254206f;
    WeightFO3 = 0.234621f;
    WeightFO4 = 0.247866f;
    WeightFFace = 1.01261f;
    WeightCS1I = 0.400946f, WeightCS2I = 0.28734f, WeightCS3I = 0.283565f, WeightCS4I = 0.477132f,
    WeightCS5I = 0.557878f;
    WeightCS1RG = 0.200849f, WeightCS2RG = 0.180316f, WeightCS3RG = 0.177607f, WeightCS4RG = 0.277317f,
    WeightCS5RG = 0.38064f;
    WeightCS1BY = 0.168938f, WeightCS2BY = 0.132461f, WeightCS3BY = 0.147813f, WeightCS4BY = 0.187422f,
    WeightCS5BY = 0.27524f;
    WeightCS1O1 = 0.092355f, WeightCS2O1 = 0.076291f, WeightCS3O1 = 0.152304f, WeightCS4O1 = 0.169898f,
    WeightCS5O1 = 0.222113f;
    WeightCS1O2 = 0.114954f, WeightCS2O2 = 0.099626f, WeightCS3O2 = 0.183116f, WeightCS4O2 = 0.218244f,
    WeightCS5O2 = 0.322886f;
    WeightCS1O3 = 0.051498f, WeightCS2O3 = 0.042323f, WeightCS3O3 = 0.12354f, WeightCS4O3 = 0.137961f,
    WeightCS5O3 = 0.210633f;
    WeightCS1O4 = 0.112923f, WeightCS2O4 = 0.097348f, WeightCS3O4 = 0.178526f, WeightCS4O4 = 0.214716f,
    WeightCS5O4 = 0.323495f;

    NumPyramid = 7;
    PyramidNumTap = 2;
    NumCSMap = 5;
    CSCenterLevelFrom = 1;
    CSCenterLevelTo = 3;
    CSDiffLevelFrom = 3;
    CSDiffLevelTo = 4;
    CSSaliencyMapLevel = 3;
    NormReductionFlag = 1;
    ConvBndHandle = 3;
    SigmoidApxMin = -2.0f;
    SigmoidApxMax = 2.0f;
    SigmoidApxStep = 128;
    EdgeAlgo = 2;

    FaceDetectionCallFlag = 0;
    FaceThresh = 3.0f;
    FaceScale = 0.841f;
    FaceStep = 2;
    FaceStabilize = 2;
    FaceLoadDataFlag = 0;
    SetText(FaceDatafile, "../../../Lib//Oriel/data/FDT/MV09_M2R_X5.PD3");
    FaceMaxScore = 3.75f;
    FaceImgMaxSize = 640;

    ImgFixFlag = 0;
    ImgMaxSize = 256;
    ImgFixWidth = 64;
    ImgFixHeight = 64;

    SalRectFlag = 1;
    SalRectGradFlag = 1;
    SalRectThreshMode = 2;
    SalRectThreshStart = 0.0f;
    SalRectThreshEnd = 1.0f;
    SalRectThreshStep = 0.1f;
    SalRectThreshLow = 0.32f;
    SalRectThreshHigh = 0.48f;
    SalRectHistTop = 0.12f;
    SalRectHistTopBin = 18;
    SalRectHistTop2 = 0.0f;
    SalRectLocalThreshFlag = 1;
    SalRectLocalMaxThresh = 0.4f;
    SalRectLocalThreshLow = 0.08f;
    SalRectLocalThreshHigh = 0.33f;
    SalRectSortMode = 0;
    SalRectAdjacentMode = 8;
    SalRectMinArea = 2;
    SalRectAvgFilterStep = 0;
    SalRectPosSpecifyFlag = 0;
    SalRectXPos = 0;
    SalRectYPos = 0;
}

ParamMem::~ParamMem() = default;
