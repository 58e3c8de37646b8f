#include <cstdint>

#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"
#include "ktlib/src/Similarity/cbs/Texture/texture/texture.h"
#include "ktlib/src/Similarity/cbs/Texture/texture/wavelet.h"

namespace {
const double kHaarScale = 0.707106781;
const int kScales = 3;
}  // namespace

Haar::Haar() : width_(0), height_(0) {}
Haar::~Haar() {}

bool Haar::setSize(int width, int height) {
    if (width <= 0 || height <= 0) return false;
    width_ = width;
    height_ = height;
    line_ = lmk::NewArray<double>(static_cast<size_t>(width > height ? width : height));
    return line_ != nullptr;
}

void Haar::Step(double* data, int n, int stride) const {
    const int averages = (n + 1) / 2;
    const int pairs = n / 2;
    double* line = line_.get();
    for (int i = 0; i < pairs; ++i) {
        const double a = data[static_cast<size_t>(2 * i) * stride];
        const double b = data[static_cast<size_t>(2 * i + 1) * stride];
        line[i] = (a + b) * kHaarScale;
        line[averages + i] = (a - b) * kHaarScale;
    }
    if (n % 2 != 0) line[averages - 1] = 2 * data[static_cast<size_t>(n - 1) * stride] * kHaarScale;
    for (int i = 0; i < n; ++i) data[static_cast<size_t>(i) * stride] = line[i];
}

void Haar::decomposition2DNS(double* data) const {
    int w = width_;
    int h = height_;
    while (w >= 2 && h > 1) {
        for (int r = 0; r < h; ++r) Step(data + static_cast<size_t>(r) * width_, w, 1);
        for (int c = 0; c < w; ++c) Step(data + c, h, width_);
        w = (w + 1) / 2;
        h = (h + 1) / 2;
    }
}

void Haar::transformOnly(double* data) const {
    const size_t n = static_cast<size_t>(width_) * static_cast<size_t>(height_);
    double sum = 0;
    for (size_t i = 0; i < n; ++i) sum += data[i];
    data[0] = sum / static_cast<double>(n);
    decomposition2DNS(data);
}

Wavelet::Wavelet(int width, int height) : width_(width), height_(height), haarReady_(false) {
    if (width <= 0 || height <= 0) return;
    haarReady_ = haar_.setSize(width, height);
    data_ = lmk::NewArray<double>(static_cast<size_t>(width) * static_cast<size_t>(height));
}

Wavelet::~Wavelet() {}

bool Wavelet::detectEdge(const _image_s* image) {
    if (!valid() || !image || !image->data || image->width != width_ || image->height != height_) return false;
    const size_t n = static_cast<size_t>(width_) * static_cast<size_t>(height_);
    const uint8_t* p = image->data;
    for (size_t i = 0; i < n; ++i, p += 4) data_[i] = static_cast<double>((306 * p[0] + 601 * p[1] + 117 * p[2] + 512) >> 10);
    haar_.transformOnly(data_.get());
    return true;
}

void Wavelet::countEdge(float* edge) const {
    int w = width_;
    int h = height_;
    for (int s = 0; s < kScales; ++s) {
        const int regionW = (w / 2) / 3;
        const int regionH = (h / 2) / 3;
        const int bandX = (w + 1) / 2;
        const int bandY = (h + 1) / 2;
        // Origins of the orientation bands: below, right of and diagonal to
        // the approximation.
        const int originX[3] = {0, bandX, bandX};
        const int originY[3] = {bandY, 0, bandY};
        for (int region = 0; region < 9; ++region) {
            const int gx = region % 3;
            const int gy = region / 3;
            for (int o = 0; o < 3; ++o) {
                const int x0 = originX[o] + gx * regionW;
                const int y0 = originY[o] + gy * regionH;
                double sum = 0;
                for (int y = y0; y < y0 + regionH; ++y) {
                    const double* row = data_.get() + static_cast<size_t>(y) * width_;
                    for (int x = x0; x < x0 + regionW; ++x) sum += row[x] < 0 ? -row[x] : row[x];
                }
                edge[27 * s + 3 * region + o] = static_cast<float>(sum);
            }
        }
        w /= 2;
        h /= 2;
    }
}

extern "C" int edge_feature(const _image_s* image, float edge[KT_EDGE_VALUES]) {
    if (!image || !image->data || image->width <= 0 || image->height <= 0 || !edge) return -1;
    Wavelet wavelet(image->width, image->height);
    if (!wavelet.detectEdge(image)) return -1;
    wavelet.countEdge(edge);
    return 0;
}
