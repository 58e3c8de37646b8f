// Photo files of the lumicor tool: JPEG and PNG decoding into an upright RGB
// image, PNG writing, and recognising what a file holds by its first bytes.
#ifndef LUMICOR_TOOL_PHOTO_IO_H
#define LUMICOR_TOOL_PHOTO_IO_H

#include <lumicor/zbm_image.h>

#include <cstdint>
#include <string>
#include <vector>

namespace lumicor_tool {

enum class FileKind { kJpeg, kPng, kMeta, kUnknown };

// What the bytes are, from their signature: JPEG (FF D8 FF), PNG, or a photo
// meta blob ("VOND").
FileKind SniffKind(const std::vector<uint8_t>& bytes);

// The whole file; false with a one-line reason in *error.
bool ReadFile(const std::string& path, std::vector<uint8_t>* bytes, std::string* error);
bool WriteFile(const std::string& path, const uint8_t* data, size_t size, std::string* error);

// A decoded photo: RGB, upright, rows width * 3 bytes apart.
struct Photo {
    ZbmImagePtr image;
    int exifOrientation = 1;  // as found in the JPEG's EXIF data (1 when absent)
    int Width() const { return image ? image->width : 0; }
    int Height() const { return image ? image->height : 0; }
};

// Decodes a JPEG (any colour space libjpeg can turn into RGB; the EXIF
// orientation is applied with ZbiuAdjustToExifOrientation) or a PNG (any
// bit depth, palette, gray or alpha; transparency is composed onto white).
// False with a one-line reason for corrupt, truncated or unsupported data.
bool DecodePhoto(const std::vector<uint8_t>& bytes, Photo* photo, std::string* error);

// The EXIF orientation (1..8) of a JPEG's APP1 block, or 1 when there is none
// or it is unreadable.
int ReadExifOrientation(const uint8_t* exif, size_t size);

// An in-memory JPEG of packed RGB rows (`stride` bytes apart) at `quality`
// (1..100); `app1`, when not empty, is written as an APP1 marker (an EXIF
// block). Used by the tests and by siml_rank's re-encoded copies.
std::vector<uint8_t> EncodeJpeg(const uint8_t* rgb, int width, int height, int stride, int quality,
                                const std::vector<uint8_t>& app1 = {});

// Writes an RGB (or gray) image as an 8-bit PNG file.
bool WritePng(const std::string& path, const _zbm_Image* image, std::string* error);

}  // namespace lumicor_tool

#endif
