// KtRepmExtract: the quality judgement of one photo. The photo is scaled to
// about 640 x 480 for the blur scorer (in gray) and to about 80 x 60 for the
// finger detection; the colour variation comes from the similarity palette
// and the exposure score from the palette and the blur.
#include <lumicor/ktlib.h>
#include <lumicor/zbm_image.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/blur/blur.h"
#include "ktlib/src/finger/fol.h"
#include "ktlib/src/representative/bad_exposure.h"
#include "ktlib/src/representative/repm_internal.h"

extern "C" int KtRepmExtract(const unsigned char* pixels, unsigned int width, unsigned int height, int pitch,
                             unsigned int format, const _KtMetaSimilarity* siml, _KtMetaRepresentative** out) {
    if (format > 4) return KT_ERR_STATE;
    if (!pixels || !siml || !out) return KT_ERR_NULL;
    const _zbm_PixelOrder order = static_cast<_zbm_PixelOrder>(format + 1);
    const uint32_t bytesPerPixel = static_cast<uint32_t>(ZbiuGetBytesPerPixel(order));
    const uint32_t rowBytes = static_cast<uint32_t>(pitch < 0 ? -static_cast<int64_t>(pitch) : pitch);
    if (width == 0 || height == 0 || *out || width > 0x7FFFFFFFu || height > 0x7FFFFFFFu ||
        static_cast<uint64_t>(width) * bytesPerPixel > rowBytes) {
        return KT_ERR_STATE;
    }

    ZbmImagePtr gray, small;
    {
        ZbmImagePtr photo(ZbiuCreateAttatchData(const_cast<unsigned char*>(pixels), static_cast<int32_t>(width),
                                                static_cast<int32_t>(height), pitch, order));
        if (!photo) return KT_ERR_NO_MEMORY;
        const int status = ktrepm::MakeWorkingCopies(photo.get(), &gray, &small);
        if (status != KT_OK) return status;
    }

    _KtMetaRepresentative* meta = new (std::nothrow) _KtMetaRepresentative();
    if (!meta) return KT_ERR_NO_MEMORY;
    auto dispose = lmk::MakeScopeGuard([&meta] { KtRepmDisposeMeta(&meta); });

    meta->colorVariation = ktrepm::ColorVariation(*siml);

    zbmvector<FOL::Finger> fingers;
    auto releaseFingers = lmk::MakeScopeGuard([&fingers] { fingers.Clear(); });
    float fingerScore = 0.0f;
    int status = FOL::CalcFingerScore(small.get(), fingers, fingerScore);
    if (status != KT_OK) return status;
    meta->fingerOnLens = fingerScore;
    status = ktrepm::StoreFingers(fingers, static_cast<uint32_t>(small->width), static_cast<uint32_t>(small->height),
                                  meta);
    if (status != KT_OK) return status;

    blur::BlurScores scores;
    _zbm_Image* blurMap = nullptr;
    status = blur::CalcBlurScorer(gray.get(), &blurMap, &scores);
    if (status != KT_OK) return status;
    ZbmImagePtr ownedMap(blurMap);
    meta->outOfFocus = static_cast<float>(scores.outOfFocus);
    meta->cameraShake = static_cast<float>(scores.cameraShake);
    meta->motionBlur = 0.0f;
    if (ownedMap) {
        status = ktrepm::StoreBlurMap(ownedMap.get(), meta);
        if (status != KT_OK) return status;
    }

    float badExposure = 0.0f;
    status = CalcBadExposure(small.get(), siml, meta->outOfFocus, &badExposure);
    if (status != KT_OK) return status;
    meta->badExposure = badExposure;

    const float checked[6] = {meta->colorVariation, meta->badExposure, meta->fingerOnLens,
                              meta->outOfFocus,     meta->cameraShake, meta->motionBlur};
    for (float v : checked)
        if (!ktrepm::ScoreInRange(v)) return KT_ERR_RANGE;

    dispose.Dismiss();
    *out = meta;
    return KT_OK;
}
