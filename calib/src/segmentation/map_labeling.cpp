#include "calib/src/segmentation/map_labeling.h"

#include <cstring>

#include "calib/src/CALib/param_va.h"

CMapLabeling::CMapLabeling()
    : filterStep_(0), adjacency_(8), maxWidth_(0), maxHeight_(0), maxStride_(0), width_(0), height_(0),
      stride_(0), xFrom_(0), xTo_(0), yFrom_(0), yTo_(0), labelCount_(0) {}

CMapLabeling::~CMapLabeling() = default;

void CMapLabeling::Reset() {
    foreground_.reset();
    labels_.reset();
    maxWidth_ = maxHeight_ = maxStride_ = 0;
    labelCount_ = 0;
}

int32_t CMapLabeling::Initialize(int32_t maxWidth, int32_t maxHeight, int32_t maxStride, const ParamVA* params) {
    Reset();
    if (params == nullptr || maxWidth < 1 || maxHeight < 1 || maxStride < maxWidth) return VA_SEGIDX_ERR_INIT;
    uint32_t count;
    if (!lmk::CheckedMul(static_cast<uint32_t>(maxStride), static_cast<uint32_t>(maxHeight), 4, &count)) {
        return VA_SEGIDX_ERR_INIT;
    }
    const size_t n = static_cast<size_t>(maxStride) * static_cast<size_t>(maxHeight);
    foreground_ = lmk::NewArray<uint8_t>(n);
    labels_ = lmk::NewArray<int32_t>(n);
    if (!foreground_ || !labels_) {
        Reset();
        return VA_SEGIDX_ERR_INIT;
    }
    filterStep_ = params->SalRectAvgFilterStep > 0 ? params->SalRectAvgFilterStep : 0;
    adjacency_ = params->SalRectAdjacentMode == 8 ? 8 : 4;
    maxWidth_ = maxWidth;
    maxHeight_ = maxHeight;
    maxStride_ = maxStride;
    return 0;
}

int32_t CMapLabeling::Labeling(const uint8_t* map, int32_t threshold, int32_t width, int32_t height,
                               int32_t stride) {
    return Labeling(map, threshold, width, height, stride, 0, width, 0, height);
}

void CMapLabeling::Rewrite(int32_t from, int32_t to, int32_t xFrom, int32_t xTo, int32_t yFrom,
                           int32_t lastOffset) {
    int32_t* labels = labels_.get();
    for (int32_t y = yFrom;; ++y) {
        const int32_t row = y * stride_;
        for (int32_t x = xFrom; x < xTo; ++x) {
            if (row + x > lastOffset) return;
            if (labels[row + x] == from) labels[row + x] = to;
        }
    }
}

int32_t CMapLabeling::Labeling(const uint8_t* map, int32_t threshold, int32_t width, int32_t height,
                               int32_t stride, int32_t xFrom, int32_t xTo, int32_t yFrom, int32_t yTo) {
    if (!labels_ || map == nullptr || width > maxWidth_ || height > maxHeight_ || stride > maxStride_ ||
        width < filterStep_ || height < filterStep_ || width > stride || width < 1 || height < 1 || xFrom < 0 ||
        yFrom < 0 || xFrom >= xTo || yFrom >= yTo || xTo > width || yTo > height) {
        return VA_LABELING_ERR_CALL;
    }
    width_ = width;
    height_ = height;
    stride_ = stride;
    xFrom_ = xFrom;
    xTo_ = xTo;
    yFrom_ = yFrom;
    yTo_ = yTo;
    const size_t n = static_cast<size_t>(maxStride_) * static_cast<size_t>(maxHeight_);
    uint8_t* fg = foreground_.get();
    int32_t* labels = labels_.get();
    std::memset(fg, 0, n);
    for (size_t i = 0; i < n; ++i) labels[i] = -1;
    labelCount_ = 0;

    if (filterStep_ == 0) {
        for (int32_t y = yFrom; y < yTo; ++y) {
            for (int32_t x = xFrom; x < xTo; ++x) fg[y * stride + x] = map[y * stride + x] >= threshold ? 1 : 0;
        }
    } else {
        // Blocks of step x step; the last block of a row or column takes
        // what remains.
        const int32_t s = filterStep_;
        for (int32_t by = yFrom; by < yTo; by += s) {
            const int32_t bh = yTo - by < s ? yTo - by : s;
            for (int32_t bx = xFrom; bx < xTo; bx += s) {
                const int32_t bw = xTo - bx < s ? xTo - bx : s;
                int32_t sum = 0;
                for (int32_t y = by; y < by + bh; ++y) {
                    for (int32_t x = bx; x < bx + bw; ++x) sum += map[y * stride + x];
                }
                const uint8_t on = sum / (bw * bh) >= threshold ? 1 : 0;
                for (int32_t y = by; y < by + bh; ++y) {
                    for (int32_t x = bx; x < bx + bw; ++x) fg[y * stride + x] = on;
                }
            }
        }
    }

    for (int32_t y = yFrom; y < yTo; ++y) {
        for (int32_t x = xFrom; x < xTo; ++x) {
            const int32_t at = y * stride + x;
            if (!fg[at]) continue;
            // Already visited neighbours: left and upper (4), plus upper-left
            // and upper-right (8).
            int32_t found[4];
            int nFound = 0;
            if (x > xFrom) found[nFound++] = labels[at - 1];
            if (y > yFrom) {
                found[nFound++] = labels[at - stride];
                if (adjacency_ == 8) {
                    if (x > xFrom) found[nFound++] = labels[at - stride - 1];
                    if (x + 1 < xTo) found[nFound++] = labels[at - stride + 1];
                }
            }
            int32_t smallest = -1;
            for (int i = 0; i < nFound; ++i) {
                if (found[i] >= 0 && (smallest < 0 || found[i] < smallest)) smallest = found[i];
            }
            if (smallest < 0) {
                labels[at] = labelCount_++;
                continue;
            }
            labels[at] = smallest;
            for (int i = 0; i < nFound; ++i) {
                if (found[i] > smallest) {
                    const int32_t larger = found[i];
                    Rewrite(larger, smallest, xFrom, xTo, yFrom, at);
                    for (int j = i + 1; j < nFound; ++j) {
                        if (found[j] == larger) found[j] = smallest;
                    }
                }
            }
        }
    }
    return 0;
}
