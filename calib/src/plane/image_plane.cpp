#include "calib/src/plane/image_plane.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <type_traits>

#include "common/src/internal/memory.h"
#include "common/src/internal/ppm.h"

namespace {

// Span of a plane in bytes must be addressable with 32-bit offsets.
template <typename T>
bool FitsBuffer(int32_t stride, int32_t rows) {
    return static_cast<int64_t>(stride) * rows * static_cast<int64_t>(sizeof(T)) <= INT32_MAX;
}

inline uint8_t ToByte(uint8_t v) { return v; }
inline uint8_t ToByte(float v) {
    if (!(v > 0.0f)) return 0;
    if (v >= 255.0f) return 255;
    return static_cast<uint8_t>(v);
}

template <typename T>
T Filler();
template <>
uint8_t Filler<uint8_t>() {
    return 128;
}
template <>
float Filler<float>() {
    return 0.0f;
}

std::FILE* OpenDump(const char* path, bool append) {
    if (path == nullptr) return nullptr;
    std::FILE* fp = std::fopen(path, append ? "r+b" : "wb");
    // "r+b" keeps what is there; later planes go after it.
    if (fp != nullptr && append && std::fseek(fp, 0, SEEK_END) != 0) {
        std::fclose(fp);
        return nullptr;
    }
    return fp;
}

template <typename T>
bool DumpRows(std::FILE* fp, const T* first, int32_t width, int32_t height, int32_t stride) {
    for (int32_t y = 0; y < height; ++y) {
        if (std::fwrite(first + static_cast<ptrdiff_t>(y) * stride, sizeof(T), static_cast<size_t>(width), fp) !=
            static_cast<size_t>(width)) {
            return false;
        }
    }
    return true;
}

}  // namespace

template <typename T>
ImagePlaneT<T>::ImagePlaneT()
    : pBuf(nullptr), pPixel(nullptr), pConstBuf(nullptr), pConstPixel(nullptr), stride(-1), bufHeight(-1),
      width(-1), height(-1), owned(0) {}

template <typename T>
ImagePlaneT<T>::~ImagePlaneT() {
    iReset();
}

template <typename T>
int32_t ImagePlaneT<T>::iReset() {
    if (owned) std::free(pBuf);
    pBuf = nullptr;
    pPixel = nullptr;
    pConstBuf = nullptr;
    pConstPixel = nullptr;
    stride = bufHeight = width = height = -1;
    owned = 0;
    return 0;
}

template <typename T>
void ImagePlaneT<T>::SetView(T* buf, const T* constBuf, int32_t w, int32_t h, int32_t s, int32_t bh,
                             int32_t offset) {
    pBuf = buf;
    pPixel = buf ? buf + offset : nullptr;
    pConstBuf = constBuf;
    pConstPixel = constBuf + offset;
    stride = s;
    bufHeight = bh;
    width = w;
    height = h;
    owned = 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iInit(int32_t w, int32_t h) {
    if (w <= 0 || h <= 0 || !IsFresh()) return IMAGEPLANE_ERR_INIT;
    const int64_t s = (static_cast<int64_t>(w) + 15) / 16 * 16;
    if (s > INT32_MAX || !FitsBuffer<T>(static_cast<int32_t>(s), h)) return IMAGEPLANE_ERR_INIT;
    // Zeroed, so that a map that a step leaves alone reads the same everywhere;
    // calloc gets large planes as fresh zero pages instead of clearing them.
    static_assert(std::is_trivially_copyable<T>::value, "plane pixels are plain values");
    T* buf = static_cast<T*>(std::calloc(static_cast<size_t>(s) * static_cast<size_t>(h), sizeof(T)));
    if (buf == nullptr) {
        iReset();
        return IMAGEPLANE_ERR_INIT;
    }
    SetView(buf, buf, w, h, static_cast<int32_t>(s), h, 0);
    owned = 1;
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iInit(int32_t w, int32_t h, T* buffer, int32_t s, int32_t bh, int32_t offsetX,
                              int32_t offsetY) {
    if (w <= 0 || h <= 0 || offsetX < 0 || offsetY < 0 || buffer == nullptr || !IsFresh()) {
        return IMAGEPLANE_ERR_INIT;
    }
    if (static_cast<int64_t>(s) < static_cast<int64_t>(w) + offsetX ||
        static_cast<int64_t>(bh) < static_cast<int64_t>(h) + offsetY || !FitsBuffer<T>(s, bh)) {
        return IMAGEPLANE_ERR_INIT;
    }
    SetView(buffer, buffer, w, h, s, bh, offsetX + s * offsetY);
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iInit(int32_t w, int32_t h, ImagePlaneT* parent, int32_t offsetX, int32_t offsetY) {
    if (parent == nullptr || parent->pBuf == nullptr) return IMAGEPLANE_ERR_INIT;
    const int32_t status = iInit(w, h, static_cast<const ImagePlaneT*>(parent), offsetX, offsetY);
    if (status != 0) return status;
    pBuf = parent->pBuf;
    pPixel = parent->pPixel + (pConstPixel - parent->pConstPixel);
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iInit(int32_t w, int32_t h, const ImagePlaneT* parent, int32_t offsetX,
                              int32_t offsetY) {
    if (parent == nullptr || parent->pConstPixel == nullptr || !IsFresh() || offsetX < 0 || offsetY < 0 ||
        w < 1 || h < 1 || w > parent->width - offsetX || h > parent->height - offsetY) {
        return IMAGEPLANE_ERR_INIT;
    }
    const int32_t parentOffset = static_cast<int32_t>(parent->pConstPixel - parent->pConstBuf);
    SetView(nullptr, parent->pConstBuf, w, h, parent->stride, parent->bufHeight,
            parentOffset + offsetX + parent->stride * offsetY);
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iResetPicSize(int32_t w, int32_t h) {
    if (pConstBuf == nullptr) return IMAGEPLANE_ERR_SIZE;
    // A view may not grow past the end of the buffer it looks into.
    const int32_t offset = static_cast<int32_t>(pConstPixel - pConstBuf);
    const int32_t colOffset = offset % stride, rowOffset = offset / stride;
    if (w < 1 || w > stride - colOffset || h < 1 || h > bufHeight - rowOffset) return IMAGEPLANE_ERR_SIZE;
    width = w;
    height = h;
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iResetPxlVal(int32_t value) {
    if (value > 255 || value < 0 || pPixel == nullptr) return IMAGEPLANE_ERR_SIZE;
    for (int32_t y = 0; y < height; ++y) {
        std::memset(pPixel + static_cast<ptrdiff_t>(y) * stride, value, static_cast<size_t>(width) * sizeof(T));
    }
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iCopyPixel(const ImagePlaneT* src, int32_t srcX, int32_t srcY, int32_t dstX, int32_t dstY,
                                   int32_t w, int32_t h) {
    if (src == nullptr || src->pConstPixel == nullptr || pPixel == nullptr || srcX < 0 || srcY < 0 || dstX < 0 ||
        dstY < 0 || w < 0 || h < 0) {
        return IMAGEPLANE_ERR_COPY;
    }
    if (static_cast<int64_t>(srcX) + w > src->width || static_cast<int64_t>(srcY) + h > src->height ||
        static_cast<int64_t>(dstX) + w > width || static_cast<int64_t>(dstY) + h > height) {
        return IMAGEPLANE_ERR_COPY;
    }
    for (int32_t y = 0; y < h; ++y) {
        std::memmove(pPixel + static_cast<ptrdiff_t>(dstY + y) * stride + dstX,
                     src->pConstPixel + static_cast<ptrdiff_t>(srcY + y) * src->stride + srcX,
                     static_cast<size_t>(w) * sizeof(T));
    }
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iCopyPixel(const ImagePlaneT* src, int32_t x, int32_t y) {
    if (src == nullptr) return IMAGEPLANE_ERR_COPY;
    const int32_t srcX = x > 0 ? x : 0, srcY = y > 0 ? y : 0;
    const int64_t dstX = x < 0 ? -static_cast<int64_t>(x) : 0, dstY = y < 0 ? -static_cast<int64_t>(y) : 0;
    if (dstX > width || dstY > height) return IMAGEPLANE_ERR_COPY;
    const int64_t w = std::min<int64_t>(static_cast<int64_t>(src->width) - srcX, width - dstX);
    const int64_t h = std::min<int64_t>(static_cast<int64_t>(src->height) - srcY, height - dstY);
    if (w < 0 || h < 0) return IMAGEPLANE_ERR_COPY;
    return iCopyPixel(src, srcX, srcY, static_cast<int32_t>(dstX), static_cast<int32_t>(dstY),
                      static_cast<int32_t>(w), static_cast<int32_t>(h));
}

template <typename T>
int32_t ImagePlaneT<T>::iPadding(int32_t padX, int32_t padY, int32_t innerWidth, int32_t innerHeight) {
    if (pPixel == nullptr || padX < 0 || padY < 0 || innerWidth < 1 || innerHeight < 1 ||
        static_cast<int64_t>(innerWidth) + 2 * static_cast<int64_t>(padX) > width ||
        static_cast<int64_t>(innerHeight) + 2 * static_cast<int64_t>(padY) > height) {
        return IMAGEPLANE_ERR_FILE;
    }
    const int32_t paddedWidth = innerWidth + 2 * padX;
    for (int32_t y = padY; y < padY + innerHeight; ++y) {
        T* row = pPixel + static_cast<ptrdiff_t>(y) * stride;
        const T left = row[padX], right = row[padX + innerWidth - 1];
        for (int32_t x = 0; x < padX; ++x) {
            row[x] = left;
            row[padX + innerWidth + x] = right;
        }
    }
    const T* first = pPixel + static_cast<ptrdiff_t>(padY) * stride;
    const T* last = pPixel + static_cast<ptrdiff_t>(padY + innerHeight - 1) * stride;
    for (int32_t y = 0; y < padY; ++y) {
        std::memcpy(pPixel + static_cast<ptrdiff_t>(y) * stride, first, static_cast<size_t>(paddedWidth) * sizeof(T));
        std::memcpy(pPixel + static_cast<ptrdiff_t>(padY + innerHeight + y) * stride, last,
                    static_cast<size_t>(paddedWidth) * sizeof(T));
    }
    return 0;
}

template <typename T>
int32_t ImagePlaneT<T>::iSavePGM(const char* path) const {
    if (pConstPixel == nullptr || path == nullptr) return IMAGEPLANE_ERR_FILE;
    lmk::UniqueArray<uint8_t> packed =
        lmk::NewArray<uint8_t>(static_cast<size_t>(width) * static_cast<size_t>(height));
    if (!packed) return IMAGEPLANE_ERR_FILE;
    for (int32_t y = 0; y < height; ++y) {
        const T* row = pConstPixel + static_cast<ptrdiff_t>(y) * stride;
        for (int32_t x = 0; x < width; ++x) packed[static_cast<size_t>(y) * width + x] = ToByte(row[x]);
    }
    const lmk::PnmStatus r = lmk::WritePnm(path, 1, width, height, packed.get());
    if (r == lmk::PnmStatus::kOpenFailed) std::printf("%s can not open\n", path);
    return r == lmk::PnmStatus::kOk ? 0 : IMAGEPLANE_ERR_FILE;
}

template <typename T>
int32_t ImagePlaneT<T>::iDebugDump(const char* path, bool append) const {
    if (pConstPixel == nullptr) return IMAGEPLANE_ERR_FILE;
    std::FILE* fp = OpenDump(path, append);
    if (fp == nullptr) return IMAGEPLANE_ERR_FILE;
    bool ok = DumpRows(fp, pConstPixel, width, height, stride);
    const T filler = Filler<T>();
    const int64_t fillerCount = 2 * static_cast<int64_t>(width / 2) * (height / 2);
    for (int64_t i = 0; ok && i < fillerCount; ++i) ok = std::fwrite(&filler, sizeof(T), 1, fp) == 1;
    ok = std::fclose(fp) == 0 && ok;
    return ok ? 0 : IMAGEPLANE_ERR_FILE;
}

template class ImagePlaneT<uint8_t>;
template class ImagePlaneT<float>;

// ------------------------------------------------------------------ MIPlane

int32_t MIPlane::DivX(int32_t f) {
    static const int32_t kDiv[5] = {2, 2, 1, 4, 1};
    return f >= 0 && f < 5 ? kDiv[f] : 0;
}

int32_t MIPlane::DivY(int32_t f) {
    static const int32_t kDiv[5] = {2, 1, 1, 1, 1};
    return f >= 0 && f < 5 ? kDiv[f] : 0;
}

MIPlane::MIPlane() : planes{nullptr, nullptr, nullptr}, width(-1), height(-1), crmWidth(-1), crmHeight(-1), format(-1) {}

MIPlane::~MIPlane() { iReset(); }

int32_t MIPlane::iReset() {
    for (ImagePlane*& p : planes) {
        delete p;
        p = nullptr;
    }
    width = height = crmWidth = crmHeight = format = -1;
    return 0;
}

int32_t MIPlane::CreatePlanes() {
    for (ImagePlane*& p : planes) {
        p = new (std::nothrow) ImagePlane();
        if (p == nullptr) return MIPLANE_ERR_INIT;
    }
    return 0;
}

namespace {
bool SizesFit(int32_t w, int32_t h, int32_t format) {
    const int32_t dx = MIPlane::DivX(format), dy = MIPlane::DivY(format);
    return dx != 0 && w >= 1 && h >= 1 && w % dx == 0 && h % dy == 0;
}
}  // namespace

int32_t MIPlane::iInit(int32_t w, int32_t h, int32_t f) {
    if (!SizesFit(w, h, f) || planes[0] != nullptr) return MIPLANE_ERR_INIT;
    const int32_t cw = w / DivX(f), ch = h / DivY(f);
    if (CreatePlanes() != 0 || planes[0]->iInit(w, h) != 0 || planes[1]->iInit(cw, ch) != 0 ||
        planes[2]->iInit(cw, ch) != 0) {
        iReset();
        return MIPLANE_ERR_INIT;
    }
    width = w;
    height = h;
    crmWidth = cw;
    crmHeight = ch;
    format = f;
    return 0;
}

int32_t MIPlane::iInit(int32_t w, int32_t h, int32_t f, const MIPlaneBuffer (&buffers)[3]) {
    if (!SizesFit(w, h, f) || planes[0] != nullptr) return MIPLANE_ERR_INIT;
    const int32_t cw = w / DivX(f), ch = h / DivY(f);
    if (CreatePlanes() != 0) {
        iReset();
        return MIPLANE_ERR_INIT;
    }
    for (int i = 0; i < 3; ++i) {
        const MIPlaneBuffer& b = buffers[i];
        if (planes[i]->iInit(i == 0 ? w : cw, i == 0 ? h : ch, b.buffer, b.stride, b.bufHeight, b.offsetX,
                             b.offsetY) != 0) {
            iReset();
            return MIPLANE_ERR_INIT;
        }
    }
    width = w;
    height = h;
    crmWidth = cw;
    crmHeight = ch;
    format = f;
    return 0;
}

int32_t MIPlane::InitView(int32_t w, int32_t h, MIPlane* parent, const MIPlane* constParent, int32_t offsetX,
                          int32_t offsetY) {
    if (constParent == nullptr || constParent->planes[0] == nullptr || planes[0] != nullptr) return MIPLANE_ERR_INIT;
    const int32_t f = constParent->format, dx = DivX(f), dy = DivY(f);
    if (!SizesFit(w, h, f) || offsetX < 0 || offsetY < 0 || offsetX % dx != 0 || offsetY % dy != 0) {
        return MIPLANE_ERR_INIT;
    }
    if (CreatePlanes() != 0) {
        iReset();
        return MIPLANE_ERR_INIT;
    }
    for (int i = 0; i < 3; ++i) {
        const int32_t pw = i == 0 ? w : w / dx, ph = i == 0 ? h : h / dy;
        const int32_t ox = i == 0 ? offsetX : offsetX / dx, oy = i == 0 ? offsetY : offsetY / dy;
        const int32_t status = parent ? planes[i]->iInit(pw, ph, parent->planes[i], ox, oy)
                                      : planes[i]->iInit(pw, ph, static_cast<const ImagePlane*>(constParent->planes[i]), ox, oy);
        if (status != 0) {
            iReset();
            return MIPLANE_ERR_INIT;
        }
    }
    width = w;
    height = h;
    crmWidth = w / dx;
    crmHeight = h / dy;
    format = f;
    return 0;
}

int32_t MIPlane::iInit(int32_t w, int32_t h, MIPlane* parent, int32_t offsetX, int32_t offsetY) {
    return InitView(w, h, parent, parent, offsetX, offsetY);
}

int32_t MIPlane::iInit(int32_t w, int32_t h, const MIPlane* parent, int32_t offsetX, int32_t offsetY) {
    return InitView(w, h, nullptr, parent, offsetX, offsetY);
}

int32_t MIPlane::iCopyPixel(const uint8_t* packed, int32_t w, int32_t h) {
    if (format != 4 || packed == nullptr || w < 0 || h < 0 || w > width || h > height ||
        planes[0]->pPixel == nullptr) {
        return MIPLANE_ERR_COPY;
    }
    ImagePlane& g = *planes[0];
    ImagePlane& b = *planes[1];
    ImagePlane& r = *planes[2];
    for (int32_t y = 0; y < h; ++y) {
        const uint8_t* s = packed + static_cast<ptrdiff_t>(y) * w * 3;
        uint8_t* pr = r.pPixel + static_cast<ptrdiff_t>(y) * r.stride;
        uint8_t* pg = g.pPixel + static_cast<ptrdiff_t>(y) * g.stride;
        uint8_t* pb = b.pPixel + static_cast<ptrdiff_t>(y) * b.stride;
        for (int32_t x = 0; x < w; ++x, s += 3) {
            pr[x] = s[0];
            pg[x] = s[1];
            pb[x] = s[2];
        }
    }
    return 0;
}

int32_t MIPlane::iCopyPixel(const MIPlane* src, int32_t srcX, int32_t srcY, int32_t dstX, int32_t dstY,
                            int32_t w, int32_t h) {
    if (src == nullptr || src->format != format || planes[0] == nullptr) return MIPLANE_ERR_COPY;
    const int32_t dx = DivX(format), dy = DivY(format);
    if (srcX % dx || dstX % dx || w % dx || srcY % dy || dstY % dy || h % dy) return MIPLANE_ERR_COPY;
    for (int i = 0; i < 3; ++i) {
        const int32_t cx = i == 0 ? 1 : dx, cy = i == 0 ? 1 : dy;
        if (planes[i]->iCopyPixel(src->planes[i], srcX / cx, srcY / cy, dstX / cx, dstY / cy, w / cx, h / cy) != 0) {
            return MIPLANE_ERR_COPY;
        }
    }
    return 0;
}

int32_t MIPlane::iCopyPixel(const MIPlane* src, int32_t x, int32_t y) {
    if (src == nullptr || src->format != format || planes[0] == nullptr) return MIPLANE_ERR_COPY;
    const int32_t dx = DivX(format), dy = DivY(format);
    if (x % dx || y % dy) return MIPLANE_ERR_COPY;
    for (int i = 0; i < 3; ++i) {
        const int32_t cx = i == 0 ? 1 : dx, cy = i == 0 ? 1 : dy;
        if (planes[i]->iCopyPixel(src->planes[i], x / cx, y / cy) != 0) return MIPLANE_ERR_COPY;
    }
    return 0;
}

int32_t MIPlane::iResetPicSize(int32_t w, int32_t h) {
    if (planes[0] == nullptr || !SizesFit(w, h, format)) return MIPLANE_ERR_MULTIPLE;
    const int32_t cw = w / DivX(format), ch = h / DivY(format);
    // Check all three before changing any.
    for (int i = 0; i < 3; ++i) {
        ImagePlane& p = *planes[i];
        const int32_t offset = static_cast<int32_t>(p.pConstPixel - p.pConstBuf);
        const int32_t pw = i == 0 ? w : cw, ph = i == 0 ? h : ch;
        if (pw > p.stride - offset % p.stride || ph > p.bufHeight - offset / p.stride) return IMAGEPLANE_ERR_SIZE;
    }
    planes[0]->iResetPicSize(w, h);
    planes[1]->iResetPicSize(cw, ch);
    planes[2]->iResetPicSize(cw, ch);
    width = w;
    height = h;
    crmWidth = cw;
    crmHeight = ch;
    return 0;
}

int32_t MIPlane::iResetPxlVal(int32_t v0, int32_t v1, int32_t v2) {
    if (planes[0] == nullptr) return IMAGEPLANE_ERR_SIZE;
    int32_t status = planes[0]->iResetPxlVal(v0);
    if (status == 0) status = planes[1]->iResetPxlVal(v1);
    if (status == 0) status = planes[2]->iResetPxlVal(v2);
    return status;
}

int32_t MIPlane::iPadding(int32_t padX, int32_t padY, int32_t innerWidth, int32_t innerHeight) {
    if (planes[0] == nullptr || padX < 0 || padY < 0 ||
        static_cast<int64_t>(innerWidth) + 2 * static_cast<int64_t>(padX) > width ||
        static_cast<int64_t>(innerHeight) + 2 * static_cast<int64_t>(padY) > height) {
        return MIPLANE_ERR_PADDING;
    }
    const int32_t dx = DivX(format), dy = DivY(format);
    int32_t status = planes[0]->iPadding(padX, padY, innerWidth, innerHeight);
    for (int i = 1; i < 3 && status == 0; ++i) {
        status = planes[i]->iPadding(padX / dx, padY / dy, innerWidth / dx, innerHeight / dy);
    }
    return status;
}

int32_t MIPlane::iSavePPM(const char* path) const {
    if (planes[0] == nullptr || (format != 2 && format != 4) || path == nullptr) return IMAGEPLANE_ERR_FILE;
    lmk::UniqueArray<uint8_t> packed =
        lmk::NewArray<uint8_t>(static_cast<size_t>(width) * static_cast<size_t>(height) * 3);
    if (!packed) return IMAGEPLANE_ERR_FILE;
    uint8_t* out = packed.get();
    for (int32_t y = 0; y < height; ++y) {
        const uint8_t* p0 = planes[0]->pConstPixel + static_cast<ptrdiff_t>(y) * planes[0]->stride;
        const uint8_t* p1 = planes[1]->pConstPixel + static_cast<ptrdiff_t>(y) * planes[1]->stride;
        const uint8_t* p2 = planes[2]->pConstPixel + static_cast<ptrdiff_t>(y) * planes[2]->stride;
        for (int32_t x = 0; x < width; ++x) {
            *out++ = p2[x];
            *out++ = p0[x];
            *out++ = p1[x];
        }
    }
    const lmk::PnmStatus r = lmk::WritePnm(path, 3, width, height, packed.get());
    if (r == lmk::PnmStatus::kOpenFailed) std::printf("%s can not open\n", path);
    return r == lmk::PnmStatus::kOk ? 0 : IMAGEPLANE_ERR_FILE;
}

int32_t MIPlane::iDebugDump(const char* path, bool append) const {
    if (planes[0] == nullptr) return IMAGEPLANE_ERR_FILE;
    std::FILE* fp = OpenDump(path, append);
    if (fp == nullptr) return IMAGEPLANE_ERR_FILE;
    bool ok = true;
    for (int i = 0; i < 3 && ok; ++i) {
        const ImagePlane& p = *planes[i];
        ok = DumpRows(fp, p.pConstPixel, p.width, p.height, p.stride);
    }
    ok = std::fclose(fp) == 0 && ok;
    return ok ? 0 : IMAGEPLANE_ERR_FILE;
}

namespace {
int SavePacked(const uint8_t* buffer, int32_t width, int32_t height, const char* path, uint32_t channels) {
    // A directory cannot be opened for writing: it fails like any other path.
    const lmk::PnmStatus r = lmk::WritePnm(path, channels, width, height, buffer);
    if (r == lmk::PnmStatus::kOpenFailed) std::printf("fopen_s() failed\n");
    return r == lmk::PnmStatus::kOk ? 0 : 1;
}
}  // namespace

int save_pgm(const uint8_t* buffer, int32_t width, int32_t height, const char* path) {
    return SavePacked(buffer, width, height, path, 1);
}

int save_ppm(const uint8_t* buffer, int32_t width, int32_t height, const char* path) {
    return SavePacked(buffer, width, height, path, 3);
}
