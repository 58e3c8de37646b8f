// VondAnalyze: one host photo into a _VondMeta record. The photo becomes an
// RGB image (the host buffer itself when it already is RGB), is sized to a
// working image of about 307,200 pixels, and the three engines run on it in
// a fixed order: faces, quality and similarity, attention areas. The first
// engine that fails ends the analysis and nothing of it is kept.
#include <lumicor/vond.h>

#include "lumicor/src/driver/host_pixel_order.h"
#include "lumicor/src/glue/vond_result.h"

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>

namespace {

// Pixel count of the working image, and how far a photo may be from it and
// still be used as it is (the square root of the count).
constexpr double kWorkingPixels = 307200.0;
constexpr double kWorkingTolerance = 554.2562584220408;
constexpr int32_t kMinSide = 10;
constexpr int32_t kMaxWorkingSide = 0xFFFF;

const _VondConfig kDefaultConfig = {4, 0.0f, 307200};

int32_t HostBytesPerPixel(int32_t order) { return order == 0 ? 1 : (order <= 2 ? 3 : 4); }

// The photo as an RGB image: `rgb` is either an owning image or a record
// attached to the host's RGB buffer (never its pixels). Returns the result
// of the step.
_VondResult MakeRgb(_VondResult result, const _zbm_Image& host, int32_t order, ZbmImagePtr* rgb) {
    if (order == vond::kHostOrderInt32Argb) {
        if (host.pitch % 4 != 0) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "invalid pitch for INT32_ARGB");
        rgb->reset(ZbiuCreate(host.width, host.height, ZBM_PIXEL_ORDER_RGB));
        if (!*rgb) return vond::Fail(result, VOND_STATUS_FAILED, "ZbiuCreate() failed");
        vond::CopyInt32ArgbToRgb(reinterpret_cast<const uint32_t*>(host.pData), host.pitch, rgb->get());
        return result;
    }
    _zbm_PixelOrder zbmOrder;
    vond::HostOrderToZbm(order, &zbmOrder);  // 0..6, checked by the caller
    ZbmImagePtr attached(ZbiuCreateAttatchData(host.pData, host.width, host.height, host.pitch, zbmOrder));
    if (!attached) return vond::Fail(result, VOND_STATUS_FAILED, "ZbiuCreateAttatchData() failed");
    if (zbmOrder == ZBM_PIXEL_ORDER_RGB) {
        *rgb = std::move(attached);  // the host's pixels, without a copy
        return result;
    }
    rgb->reset(ZbiuCreate(host.width, host.height, ZBM_PIXEL_ORDER_RGB));
    if (!*rgb) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "ZbiuCreate() failed");
    if (ZbiuConvertColorSpace(attached.get(), rgb->get()) != 0) {
        rgb->reset();
        return vond::Fail(result, VOND_STATUS_FAILED, "ZbiuConvertColorSpace() failed");
    }
    return result;
}

// The working image: `resized` stays empty when the RGB image is close
// enough to the working pixel count.
_VondResult MakeWorking(_VondResult result, const _zbm_Image* rgb, ZbmImagePtr* resized) {
    const double pixels = static_cast<double>(rgb->width) * static_cast<double>(rgb->height);
    if (std::fabs(pixels - kWorkingPixels) < kWorkingTolerance) return result;
    const double w = std::sqrt(rgb->width * kWorkingPixels / rgb->height);
    const double h = std::sqrt(rgb->height * kWorkingPixels / rgb->width);
    // A photo of extreme shape can have no working size at all.
    if (!(w >= 1.0 && h >= 1.0 && w < 2147483647.0 && h < 2147483647.0))
        return vond::Fail(result, VOND_STATUS_FAILED, "ZbiuResize(): failed");
    resized->reset(ZbiuCreate(static_cast<int32_t>(w), static_cast<int32_t>(h), rgb->order));
    if (!*resized) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "ZbiuResize(): failed");
    const int status = ZbiuResize(rgb, resized->get());
    if (status != 0) {
        resized->reset();
        return vond::Fail(result, status == ZBIU_ERR_OUT_OF_MEMORY ? VOND_STATUS_OUT_OF_MEMORY : VOND_STATUS_FAILED,
                          "ZbiuResize(): failed");
    }
    return result;
}

}  // namespace

_VondResult VondAnalyze(const _zbm_Image* pImage, int32_t faceRectCount, const _VondFaceRect* pFaceRectArray,
                        const _VondConfig* pConfig, _VondMeta* pMetaOut) {
    _VondResult result = vond::Begin("VondAnalyze");
    if (pMetaOut == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pMetaOut == NULL");
    std::memset(pMetaOut, 0, sizeof *pMetaOut);

    if (pImage == nullptr || pImage->pData == nullptr || pImage->width == 0 || pImage->height == 0 ||
        pImage->pitch == 0) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER,
                          "pImage == NULL || pImage->pBuf == NULL || pImage->width == 0 || pImage->height == 0 || "
                          "pImage->pitch == 0");
    }
    // Host numbering in a 32-bit field that may hold any value (also outside
    // the enumeration), so it is read as an integer.
    int32_t order;
    std::memcpy(&order, &pImage->order, sizeof order);
    if (order >= vond::kHostOrderCount) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER,
                          "pImage == NULL || pImage->pBuf == NULL || pImage->width == 0 || pImage->height == 0 || "
                          "pImage->pitch == 0 || pImage->order >= VOND_PIXEL_ORDER_NUM");
    }
    if (order < 0) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "Invalid pImage->order");
    // 64-bit: neither |INT32_MIN| nor width x 4 may overflow.
    if (std::llabs(static_cast<long long>(pImage->pitch)) <
        static_cast<long long>(pImage->width) * HostBytesPerPixel(order)) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "Invalid pImage->pitch");
    }
    if (faceRectCount < -1) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "faceRectCount < -1");
    if (faceRectCount >= 1 && pFaceRectArray == nullptr)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "faceRectCount >= 1 && pFaceRectArray == NULL");
    if (faceRectCount <= 0 && pFaceRectArray != nullptr) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER,
                          "(faceRectCount == -1 || faceRectCount == 0) && pFaceRectArray != NULL");
    }
    const _VondConfig& config = pConfig != nullptr ? *pConfig : kDefaultConfig;
    if (config.faceDetectDicMode >= ORIEL_D_MODE_MAX)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pConfig->faceDetectDicMode >= ORIEL_D_MODE_MAX");
    if (config.faceRcSize == 0) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pConfig->faceRcSize == 0");
    if (pImage->width < kMinSide || pImage->height < kMinSide) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER,
                          "pImage->width < MIN_SHORT_SIDE_LENGTH || pImage->height < MIN_SHORT_SIDE_LENGTH");
    }

    ZbmImagePtr rgb;
    _VondResult step = MakeRgb(result, *pImage, order, &rgb);
    if (step.status != VOND_STATUS_OK) return step;
    ZbmImagePtr resized;
    step = MakeWorking(result, rgb.get(), &resized);
    if (step.status != VOND_STATUS_OK) return step;
    const _zbm_Image* working = resized ? resized.get() : rgb.get();

    _VondMeta& meta = *pMetaOut;
    meta.version = *VondGetVersion();
    meta.faceDetectDicMode = config.faceDetectDicMode;
    meta.faceEngineParam = config.faceEngineParam;
    meta.faceRcSize = config.faceRcSize;

    if (working->width > kMaxWorkingSide || working->height > kMaxWorkingSide) {
        VondDisposeMeta(pMetaOut);
        return vond::Fail(result, VOND_STATUS_FAILED, "pImageForFace->width > 0xFFFF || pImageForFace->height > 0xFFFF");
    }

    // From here on a failing engine's result is the driver's, and the record
    // is released with everything the earlier engines hung on it.
    step = VondOrielAnalyze(working, static_cast<uint32_t>(pImage->width), static_cast<uint32_t>(pImage->height),
                            faceRectCount, pFaceRectArray, config.faceDetectDicMode, config.faceEngineParam,
                            config.faceRcSize, meta.faceMeta, meta.clusterSubject, meta.faceMetaArray);
    if (step.status == VOND_STATUS_OK) {
        step = VondKtLibAnalyze(working, meta.simlEngineVersion, meta.simlMetaVersion, meta.similarity,
                                meta.repmEngineVersion, meta.repmMetaVersion, meta.representative,
                                meta.clblEngineVersion, meta.clblMetaVersion, meta.colorLabel);
    }
    if (step.status == VOND_STATUS_OK) {
        if (working->width > kMaxWorkingSide || working->height > kMaxWorkingSide) {
            step = vond::Fail(result, VOND_STATUS_FAILED,
                              "pImageForCALib->width > ZBM_UINT16_MAX || pImageForCALib->height > ZBM_UINT16_MAX");
        } else {
            meta.analyzedWidth = static_cast<uint16_t>(working->width);
            meta.analyzedHeight = static_cast<uint16_t>(working->height);
            step = VondCALibAnalyze(working, meta.faceMeta, meta.attentionAreas, meta.caLibVersion);
        }
    }
    if (step.status != VOND_STATUS_OK) {
        VondDisposeMeta(pMetaOut);
        return step;
    }
    return result;
}
