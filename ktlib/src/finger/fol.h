// Finger-on-lens detection: smooth, skin-coloured blobs that enter the photo
// from its border. Candidate regions (fol_region.h) are smoothed with an
// active contour, closed along the border, measured, and scored by a patch
// classifier along their outline; the work runs at six scales and
// overlapping results are merged.
//
// Status codes: 0; 4 out of memory; the image functions' and the patch
// classifier's codes pass through.
#ifndef LUMICOR_KTLIB_FINGER_FOL_H
#define LUMICOR_KTLIB_FINGER_FOL_H

#include <lumicor/zbm_image.h>

#include "ktlib/src/finger/fol_region.h"

#include <cstdint>

namespace FOL {

struct FingerPoint {
    float x;  // divided by the analysed width
    float y;  // divided by the analysed height
};

// One finger outline. The record owns its points (Clear frees them); a
// zbmvector of fingers clears every finger when it is cleared.
struct Finger {
    zbmvector<FingerPoint> points;
    float area;  // polygon area / (width x height)
    float score;
    void Clear() { points.Clear(); }
};

// Active contour over integer points; the error of a position comes from a
// callback so that the detector can bring its own tables.
class Snakes {
public:
    typedef float (*ErrorFunction)(const Snakes& snakes, int32_t index, zbm_Pos candidate, const void* context);
    Snakes(int32_t width, int32_t height, ErrorFunction error, const void* context)
        : width_(width), height_(height), error_(error), context_(context) {}
    virtual ~Snakes() { points_.Clear(); }
    Snakes(const Snakes&) = delete;
    Snakes& operator=(const Snakes&) = delete;

    // Copies the points; 4 out of memory.
    int SetPoints(const zbmvector<zbm_Pos>& points);
    // Cuts short detours: removes the points between the first pair p_i, p_j
    // whose index distance x step exceeds ratio x their distance, repeatedly.
    void Truncate(int32_t step, float ratio);
    // Moves every point to the best position of its 5 x 5 neighbourhood, for
    // up to maxPasses passes, stopping after a pass that moved at most
    // `settled` points.
    void Optimize(int32_t maxPasses, int32_t settled);

    int32_t Width() const { return width_; }
    int32_t Height() const { return height_; }
    int32_t Size() const { return points_.size(); }
    zbm_Pos Point(int32_t i) const { return points_[i]; }
    const zbmvector<zbm_Pos>& Points() const { return points_; }

private:
    int32_t width_;
    int32_t height_;
    ErrorFunction error_;
    const void* context_;
    zbmvector<zbm_Pos> points_;
};

// Appends the image corners that close the outline clockwise along the
// border from its last point back to its first (nothing when both ends lie
// on the same edge). 4 out of memory.
int AppendCornerPointsOnEdge(int32_t width, int32_t height, zbmvector<zbm_Pos>& points);
// Signed area (positive for a clockwise outline in picture coordinates).
float CalcSurroundedArea(const zbmvector<zbm_Pos>& points);
// 0: same finger, keep a; 1: same finger, keep b; 2: different fingers.
int CalcFingerAcceptance(const Finger& a, const Finger& b);

// Scores 10 x 10 patches across a finger outline.
class FeRVLHandler {
public:
    enum { kPatchSize = 10 };
    FeRVLHandler() : work_(nullptr) {}
    virtual ~FeRVLHandler() { Finalize(); }
    FeRVLHandler(const FeRVLHandler&) = delete;
    FeRVLHandler& operator=(const FeRVLHandler&) = delete;

    // Creates the work image; 4 out of memory.
    int Initialize();
    void Finalize();
    // Copies rect (10 x 10, inside the RGB image) into the work image, turned
    // so that every outline pattern is seen in its dictionary's orientation.
    int PreparePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern);
    const _zbm_Image* WorkImage() const { return work_; }
    // The finger-edge score of the patch; status of the preparation or the
    // classifier, *score untouched on failure.
    int EvalImagePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern, float* score);
    // The same, with the lowest float standing for a failure.
    float EvalImagePatch(const _zbm_Image* image, const zbm_Rect& rect, int32_t pattern);

private:
    _zbm_Image* work_;
};

// Outline pattern (0..7) of a tangent angle in radians, counter-clockwise in
// the picture.
int32_t FingerPatternOfAngle(double angle);

// Finger score in [0, 1] of the mean patch score of an outline: 0.4175 is the
// 0.6 mark, 2.5 and above give 1.
float FingerScoreOfMean(float mean);

// Sees every patch the detector scores (used by the training tool).
class PatchObserver {
public:
    virtual ~PatchObserver() {}
    // patch: the turned 10 x 10 RGB patch; (x, y): the outline point in
    // normalised coordinates; scale: 0..5; contour: its index at that scale.
    virtual void OnPatch(const _zbm_Image* patch, int32_t pattern, float x, float y, int32_t scale, int32_t contour,
                         float score) = 0;
};

// Fingers of a colour image, with the photo's finger-on-lens score (the best
// finger score, 0 without fingers). fingers is cleared first; on failure it
// is empty and score is 0. Images below 10 x 10 have no fingers.
int CalcFingerScore(const _zbm_Image* image, zbmvector<Finger>& fingers, float& score);
// The same, reporting every scored patch to observer (may be NULL).
int CalcFingerScore(const _zbm_Image* image, zbmvector<Finger>& fingers, float& score, PatchObserver* observer);

}  // namespace FOL

#endif
