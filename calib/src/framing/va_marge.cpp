#include "calib/src/framing/va_marge.h"

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <utility>

VAMarge::VAMarge(const _CAParam* param)
    : gridArea(0),
      mergeLeft(0),
      mergeTop(0),
      mergeRight(0),
      mergeBottom(0),
      mergeArea(0),
      mainIndex(0),
      secondIndex(1),
      mainSize(0),
      subjectRatio(0.0f),
      shapeFactor(0.0f),
      sizeFactor(0.0f),
      smallSubjectFactor(0.0f),
      singleMain(false),
      twoSubject(false),
      diagonal(false),
      centre(false) {
    std::memset(importance, 0, sizeof importance);
    std::memset(aspect, 0, sizeof aspect);
    const int32_t mode = param != nullptr ? param->composition_mode : 4;
    switch (mode) {
        case 0:
            singleMain = true;
            break;
        case 1:
            singleMain = twoSubject = true;
            break;
        case 2:
            singleMain = twoSubject = diagonal = true;
            break;
        case 3:
            centre = true;
            break;
        default:  // importance-weighted composition of all areas
            break;
    }
}

VAMarge::~VAMarge() = default;

float VAMarge::AspectOf(int32_t w, int32_t h) {
    if (h == 0) {
        if (w == 0) return 0.0f;
        return w > 0 ? FLT_MAX : -FLT_MAX;
    }
    return static_cast<float>(w) / static_cast<float>(h);
}

void VAMarge::SwapSlots(int a, int b) {
    std::swap(x[a], x[b]);
    std::swap(y[a], y[b]);
    std::swap(width[a], width[b]);
    std::swap(height[a], height[b]);
    std::swap(val[a], val[b]);
    std::swap(isFace[a], isFace[b]);
    std::swap(direction[a], direction[b]);
    std::swap(importance[a], importance[b]);
    std::swap(aspect[a], aspect[b]);
}

void VAMarge::ReAdjust(int gw, int gh, unsigned int forceMain) {
    gridArea = gw * gh;
    const float fgw = static_cast<float>(gw);
    const float fgh = static_cast<float>(gh);
    const float diagonalLength = std::sqrt(fgw * fgw + fgh * fgh);
    const float reach = 0.35f * diagonalLength;
    const float centreX = fgw * 0.5f;
    const float centreY = fgh * 0.5f;
    const float sizeUnit = static_cast<float>(gridArea) / 64.0f;

    for (int i = 0; i < num; ++i) {
        const float dx = (static_cast<float>(x[i]) + static_cast<float>(width[i]) * 0.5f) - centreX;
        const float dy = (static_cast<float>(y[i]) + static_cast<float>(height[i]) * 0.5f) - centreY;
        const float dist = std::sqrt(dx * dx + dy * dy);
        float position = (reach - dist) / reach;
        if (position < 0.1f) position = 0.1f;
        float size = static_cast<float>(width[i] * height[i]) / sizeUnit;
        if (size > 1.0f) size = 1.0f;
        float value;
        if (val[i] < 0) {
            value = 0.0f;
        } else if (val[i] < 255) {
            value = static_cast<float>(val[i]) / 255.0f;
        } else {
            value = 1.0f;
        }
        importance[i] = value * position * size;
    }

    // Bubble sort from the back; equal importances keep their order.
    for (int i = 0; i + 1 < num; ++i) {
        for (int j = num - 1; j > i; --j) {
            if (importance[j - 1] < importance[j]) SwapSlots(j - 1, j);
        }
    }

    mainIndex = 0;
    if (forceMain != static_cast<unsigned int>(CA_NONE_SPECIFIED) &&
        forceMain < static_cast<unsigned int>(num)) {
        mainIndex = static_cast<int32_t>(forceMain);
        if (importance[mainIndex] < kImportanceFloor) importance[mainIndex] = kImportanceFloor;
    }
}

void VAMarge::Marge(int gw, int gh) {
    const int m = mainIndex;
    const int s = secondIndex;
    if (twoSubject && num > 1) {
        int32_t l[2] = {0, 0}, t[2] = {0, 0}, r[2] = {0, 0}, b[2] = {0, 0};
        const int slot[2] = {m, s};
        for (int k = 0; k < 2; ++k) {
            const int i = slot[k];
            if (IsPresent(i)) {
                l[k] = x[i];
                t[k] = y[i];
                r[k] = x[i] + width[i];
                b[k] = y[i] + height[i];
            }
        }
        mergeLeft = std::min(l[0], l[1]);
        mergeTop = std::min(t[0], t[1]);
        mergeRight = std::max(r[0], r[1]);
        mergeBottom = std::max(b[0], b[1]);
    } else if (singleMain) {
        mergeLeft = mergeTop = mergeRight = mergeBottom = 0;
        if (IsPresent(m)) {
            mergeLeft = x[m];
            mergeTop = y[m];
            mergeRight = x[m] + width[m];
            mergeBottom = y[m] + height[m];
        }
    } else {
        mergeLeft = gw;
        mergeTop = gh;
        mergeRight = 0;
        mergeBottom = 0;
        for (int i = 0; i < num; ++i) {
            if (!IsPresent(i) || width[i] * height[i] == 0) continue;
            mergeLeft = std::min(mergeLeft, x[i]);
            mergeTop = std::min(mergeTop, y[i]);
            mergeRight = std::max(mergeRight, x[i] + width[i]);
            mergeBottom = std::max(mergeBottom, y[i] + height[i]);
        }
    }

    const int32_t boxWidth = mergeRight - mergeLeft;
    const int32_t boxHeight = mergeBottom - mergeTop;
    for (int i = 0; i < num; ++i) {
        aspect[i] = IsPresent(i) ? AspectOf(width[i], height[i]) : AspectOf(boxWidth, boxHeight);
    }
    mergeArea = boxWidth * boxHeight;

    const bool mainPresent = IsPresent(m);
    mainSize = mainPresent ? width[m] * height[m] : mergeArea;
    subjectRatio = mainPresent ? static_cast<float>(mainSize) / static_cast<float>(gridArea) : 1.0f;

    if (subjectRatio < kSubjectRatioLow) {
        smallSubjectFactor = 1.0f;
    } else if (subjectRatio < kSubjectRatioHigh) {
        smallSubjectFactor =
            (kSubjectRatioHigh - subjectRatio) / (kSubjectRatioHigh - kSubjectRatioLow);
    } else {
        smallSubjectFactor = 0.0f;
    }

    const float a = aspect[m];
    if (a <= kThinLimit) {
        shapeFactor = a / kThinLimit;
    } else if (a < kWideLimit) {
        shapeFactor = 1.0f;
    } else if (a > kWideLimit && a < 3.33f) {
        shapeFactor = 1.0f - (a - kWideLimit) / kThinLimit;
    } else {
        shapeFactor = 0.0f;  // also exactly kWideLimit
    }

    sizeFactor = subjectRatio < kSmallSizeLimit ? subjectRatio / kSmallSizeLimit : 1.0f;
}
