// Segmentation of a saliency map into ranked salient rectangles: two
// thresholds (given, fixed or from the map's histogram), labelling at the
// first, measuring and filtering at the second, optional local re-labelling
// of each region, and ranking by a chosen key.
#ifndef LUMICOR_CALIB_SEGMENTATION_MAP_SEGMENT_INDEX_H
#define LUMICOR_CALIB_SEGMENTATION_MAP_SEGMENT_INDEX_H

#include <cstdint>

#include "calib/src/segmentation/map_labeling.h"
#include "common/src/internal/memory.h"

class ParamVA;

// One salient rectangle; value is the ranking key (by default the region's
// largest map value).
typedef struct tagVA_RECT {
    int32_t x;
    int32_t y;
    int32_t width;
    int32_t height;
    int32_t value;
} VA_RECT;

// Measurements of one region.
struct VASegmentProperty {
    uint32_t MinXPos;
    uint32_t MaxXPos;
    uint32_t MinYPos;
    uint32_t MaxYPos;
    uint16_t Size;
    uint16_t SumOfValue;  // kept in 16 bits
    uint8_t MaxValue;
    uint8_t MinValue;
    uint8_t used;
};

class CMapSegmentIndex {
public:
    static constexpr int kMaxRects = 256;

    CMapSegmentIndex();
    virtual ~CMapSegmentIndex();

    // Allocates every buffer for maps up to maxWidth x maxHeight, rows up to
    // maxStride apart. 0, or VA_SEGIDX_ERR_INIT.
    int32_t Initialize(int32_t maxWidth, int32_t maxHeight, int32_t maxStride, const ParamVA* params);
    // Thresholds by SalRectThreshMode 1..3.
    int32_t Indexing(const uint8_t* map, int32_t width, int32_t height, int32_t stride);
    // In mode 0 both thresholds become ceil(threshold * 255) kept in 8 bits.
    int32_t Indexing(float threshold, const uint8_t* map, int32_t width, int32_t height, int32_t stride);
    // The ranked rectangles (null when there are none) and their count; valid
    // until the next Indexing.
    void GetSegmentIndex(tagVA_RECT** rects, int32_t* count);
    void Reset();

    uint8_t Threshold1() const { return threshold1_; }
    uint8_t Threshold2() const { return threshold2_; }
    int32_t PropertyCount() const { return propertyCount_; }
    const VASegmentProperty* Properties() const { return properties_.get(); }

private:
    int32_t Run(const uint8_t* map, int32_t width, int32_t height, int32_t stride);
    int32_t CalcMapHistogram(const uint8_t* map);
    void CalcAutoTwoThreshold();
    int32_t UpdateProperty(const uint8_t* map, uint8_t t2, int32_t minArea);
    bool Measure(const uint8_t* map, const int32_t* labels, int32_t label, int32_t x0, int32_t x1, int32_t y0,
                 int32_t y1, int32_t countFrom, VASegmentProperty* p, int32_t* atLeast) const;
    void Store(const VASegmentProperty& p);
    void SortProperty(int32_t mode);
    int32_t WriteDebugFiles(const uint8_t* map);
    int32_t WriteLocalDebugFiles(int32_t t2);
    void DebugName(char* out, const char* suffix, const char* ext) const;

    const ParamVA* params_;
    int32_t maxWidth_, maxHeight_, maxStride_;
    int32_t width_, height_, stride_;
    uint8_t threshold1_, threshold2_;
    lmk::UniqueArray<int32_t> histogram_;        // 101 counts
    lmk::UniqueArray<int32_t> histInvCumSum_;    // 100
    lmk::UniqueArray<int32_t> histBinInvCumSum_; // 100
    CMapLabeling labeling_;
    CMapLabeling localLabeling_;
    lmk::UniqueArray<VASegmentProperty> properties_;
    int32_t propertyCapacity_;
    int32_t propertyCount_;
    tagVA_RECT rects_[kMaxRects];
    int32_t rectCount_;
};

#endif
