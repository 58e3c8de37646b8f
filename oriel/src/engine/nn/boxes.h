// Box helpers of the detectors: SSD anchor grid and box decoding, YOLO-style
// cell decoding, and greedy non-maximum suppression.
#ifndef ORIEL_ENGINE_NN_BOXES_H
#define ORIEL_ENGINE_NN_BOXES_H

#include <cstddef>

namespace oriel {
namespace nn {

// Axis-aligned box in normalised coordinates.
struct Box {
    float ymin, xmin, ymax, xmax;
};

struct Candidate {
    Box box;
    float score;
    int index;  // position in the detector's output (ties keep this order)
};

// Number of SSD anchors for feature maps of the given sizes (6 maps: 3
// anchors per cell on the first, 6 on the others).
size_t SsdAnchorCount(const int* gridH, const int* gridW, int maps);

// Fills the SSD anchors [ymin, xmin, ymax, xmax] (fractions of the input)
// for an input of inW x inH pixels and maps of strides 16, 32, .., 512:
// scales 0.2 .. 0.95 of the trained 512-pixel side over the six maps (the
// first map uses 0.1 and 0.2 with aspect ratios 1, 2, 1/2; the others 1, 2,
// 1/2, 3, 1/3 plus one box of scale sqrt(s * s_next)), cell centres at
// (i + 0.5) strides. On a 512 x 512 input these are the trained anchors.
void SsdAnchors(const int* gridH, const int* gridW, int maps, int inW, int inH, float* out);

// Decodes one SSD box encoding [ty, tx, th, tw] against its anchor.
Box SsdDecode(const float* anchor, const float* enc);

float Sigmoid(float x);
float IoU(const Box& a, const Box& b);

// Greedy suppression as the SSD detector uses it: candidates sorted by
// descending score (stable), each kept unless it overlaps a kept one by more
// than iouThreshold; at most maxOut kept. Sorts `c` in place; returns the
// number kept, moved to the front of `c`.
size_t NonMaxSuppression(Candidate* c, size_t n, float iouThreshold, size_t maxOut);

}  // namespace nn
}  // namespace oriel

#endif
