#include "ktlib/src/finger/fervl/fervl.h"

#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"

#include <cmath>

namespace {

uint32_t GridColumns(const _FeRVLDictionary& d) { return (d.resizeWidth - d.P) / d.S + 1; }
uint32_t GridRows(const _FeRVLDictionary& d) { return (d.resizeHeight - d.P) / d.S + 1; }

}  // namespace

int FeRVL::checkImage(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch) {
    if (!pixels || width == 0 || height == 0 || pitch == 0 || width > pitch) return KT_ERR_STATE;
    return KT_OK;
}

int FeRVL::checkDictionary(const _FeRVLDictionary* d) {
    if (!d) return KT_ERR_NULL;
    if (d->resizeWidth == 0 || d->resizeHeight == 0 || d->P == 0 || d->S == 0) return KT_ERR_STATE;
    if (d->P > d->resizeWidth || d->P > d->resizeHeight || d->S > d->resizeWidth || d->S > d->resizeHeight) {
        return KT_ERR_STATE;
    }
    // Shapes the arrays rely on; the sizes stay far from 32-bit limits.
    if (d->resizeWidth > 1024 || d->resizeHeight > 1024 || d->K == 0 || d->K > 65536 || d->classCount == 0 ||
        d->patchDimension != 3 * d->P * d->P || !d->centroids || !d->classWeights || !d->whiteningMean ||
        !d->whiteningMatrix || !d->featureMean || !d->featureDeviation) {
        return KT_ERR_STATE;
    }
    return KT_OK;
}

int FeRVL::setRgbColorOrderedBuffToImage(const unsigned char* pixels, uint32_t width, uint32_t height,
                                         uint32_t pitch, _zbm_PixelOrder order, _zbm_Image* image) {
    int32_t ro, go, bo;
    if (order < ZBM_PIXEL_ORDER_RGB || order > ZBM_PIXEL_ORDER_ABGR || !image ||
        image->order != ZBM_PIXEL_ORDER_RGB || static_cast<uint32_t>(image->width) != width ||
        static_cast<uint32_t>(image->height) != height || !ZbiuGetRgbOffset(order, &ro, &go, &bo, nullptr)) {
        return KT_ERR_STATE;
    }
    const int32_t bpp = ZbiuGetBytesPerPixel(order);
    if (static_cast<uint64_t>(width) * bpp > pitch) return KT_ERR_STATE;
    for (uint32_t y = 0; y < height; ++y) {
        const unsigned char* src = pixels + static_cast<size_t>(y) * pitch;
        uint8_t* dst = ZbiuGetPointer(image, 0, static_cast<int32_t>(y));
        for (uint32_t x = 0; x < width; ++x, src += bpp, dst += 3) {
            dst[0] = src[ro];
            dst[1] = src[go];
            dst[2] = src[bo];
        }
    }
    return KT_OK;
}

int FeRVL::createPatches(const _zbm_Image* image, const _FeRVLDictionary& d, double* patches, uint32_t count) {
    const uint32_t cols = GridColumns(d), rows = GridRows(d);
    if (count != cols * rows) return KT_ERR_STATE;
    const uint32_t pp = d.P * d.P, dim = d.patchDimension;
    for (uint32_t r = 0; r < rows; ++r) {
        for (uint32_t c = 0; c < cols; ++c) {
            double* v = patches + static_cast<size_t>(r * cols + c) * dim;
            for (uint32_t y = 0; y < d.P; ++y) {
                const uint8_t* row = ZbiuGetConstPointer(image, static_cast<int32_t>(c * d.S),
                                                         static_cast<int32_t>(r * d.S + y));
                for (uint32_t x = 0; x < d.P; ++x)
                    for (uint32_t ch = 0; ch < 3; ++ch) v[ch * pp + y * d.P + x] = row[x * 3 + ch];
            }
            double mean = 0.0;
            for (uint32_t i = 0; i < dim; ++i) mean += v[i];
            mean /= dim;
            double var = 0.0;
            for (uint32_t i = 0; i < dim; ++i) var += (v[i] - mean) * (v[i] - mean);
            var /= (dim - 1);
            const double scale = std::sqrt(var + 10.0);
            for (uint32_t i = 0; i < dim; ++i) v[i] = (v[i] - mean) / scale;
        }
    }
    return KT_OK;
}

int FeRVL::whitenPatches(const _FeRVLDictionary& d, const double* patches, uint32_t count, double* whitened) {
    const uint32_t dim = d.patchDimension;
    for (uint32_t p = 0; p < count; ++p) {
        const double* x = patches + static_cast<size_t>(p) * dim;
        double* y = whitened + static_cast<size_t>(p) * dim;
        for (uint32_t j = 0; j < dim; ++j) {
            const double* m = d.whiteningMatrix[j];
            double sum = 0.0;
            for (uint32_t i = 0; i < dim; ++i) sum += (x[i] - d.whiteningMean[i]) * m[i];
            y[j] = sum;
        }
    }
    return KT_OK;
}

int FeRVL::calcDistance(const _FeRVLDictionary& d, const double* whitened, uint32_t count, double* distances) {
    const uint32_t dim = d.patchDimension;
    // |y|^2 of every patch first (parked in its centroid-0 slot, which is
    // filled last); each centroid's |c|^2 is then computed once.
    for (uint32_t p = 0; p < count; ++p) {
        const double* y = whitened + static_cast<size_t>(p) * dim;
        double yy = 0.0;
        for (uint32_t i = 0; i < dim; ++i) yy += y[i] * y[i];
        distances[static_cast<size_t>(p) * d.K] = yy;
    }
    for (uint32_t k = d.K; k-- > 0;) {
        const double* c = d.centroids[k];
        double cc = 0.0;
        for (uint32_t i = 0; i < dim; ++i) cc += c[i] * c[i];
        for (uint32_t p = 0; p < count; ++p) {
            const double* y = whitened + static_cast<size_t>(p) * dim;
            double yc = 0.0;
            for (uint32_t i = 0; i < dim; ++i) yc += y[i] * c[i];
            double* out = distances + static_cast<size_t>(p) * d.K;
            const double sq = out[0] - 2.0 * yc + cc;
            out[k] = std::sqrt(sq > 0.0 ? sq : 0.0);
        }
    }
    return KT_OK;
}

int FeRVL::cnvPatchesTo4KFeature(const _FeRVLDictionary& d, const double* distances, uint32_t rows, uint32_t cols,
                                 double* feature) {
    const uint32_t K = d.K;
    const uint32_t halfRows = (rows + 1) / 2, halfCols = (cols + 1) / 2;
    for (uint32_t i = 0; i < 4 * K; ++i) feature[i] = 0.0;
    for (uint32_t r = 0; r < rows; ++r) {
        for (uint32_t c = 0; c < cols; ++c) {
            const double* dist = distances + static_cast<size_t>(r * cols + c) * K;
            double mean = 0.0;
            for (uint32_t k = 0; k < K; ++k) mean += dist[k];
            mean /= K;
            const uint32_t quadrant = (r < halfRows ? 0 : 2) + (c < halfCols ? 0 : 1);
            double* f = feature + quadrant * K;
            for (uint32_t k = 0; k < K; ++k) {
                const double a = mean - dist[k];
                if (a > 0.0) f[k] += a;
            }
        }
    }
    return KT_OK;
}

int FeRVL::normalize4KFeature(const _FeRVLDictionary& d, double* feature) {
    for (uint32_t i = 0; i < 4 * d.K; ++i) feature[i] = (feature[i] - d.featureMean[i]) / d.featureDeviation[i];
    feature[4 * d.K] = 1.0;
    return KT_OK;
}

int FeRVL::calcScores(const _FeRVLDictionary& d, const double* feature, zbmvector<double>& scores) {
    const int32_t first = scores.size();
    if (!scores.Resize(first + static_cast<int32_t>(d.classCount))) return KT_ERR_NO_MEMORY;
    for (uint32_t c = 0; c < d.classCount; ++c) {
        const double* w = d.classWeights[c];
        double sum = 0.0;
        for (uint32_t i = 0; i <= 4 * d.K; ++i) sum += feature[i] * w[i];
        scores[first + static_cast<int32_t>(c)] = sum;
    }
    return KT_OK;
}

int FeRVL::Classify(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch,
                    _zbm_PixelOrder order, const _FeRVLDictionary* dictionary, zbmvector<double>& scores) const {
    int status = checkImage(pixels, width, height, pitch);
    if (status != KT_OK) return status;
    status = checkDictionary(dictionary);
    if (status != KT_OK) return status;
    const _FeRVLDictionary& d = *dictionary;
    if (width > 0x7FFFu || height > 0x7FFFu) return KT_ERR_STATE;

    ZbmImagePtr copy(ZbiuCreate(static_cast<int32_t>(width), static_cast<int32_t>(height), ZBM_PIXEL_ORDER_RGB));
    if (!copy) return KT_ERR_NO_MEMORY;
    status = setRgbColorOrderedBuffToImage(pixels, width, height, pitch, order, copy.get());
    if (status != KT_OK) return status;
    ZbmImagePtr scaled;
    if (width == d.resizeWidth && height == d.resizeHeight) {
        scaled = std::move(copy);
    } else {
        scaled.reset(ZbiuCreate(static_cast<int32_t>(d.resizeWidth), static_cast<int32_t>(d.resizeHeight),
                                ZBM_PIXEL_ORDER_RGB));
        if (!scaled) return KT_ERR_NO_MEMORY;
        status = ZbiuResize(copy.get(), scaled.get());
        if (status != ZBIU_OK) return status;
        copy.reset();
    }

    const uint32_t rows = GridRows(d), cols = GridColumns(d), count = rows * cols;
    const size_t values = static_cast<size_t>(count) * d.patchDimension;
    lmk::UniqueArray<double> patches = lmk::NewArray<double>(values);
    lmk::UniqueArray<double> whitened = lmk::NewArray<double>(values);
    lmk::UniqueArray<double> distances = lmk::NewArray<double>(static_cast<size_t>(count) * d.K);
    lmk::UniqueArray<double> feature = lmk::NewArray<double>(4 * static_cast<size_t>(d.K) + 1);
    if (!patches || !whitened || !distances || !feature) return KT_ERR_NO_MEMORY;
    status = createPatches(scaled.get(), d, patches.get(), count);
    if (status == KT_OK) status = whitenPatches(d, patches.get(), count, whitened.get());
    if (status == KT_OK) status = calcDistance(d, whitened.get(), count, distances.get());
    if (status == KT_OK) status = cnvPatchesTo4KFeature(d, distances.get(), rows, cols, feature.get());
    if (status == KT_OK) status = normalize4KFeature(d, feature.get());
    if (status == KT_OK) status = calcScores(d, feature.get(), scores);
    return status;
}

int FeRVLClassify(const unsigned char* pixels, uint32_t width, uint32_t height, uint32_t pitch, _zbm_PixelOrder order,
                  const _FeRVLDictionary* dictionary, zbmvector<double>& scores) {
    const FeRVL* worker = new (std::nothrow) FeRVL();
    if (!worker) return KT_ERR_NO_MEMORY;
    const int status = worker->Classify(pixels, width, height, pitch, order, dictionary, scores);
    delete worker;
    return status;
}
