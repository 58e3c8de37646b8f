// KtClblExtract: colour labels from the palette of a similarity meta.
#include <lumicor/ktlib.h>

#include <memory>

#include "common/src/internal/memory.h"
#include "ktlib/src/colorlabel/color_labeling.h"

namespace {

// Judges the histogram with a freshly made module of the given parameters;
// -1 when the module cannot be allocated.
template <typename Module, typename Param>
int Judge(const ColorHistogram& histogram, const Param& param) {
    std::unique_ptr<Module> module = lmk::NewObject<Module>(param);
    if (!module) return -1;
    ColorLabeling labeling;
    labeling.SetModule(module.get());
    return labeling.JudgeImage(&histogram);
}

}  // namespace

extern "C" int KtClblExtract(const _KtMetaSimilarity* siml, _KtMetaColorLabel** out) {
    if (!siml || !out) return KT_ERR_NULL;
    if (*out) return KT_ERR_STATE;
    std::unique_ptr<_KtMetaColorLabel> labels = lmk::NewObject<_KtMetaColorLabel>();
    if (!labels) return KT_ERR_NO_MEMORY;
    ColorHistogram histogram;
    if (!histogram.SetFromSimilarity(*siml)) return KT_ERR_NO_MEMORY;

    const int values[6] = {
        Judge<ColorLabelingModuleAchromatic>(histogram, colorlabel::kWhite),
        Judge<ColorLabelingModuleAchromatic>(histogram, colorlabel::kBlack),
        Judge<ColorLabelingModuleChromatic>(histogram, colorlabel::kRed),
        Judge<ColorLabelingModuleChromatic>(histogram, colorlabel::kYellow),
        Judge<ColorLabelingModuleChromatic>(histogram, colorlabel::kGreen),
        Judge<ColorLabelingModuleChromatic>(histogram, colorlabel::kBlue),
    };
    uint8_t* fields[6] = {&labels->white, &labels->black, &labels->red, &labels->yellow, &labels->green, &labels->blue};
    for (int i = 0; i < 6; ++i) {
        if (values[i] < 0) return KT_ERR_NO_MEMORY;
        *fields[i] = static_cast<uint8_t>(values[i]);
    }
    *out = labels.release();
    return KT_OK;
}
