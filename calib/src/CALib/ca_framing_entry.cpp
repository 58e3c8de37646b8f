// Entry points of the framing search: CAGetDefaultParam and CASearchFraming.
#include <cmath>
#include <cstdint>
#include <new>

#include <lumicor/calib.h>

#include "calib/src/CALib/ca_common.h"
#include "calib/src/framing/framing_search.h"
#include "calib/src/framing/va_marge.h"
#include "common/src/internal/memory.h"

namespace {

constexpr float MIN_ASPECT_RATIO = 0.1f;
constexpr float MAX_ASPECT_RATIO = 10.0f;
constexpr float MAGNIFICATION_LIMIT = 100.0f;
// Largest photo side the framing accepts: pixel crops are 32-bit and every
// side must be exact as a float.
constexpr uint32_t MAX_LENGTH = 1u << 24;

constexpr const char kFunction[] = "CASearchFraming";

void Refuse(int line, const char* condition) {
    CA::ReportInvalidParams(CA::kEntrySource, line, kFunction, condition);
}

}  // namespace

extern "C" uint32_t CAGetDefaultParam(_CAParam* pParam) {
    if (pParam == nullptr) {
        CA::ReportMessage("CAGetDefaultParam", 114, "Invalid params");
        return 3;
    }
    pParam->composition_mode = 4;
    pParam->aspect_ratio = 1.0f;
    pParam->magnification_limit = 10.0f;
    pParam->consistency_weight_min = 0.1f;
    pParam->force_main_number = CA_NONE_SPECIFIED;
    return 0;
}

extern "C" uint32_t CASearchFraming(uint32_t width, uint32_t height, const _CAParam* pParam,
                                    const _CAAttentionAreaArray* pAttentionAreaArray,
                                    _CAResult* pResult) {
    if (width < MIN_LENGTH) {
        Refuse(134, "width < MIN_LENGTH");
        return 3;
    }
    if (height < MIN_LENGTH) {
        Refuse(135, "height < MIN_LENGTH");
        return 3;
    }
    if (pParam == nullptr) {
        Refuse(136, "pParam == NULL");
        return 3;
    }
    // Written as negations so that NaN is refused as well.
    if (!(pParam->aspect_ratio >= MIN_ASPECT_RATIO)) {
        Refuse(137, "pParam->aspect_ratio < MIN_ASPECT_RATIO");
        return 3;
    }
    if (!(pParam->aspect_ratio <= MAX_ASPECT_RATIO)) {
        Refuse(138, "pParam->aspect_ratio > MAX_ASPECT_RATIO");
        return 3;
    }
    if (!(pParam->magnification_limit >= 1.0f && pParam->magnification_limit <= MAGNIFICATION_LIMIT)) {
        Refuse(139, "pParam->magnification_limit < 1.0f || MAGNIFICATION_LIMIT < pParam->magnification_limit");
        return 3;
    }
    // Compared as unsigned numbers: any negative index other than -1 fails too.
    if (pAttentionAreaArray != nullptr && pParam->force_main_number != CA_NONE_SPECIFIED &&
        pAttentionAreaArray->numAreas <= static_cast<uint32_t>(pParam->force_main_number)) {
        Refuse(140, "pParam->force_main_number != CA_NONE_SPECIFIED && pAttentionAreaArray->numAreas <= pParam->force_main_number");
        return 3;
    }
    if (pAttentionAreaArray == nullptr) {
        Refuse(141, "pAttentionAreaArray == NULL");
        return 3;
    }
    if (pResult == nullptr) {
        Refuse(142, "pResult == NULL");
        return 3;
    }
    // Checks beyond the historical list keep line tags of their own.
    if (width > MAX_LENGTH) {
        Refuse(150, "width > MAX_LENGTH");
        return 3;
    }
    if (height > MAX_LENGTH) {
        Refuse(151, "height > MAX_LENGTH");
        return 3;
    }
    if (!std::isfinite(pParam->consistency_weight_min)) {
        Refuse(152, "!isfinite(pParam->consistency_weight_min)");
        return 3;
    }
    // Only the first 16 areas are framed; a main area beyond them does not exist.
    if (pParam->force_main_number != CA_NONE_SPECIFIED &&
        static_cast<uint32_t>(pParam->force_main_number) >= static_cast<uint32_t>(VA::kMaxAreas)) {
        Refuse(153, "pParam->force_main_number != CA_NONE_SPECIFIED && MAX_AREAS <= pParam->force_main_number");
        return 3;
    }

    std::unique_ptr<VAMarge> marge(new (std::nothrow) VAMarge(pParam));
    if (!marge) {
        CA::ReportFailed(kFunction, 146, "CA_NEW");
        return 4;
    }

    int gridWidth;
    int gridHeight;
    FramingSearch::GridSize(width, height, &gridWidth, &gridHeight);

    uint32_t status = marge->SetAttentionAreaArray(gridWidth, gridHeight, pAttentionAreaArray);
    if (status != 0) {
        CA::ReportFailed(kFunction, 168, "SetAttentionAreaArray");
        return status;
    }
    marge->ReAdjust(gridWidth, gridHeight, static_cast<unsigned int>(pParam->force_main_number));
    marge->Marge(gridWidth, gridHeight);

    FramingSearch search(static_cast<int>(width), static_cast<int>(height), gridWidth, gridHeight);
    status = search.Search(pParam, marge.get(), pResult);
    if (status != 0) CA::ReportFailed(kFunction, 179, "Search()");
    return status;
}
