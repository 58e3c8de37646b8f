// Haar wavelet decomposition of a luma image and the edge energy read from
// its detail bands (the edge part of the similarity signature).
#ifndef LUMICOR_KTLIB_CBS_WAVELET_H
#define LUMICOR_KTLIB_CBS_WAVELET_H

#include "common/src/internal/memory.h"

struct _image_s;

// In-place, non-standard 2-D Haar decomposition: rows then columns of a
// shrinking top-left region until it is one column wide or one row high.
class Haar {
public:
    Haar();
    virtual ~Haar();
    // Size of the arrays to transform; false for a non-positive size or when
    // the scratch line cannot be allocated.
    bool setSize(int width, int height);
    // Replaces element (0, 0) by the mean of the array, then decomposes.
    void transformOnly(double* data) const;
    // The decomposition itself.
    void decomposition2DNS(double* data) const;

private:
    // One pair step over n values spaced `stride` apart.
    void Step(double* data, int n, int stride) const;

    int width_;
    int height_;
    lmk::UniqueArray<double> line_;
};

class Wavelet {
public:
    Wavelet(int width, int height);
    virtual ~Wavelet();
    // False when the coefficient array could not be allocated.
    bool valid() const { return data_ != nullptr && haarReady_; }
    // Fills the array with the image's integer luma and decomposes it; the
    // image must have the Wavelet's size.
    bool detectEdge(const _image_s* image);
    // Sums of absolute detail coefficients: three scales x 3 x 3 regions x
    // three orientations.
    void countEdge(float* edge) const;

private:
    int width_;
    int height_;
    Haar haar_;
    bool haarReady_;
    lmk::UniqueArray<double> data_;
};

#endif
