#include "calib/src/CALib/va.h"

#include <cmath>
#include <cstdio>
#include <cstring>
#include <new>

#include "calib/src/CALib/ca_common.h"

VA::VA() : num(0) {
    std::memset(x, 0, sizeof x);
    std::memset(y, 0, sizeof y);
    std::memset(width, 0, sizeof width);
    std::memset(height, 0, sizeof height);
    std::memset(val, 0, sizeof val);
    std::memset(isFace, 0, sizeof isFace);
    std::memset(direction, 0, sizeof direction);
}

VA::~VA() = default;

void VA::vPrint() const {
    std::printf("num = %d\n", num);
    for (int i = 0; i < num && i < kMaxAreas; ++i) {
        std::printf("x = %d, y = %d, width = %d, height = %d, val = %d, isFace = %d, direction = %d\n",
                    x[i], y[i], width[i], height[i], val[i], isFace[i], direction[i]);
    }
}

uint32_t VA::CreateAttentionAreaArray(int refWidth, int refHeight,
                                      _CAAttentionAreaArray* out) const {
    if (out == nullptr) {
        CA::ReportInvalidParams(CA::kEntrySource, __LINE__, "CreateAttentionAreaArray",
                                "out == NULL");
        return 3;
    }
    if (refWidth < 1 || refHeight < 1) {
        CA::ReportInvalidParams(CA::kEntrySource, __LINE__, "CreateAttentionAreaArray",
                                "refWidth < 1 || refHeight < 1");
        return 3;
    }
    const int count = num < 0 ? 0 : (num > kMaxAreas ? kMaxAreas : num);
    out->isFace = isFace[0];
    out->numAreas = static_cast<uint32_t>(count);
    // Array new also for no entries: the disposer frees whatever is there.
    CAAttentionArea* areas = new (std::nothrow) CAAttentionArea[count];
    out->pAreaArray = areas;
    if (areas == nullptr) {
        CA::ReportFailed("CreateAttentionAreaArray", __LINE__, "CA_NEW");
        return 4;
    }
    const float rw = static_cast<float>(refWidth);
    const float rh = static_cast<float>(refHeight);
    for (int i = 0; i < count; ++i) {
        areas[i].nx = static_cast<float>(x[i]) / rw;
        areas[i].ny = static_cast<float>(y[i]) / rh;
        areas[i].nw = static_cast<float>(width[i]) / rw;
        areas[i].nh = static_cast<float>(height[i]) / rh;
        if (out->isFace) {
            areas[i].val.direction = direction[i];
        } else {
            areas[i].val.direction = val[i];
        }
    }
    return 0;
}

namespace {

bool UsableCoordinate(float v) {
    return std::isfinite(v) && std::fabs(v) <= VA::kMaxNormalisedExtent;
}

// Whole units of a normalised coordinate: the integer part of 0.5 + ref * v.
int32_t ToUnits(int ref, float v) {
    return static_cast<int32_t>(0.5f + static_cast<float>(ref) * v);
}

}  // namespace

uint32_t VA::SetAttentionAreaArray(int refWidth, int refHeight, const _CAAttentionAreaArray* in) {
    if (in == nullptr || refWidth < 1 || refHeight < 1 || refWidth > kMaxReferenceSize ||
        refHeight > kMaxReferenceSize) {
        return 3;
    }
    const int count = in->numAreas > static_cast<uint32_t>(kMaxAreas)
                          ? kMaxAreas
                          : static_cast<int>(in->numAreas);
    if (count < 1) {
        num = 0;
        return 0;
    }
    const CAAttentionArea* areas = in->pAreaArray;
    if (areas == nullptr) return 3;
    // Check every record before touching the list: a damaged array loads nothing.
    for (int i = 0; i < count; ++i) {
        if (!UsableCoordinate(areas[i].nx) || !UsableCoordinate(areas[i].ny) ||
            !UsableCoordinate(areas[i].nw) || !UsableCoordinate(areas[i].nh)) {
            return 3;
        }
    }
    num = count;
    for (int i = 0; i < count; ++i) {
        x[i] = ToUnits(refWidth, areas[i].nx);
        y[i] = ToUnits(refHeight, areas[i].ny);
        width[i] = ToUnits(refWidth, areas[i].nw);
        height[i] = ToUnits(refHeight, areas[i].nh);
        if (in->isFace) {
            val[i] = 255;
            isFace[i] = 1;
            direction[i] = areas[i].val.direction;
        } else {
            val[i] = areas[i].val.direction;  // the saliency, read as the signed field
            isFace[i] = 0;
            direction[i] = 0;
        }
    }
    return 0;
}
