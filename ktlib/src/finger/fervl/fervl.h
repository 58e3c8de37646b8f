// Patch classifier of the finger-on-lens detection: a small colour patch is
// scaled to the dictionary's size, cut into overlapping sub-patches that are
// contrast-normalised, whitened and encoded against K centroids (triangle
// activation), pooled over four quadrants, standardised and scored by one
// linear scorer per class.
//
// Status codes: 0; 2 no dictionary; 3 invalid image or dictionary; 4 out of
// memory; image-function codes pass through.
#ifndef LUMICOR_KTLIB_FINGER_FERVL_FERVL_H
#define LUMICOR_KTLIB_FINGER_FERVL_FERVL_H

#include <lumicor/zbm_image.h>

#include <cstdint>

struct _FeRVLDictionary {
    uint32_t classCount;
    uint32_t K;               // centroids
    uint32_t patchDimension;  // 3 x P x P
    uint32_t resizeWidth;
    uint32_t resizeHeight;
    uint32_t P;  // sub-patch side
    uint32_t S;  // sub-patch step
    const double* const* centroids;        // K rows of patchDimension
    const double* const* classWeights;     // classCount rows of 4K + 1 (the last multiplies 1)
    const double* whiteningMean;           // patchDimension
    const double* const* whiteningMatrix;  // patchDimension rows of patchDimension
    const double* featureMean;             // 4K
    const double* featureDeviation;        // 4K
};

// Outline crossing the patch diagonally, and outline splitting it in halves
// (after the caller's rotation into the trained orientation).
extern const _FeRVLDictionary FERVL_DICTIONARY_DIAG;
extern const _FeRVLDictionary FERVL_DICTIONARY_HALF;

class FeRVL {
public:
    FeRVL() {}
    virtual ~FeRVL() {}

    // Appends one score per class to `scores` (nothing on failure).
    int Classify(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch, _zbm_PixelOrder order,
                 const _FeRVLDictionary* dictionary, zbmvector<double>& scores) const;

    // 3 when pixels is NULL, a size or the pitch is 0, or width > pitch.
    static int checkImage(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch);
    // 2 when NULL; 3 when the resize size, P or S is 0, P or S exceeds the
    // resize size, or the shapes do not fit together.
    static int checkDictionary(const _FeRVLDictionary* dictionary);

    // The steps of Classify, exposed for the training tool and the tests.
    // Copies an RGB-family buffer into `image` (RGB, width x height).
    static int setRgbColorOrderedBuffToImage(const unsigned char* pixels, uint32_t width, uint32_t height,
                                             uint32_t pitch, _zbm_PixelOrder order, _zbm_Image* image);
    // Sub-patch vectors (R plane, G plane, B plane), normalised; rows x cols
    // of them, row by row, each patchDimension values.
    static int createPatches(const _zbm_Image* image, const _FeRVLDictionary& d, double* patches, uint32_t count);
    static int whitenPatches(const _FeRVLDictionary& d, const double* patches, uint32_t count, double* whitened);
    static int calcDistance(const _FeRVLDictionary& d, const double* whitened, uint32_t count, double* distances);
    static int cnvPatchesTo4KFeature(const _FeRVLDictionary& d, const double* distances, uint32_t rows, uint32_t cols,
                                     double* feature);
    static int normalize4KFeature(const _FeRVLDictionary& d, double* feature);
    static int calcScores(const _FeRVLDictionary& d, const double* feature, zbmvector<double>& scores);
};

// Runs FeRVL::Classify with a worker of its own.
int FeRVLClassify(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch, _zbm_PixelOrder order,
                  const _FeRVLDictionary* dictionary, zbmvector<double>& scores);

#endif
