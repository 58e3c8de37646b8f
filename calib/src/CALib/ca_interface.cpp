#include "calib/src/CALib/ca_interface.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <cstdio>
#include <cstring>
#include <new>

#include "calib/src/CALib/ca_common.h"
#include "calib/src/arrange/va_arrange.h"
#include "calib/src/attention/visual_attention.h"
#include "calib/src/plane/image_plane.h"
#include "common/src/image/resize.h"
#include "common/src/internal/memory.h"
#include "common/src/internal/portable_math.h"
#include <lumicor/lmk.h>
#include "oriel/src/pixdif/pixdif_detector.h"

namespace {

constexpr double kPi = 3.14159265358979323846;

// Truncation toward zero of a pixel coordinate; non-finite or huge values
// from the host are held to +-2^24.
int32_t ToPixel(float v) {
    if (!(v == v)) return 0;
    if (v > 16777216.0f) return 16777216;
    if (v < -16777216.0f) return -16777216;
    return static_cast<int32_t>(v);
}

}  // namespace

CAinterface::CAinterface() : saliencyMap(nullptr), useFaceInfo(1), debugOutput(0), combineRects(1) {
    std::memset(outputDir, 0, sizeof outputDir);
    std::strcpy(outputDir, "./out");
}

CAinterface::~CAinterface() { ZbiuDispose(&saliencyMap); }

namespace {

// Size of the copy whose longer side is `size`; true when the image is small
// enough to be used as it is.
bool ShrinkSize(const _zbm_Image* image, int32_t size, int32_t* w, int32_t* h) {
    const float ratio = static_cast<float>(image->height) / static_cast<float>(image->width);
    if (ratio <= 1.0f) {
        *w = size;
        *h = static_cast<int32_t>(std::floor(0.5f + static_cast<float>(size) * ratio));
        return image->width <= size;
    }
    *w = static_cast<int32_t>(std::floor(static_cast<float>(size) / ratio + 0.5f));
    *h = size;
    return image->height <= size;
}

}  // namespace

_zbm_Image* CAinterface::CreateShrinkImage(const _zbm_Image* image, int32_t size) {
    if (image == nullptr) return nullptr;
    int32_t w, h;
    if (ShrinkSize(image, size, &w, &h)) {
        _zbm_Image* copy = ZbiuCreateAttatchData(image->pData, image->width, image->height, image->pitch, image->order);
        if (copy == nullptr) CA::ReportFailed("CreateShrinkImage", __LINE__, "ZbiuCreateAttatchData");
        return copy;
    }
    ZbmImagePtr small(ZbiuCreate(w, h, image->order));
    if (!small) {
        CA::ReportFailed("CreateShrinkImage", __LINE__, "ZbiuCreate");
        return nullptr;
    }
    if (ZbiuResize(image, small.get()) != 0) {
        CA::ReportFailed("CreateShrinkImage", __LINE__, "ZbiuResize");
        return nullptr;
    }
    return small.release();
}

bool CAinterface::CreateShrinkImages(const _zbm_Image* image, int32_t size, int32_t secondSize, ZbmImagePtr* first,
                                     ZbmImagePtr* second) {
    first->reset();
    second->reset();
    if (image == nullptr) return false;
    int32_t w[2], h[2];
    const bool attach0 = ShrinkSize(image, size, &w[0], &h[0]);
    const bool attach1 = ShrinkSize(image, secondSize, &w[1], &h[1]);
    if (attach0 || attach1) {
        // At most one reduction: nothing to share.
        first->reset(CreateShrinkImage(image, size));
        if (*first) second->reset(CreateShrinkImage(image, secondSize));
        if (!*second) first->reset();
        return static_cast<bool>(*second);
    }
    ZbmImagePtr small[2];
    for (int i = 0; i < 2; ++i) {
        small[i].reset(ZbiuCreate(w[i], h[i], image->order));
        if (!small[i]) {
            CA::ReportFailed("CreateShrinkImage", __LINE__, "ZbiuCreate");
            return false;
        }
    }
    _zbm_Image* const targets[2] = {small[0].get(), small[1].get()};
    if (lmk::image::ResizeEach(image, targets, 2) != 0) {
        CA::ReportFailed("CreateShrinkImage", __LINE__, "ZbiuResize");
        return false;
    }
    *first = std::move(small[0]);
    *second = std::move(small[1]);
    return true;
}

MIPlane* CAinterface::CreateMIPlane(const _zbm_Image* image) {
    if (image == nullptr) return nullptr;
    const int32_t w = image->width, h = image->height;
    lmk::UniqueArray<uint8_t> packed;
    const uint8_t* pixels = image->pData;
    if (image->order != ZBM_PIXEL_ORDER_RGB || image->pitch != 3 * w) {
        int32_t o[3];
        switch (image->order) {
            case ZBM_PIXEL_ORDER_RGB:
            case ZBM_PIXEL_ORDER_RGBA: o[0] = 0, o[1] = 1, o[2] = 2; break;
            case ZBM_PIXEL_ORDER_BGR:
            case ZBM_PIXEL_ORDER_BGRA: o[0] = 2, o[1] = 1, o[2] = 0; break;
            case ZBM_PIXEL_ORDER_ARGB: o[0] = 1, o[1] = 2, o[2] = 3; break;
            default:
                CA::ReportMessage("CreateMIPlane", __LINE__, "not implementation");
                return nullptr;
        }
        packed = lmk::NewArray<uint8_t>(static_cast<size_t>(w) * static_cast<size_t>(h) * 3);
        if (!packed) {
            CA::ReportFailed("CreateMIPlane", __LINE__, "CA_NEW");
            return nullptr;
        }
        uint8_t* out = packed.get();
        for (int32_t y = 0; y < h; ++y) {
            const uint8_t* row = ZbiuGetConstPointer(image, 0, y);
            for (int32_t x = 0; x < w; ++x, row += image->bytesPerPixel) {
                *out++ = row[o[0]];
                *out++ = row[o[1]];
                *out++ = row[o[2]];
            }
        }
        pixels = packed.get();
    }
    MIPlane* plane = new (std::nothrow) MIPlane();
    if (plane == nullptr) {
        CA::ReportFailed("CreateMIPlane", __LINE__, "CA_NEW");
        return nullptr;
    }
    if (plane->iInit(w, h, 4) != 0) {
        CA::ReportFailed("CreateMIPlane", __LINE__, "MIPlane->iInit()");
        delete plane;
        return nullptr;
    }
    if (plane->iCopyPixel(pixels, w, h) != 0) {
        CA::ReportFailed("CreateMIPlane", __LINE__, "MIPlane->iCopyPixel()");
        delete plane;
        return nullptr;
    }
    return plane;
}

uint32_t CAinterface::DisposeMIPlane(MIPlane** plane) {
    if (plane != nullptr) {
        delete *plane;
        *plane = nullptr;
    }
    return 0;
}

int32_t CAinterface::DirectionCode(float roll, float pitch, float yaw) {
    const float a = static_cast<float>(static_cast<double>(yaw) / (kPi / 2));
    const float b = static_cast<float>(static_cast<double>(pitch) / (kPi / 2));
    const float r = static_cast<float>(std::sqrt(static_cast<double>(a) * a + static_cast<double>(b) * b));
    if (r <= 1.0f / 18.0f) return 0;
    const float theta = static_cast<float>(lmk::Atan2(-static_cast<double>(b), static_cast<double>(a)));
    float phi = theta + roll;
    if (phi < -kPi) {
        phi = static_cast<float>(phi + 2 * kPi);
    } else if (phi >= kPi) {
        phi = static_cast<float>(phi - 2 * kPi);
    }
    if (phi == 0.0f) return 0;
    const double p = phi;
    if (p >= -kPi / 8 && p < kPi / 8) return 1;
    if (p >= kPi / 8 && p < 3 * kPi / 8) return 2;
    if (p >= 3 * kPi / 8 && p < 5 * kPi / 8) return 3;
    if (p >= 5 * kPi / 8 && p < 7 * kPi / 8) return 4;
    if ((p >= 7 * kPi / 8 && p < kPi) || (p >= -kPi && p < -7 * kPi / 8)) return 5;
    if (p >= -7 * kPi / 8 && p < -5 * kPi / 8) return 6;
    if (p >= -5 * kPi / 8 && p < -3 * kPi / 8) return 7;
    if (p >= -3 * kPi / 8 && p < -kPi / 8) return 8;
    return 0;  // outside one turn even after wrapping: undetermined
}

uint32_t CAinterface::Detect(const MIPlane* plane, const _CAFaceInfoArray* faces, VAArrange* list) {
    if (plane == nullptr || list == nullptr) return 3;
    std::strncpy(param.outputPath, outputDir, sizeof param.outputPath - 1);
    param.outputPath[sizeof param.outputPath - 1] = '\0';
    if (debugOutput) {
        const char* name = "param.txt";
        // fopen_s refuses a path that names a directory.
        std::FILE* fp = nullptr;
        if (lmk::fopen_s(&fp, name, "w") != 0 || fp == nullptr) {
            std::fprintf(stderr, "No write file: %s\n", name);
            return 11;
        }
        param.vOutputParam(fp);
        std::fclose(fp);
    }
    if (useFaceInfo && faces != nullptr && faces->numFaces != 0) {
        const int32_t W = plane->width, H = plane->height;
        const int32_t count = faces->numFaces < 0 ? 0 : (faces->numFaces > VA::kMaxAreas ? VA::kMaxAreas : faces->numFaces);
        list->num = count;
        for (int32_t i = 0; i < count; ++i) {
            const CAFaceInfo& f = faces->pInfoArray[i];
            list->x[i] = ToPixel(static_cast<float>(W) * f.nx);
            list->y[i] = ToPixel(static_cast<float>(H) * f.ny);
            list->width[i] = ToPixel(static_cast<float>(W) * f.nw);
            list->height[i] = ToPixel(static_cast<float>(H) * f.nh);
            list->val[i] = 255;
            list->isFace[i] = 1;
            list->direction[i] = DirectionCode(f.roll, f.pitch, f.yaw);
        }
        ZbiuDispose(&saliencyMap);
        saliencyMap = ZbiuCreate(W, H, ZBM_PIXEL_ORDER_GRAY);
        if (saliencyMap == nullptr) {
            CA::ReportFailed("Detect", __LINE__, "ZbiuCreate");
            return 2;
        }
        for (int32_t i = 0; i < count; ++i) {
            const int64_t x0 = std::max<int64_t>(list->x[i], 0), y0 = std::max<int64_t>(list->y[i], 0);
            const int64_t x1 = std::min<int64_t>(static_cast<int64_t>(list->x[i]) + list->width[i], W);
            const int64_t y1 = std::min<int64_t>(static_cast<int64_t>(list->y[i]) + list->height[i], H);
            for (int64_t y = y0; y < y1; ++y) {
                std::memset(ZbiuGetPointer(saliencyMap, static_cast<int32_t>(x0), static_cast<int32_t>(y)), 255,
                            static_cast<size_t>(x1 > x0 ? x1 - x0 : 0));
            }
        }
        return 0;
    }
    return Do_VA(plane, param, list);
}

uint32_t CAinterface::Do_VA(const MIPlane* plane, ParamMem prm, VAArrange* list) {
    std::unique_ptr<VisualAttention> va(new (std::nothrow) VisualAttention());
    if (!va) {
        CA::ReportFailed("Do_VA", __LINE__, "CA_NEW");
        return 4;
    }
    if (prm.TestInputImgFormat == 2) {
        MIPlane temporary;
        if (temporary.iInit(plane->width, plane->height, 2) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "MIPlane iInit");
            return 1;
        }
        if (VisualAttention::iRGB2YCbCr(plane, &temporary) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iRGB2YCbCr");
            return 1;
        }
        if (va->iInit(&temporary, &prm) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iInit");
            return 1;
        }
    } else if (va->iInit(plane, &prm) != 0) {
        CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iInit");
        return 1;
    }
    std::unique_ptr<orielcore_VA::PixDifTreeDetector> detector(new (std::nothrow) orielcore_VA::PixDifTreeDetector());
    if (!detector || !detector->AllocateMemory(plane->width, plane->height, 20, 1024)) {
        CA::ReportFailed("Do_VA", __LINE__, "ORIEL AllocateMemory");
        return 4;
    }
    orielcore_VA::SPooledList results;
    detector->CreateEmptyResultHolder(&results);

    if (va->iCreateSaliency(detector.get(), &results) != 0) {
        CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iCreateSaliency");
        return 1;
    }
    ImagePlane* map = nullptr;
    if (va->iGetSaliencyMap(&map) != 0) {
        CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iGetSaliencyMap");
        return 1;
    }
    char name[ParamVA::kTextSize + 32];
    if (debugOutput) {
        std::snprintf(name, sizeof name, "%s_saliency.pgm", prm.outputPath);
        if (save_pgm(map->pBuf, map->width, map->height, name) != 0) return 11;
    }
    ZbiuDispose(&saliencyMap);
    saliencyMap = ZbiuCreateFromData(map->pBuf, map->width, map->height, map->width, ZBM_PIXEL_ORDER_GRAY);
    if (saliencyMap == nullptr) {
        CA::ReportFailed("Do_VA", __LINE__, "ZbiuCreateFromData");
        return 2;
    }
    if (!prm.SalRectFlag) return 0;
    if (prm.SalRectGradFlag) {
        ImagePlane* gradient = nullptr;
        if (va->iGetGradientSaliencyMap(&gradient) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iGetGradientSaliencyMap");
            return 1;
        }
        if (prm.OutputDebugDump) {
            std::snprintf(name, sizeof name, "%s_gradient.pgm", prm.outputPath);
            save_pgm(gradient->pBuf, gradient->width, gradient->height, name);
        }
    }
    auto take = [&](int32_t count, const tagVA_RECT* rects, const char* csvName) -> uint32_t {
        const int32_t n = count < 0 ? 0 : (count > VA::kMaxAreas ? VA::kMaxAreas : count);
        for (int32_t i = 0; i < VA::kMaxAreas; ++i) {
            const bool set = i < n;
            list->x[i] = set ? rects[i].x : 0;
            list->y[i] = set ? rects[i].y : 0;
            list->width[i] = set ? rects[i].width : 0;
            list->height[i] = set ? rects[i].height : 0;
            list->val[i] = set ? rects[i].value : 0;
            list->isFace[i] = 0;
            list->direction[i] = 0;
        }
        list->num = n;
        if (!prm.OutputDebugDump) return 0;
        std::FILE* fp = std::fopen(csvName, "w");
        if (fp == nullptr) {
            std::printf("\nFile: %s cannot open.", csvName);
            return 11;
        }
        for (int32_t i = 0; i < n; ++i) {
            std::fprintf(fp, "%d,%d,%d,%d,%d,%d\n", rects[i].x, rects[i].y, rects[i].width, rects[i].height,
                         rects[i].value, 0);
        }
        std::fclose(fp);
        return 0;
    };
    if (prm.SalRectThreshMode != VA_SEGIDX_THRESHOLD_MODE_0) {
        int32_t count = 0;
        tagVA_RECT* rects = nullptr;
        if (va->iGetSaliencyRect(&count, &rects) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iGetMapSegmentIndex");
            return 1;
        }
        std::snprintf(name, sizeof name, "%s_salrect.csv", prm.outputPath);
        return take(count, rects, name);
    }
    for (float t = prm.SalRectThreshStart; t < prm.SalRectThreshEnd + prm.SalRectThreshStep;
         t += prm.SalRectThreshStep) {
        int32_t count = 0;
        tagVA_RECT* rects = nullptr;
        if (va->iGetSaliencyRect(t, &count, &rects) != 0) {
            CA::ReportFailed("Do_VA", __LINE__, "VisualAttention iGetMapSegmentIndex");
            return 1;
        }
        if (prm.OutputDebugDump) std::printf("Threshold %f:\n", static_cast<double>(t));
        std::snprintf(name, sizeof name, "%s_salrect%.1f.csv", prm.outputPath, static_cast<double>(t));
        const uint32_t status = take(count, rects, name);
        if (status != 0) return status;
        if (!(prm.SalRectThreshStep > 0.0f)) break;
    }
    return 0;
}

uint32_t CAinterface::ArrangeVa(const _zbm_Image* image, VAArrange* list) {
    if (image == nullptr || list == nullptr) return 3;
    list->AdjustVa(image, saliencyMap);
    if (combineRects && !list->isFace[0]) {
        const uint32_t status = list->RectCombine(image);
        if (status != 0) return status;
    }
    list->ReAdjustVa(image);
    return 0;
}
