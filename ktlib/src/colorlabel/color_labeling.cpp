#include "ktlib/src/colorlabel/color_labeling.h"

#include <cmath>
#include <cstdint>

namespace colorlabel {
const _achromaticModuleParam kWhite = {5, 12, 100};
const _achromaticModuleParam kBlack = {30, 25, 0};
const _chromaticModuleParam kRed = {100, 25, 25, -35, 55};
const _chromaticModuleParam kYellow = {100, 75, 25, 75, 110};
const _chromaticModuleParam kGreen = {100, 15, 25, 110, 170};
const _chromaticModuleParam kBlue = {100, 15, 25, 200, 300};
}  // namespace colorlabel

namespace {
// The grey axis of the 8-bit Lab encoding.
const int kNeutral = 127;
const int kPaletteSlots = 32;
const double kPi = 3.14159265358979323846;
}  // namespace

bool ColorHistogram::Init(int colors) {
    if (colors < 0) return false;
    total_ = 0;
    components_.reset();
    if (colors > 0) {
        components_ = lmk::NewArray<ColorCompornent>(static_cast<size_t>(colors));
        if (!components_) return false;
    }
    total_ = colors;
    return true;
}

bool ColorHistogram::SetFromSimilarity(const _KtMetaSimilarity& siml) {
    const int colors = siml.ncol32 > kPaletteSlots ? kPaletteSlots : static_cast<int>(siml.ncol32);
    if (!Init(colors)) return false;
    for (int i = 0; i < colors; ++i) {
        const _KtMetaSimilarity::_ColHist entry = siml.colHist32[i];
        ColorCompornent& c = components_[i];
        c.L = entry.lab.l;
        c.a = entry.lab.a;
        c.b = entry.lab.b;
        c.count = entry.count > 0x7fffffffu ? 0x7fffffff : static_cast<int32_t>(entry.count);
    }
    return true;
}

const ColorCompornent* ColorHistogram::GetCompornent(int index) const {
    return index >= 0 && index < total_ ? &components_[index] : nullptr;
}

ColorCompornent* ColorHistogram::GetCompornent(int index) {
    return index >= 0 && index < total_ ? &components_[index] : nullptr;
}

ColorLabelingModuleAchromatic::ColorLabelingModuleAchromatic(const _achromaticModuleParam& param)
    : lCenter_(param.lCenter),
      lRadius2_(param.lRadius * param.lRadius),
      chromaRadius2_(param.chromaRadius * param.chromaRadius) {}

int ColorLabelingModuleAchromatic::JudgeColor(int L, int a, int b) const {
    // Inside the ellipsoid: q^2 (L - Lc)^2 <= p^2 (q^2 - da^2 - db^2). Palette
    // values are bytes, so every term stays far inside 32 bits; 64 bits keep
    // arbitrary callers defined.
    const int64_t da = static_cast<int64_t>(a) - kNeutral;
    const int64_t db = static_cast<int64_t>(b) - kNeutral;
    const int64_t dl = static_cast<int64_t>(L) - lCenter_;
    return static_cast<int64_t>(chromaRadius2_) * dl * dl <= static_cast<int64_t>(lRadius2_) * (chromaRadius2_ - da * da - db * db)
               ? 1
               : 0;
}

ColorLabelingModuleChromatic::ColorLabelingModuleChromatic(const _chromaticModuleParam& param)
    : lHigh_(param.lHigh), lLow_(param.lLow), chromaMin_(param.chromaMin) {
    SetParam(param.hueStart, &signStart_, &slopeStart_, 1);
    SetParam(param.hueEnd, &signEnd_, &slopeEnd_, -1);
}

void ColorLabelingModuleChromatic::SetParam(int angle, int* sign, double* slope, int s) {
    int a = angle % 360;
    if (a < 0) a += 360;
    // The vertical lines get a steep finite slope instead of an infinite one.
    *slope = (a == 90 || a == 270) ? 255.0 : std::tan(a * kPi / 180.0);
    *sign = (a <= 90 || a >= 271) ? -s : s;
}

int ColorLabelingModuleChromatic::JudgeColor(int L, int a, int b) const {
    if (L > lHigh_ || L < lLow_) return 0;
    const int64_t da = static_cast<int64_t>(a) - kNeutral;
    const int64_t db = static_cast<int64_t>(b) - kNeutral;
    if (da * da + db * db < static_cast<int64_t>(chromaMin_) * chromaMin_) return 0;
    // Outside the wedge when strictly on the far side of either hue line; a
    // colour exactly on a line belongs to the label.
    const double x = static_cast<double>(da);
    const double y = static_cast<double>(db);
    if (signStart_ * (y - x * slopeStart_) > 0) return 0;
    if (signEnd_ * (y - x * slopeEnd_) > 0) return 0;
    return 1;
}

int ColorLabeling::JudgeImage(const ColorHistogram* histogram) const {
    if (!module_ || !histogram) return 0;
    int64_t total = 0;
    int64_t hits = 0;
    for (int i = 0; i < histogram->GetTotalColors(); ++i) {
        const ColorCompornent* c = histogram->GetCompornent(i);
        total += c->count;
        if (module_->JudgeColor(c->L, c->a, c->b)) hits += c->count;
    }
    if (total <= 0) return 0;
    const double percent = 100.0 * static_cast<double>(hits) / static_cast<double>(total);
    // Negative counts (possible only in a hand-made histogram) must not carry
    // the share outside 0..100.
    if (!(percent > 0)) return 0;
    if (percent >= 100) return 100;
    return static_cast<int>(percent);
}
