// Connected-component labelling of a thresholded 8-bit map inside a region
// of interest, with an optional block mean filter before thresholding.
#ifndef LUMICOR_CALIB_SEGMENTATION_MAP_LABELING_H
#define LUMICOR_CALIB_SEGMENTATION_MAP_LABELING_H

#include <cstdint>

#include "common/src/internal/memory.h"

class ParamVA;

enum : int32_t {
    VA_SEGIDX_ERR_INIT = 0x3007000,      // initialisation failed
    VA_SEGIDX_ERR_CALL = 0x3007001,      // bad call of the segmenter
    VA_LABELING_ERR_CALL = 0x3007002,    // bad call of the labeller
    VA_SEGIDX_ERR_FILE = 0x3006000       // writing a debug file failed
};

class CMapLabeling {
public:
    CMapLabeling();
    virtual ~CMapLabeling();

    // Buffers for maps up to maxWidth x maxHeight with rows up to maxStride
    // apart. Reads SalRectAvgFilterStep and SalRectAdjacentMode.
    int32_t Initialize(int32_t maxWidth, int32_t maxHeight, int32_t maxStride, const ParamVA* params);
    // Labels the pixels of columns xFrom..xTo-1, rows yFrom..yTo-1 whose value
    // (or block mean) is at least threshold. Labels are numbered in order of
    // creation in one raster pass; merging two labels rewrites the larger.
    int32_t Labeling(const uint8_t* map, int32_t threshold, int32_t width, int32_t height, int32_t stride,
                     int32_t xFrom, int32_t xTo, int32_t yFrom, int32_t yTo);
    int32_t Labeling(const uint8_t* map, int32_t threshold, int32_t width, int32_t height, int32_t stride);
    void Reset();

    // Label of each pixel (y * stride + x), -1 for background.
    const int32_t* GetLabelBuffer() const { return labels_.get(); }
    // 1 for foreground, 0 for background.
    const uint8_t* GetForeground() const { return foreground_.get(); }
    // Labels handed out by the last call (merged ones included).
    int32_t GetLabelCount() const { return labelCount_; }

private:
    void Rewrite(int32_t from, int32_t to, int32_t xFrom, int32_t xTo, int32_t yFrom, int32_t lastOffset);

    int32_t filterStep_;
    int32_t adjacency_;
    int32_t maxWidth_, maxHeight_, maxStride_;
    int32_t width_, height_, stride_;
    int32_t xFrom_, xTo_, yFrom_, yTo_;
    lmk::UniqueArray<uint8_t> foreground_;
    lmk::UniqueArray<int32_t> labels_;
    int32_t labelCount_;
};

#endif
