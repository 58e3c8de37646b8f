#include "calib/src/arrange/va_arrange.h"

#include <algorithm>
#include <cmath>
#include <utility>
#include <cstring>

#include "calib/src/CALib/ca_common.h"

namespace {

constexpr int kHueBins = 180;
// A step of growth needs this mean saturation (or red) in its quadrant.
constexpr int kCriterionMin = 180;
// Hues closer than this are alike.
constexpr int kHueTolerance = 6;

struct Rect {
    int32_t x0, x1, y0, y1;  // columns x0..x1-1, rows y0..y1-1
};

// Statistics of one rectangle of the HSV copy (and of the reference for red).
class HsvStats {
public:
    HsvStats(const _zbm_Image* hsv, const _zbm_Image* ref, int32_t redOffset)
        : hsv_(hsv), ref_(ref), redOffset_(redOffset) {}

    // Dominant hue: the fullest of the 180 bins of stored hues 0..179, the
    // highest bin among equals (179 for no counted pixel).
    int32_t Hue(const Rect& r) const {
        int32_t hist[kHueBins];
        std::memset(hist, 0, sizeof hist);
        ForEach(r, [&](int32_t x, int32_t y) {
            const uint8_t h = ZbiuGetConstPointer(hsv_, x, y)[0];
            if (h < kHueBins) ++hist[h];
        });
        int32_t best = kHueBins - 1;
        for (int32_t b = kHueBins - 1; b >= 0; --b) {
            if (hist[b] > hist[best]) best = b;
        }
        return best;
    }

    // floor(mean) of the saturation byte, or of the red byte of the reference.
    int32_t Mean(const Rect& r, bool red) const {
        int64_t sum = 0, count = 0;
        ForEach(r, [&](int32_t x, int32_t y) {
            sum += red ? ZbiuGetConstPointer(ref_, x, y)[redOffset_] : ZbiuGetConstPointer(hsv_, x, y)[1];
            ++count;
        });
        return count == 0 ? 0 : static_cast<int32_t>(sum / count);
    }

    uint8_t HueAt(int32_t x, int32_t y) const { return ZbiuGetConstPointer(hsv_, x, y)[0]; }
    bool Inside(int32_t x, int32_t y) const { return x >= 0 && y >= 0 && x < hsv_->width && y < hsv_->height; }

private:
    template <typename F>
    void ForEach(const Rect& r, F f) const {
        const int32_t x0 = r.x0 < 0 ? 0 : r.x0, y0 = r.y0 < 0 ? 0 : r.y0;
        const int32_t x1 = r.x1 > hsv_->width ? hsv_->width : r.x1;
        const int32_t y1 = r.y1 > hsv_->height ? hsv_->height : r.y1;
        for (int32_t y = y0; y < y1; ++y) {
            for (int32_t x = x0; x < x1; ++x) f(x, y);
        }
    }

    const _zbm_Image* hsv_;
    const _zbm_Image* ref_;
    int32_t redOffset_;
};

enum Quadrant { kQ00, kQ01, kQ10, kQ11 };

Rect QuadrantOf(int32_t x, int32_t y, int32_t w, int32_t h, Quadrant q) {
    const int32_t xm = (2 * x + w) / 2, ym = (2 * y + h) / 2;
    switch (q) {
        case kQ00: return Rect{x, xm, y, ym};
        case kQ01: return Rect{xm, x + w, y, ym};
        case kQ10: return Rect{x, xm, ym, y + h};
        default: return Rect{xm, x + w, ym, y + h};
    }
}

int32_t Area(int32_t w, int32_t h) { return w * h; }

}  // namespace

VAArrange::VAArrange() : scaleX(0.0f), scaleY(0.0f) {}

VAArrange::~VAArrange() = default;

namespace {
int32_t CountValid(const VA& va) {
    int32_t n = 0;
    for (int i = 0; i < VA::kMaxAreas; ++i) {
        if (va.width[i] * va.height[i] != 0 && va.val[i] >= 1) ++n;
    }
    return n;
}
}  // namespace

void VAArrange::AdjustVa(const _zbm_Image* reference, const _zbm_Image* saliencyMap) {
    num = CountValid(*this);
    if (reference == nullptr) return;
    const int32_t mapW = saliencyMap ? saliencyMap->width : reference->width;
    const int32_t mapH = saliencyMap ? saliencyMap->height : reference->height;
    if (isFace[0]) {
        for (int i = 0; i < num; ++i) {
            float xs = static_cast<float>(x[i]) - 0.25f * static_cast<float>(width[i]);
            float ys = static_cast<float>(y[i]) - 0.25f * static_cast<float>(height[i]);
            float ws = 1.5f * static_cast<float>(width[i]);
            float hs = 1.5f * static_cast<float>(height[i]);
            if (xs < 0.0f) {
                ws += xs;
                xs = 0.0f;
            }
            if (ys < 0.0f) {
                hs += ys;
                ys = 0.0f;
            }
            ws = std::fmin(ws, static_cast<float>(mapW) - xs);
            hs = std::fmin(hs, static_cast<float>(mapH) - ys);
            x[i] = static_cast<int32_t>(xs);
            y[i] = static_cast<int32_t>(ys);
            width[i] = static_cast<int32_t>(ws);
            height[i] = static_cast<int32_t>(hs);
        }
    }
    scaleX = static_cast<float>(reference->width) / static_cast<float>(mapW);
    scaleY = static_cast<float>(reference->height) / static_cast<float>(mapH);
    for (int i = 0; i < num; ++i) {
        x[i] = static_cast<int32_t>(std::floor(0.5f + scaleX * static_cast<float>(x[i])));
        y[i] = static_cast<int32_t>(std::floor(0.5f + scaleY * static_cast<float>(y[i])));
        const int32_t w = static_cast<int32_t>(std::floor(0.5f + scaleX * static_cast<float>(width[i])));
        const int32_t h = static_cast<int32_t>(std::floor(0.5f + scaleY * static_cast<float>(height[i])));
        width[i] = reference->width - x[i] < w ? reference->width - x[i] : w;
        height[i] = reference->height - y[i] < h ? reference->height - y[i] : h;
    }
}

uint32_t VAArrange::RectCombine(const _zbm_Image* reference) {
    if (reference == nullptr) return 0;
    ZbmImagePtr hsv(ZbiuCreate(reference->width, reference->height, reference->order));
    if (!hsv) {
        CA::ReportFailed("RectCombine", __LINE__, "ZbiuCreate");
        return 2;
    }
    int32_t ro = 0, go = 1, bo = 2;
    ZbiuGetRgbOffset(reference->order, &ro, &go, &bo, nullptr);
    const int32_t W = reference->width, H = reference->height;
    int64_t satAll = 0, redAll = 0, satCenter = 0, redCenter = 0;
    const int32_t qw = W / 4, qh = H / 4;
    for (int32_t yy = 0; yy < H; ++yy) {
        for (int32_t xx = 0; xx < W; ++xx) {
            const uint8_t* p = ZbiuGetConstPointer(reference, xx, yy);
            int h, s, v;
            rgb2hsv(p[ro], p[go], p[bo], &h, &s, &v);
            uint8_t* q = ZbiuGetPointer(hsv.get(), xx, yy);
            q[0] = static_cast<uint8_t>(h);
            q[1] = static_cast<uint8_t>(s);
            q[2] = static_cast<uint8_t>(v);
            satAll += q[1];
            redAll += p[ro];
            if (yy >= qh && yy < 3 * qh && xx >= qw && xx < 3 * qw) {
                satCenter += q[1];
                redCenter += p[ro];
            }
        }
    }
    const int32_t nc = (W * H) / 4, no = W * H - nc;
    const float satRatio = (static_cast<float>(satCenter) / static_cast<float>(nc)) /
                           (static_cast<float>(satAll - satCenter) / static_cast<float>(no));
    const float redRatio = (static_cast<float>(redCenter) / static_cast<float>(nc)) /
                           (static_cast<float>(redAll - redCenter) / static_cast<float>(no));
    const bool useRed = satRatio < redRatio;
    const HsvStats stats(hsv.get(), reference, ro);

    auto step = [&](int i, int32_t c, int32_t r, Quadrant q) {
        if (c < 1 || r < 1 || !stats.Inside(c, r)) return false;
        const Rect quad = QuadrantOf(x[i], y[i], width[i], height[i], q);
        if (stats.Mean(quad, useRed) < kCriterionMin) return false;
        const int32_t d = static_cast<int32_t>(stats.HueAt(c, r)) - stats.Hue(quad);
        return (d < 0 ? -d : d) < kHueTolerance;
    };

    for (int i = 0; i < num && i < kMaxAreas; ++i) {
        // Top edge, upward.
        for (int32_t c = x[i]; c < x[i] + width[i]; ++c) {
            while (step(i, c, y[i], c < x[i] + width[i] / 2 ? kQ00 : kQ01)) {
                y[i] = y[i] - 1 > 0 ? y[i] - 1 : 0;
                height[i] = height[i] + 1 < H - y[i] ? height[i] + 1 : H - y[i];
            }
        }
        // Left edge, leftward.
        for (int32_t r = y[i]; r < y[i] + height[i]; ++r) {
            while (step(i, x[i], r, r < y[i] + height[i] / 2 ? kQ00 : kQ10)) {
                x[i] = x[i] - 1 > 0 ? x[i] - 1 : 0;
                width[i] = width[i] + 1 < W - x[i] ? width[i] + 1 : W - x[i];
            }
        }
        // Bottom edge, downward.
        for (int32_t r = y[i] + height[i] - 1; r < y[i] + height[i]; ++r) {
            for (int32_t c = x[i]; c < x[i] + width[i]; ++c) {
                if (step(i, c, r, c < x[i] + width[i] / 2 ? kQ10 : kQ11)) {
                    height[i] = height[i] + 1 < H - y[i] ? height[i] + 1 : H - y[i];
                }
            }
        }
        // Right edge, rightward.
        for (int32_t r = y[i]; r < y[i] + height[i]; ++r) {
            for (int32_t c = x[i] + width[i] - 1; c < x[i] + width[i]; ++c) {
                if (step(i, c, r, r < y[i] + height[i] / 2 ? kQ01 : kQ11)) {
                    width[i] = width[i] + 1 < W - x[i] ? width[i] + 1 : W - x[i];
                }
            }
        }
    }

    // Merging: after each merge the scan starts again from the first pair.
    bool merged = true;
    while (merged) {
        merged = false;
        for (int i = 0; i < kMaxAreas - 1 && !merged; ++i) {
            for (int j = i + 1; j < kMaxAreas && !merged; ++j) {
                if (val[i] < 1 || val[j] < 1) continue;
                const int32_t dx = (x[i] + width[i] / 2) - (x[j] + width[j] / 2);
                const int32_t dy = (y[i] + height[i] / 2) - (y[j] + height[j] / 2);
                const float d = std::sqrt(static_cast<float>(dx * dx + dy * dy));
                const float di = std::sqrt(static_cast<float>(width[i] * width[i] + height[i] * height[i]));
                const float dj = std::sqrt(static_cast<float>(width[j] * width[j] + height[j] * height[j]));
                if (!(d <= 0.5f * (di > dj ? di : dj))) continue;
                const int32_t hi = stats.Hue(Rect{x[i], x[i] + width[i], y[i], y[i] + height[i]});
                const int32_t hj = stats.Hue(Rect{x[j], x[j] + width[j], y[j], y[j] + height[j]});
                if ((hi > hj ? hi - hj : hj - hi) >= kHueTolerance) continue;
                const int32_t ai = Area(width[i], height[i]), aj = Area(width[j], height[j]);
                const int32_t right = std::max(x[i] + width[i], x[j] + width[j]);
                const int32_t bottom = std::max(y[i] + height[i], y[j] + height[j]);
                x[j] = std::min(x[i], x[j]);
                y[j] = std::min(y[i], y[j]);
                width[j] = right - x[j];
                height[j] = bottom - y[j];
                // Two empty rectangles have no weights: keep the mean of the values.
                val[j] = ai + aj != 0 ? (val[i] * ai + val[j] * aj) / (ai + aj) : (val[i] + val[j]) / 2;
                val[i] = 0;
                merged = true;
            }
        }
    }
    return 0;
}

void VAArrange::ReAdjustVa(const _zbm_Image* reference) {
    num = CountValid(*this);
    // Stable exchange sort: neighbours swap only when the later one is larger.
    for (int pass = 0; pass < kMaxAreas - 1; ++pass) {
        for (int i = 0; i < kMaxAreas - 1 - pass; ++i) {
            if (val[i + 1] <= val[i]) continue;
            std::swap(x[i], x[i + 1]);
            std::swap(y[i], y[i + 1]);
            std::swap(width[i], width[i + 1]);
            std::swap(height[i], height[i + 1]);
            std::swap(val[i], val[i + 1]);
            std::swap(isFace[i], isFace[i + 1]);
            std::swap(direction[i], direction[i + 1]);
        }
    }
    if (reference == nullptr) return;
    for (int i = 0; i < num; ++i) {
        if (x[i] + width[i] > reference->width) width[i] = reference->width - x[i];
        if (y[i] + height[i] > reference->height) height[i] = reference->height - y[i];
    }
}
