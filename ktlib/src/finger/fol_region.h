// First stage of the finger-on-lens detection: a per-pixel finger likelihood
// from colour and local texture, connected regions of likely pixels that
// enter the picture from its border, and the outline of each such region
// from one border crossing to the other.
//
// Tables are row-major zbmvectors of width x height entries owned by the
// Detector (or by the caller of the free builders, who clears them).
// Status codes: 0, 4 out of memory, and the image functions' codes.
#ifndef LUMICOR_KTLIB_FINGER_FOL_REGION_H
#define LUMICOR_KTLIB_FINGER_FOL_REGION_H

#include <lumicor/zbm_image.h>

#include <cstdint>

namespace FOL {

// Border geometry of a width x height image.
class ImageBound {
public:
    ImageBound() : width_(0), height_(0) {}
    ImageBound(int32_t width, int32_t height) : width_(width), height_(height) {}
    int32_t Width() const { return width_; }
    int32_t Height() const { return height_; }
    bool IsOnLeftEdge(zbm_Pos p) const { return p.x == 0; }
    bool IsOnTopEdge(zbm_Pos p) const { return p.y == 0; }
    bool IsOnRightEdge(zbm_Pos p) const { return p.x == width_ - 1; }
    bool IsOnBottomEdge(zbm_Pos p) const { return p.y == height_ - 1; }
    bool IsOnImageEdge(zbm_Pos p) const {
        return IsOnLeftEdge(p) || IsOnTopEdge(p) || IsOnRightEdge(p) || IsOnBottomEdge(p);
    }
    bool IsOnSameEdge(zbm_Pos a, zbm_Pos b) const {
        return (IsOnLeftEdge(a) && IsOnLeftEdge(b)) || (IsOnTopEdge(a) && IsOnTopEdge(b)) ||
               (IsOnRightEdge(a) && IsOnRightEdge(b)) || (IsOnBottomEdge(a) && IsOnBottomEdge(b));
    }
    bool IsInImage(zbm_Pos p) const { return p.x >= 0 && p.y >= 0 && p.x < width_ && p.y < height_; }
    bool IsRectInImage(const zbm_Rect& r) const {
        return r.x >= 0 && r.y >= 0 && r.x + r.width - 1 < width_ && r.y + r.height - 1 < height_;
    }
    static bool IsNeighbour8(zbm_Pos a, zbm_Pos b) {
        return a.x - b.x <= 1 && b.x - a.x <= 1 && a.y - b.y <= 1 && b.y - a.y <= 1;
    }
    // The next border pixel going right along the top row, down the right
    // column, left along the bottom row and up the left column.
    zbm_Pos NextPointOnImageEdgeClockwise(zbm_Pos p) const;
    // The reverse walk.
    zbm_Pos NextPointOnImageEdgeCounterClockwise(zbm_Pos p) const;

private:
    int32_t width_;
    int32_t height_;
};

// Per-pixel finger model on the features R, G, B, T (local texture) and the
// likelihood from which a pixel counts as finger.
typedef float (*FingerProbabilityFunction)(const float* features);
struct FingerLiklihood {
    FingerProbabilityFunction function;
    float threshold;
};

// The model in use: Gaussian kernels regressed on 80 x 60 photos.
float CalcFingerProbability_rc4800_RGBT_r1_step20_LINEAR_REGRESSION_GK_GEN(const float* features);
// That model with its threshold 0.1.
FingerLiklihood DefaultFingerLiklihood();

struct RegionInfo {
    int32_t count;
    int32_t left;    // pixels in column 0
    int32_t top;     // in row 0
    int32_t right;   // in the last column
    int32_t bottom;  // in the last row
    int32_t accepted;
    int32_t newLabel;
};

// Local texture: per pixel, over its 3 x 3 neighbourhood clipped to the image,
// 0.299 sd(R) + 0.587 sd(G) + 0.114 sd(B), clamped to 0..20. `image` is RGB.
int CalcTextureTable(const _zbm_Image* image, zbmvector<float>& table);
// model(R, G, B, T) per pixel, clamped to -0.25..0.75.
int CalcFingerTable(const _zbm_Image* image, const zbmvector<float>& texture, FingerProbabilityFunction model,
                    zbmvector<float>& table);
// Weighted central differences (10 on the axis, 3 beside it); 0 on the outer
// rows and columns.
int CalcHVEdgeTable(const zbmvector<float>& table, int32_t width, int32_t height, zbmvector<float>& horizontal,
                    zbmvector<float>& vertical);
// sqrt(H^2 + V^2) of CalcHVEdgeTable.
int CalcEdgeMagTable(const zbmvector<float>& table, int32_t width, int32_t height, zbmvector<float>& magnitude);
// Connected regions (4-adjacency) of the entries at or above threshold;
// labels 1..count, 0 elsewhere.
int CalcLabeledFingerTable(const zbmvector<float>& table, int32_t width, int32_t height, float threshold,
                           int32_t& count, zbmvector<int32_t>& labels);
// Measures every label, accepts those that enter from the border like a
// finger and renumbers them 1, 2, ... (other pixels become 0). regions holds
// one entry per old label.
int UpdateLabeledTable(zbmvector<int32_t>& labels, int32_t count, int32_t width, int32_t height,
                       int32_t& acceptedCount, zbmvector<RegionInfo>& regions);
// The inner outline of region `label` from one border crossing to the other.
int FindContourOfRegion(const zbmvector<int32_t>& labels, int32_t width, int32_t height, int32_t label,
                        const RegionInfo& region, zbmvector<zbm_Pos>& contour);

struct Finger;
class Snakes;

class Detector {
public:
    // Colour and texture statistics inside a finger outline.
    struct FingerStats {
        float meanR;
        float meanG;
        float meanB;
        float colorDeviation;
        float meanTexture;
        float textureDeviation;
    };

    Detector() : image_(nullptr) {}
    virtual ~Detector() { Clear(); }
    Detector(const Detector&) = delete;
    Detector& operator=(const Detector&) = delete;

    // Contours of the likely finger regions of an RGB image, every fourth
    // traced point and the last. contours is cleared first. The image must
    // outlive the detector's use of it (statistics read its pixels).
    int DetectInitialRegions(const _zbm_Image* image, const FingerLiklihood& model,
                             zbmvector<zbmvector<zbm_Pos>>& contours);

    // Smooths a traced outline with an active contour on the edge magnitude
    // table of the last detection (its two ends stay on the border). 4 out of
    // memory (adjusted is then empty).
    int AdjustContour(const zbmvector<zbm_Pos>& contour, zbmvector<zbm_Pos>& adjusted) const;
    // Statistics of the last detection's image and texture table over the
    // filled outline of `finger`. 4 when the mask cannot be created.
    int CalcFingerStats(const Finger& finger, FingerStats& stats) const;
    // Error of moving point `index` of the snake to `candidate`; `context` is
    // the Detector.
    static float CalcSnakesError(const Snakes& snakes, int32_t index, zbm_Pos candidate, const void* context);

    const _zbm_Image* Image() const { return image_; }
    const ImageBound& Bound() const { return bound_; }
    const zbmvector<float>& TextureTable() const { return texture_; }
    const zbmvector<float>& FingerTable() const { return finger_; }
    const zbmvector<float>& EdgeMagnitudeTable() const { return edge_; }
    const zbmvector<int32_t>& LabelTable() const { return labels_; }
    const zbmvector<RegionInfo>& Regions() const { return regions_; }
    void Clear();

protected:
    const _zbm_Image* image_;
    ImageBound bound_;
    zbmvector<float> texture_;
    zbmvector<float> finger_;
    zbmvector<float> edge_;
    zbmvector<int32_t> labels_;
    zbmvector<RegionInfo> regions_;
};

}  // namespace FOL

#endif
