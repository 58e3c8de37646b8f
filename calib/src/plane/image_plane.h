// Planes of the attention engine: ImagePlane (8-bit samples), ImagePlaneFloat
// (float samples) and MIPlane (three planes with a chroma format), with the
// free debug writers save_pgm and save_ppm.
//
// A plane either owns a buffer whose rows are aligned to 16 samples or is a
// view into caller memory or into another plane; views never copy. Sample
// (x, y) of the picture lies y * stride + x samples after the first picture
// sample. Padding fills the margin around an inner area by edge replication
// so that filters may read outside the inner area without bounds tests.
#ifndef LUMICOR_CALIB_PLANE_IMAGE_PLANE_H
#define LUMICOR_CALIB_PLANE_IMAGE_PLANE_H

#include <cstdint>

// Status codes of the plane classes (0 is success).
enum : int32_t {
    IMAGEPLANE_ERR_INIT = 0x1001000,    // bad initialisation or allocation
    IMAGEPLANE_ERR_COPY = 0x1001002,    // bad copy region
    IMAGEPLANE_ERR_SIZE = 0x1001003,    // bad size or value
    IMAGEPLANE_ERR_FILE = 0x1001004,    // file or padding error
    MIPLANE_ERR_INIT = 0x1002000,       // bad initialisation or allocation
    MIPLANE_ERR_COPY = 0x1002002,       // bad copy
    MIPLANE_ERR_MULTIPLE = 0x1002004,   // size not a multiple of the divisors
    MIPLANE_ERR_PADDING = 0x1002006     // padding larger than the picture
};

template <typename T>
class ImagePlaneT {
public:
    ImagePlaneT();
    ~ImagePlaneT();
    ImagePlaneT(const ImagePlaneT&) = delete;
    ImagePlaneT& operator=(const ImagePlaneT&) = delete;

    // Own buffer: stride = width rounded up to 16, bufHeight = height.
    int32_t iInit(int32_t width, int32_t height);
    // View of caller memory; the picture starts at buffer + offsetX + stride * offsetY.
    int32_t iInit(int32_t width, int32_t height, T* buffer, int32_t stride, int32_t bufHeight, int32_t offsetX,
                  int32_t offsetY);
    // Writable and read-only views of a region of another plane.
    int32_t iInit(int32_t width, int32_t height, ImagePlaneT* parent, int32_t offsetX, int32_t offsetY);
    int32_t iInit(int32_t width, int32_t height, const ImagePlaneT* parent, int32_t offsetX, int32_t offsetY);

    // Changes only the picture size; it must stay inside the buffer from the
    // picture's first sample on.
    int32_t iResetPicSize(int32_t width, int32_t height);
    // Sets every byte of the picture rows to value (0..255).
    int32_t iResetPxlVal(int32_t value);
    int32_t iCopyPixel(const ImagePlaneT* src, int32_t srcX, int32_t srcY, int32_t dstX, int32_t dstY,
                       int32_t width, int32_t height);
    // Copies the overlap when src is placed at (-x, -y).
    int32_t iCopyPixel(const ImagePlaneT* src, int32_t x, int32_t y);
    // Edge replication around the inner area that starts at (padX, padY).
    int32_t iPadding(int32_t padX, int32_t padY, int32_t innerWidth, int32_t innerHeight);
    // Frees an owned buffer and returns the plane to its new state.
    int32_t iReset();
    // "P5" file of the picture (float samples truncated and clamped to 0..255).
    int32_t iSavePGM(const char* path) const;
    // Raw picture rows followed by two 4:2:0 chroma planes of filler samples
    // (128, or 0.0 for the float plane); append adds to the end of an existing file.
    int32_t iDebugDump(const char* path, bool append) const;

    T* pGetBufferPtr() { return pBuf; }
    const T* pGetConstBufferPtr() const { return pConstBuf; }

    T* pBuf;
    T* pPixel;
    const T* pConstBuf;
    const T* pConstPixel;
    int32_t stride;
    int32_t bufHeight;
    int32_t width;
    int32_t height;
    int32_t owned;

private:
    bool IsFresh() const { return pConstBuf == nullptr; }
    void SetView(T* buf, const T* constBuf, int32_t w, int32_t h, int32_t s, int32_t bh, int32_t offset);
};

typedef ImagePlaneT<uint8_t> ImagePlane;
typedef ImagePlaneT<float> ImagePlaneFloat;

// Caller memory of one plane of an MIPlane.
struct MIPlaneBuffer {
    uint8_t* buffer;
    int32_t stride;
    int32_t bufHeight;
    int32_t offsetX;
    int32_t offsetY;
};

// Three 8-bit planes. Chroma formats: 0 4:2:0, 1 4:2:2, 2 Y Cb Cr at full
// resolution, 3 4:1:1, 4 RGB at full resolution stored G, B, R.
class MIPlane {
public:
    MIPlane();
    ~MIPlane();
    MIPlane(const MIPlane&) = delete;
    MIPlane& operator=(const MIPlane&) = delete;

    int32_t iInit(int32_t width, int32_t height, int32_t format);
    int32_t iInit(int32_t width, int32_t height, int32_t format, const MIPlaneBuffer (&buffers)[3]);
    int32_t iInit(int32_t width, int32_t height, MIPlane* parent, int32_t offsetX, int32_t offsetY);
    int32_t iInit(int32_t width, int32_t height, const MIPlane* parent, int32_t offsetX, int32_t offsetY);

    int32_t iGetImgWidth() const { return width; }
    int32_t iGetImgHeight() const { return height; }
    int32_t iGetCrmWidth() const { return crmWidth; }
    int32_t iGetCrmHeight() const { return crmHeight; }
    int32_t iGetCrmFormat() const { return format; }
    ImagePlane* pGetImagePlane(int i) { return i >= 0 && i < 3 ? planes[i] : nullptr; }
    const ImagePlane* pGetConstImagePlane(int i) const { return i >= 0 && i < 3 ? planes[i] : nullptr; }

    // Format 4 only: width x height pixels R, G, B (rows width * 3 bytes)
    // into planes 2, 0, 1.
    int32_t iCopyPixel(const uint8_t* packed, int32_t width, int32_t height);
    int32_t iCopyPixel(const MIPlane* src, int32_t srcX, int32_t srcY, int32_t dstX, int32_t dstY, int32_t width,
                       int32_t height);
    int32_t iCopyPixel(const MIPlane* src, int32_t x, int32_t y);
    int32_t iResetPicSize(int32_t width, int32_t height);
    int32_t iResetPxlVal(int32_t value0, int32_t value1, int32_t value2);
    int32_t iPadding(int32_t padX, int32_t padY, int32_t innerWidth, int32_t innerHeight);
    // Formats 2 and 4: "P6" file with the samples of planes 2, 0, 1 per pixel.
    int32_t iSavePPM(const char* path) const;
    int32_t iDebugDump(const char* path, bool append) const;
    int32_t iReset();

    ImagePlane* planes[3];
    int32_t width;
    int32_t height;
    int32_t crmWidth;
    int32_t crmHeight;
    int32_t format;

    // Horizontal and vertical chroma divisors of a format (0 for formats
    // outside 0..4).
    static int32_t DivX(int32_t format);
    static int32_t DivY(int32_t format);

private:
    int32_t CreatePlanes();
    int32_t InitView(int32_t width, int32_t height, MIPlane* parent, const MIPlane* constParent, int32_t offsetX,
                     int32_t offsetY);
};

// Debug writers for packed buffers: "P5\n<w> <h>\n255\n" + w*h bytes and
// "P6\n<w> <h>\n255\n" + w*h*3 bytes. A path naming a directory is refused;
// an open failure prints "fopen_s() failed\n". Return 0 when written.
int save_pgm(const uint8_t* buffer, int32_t width, int32_t height, const char* path);
int save_ppm(const uint8_t* buffer, int32_t width, int32_t height, const char* path);

#endif
