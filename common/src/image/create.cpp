// Image records: creation, attaching caller memory, copies, crops, release,
// clearing and single-pixel access.
#include <lumicor/zbm_image.h>

#include <cstdlib>
#include <cstring>

#include "common/src/image/image_util.h"

using namespace lmk::image;

namespace {

// Owning image with a packed pitch. The pixels are zeroed when `zero` is set,
// otherwise left for the caller to fill completely.
_zbm_Image* NewOwningImage(int32_t width, int32_t height, _zbm_PixelOrder order, bool zero) {
    const int32_t bpp = BytesPerPixel(order);
    if (bpp == 0 || width < 1 || height < 1) return nullptr;
    if (static_cast<uint64_t>(width) * static_cast<uint64_t>(height) > kMaxCreatePixels) return nullptr;
    // Below the ceiling the byte count (at most 64,000,000) cannot overflow.
    const size_t bytes = static_cast<size_t>(width) * static_cast<size_t>(height) * static_cast<size_t>(bpp);
    auto* image = static_cast<_zbm_Image*>(std::malloc(sizeof(_zbm_Image)));
    if (!image) return nullptr;
    auto* data = static_cast<uint8_t*>(zero ? std::calloc(bytes, 1) : std::malloc(bytes));
    if (!data) {
        std::free(image);
        return nullptr;
    }
    image->pData = data;
    image->width = width;
    image->height = height;
    image->pitch = width * bpp;
    image->order = order;
    image->bytesPerPixel = bpp;
    image->ownsData = 1;
    return image;
}

void CopyRows(const uint8_t* src, int32_t srcPitch, _zbm_Image* dst) {
    const uint32_t rowBytes = RowBytes(dst);
    for (int32_t y = 0; y < dst->height; ++y) {
        std::memcpy(Row(dst, y), src + static_cast<ptrdiff_t>(y) * srcPitch, rowBytes);
    }
}

void FillPixels(_zbm_Image* image, const zbm_PackedUchar& value) {
    const int32_t bpp = image->bytesPerPixel;
    bool uniform = true;
    for (int32_t c = 1; c < bpp; ++c) uniform = uniform && value.v[c] == value.v[0];
    for (int32_t y = 0; y < image->height; ++y) {
        uint8_t* p = Row(image, y);
        if (uniform) {
            std::memset(p, value.v[0], RowBytes(image));
        } else {
            for (int32_t x = 0; x < image->width; ++x, p += bpp) WritePixel(p, bpp, value);
        }
    }
}

}  // namespace

int32_t ZbiuGetBytesPerPixel(_zbm_PixelOrder order) { return BytesPerPixel(order); }

int ZbiuGetRgbOffset(_zbm_PixelOrder order, int32_t* r, int32_t* g, int32_t* b, int32_t* a) {
    static const int32_t kOffsets[ZBM_PIXEL_ORDER_NUM][4] = {
        {0, 0, 0, 0},  {0, 1, 2, -1}, {2, 1, 0, -1}, {0, 1, 2, 3}, {2, 1, 0, 3},
        {1, 2, 3, 0},  {3, 2, 1, 0},  {0, 0, 0, 0},  {0, 0, 0, 0},
    };
    const int32_t* o = IsValidOrder(order) ? kOffsets[order] : kOffsets[0];
    if (r) *r = o[0];
    if (g) *g = o[1];
    if (b) *b = o[2];
    if (a) *a = o[3];
    return IsRgbFamily(order) ? 1 : 0;
}

_zbm_Image* ZbiuCreate(int32_t width, int32_t height, _zbm_PixelOrder order) {
    return NewOwningImage(width, height, order, true);
}

_zbm_Image* ZbiuCreate(int32_t width, int32_t height, _zbm_PixelOrder order, zbm_PackedUchar fill) {
    _zbm_Image* image = NewOwningImage(width, height, order, false);
    if (image) FillPixels(image, fill);
    return image;
}

_zbm_Image* ZbiuCreateAttatchData(void* data, int32_t width, int32_t height, int32_t pitch, _zbm_PixelOrder order) {
    if (!data || !IsValidLayout(width, height, pitch, order)) return nullptr;
    auto* image = static_cast<_zbm_Image*>(std::malloc(sizeof(_zbm_Image)));
    if (!image) return nullptr;
    image->ownsData = 0;
    ZbiuReplaceAttatchedData(image, data, width, height, pitch, order);
    return image;
}

int ZbiuReplaceAttatchedData(_zbm_Image* image, void* data, int32_t width, int32_t height, int32_t pitch,
                             _zbm_PixelOrder order) {
    if (!image || !data || image->ownsData || !IsValidLayout(width, height, pitch, order)) {
        return ZBIU_ERR_INVALID_ARGUMENT;
    }
    image->pData = static_cast<uint8_t*>(data);
    image->width = width;
    image->height = height;
    image->pitch = pitch;
    image->order = order;
    image->bytesPerPixel = BytesPerPixel(order);
    return ZBIU_OK;
}

_zbm_Image* ZbiuCreateFromData(const void* data, int32_t width, int32_t height, int32_t pitch,
                               _zbm_PixelOrder order) {
    if (!data || !IsValidLayout(width, height, pitch, order)) return nullptr;
    _zbm_Image* image = NewOwningImage(width, height, order, false);
    if (image) CopyRows(static_cast<const uint8_t*>(data), pitch, image);
    return image;
}

_zbm_Image* ZbiuCreateClone(const _zbm_Image* image) {
    if (!IsValidImage(image)) return nullptr;
    return ZbiuCreateFromData(image->pData, image->width, image->height, image->pitch, image->order);
}

_zbm_Image* ZbiuCreateCrop(const _zbm_Image* image, const zbm_Rect& rect) {
    if (!IsValidImage(image) || rect.x < 0 || rect.y < 0 || rect.width < 1 || rect.height < 1) return nullptr;
    if (static_cast<int64_t>(rect.x) + rect.width > image->width ||
        static_cast<int64_t>(rect.y) + rect.height > image->height) {
        return nullptr;
    }
    _zbm_Image* crop = NewOwningImage(rect.width, rect.height, image->order, false);
    if (crop) CopyRows(ZbiuGetConstPointer(image, rect.x, rect.y), image->pitch, crop);
    return crop;
}

void ZbiuDispose(_zbm_Image** image) {
    if (!image || !*image) return;
    if ((*image)->ownsData) std::free((*image)->pData);
    std::free(*image);
    *image = nullptr;
}

int ZbiuClear(_zbm_Image* image, zbm_PackedUchar value) {
    if (!IsValidImage(image)) return ZBIU_ERR_INVALID_ARGUMENT;
    FillPixels(image, value);
    return ZBIU_OK;
}

int ZbiuClear(_zbm_Image* image) {
    const zbm_PackedUchar zero = {{0, 0, 0, 0}};
    return ZbiuClear(image, zero);
}

const uint8_t* ZbiuGetConstPointer(const _zbm_Image* image, int32_t x, int32_t y) {
    if (!image || !image->pData) return nullptr;
    return Row(image, y) + static_cast<ptrdiff_t>(x) * image->bytesPerPixel;
}

uint8_t* ZbiuGetPointer(_zbm_Image* image, int32_t x, int32_t y) {
    if (!image || !image->pData) return nullptr;
    return Row(image, y) + static_cast<ptrdiff_t>(x) * image->bytesPerPixel;
}

zbm_PackedUchar ZbiuGetPixel(const _zbm_Image* image, int32_t x, int32_t y) {
    return ZbiuGetPixel(image, ZbiuGetConstPointer(image, x, y));
}

zbm_PackedUchar ZbiuGetPixel(const _zbm_Image* image, const uint8_t* pointer) {
    if (!image || !pointer || image->bytesPerPixel < 1 || image->bytesPerPixel > 4) {
        const zbm_PackedUchar zero = {{0, 0, 0, 0}};
        return zero;
    }
    return ReadPixel(pointer, image->bytesPerPixel);
}

void ZbiuSetPixel(_zbm_Image* image, int32_t x, int32_t y, zbm_PackedUchar value) {
    if (!IsValidImage(image) || x < 0 || y < 0 || x >= image->width || y >= image->height) return;
    WritePixel(ZbiuGetPointer(image, x, y), image->bytesPerPixel, value);
}

void ZbiuSetPixel(_zbm_Image* image, uint8_t* pointer, zbm_PackedUchar value) {
    if (!IsValidImage(image) || !pointer) return;
    // The rows span from the top row to the bottom row in memory order; with
    // a negative pitch the bottom row comes first. The whole pixel must fit.
    const auto top = reinterpret_cast<uintptr_t>(image->pData);
    const auto bottom = reinterpret_cast<uintptr_t>(Row(image, image->height - 1));
    const uintptr_t first = image->pitch < 0 ? bottom : top;
    const uintptr_t end = (image->pitch < 0 ? top : bottom) + RowBytes(image);
    const auto at = reinterpret_cast<uintptr_t>(pointer);
    if (at < first || at + static_cast<uintptr_t>(image->bytesPerPixel) > end) return;
    WritePixel(pointer, image->bytesPerPixel, value);
}
