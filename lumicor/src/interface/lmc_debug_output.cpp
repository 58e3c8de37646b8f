// Debug PPM images of an analysed photo (see lmc_debug_output.h).
#include "lumicor/src/interface/lmc_debug_output.h"

#include "common/src/internal/memory.h"
#include "common/src/internal/ppm.h"
#include "lumicor/src/driver/host_pixel_order.h"
#include "lumicor/src/interface/lmc_log.h"

#include <lumicor/lmk.h>
#include <lumicor/zbm_image.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string>

namespace {

// Plain global like the initialised flag: one caller at a time.
uint32_t s_debugImageCounter = 0;

const zbm_PackedUchar kFaceColour = {{255, 0, 0, 0}};
const zbm_PackedUchar kAreaColour = {{0, 0, 255, 0}};

// Reads a [Debug] string of module Lumicor. Lookups build std::string values;
// running out of memory there only means the setting cannot be read.
bool ReadDebugSetting(const char* key, const char* defaultValue, std::string* value) {
    try {
        *value = LmkConfig::GetValueString("Lumicor", "Debug", key, defaultValue);
        return true;
    } catch (...) {
        return false;
    }
}

// A flag is on only when its value is exactly "true" (case-sensitive).
bool IsFlagOn(const char* key) {
    std::string value;
    return ReadDebugSetting(key, "false", &value) && value == "true";
}

// Private owning copy of the host photo (createZbmImage): the host's own order
// for byte buffers, RGB for 32-bit ARGB words.
ZbmImagePtr CreateZbmImage(const LmcImage& host) {
    _zbm_PixelOrder order;
    if (vond::HostOrderToZbm(host.order, &order)) {
        if (host.pBuf == nullptr) return ZbmImagePtr();
        ZbmImagePtr copy(ZbiuCreateFromData(host.pBuf, host.width, host.height, host.pitch, order));
        if (!copy) LMC_LOG_ERROR("%s(%d): ZbiuCreateFromData() failed\n");
        return copy;
    }
    if (host.order != vond::kHostOrderInt32Argb || host.pBufInt32 == nullptr) return ZbmImagePtr();
    if (host.pitch % 4 != 0) {
        LMC_LOG_ERROR("%s(%d): pImage->pitch %% 4 != 0\n");
        return ZbmImagePtr();
    }
    ZbmImagePtr copy(ZbiuCreate(host.width, host.height, ZBM_PIXEL_ORDER_RGB));
    if (!copy) {
        LMC_LOG_ERROR("%s(%d): ZbiuCreate() failed\n");
        return copy;
    }
    vond::CopyInt32ArgbToRgb(host.pBufInt32, host.pitch, copy.get());
    return copy;
}

// Truncation toward zero of a scaled fraction. Fractions read back from a
// stored blob are arbitrary floats: NaN becomes 0 and values beyond int32 are
// clamped, so the conversion is always defined.
int32_t TruncToInt(float v) {
    if (std::isnan(v)) return 0;
    if (v >= 2147483520.0f) return std::numeric_limits<int32_t>::max();
    if (v <= -2147483648.0f) return std::numeric_limits<int32_t>::min();
    return static_cast<int32_t>(v);
}

void DrawAnalysisResult(_zbm_Image* image, const _VondMeta& meta) {
    const uint32_t faceCount = meta.faceMeta.pRegions != nullptr ? meta.faceMeta.regionCount : 0;
    const _CAAttentionAreaArray& areas = meta.attentionAreas;
    const uint32_t areaCount = areas.pAreaArray != nullptr ? areas.numAreas : 0;

    char text[32];
    std::snprintf(text, sizeof text, "face num: %u", static_cast<unsigned>(faceCount));
    ZbiuDrawString(image, text, zbm_Pos{0, 0}, ZBM_ALIGNMENT_TOP_LEFT, kFaceColour);
    std::snprintf(text, sizeof text, "area num: %u", static_cast<unsigned>(areaCount));
    ZbiuDrawString(image, text, zbm_Pos{0, 10}, ZBM_ALIGNMENT_TOP_LEFT, kAreaColour);

    for (uint32_t i = 0; i < faceCount; ++i) {
        const zbm_Rect box = meta.faceMeta.pRegions[i].faceArea;  // copied out of the packed record
        ZbiuDrawRectangle(image, box, kFaceColour, 1, nullptr);
    }
    const float w = static_cast<float>(image->width);
    const float h = static_cast<float>(image->height);
    for (uint32_t i = 0; i < areaCount; ++i) {
        const CAAttentionArea& a = areas.pAreaArray[i];
        const zbm_Rect box = {TruncToInt(w * a.nx), TruncToInt(h * a.ny), TruncToInt(w * a.nw), TruncToInt(h * a.nh)};
        ZbiuDrawRectangle(image, box, kAreaColour, 1, nullptr);
    }
}

// dir + "/" + name + counter + ".ppm" in a heap buffer; null when out of memory.
lmk::MallocPtr<char> MakePath(const std::string& dir, const char* name, uint32_t counter) {
    const size_t size = dir.size() + std::strlen(name) + 32;
    lmk::MallocPtr<char> path(static_cast<char*>(std::malloc(size)));
    if (path) std::snprintf(path.get(), size, "%s/%s%u.ppm", dir.c_str(), name, static_cast<unsigned>(counter));
    return path;
}

// Reads the directory setting `dirKey` and writes `image` there; logs and
// returns false on any failure.
bool SaveDebugImage(const _zbm_Image* image, const char* dirKey, const char* emptyDirMessage, const char* name,
                    uint32_t counter) {
    std::string dir;
    if (!ReadDebugSetting(dirKey, "", &dir)) return false;
    if (dir.empty()) {
        LMC_LOG_ERROR(emptyDirMessage);
        return false;
    }
    lmk::MallocPtr<char> path = MakePath(dir, name, counter);
    if (!path) return false;
    if (zbiuSaveToPpm(path.get(), image) != 0) {
        LMC_LOG_ERROR("%s(%d): zbiuSaveToPpm(\"%s\"): failed\n", path.get());
        return false;
    }
    return true;
}

}  // namespace

uint32_t lmc::DebugImageCounter() { return s_debugImageCounter; }
void lmc::AdvanceDebugImageCounter() { ++s_debugImageCounter; }

uint32_t outputPpmImagesForDebug(const LmcImage* pImage, const _VondMeta* pMeta) {
    const bool saveInput = IsFlagOn("SaveInputImage");
    const bool saveResult = IsFlagOn("SaveAnalyzeResultImage");
    if (!saveInput && !saveResult) return LMC_STATUS_OK;
    if (pImage == nullptr || pMeta == nullptr) return LMC_STATUS_FAILED;

    ZbmImagePtr copy = CreateZbmImage(*pImage);
    if (!copy) {
        LMC_LOG_ERROR("%s(%d): createZbmImage(): failed\n");
        return LMC_STATUS_FAILED;
    }
    const uint32_t counter = s_debugImageCounter;
    if (saveInput &&
        !SaveDebugImage(copy.get(), "SaveInputImageDir",
                        "%s(%d): in lmc.conf, [Debug] SaveInputImageDir == \"\"\n", "out_", counter))
        return LMC_STATUS_FAILED;
    if (saveResult) {
        DrawAnalysisResult(copy.get(), *pMeta);
        if (!SaveDebugImage(copy.get(), "SaveAnalyzeResultImageDir",
                            "%s(%d): in lmc.conf, [Debug] SaveAnalyzeResultImageDir == \"\"\n", "out_result_",
                            counter))
            return LMC_STATUS_FAILED;
    }
    return LMC_STATUS_OK;
}
