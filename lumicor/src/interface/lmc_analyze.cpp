// LmcAnalyzePhoto: one host photo into a photo meta blob owned by the host.
#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include "common/src/internal/memory.h"
#include "lumicor/src/interface/lmc_debug_output.h"
#include "lumicor/src/interface/lmc_log.h"
#include "lumicor/src/interface/lmc_state.h"

#include <cstdint>
#include <cstring>
#include <new>

namespace {

// The driver configuration of the exported interface: dictionary mode 7,
// face engine parameter 1.0, a face working image of 76,800 pixels.
const _VondConfig kInterfaceConfig = {7, 1.0f, 76800};

// A driver status as the interface reports it: out of memory stays out of
// memory, anything else is a failure.
uint32_t InterfaceStatus(uint32_t driverStatus) {
    return driverStatus == VOND_STATUS_OUT_OF_MEMORY ? LMC_STATUS_OUT_OF_MEMORY : LMC_STATUS_FAILED;
}

const char* OrEmpty(const char* text) { return text != nullptr ? text : ""; }

// Logs a failed driver call: "[function] message".
void LogDriverFailure(const _VondResult& r) {
    LMC_LOG_ERROR("%s(%d): [%s] %s\n", OrEmpty(r.function), OrEmpty(r.message));
}

}  // namespace

extern "C" uint32_t LmcAnalyzePhoto(const LmcImage* pImage, int32_t nFaceRectCount, const LmcFaceRect* pFaceRectArray,
                                    LmcPhotoMeta* pMetaOut) {
    if (!lmc::IsInitialized()) return LMC_STATUS_FAILED;
    if (pMetaOut == nullptr) {
        LMC_LOG_ERROR("%s(%d): LmcAnalyzePhoto(): pMetaOut == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    // Empty from here on, so that it is empty on every failure.
    pMetaOut->nBufferSize = 0;
    pMetaOut->pMeta = nullptr;

    // The order is a 32-bit signed field that a host may fill with any value;
    // it is read as such, since a C++ enumeration cannot hold all of them.
    int32_t order = 0;
    if (pImage != nullptr) std::memcpy(&order, &pImage->order, sizeof order);
    if (pImage == nullptr || pImage->width <= 0 || pImage->height <= 0 || pImage->pitch == 0 ||
        order >= LMC_PIXEL_ORDER_MAX) {
        LMC_LOG_ERROR(
            "%s(%d): LmcAnalyzePhoto(): pImage == NULL || pImage->width <= 0 || pImage->height <= 0 || "
            "pImage->pitch == 0 || pImage->order >= LMC_PIXEL_ORDER_MAX\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    if (nFaceRectCount < -1 || (nFaceRectCount >= 1 && pFaceRectArray == nullptr)) {
        LMC_LOG_ERROR("%s(%d): LmcAnalyzePhoto(): nFaceRectCount < -1 || nFaceRectCount >= 1 && pFaceRectArray == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    static_assert(sizeof(LmcPixelOrder) == sizeof(int32_t), "the order is a 32-bit field");
    const bool int32Order = order == LMC_PIXEL_ORDER_INT32_ARGB;
    if (!int32Order && pImage->pBuf == nullptr) {
        LMC_LOG_ERROR("%s(%d): LmcAnalyzePhoto(): pImage->order != LMC_PIXEL_ORDER_INT32_ARGB && pImage->pBuf == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    if (int32Order && pImage->pBufInt32 == nullptr) {
        LMC_LOG_ERROR(
            "%s(%d): LmcAnalyzePhoto(): pImage->order == LMC_PIXEL_ORDER_INT32_ARGB && pImage->pBufInt32 == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }

    _VondMeta meta;
    std::memset(&meta, 0, sizeof meta);
    // The driver reads the host's buffer through this record (its own
    // numbering of the pixel orders); nothing is copied and nothing written.
    _zbm_Image wrapper;
    std::memset(&wrapper, 0, sizeof wrapper);
    wrapper.pData = int32Order ? reinterpret_cast<uint8_t*>(const_cast<uint32_t*>(pImage->pBufInt32))
                               : const_cast<uint8_t*>(pImage->pBuf);
    wrapper.width = pImage->width;
    wrapper.height = pImage->height;
    wrapper.pitch = pImage->pitch;
    std::memcpy(&wrapper.order, &order, sizeof order);  // the driver reads it the same way

    lmk::UniqueArray<_VondFaceRect> rects;
    if (nFaceRectCount >= 1) {
        rects = lmk::NewArray<_VondFaceRect>(static_cast<size_t>(nFaceRectCount));
        if (!rects) {
            LMC_LOG_ERROR("%s(%d): LMK_NEW failed\n");
            return LMC_STATUS_OUT_OF_MEMORY;
        }
        static_assert(sizeof(_VondFaceRect) == sizeof(LmcFaceRect), "face boxes are passed through unchanged");
        std::memcpy(rects.get(), pFaceRectArray, sizeof(LmcFaceRect) * static_cast<size_t>(nFaceRectCount));
    }

    uint32_t code = LMC_STATUS_OK;
    const _VondResult analysed = VondAnalyze(&wrapper, nFaceRectCount, rects.get(), &kInterfaceConfig, &meta);
    if (analysed.status != VOND_STATUS_OK) {
        code = InterfaceStatus(analysed.status);
        LogDriverFailure(analysed);
        LMC_LOG_ERROR("%s(%d): result.status = %d\n", static_cast<int>(analysed.status));
        if (analysed.status == VOND_STATUS_INVALID_PARAMETER) {
            // Pointers as the 32-bit values they are on the target.
            LMC_LOG_ERROR("%s(%d): pBuf = 0x%08x\n",
                          static_cast<unsigned>(reinterpret_cast<uintptr_t>(pImage->pBuf)));
            LMC_LOG_ERROR("%s(%d): pBufInt32 = 0x%08x\n",
                          static_cast<unsigned>(reinterpret_cast<uintptr_t>(pImage->pBufInt32)));
            LMC_LOG_ERROR("%s(%d): width = %d\n", pImage->width);
            LMC_LOG_ERROR("%s(%d): height = %d\n", pImage->height);
            LMC_LOG_ERROR("%s(%d): pitch = %d\n", pImage->pitch);
            LMC_LOG_ERROR("%s(%d): order = %d\n", static_cast<int>(order));
        }
    } else {
        const uint32_t debug = outputPpmImagesForDebug(pImage, &meta);
        // Every analysed photo counts, whether or not images were written.
        lmc::AdvanceDebugImageCounter();
        if (debug != LMC_STATUS_OK) {
            LMC_LOG_ERROR("%s(%d): outputPpmImagesForDebug() failed\n");
            code = LMC_STATUS_FAILED;
        }
    }

    uint32_t size = 0;
    if (code == LMC_STATUS_OK) {
        const _VondResult sized = VondGetSerializedSize(&meta, &size);
        if (sized.status != VOND_STATUS_OK) {
            code = InterfaceStatus(sized.status);
            LogDriverFailure(sized);
        }
    }
    if (code == LMC_STATUS_OK) {
        pMetaOut->nBufferSize = size;
        pMetaOut->pMeta = new (std::nothrow) uint8_t[size];
        if (pMetaOut->pMeta == nullptr) {
            // Reported as what it is rather than as the serialiser's refusal
            // of a null buffer.
            LMC_LOG_ERROR("%s(%d): LMK_NEW failed\n");
            code = LMC_STATUS_OUT_OF_MEMORY;
        } else {
            const _VondResult written = VondSerializeMeta(&meta, size, pMetaOut->pMeta);
            if (written.status != VOND_STATUS_OK) {
                code = InterfaceStatus(written.status);
                LogDriverFailure(written);
            }
        }
    }

    VondDisposeMeta(&meta);
    if (code != LMC_STATUS_OK) LmcDisposePhotoMeta(pMetaOut);
    return code;
}
