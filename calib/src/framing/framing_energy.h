// The energy that rates a candidate crop on the framing grid, lower is better:
// four terms (composition on the rule of thirds, consistency with the subject
// and the photo, crop outside the photo, main subject cut or badly sized) and
// the weights that combine them.
//
// The terms run for every candidate of the search: they read the summary and
// the crop, allocate nothing and keep no state.
#ifndef LUMICOR_CALIB_FRAMING_FRAMING_ENERGY_H
#define LUMICOR_CALIB_FRAMING_FRAMING_ENERGY_H

#include <cstdint>

class FramingSearch;
class VAMarge;

// One candidate crop. Grid cells during the search, pixels once the search
// has converted its winner.
struct CropRegion {
    int32_t left;
    int32_t top;
    int32_t width;
    int32_t height;
    double energy;       // 100.0 until evaluated
    float composition;   // term values of the last evaluation
    float consistency;
    float penaltyInside;
    float penaltyMainCut;
    float scaleX;        // photo width / grid width
    float scaleY;        // photo height / grid height
    float aspectRatio;   // requested crop height / crop width
};

// Weights of the four terms.
struct ObjectFunction {
    explicit ObjectFunction(float consistencyWeightMin)
        : compositionWeight(1.0f),
          consistencyWeight(1.0f),
          insideWeight(1.0f),
          mainCutWeight(1.0f),
          weightMin(consistencyWeightMin),
          weightMax(1.0f) {}

    float compositionWeight;
    float consistencyWeight;
    float insideWeight;
    float mainCutWeight;
    float weightMin;  // consistency weight for very small subjects
    float weightMax;  // consistency weight for large subjects
};

namespace CA {

// Consistency weight from the subject ratio, ramped between weightMin and
// weightMax; the composition weight takes the rest so the four sum to 4.
void SetFuncCoef(ObjectFunction* of, const VAMarge* va);

// Area of the crop's intersection with the rectangle [l, r) x [t, b), except
// that a rectangle reaching above and below the crop that covers exactly one
// of its vertical edges counts as not overlapping at all.
int32_t Overlap(const CropRegion* crop, int32_t l, int32_t t, int32_t r, int32_t b);

float CalcCompEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop);
float CalcConsEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop);
float CalcPenCIEnergy(const FramingSearch* fs, const CropRegion* crop);
float CalcPenMCEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop);

// Evaluates the four terms, stores them and the weighted sum in the crop and
// returns the energy.
double CalcEnergy(const FramingSearch* fs, const VAMarge* va, const ObjectFunction* of,
                  CropRegion* crop);

}  // namespace CA

#endif
