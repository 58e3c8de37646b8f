#include "ktlib/src/Similarity/cbs/CBSCommon/image/image.h"

#include <cstdlib>
#include <cstring>

#include "ktlib/src/Similarity/cbs/CBSCommon/cbs_error.h"

namespace {
bool ValidImage(const _image_s* im) { return im && im->data && im->width > 0 && im->height > 0; }
}  // namespace

extern "C" int image_init(_image_s* im, int width, int height) {
    if (!im) return -1;
    im->width = 0;
    im->height = 0;
    im->data = nullptr;
    if (width <= 0 || height <= 0) return -1;
    // Both factors are positive; compare in 64 bits so that no product wraps.
    if (static_cast<int64_t>(width) * height > CBS_IMAGE_MAX_PIXELS) {
        CBS_ERROR("image is too large");
        return -1;
    }
    uint8_t* data = static_cast<uint8_t*>(std::calloc(static_cast<size_t>(width) * height, 4));
    if (!data) {
        CBS_ERROR("image_init: Out of memory");
        return -1;
    }
    im->width = width;
    im->height = height;
    im->data = data;
    return 0;
}

extern "C" _image_s* image_create(int width, int height) {
    _image_s* im = static_cast<_image_s*>(std::malloc(sizeof(_image_s)));
    if (!im) {
        CBS_ERROR("image_init: Out of memory");
        return nullptr;
    }
    if (image_init(im, width, height) != 0) {
        std::free(im);
        return nullptr;
    }
    return im;
}

extern "C" void image_free(_image_s* im) {
    if (!im) return;
    std::free(im->data);
    im->data = nullptr;
    im->width = 0;
    im->height = 0;
}

extern "C" void image_kill(_image_s* im) {
    if (!im) return;
    image_free(im);
    std::free(im);
}

extern "C" int image_pget(const _image_s* im, int x, int y, uint8_t rgb[3]) {
    if (!ValidImage(im) || !rgb || x < 0 || y < 0 || x >= im->width || y >= im->height) return -1;
    const uint8_t* p = im->data + (static_cast<size_t>(y) * im->width + x) * 4;
    rgb[0] = p[0];
    rgb[1] = p[1];
    rgb[2] = p[2];
    return 0;
}

extern "C" int image_pset(_image_s* im, int x, int y, const uint8_t rgb[3]) {
    if (!ValidImage(im) || !rgb || x < 0 || y < 0 || x >= im->width || y >= im->height) {
        CBS_ERROR("image_pset: out of range\n");
        return -1;
    }
    uint8_t* p = im->data + (static_cast<size_t>(y) * im->width + x) * 4;
    p[0] = rgb[0];
    p[1] = rgb[1];
    p[2] = rgb[2];
    p[3] = 0;
    return 0;
}

extern "C" int image_copy(_image_s* dst, const _image_s* src) {
    if (!ValidImage(dst) || !ValidImage(src) || dst->width != src->width || dst->height != src->height) {
        CBS_ERROR("image_copy: Size does not match");
        return -1;
    }
    std::memcpy(dst->data, src->data, static_cast<size_t>(src->width) * src->height * 4);
    return 0;
}

extern "C" void image_reset(_image_s* im) {
    if (!ValidImage(im)) return;
    std::memset(im->data, 0, static_cast<size_t>(im->width) * im->height * 4);
}
