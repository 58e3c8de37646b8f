// VAMarge: the attention areas summarised for the framing search.
//
// Built once per framing call on the framing grid: each area gets an
// importance, the areas are ordered by it, a main area is chosen, and the
// areas are merged into one box with the factors the energy terms weigh by.
// After Marge() the object is only read.
#ifndef LUMICOR_CALIB_FRAMING_VA_MARGE_H
#define LUMICOR_CALIB_FRAMING_VA_MARGE_H

#include <cstdint>

#include <lumicor/calib.h>

#include "calib/src/CALib/va.h"

class VAMarge : public VA {
public:
    // Tuning constants of the summary and of the energy terms.
    static constexpr float kThinLimit = 0.33f;
    static constexpr float kWideLimit = 3.0f;
    static constexpr float kSquareBandLow = 0.75f;
    static constexpr float kSquareBandHigh = 1.33f;
    static constexpr float kSmallSizeLimit = 0.015625f;
    static constexpr float kSubjectRatioLow = 0.0625f;
    static constexpr float kSubjectRatioHigh = 0.5f;
    static constexpr float kBoxRatioLow = 0.0625f;
    static constexpr float kBoxRatioHigh = 0.5f;
    static constexpr float kCutRampStart = 0.0f;
    static constexpr float kCutRampEnd = 1.0f;
    static constexpr float kImportanceFloor = 0.01f;

    // Takes the composition flags from param->composition_mode.
    explicit VAMarge(const _CAParam* param);
    ~VAMarge() override;

    // Importance of every loaded area, importance order (stable, largest
    // first) and the main area: forceMain is an index into that order, or
    // 0xFFFFFFFF (CA_NONE_SPECIFIED) for the most important area. An index
    // beyond the loaded areas is ignored.
    void ReAdjust(int gw, int gh, unsigned int forceMain);

    // Merged box, per-area aspects, main size and the subject factors.
    void Marge(int gw, int gh);

    // An area takes part when its importance reaches the floor.
    bool IsPresent(int i) const { return importance[i] >= kImportanceFloor; }

    // width / height. An area without height has no finite aspect; it takes
    // the limit instead: the largest float with the sign of its width, or 0
    // when it has no width either.
    static float AspectOf(int32_t w, int32_t h);

    float importance[kMaxAreas];
    float aspect[kMaxAreas];
    int32_t gridArea;
    int32_t mergeLeft;
    int32_t mergeTop;
    int32_t mergeRight;
    int32_t mergeBottom;
    int32_t mergeArea;
    int32_t mainIndex;
    int32_t secondIndex;
    int32_t mainSize;
    float subjectRatio;
    float shapeFactor;
    float sizeFactor;
    float smallSubjectFactor;
    // Composition flags.
    bool singleMain;
    bool twoSubject;
    bool diagonal;
    bool centre;

private:
    void SwapSlots(int a, int b);
};

#endif
