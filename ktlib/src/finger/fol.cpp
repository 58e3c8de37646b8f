#include "ktlib/src/finger/fol.h"

#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/finger/fervl/fervl.h"

#include <cfloat>
#include <cmath>

namespace FOL {

namespace {

const double kPi = 3.14159265358979323846;

// Curvature penalty of the bend a -> b -> c: -cos of the turn, a backward
// turn counting double. Coincident points do not bend.
float Bend(zbm_Pos a, zbm_Pos b, zbm_Pos c) {
    const float ux = static_cast<float>(b.x - a.x), uy = static_cast<float>(b.y - a.y);
    const float vx = static_cast<float>(c.x - b.x), vy = static_cast<float>(c.y - b.y);
    const float norms = std::sqrt(ux * ux + uy * uy) * std::sqrt(vx * vx + vy * vy);
    if (norms == 0.0f) return 0.0f;
    float cosine = (ux * vx + uy * vy) / norms;
    if (cosine < 0.0f) cosine *= 2.0f;
    return -cosine;
}

int32_t SquaredDistance(zbm_Pos a, zbm_Pos b) {
    const int32_t dx = a.x - b.x, dy = a.y - b.y;
    return dx * dx + dy * dy;
}

// Draws the closed polygon of normalised points scaled by (sx, sy) into a
// zeroed gray image and fills each row between its first and last outline
// pixel inside the points' bounding box.
void RasterisePolygon(const Finger& finger, float sx, float sy, _zbm_Image* mask) {
    const zbm_PackedUchar on = {{255, 0, 0, 0}};
    const int32_t n = finger.points.size();
    if (n == 0) return;
    int32_t minX = INT32_MAX, minY = INT32_MAX, maxX = INT32_MIN, maxY = INT32_MIN;
    zbm_Pos first = {0, 0}, previous = {0, 0};
    for (int32_t i = 0; i < n; ++i) {
        const zbm_Pos p = {static_cast<int32_t>(sx * finger.points[i].x), static_cast<int32_t>(sy * finger.points[i].y)};
        if (i == 0)
            first = p;
        else
            ZbiuDrawLine(mask, previous, p, on);
        previous = p;
        if (p.x < minX) minX = p.x;
        if (p.x > maxX) maxX = p.x;
        if (p.y < minY) minY = p.y;
        if (p.y > maxY) maxY = p.y;
    }
    ZbiuDrawLine(mask, previous, first, on);
    if (minX < 0) minX = 0;
    if (minY < 0) minY = 0;
    if (maxX > mask->width - 1) maxX = mask->width - 1;
    if (maxY > mask->height - 1) maxY = mask->height - 1;
    for (int32_t y = minY; y <= maxY; ++y) {
        uint8_t* row = ZbiuGetPointer(mask, 0, y);
        int32_t left = -1, right = -1;
        for (int32_t x = minX; x <= maxX; ++x) {
            if (row[x] == 255) {
                if (left < 0) left = x;
                right = x;
            }
        }
        for (int32_t x = left + 1; x < right; ++x) row[x] = 255;
    }
}

}  // namespace

// ---------------------------------------------------------------- snakes

int Snakes::SetPoints(const zbmvector<zbm_Pos>& points) {
    points_.Clear();
    if (!points_.Resize(points.size())) return KT_ERR_NO_MEMORY;
    for (int32_t i = 0; i < points.size(); ++i) points_[i] = points[i];
    return KT_OK;
}

void Snakes::Truncate(int32_t step, float ratio) {
    for (;;) {
        const int32_t n = points_.size();
        int32_t from = -1, to = -1;
        for (int32_t i = 0; i < n && from < 0; ++i) {
            for (int32_t j = i + 1; j < n; ++j) {
                const double along = static_cast<double>(step) * (j - i);
                const double across = static_cast<double>(SquaredDistance(points_[i], points_[j]));
                if (along * along > static_cast<double>(ratio) * ratio * across) {
                    from = i;
                    to = j;
                    break;
                }
            }
        }
        if (from < 0 || to - from < 2) return;
        const int32_t removed = to - from - 1;
        for (int32_t k = to; k < n; ++k) points_[k - removed] = points_[k];
        points_.Resize(n - removed);
    }
}

void Snakes::Optimize(int32_t maxPasses, int32_t settled) {
    const ImageBound bound(width_, height_);
    for (int32_t pass = 0; pass < maxPasses; ++pass) {
        int32_t moved = 0;
        for (int32_t i = 0; i < points_.size(); ++i) {
            const zbm_Pos current = points_[i];
            zbm_Pos best = current;
            float bestError = 0.0f;
            bool any = false;
            for (int32_t dy = -2; dy <= 2; ++dy) {
                for (int32_t dx = -2; dx <= 2; ++dx) {
                    const zbm_Pos candidate = {current.x + dx, current.y + dy};
                    if (!bound.IsInImage(candidate)) continue;
                    const float e = error_(*this, i, candidate, context_);
                    if (!any || e < bestError) {
                        any = true;
                        bestError = e;
                        best = candidate;
                    }
                }
            }
            if (best.x != current.x || best.y != current.y) {
                points_[i] = best;
                ++moved;
            }
        }
        if (moved <= settled) return;
    }
}

float Detector::CalcSnakesError(const Snakes& snakes, int32_t i, zbm_Pos p, const void* context) {
    const Detector& detector = *static_cast<const Detector*>(context);
    const int32_t n = snakes.Size();
    const int32_t w = snakes.Width(), h = snakes.Height();
    const bool hasPrevious = i > 0, hasNext = i < n - 1;
    if ((!hasPrevious || !hasNext) && !ImageBound(w, h).IsOnImageEdge(p)) return FLT_MAX;

    int32_t sum = 0, terms = 0;
    if (hasPrevious) sum += SquaredDistance(snakes.Point(i - 1), p), ++terms;
    if (hasNext) sum += SquaredDistance(snakes.Point(i + 1), p), ++terms;
    const float continuity = terms == 0 ? 0.0f
                                        : static_cast<float>(sum) / static_cast<float>(terms) /
                                              static_cast<float>((w + h) / 2);
    const float image = -detector.edge_[p.y * w + p.x];
    float curvature = 0.0f;
    if (hasPrevious && hasNext)
        curvature = Bend(snakes.Point(i - 1), p, snakes.Point(i + 1));
    else if (hasNext && i + 2 < n)
        curvature = Bend(p, snakes.Point(i + 1), snakes.Point(i + 2));
    else if (hasPrevious && i >= 2)
        curvature = Bend(snakes.Point(i - 2), snakes.Point(i - 1), p);
    return image + continuity + 10.0f * curvature;
}

int Detector::AdjustContour(const zbmvector<zbm_Pos>& contour, zbmvector<zbm_Pos>& adjusted) const {
    adjusted.Clear();
    Snakes snakes(bound_.Width(), bound_.Height(), CalcSnakesError, this);
    int status = snakes.SetPoints(contour);
    if (status != KT_OK) return status;
    snakes.Truncate(4, 5.0f);
    snakes.Optimize(10, 2);
    if (!adjusted.Resize(snakes.Size())) return KT_ERR_NO_MEMORY;
    for (int32_t i = 0; i < snakes.Size(); ++i) adjusted[i] = snakes.Point(i);
    return KT_OK;
}

int Detector::CalcFingerStats(const Finger& finger, FingerStats& stats) const {
    const int32_t w = bound_.Width(), h = bound_.Height();
    ZbmImagePtr mask(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_GRAY));
    if (!mask) return KT_ERR_NO_MEMORY;
    RasterisePolygon(finger, static_cast<float>(w), static_cast<float>(h), mask.get());
    int32_t ro, go, bo;
    ZbiuGetRgbOffset(image_->order, &ro, &go, &bo, nullptr);
    double sr = 0, sg = 0, sb = 0, st = 0;
    int32_t count = 0;
    for (int32_t pass = 0; pass < 2; ++pass) {
        const double mr = count ? sr / count : 0, mg = count ? sg / count : 0, mb = count ? sb / count : 0;
        const double mt = count ? st / count : 0;
        double colour = 0, texture = 0;
        for (int32_t y = 0; y < h; ++y) {
            const uint8_t* m = ZbiuGetConstPointer(mask.get(), 0, y);
            for (int32_t x = 0; x < w; ++x) {
                if (m[x] != 255) continue;
                const uint8_t* p = ZbiuGetConstPointer(image_, x, y);
                const double r = p[ro], g = p[go], b = p[bo], t = texture_[y * w + x];
                if (pass == 0) {
                    sr += r, sg += g, sb += b, st += t, ++count;
                } else {
                    colour += (r - mr) * (r - mr) + (g - mg) * (g - mg) + (b - mb) * (b - mb);
                    texture += (t - mt) * (t - mt);
                }
            }
        }
        if (pass == 1) {
            stats.meanR = static_cast<float>(mr);
            stats.meanG = static_cast<float>(mg);
            stats.meanB = static_cast<float>(mb);
            stats.meanTexture = static_cast<float>(mt);
            stats.colorDeviation = count ? static_cast<float>(std::sqrt(colour / count)) : 0.0f;
            stats.textureDeviation = count ? static_cast<float>(std::sqrt(texture / count)) : 0.0f;
        }
    }
    return KT_OK;
}

// ---------------------------------------------------------------- geometry

int AppendCornerPointsOnEdge(int32_t w, int32_t h, zbmvector<zbm_Pos>& points) {
    const int32_t n = points.size();
    if (n == 0) return KT_OK;
    const ImageBound bound(w, h);
    const zbm_Pos first = points[0], last = points[n - 1];
    if (bound.IsOnSameEdge(first, last)) return KT_OK;
    // Edges in test order: 0 left, 1 top, 2 right, 3 bottom.
    auto edgeOf = [&](zbm_Pos p) {
        if (bound.IsOnLeftEdge(p)) return 0;
        if (bound.IsOnTopEdge(p)) return 1;
        if (bound.IsOnRightEdge(p)) return 2;
        if (bound.IsOnBottomEdge(p)) return 3;
        return -1;
    };
    const int from = edgeOf(last), to = edgeOf(first);
    if (from < 0 || to < 0) return KT_OK;
    // Clockwise along the border the corner after edge e is: top-right after
    // the top, bottom-right after the right, bottom-left after the bottom,
    // top-left after the left.
    const zbm_Pos cornerAfter[4] = {{0, 0}, {w - 1, 0}, {w - 1, h - 1}, {0, h - 1}};
    for (int e = from; e != to; e = (e + 1) % 4) {
        if (!points.PushBack(cornerAfter[e])) return KT_ERR_NO_MEMORY;
    }
    return KT_OK;
}

float CalcSurroundedArea(const zbmvector<zbm_Pos>& points) {
    const int32_t n = points.size();
    float sum = 0.0f;
    for (int32_t i = 0; i < n; ++i) {
        const zbm_Pos a = points[i], b = points[(i + 1) % n];
        sum += static_cast<float>(a.x - b.x) * static_cast<float>(a.y + b.y);
    }
    return 0.5f * sum;
}

int CalcFingerAcceptance(const Finger& a, const Finger& b) {
    uint8_t bytesA[16 * 16] = {0}, bytesB[16 * 16] = {0};
    _zbm_Image maskA = {bytesA, 16, 16, 16, ZBM_PIXEL_ORDER_GRAY, 1, 0};
    _zbm_Image maskB = {bytesB, 16, 16, 16, ZBM_PIXEL_ORDER_GRAY, 1, 0};
    RasterisePolygon(a, 16.0f, 16.0f, &maskA);
    RasterisePolygon(b, 16.0f, 16.0f, &maskB);
    int32_t countA = 0, countB = 0, both = 0;
    for (int32_t i = 0; i < 16 * 16; ++i) {
        countA += bytesA[i] == 255;
        countB += bytesB[i] == 255;
        both += bytesA[i] == 255 && bytesB[i] == 255;
    }
    const bool same = (countA > 0 && static_cast<float>(both) / static_cast<float>(countA) >= 0.5f) ||
                      (countB > 0 && static_cast<float>(both) / static_cast<float>(countB) >= 0.5f);
    if (!same) return 2;
    return a.score >= b.score ? 0 : 1;
}

// ---------------------------------------------------------------- patches

int FeRVLHandler::Initialize() {
    Finalize();
    work_ = ZbiuCreate(kPatchSize, kPatchSize, ZBM_PIXEL_ORDER_RGB);
    return work_ ? KT_OK : KT_ERR_NO_MEMORY;
}

void FeRVLHandler::Finalize() { ZbiuDispose(&work_); }

int FeRVLHandler::PreparePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern) {
    if (!work_ || !image || image->order != ZBM_PIXEL_ORDER_RGB || rect.width != kPatchSize ||
        rect.height != kPatchSize || !ImageBound(image->width, image->height).IsRectInImage(rect)) {
        return KT_ERR_STATE;
    }
    // A view of the rectangle: no pixels are copied and nothing is allocated.
    _zbm_Image view = {const_cast<uint8_t*>(ZbiuGetConstPointer(image, rect.x, rect.y)),
                       kPatchSize,
                       kPatchSize,
                       image->pitch,
                       ZBM_PIXEL_ORDER_RGB,
                       3,
                       0};
    switch (pattern) {
    case 3:
    case 5:
        return ZbiuRotate180(&view, work_);
    case 2:
    case 6:
        return ZbiuRotateRight(&view, work_);
    case 1:
    case 7:
        return ZbiuRotateLeft(&view, work_);
    case 0:
    case 4:
        return ZbiuCopy(&view, work_);
    default:
        return KT_ERR_STATE;
    }
}

int FeRVLHandler::EvalImagePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern, float* score) {
    int status = PreparePatch(image, rect, pattern);
    if (status != KT_OK) return status;
    zbmvector<double> scores;
    status = FeRVLClassify(work_->pData, kPatchSize, kPatchSize, static_cast<uint32_t>(work_->pitch),
                           ZBM_PIXEL_ORDER_RGB, pattern <= 3 ? &FERVL_DICTIONARY_DIAG : &FERVL_DICTIONARY_HALF,
                           scores);
    if (status == KT_OK && scores.size() > 0) *score = static_cast<float>(scores[0]);
    scores.Clear();
    return status;
}

float FeRVLHandler::EvalImagePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern) {
    float score = -FLT_MAX;
    return EvalImagePatch(image, rect, pattern, &score) == KT_OK ? score : -FLT_MAX;
}

float FingerScoreOfMean(float m) {
    float v = m / 2.5f;
    if (v > 0.167f)
        v = (v - 0.167f) * 0.4f / 0.833f + 0.6f;
    else
        v = v * 3.5928147f;
    if (v > 1.0f) v = 1.0f;
    if (v < 0.0f) v = 0.0f;
    return v;
}

int32_t FingerPatternOfAngle(double angle) {
    const double e = kPi / 8.0;
    if (angle < -7.0 * e || angle >= 7.0 * e) return 4;
    if (angle < -5.0 * e) return 0;
    if (angle < -3.0 * e) return 6;
    if (angle < -e) return 2;
    if (angle < e) return 5;
    if (angle < 3.0 * e) return 3;
    if (angle < 5.0 * e) return 7;
    return 1;
}

// ---------------------------------------------------------------- detection

namespace {

// One contour of one scale: adjusted, closed, measured and scored. A
// contour that is not a finger leaves `finger` with score 0.
int EvaluateContour(const Detector& detector, FeRVLHandler& handler, const zbmvector<zbm_Pos>& contour,
                    int32_t scale, int32_t index, PatchObserver* observer, Finger& finger) {
    const _zbm_Image* image = detector.Image();
    const int32_t w = image->width, h = image->height;
    finger.score = 0.0f;
    zbmvector<zbm_Pos> points;
    auto release = lmk::MakeScopeGuard([&points] { points.Clear(); });
    int status = detector.AdjustContour(contour, points);
    if (status == KT_OK) status = AppendCornerPointsOnEdge(w, h, points);
    if (status != KT_OK) return status;
    const int32_t n = points.size();
    if (n < 3) return KT_OK;

    finger.area = CalcSurroundedArea(points) / static_cast<float>(w * h);
    if (!finger.points.Resize(n)) return KT_ERR_NO_MEMORY;
    for (int32_t i = 0; i < n; ++i) {
        finger.points[i].x = static_cast<float>(points[i].x) / static_cast<float>(w);
        finger.points[i].y = static_cast<float>(points[i].y) / static_cast<float>(h);
    }
    Detector::FingerStats stats;
    status = detector.CalcFingerStats(finger, stats);
    if (status != KT_OK) return status;
    if (stats.meanTexture > 13.0f || stats.colorDeviation > 80.0f) return KT_OK;

    const ImageBound bound(w, h);
    const int32_t step = n < 14 ? 1 : n / 13 + 1;
    float sum = 0.0f;
    int32_t count = 0;
    for (int32_t i = 1; i < n - 1; i += step) {
        const FingerPoint& p = finger.points[i];
        const zbm_Rect rect = {static_cast<int32_t>(static_cast<float>(w) * p.x - 5.0f + 0.5f),
                               static_cast<int32_t>(static_cast<float>(h) * p.y - 5.0f + 0.5f), 10, 10};
        if (!bound.IsRectInImage(rect)) continue;
        const FingerPoint& before = finger.points[i - 1];
        const FingerPoint& after = finger.points[i + 1];
        const double angle = std::atan2(-static_cast<double>(after.y - before.y), static_cast<double>(after.x - before.x));
        const int32_t pattern = FingerPatternOfAngle(angle);
        float value = 0.0f;
        status = handler.EvalImagePatch(image, rect, pattern, &value);
        if (status != KT_OK) return status;
        if (observer) observer->OnPatch(handler.WorkImage(), pattern, p.x, p.y, scale, index, value);
        sum += value;
        ++count;
    }
    finger.score = FingerScoreOfMean(count ? sum / static_cast<float>(count) : 0.0f);
    return KT_OK;
}

int DetectAtScale(const _zbm_Image* image, FeRVLHandler& handler, int32_t scale, PatchObserver* observer,
                  zbmvector<Finger>& candidates) {
    Detector detector;
    zbmvector<zbmvector<zbm_Pos>> contours;
    auto release = lmk::MakeScopeGuard([&contours] { contours.Clear(); });
    int status = detector.DetectInitialRegions(image, DefaultFingerLiklihood(), contours);
    if (status != KT_OK) return status;
    for (int32_t c = 0; c < contours.size(); ++c) {
        if (contours[c].size() <= 1) continue;
        Finger finger = {};
        status = EvaluateContour(detector, handler, contours[c], scale, c, observer, finger);
        if (status != KT_OK || finger.score <= 0.0f) {
            finger.Clear();
            if (status != KT_OK) return status;
            continue;
        }
        if (!candidates.PushBack(finger)) {
            finger.Clear();
            return KT_ERR_NO_MEMORY;
        }
    }
    return KT_OK;
}

}  // namespace

int CalcFingerScore(const _zbm_Image* image, zbmvector<Finger>& fingers, float& score) {
    return CalcFingerScore(image, fingers, score, nullptr);
}

int CalcFingerScore(const _zbm_Image* image, zbmvector<Finger>& fingers, float& score, PatchObserver* observer) {
    fingers.Clear();
    score = 0.0f;
    if (!image || !image->pData) return KT_ERR_STATE;
    if (image->width < 10 || image->height < 10) return KT_OK;

    ZbmImagePtr rgb(ZbiuCreate(image->width, image->height, ZBM_PIXEL_ORDER_RGB));
    if (!rgb) return KT_ERR_NO_MEMORY;
    int status = ZbiuConvertColorSpace(image, rgb.get());
    if (status != ZBIU_OK) return status;
    FeRVLHandler handler;
    status = handler.Initialize();
    if (status != KT_OK) return status;

    zbmvector<Finger> candidates;
    auto release = lmk::MakeScopeGuard([&candidates] { candidates.Clear(); });
    float factor = 1.0f;
    for (int32_t scale = 0; scale < 6; ++scale) {
        if (scale == 0) {
            status = DetectAtScale(rgb.get(), handler, scale, observer, candidates);
        } else {
            factor *= 0.871f;
            const int32_t w = static_cast<int32_t>(static_cast<float>(image->width) * factor);
            const int32_t h = static_cast<int32_t>(static_cast<float>(image->height) * factor);
            ZbmImagePtr scaled(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_RGB));
            if (!scaled) return KT_ERR_NO_MEMORY;
            status = ZbiuResize(rgb.get(), scaled.get());
            if (status == ZBIU_OK) status = DetectAtScale(scaled.get(), handler, scale, observer, candidates);
        }
        if (status != KT_OK) return status;
    }

    // Merge: a candidate that covers half of an earlier result (or is half
    // covered by it) is the same finger and the better score stays.
    zbmvector<Finger> results;
    auto releaseResults = lmk::MakeScopeGuard([&results] { results.Clear(); });
    for (int32_t c = 0; c < candidates.size(); ++c) {
        Finger& candidate = candidates[c];
        bool matched = false;
        for (int32_t r = 0; r < results.size() && !matched; ++r) {
            const int decision = CalcFingerAcceptance(results[r], candidate);
            if (decision == 2) continue;
            matched = true;
            if (decision == 1) {
                results[r].Clear();
                results[r] = candidate;
                candidate = Finger();
            }
        }
        if (!matched) {
            if (!results.PushBack(candidate)) return KT_ERR_NO_MEMORY;
            candidate = Finger();
        }
    }
    float best = 0.0f;
    for (int32_t r = 0; r < results.size(); ++r)
        if (results[r].score > best) best = results[r].score;
    releaseResults.Dismiss();
    fingers = results;
    score = best;
    return KT_OK;
}

}  // namespace FOL
