#include "ktlib/src/finger/fol_region.h"

#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"
#include "common/src/internal/portable_math.h"

#include <cmath>

namespace FOL {

namespace {

bool Resize(zbmvector<float>& table, int32_t n) { return table.Resize(n) != 0; }

// Neighbour offsets, numbered clockwise from the upper left.
const int32_t kDx[8] = {-1, 0, 1, 1, 1, 0, -1, -1};
const int32_t kDy[8] = {-1, -1, -1, 0, 1, 1, 1, 0};

}  // namespace

zbm_Pos ImageBound::NextPointOnImageEdgeClockwise(zbm_Pos p) const {
    if (p.y == 0 && p.x < width_ - 1) return zbm_Pos{p.x + 1, 0};
    if (p.x == width_ - 1 && p.y < height_ - 1) return zbm_Pos{p.x, p.y + 1};
    if (p.y == height_ - 1 && p.x > 0) return zbm_Pos{p.x - 1, p.y};
    if (p.x == 0 && p.y > 0) return zbm_Pos{0, p.y - 1};
    return p;
}

zbm_Pos ImageBound::NextPointOnImageEdgeCounterClockwise(zbm_Pos p) const {
    if (p.x == 0 && p.y < height_ - 1) return zbm_Pos{0, p.y + 1};
    if (p.y == height_ - 1 && p.x < width_ - 1) return zbm_Pos{p.x + 1, p.y};
    if (p.x == width_ - 1 && p.y > 0) return zbm_Pos{p.x, p.y - 1};
    if (p.y == 0 && p.x > 0) return zbm_Pos{p.x - 1, 0};
    return p;
}

float CalcFingerProbability_rc4800_RGBT_r1_step20_LINEAR_REGRESSION_GK_GEN(const float* features) {
    const double r = features[0], g = features[1], b = features[2], t = features[3];
    const double dg = g - 51.901126;
    const double dt = t - 14.209118;
    const double bb = b + 36.550803;
    const double b114 = b - 114.0;
    const double r41 = r - 41.0;
    const double p = 0.096845 - 0.132141 * lmk::Exp(-11904.761904761905 * (dg * dg)) -
                     0.204944 * lmk::Exp(-5.56192055007202e-5 * (dt * dt)) +
                     0.305422 * lmk::Exp(-0.009031199642877467 * (t * t)) -
                     0.263602 * lmk::Exp(-0.0004722303002724437 * (t * t + r * r)) +
                     0.370642 * lmk::Exp(-5.3718628422261016e-5 * (bb * bb + g * g)) +
                     0.184849 * lmk::Exp(-0.00016785395554792045 * (b114 * b114)) -
                     0.276746 * lmk::Exp(-0.00011785740402115271 * (r41 * r41));
    return static_cast<float>(p);
}

FingerLiklihood DefaultFingerLiklihood() {
    FingerLiklihood model = {CalcFingerProbability_rc4800_RGBT_r1_step20_LINEAR_REGRESSION_GK_GEN, 0.1f};
    return model;
}

int CalcTextureTable(const _zbm_Image* image, zbmvector<float>& table) {
    const int32_t w = image->width, h = image->height;
    if (!Resize(table, w * h)) return KT_ERR_NO_MEMORY;
    int32_t ro, go, bo;
    ZbiuGetRgbOffset(image->order, &ro, &go, &bo, nullptr);
    const int32_t offsets[3] = {ro, go, bo};
    const double weights[3] = {0.299, 0.587, 0.114};
    for (int32_t y = 0; y < h; ++y) {
        const int32_t y0 = y > 0 ? y - 1 : 0, y1 = y < h - 1 ? y + 1 : h - 1;
        for (int32_t x = 0; x < w; ++x) {
            const int32_t x0 = x > 0 ? x - 1 : 0, x1 = x < w - 1 ? x + 1 : w - 1;
            const double n = static_cast<double>((x1 - x0 + 1) * (y1 - y0 + 1));
            double t = 0.0;
            const int32_t bpp = image->bytesPerPixel;
            for (int32_t c = 0; c < 3; ++c) {
                int32_t sum = 0;
                for (int32_t yy = y0; yy <= y1; ++yy) {
                    const uint8_t* row = image->pData + yy * image->pitch + offsets[c];
                    for (int32_t xx = x0; xx <= x1; ++xx) sum += row[xx * bpp];
                }
                const double mean = sum / n;
                double sq = 0.0;
                for (int32_t yy = y0; yy <= y1; ++yy) {
                    const uint8_t* row = image->pData + yy * image->pitch + offsets[c];
                    for (int32_t xx = x0; xx <= x1; ++xx) {
                        const double d = mean - row[xx * bpp];
                        sq += d * d;
                    }
                }
                t += weights[c] * std::sqrt(sq / n);
            }
            table[y * w + x] = static_cast<float>(t < 0.0 ? 0.0 : (t > 20.0 ? 20.0 : t));
        }
    }
    return KT_OK;
}

int CalcFingerTable(const _zbm_Image* image, const zbmvector<float>& texture, FingerProbabilityFunction model,
                    zbmvector<float>& table) {
    const int32_t w = image->width, h = image->height;
    if (!Resize(table, w * h)) return KT_ERR_NO_MEMORY;
    int32_t ro, go, bo;
    ZbiuGetRgbOffset(image->order, &ro, &go, &bo, nullptr);
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            const uint8_t* p = ZbiuGetConstPointer(image, x, y);
            const float features[4] = {static_cast<float>(p[ro]), static_cast<float>(p[go]), static_cast<float>(p[bo]),
                                       texture[y * w + x]};
            const float v = model(features);
            table[y * w + x] = v < -0.25f ? -0.25f : (v > 0.75f ? 0.75f : v);
        }
    }
    return KT_OK;
}

int CalcHVEdgeTable(const zbmvector<float>& p, int32_t w, int32_t h, zbmvector<float>& horizontal,
                    zbmvector<float>& vertical) {
    if (!Resize(horizontal, w * h) || !Resize(vertical, w * h)) return KT_ERR_NO_MEMORY;
    for (int32_t i = 0; i < w * h; ++i) horizontal[i] = vertical[i] = 0.0f;
    for (int32_t y = 1; y < h - 1; ++y) {
        for (int32_t x = 1; x < w - 1; ++x) {
            const float* up = &p[(y - 1) * w + x];
            const float* mid = &p[y * w + x];
            const float* down = &p[(y + 1) * w + x];
            horizontal[y * w + x] = 10.0f * (mid[1] - mid[-1]) + 3.0f * (up[1] - up[-1]) + 3.0f * (down[1] - down[-1]);
            vertical[y * w + x] = 10.0f * (down[0] - up[0]) + 3.0f * (down[-1] - up[-1]) + 3.0f * (down[1] - up[1]);
        }
    }
    return KT_OK;
}

int CalcEdgeMagTable(const zbmvector<float>& table, int32_t w, int32_t h, zbmvector<float>& magnitude) {
    zbmvector<float> horizontal, vertical;
    auto release = lmk::MakeScopeGuard([&] {
        horizontal.Clear();
        vertical.Clear();
    });
    int status = CalcHVEdgeTable(table, w, h, horizontal, vertical);
    if (status != KT_OK) return status;
    if (!Resize(magnitude, w * h)) return KT_ERR_NO_MEMORY;
    for (int32_t i = 0; i < w * h; ++i)
        magnitude[i] = std::sqrt(horizontal[i] * horizontal[i] + vertical[i] * vertical[i]);
    return KT_OK;
}

int CalcLabeledFingerTable(const zbmvector<float>& table, int32_t w, int32_t h, float threshold, int32_t& count,
                           zbmvector<int32_t>& labels) {
    count = 0;
    ZbmImagePtr mask(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_GRAY));
    if (!mask) return KT_ERR_NO_MEMORY;
    for (int32_t y = 0; y < h; ++y) {
        uint8_t* row = ZbiuGetPointer(mask.get(), 0, y);
        for (int32_t x = 0; x < w; ++x) row[x] = table[y * w + x] >= threshold ? 255 : 0;
    }
    if (!labels.Resize(w * h)) return KT_ERR_NO_MEMORY;
    return ZbiuLabeling(mask.get(), labels.data, &count);
}

int UpdateLabeledTable(zbmvector<int32_t>& labels, int32_t count, int32_t w, int32_t h, int32_t& acceptedCount,
                       zbmvector<RegionInfo>& regions) {
    acceptedCount = 0;
    if (!regions.Resize(0) || !regions.Resize(count)) return KT_ERR_NO_MEMORY;
    for (int32_t y = 0; y < h; ++y) {
        for (int32_t x = 0; x < w; ++x) {
            const int32_t label = labels[y * w + x];
            if (label <= 0 || label > count) continue;
            RegionInfo& r = regions[label - 1];
            ++r.count;
            r.left += x == 0;
            r.top += y == 0;
            r.right += x == w - 1;
            r.bottom += y == h - 1;
        }
    }
    const int32_t largest = static_cast<int32_t>(0.7f * static_cast<float>(w) * static_cast<float>(h));
    for (int32_t i = 0; i < count; ++i) {
        RegionInfo& r = regions[i];
        const bool l = r.left > 0, t = r.top > 0, rt = r.right > 0, b = r.bottom > 0;
        const bool touches = l || t || rt || b;
        const bool all = l && t && rt && b;
        const bool across = (l && rt && !t && !b) || (t && b && !l && !rt);
        const int32_t needed = static_cast<int32_t>(std::sqrt(static_cast<float>(r.count)) * 0.70710677f);
        const bool enters = needed <= r.left + r.top + r.right + r.bottom;
        // Labels are bytes downstream: regions past the 255th are not taken.
        if (r.count >= 50 && r.count <= largest && touches && !all && !across && enters && acceptedCount < 255) {
            r.accepted = 1;
            r.newLabel = ++acceptedCount;
        }
    }
    for (int32_t i = 0; i < w * h; ++i) {
        const int32_t label = labels[i];
        labels[i] = (label > 0 && label <= count) ? regions[label - 1].newLabel : 0;
    }
    return KT_OK;
}

int FindContourOfRegion(const zbmvector<int32_t>& labels, int32_t w, int32_t h, int32_t label,
                        const RegionInfo& region, zbmvector<zbm_Pos>& contour) {
    contour.Clear();
    const ImageBound bound(w, h);
    auto inRegion = [&](zbm_Pos p) { return bound.IsInImage(p) && labels[p.y * w + p.x] == label; };

    zbm_Pos startCorner, endCorner;
    if (region.left == 0) {
        startCorner = zbm_Pos{0, h - 1};
        endCorner = zbm_Pos{0, 0};
    } else if (region.top == 0) {
        startCorner = zbm_Pos{0, 0};
        endCorner = zbm_Pos{w - 1, 0};
    } else if (region.right == 0) {
        startCorner = zbm_Pos{w - 1, 0};
        endCorner = zbm_Pos{w - 1, h - 1};
    } else {
        startCorner = zbm_Pos{w - 1, h - 1};
        endCorner = zbm_Pos{0, h - 1};
    }
    const int32_t perimeter = 2 * (w + h);
    zbm_Pos start = startCorner, end = endCorner;
    bool found = false;
    for (int32_t i = 0; i < perimeter && !found; ++i) {
        start = bound.NextPointOnImageEdgeCounterClockwise(start);
        found = inRegion(start);
    }
    if (!found) return KT_OK;  // not a border region: no outline
    found = false;
    for (int32_t i = 0; i < perimeter && !found; ++i) {
        end = bound.NextPointOnImageEdgeClockwise(end);
        found = inRegion(end);
    }
    if (!found) return KT_OK;

    int32_t direction;
    if (bound.IsOnLeftEdge(start))
        direction = start.y != 0 ? 1 : 3;
    else if (bound.IsOnTopEdge(start))
        direction = start.x != w - 1 ? 3 : 5;
    else if (bound.IsOnRightEdge(start))
        direction = start.y == h - 1 ? 7 : 5;
    else
        direction = start.x != 0 ? 7 : 1;

    if (!contour.PushBack(start)) return KT_ERR_NO_MEMORY;
    zbm_Pos current = start;
    // An outline visits each pixel of the region a few times at most.
    const int32_t limit = 4 * region.count + 8;
    for (int32_t steps = 0; !ImageBound::IsNeighbour8(current, end) && steps < limit; ++steps) {
        int32_t moved = -1;
        for (int32_t k = 0; k < 8; ++k) {
            const int32_t d = (direction + k) & 7;
            const zbm_Pos next = {current.x + kDx[d], current.y + kDy[d]};
            if (inRegion(next)) {
                moved = d;
                current = next;
                break;
            }
        }
        if (moved < 0) break;  // a single pixel: nowhere to go
        if (!contour.PushBack(current)) return KT_ERR_NO_MEMORY;
        direction = moved == 0 || moved == 7 ? 6 : (moved <= 2 ? 0 : (moved <= 4 ? 2 : 4));
    }
    if (!contour.PushBack(end)) return KT_ERR_NO_MEMORY;
    return KT_OK;
}

void Detector::Clear() {
    texture_.Clear();
    finger_.Clear();
    edge_.Clear();
    labels_.Clear();
    regions_.Clear();
    image_ = nullptr;
}

int Detector::DetectInitialRegions(const _zbm_Image* image, const FingerLiklihood& model,
                                   zbmvector<zbmvector<zbm_Pos>>& contours) {
    contours.Clear();
    Clear();
    if (!image || !image->pData || image->order != ZBM_PIXEL_ORDER_RGB) return KT_ERR_STATE;
    image_ = image;
    const int32_t w = image->width, h = image->height;
    bound_ = ImageBound(w, h);
    int status = CalcTextureTable(image, texture_);
    if (status == KT_OK) status = CalcFingerTable(image, texture_, model.function, finger_);
    if (status == KT_OK) status = CalcEdgeMagTable(finger_, w, h, edge_);
    int32_t count = 0;
    if (status == KT_OK) status = CalcLabeledFingerTable(finger_, w, h, model.threshold, count, labels_);
    int32_t accepted = 0;
    if (status == KT_OK) status = UpdateLabeledTable(labels_, count, w, h, accepted, regions_);
    if (status != KT_OK) return status;

    for (int32_t i = 0; i < count; ++i) {
        const RegionInfo& region = regions_[i];
        if (!region.accepted) continue;
        zbmvector<zbm_Pos> traced;
        status = FindContourOfRegion(labels_, w, h, region.newLabel, region, traced);
        if (status != KT_OK) {
            contours.Clear();
            return status;
        }
        zbmvector<zbm_Pos> kept;
        const int32_t n = traced.size();
        bool ok = true;
        for (int32_t k = 0; k < n - 2 && ok; k += 4) ok = kept.PushBack(traced[k]) != 0;
        if (ok && n > 0) ok = kept.PushBack(traced[n - 1]) != 0;
        traced.Clear();
        if (!ok || !contours.PushBack(kept)) {
            kept.Clear();
            contours.Clear();
            return KT_ERR_NO_MEMORY;
        }
    }
    return KT_OK;
}

}  // namespace FOL
