#include "ktlib/src/blur/blur.h"

#include <lumicor/ktlib.h>

#include "common/src/internal/portable_math.h"

#include <algorithm>
#include <cmath>
#include <functional>

namespace blur {

namespace {

// Lifting constants of the CDF 9/7 wavelet.
const double kAlpha = -1.586134342;
const double kBeta = -0.05298011854;
const double kGamma = 0.8829110762;
const double kDelta = 0.4435068522;
const double kDetailScale = 0.615087052457;
const double kSmoothScale = 1.230174104914;

// Level weights: the finest level counts most.
double LevelWeight(int32_t levels, int32_t k) { return static_cast<double>(1u << (levels - 1 - k)); }

}  // namespace

// ---------------------------------------------------------------- EnergyMap

int EnergyMap::Reset(int32_t width, int32_t height) {
    values_.reset();
    width_ = 0;
    height_ = 0;
    if (width <= 0 || height <= 0) return KT_OK;
    uint32_t count;
    if (!lmk::CheckedMul(static_cast<uint32_t>(width), static_cast<uint32_t>(height), &count)) {
        return KT_ERR_NO_MEMORY;
    }
    values_ = lmk::NewArray<double>(count);
    if (!values_) return KT_ERR_NO_MEMORY;
    width_ = width;
    height_ = height;
    return KT_OK;
}

int EnergyMap::CreateBlurmap(_zbm_Image** out) const {
    if (!out || *out || Count() == 0) return KT_ERR_STATE;
    _zbm_Image* map = ZbiuCreate(width_, height_, ZBM_PIXEL_ORDER_GRAY);
    if (!map) return KT_ERR_NO_MEMORY;
    for (int32_t y = 0; y < height_; ++y) {
        uint8_t* row = ZbiuGetPointer(map, 0, y);
        for (int32_t x = 0; x < width_; ++x) {
            const double v = 20.0 * At(x, y);
            row[x] = v >= 255.0 ? 255 : static_cast<uint8_t>(v);
        }
    }
    *out = map;
    return KT_OK;
}

// ---------------------------------------------------------------- Subband

int Subband::SetData(const double* source, int32_t stride, int32_t width, int32_t height) {
    const bool empty = width <= 0 || height <= 0;
    data_ = empty ? nullptr : source;
    stride_ = stride;
    width_ = empty ? 0 : width;
    height_ = empty ? 0 : height;
    return KT_OK;
}

int Subband::CalcLogEnergy(double& energy) const {
    const int32_t n = width_ * height_;
    if (n == 0) {
        energy = 0.0;
        return KT_OK;
    }
    double sum = 0.0;
    for (int32_t y = 0; y < height_; ++y) {
        const double* row = data_ + static_cast<size_t>(y) * stride_;
        for (int32_t x = 0; x < width_; ++x) sum += row[x] * row[x];
    }
    energy = lmk::Log(sum / n + 1.0);
    return KT_OK;
}

int Subband::CalcBlockEnergyMap(int32_t blockSize, double overlap, const EnergyMap*& out) {
    const int32_t o = static_cast<int32_t>(blockSize * overlap);
    const int32_t step = blockSize - o;
    int32_t mapWidth = 0, mapHeight = 0;
    if (step > 0 && width_ >= o && height_ >= o) {
        mapWidth = (width_ - o) / step;
        mapHeight = (height_ - o) / step;
    }
    const int status = map_.Reset(mapWidth, mapHeight);
    if (status != KT_OK) return status;
    const double cells = static_cast<double>(mapWidth) * mapHeight;
    for (int32_t j = 0; j < mapHeight; ++j) {
        for (int32_t i = 0; i < mapWidth; ++i) {
            double sum = 0.0;
            for (int32_t y = j * step; y < j * step + blockSize; ++y) {
                const double* row = data_ + static_cast<size_t>(y) * stride_;
                for (int32_t x = i * step; x < i * step + blockSize; ++x) sum += row[x] * row[x];
            }
            map_.At(i, j) = lmk::Log(sum / cells + 1.0);
        }
    }
    out = &map_;
    return KT_OK;
}

// ---------------------------------------------------------------- Band

Band::Band(int32_t level) : level_(level) {
    for (int32_t k = 0; k < 3; ++k) subbands_[k].reset(new (std::nothrow) Subband(static_cast<Direction>(k)));
}

int Band::CalcLogEnergy(double& energy) const {
    double e[3];
    for (int32_t k = 0; k < 3; ++k) subbands_[k]->CalcLogEnergy(e[k]);
    energy = 0.8 * e[kDirectionDiagonal] + 0.1 * (e[kDirectionRight] + e[kDirectionBelow]);
    return KT_OK;
}

int Band::CalcBlockEnergyMap(int32_t blockSize, const EnergyMap*& out, float overlap) {
    const int32_t b = static_cast<int32_t>(blockSize / static_cast<double>(1u << (level_ + 1)));
    const EnergyMap* maps[3];
    for (int32_t k = 0; k < 3; ++k) {
        const int status = subbands_[k]->CalcBlockEnergyMap(b, overlap, maps[k]);
        if (status != KT_OK) return status;
    }
    const int32_t width = maps[kDirectionBelow]->Width();
    const int32_t height = maps[kDirectionRight]->Height();
    // Every orientation map covers at least this grid: the right and diagonal
    // subbands are never narrower than the one below, the below and diagonal
    // ones never lower than the one to the right.
    const int status = map_.Reset(width, height);
    if (status != KT_OK) return status;
    for (int32_t y = 0; y < height; ++y) {
        for (int32_t x = 0; x < width; ++x) {
            map_.At(x, y) = 0.8 * maps[kDirectionDiagonal]->At(x, y) +
                            0.1 * (maps[kDirectionRight]->At(x, y) + maps[kDirectionBelow]->At(x, y));
        }
    }
    out = &map_;
    return KT_OK;
}

// ---------------------------------------------------------------- Coefficient

int Coefficient::Reset(int32_t levels) {
    bands_.reset();
    levels_ = 0;
    if (levels <= 0) return KT_OK;
    bands_ = lmk::NewArray<std::unique_ptr<Band>>(static_cast<size_t>(levels));
    if (!bands_) return KT_ERR_NO_MEMORY;
    levels_ = levels;
    return KT_OK;
}

int Coefficient::CreateBand(int32_t level, Band*& band) {
    if (level < 0 || level >= levels_) return KT_ERR_STATE;
    std::unique_ptr<Band> created(new (std::nothrow) Band(level));
    if (!created || !created->Valid()) return KT_ERR_NO_MEMORY;
    bands_[level] = std::move(created);
    band = bands_[level].get();
    return KT_OK;
}

int Coefficient::CalcLogEnergy(int32_t levels, double& energy) const {
    if (levels > levels_) return KT_ERR_STATE;
    double sum = 0.0;
    for (int32_t k = 0; k < levels; ++k) {
        double e;
        bands_[k]->CalcLogEnergy(e);
        sum += LevelWeight(levels, k) * e;
    }
    energy = sum;
    return KT_OK;
}

int Coefficient::CalcBlockEnergyMap(int32_t levels, float overlap) {
    if (levels > levels_ || levels <= 0) return KT_ERR_STATE;
    for (int32_t k = 0; k < levels; ++k) {
        const EnergyMap* band;
        int status = bands_[k]->CalcBlockEnergyMap(16, band, overlap);
        if (status != KT_OK) return status;
        if (k == 0) {
            status = map_.Reset(band->Width(), band->Height());
            if (status != KT_OK) return status;
        } else if (band->Width() != map_.Width() || band->Height() != map_.Height()) {
            return KT_ERR_RANGE;
        }
        const double weight = LevelWeight(levels, k);
        for (int32_t y = 0; y < map_.Height(); ++y)
            for (int32_t x = 0; x < map_.Width(); ++x) map_.At(x, y) += weight * band->At(x, y);
    }
    return KT_OK;
}

int Coefficient::CalcBlockEnergy(int32_t percent, double& energy) const {
    const int32_t count = map_.Count();
    if (count == 0) {
        energy = 0.0;
        return KT_OK;
    }
    lmk::UniqueArray<double> sorted = lmk::NewUninitializedArray<double>(static_cast<size_t>(count));
    if (!sorted) return KT_ERR_NO_MEMORY;
    std::copy(map_.Values(), map_.Values() + count, sorted.get());
    std::sort(sorted.get(), sorted.get() + count, std::greater<double>());
    // Small maps would otherwise take no cell at all.
    const int32_t m = std::max<int32_t>(1, static_cast<int32_t>(static_cast<int64_t>(percent) * count / 100));
    double sum = 0.0;
    for (int32_t i = 0; i < m; ++i) sum += sorted[i] * sorted[i];
    energy = std::sqrt(sum / m);
    return KT_OK;
}

// ---------------------------------------------------------------- Cohen

int Cohen::Initialize(const unsigned char* pixels, int32_t width, int32_t height) {
    if (!pixels || width <= 0 || height <= 0) return KT_ERR_NULL;
    uint32_t count;
    if (!lmk::CheckedMul(static_cast<uint32_t>(width), static_cast<uint32_t>(height), &count) ||
        count > 0x7FFFFFFFu / sizeof(double)) {
        return KT_ERR_NO_MEMORY;
    }
    data_ = lmk::NewUninitializedArray<double>(count);
    if (!data_) return KT_ERR_NO_MEMORY;
    for (uint32_t i = 0; i < count; ++i) data_[i] = pixels[i];
    width_ = width;
    height_ = height;
    // Levels from the shorter side, in single precision as the scores were tuned with.
    const float shorter = static_cast<float>(std::min(width, height));
    levels_ = static_cast<int32_t>(static_cast<float>(lmk::Log(shorter)) / 0.6931472f);
    if (levels_ > kMaxLevels) levels_ = kMaxLevels;
    int32_t w = width, h = height;
    for (int32_t k = 0; k < levels_; ++k) {
        regionWidth_[k] = w;
        regionHeight_[k] = h;
        w /= 2;
        h /= 2;
    }
    return KT_OK;
}

void Cohen::Transform1D(double* x, int32_t n, int32_t stride, double* scratch) {
    if (n < 2) return;
    const int32_t h = n / 2;
    double* s = scratch;
    double* d = scratch + h;
    for (int32_t i = 0; i < h; ++i) {
        s[i] = x[(2 * i) * stride];
        d[i] = x[(2 * i + 1) * stride];
    }
    for (int32_t i = 0; i < h - 1; ++i) d[i] += kAlpha * (s[i] + s[i + 1]);
    d[h - 1] += 2.0 * kAlpha * s[h - 1];
    s[0] += 2.0 * kBeta * d[0];
    for (int32_t i = 1; i < h; ++i) s[i] += kBeta * (d[i - 1] + d[i]);
    for (int32_t i = 0; i < h - 1; ++i) d[i] += kGamma * (s[i] + s[i + 1]);
    d[h - 1] += 2.0 * kGamma * s[h - 1];
    s[0] += 2.0 * kDelta * d[0];
    for (int32_t i = 1; i < h; ++i) s[i] += kDelta * (d[i - 1] + d[i]);
    for (int32_t i = 0; i < h; ++i) {
        x[i * stride] = s[i] / kSmoothScale;
        x[(h + i) * stride] = d[i] * kDetailScale;
    }
    if (n % 2 != 0) x[(n - 1) * stride] = d[h - 1] * kDetailScale;
}

// The column pass of one level: the same lifting as Transform1D, applied to
// strips of whole rows at once (row 2i is s_i, row 2i+1 is d_i) so that
// memory is read in order. Every value sees exactly the operations of
// Transform1D. scratch holds kStrip x h values.
void Cohen::TransformColumns(int32_t w, int32_t h, double* scratch) {
    if (h < 2) return;
    const int32_t half = h / 2;
    for (int32_t x0 = 0; x0 < w; x0 += kStrip) {
        const int32_t n = std::min(kStrip, w - x0);
        double* base = data_.get() + x0;
        auto row = [&](int32_t y) { return base + static_cast<size_t>(y) * width_; };
        auto s = [&](int32_t i) { return scratch + static_cast<size_t>(i) * kStrip; };
        auto d = [&](int32_t i) { return scratch + static_cast<size_t>(half + i) * kStrip; };
        for (int32_t i = 0; i < half; ++i) {
            std::copy(row(2 * i), row(2 * i) + n, s(i));
            std::copy(row(2 * i + 1), row(2 * i + 1) + n, d(i));
        }
        auto predict = [&](double k) {
            for (int32_t i = 0; i < half - 1; ++i) {
                double* di = d(i);
                const double *a = s(i), *b = s(i + 1);
                for (int32_t x = 0; x < n; ++x) di[x] += k * (a[x] + b[x]);
            }
            double* last = d(half - 1);
            const double* a = s(half - 1);
            for (int32_t x = 0; x < n; ++x) last[x] += 2.0 * k * a[x];
        };
        auto update = [&](double k) {
            double* first = s(0);
            const double* d0 = d(0);
            for (int32_t x = 0; x < n; ++x) first[x] += 2.0 * k * d0[x];
            for (int32_t i = 1; i < half; ++i) {
                double* si = s(i);
                const double *a = d(i - 1), *b = d(i);
                for (int32_t x = 0; x < n; ++x) si[x] += k * (a[x] + b[x]);
            }
        };
        predict(kAlpha);
        update(kBeta);
        predict(kGamma);
        update(kDelta);
        for (int32_t i = 0; i < half; ++i) {
            const double *si = s(i), *di = d(i);
            double *top = row(i), *bottom = row(half + i);
            for (int32_t x = 0; x < n; ++x) {
                top[x] = si[x] / kSmoothScale;
                bottom[x] = di[x] * kDetailScale;
            }
        }
        if (h % 2 != 0) {
            const double* di = d(half - 1);
            double* last = row(h - 1);
            for (int32_t x = 0; x < n; ++x) last[x] = di[x] * kDetailScale;
        }
    }
}

int Cohen::ForwardTransform(int32_t levels) {
    if (!data_) return KT_ERR_STATE;
    if (levels == 0) levels = levels_;
    if (levels < 0 || levels > levels_) return KT_ERR_STATE;
    const size_t scratchSize = static_cast<size_t>(std::max(width_, static_cast<int32_t>(kStrip) * height_));
    lmk::UniqueArray<double> scratch = lmk::NewUninitializedArray<double>(scratchSize);
    if (!scratch) return KT_ERR_NO_MEMORY;
    for (int32_t k = 0; k < levels; ++k) {
        const int32_t w = regionWidth_[k], h = regionHeight_[k];
        for (int32_t y = 0; y < h; ++y) Transform1D(data_.get() + static_cast<size_t>(y) * width_, w, 1, scratch.get());
        TransformColumns(w, h, scratch.get());
    }
    return KT_OK;
}

int Cohen::GetCoefficient(int32_t levels, Coefficient& coefficient) const {
    if (!data_ || levels <= 0 || levels > levels_ - 1) return KT_ERR_STATE;
    int status = coefficient.Reset(levels);
    if (status != KT_OK) return status;
    for (int32_t k = 0; k < levels; ++k) {
        const int32_t w = regionWidth_[k], h = regionHeight_[k];
        const int32_t nw = regionWidth_[k + 1], nh = regionHeight_[k + 1];
        Band* band = nullptr;
        status = coefficient.CreateBand(k, band);
        if (status != KT_OK) return status;
        const double* base = data_.get();
        status = band->GetSubband(kDirectionRight).SetData(base + nw, width_, w - nw, nh);
        if (status == KT_OK)
            status = band->GetSubband(kDirectionBelow).SetData(base + static_cast<size_t>(nh) * width_, width_, nw, h - nh);
        if (status == KT_OK)
            status = band->GetSubband(kDirectionDiagonal)
                         .SetData(base + static_cast<size_t>(nh) * width_ + nw, width_, w - nw, h - nh);
        if (status != KT_OK) return status;
    }
    return KT_OK;
}

// ---------------------------------------------------------------- scorer

int CalcBlurScorer(const _zbm_Image* gray, _zbm_Image** blurMap, BlurScores* scores) {
    if (!gray || !blurMap || !scores) return KT_ERR_NULL;
    if (*blurMap) return KT_ERR_STATE;
    if (gray->width < 24 || gray->height < 24) {
        scores->outOfFocus = -1.0;
        scores->cameraShake = -1.0;
        return KT_OK;
    }
    if (!gray->pData) return KT_ERR_NO_PIXELS;
    if (gray->order != ZBM_PIXEL_ORDER_GRAY || gray->pitch != gray->width) return KT_ERR_STATE;

    Cohen cohen;
    int status = cohen.Initialize(gray->pData, gray->width, gray->height);
    if (status == KT_ERR_NULL) return KT_ERR_NO_PIXELS;
    if (status != KT_OK) return status;
    const int32_t kLevels = 3;
    status = cohen.ForwardTransform(kLevels);
    if (status != KT_OK) return status;
    Coefficient coefficient;
    status = cohen.GetCoefficient(kLevels, coefficient);
    if (status != KT_OK) return status;
    double globalEnergy;
    status = coefficient.CalcLogEnergy(kLevels, globalEnergy);
    if (status != KT_OK) return status;
    // A level whose map has another size (12) leaves the finer levels summed.
    status = coefficient.CalcBlockEnergyMap(kLevels, 0.5f);
    if (status == KT_ERR_NO_MEMORY) return status;
    double topEnergy;
    status = coefficient.CalcBlockEnergy(5, topEnergy);
    if (status != KT_OK) return status;
    _zbm_Image* map = nullptr;
    if (coefficient.GetEnergyMap().Count() != 0) {
        status = coefficient.GetEnergyMap().CreateBlurmap(&map);
        if (status != KT_OK) return status;
    }
    scores->outOfFocus = 1.0 / (1.0 + lmk::Exp(2.0 * (topEnergy - 0.5252)));
    scores->cameraShake = 1.0 / (1.0 + lmk::Exp((globalEnergy - 14.2742) * 0.125));
    *blurMap = map;
    return KT_OK;
}

}  // namespace blur
