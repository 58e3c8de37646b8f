/*
 * zbm_image.h - the image record shared by every Lumicor engine, its pixel
 * orders and value types, the Zbiu image operations and the zbm_Write* byte
 * writers used by every serialiser.
 *
 * Usage:
 *   _zbm_Image* img = ZbiuCreate(640, 480, ZBM_PIXEL_ORDER_RGB);   // owning, zero-filled
 *   if (!img) { ... out of memory or more than 16,000,000 pixels ... }
 *   ZbiuSetPixel(img, 10, 20, px);
 *   ZbiuDispose(&img);                                           // img becomes NULL
 *
 * Ownership: every image returned by a ZbiuCreate* function belongs to the
 * caller and is released with ZbiuDispose. Attached images (ZbiuCreateAttatchData)
 * never free the caller's pixels. Functions returning int return 0 on success,
 * 3 for an invalid argument, 4 when out of memory, 12 for an unsupported value
 * and 13 for an unsupported conversion. No function logs or throws.
 * Threads: functions are reentrant; an image must not be written by two
 * threads at once.
 */
#ifndef LUMICOR_ZBM_IMAGE_H
#define LUMICOR_ZBM_IMAGE_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Channel layout of an image. Byte offsets of R, G, B, A per order are given
 * by ZbiuGetRgbOffset. */
typedef enum _zbm_PixelOrder {
    ZBM_PIXEL_ORDER_GRAY = 0, /* 1 byte  */
    ZBM_PIXEL_ORDER_RGB = 1,  /* 3 bytes */
    ZBM_PIXEL_ORDER_BGR = 2,  /* 3 bytes */
    ZBM_PIXEL_ORDER_RGBA = 3, /* 4 bytes */
    ZBM_PIXEL_ORDER_BGRA = 4, /* 4 bytes */
    ZBM_PIXEL_ORDER_ARGB = 5, /* 4 bytes */
    ZBM_PIXEL_ORDER_ABGR = 6, /* 4 bytes */
    ZBM_PIXEL_ORDER_YUV = 7,  /* 3 bytes: Y, U, V */
    ZBM_PIXEL_ORDER_LAB = 8,  /* 3 bytes: L, a, b */
    ZBM_PIXEL_ORDER_NUM = 9
} _zbm_PixelOrder;

/* The image record: seven 32-bit fields on the target. */
typedef struct _zbm_Image {
    uint8_t* pData;         /* first byte of the top row */
    int32_t width;          /* pixels per row */
    int32_t height;         /* rows */
    int32_t pitch;          /* bytes from one row to the next (may be negative for attached data) */
    _zbm_PixelOrder order;  /* channel layout */
    int32_t bytesPerPixel;  /* derived from order */
    int32_t ownsData;       /* 1: pData was allocated by the image and is freed on dispose */
} _zbm_Image;

typedef struct zbm_Pos {
    int32_t x;
    int32_t y;
} zbm_Pos;

/* Covers columns x .. x+width-1 and rows y .. y+height-1. */
typedef struct zbm_Rect {
    int32_t x;
    int32_t y;
    int32_t width;
    int32_t height;
} zbm_Rect;

/* One pixel in the image's own storage order; bytes past bytesPerPixel are 0. */
typedef struct zbm_PackedUchar {
    uint8_t v[4];
} zbm_PackedUchar;

/* One float per stored channel: averages, variances, gains, offsets. */
typedef struct zbm_PackedFloat {
    float v[4];
} zbm_PackedFloat;

/* Status codes of the Zbiu functions. */
enum {
    ZBIU_OK = 0,
    ZBIU_ERR_INVALID_ARGUMENT = 3,
    ZBIU_ERR_OUT_OF_MEMORY = 4,
    ZBIU_ERR_UNSUPPORTED_VALUE = 12,
    ZBIU_ERR_UNSUPPORTED_CONVERSION = 13
};

/* ------------------------------------------------------------------------
 * Byte-order writers. Each copies one value from src to dst and returns the
 * number of bytes written. The BE forms reverse the bytes of a little-endian
 * host value; since a swap is its own inverse, parsers read a big-endian
 * field by calling the same writer with the blob as source and the native
 * variable as destination. Neither pointer may be NULL.
 * ------------------------------------------------------------------------ */
typedef enum _zbm_WriteEndianType {
    ZBM_WRITE_ENDIAN_LITTLE = 0,
    ZBM_WRITE_ENDIAN_BIG = 1,
    ZBM_WRITE_ENDIAN_NONE = 2 /* writes nothing, returns 0 */
} _zbm_WriteEndianType;

uint32_t zbm_Write8(void* dst, const void* src);
uint32_t zbm_Write16BE(void* dst, const void* src);
uint32_t zbm_Write32BE(void* dst, const void* src);
uint32_t zbm_Write64BE(void* dst, const void* src);
uint32_t zbm_Write16LE(void* dst, const void* src);
uint32_t zbm_Write32LE(void* dst, const void* src);
uint32_t zbm_Write64LE(void* dst, const void* src);
/* Dispatch on type; a type outside 0..2 writes nothing and returns 0. */
uint32_t zbm_Write16(void* dst, const void* src, _zbm_WriteEndianType type);
uint32_t zbm_Write32(void* dst, const void* src, _zbm_WriteEndianType type);
uint32_t zbm_Write64(void* dst, const void* src, _zbm_WriteEndianType type);

#ifdef __cplusplus
} /* extern "C" */
#endif

/* ZBIU_FUNCTIONS: the Zbiu image operations are declared below. */

#ifdef __cplusplus

#include <new>
#include <memory>
#include <stdlib.h>
#include <string.h>
#include <type_traits>

/* ==========================================================================
 * Containers that travel with images.
 * ========================================================================== */

namespace zbm_detail {
/* Element types that own a buffer (zbmvector itself, or records holding one)
 * expose a member Clear(); the containers call it before dropping an element. */
template <typename T, typename = void>
struct HasClear : std::false_type {};
template <typename T>
struct HasClear<T, decltype(std::declval<T&>().Clear(), void())> : std::true_type {};

template <typename T>
inline void ClearElement(T& e, std::true_type) { e.Clear(); }
template <typename T>
inline void ClearElement(T&, std::false_type) {}
template <typename T>
inline void ClearElement(T& e) { ClearElement(e, HasClear<T>()); }
}  // namespace zbm_detail

/* zbmvector<T>: growable array of plain records (element pointer, count,
 * capacity). It is a plain record itself: copying it copies the pointer, so
 * exactly one copy owns the storage and must be cleared; it has no destructor.
 * New slots are zero bytes, which is the empty state of every element type
 * used with it (including nested zbmvectors). Elements are moved by realloc,
 * so T must not hold pointers into itself.
 *
 *   zbmvector<zbm_Pos> pts;            // empty
 *   if (!pts.PushBack(p)) return 4;    // pts is empty again after a failure
 *   ...
 *   pts.Clear();                       // frees the storage */
template <typename T>
struct zbmvector {
    T* data = nullptr;
    int32_t count = 0;
    int32_t capacity = 0;

    /* Appends a copy of value. When the storage is full it grows by exactly 8
     * elements with realloc. Returns 1; on failure the old storage (and every
     * element's own buffer) is freed, count and capacity become 0 and 0 is
     * returned. */
    int PushBack(const T& value) {
        if (count == capacity) {
            /* value may be an element of this vector: find it again after the
             * storage has moved. */
            const T* src = &value;
            const uintptr_t at = reinterpret_cast<uintptr_t>(src);
            const uintptr_t first = reinterpret_cast<uintptr_t>(data);
            const bool inside = count > 0 && at >= first && at < first + static_cast<uintptr_t>(count) * sizeof(T);
            const int32_t index = inside ? static_cast<int32_t>((at - first) / sizeof(T)) : 0;
            if (!Reallocate(capacity + 8)) {
                Clear();
                return 0;
            }
            if (inside) src = data + index;
            data[count++] = *src;
            return 1;
        }
        data[count++] = value;
        return 1;
    }

    /* Frees the storage, first clearing every element that owns a buffer, and
     * sets all three fields to zero. */
    void Clear() {
        for (int32_t i = 0; i < count; ++i) zbm_detail::ClearElement(data[i]);
        free(static_cast<void*>(data));
        data = nullptr;
        count = 0;
        capacity = 0;
    }

    /* Sets the count to n, growing the storage to exactly n elements when it
     * is too small; new elements are zero bytes, dropped elements are cleared.
     * Returns 1, or 0 (vector unchanged) for a negative n or when memory runs
     * out. */
    int Resize(int32_t n) {
        if (n < 0) return 0;
        if (n > capacity && !Reallocate(n)) return 0;
        for (int32_t i = n; i < count; ++i) {
            zbm_detail::ClearElement(data[i]);
            memset(static_cast<void*>(&data[i]), 0, sizeof(T));
        }
        count = n;
        return 1;
    }

    int32_t size() const { return count; }
    bool empty() const { return count == 0; }
    T& operator[](int32_t i) { return data[i]; }
    const T& operator[](int32_t i) const { return data[i]; }
    T* begin() { return data; }
    T* end() { return data + count; }
    const T* begin() const { return data; }
    const T* end() const { return data + count; }

private:
    /* Grows the storage to newCapacity elements (zero-filling the new slots);
     * false when the byte size overflows or realloc fails (storage intact). */
    bool Reallocate(int32_t newCapacity) {
        if (newCapacity < capacity || static_cast<uint64_t>(newCapacity) * sizeof(T) > 0x7FFFFFFFu) return false;
        void* p = realloc(static_cast<void*>(data), static_cast<size_t>(newCapacity) * sizeof(T));
        if (!p) return false;
        data = static_cast<T*>(p);
        memset(static_cast<void*>(data + capacity), 0, static_cast<size_t>(newCapacity - capacity) * sizeof(T));
        capacity = newCapacity;
        return true;
    }
};

/* zbmlist<T>: doubly linked list with a sentinel node. The list owns its nodes
 * and frees them on Clear and on destruction; it cannot be copied. Positions
 * are node pointers; End() is the sentinel. T must be default-constructible
 * and copyable without allocating (plain records). */
template <typename T>
class zbmlist {
public:
    struct Node {
        Node* prev;
        Node* next;
        T value;
    };

    zbmlist() : count_(0) { head_.prev = head_.next = &head_; }
    ~zbmlist() { Clear(); }
    zbmlist(const zbmlist&) = delete;
    zbmlist& operator=(const zbmlist&) = delete;

    Node* Begin() { return head_.next; }
    Node* End() { return &head_; }
    const Node* Begin() const { return head_.next; }
    const Node* End() const { return &head_; }
    bool Empty() const { return count_ == 0; }
    int32_t Size() const { return count_; }

    /* Links a new node holding value before position and returns it. When the
     * node cannot be allocated, returns position unchanged and leaves the list
     * as it was. */
    Node* Insert(Node* position, const T& value) {
        Node* n = new (std::nothrow) Node{position->prev, position, value};
        if (!n) return position;
        position->prev->next = n;
        position->prev = n;
        ++count_;
        return n;
    }

    /* Unlinks and frees the node at position (not End()); returns the node
     * that followed it. */
    Node* Erase(Node* position) {
        if (position == &head_) return position;
        Node* next = position->next;
        position->prev->next = next;
        next->prev = position->prev;
        delete position;
        --count_;
        return next;
    }

    /* Appends value; 1 on success, 0 when the node cannot be allocated. */
    int PushBack(const T& value) { return Insert(End(), value) != End() ? 1 : 0; }
    /* Prepends value; 1 on success, 0 when the node cannot be allocated. */
    int PushFront(const T& value) {
        Node* first = Begin();
        return Insert(first, value) != first ? 1 : 0;
    }
    /* Removes the last element; does nothing on an empty list. */
    void PopBack() { Erase(head_.prev); }
    /* Removes the first element; does nothing on an empty list. */
    void PopFront() { Erase(head_.next); }
    /* First and last element; the list must not be empty. */
    T& Front() { return head_.next->value; }
    T& Back() { return head_.prev->value; }

    /* Frees every node. */
    void Clear() {
        while (head_.next != &head_) Erase(head_.next);
    }

private:
    Node head_;
    int32_t count_;
};

/* ==========================================================================
 * Creation and release.
 *
 * Every created image owns its pixels, has pitch = width × bytesPerPixel and
 * is released with ZbiuDispose. Creation refuses sizes below 1 × 1, more than
 * 16,000,000 pixels and orders outside 0..8 by returning NULL; NULL also
 * means out of memory, and nothing is left allocated then.
 * ========================================================================== */

/* Bytes per pixel of an order (1, 3 or 4); 0 for an order outside 0..8. */
int32_t ZbiuGetBytesPerPixel(_zbm_PixelOrder order);

/* Byte offsets of red, green, blue and alpha inside one pixel of `order`
 * (alpha -1 when the order has no alpha byte). Returns 1 for the RGB family
 * (orders 1..6); for GRAY, YUV, LAB and invalid orders all four offsets are 0
 * and 0 is returned. Any output pointer may be NULL. */
int ZbiuGetRgbOffset(_zbm_PixelOrder order, int32_t* r, int32_t* g, int32_t* b, int32_t* a);

/* New image of width × height pixels, every byte zero. */
_zbm_Image* ZbiuCreate(int32_t width, int32_t height, _zbm_PixelOrder order);
/* New image with every pixel set to the first bytesPerPixel bytes of fill. */
_zbm_Image* ZbiuCreate(int32_t width, int32_t height, _zbm_PixelOrder order, zbm_PackedUchar fill);

/* New record pointing at caller memory (ownsData = 0); the caller keeps the
 * pixels alive and frees them after ZbiuDispose. pitch may be negative (a
 * bottom-up buffer: data is the top row, earlier addresses hold lower rows);
 * |pitch| must be at least width × bytesPerPixel. No pixel ceiling applies.
 * NULL when data is NULL, a size or the pitch is invalid, or out of memory. */
_zbm_Image* ZbiuCreateAttatchData(void* data, int32_t width, int32_t height, int32_t pitch, _zbm_PixelOrder order);

/* Re-points an attached image at other caller memory, with the same rules as
 * ZbiuCreateAttatchData. Returns 0; 3 when image or data is NULL, the image
 * owns its buffer, or a size, pitch or order is invalid (image unchanged). */
int ZbiuReplaceAttatchedData(_zbm_Image* image, void* data, int32_t width, int32_t height, int32_t pitch,
                             _zbm_PixelOrder order);

/* New owning image holding a copy of width × bytesPerPixel bytes from each
 * of height rows starting at data, rows pitch bytes apart (negative pitch:
 * bottom-up source). NULL on invalid arguments (as for attaching) or failure. */
_zbm_Image* ZbiuCreateFromData(const void* data, int32_t width, int32_t height, int32_t pitch,
                               _zbm_PixelOrder order);

/* New owning copy of image (with a packed pitch); NULL for a NULL or invalid
 * image, or on failure. */
_zbm_Image* ZbiuCreateClone(const _zbm_Image* image);

/* New owning image holding rect of image. NULL when rect.x or rect.y is
 * negative, the rectangle reaches past the right or bottom edge, it is empty,
 * or on failure. */
_zbm_Image* ZbiuCreateCrop(const _zbm_Image* image, const zbm_Rect& rect);

/* Frees the pixels (when owned) and the record and sets *image to NULL. Does
 * nothing for a NULL image or a NULL *image. */
void ZbiuDispose(_zbm_Image** image);

/* Sets every pixel to the first bytesPerPixel bytes of value. 0, or 3 for an
 * invalid image. */
int ZbiuClear(_zbm_Image* image, zbm_PackedUchar value);
/* Sets every byte of every pixel to zero. 0, or 3 for an invalid image. */
int ZbiuClear(_zbm_Image* image);

/* Disposes an owned image when it goes out of scope. */
struct ZbmImageDeleter {
    void operator()(_zbm_Image* image) const { ZbiuDispose(&image); }
};
typedef std::unique_ptr<_zbm_Image, ZbmImageDeleter> ZbmImagePtr;

/* ==========================================================================
 * Pixel access. No bounds checks except where stated; a NULL image yields a
 * NULL pointer, a zero pixel or no write.
 * ========================================================================== */

/* pData + y × pitch + x × bytesPerPixel. */
const uint8_t* ZbiuGetConstPointer(const _zbm_Image* image, int32_t x, int32_t y);
uint8_t* ZbiuGetPointer(_zbm_Image* image, int32_t x, int32_t y);

/* The pixel at (x, y) / at pointer; bytes past bytesPerPixel are 0. */
zbm_PackedUchar ZbiuGetPixel(const _zbm_Image* image, int32_t x, int32_t y);
zbm_PackedUchar ZbiuGetPixel(const _zbm_Image* image, const uint8_t* pointer);

/* Writes value at (x, y) only when 0 <= x < width and 0 <= y < height. */
void ZbiuSetPixel(_zbm_Image* image, int32_t x, int32_t y, zbm_PackedUchar value);
/* Writes value at pointer only when the whole pixel lies inside the image's
 * rows (from the top row to the bottom row, whatever the sign of the pitch). */
void ZbiuSetPixel(_zbm_Image* image, uint8_t* pointer, zbm_PackedUchar value);

/* ==========================================================================
 * Geometry. Source and destination are two distinct valid images of the same
 * pixel order; otherwise these return 3. 0 on success.
 * ========================================================================== */

/* Row copy; same width and height. */
int ZbiuCopy(const _zbm_Image* src, _zbm_Image* dst);
/* Mirror left-right: pixel x goes to width-1-x. Same size. */
int ZbiuFlop(const _zbm_Image* src, _zbm_Image* dst);
/* Mirror top-bottom: row y goes to height-1-y. Same size. */
int ZbiuFlip(const _zbm_Image* src, _zbm_Image* dst);
/* Half turn. Same size. */
int ZbiuRotate180(const _zbm_Image* src, _zbm_Image* dst);
/* Quarter turn counter-clockwise: dst is src.height × src.width and source
 * pixel (x, y) goes to (y, src.width-1-x). */
int ZbiuRotateLeft(const _zbm_Image* src, _zbm_Image* dst);
/* Quarter turn clockwise: dst is src.height × src.width and source pixel
 * (x, y) goes to (src.height-1-y, x). */
int ZbiuRotateRight(const _zbm_Image* src, _zbm_Image* dst);

/* Free rotation by angle radians about the image centres (a positive angle
 * turns the picture clockwise as seen with rows top-down), by inverse mapping
 * with 10-bit bilinear sampling from a fixed-point sine table. The images may
 * differ in size; destination pixels whose source point falls outside
 * [0, width-1) × [0, height-1) are left unwritten. 3 also for a NaN or
 * infinite angle. */
int ZbiuRotate(const _zbm_Image* src, _zbm_Image* dst, float angle);

/* Replaces *image by an upright version for EXIF orientation 1..8 (1: as is;
 * 2 mirror; 3 half turn; 4 flip; 5 left turn then flip; 6 right turn; 7 right
 * turn then flip; 8 left turn). Each step creates a new image and disposes
 * the previous one (an attached record is disposed without touching the
 * caller's pixels); on failure the caller keeps the last good image.
 * Returns 0; 3 for a NULL or invalid image; 12 for orientation outside 1..8
 * (image untouched); 4 when an image cannot be created. */
int ZbiuAdjustToExifOrientation(_zbm_Image*& image, int orientation);

/* Scales src to dst's size (same order): equal sizes are copied; when one
 * dimension grows and the other shrinks, two passes through a temporary
 * (the shrinking dimension first); enlargements and reductions up to 2x are
 * 10-bit bilinear (exact 2x is the truncated mean of each 2×2 block); a
 * reduction of more than 2x in either dimension first halves both
 * dimensions ((n + 1) / 2), again while a whole-number ratio to the target
 * is above 2, and finishes with one of the previous rules. src may be an
 * attached image with a negative pitch; dst must not share pixel memory
 * with src (rows are written while later source rows are still being read).
 * Returns 0, 3 for invalid, identical or mismatching images, 4 out of memory. */
int ZbiuResize(const _zbm_Image* src, _zbm_Image* dst);

/* Converts src into dst (same width and height) between pixel orders:
 * RGB family (1..6) among themselves (alpha copied when both have one, else
 * 255), GRAY <-> RGB family, GRAY -> YUV, RGB family <-> YUV, RGB family
 * <-> LAB, and plain copies between equal orders. Returns 0; 3 for NULL,
 * identical or mismatching images or a destination order outside 0..8;
 * 12 for a source order outside 0..8; 13 for GRAY/YUV -> LAB, LAB -> GRAY/YUV
 * and YUV -> GRAY. */
int ZbiuConvertColorSpace(const _zbm_Image* src, _zbm_Image* dst);

/* ==========================================================================
 * Single-pixel colour conversions. Channels 0..255.
 * ========================================================================== */

/* gray = (306 R + 601 G + 117 B + 512) >> 10 */
uint8_t ZbiuRgb2Gray(uint8_t r, uint8_t g, uint8_t b);
/* r = g = b = gray. NULL outputs are skipped (as in every function below). */
void ZbiuGray2Rgb(uint8_t gray, uint8_t* r, uint8_t* g, uint8_t* b);
/* Integer YUV with U and V centred on 128; the way back is clamped. */
void ZbiuRgb2Yuv(uint8_t r, uint8_t g, uint8_t b, uint8_t* y, uint8_t* u, uint8_t* v);
void ZbiuYuv2Rgb(uint8_t y, uint8_t u, uint8_t v, uint8_t* r, uint8_t* g, uint8_t* b);
/* Lab without gamma linearisation: L 0..99, a and b offset by 128. */
void ZbiuRgb2Lab(uint8_t r, uint8_t g, uint8_t b, uint8_t* l, uint8_t* a, uint8_t* bb);
void ZbiuLab2Rgb(uint8_t l, uint8_t a, uint8_t bb, uint8_t* r, uint8_t* g, uint8_t* b);

/* The same conversions on int channels for the quality and attention engines.
 * Inputs are expected in 0..255 (values outside are clamped first). */
void rgb2yuv(int r, int g, int b, int* y, int* u, int* v);
void yuv2rgb(int y, int u, int v, int* r, int* g, int* b);
void rgb2lab(int r, int g, int b, int* l, int* a, int* bb);
void lab2rgb(int l, int a, int bb, int* r, int* g, int* b);
/* Lab with the camera transfer curve undone first (each channel / 256, then
 * c <= 0.018: c / 4.5, else ((c + 0.099) / 1.099)^(1 / 0.45)), D65 white;
 * L 0..99, a and b offset by 128 and clamped to 0..255. */
void srgb2lab(int r, int g, int b, int* l, int* a, int* bb);
/* Inverse of srgb2lab (the curve is reapplied: lin <= 0.004: 4.5 lin, else
 * 1.099 lin^0.45 - 0.099), results rounded and clamped to 0..255. */
void lab2srgb(int l, int a, int bb, int* r, int* g, int* b);
/* v = max(r,g,b); s = (v - min) × 255 / v; h in degrees 0..359 from the
 * dominant channel (integer division, +360 when negative); for a gray pixel
 * (or black) s = 0 and h = -1. */
void rgb2hsv(int r, int g, int b, int* h, int* s, int* v);
/* Inverse of rgb2hsv in single precision: h in degrees (wrapped into
 * 0..360; a negative h means no hue and gives gray), s and v 0..255 as
 * rgb2hsv returns them; r, g, b rounded and clamped to 0..255. */
void fhsv2rgb(float h, float s, float v, int* r, int* g, int* b);

/* floor(sqrt(n)) for every 32-bit n, bit by bit in integers
 * (isqrt(8) = 2, isqrt(4294967295) = 65535). */
uint32_t isqrt(uint32_t n);
/* Exported variants kept for existing callers; all return isqrt(n). */
uint32_t isqrt1(uint32_t n);
uint32_t isqrt2(uint32_t n);
uint32_t isqrt3(uint32_t n);
uint32_t isqrt4(uint32_t n);
uint32_t isqrt5(uint32_t n);
uint32_t isqrt7(uint32_t n);

/* ==========================================================================
 * Whole-image statistics and point operations. Channels are the image's
 * stored bytes (bytesPerPixel of them); unused entries of the outputs are 0.
 * 0 on success, 3 for a NULL or invalid image or output pointer.
 * ========================================================================== */

/* Per-channel minimum and maximum. */
int ZbiuGetMinMax(const _zbm_Image* image, zbm_PackedUchar* min, zbm_PackedUchar* max);
/* Per-channel mean: sum over all pixels / (width × height). */
int ZbiuCalcAverage(const _zbm_Image* image, zbm_PackedFloat* avg);
/* Per-channel variance about the given mean: sum (v - avg)^2 / (width × height). */
int ZbiuCalcVariance(const _zbm_Image* image, const zbm_PackedFloat& avg, zbm_PackedFloat* var);
/* Per-channel mean over the pixels whose integer coordinates lie inside the
 * triangle or on its edges, clipped to the image (a degenerate triangle
 * covers the pixels on its segment). A triangle covering no pixel gives an
 * all-zero mean and status 0. */
int ZbiuCalcAvarageInTriangle(const _zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_Pos p2, zbm_PackedFloat* avg);

/* Point operations: src and dst distinct, same size and order (3 otherwise);
 * src may be attached read-only memory. */
/* dst = (src - offset) × gain per channel, in single precision, truncated
 * toward zero and clamped to 0..255 (NaN gives 0). */
int ZbiuOffsetImage(const _zbm_Image* src, _zbm_Image* dst, zbm_PackedFloat offset, zbm_PackedFloat gain);
/* dst = src × gain per channel, truncated and clamped to 0..255. */
int ZbiuGainImage(const _zbm_Image* src, _zbm_Image* dst, zbm_PackedFloat gain);
/* dst = round(255 × (src / 255)^(1 / gamma)) on every channel: gamma > 1
 * brightens, gamma < 1 darkens. 3 also when gamma is not a positive finite
 * number. */
int ZbiuGammaCompensation(const _zbm_Image* src, _zbm_Image* dst, float gamma);
/* dst = 255 - src on every channel. */
int ZbiuNegative(const _zbm_Image* src, _zbm_Image* dst);
/* Gray images only: 255 where src >= t, else 0. */
int ZbiuThreshold(const _zbm_Image* src, _zbm_Image* dst, uint8_t t);
/* Gray images only: 255 where lo <= src <= hi, else 0. */
int ZbiuBandThreshold(const _zbm_Image* src, _zbm_Image* dst, uint8_t lo, uint8_t hi);
/* Gray src to a false-colour dst of any RGB-family order (alpha 255), same
 * size: four linear ramps, 0 blue to 63 cyan, 64 cyan to 127 green, 128
 * green to 191 yellow, 192 yellow to 255 red. 3 for other orders. */
int ZbiuGrayToPseudoRgb(const _zbm_Image* src, _zbm_Image* dst);

/* Maximum number of provisional labels ZbiuLabeling can track. */
enum { ZBIU_LABELING_MAX_PROVISIONAL = 10000 };

/* Connected components (4-adjacency) of the non-zero pixels of a gray image.
 * labels (caller-owned, width × height entries, rows width entries apart)
 * receives 0 for zero pixels and 1..count for the components, numbered in the
 * order of their first pixel in the provisional (raster) labelling; *count the
 * number of components. Returns 0; 3 for NULL arguments or a non-gray image;
 * 4 out of memory; 12 when the image needs more than
 * ZBIU_LABELING_MAX_PROVISIONAL provisional labels (labels all 0, *count 0). */
int ZbiuLabeling(const _zbm_Image* image, int32_t* labels, int32_t* count);

/* Outer outline (8-connected border following, clockwise) of the region that
 * holds the first non-zero pixel of a gray image in raster order; the start
 * pixel comes first and is not repeated at the end. points is cleared first
 * and stays empty for an all-zero image. Returns 0; 3 for an invalid or
 * non-gray image; 4 out of memory (points empty). */
int ZbiuGetContour(const _zbm_Image* image, zbmvector<zbm_Pos>& points);

/* ==========================================================================
 * Drawing. Every pixel goes through ZbiuSetPixel, so shapes are clipped to
 * the image. The first bytesPerPixel bytes of each colour are written.
 * 0 on success, 3 for an invalid image or argument.
 * ========================================================================== */

/* Anchor of a text block: which point of its bounding box lies at the given
 * position. */
typedef enum _zbm_Alignment {
    ZBM_ALIGNMENT_TOP_LEFT = 0,
    ZBM_ALIGNMENT_TOP_CENTER = 1,
    ZBM_ALIGNMENT_TOP_RIGHT = 2,
    ZBM_ALIGNMENT_MIDDLE_LEFT = 3,
    ZBM_ALIGNMENT_MIDDLE_CENTER = 4,
    ZBM_ALIGNMENT_MIDDLE_RIGHT = 5,
    ZBM_ALIGNMENT_BOTTOM_LEFT = 6,
    ZBM_ALIGNMENT_BOTTOM_CENTER = 7,
    ZBM_ALIGNMENT_BOTTOM_RIGHT = 8
} _zbm_Alignment;

/* Cell of the built-in font: glyphs are at most 5 × 9 pixels, advanced by
 * 6 pixels; lines are 10 pixels apart. */
enum { ZBIU_FONT_ADVANCE = 6, ZBIU_FONT_LINE_HEIGHT = 10 };

/* Bresenham line from p0 to p1, both end points included. */
int ZbiuDrawLine(_zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_PackedUchar value);
/* Filled disc of the given radius (0: a single pixel). 3 for a negative radius. */
int ZbiuDrawDot(_zbm_Image* image, zbm_Pos center, int32_t radius, zbm_PackedUchar value);
/* Rectangle outline lineWidth pixels thick, drawn inside rect (lineWidth 0:
 * no outline); when fill is not NULL the inside of the outline is filled with
 * *fill. An empty rect draws nothing. 3 for a negative lineWidth. */
int ZbiuDrawRectangle(_zbm_Image* image, const zbm_Rect& rect, zbm_PackedUchar color, int32_t lineWidth = 1,
                      const zbm_PackedUchar* fill = nullptr);
/* One-pixel circle outline (pixels with dx^2 + dy^2 <= r^2 + r that touch the
 * outside); filled with *fill when fill is not NULL. 3 for a negative radius. */
int ZbiuDrawCircle(_zbm_Image* image, zbm_Pos center, int32_t radius, zbm_PackedUchar color,
                   const zbm_PackedUchar* fill = nullptr);
/* Axis-aligned ellipse with radii rx, ry, drawn like ZbiuDrawCircle (a zero
 * radius gives a line). 3 for a negative radius. */
int ZbiuDrawEllipse(_zbm_Image* image, zbm_Pos center, int32_t rx, int32_t ry, zbm_PackedUchar color,
                    const zbm_PackedUchar* fill = nullptr);
/* Triangle outline (three ZbiuDrawLine edges); when fill is not NULL the
 * pixels inside are filled first (the pixels ZbiuCalcAvarageInTriangle uses). */
int ZbiuDrawTriangle(_zbm_Image* image, zbm_Pos p0, zbm_Pos p1, zbm_Pos p2, zbm_PackedUchar color,
                     const zbm_PackedUchar* fill = nullptr);
/* Draws text with the built-in font; '\n' starts a new line. The bounding box
 * of the block (6 × longest line - 1 wide, 10 × lines - 1 high) is placed so
 * that its alignment point is at pos. Characters outside printable ASCII are
 * drawn as '?'. 3 for NULL text or an alignment outside 0..8. */
int ZbiuDrawString(_zbm_Image* image, const char* text, zbm_Pos pos, _zbm_Alignment alignment,
                   zbm_PackedUchar color);
/* Flood fill (4-adjacency) of the region of pixels equal to the seed pixel,
 * with value; pending runs are kept in a zbmlist. Returns 0 (also when value
 * equals the seed's pixel); 3 for an invalid image or a seed outside it; 4
 * when the pending list cannot grow (the region is then partly filled). */
int ZbiuFillRegion(_zbm_Image* image, zbm_Pos seed, zbm_PackedUchar value);

#endif /* __cplusplus */

#endif /* LUMICOR_ZBM_IMAGE_H */
