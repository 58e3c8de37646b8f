#include "ktlib/src/representative/bad_exposure.h"

#include "ktlib/src/colorlabel/color_labeling.h"

int CalcBadExposure(const _zbm_Image* image, const _KtMetaSimilarity* siml, float outOfFocus, float* badExposure) {
    if (!image || !siml || !badExposure) return KT_ERR_STATE;
    ColorHistogram histogram;
    if (!histogram.SetFromSimilarity(*siml)) return KT_ERR_NO_MEMORY;
    const ColorLabelingModuleAchromatic black(colorlabel::kBlack);
    ColorLabeling labeling;
    labeling.SetModule(&black);
    const int p = labeling.JudgeImage(&histogram);

    // Darkness: half of the scale for up to 36 % near-black pixels, the other
    // half from 37 % to 100 %.
    float e;
    if (p <= 36)
        e = static_cast<float>(p) / 37.0f * 0.5f;
    else
        e = 0.5f + static_cast<float>(p - 37) / 63.0f * 0.5f;
    *badExposure = (e * e + outOfFocus * outOfFocus) * 0.5f;
    return KT_OK;
}
