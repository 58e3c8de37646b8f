#include "ktlib/src/frame/kt_repm_record.h"

#include "common/src/internal/memory.h"

#include <cstring>

namespace ktrepm {

void ReleaseArrays(_KtMetaRepresentative* m) {
    if (m->pFingers) {
        for (uint32_t i = 0; i < m->numFinger; ++i) delete[] m->pFingers[i].pPoints;
        delete[] m->pFingers;
    }
    delete[] m->pBlurMap;
    m->pFingers = nullptr;
    m->numFinger = 0;
    m->pBlurMap = nullptr;
    m->mapWidth = 0;
    m->mapHeight = 0;
}

int DeepCopy(const _KtMetaRepresentative& src, _KtMetaRepresentative* dst) {
    if (src.numFinger > KT_MAX_FINGERS || (src.numFinger != 0 && !src.pFingers)) return KT_ERR_STATE;
    uint32_t mapBytes = 0;
    if (!lmk::CheckedMul(src.mapWidth, src.mapHeight, &mapBytes) || (mapBytes != 0 && !src.pBlurMap)) {
        return KT_ERR_STATE;
    }
    for (uint32_t i = 0; i < src.numFinger; ++i) {
        uint32_t pointBytes;
        if (!lmk::CheckedMul(src.pFingers[i].numPoint, sizeof(_KtFingerPoint), &pointBytes) ||
            (pointBytes != 0 && !src.pFingers[i].pPoints)) {
            return KT_ERR_STATE;
        }
    }

    _KtMetaRepresentative copy = src;
    copy.numFinger = 0;
    copy.pFingers = nullptr;
    copy.mapWidth = 0;
    copy.mapHeight = 0;
    copy.pBlurMap = nullptr;
    auto release = lmk::MakeScopeGuard([&copy] { ReleaseArrays(&copy); });

    if (src.numFinger != 0) {
        copy.pFingers = lmk::NewArray<_KtFinger>(src.numFinger).release();
        if (!copy.pFingers) return KT_ERR_NO_MEMORY;
        copy.numFinger = src.numFinger;
        for (uint32_t i = 0; i < src.numFinger; ++i) {
            const _KtFinger& from = src.pFingers[i];
            _KtFinger& to = copy.pFingers[i];
            to.score = from.score;
            to.area = from.area;
            if (from.numPoint != 0) {
                to.pPoints = lmk::NewArray<_KtFingerPoint>(from.numPoint).release();
                if (!to.pPoints) return KT_ERR_NO_MEMORY;
                std::memcpy(to.pPoints, from.pPoints, sizeof(_KtFingerPoint) * from.numPoint);
            }
            to.numPoint = from.numPoint;
        }
    }
    if (mapBytes != 0) {
        copy.pBlurMap = lmk::NewArray<uint8_t>(mapBytes).release();
        if (!copy.pBlurMap) return KT_ERR_NO_MEMORY;
        std::memcpy(copy.pBlurMap, src.pBlurMap, mapBytes);
    }
    copy.mapWidth = src.mapWidth;
    copy.mapHeight = src.mapHeight;

    release.Dismiss();
    *dst = copy;
    return KT_OK;
}

}  // namespace ktrepm
