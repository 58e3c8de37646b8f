// Colour labels: each label judges the palette colours of a similarity meta
// against a region of the 8-bit Lab space (L 0..99, a and b around 127); the
// label value is the pixel-weighted percentage of the palette inside it.
#ifndef LUMICOR_KTLIB_COLOR_LABELING_H
#define LUMICOR_KTLIB_COLOR_LABELING_H

#include <lumicor/ktlib.h>

#include <cstdint>

#include "common/src/internal/memory.h"

// One palette colour: 8-bit Lab and its pixel count.
class ColorCompornent {
public:
    ColorCompornent() : L(0), a(0), b(0), count(0) {}
    int32_t L;
    int32_t a;
    int32_t b;
    int32_t count;
};

class ColorHistogram {
public:
    ColorHistogram() : total_(0) {}
    virtual ~ColorHistogram() {}
    // Makes room for `colors` zeroed components; false when out of memory or
    // negative.
    bool Init(int colors);
    // Takes the first ncol32 (at most 32) palette entries of a similarity
    // meta; counts above 2147483647 are stored as 2147483647. False when out
    // of memory.
    bool SetFromSimilarity(const _KtMetaSimilarity& siml);
    int GetTotalColors() const { return total_; }
    const ColorCompornent* GetCompornent(int index) const;
    ColorCompornent* GetCompornent(int index);

private:
    int total_;
    lmk::UniqueArray<ColorCompornent> components_;
};

class ColorLabelingModule {
public:
    virtual ~ColorLabelingModule() {}
    // 1 when the colour belongs to the label, else 0.
    virtual int JudgeColor(int L, int a, int b) const = 0;
};

struct _achromaticModuleParam {
    int32_t lRadius;      // L semi-axis
    int32_t chromaRadius; // chroma semi-axis
    int32_t lCenter;      // L centre
};

// An ellipsoid around (L centre, 127, 127).
class ColorLabelingModuleAchromatic : public ColorLabelingModule {
public:
    explicit ColorLabelingModuleAchromatic(const _achromaticModuleParam& param);
    int JudgeColor(int L, int a, int b) const override;

private:
    int32_t lCenter_;
    int32_t lRadius2_;
    int32_t chromaRadius2_;
};

struct _chromaticModuleParam {
    int32_t lHigh;        // highest L
    int32_t lLow;         // lowest L
    int32_t chromaMin;    // smallest chroma radius
    int32_t hueStart;     // degrees, counter-clockwise from +a
    int32_t hueEnd;       // degrees
};

// A hue wedge between two lines through the grey axis, within an L range and
// beyond a chroma radius.
class ColorLabelingModuleChromatic : public ColorLabelingModule {
public:
    explicit ColorLabelingModuleChromatic(const _chromaticModuleParam& param);
    int JudgeColor(int L, int a, int b) const override;
    // Slope and side sign of the hue line at `angle` degrees; s = +1 for the
    // start line, -1 for the end line.
    static void SetParam(int angle, int* sign, double* slope, int s);

private:
    int32_t lHigh_;
    int32_t lLow_;
    int32_t chromaMin_;
    double slopeStart_;
    int signStart_;
    double slopeEnd_;
    int signEnd_;
};

class ColorLabeling {
public:
    ColorLabeling() : module_(nullptr) {}
    virtual ~ColorLabeling() {}
    void SetModule(const ColorLabelingModule* module) { module_ = module; }
    // Truncated percentage (0..100) of the histogram's pixels whose colour the
    // module accepts; 0 without a module or without a positive total count.
    int JudgeImage(const ColorHistogram* histogram) const;

private:
    const ColorLabelingModule* module_;  // not owned
};

namespace colorlabel {
extern const _achromaticModuleParam kWhite;
extern const _achromaticModuleParam kBlack;
extern const _chromaticModuleParam kRed;
extern const _chromaticModuleParam kYellow;
extern const _chromaticModuleParam kGreen;
extern const _chromaticModuleParam kBlue;
}  // namespace colorlabel

#endif
