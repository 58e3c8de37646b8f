#include "calib/src/framing/framing_energy.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "calib/src/framing/framing_search.h"
#include "calib/src/framing/va_marge.h"
#include "common/src/internal/portable_math.h"

// The per-area helpers run for every area of every candidate; inlined, the
// independent exponentials of several areas overlap in the pipeline.
#define FRAMING_INLINE inline __attribute__((always_inline))

namespace CA {

void SetFuncCoef(ObjectFunction* of, const VAMarge* va) {
    const float ratio = va->subjectRatio;
    const float lo = VAMarge::kSubjectRatioLow;
    const float hi = VAMarge::kSubjectRatioHigh;
    const float wmin = of->weightMin;
    const float wmax = of->weightMax;
    float consistency;
    if (ratio < lo) {
        consistency = wmin;
    } else if (ratio >= hi) {
        consistency = wmax;
    } else {
        consistency = wmin + (ratio - lo) * (wmax - wmin) / (hi - lo);
    }
    if (consistency > wmax) consistency = wmax;
    of->consistencyWeight = consistency;
    of->insideWeight = 1.0f;
    of->mainCutWeight = 1.0f;
    of->compositionWeight = 4.0f - (consistency + of->insideWeight + of->mainCutWeight);
}

int32_t Overlap(const CropRegion* crop, int32_t l, int32_t t, int32_t r, int32_t b) {
    const int32_t cl = crop->left;
    const int32_t ct = crop->top;
    const int32_t cr = cl + crop->width;
    const int32_t cb = ct + crop->height;
    if (t < ct && cb < b && ((cl < l && l < cr && cr < r) || (l < cl && cl < r && r < cr))) {
        return 0;
    }
    const int32_t iw = std::min(cr, r) - std::max(cl, l);
    const int32_t ih = std::min(cb, b) - std::max(ct, t);
    if (iw <= 0 || ih <= 0) return 0;
    return iw * ih;
}

namespace {

float Distance(float dx, float dy) { return std::sqrt(dx * dx + dy * dy); }

// exp(-d / diag): closeness of a distance measured against the crop diagonal.
float Closeness(float d, float diag) { return lmk::ExpF(-d / diag); }

float CropDiagonal(const CropRegion* crop) {
    const float w = static_cast<float>(crop->width);
    const float h = static_cast<float>(crop->height);
    return std::sqrt(w * w + h * h);
}

// How much an area counts as a point, a vertical line or a horizontal line.
struct ShapeClass {
    float point;
    float vertical;
    float horizontal;
};

FRAMING_INLINE ShapeClass ShapeOf(const FramingSearch* fs, const VAMarge* va, int i) {
    if (static_cast<float>(va->width[i]) < 0.25f * static_cast<float>(fs->W) &&
        static_cast<float>(va->height[i]) < 0.25f * static_cast<float>(fs->H)) {
        return {1.0f, 0.0f, 0.0f};
    }
    const float a = va->aspect[i];
    if (a < VAMarge::kThinLimit) return {0.0f, 1.0f, 0.0f};
    if (a < VAMarge::kSquareBandLow) {
        const float v = (VAMarge::kSquareBandLow - a) / (VAMarge::kSquareBandLow - VAMarge::kThinLimit);
        return {1.0f - v, v, 0.0f};
    }
    if (a < VAMarge::kSquareBandHigh) return {1.0f, 0.0f, 0.0f};
    if (a < VAMarge::kWideLimit) {
        const float h = (a - VAMarge::kSquareBandHigh) / (VAMarge::kWideLimit - VAMarge::kSquareBandHigh);
        return {1.0f - h, 0.0f, h};
    }
    return {0.0f, 0.0f, 1.0f};
}

// Third lines and power points of the crop.
struct Thirds {
    float x1, x2;  // vertical third lines
    int32_t y1, y2;  // horizontal third lines
};

Thirds ThirdsOf(const CropRegion* crop) {
    const float w3 = static_cast<float>(crop->width) / 3.0f;
    const float h3 = static_cast<float>(crop->height) / 3.0f;
    const float left = static_cast<float>(crop->left);
    const float top = static_cast<float>(crop->top);
    Thirds t;
    t.x1 = left + w3;
    t.x2 = left + 2.0f * w3;
    t.y1 = static_cast<int32_t>(top + h3);
    t.y2 = static_cast<int32_t>(top + h3 + h3);
    return t;
}

// Everything the composition needs of one area against one crop. Distances
// are kept squared and rooted only where needed: the rounded square root is
// monotonic, so the root of the smallest square is exactly the smallest root.
struct AreaFit {
    ShapeClass shape;
    int32_t ax, ay;  // anchor
    float sq[4];     // squared distances to P1 (x1,y1), P2 (x2,y1), P3 (x1,y2), P4 (x2,y2)
    float target;    // distance to the target point of the composition rule
    float D(int k) const { return std::sqrt(sq[k]); }
};

void AnchorOf(const VAMarge* va, int i, int32_t* ax, int32_t* ay) {
    if (va->IsPresent(i)) {
        *ax = (va->x[i] + va->x[i] + va->width[i]) >> 1;
        *ay = (va->y[i] + va->y[i] + va->height[i]) >> 1;
    } else {
        *ax = (va->mergeLeft + va->mergeRight) >> 1;
        *ay = (va->mergeTop + va->mergeBottom) >> 1;
    }
}

float Min2(float a, float b) { return b < a ? b : a; }

FRAMING_INLINE AreaFit FitArea(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop,
                const Thirds& th, int i) {
    AreaFit f;
    f.shape = ShapeOf(fs, va, i);
    AnchorOf(va, i, &f.ax, &f.ay);
    const float ax = static_cast<float>(f.ax);
    const float ay = static_cast<float>(f.ay);
    const float dx1 = th.x1 - ax;
    const float dx2 = th.x2 - ax;
    const float dy1 = static_cast<float>(th.y1) - ay;
    const float dy2 = static_cast<float>(th.y2) - ay;
    f.sq[0] = dx1 * dx1 + dy1 * dy1;
    f.sq[1] = dx2 * dx2 + dy1 * dy1;
    f.sq[2] = dx1 * dx1 + dy2 * dy2;
    f.sq[3] = dx2 * dx2 + dy2 * dy2;

    float targetSq;
    if (va->centre) {
        const float cx = static_cast<float>(crop->left + crop->left + crop->width) * 0.5f;
        const float cy = static_cast<float>(crop->top + crop->top + crop->height) * 0.5f;
        const float bx = static_cast<float>((va->mergeLeft + va->mergeRight) >> 1);
        const float by = static_cast<float>((va->mergeTop + va->mergeBottom) >> 1);
        targetSq = (cx - bx) * (cx - bx) + (cy - by) * (cy - by);
    } else if (va->isFace[0]) {
        // Leave room in the direction the main face looks.
        const int m = va->mainIndex;
        switch (va->direction[m]) {
            case 1: targetSq = f.sq[0]; break;
            case 2: targetSq = f.sq[2]; break;
            case 3: targetSq = Min2(f.sq[2], f.sq[3]); break;
            case 4: targetSq = f.sq[3]; break;
            case 5:
            case 6: targetSq = f.sq[1]; break;
            case 7: targetSq = Min2(f.sq[0], f.sq[1]); break;
            case 8: targetSq = f.sq[0]; break;
            default: {
                const int32_t mainBottom = va->y[m] + va->height[m];
                const int32_t margin = static_cast<int32_t>(0.15f * static_cast<float>(fs->H));
                targetSq = margin <= fs->H - mainBottom ? Min2(f.sq[0], f.sq[1])
                                                        : Min2(f.sq[2], f.sq[3]);
                break;
            }
        }
    } else {
        targetSq = Min2(Min2(f.sq[0], f.sq[1]), Min2(f.sq[2], f.sq[3]));
    }
    f.target = std::sqrt(targetSq);
    return f;
}

// Distance to the nearer vertical third line, plus the mean distance to its two power points.
float VerticalLineDistance(const Thirds& th, const AreaFit& f) {
    const int32_t dv1 = std::abs(static_cast<int32_t>(th.x1) - f.ax);
    const int32_t dv2 = std::abs(static_cast<int32_t>(th.x2) - f.ax);
    if (dv2 < dv1) return static_cast<float>(dv2) + (f.D(1) + f.D(3)) / 2.0f;
    return static_cast<float>(dv1) + (f.D(0) + f.D(2)) / 2.0f;
}

float HorizontalLineDistance(const Thirds& th, const AreaFit& f) {
    const int32_t dh1 = std::abs(th.y1 - f.ay);
    const int32_t dh2 = std::abs(th.y2 - f.ay);
    if (dh2 < dh1) return static_cast<float>(dh2) + (f.D(2) + f.D(3)) / 2.0f;
    return static_cast<float>(dh1) + (f.D(0) + f.D(1)) / 2.0f;
}

// point * eT^2 + vertical * eV^2 + horizontal * eH^2. A zero weight adds an
// exact zero, so its closeness is not computed.
FRAMING_INLINE float SquaredShapeScore(const Thirds& th, const AreaFit& f, float diag) {
    const float eT = Closeness(f.target, diag);
    float score = f.shape.point * (eT * eT);
    if (f.shape.vertical != 0.0f) {
        const float eV = Closeness(VerticalLineDistance(th, f), diag);
        score += f.shape.vertical * (eV * eV);
    }
    if (f.shape.horizontal != 0.0f) {
        const float eH = Closeness(HorizontalLineDistance(th, f), diag);
        score += f.shape.horizontal * (eH * eH);
    }
    return score;
}

}  // namespace

float CalcCompEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop) {
    const int n = va->num;
    if (n <= 0) return 0.0f;
    const float diag = CropDiagonal(crop);
    if (diag == 0.0f) return 0.0f;  // a crop without extent composes nothing
    const Thirds th = ThirdsOf(crop);
    const int m = va->mainIndex;
    const int s = va->secondIndex;

    if (va->centre) {
        return Closeness(FitArea(fs, va, crop, th, m).target, diag);
    }
    if (!va->singleMain && !va->twoSubject && !va->diagonal) {
        float weighted = 0.0f;
        float total = 0.0f;
        for (int i = 0; i < n; ++i) {
            total += va->importance[i];
            // A zero importance adds an exact zero whatever the score.
            if (va->importance[i] == 0.0f) continue;
            const AreaFit f = FitArea(fs, va, crop, th, i);
            weighted += va->importance[i] * SquaredShapeScore(th, f, diag);
        }
        return total == 0.0f ? 0.0f : weighted / total;
    }
    if (va->twoSubject && va->diagonal) {
        if (n < 2) return 0.0f;
        const AreaFit fm = FitArea(fs, va, crop, th, m);
        const AreaFit fs2 = FitArea(fs, va, crop, th, s);
        float em[4], es[4];
        for (int k = 0; k < 4; ++k) {
            em[k] = Closeness(fm.D(k), diag);
            es[k] = Closeness(fs2.D(k), diag);
        }
        float best = em[0] * es[3];
        best = std::max(best, em[3] * es[0]);
        best = std::max(best, em[2] * es[1]);
        best = std::max(best, em[1] * es[2]);
        return best;
    }
    if (va->twoSubject) {
        if (n < 2) return 0.0f;
        const AreaFit fm = FitArea(fs, va, crop, th, m);
        const AreaFit fs2 = FitArea(fs, va, crop, th, s);
        float sum = fm.shape.point * fs2.shape.point * Closeness(fm.target, diag) *
                    Closeness(fs2.target, diag);
        if (fm.shape.vertical != 0.0f && fs2.shape.vertical != 0.0f) {
            sum += fm.shape.vertical * fs2.shape.vertical *
                   Closeness(VerticalLineDistance(th, fm), diag) *
                   Closeness(VerticalLineDistance(th, fs2), diag);
        }
        if (fm.shape.horizontal != 0.0f && fs2.shape.horizontal != 0.0f) {
            sum += fm.shape.horizontal * fs2.shape.horizontal *
                   Closeness(HorizontalLineDistance(th, fm), diag) *
                   Closeness(HorizontalLineDistance(th, fs2), diag);
        }
        return sum;
    }
    // Single main subject.
    if (!va->IsPresent(m)) return 0.0f;
    const AreaFit fm = FitArea(fs, va, crop, th, m);
    if (va->isFace[0]) {
        const float eT = Closeness(fm.target, diag);
        return eT * eT;
    }
    return SquaredShapeScore(th, fm, diag);
}

float CalcConsEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop) {
    if (va->mergeArea == 0) return 0.0f;
    const float diag = CropDiagonal(crop);
    if (diag == 0.0f) return 0.0f;
    const int32_t denominator = va->mergeArea + va->gridArea;
    if (denominator == 0) return 0.0f;

    const int32_t l = crop->left;
    const int32_t t = crop->top;
    const int32_t r = l + crop->width;
    const int32_t b = t + crop->height;
    const float cx = static_cast<float>((l + r) >> 1);
    const float cy = static_cast<float>((t + b) >> 1);
    const float bx = static_cast<float>((va->mergeLeft + va->mergeRight) >> 1);
    const float by = static_cast<float>((va->mergeTop + va->mergeBottom) >> 1);
    const float gx = static_cast<float>(fs->gw >> 1);
    const float gy = static_cast<float>(fs->gh >> 1);
    const float e1 = Closeness(Distance(cx - bx, cy - by), diag);
    const float e2 = Closeness(Distance(cx - gx, cy - gy), diag);

    const int32_t overlap = Overlap(crop, va->mergeLeft, va->mergeTop, va->mergeRight, va->mergeBottom);
    const float share = static_cast<float>(overlap + crop->width * crop->height) /
                        static_cast<float>(denominator);
    return share * (e1 * e1) * (e2 * e2) * va->shapeFactor * va->sizeFactor;
}

float CalcPenCIEnergy(const FramingSearch* fs, const CropRegion* crop) {
    if (crop->left < 0 || crop->left + crop->width > fs->W || crop->top < 0 ||
        crop->top + crop->height > fs->H) {
        return 1.0f;
    }
    return 0.0f;
}

float CalcPenMCEnergy(const FramingSearch* fs, const VAMarge* va, const CropRegion* crop) {
    (void)fs;
    const int m = va->mainIndex;
    const int32_t overlap =
        Overlap(crop, va->x[m], va->y[m], va->x[m] + va->width[m], va->y[m] + va->height[m]);
    float cut = 0.0f;
    if (va->mainSize != 0) {
        cut = static_cast<float>(va->mainSize - overlap) / static_cast<float>(va->mainSize);
    }
    if (cut < VAMarge::kCutRampStart) {
        cut = 0.0f;
    } else if (cut >= VAMarge::kCutRampEnd) {
        cut = 1.0f;
    }

    const int32_t cropArea = crop->width * crop->height;
    const float q = cropArea == 0 ? 0.0f
                                  : static_cast<float>(va->mergeArea) / static_cast<float>(cropArea);
    float box;
    if (q < VAMarge::kBoxRatioLow) {
        box = (VAMarge::kBoxRatioLow - q) / VAMarge::kBoxRatioLow;
    } else if (q < VAMarge::kBoxRatioHigh) {
        box = 0.0f;
    } else if (q < 1.0f) {
        box = (q - VAMarge::kBoxRatioHigh) / VAMarge::kBoxRatioHigh;
    } else {
        box = 1.0f;
    }
    return (cut + (1.0f - cut) * box) * va->smallSubjectFactor;
}

double CalcEnergy(const FramingSearch* fs, const VAMarge* va, const ObjectFunction* of,
                  CropRegion* crop) {
    crop->composition = CalcCompEnergy(fs, va, crop);
    crop->consistency = CalcConsEnergy(fs, va, crop);
    crop->penaltyInside = CalcPenCIEnergy(fs, crop);
    crop->penaltyMainCut = CalcPenMCEnergy(fs, va, crop);
    const float e = of->consistencyWeight * (1.0f - crop->consistency) +
                    of->compositionWeight * (1.0f - crop->composition) +
                    of->insideWeight * crop->penaltyInside +
                    of->mainCutWeight * crop->penaltyMainCut;
    crop->energy = static_cast<double>(e);
    return crop->energy;
}

}  // namespace CA
