#include "calib/src/segmentation/map_segment_index.h"

#include <cmath>
#include <cstdio>
#include <cstring>

#include "calib/src/CALib/param_va.h"
#include "calib/src/plane/image_plane.h"

namespace {

constexpr int kHistBins = 101;
constexpr int kCumBins = 100;
// Threshold when the histogram gives none.
constexpr uint8_t kDefaultThreshold = 248;

// ceil(t * 255) computed in float and kept in 8 bits.
uint8_t ThresholdByte(float t) {
    return static_cast<uint8_t>(static_cast<int32_t>(std::ceil(t * 255.0f)));
}

int32_t CeilTimes255(float t) { return static_cast<int32_t>(std::ceil(t * 255.0f)); }

// Threshold of the histogram position j (bins counted from the top).
uint8_t HistogramThreshold(int j) {
    return ThresholdByte(static_cast<float>(97 - j) / 100.0f);
}

}  // namespace

CMapSegmentIndex::CMapSegmentIndex()
    : params_(nullptr), maxWidth_(0), maxHeight_(0), maxStride_(0), width_(0), height_(0), stride_(0),
      threshold1_(0), threshold2_(0), propertyCapacity_(0), propertyCount_(0), rectCount_(0) {
    std::memset(rects_, 0, sizeof rects_);
}

CMapSegmentIndex::~CMapSegmentIndex() { Reset(); }

void CMapSegmentIndex::Reset() {
    histogram_.reset();
    histInvCumSum_.reset();
    histBinInvCumSum_.reset();
    labeling_.Reset();
    localLabeling_.Reset();
    properties_.reset();
    propertyCapacity_ = propertyCount_ = rectCount_ = 0;
    params_ = nullptr;
}

int32_t CMapSegmentIndex::Initialize(int32_t maxWidth, int32_t maxHeight, int32_t maxStride, const ParamVA* params) {
    Reset();
    if (params == nullptr || maxStride < maxWidth || maxWidth < 1 || maxHeight < 1) return VA_SEGIDX_ERR_INIT;
    const int64_t capacity = (static_cast<int64_t>(maxHeight) * maxStride + 1) / 2;
    if (capacity > INT32_MAX / static_cast<int64_t>(sizeof(VASegmentProperty))) return VA_SEGIDX_ERR_INIT;
    if (params->SalRectThreshMode == VA_SEGIDX_THRESHOLD_MODE_2 ||
        params->SalRectThreshMode == VA_SEGIDX_THRESHOLD_MODE_3) {
        histogram_ = lmk::NewArray<int32_t>(kHistBins);
        histInvCumSum_ = lmk::NewArray<int32_t>(kCumBins);
        histBinInvCumSum_ = lmk::NewArray<int32_t>(kCumBins);
        if (!histogram_ || !histInvCumSum_ || !histBinInvCumSum_) {
            Reset();
            return VA_SEGIDX_ERR_INIT;
        }
    }
    properties_ = lmk::NewArray<VASegmentProperty>(static_cast<size_t>(capacity));
    if (!properties_ || labeling_.Initialize(maxWidth, maxHeight, maxStride, params) != 0 ||
        localLabeling_.Initialize(maxWidth, maxHeight, maxStride, params) != 0) {
        Reset();
        return VA_SEGIDX_ERR_INIT;
    }
    params_ = params;
    propertyCapacity_ = static_cast<int32_t>(capacity);
    maxWidth_ = maxWidth;
    maxHeight_ = maxHeight;
    maxStride_ = maxStride;
    return 0;
}

void CMapSegmentIndex::GetSegmentIndex(tagVA_RECT** rects, int32_t* count) {
    if (rects) *rects = rectCount_ < 1 ? nullptr : rects_;
    if (count) *count = rectCount_;
}

int32_t CMapSegmentIndex::Indexing(float threshold, const uint8_t* map, int32_t width, int32_t height,
                                   int32_t stride) {
    if (params_ == nullptr) return VA_SEGIDX_ERR_CALL;
    if (params_->SalRectThreshMode == VA_SEGIDX_THRESHOLD_MODE_0) {
        threshold1_ = threshold2_ = ThresholdByte(threshold);
    }
    return Run(map, width, height, stride);
}

int32_t CMapSegmentIndex::Indexing(const uint8_t* map, int32_t width, int32_t height, int32_t stride) {
    if (params_ == nullptr) return VA_SEGIDX_ERR_CALL;
    return Run(map, width, height, stride);
}

int32_t CMapSegmentIndex::Run(const uint8_t* map, int32_t width, int32_t height, int32_t stride) {
    if (map == nullptr || width < 1 || height < 1 || width > maxWidth_ || height > maxHeight_ ||
        stride > maxStride_ || width > stride) {
        return VA_SEGIDX_ERR_CALL;
    }
    width_ = width;
    height_ = height;
    stride_ = stride;
    const int32_t mode = params_->SalRectThreshMode;
    if (mode == VA_SEGIDX_THRESHOLD_MODE_2 || mode == VA_SEGIDX_THRESHOLD_MODE_3) {
        if (!histogram_) return VA_SEGIDX_ERR_CALL;
        std::memset(histogram_.get(), 0, kHistBins * sizeof(int32_t));
        std::memset(histInvCumSum_.get(), 0, kCumBins * sizeof(int32_t));
        std::memset(histBinInvCumSum_.get(), 0, kCumBins * sizeof(int32_t));
    }
    std::memset(properties_.get(), 0, static_cast<size_t>(propertyCapacity_) * sizeof(VASegmentProperty));
    propertyCount_ = 0;

    if (mode == VA_SEGIDX_THRESHOLD_MODE_1) {
        threshold1_ = ThresholdByte(params_->SalRectThreshLow);
        threshold2_ = ThresholdByte(params_->SalRectThreshHigh);
    } else if (mode == VA_SEGIDX_THRESHOLD_MODE_2 || mode == VA_SEGIDX_THRESHOLD_MODE_3) {
        const int32_t status = CalcMapHistogram(map);
        if (status != 0) return status;
        CalcAutoTwoThreshold();
    }
    if (params_->OutputDebugInfo) {
        std::printf("Threshold1: %d\n", threshold1_);
        std::printf("Threshold2: %d\n", threshold2_);
    }
    int32_t status = labeling_.Labeling(map, threshold1_, width, height, stride);
    if (status == 0) status = UpdateProperty(map, threshold2_, params_->SalRectMinArea);
    if (status != 0) return status;
    SortProperty(params_->SalRectSortMode);
    return params_->OutputDebugDump ? WriteDebugFiles(map) : 0;
}

int32_t CMapSegmentIndex::CalcMapHistogram(const uint8_t* map) {
    int32_t* count = histogram_.get();
    for (int32_t y = 0; y < height_; ++y) {
        for (int32_t x = 0; x < width_; ++x) {
            const int bin = static_cast<int>(map[y * stride_ + x] / 2.55 - 0.0196);
            ++count[bin + 1];
        }
    }
    int32_t* inv = histInvCumSum_.get();
    int32_t* nz = histBinInvCumSum_.get();
    inv[0] = count[100];
    nz[0] = count[100] != 0 ? 1 : 0;
    for (int j = 1; j < kCumBins; ++j) {
        inv[j] = inv[j - 1] + count[100 - j];
        nz[j] = nz[j - 1] + (count[100 - j] != 0 ? 1 : 0);
    }
    if (params_->OutputDebugInfo) {
        std::printf("Histogram:\n");
        for (int i = 0; i < kHistBins; ++i) std::printf("%d ", count[i]);
        std::printf("\nHistInvCumSum:\n");
        for (int i = 0; i < kCumBins; ++i) std::printf("%d ", inv[i]);
        std::printf("\nHistBinInvCumSum:\n");
        for (int i = 0; i < kCumBins; ++i) std::printf("%d ", nz[i]);
        std::printf("\n");
    }
    if (params_->OutputDebugDump) {
        struct {
            const char* suffix;
            const char* title;
            const int32_t* values;
            int n;
        } const files[] = {{"_segidx_hist.csv", "Histogram,\n", count, kHistBins},
                           {"_segidx_histinvcumsum.csv", "HistInvCumSum,\n", inv, kCumBins},
                           {"_segidx_histbininvcumsum.csv", "HistBinInvCumSum,\n", nz, kCumBins}};
        for (const auto& f : files) {
            char name[512];
            std::snprintf(name, sizeof name, "%s%s", params_->outputPath, f.suffix);
            std::FILE* fp = std::fopen(name, "w");
            if (fp == nullptr) return VA_SEGIDX_ERR_FILE;
            std::fputs(f.title, fp);
            for (int i = 0; i < f.n; ++i) std::fprintf(fp, "%d, ", f.values[i]);
            std::fputs("\n", fp);
            std::fclose(fp);
        }
    }
    return 0;
}

void CMapSegmentIndex::CalcAutoTwoThreshold() {
    const int32_t n = width_ * height_;
    const int32_t* inv = histInvCumSum_.get();
    const int32_t* nz = histBinInvCumSum_.get();
    // N x fraction in float, as the keys are floats.
    const int32_t top = static_cast<int32_t>(std::floor(static_cast<float>(n) * params_->SalRectHistTop));
    threshold1_ = kDefaultThreshold;
    for (int j = 0; j < kCumBins; ++j) {
        if (inv[j] >= top) {
            threshold1_ = HistogramThreshold(j);
            break;
        }
    }
    threshold2_ = kDefaultThreshold;
    if (params_->SalRectThreshMode == VA_SEGIDX_THRESHOLD_MODE_2) {
        for (int j = 0; j < kCumBins; ++j) {
            if (nz[j] == params_->SalRectHistTopBin) {
                threshold2_ = HistogramThreshold(j);
                break;
            }
        }
    } else {
        const int32_t top2 = static_cast<int32_t>(std::floor(static_cast<float>(n) * params_->SalRectHistTop2));
        for (int j = 0; j < kCumBins; ++j) {
            if (inv[j] >= top2) {
                threshold2_ = HistogramThreshold(j);
                break;
            }
        }
    }
}

bool CMapSegmentIndex::Measure(const uint8_t* map, const int32_t* labels, int32_t label, int32_t x0, int32_t x1,
                               int32_t y0, int32_t y1, int32_t countFrom, VASegmentProperty* p,
                               int32_t* atLeast) const {
    bool any = false;
    int32_t a = 0;
    VASegmentProperty q;
    std::memset(&q, 0, sizeof q);
    for (int32_t y = y0; y < y1; ++y) {
        for (int32_t x = x0; x < x1; ++x) {
            const int32_t at = y * stride_ + x;
            if (labels[at] != label) continue;
            const uint8_t v = map[at];
            const uint32_t px = static_cast<uint32_t>(at % stride_), py = static_cast<uint32_t>(at / stride_);
            if (!any) {
                q.MaxValue = q.MinValue = v;
                q.MinXPos = q.MaxXPos = px;
                q.MinYPos = q.MaxYPos = py;
                any = true;
            } else {
                if (v > q.MaxValue) q.MaxValue = v;
                if (v < q.MinValue) q.MinValue = v;
                if (px < q.MinXPos) q.MinXPos = px;
                if (px > q.MaxXPos) q.MaxXPos = px;
                if (py < q.MinYPos) q.MinYPos = py;
                if (py > q.MaxYPos) q.MaxYPos = py;
            }
            q.Size = static_cast<uint16_t>(q.Size + 1);
            q.SumOfValue = static_cast<uint16_t>(q.SumOfValue + v);
            if (v >= countFrom) ++a;
        }
    }
    *p = q;
    *atLeast = a;
    return any;
}

void CMapSegmentIndex::Store(const VASegmentProperty& p) {
    if (propertyCount_ < propertyCapacity_) properties_[propertyCount_++] = p;
}

int32_t CMapSegmentIndex::UpdateProperty(const uint8_t* map, uint8_t t2, int32_t minArea) {
    const int32_t labelCount = labeling_.GetLabelCount();
    const int32_t* labels = labeling_.GetLabelBuffer();
    for (int32_t label = 0; label < labelCount; ++label) {
        VASegmentProperty p;
        int32_t a;
        if (!Measure(map, labels, label, 0, width_, 0, height_, t2, &p, &a)) continue;
        if (p.MaxValue < t2 || a <= minArea) continue;
        if (params_->SalRectPosSpecifyFlag) {
            const int64_t px = params_->SalRectXPos, py = params_->SalRectYPos;
            if (!(p.MinXPos <= px && px <= p.MaxXPos && p.MinYPos <= py && py <= p.MaxYPos)) continue;
        }
        if (!params_->SalRectLocalThreshFlag) {
            Store(p);
            continue;
        }
        const bool weak = ThresholdByte(params_->SalRectLocalMaxThresh) > p.MaxValue;
        const int32_t tl = CeilTimes255(weak ? params_->SalRectLocalThreshLow : params_->SalRectLocalThreshHigh);
        const int32_t x0 = static_cast<int32_t>(p.MinXPos), y0 = static_cast<int32_t>(p.MinYPos);
        const int32_t x1 = static_cast<int32_t>(p.MaxXPos) + 1 < width_ ? static_cast<int32_t>(p.MaxXPos) + 1 : width_;
        const int32_t y1 =
            static_cast<int32_t>(p.MaxYPos) + 1 < height_ ? static_cast<int32_t>(p.MaxYPos) + 1 : height_;
        const int32_t status = localLabeling_.Labeling(map, tl, width_, height_, stride_, x0, x1, y0, y1);
        if (status != 0) return status;
        if (params_->OutputDebugDump) {
            const int32_t s = WriteLocalDebugFiles(t2);
            if (s != 0) return s;
        }
        const int32_t* local = localLabeling_.GetLabelBuffer();
        for (int32_t l = 0; l < localLabeling_.GetLabelCount(); ++l) {
            VASegmentProperty q;
            int32_t aq;
            if (!Measure(map, local, l, x0, x1, y0, y1, tl, &q, &aq)) continue;
            if (q.MaxValue >= t2 && aq > minArea) Store(q);
        }
    }
    return 0;
}

void CMapSegmentIndex::SortProperty(int32_t mode) {
    rectCount_ = 0;
    std::memset(rects_, 0, sizeof rects_);
    VASegmentProperty* props = properties_.get();
    for (int32_t i = 0; i < propertyCount_; ++i) props[i].used = 0;
    const int32_t rounds = propertyCount_ < kMaxRects ? propertyCount_ : kMaxRects;
    for (int32_t r = 0; r < rounds; ++r) {
        int32_t best = -1;
        int32_t bestKey = 0;
        for (int32_t i = 0; i < propertyCount_; ++i) {
            if (props[i].used) continue;
            int32_t key;
            switch (mode) {
                case 1: key = props[i].Size ? props[i].SumOfValue / props[i].Size : 0; break;
                case 2: key = props[i].SumOfValue; break;
                case 3: key = props[i].Size; break;
                default: key = props[i].MaxValue; break;
            }
            if (best < 0 || key > bestKey) {
                best = i;
                bestKey = key;
            }
        }
        props[best].used = 1;
        tagVA_RECT& rect = rects_[rectCount_++];
        rect.x = static_cast<int32_t>(props[best].MinXPos);
        rect.y = static_cast<int32_t>(props[best].MinYPos);
        rect.width = static_cast<int32_t>(props[best].MaxXPos + 1 - props[best].MinXPos);
        rect.height = static_cast<int32_t>(props[best].MaxYPos + 1 - props[best].MinYPos);
        rect.value = bestKey;
    }
}

void CMapSegmentIndex::DebugName(char* out, const char* suffix, const char* ext) const {
    const int32_t mode = params_->SalRectThreshMode;
    if (mode == VA_SEGIDX_THRESHOLD_MODE_0) {
        std::snprintf(out, 512, "%s_segidx_mode0_th%d%s.%s", params_->outputPath, threshold1_, suffix, ext);
    } else {
        std::snprintf(out, 512, "%s_segidx_mode%d_th%d_%d%s.%s", params_->outputPath, mode, threshold1_,
                      threshold2_, suffix, ext);
    }
}

namespace {

// Packs width x height values of a map with row pitch `stride` into bytes.
template <typename F>
int32_t SaveMapAsPgm(const char* path, int32_t width, int32_t height, F value) {
    lmk::UniqueArray<uint8_t> packed = lmk::NewArray<uint8_t>(static_cast<size_t>(width) * height);
    if (!packed) return VA_SEGIDX_ERR_FILE;
    for (int32_t y = 0; y < height; ++y) {
        for (int32_t x = 0; x < width; ++x) packed[static_cast<size_t>(y) * width + x] = value(x, y);
    }
    return save_pgm(packed.get(), width, height, path) == 0 ? 0 : VA_SEGIDX_ERR_FILE;
}

uint8_t LabelShade(int32_t label) { return label < 0 ? 0 : static_cast<uint8_t>(label >= 254 ? 255 : label + 1); }

}  // namespace

int32_t CMapSegmentIndex::WriteLocalDebugFiles(int32_t) {
    char name[512];
    DebugName(name, "_local", "pgm");
    const uint8_t* fg = localLabeling_.GetForeground();
    const int32_t* labels = localLabeling_.GetLabelBuffer();
    const int32_t s = stride_;
    int32_t status = SaveMapAsPgm(name, width_, height_, [&](int32_t x, int32_t y) {
        return static_cast<uint8_t>(fg[y * s + x] ? 255 : 0);
    });
    if (status != 0) return status;
    std::snprintf(name, sizeof name, "%s_LabeledBuffer_local.pgm", params_->outputPath);
    return SaveMapAsPgm(name, width_, height_,
                        [&](int32_t x, int32_t y) { return LabelShade(labels[y * s + x]); });
}

int32_t CMapSegmentIndex::WriteDebugFiles(const uint8_t*) {
    char name[512];
    DebugName(name, "", "pgm");
    const uint8_t* fg = labeling_.GetForeground();
    const int32_t* labels = labeling_.GetLabelBuffer();
    const int32_t s = stride_;
    int32_t status = SaveMapAsPgm(name, width_, height_, [&](int32_t x, int32_t y) {
        return static_cast<uint8_t>(fg[y * s + x] ? 255 : 0);
    });
    if (status != 0) return status;
    std::snprintf(name, sizeof name, "%s_LabeledBuffer.pgm", params_->outputPath);
    status = SaveMapAsPgm(name, width_, height_, [&](int32_t x, int32_t y) { return LabelShade(labels[y * s + x]); });
    if (status != 0) return status;
    DebugName(name, "", "csv");
    std::FILE* fp = std::fopen(name, "w");
    if (fp == nullptr) return VA_SEGIDX_ERR_FILE;
    std::fputs("Threshold1,Threshold2,SortMode,AdjacentMode,MinArea,AvgFilterStep,PosSpecifyFlag,XPos,YPos\n", fp);
    std::fprintf(fp, "%d,%d,%d,%d,%d,%d,%d,%d,%d\n", threshold1_, threshold2_, params_->SalRectSortMode,
                 params_->SalRectAdjacentMode, params_->SalRectMinArea, params_->SalRectAvgFilterStep,
                 params_->SalRectPosSpecifyFlag, params_->SalRectXPos, params_->SalRectYPos);
    std::fputs("MaxValue,MinValue,MaxXPos,MinXPos,MaxYPos,MinYPos,Size,SumOfValue\n", fp);
    for (int32_t i = 0; i < propertyCount_; ++i) {
        const VASegmentProperty& p = properties_[i];
        std::fprintf(fp, "%d,%d,%d,%d,%d,%d,%d,%d\n", p.MaxValue, p.MinValue, static_cast<int>(p.MaxXPos),
                     static_cast<int>(p.MinXPos), static_cast<int>(p.MaxYPos), static_cast<int>(p.MinYPos), p.Size,
                     p.SumOfValue);
    }
    std::fclose(fp);
    return 0;
}
