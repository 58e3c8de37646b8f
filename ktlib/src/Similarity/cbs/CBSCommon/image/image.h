// Working image of the similarity extraction: width x height pixels stored
// back to back, four bytes each (R, G, B, 0). Records are plain; image_init /
// image_free manage the pixel buffer of a caller-owned record, image_create /
// image_kill also allocate and free the record itself.
#ifndef LUMICOR_KTLIB_CBS_IMAGE_H
#define LUMICOR_KTLIB_CBS_IMAGE_H

#include <stdint.h>

// Largest accepted image, in pixels.
#define CBS_IMAGE_MAX_PIXELS 16000000

struct _image_s {
    int32_t width;
    int32_t height;
    uint8_t* data; /* width * height * 4 bytes: R, G, B, 0 */
};

extern "C" {
// Allocates a zeroed buffer for width x height pixels into *im (any earlier
// buffer is not freed). -1 for a non-positive size, more than
// CBS_IMAGE_MAX_PIXELS pixels or out of memory; *im is then left empty.
int image_init(_image_s* im, int width, int height);
// New record with a zeroed buffer; NULL on the failures of image_init.
_image_s* image_create(int width, int height);
// Frees the pixel buffer and empties the record (the record stays).
void image_free(_image_s* im);
// Frees the buffer and the record created by image_create; NULL is ignored.
void image_kill(_image_s* im);
// Reads pixel (x, y) into rgb[0..2]; -1 when outside the image.
int image_pget(const _image_s* im, int x, int y, uint8_t rgb[3]);
// Writes pixel (x, y) from rgb[0..2] (the fourth byte becomes 0); -1 when outside.
int image_pset(_image_s* im, int x, int y, const uint8_t rgb[3]);
// Copies the pixels of src into dst of the same size; -1 otherwise.
int image_copy(_image_s* dst, const _image_s* src);
// Sets every pixel to black.
void image_reset(_image_s* im);
}

#endif
