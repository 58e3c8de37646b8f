// Steps of the representative meta extraction that do not depend on the
// other metas' engines.
#include "ktlib/src/representative/repm_internal.h"

#include "common/src/internal/memory.h"

#include <cmath>
#include <cstring>

namespace ktrepm {

float ColorVariation(const _KtMetaSimilarity& siml) {
    const double n = static_cast<double>(siml.width) * static_cast<double>(siml.height);
    if (!(n > 0.0)) return 0.0f;
    const uint32_t colours = siml.ncol32 < 32 ? siml.ncol32 : 32;
    double sum = 0.0;
    for (uint32_t i = 0; i < colours; ++i) {
        const _KtMetaSimilarity::_ColHist& a = siml.colHist32[i];
        for (uint32_t j = i + 1; j < colours; ++j) {
            const _KtMetaSimilarity::_ColHist& b = siml.colHist32[j];
            const double da = static_cast<double>(a.lab.a) - b.lab.a;
            const double dl = 0.7 * (static_cast<double>(a.lab.l) - b.lab.l);
            const double db = static_cast<double>(a.lab.b) - b.lab.b;
            const double d = std::sqrt(da * da + dl * dl + db * db);
            sum += d * a.count * b.count / n;
        }
    }
    double v = sum * 10.0 / n;
    if (v > 255.0) v = 255.0;
    return static_cast<float>(v / 255.0);
}

int SizeForPixels(uint32_t width, uint32_t height, double pixels, int32_t* w, int32_t* h) {
    const double fw = std::sqrt(static_cast<double>(width) * pixels / height) + 0.5;
    const double fh = std::sqrt(static_cast<double>(height) * pixels / width) + 0.5;
    if (!(fw < 2147483647.0) || !(fh < 2147483647.0)) return KT_ERR_STATE;
    *w = static_cast<int32_t>(fw);
    *h = static_cast<int32_t>(fh);
    return KT_OK;
}

int StoreFingers(const zbmvector<FOL::Finger>& fingers, uint32_t width, uint32_t height, _KtMetaRepresentative* m) {
    const uint32_t count = fingers.size() < static_cast<int32_t>(KT_MAX_FINGERS) ? static_cast<uint32_t>(fingers.size())
                                                                                 : KT_MAX_FINGERS;
    m->analyzedWidth = width;
    m->analyzedHeight = height;
    if (count == 0) return KT_OK;
    m->pFingers = lmk::NewArray<_KtFinger>(count).release();
    if (!m->pFingers) return KT_ERR_NO_MEMORY;
    m->numFinger = count;
    const float fw = static_cast<float>(width), fh = static_cast<float>(height);
    for (uint32_t i = 0; i < count; ++i) {
        const FOL::Finger& from = fingers[static_cast<int32_t>(i)];
        _KtFinger& to = m->pFingers[i];
        to.score = from.score;
        // Outlines closed counter-clockwise would give a negative area.
        const float area = fw * from.area * fh;
        to.area = area > 0.0f ? static_cast<uint32_t>(area) : 0u;
        const uint32_t points = static_cast<uint32_t>(from.points.size());
        if (points == 0) continue;
        to.pPoints = lmk::NewArray<_KtFingerPoint>(points).release();
        if (!to.pPoints) return KT_ERR_NO_MEMORY;
        to.numPoint = points;
        for (uint32_t k = 0; k < points; ++k) {
            const FOL::FingerPoint& p = from.points[static_cast<int32_t>(k)];
            to.pPoints[k].x = static_cast<uint16_t>(fw * p.x);
            to.pPoints[k].y = static_cast<uint16_t>(fh * p.y);
        }
    }
    return KT_OK;
}

int StoreBlurMap(const _zbm_Image* map, _KtMetaRepresentative* m) {
    const int32_t w = static_cast<int32_t>(0.5 + map->width * 0.25);
    const int32_t h = static_cast<int32_t>(0.5 + map->height * 0.25);
    ZbmImagePtr small(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_GRAY));
    if (!small) return KT_ERR_NO_MEMORY;
    const int status = ZbiuResize(map, small.get());
    if (status != ZBIU_OK) return status;
    const uint32_t bytes = static_cast<uint32_t>(w) * static_cast<uint32_t>(h);
    m->pBlurMap = lmk::NewArray<uint8_t>(bytes).release();
    if (!m->pBlurMap) return KT_ERR_NO_MEMORY;
    for (int32_t y = 0; y < h; ++y)
        std::memcpy(m->pBlurMap + static_cast<size_t>(y) * w, ZbiuGetConstPointer(small.get(), 0, y), w);
    m->mapWidth = static_cast<uint32_t>(w);
    m->mapHeight = static_cast<uint32_t>(h);
    return KT_OK;
}

bool ScoreInRange(float v) { return v == -1.0f || (v >= 0.0f && v <= 1.0f); }

int MakeWorkingCopies(const _zbm_Image* photo, ZbmImagePtr* gray, ZbmImagePtr* small) {
    const uint32_t width = static_cast<uint32_t>(photo->width), height = static_cast<uint32_t>(photo->height);
    int32_t aw, ah, bw, bh;
    if (SizeForPixels(width, height, 307200.0, &aw, &ah) != KT_OK ||
        SizeForPixels(width, height, 4800.0, &bw, &bh) != KT_OK) {
        return KT_ERR_STATE;
    }
    ZbmImagePtr work(ZbiuCreate(aw, ah, photo->order));
    if (!work) return KT_ERR_NO_MEMORY;
    int status = ZbiuResize(photo, work.get());
    if (status != ZBIU_OK) return status;
    ZbmImagePtr b(ZbiuCreate(bw, bh, photo->order));
    if (!b) return KT_ERR_NO_MEMORY;
    status = ZbiuResize(work.get(), b.get());
    if (status != ZBIU_OK) return status;
    ZbmImagePtr c(ZbiuCreate(aw, ah, ZBM_PIXEL_ORDER_GRAY));
    if (!c) return KT_ERR_NO_MEMORY;
    status = ZbiuConvertColorSpace(work.get(), c.get());
    if (status != ZBIU_OK) return status;
    *gray = std::move(c);
    *small = std::move(b);
    return KT_OK;
}

}  // namespace ktrepm
