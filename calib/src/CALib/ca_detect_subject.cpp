// Entry points of subject detection: CADetectSubject, CADisposeAttentionAreaArray
// and CAGetLibVersion.
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

#include <lumicor/calib.h>
#include <lumicor/zbm_image.h>

#include "calib/src/CALib/ca_common.h"
#include "calib/src/CALib/ca_interface.h"
#include "calib/src/arrange/va_arrange.h"
#include "calib/src/plane/image_plane.h"

namespace {

constexpr const char kFunction[] = "CADetectSubject";

void Refuse(int line, const char* condition) { CA::ReportInvalidParams(CA::kEntrySource, line, kFunction, condition); }

void Failed(int line, const char* step) { CA::ReportFailed(kFunction, line, step); }

}  // namespace

extern "C" _CALibVersion CAGetLibVersion(void) {
    _CALibVersion v;
    std::memset(&v, 0, sizeof v);
    std::memcpy(v.text, "1.2.2.1217", 10);
    return v;
}

extern "C" uint32_t CADisposeAttentionAreaArray(_CAAttentionAreaArray* array) {
    if (array == nullptr) {
        CA::ReportMessage("CADisposeAttentionAreaArray", __LINE__, "CAAttentionAreaArray is NULL");
        return 3;
    }
    if (array->pAreaArray != nullptr) {
        array->isFace = 0;
        array->numAreas = 0;
        delete[] array->pAreaArray;
        array->pAreaArray = nullptr;
    }
    return 0;
}

extern "C" uint32_t CADetectSubject(const uint8_t* pBuf, uint32_t width, uint32_t height, int32_t rowstride,
                                    _CAColorOrder order, const _CAFaceInfoArray* pFaceInfoArray,
                                    _CAAttentionAreaArray* pAttentionAreaArray) {
    if (pBuf == nullptr) {
        Refuse(__LINE__, "pBuf == NULL");
        return 3;
    }
    if (width < MIN_LENGTH) {
        Refuse(__LINE__, "width < MIN_LENGTH");
        return 3;
    }
    if (height < MIN_LENGTH) {
        Refuse(__LINE__, "height < MIN_LENGTH");
        return 3;
    }
    // Three bytes per pixel are required whatever the order; compared without
    // overflow.
    const int64_t pitch = rowstride < 0 ? -static_cast<int64_t>(rowstride) : rowstride;
    if (pitch < static_cast<int64_t>(width) * 3) {
        Refuse(__LINE__, "static_cast<unsigned int>(abs(rowstride)) < width * 3");
        return 3;
    }
    if (pFaceInfoArray && pFaceInfoArray->numFaces && pFaceInfoArray->pInfoArray == nullptr) {
        Refuse(__LINE__, "pFaceInfoArray && pFaceInfoArray->numFaces && pFaceInfoArray->pInfoArray == NULL");
        return 3;
    }
    if (pAttentionAreaArray == nullptr) {
        Refuse(__LINE__, "pAttentionAreaArray == NULL");
        return 3;
    }
    // The host's pixels are only read.
    const int64_t order1 = static_cast<int64_t>(order) + 1;
    ZbmImagePtr source(width > INT32_MAX || height > INT32_MAX || order1 < 0 || order1 >= ZBM_PIXEL_ORDER_NUM
                           ? nullptr
                           : ZbiuCreateAttatchData(const_cast<uint8_t*>(pBuf), static_cast<int32_t>(width),
                                                   static_cast<int32_t>(height), rowstride,
                                                   static_cast<_zbm_PixelOrder>(order1)));
    if (!source) {
        Failed(__LINE__, "ZbiuCreateAttatchData");
        return 2;
    }
    std::unique_ptr<CAinterface> ca(new (std::nothrow) CAinterface());
    if (!ca) {
        Failed(__LINE__, "CA_NEW");
        return 4;
    }
    // The 40 image is made here with the 640 one so that a large photo is
    // read once: the 40 reduction continues from the 640 one's halvings.
    ZbmImagePtr image640, image40;
    if (!ca->CreateShrinkImages(source.get(), 640, 40, &image640, &image40)) {
        Failed(__LINE__, "CreateShrinkImage");
        return 2;
    }
    std::unique_ptr<VAArrange> list(new (std::nothrow) VAArrange());
    if (!list) {
        Failed(__LINE__, "CA_NEW");
        return 4;
    }
    MIPlane* plane = ca->CreateMIPlane(image640.get());
    if (plane == nullptr) {
        Failed(__LINE__, "CreateMIPlane");
        return 2;
    }
    const uint32_t detected = ca->Detect(plane, pFaceInfoArray, list.get());
    ca->DisposeMIPlane(&plane);
    if (detected != 0) {
        Failed(__LINE__, "Detect");
        return detected;
    }
    const uint32_t arranged = ca->ArrangeVa(image40.get(), list.get());
    if (arranged != 0) {
        Failed(__LINE__, "ArrangeVa");
        return arranged;
    }
    const uint32_t created = list->CreateAttentionAreaArray(image40->width, image40->height, pAttentionAreaArray);
    if (created != 0) {
        Failed(__LINE__, "CreateAttentionAreaArray");
        return created;
    }
    return 0;
}
