#include "calib/src/framing/framing_search.h"

#include <algorithm>
#include <cmath>
#include <new>

#include "calib/src/CALib/ca_common.h"
#include "calib/src/framing/va_marge.h"
#include "common/src/internal/memory.h"

namespace {

constexpr int kLevels = 20;
constexpr double kUnrated = 100.0;  // energy of a crop that was never evaluated
constexpr int kCoarseStep = 4;
constexpr int kFineReach = 4;
// A face at least this fraction of the grid is framed without zooming in.
constexpr float kLargeFace = 0.5f;

// A result is usable when every value is a number in [0, 1] and the crop has
// an extent; NaN fails every comparison and so is caught here too.
bool UsableFraction(float v) { return v >= 0.0f && v <= 1.0f; }

}  // namespace

void FramingSearch::GridSize(uint32_t width, uint32_t height, int* gridWidth, int* gridHeight) {
    const float r = static_cast<float>(height) / static_cast<float>(width);
    const float side = static_cast<float>(kFramingGridLongSide);
    int gwv;
    int ghv;
    if (r <= 1.0f) {
        gwv = kFramingGridLongSide;
        ghv = static_cast<int>(0.5f + side * r);
    } else {
        ghv = kFramingGridLongSide;
        gwv = static_cast<int>(side / r + 0.5f);
    }
    // A photo more than 80 times longer than wide would round its short side
    // to no cell at all.
    *gridWidth = std::max(gwv, 1);
    *gridHeight = std::max(ghv, 1);
}

float FramingSearch::calculateMaximumRegionMin(int width, int height, float a) {
    const float w = static_cast<float>(width);
    const float h = static_cast<float>(height);
    if (h / w > a) return w * a / h;
    return h / (w * a);
}

void FramingSearch::correct(float a, _CAResult* result) const {
    const float fw = static_cast<float>(W);
    const float fh = static_cast<float>(H);
    float x = result->x;
    float y = result->y;
    float w = result->width;
    float h = result->height;
    const float ph = h * fh;
    const float pw = w * fw;
    if (a - ph / pw > 0.0f) {
        // Too wide: grow the height, then fit the width to it.
        const float dh = (a * pw - ph) / fh;
        y = std::max(0.0f, y - dh * 0.5f);
        h = std::min(h + dh, 1.0f - y);
        const float dw = (h * fh / a - w * fw) / fw;
        x = std::max(0.0f, x - dw * 0.5f);
        w = std::min(w + dw, 1.0f - x);
    } else {
        // Too tall (or exact): grow the width, then fit the height to it.
        const float dw = (ph / a - pw) / fw;
        x = std::max(0.0f, x - dw * 0.5f);
        w = std::min(w + dw, 1.0f - x);
        const float dh = (fw * w * a - h * fh) / fh;
        y = std::max(0.0f, y - dh * 0.5f);
        h = std::min(h + dh, 1.0f - y);
    }
    result->x = x;
    result->y = y;
    result->width = w;
    result->height = h;
}

uint32_t FramingSearch::Search(const _CAParam* param, VAMarge* va, _CAResult* result) {
    ObjectFunction of(param->consistency_weight_min);
    CA::SetFuncCoef(&of, va);

    const float a = param->aspect_ratio;
    const float maxScale = calculateMaximumRegionMin(W, H, a);
    float minScale = maxScale * (1.0f / param->magnification_limit);

    if (va->isFace[0] && va->num > 0) {
        int32_t largestWidth = va->width[0];
        int32_t largestHeight = va->height[0];
        for (int i = 1; i < va->num; ++i) {
            largestWidth = std::max(largestWidth, va->width[i]);
            largestHeight = std::max(largestHeight, va->height[i]);
        }
        const float share = std::max(static_cast<float>(largestWidth) / static_cast<float>(gw),
                                     static_cast<float>(largestHeight) / static_cast<float>(gh));
        if (share >= kLargeFace) minScale = maxScale;
    }

    SearchRegion region;
    region.left = 0;
    region.right = gw;
    region.top = 0;
    region.bottom = gh;
    region.minWidth = static_cast<int32_t>(static_cast<float>(gw) * minScale);
    region.maxWidth = gw;
    region.minHeight = static_cast<int32_t>(static_cast<float>(gh) * minScale);
    region.maxHeight = gh;
    region.minScale = minScale;

    CropRegion crop;
    crop.left = 0;
    crop.top = 0;
    crop.width = gw;
    crop.height = gh;
    crop.energy = kUnrated;
    crop.composition = crop.consistency = crop.penaltyInside = crop.penaltyMainCut = 0.0f;
    crop.scaleX = static_cast<float>(W) / static_cast<float>(gw);
    crop.scaleY = static_cast<float>(H) / static_cast<float>(gh);
    crop.aspectRatio = a;

    const uint32_t status = Opt::Coarse2Fine(this, va, &crop, region, &of);
    if (status != 0) {
        CA::ReportFailed("Search", 67, "Coarse2Fine()");
        return status;
    }

    _CAResult out;
    out.x = static_cast<float>(crop.left) / static_cast<float>(W);
    out.y = static_cast<float>(crop.top) / static_cast<float>(H);
    out.width = static_cast<float>(crop.width) / static_cast<float>(W);
    out.height = static_cast<float>(crop.height) / static_cast<float>(H);
    correct(a, &out);
    *result = out;

    if (!UsableFraction(out.x) || !UsableFraction(out.y) || !UsableFraction(out.width) ||
        !UsableFraction(out.height) || out.width == 0.0f || out.height == 0.0f) {
        CA::ReportMessage("Search", 96, "out of range result");
        return 12;
    }
    return 0;
}

namespace Opt {

namespace {

// Crop size of one coarse level at scale s: the side the aspect ratio leaves
// free is the grid's, the other follows the aspect.
void LevelSize(const FramingSearch* fs, float a, float s, int32_t* width, int32_t* height) {
    const float limit = static_cast<float>(kFramingGridLongSide);
    if (a >= static_cast<float>(fs->H) / static_cast<float>(fs->W)) {
        *width = static_cast<int32_t>(static_cast<float>(fs->gw) * s + 0.5f);
        const float t = static_cast<float>(fs->gw) * s * a;
        *height = static_cast<int32_t>(t < limit ? t + 0.5f : t);
    } else {
        *height = static_cast<int32_t>(static_cast<float>(fs->gh) * s + 0.5f);
        const float t = static_cast<float>(fs->gh) * s / a;
        *width = static_cast<int32_t>(t < limit ? t + 0.5f : t);
    }
}

}  // namespace

void ToPixels(const FramingSearch* fs, CropRegion* crop) {
    crop->left = static_cast<int32_t>(static_cast<float>(crop->left) * crop->scaleX + 0.5f);
    crop->top = static_cast<int32_t>(static_cast<float>(crop->top) * crop->scaleY + 0.5f);
    crop->width = static_cast<int32_t>(static_cast<float>(crop->width) * crop->scaleX + 0.5f);
    crop->height = static_cast<int32_t>(static_cast<float>(crop->height) * crop->scaleY + 0.5f);

    // Rounding may leave the crop a pixel past the right or bottom edge:
    // shrink it, the other side following the aspect, until it fits.
    const float a = crop->aspectRatio;
    while (CA::CalcPenCIEnergy(fs, crop) != 0.0f) {
        if (a <= 1.0f) {
            crop->width -= 1;
            crop->height = static_cast<int32_t>(static_cast<float>(crop->width) * a + 0.5f);
        } else {
            crop->height -= 1;
            crop->width = static_cast<int32_t>(static_cast<float>(crop->height) / a + 0.5f);
        }
        if (crop->width < 0 || crop->height < 0) break;
    }
}

uint32_t Coarse2Fine(FramingSearch* fs, VAMarge* va, CropRegion* crop, SearchRegion region,
                     ObjectFunction* of) {
    std::unique_ptr<CropRegion> work(new (std::nothrow) CropRegion(*crop));
    if (!work) {
        CA::ReportFailed("Coarse2Fine", 16, "CA_NEW");
        return 4;
    }
    lmk::UniqueArray<CropRegion> levels(new (std::nothrow) CropRegion[kLevels]);
    if (!levels) {
        CA::ReportFailed("Coarse2Fine", 28, "CA_NEW");
        return 4;
    }
    for (int k = 0; k < kLevels; ++k) levels[k] = *crop;

    const float a = crop->aspectRatio;

    // Coarse stage: every size on a 4-cell lattice of positions. Ties go to
    // the later position.
    for (int k = 1; k <= kLevels; ++k) {
        float s = static_cast<float>(k) / static_cast<float>(kLevels);
        if (s <= region.minScale) s = region.minScale;
        int32_t width;
        int32_t height;
        LevelSize(fs, a, s, &width, &height);
        if (height > fs->gh) continue;  // this size does not fit: the level stays unrated
        CropRegion& level = levels[k - 1];
        double levelBest = kUnrated;
        for (int32_t top = region.top; top <= region.bottom - height; top += kCoarseStep) {
            for (int32_t left = region.left; left <= region.right - width; left += kCoarseStep) {
                work->left = left;
                work->top = top;
                work->width = width;
                work->height = height;
                const double e = CA::CalcEnergy(fs, va, of, work.get());
                if (e <= levelBest) {
                    level = *work;
                    levelBest = e;
                }
            }
        }
    }

    // The best level; ties go to the later (larger) level.
    double best = kUnrated;
    for (int k = 0; k < kLevels; ++k) {
        if (levels[k].energy <= best) {
            *crop = levels[k];
            best = levels[k].energy;
        }
    }
    levels.reset();

    // Fine stage: every position within 4 cells of the winner, same size.
    const int32_t left0 = crop->left;
    const int32_t top0 = crop->top;
    const int32_t width = crop->width;
    const int32_t height = crop->height;
    const int32_t topEnd = std::min(top0 + kFineReach, region.bottom + 1 - height);
    const int32_t leftEnd = std::min(left0 + kFineReach, region.right + 1 - width);
    for (int32_t top = std::max(region.top, top0 - kFineReach); top < topEnd; ++top) {
        for (int32_t left = std::max(region.left, left0 - kFineReach); left < leftEnd; ++left) {
            work->left = left;
            work->top = top;
            work->width = width;
            work->height = height;
            const double e = CA::CalcEnergy(fs, va, of, work.get());
            if (e <= crop->energy) *crop = *work;
        }
    }
    work.reset();

    ToPixels(fs, crop);
    return 0;
}

}  // namespace Opt
