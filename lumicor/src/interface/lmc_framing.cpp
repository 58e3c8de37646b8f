// Framing of a stored photo meta: the crop of a wanted shape, computed from
// the blob's attention areas and analysed size alone.
#include <lumicor/calib.h>
#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include "common/src/internal/memory.h"
#include "lumicor/src/interface/lmc_log.h"

#include <cstring>

extern "C" uint32_t LmcSearchFraming(const LmcPhotoMeta* pPhotoMeta, const LmcFramingParam* pParam,
                                     LmcRect* pRectOut) {
    if (pPhotoMeta == nullptr || pParam == nullptr || pRectOut == nullptr) {
        LMC_LOG_ERROR("%s(%d): LmcSearchFraming(): pPhotoMeta == NULL || pParam == NULL || pRectOut == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    if (pPhotoMeta->nBufferSize == 0 || pPhotoMeta->pMeta == nullptr) {
        LMC_LOG_ERROR("%s(%d): LmcSearchFraming(): pPhotoMeta->nBufferSize == 0 || pPhotoMeta->pMeta == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }

    _VondMeta meta;
    std::memset(&meta, 0, sizeof meta);
    // The parsed record is released on every path from here on, also after a
    // failed parse (which leaves it disposed already; disposing again is harmless).
    auto release = lmk::MakeScopeGuard([&meta] { VondDisposeMeta(&meta); });

    if (VondParseMeta(pPhotoMeta->nBufferSize, pPhotoMeta->pMeta, &meta).status != VOND_STATUS_OK) {
        LMC_LOG_ERROR("%s(%d): VondParseMeta(): failed\n");
        return LMC_STATUS_FAILED;
    }

    _CAParam param;
    if (CAGetDefaultParam(&param) != 0) {
        LMC_LOG_ERROR("%s(%d): CAGetDefaultParam(): failed\n");
        return LMC_STATUS_FAILED;
    }
    // The host chooses the first three parameters; the rest keep their defaults.
    param.composition_mode = pParam->composition_mode;
    param.aspect_ratio = pParam->aspect_ratio;
    param.magnification_limit = pParam->magnification_limit;

    _CAResult result;
    if (CASearchFraming(meta.analyzedWidth, meta.analyzedHeight, &param, &meta.attentionAreas, &result) != 0) {
        LMC_LOG_ERROR("%s(%d): CASearchFraming(): failed\n");
        return LMC_STATUS_FAILED;
    }
    pRectOut->x = result.x;
    pRectOut->y = result.y;
    pRectOut->width = result.width;
    pRectOut->height = result.height;
    return LMC_STATUS_OK;
}
