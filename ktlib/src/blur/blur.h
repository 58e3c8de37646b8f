// Sharpness of a gray photo from a three-level CDF 9/7 wavelet transform:
// the energy of the detail coefficients gives an out-of-focus score (from the
// strongest local energy) and a camera-shake score (from the global energy),
// and a small blur map of local detail energy.
//
// Cohen holds the image as doubles and transforms it in place; Coefficient
// collects the detail coefficients of each level as a Band of three Subbands
// (orientation 0: right of the next level's region, 1: below it, 2: the
// diagonal corner); every level, band and subband can reduce itself to a
// global log energy and an EnergyMap of block energies.
//
// Status codes are those of the quality metas (KT_* in lumicor/ktlib.h).
#ifndef LUMICOR_KTLIB_BLUR_BLUR_H
#define LUMICOR_KTLIB_BLUR_BLUR_H

#include <lumicor/zbm_image.h>

#include "common/src/internal/memory.h"

#include <cstdint>
#include <memory>

namespace blur {

struct BlurScores {
    double outOfFocus;
    double cameraShake;
};

// A row-major grid of block energies.
class EnergyMap {
public:
    EnergyMap() : width_(0), height_(0) {}
    virtual ~EnergyMap() {}
    // Replaces the map by a zeroed width x height one; 4 out of memory
    // (the map is then empty). A zero size gives an empty map.
    int Reset(int32_t width, int32_t height);
    int32_t Width() const { return width_; }
    int32_t Height() const { return height_; }
    int32_t Count() const { return width_ * height_; }
    double& At(int32_t x, int32_t y) { return values_[y * width_ + x]; }
    double At(int32_t x, int32_t y) const { return values_[y * width_ + x]; }
    const double* Values() const { return values_.get(); }
    // New gray image of the map's size, each pixel min(trunc(20 x value), 255).
    // 3 when out is NULL or *out is set (or the map is empty), 4 out of memory.
    int CreateBlurmap(_zbm_Image** out) const;

private:
    int32_t width_;
    int32_t height_;
    lmk::UniqueArray<double> values_;
};

enum Direction { kDirectionRight = 0, kDirectionBelow = 1, kDirectionDiagonal = 2 };

// One orientation of one level: a view of the transform's coefficients (the
// Cohen it was taken from must outlive it).
class Subband {
public:
    explicit Subband(Direction direction) : direction_(direction), data_(nullptr), stride_(0), width_(0), height_(0) {}
    virtual ~Subband() {}
    // Refers to width x height values, rows `stride` values apart.
    int SetData(const double* source, int32_t stride, int32_t width, int32_t height);
    Direction GetDirection() const { return direction_; }
    int32_t Width() const { return width_; }
    int32_t Height() const { return height_; }
    double At(int32_t x, int32_t y) const { return data_[static_cast<size_t>(y) * stride_ + x]; }
    // ln(mean of the squared coefficients + 1); 0 for an empty subband.
    int CalcLogEnergy(double& energy) const;
    // Blocks of blockSize overlapping by trunc(blockSize x overlap); each cell
    // ln(sum of squares / number of cells + 1). 4 out of memory.
    int CalcBlockEnergyMap(int32_t blockSize, double overlap, const EnergyMap*& out);

private:
    Direction direction_;
    const double* data_;
    int32_t stride_;
    int32_t width_;
    int32_t height_;
    EnergyMap map_;
};

// The three orientations of one level.
class Band {
public:
    explicit Band(int32_t level);
    virtual ~Band() {}
    int32_t Level() const { return level_; }
    Subband& GetSubband(int32_t orientation) { return *subbands_[orientation]; }
    const Subband& GetSubband(int32_t orientation) const { return *subbands_[orientation]; }
    bool Valid() const { return subbands_[0] && subbands_[1] && subbands_[2]; }
    // 0.8 x diagonal + 0.1 x (right + below).
    int CalcLogEnergy(double& energy) const;
    // Cell-wise 0.8 x diagonal + 0.1 x (right + below) of the orientation maps
    // with block size trunc(blockSize / 2^(level + 1)); the map is as wide as
    // the orientation-1 map and as high as the orientation-0 map. 4 out of memory.
    int CalcBlockEnergyMap(int32_t blockSize, const EnergyMap*& out, float overlap);

private:
    int32_t level_;
    std::unique_ptr<Subband> subbands_[3];
    EnergyMap map_;
};

// The detail coefficients of the first levels of a transform.
class Coefficient {
public:
    Coefficient() : levels_(0) {}
    virtual ~Coefficient() {}
    // Drops the bands and makes room for `levels` new ones; 4 out of memory.
    int Reset(int32_t levels);
    int32_t Levels() const { return levels_; }
    // Creates band `level`; 4 out of memory.
    int CreateBand(int32_t level, Band*& band);
    const Band& GetBand(int32_t level) const { return *bands_[level]; }
    // Sum over the first `levels` levels of 2^(levels - 1 - k) x band k energy.
    // 3 when more levels are asked for than held.
    int CalcLogEnergy(int32_t levels, double& energy) const;
    // The same weighted sum cell by cell over the band maps (base block size
    // 16); the level-0 map fixes the size. 12 when a level's map has another
    // size (the levels before it stay summed), 3 for too many levels, 4 out
    // of memory.
    int CalcBlockEnergyMap(int32_t levels, float overlap);
    const EnergyMap& GetEnergyMap() const { return map_; }
    // sqrt(sum v^2 / m) over the m = percent x count / 100 largest cells
    // (at least one when the map has any; 0 for an empty map). 4 out of memory.
    int CalcBlockEnergy(int32_t percent, double& energy) const;

private:
    int32_t levels_;
    lmk::UniqueArray<std::unique_ptr<Band>> bands_;
    EnergyMap map_;
};

// CDF 9/7 lifting transform of a whole image held as doubles.
class Cohen {
public:
    Cohen() : width_(0), height_(0), levels_(0) {}
    virtual ~Cohen() {}
    // Copies width x height bytes (rows back to back). 2 for a NULL buffer or
    // a size below 1 x 1, 4 out of memory.
    int Initialize(const unsigned char* pixels, int32_t width, int32_t height);
    // Transforms the first `levels` levels (0: all). 3 when not initialised
    // or more levels are asked for than exist, 4 out of memory.
    int ForwardTransform(int32_t levels);
    // Detail coefficients of the first `levels` levels (views of this
    // transform's data). 3 when levels exceeds the highest usable level
    // (levels - 1), 4 out of memory.
    int GetCoefficient(int32_t levels, Coefficient& coefficient) const;
    int32_t Levels() const { return levels_; }
    int32_t RegionWidth(int32_t level) const { return regionWidth_[level]; }
    int32_t RegionHeight(int32_t level) const { return regionHeight_[level]; }
    const double* Data() const { return data_.get(); }

    // One-dimensional forward lifting of n values spaced `stride` apart,
    // using `scratch` (n values) for the even/odd split.
    static void Transform1D(double* values, int32_t n, int32_t stride, double* scratch);

private:
    // Transform1D down every column of the top-left w x h region, kStrip
    // columns at a time; scratch holds kStrip x h values.
    void TransformColumns(int32_t w, int32_t h, double* scratch);
    static constexpr int32_t kStrip = 16;

    static const int32_t kMaxLevels = 32;
    int32_t width_;
    int32_t height_;
    int32_t levels_;
    int32_t regionWidth_[kMaxLevels];
    int32_t regionHeight_[kMaxLevels];
    lmk::UniqueArray<double> data_;
};

// Scores a gray image whose rows are stored back to back. Below 24 pixels in
// either direction nothing is measured: both scores -1.0, no map, result 0.
// Otherwise *blurMap (NULL on entry) receives a new gray image owned by the
// caller. Returns 0; 2 for NULL arguments; 3 when *blurMap is set or the
// image is not a packed gray image; 7 when the pixel buffer is NULL; 4 out of
// memory. On failure no map is left.
int CalcBlurScorer(const _zbm_Image* gray, _zbm_Image** blurMap, BlurScores* scores);

}  // namespace blur

#endif
