/* lmc.h is the host's interface and must compile as C: this file is built by
 * a C compiler and calls through the header's C linkage. */
#include <lumicor/lmc.h>

#include <stddef.h>

/* Field widths and order that hosts rely on (negative array size on mismatch). */
typedef char lmc_check_order_size[sizeof(LmcPixelOrder) == 4 ? 1 : -1];
typedef char lmc_check_face_rect[sizeof(LmcFaceRect) == 16 ? 1 : -1];
typedef char lmc_check_rect[sizeof(LmcRect) == 16 ? 1 : -1];
typedef char lmc_check_framing[sizeof(LmcFramingParam) == 12 ? 1 : -1];
typedef char lmc_check_image_width[offsetof(LmcImage, width) == 2 * sizeof(void*) ? 1 : -1];
typedef char lmc_check_image_order[offsetof(LmcImage, order) == 2 * sizeof(void*) + 12 ? 1 : -1];
typedef char lmc_check_meta_ptr[offsetof(LmcPhotoMeta, pMeta) == sizeof(void*) ? 1 : -1];

/* Disposes a blob the way a C host does; used by LmcInterfaceTest. */
uint32_t LmcHeaderCheckDisposeFromC(LmcPhotoMeta* meta) { return LmcDisposePhotoMeta(meta); }
