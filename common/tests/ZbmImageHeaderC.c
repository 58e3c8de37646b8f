/* The record, pixel orders and byte writers of the image header are usable
 * from C; this file only has to compile as C. */
#include <lumicor/zbm_image.h>

int LumicorZbmImageHeaderIsC(void);

int LumicorZbmImageHeaderIsC(void) {
    _zbm_Image image = {0};
    zbm_PackedUchar pixel = {{1, 2, 3, 4}};
    image.order = ZBM_PIXEL_ORDER_GRAY;
    return (int)zbm_Write8(&image.width, &pixel) + image.width;
}
