#include "photo_io.h"

#include <csetjmp>
#include <cstdio>  // before jpeglib.h, which uses FILE
#include <cstdlib>
#include <cstring>

#include <jerror.h>
#include <jpeglib.h>
#include <libexif/exif-data.h>
#include <png.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>

namespace lumicor_tool {

FileKind SniffKind(const std::vector<uint8_t>& bytes) {
    static const uint8_t kPng[8] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};
    if (bytes.size() >= 3 && bytes[0] == 0xFF && bytes[1] == 0xD8 && bytes[2] == 0xFF) return FileKind::kJpeg;
    if (bytes.size() >= 8 && std::memcmp(bytes.data(), kPng, 8) == 0) return FileKind::kPng;
    if (bytes.size() >= 4 && std::memcmp(bytes.data(), "VOND", 4) == 0) return FileKind::kMeta;
    return FileKind::kUnknown;
}

bool ReadFile(const std::string& path, std::vector<uint8_t>* bytes, std::string* error) {
    std::error_code ec;
    if (std::filesystem::is_directory(path, ec)) {
        *error = "is a folder, not a file";
        return false;
    }
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        *error = std::string("cannot open: ") + std::strerror(errno);
        return false;
    }
    bytes->assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    if (in.bad()) {
        *error = "cannot read the file";
        return false;
    }
    return true;
}

bool WriteFile(const std::string& path, const uint8_t* data, size_t size, std::string* error) {
    std::FILE* f = std::fopen(path.c_str(), "wb");
    if (f == nullptr) {
        *error = "cannot write " + path + ": " + std::strerror(errno);
        return false;
    }
    const bool ok = std::fwrite(data, 1, size, f) == size;
    if (std::fclose(f) != 0 || !ok) {
        *error = "cannot write " + path + ": " + std::strerror(errno);
        return false;
    }
    return true;
}

int ReadExifOrientation(const uint8_t* exif, size_t size) {
    if (exif == nullptr || size == 0 || size > 0xFFFF) return 1;
    ExifData* data = exif_data_new_from_data(exif, static_cast<unsigned int>(size));
    if (data == nullptr) return 1;
    int orientation = 1;
    ExifEntry* entry = exif_content_get_entry(data->ifd[EXIF_IFD_0], EXIF_TAG_ORIENTATION);
    if (entry != nullptr && entry->format == EXIF_FORMAT_SHORT && entry->components >= 1 && entry->size >= 2 &&
        entry->data != nullptr) {
        const int value = exif_get_short(entry->data, exif_data_get_byte_order(data));
        if (value >= 1 && value <= 8) orientation = value;
    }
    exif_data_unref(data);
    return orientation;
}

namespace {

// libjpeg reports fatal errors through error_exit, which must not return:
// it jumps back to the decoder with the library's message.
struct JpegError {
    jpeg_error_mgr mgr;
    std::jmp_buf jump;
    char message[JMSG_LENGTH_MAX];
    bool truncated;
};

void JpegErrorExit(j_common_ptr cinfo) {
    JpegError* err = reinterpret_cast<JpegError*>(cinfo->err);
    (*cinfo->err->format_message)(cinfo, err->message);
    std::longjmp(err->jump, 1);
}

// Warnings are not printed; a file that ends early is remembered, since
// libjpeg would otherwise hand out a picture with a gray bottom.
void JpegEmitMessage(j_common_ptr cinfo, int level) {
    JpegError* err = reinterpret_cast<JpegError*>(cinfo->err);
    if (level < 0 && cinfo->err->msg_code == JWRN_JPEG_EOF) err->truncated = true;
}

struct JpegOutput {
    std::vector<uint8_t> pixels;
    int width = 0;
    int height = 0;
    int orientation = 1;
};

enum class JpegStatus { kOk, kCorrupt, kTooLarge, kTruncated };

// Kept free of local objects between setjmp and the calls that may jump:
// the output lives in the caller's frame and the message in a plain buffer.
JpegStatus DecodeJpegRaw(const std::vector<uint8_t>& bytes, JpegOutput* out, char* message) {
    jpeg_decompress_struct cinfo;
    JpegError err;
    err.truncated = false;
    err.message[0] = '\0';
    cinfo.err = jpeg_std_error(&err.mgr);
    err.mgr.error_exit = JpegErrorExit;
    err.mgr.emit_message = JpegEmitMessage;
    if (setjmp(err.jump) != 0) {
        jpeg_destroy_decompress(&cinfo);
        std::memcpy(message, err.message, JMSG_LENGTH_MAX);
        return JpegStatus::kCorrupt;
    }
    jpeg_create_decompress(&cinfo);
    jpeg_mem_src(&cinfo, bytes.data(), static_cast<unsigned long>(bytes.size()));
    jpeg_save_markers(&cinfo, JPEG_APP0 + 1, 0xFFFF);
    jpeg_read_header(&cinfo, TRUE);
    for (jpeg_saved_marker_ptr m = cinfo.marker_list; m != nullptr; m = m->next) {
        if (m->marker == JPEG_APP0 + 1 && m->data_length >= 6 && std::memcmp(m->data, "Exif\0\0", 6) == 0) {
            out->orientation = ReadExifOrientation(m->data, m->data_length);
            break;
        }
    }
    cinfo.out_color_space = JCS_RGB;
    jpeg_start_decompress(&cinfo);
    const uint64_t bytesTotal = static_cast<uint64_t>(cinfo.output_width) * cinfo.output_height * 3;
    if (cinfo.output_components != 3 || bytesTotal > (uint64_t{1} << 31)) {
        jpeg_destroy_decompress(&cinfo);
        return JpegStatus::kTooLarge;
    }
    out->width = static_cast<int>(cinfo.output_width);
    out->height = static_cast<int>(cinfo.output_height);
    out->pixels.resize(static_cast<size_t>(bytesTotal));
    while (cinfo.output_scanline < cinfo.output_height && !err.truncated) {
        JSAMPROW row = &out->pixels[static_cast<size_t>(cinfo.output_scanline) * out->width * 3];
        jpeg_read_scanlines(&cinfo, &row, 1);
    }
    if (err.truncated) {
        jpeg_destroy_decompress(&cinfo);
        return JpegStatus::kTruncated;
    }
    jpeg_finish_decompress(&cinfo);
    jpeg_destroy_decompress(&cinfo);
    return JpegStatus::kOk;
}

// An owning RGB image holding the packed rows of `pixels`.
bool ToImage(const std::vector<uint8_t>& pixels, int width, int height, ZbmImagePtr* image, std::string* error) {
    image->reset(ZbiuCreateFromData(pixels.data(), width, height, width * 3, ZBM_PIXEL_ORDER_RGB));
    if (!*image) {
        *error = "photo of " + std::to_string(width) + " x " + std::to_string(height) +
                 " pixels is too large (at most 16,000,000 pixels)";
        return false;
    }
    return true;
}

bool DecodeJpeg(const std::vector<uint8_t>& bytes, Photo* photo, std::string* error) {
    JpegOutput out;
    char message[JMSG_LENGTH_MAX] = {0};
    switch (DecodeJpegRaw(bytes, &out, message)) {
        case JpegStatus::kOk:
            break;
        case JpegStatus::kCorrupt:
            *error = std::string("corrupt or unsupported JPEG data (") + message + ")";
            return false;
        case JpegStatus::kTooLarge:
            *error = "JPEG photo too large";
            return false;
        case JpegStatus::kTruncated:
            *error = "truncated JPEG data";
            return false;
    }
    if (!ToImage(out.pixels, out.width, out.height, &photo->image, error)) return false;
    photo->exifOrientation = out.orientation;
    if (out.orientation != 1) {
        _zbm_Image* image = photo->image.release();
        const int status = ZbiuAdjustToExifOrientation(image, out.orientation);
        photo->image.reset(image);  // the upright image, or the last good one
        if (status != 0) {
            *error = "cannot turn the photo upright (EXIF orientation " + std::to_string(out.orientation) + ")";
            return false;
        }
    }
    return true;
}

bool DecodePng(const std::vector<uint8_t>& bytes, Photo* photo, std::string* error) {
    png_image png;
    std::memset(&png, 0, sizeof png);
    png.version = PNG_IMAGE_VERSION;
    if (!png_image_begin_read_from_memory(&png, bytes.data(), bytes.size())) {
        *error = std::string("corrupt or unsupported PNG data (") + png.message + ")";
        return false;
    }
    png.format = PNG_FORMAT_RGB;
    const uint64_t size = static_cast<uint64_t>(png.width) * png.height * 3;
    if (size > (uint64_t{1} << 31)) {
        png_image_free(&png);
        *error = "PNG photo too large";
        return false;
    }
    std::vector<uint8_t> pixels(static_cast<size_t>(size));
    png_color white = {255, 255, 255};
    if (!png_image_finish_read(&png, &white, pixels.data(), static_cast<png_int_32>(png.width * 3), nullptr)) {
        *error = std::string("corrupt or unsupported PNG data (") + png.message + ")";
        png_image_free(&png);
        return false;
    }
    photo->exifOrientation = 1;
    return ToImage(pixels, static_cast<int>(png.width), static_cast<int>(png.height), &photo->image, error);
}

}  // namespace

bool DecodePhoto(const std::vector<uint8_t>& bytes, Photo* photo, std::string* error) {
    switch (SniffKind(bytes)) {
        case FileKind::kJpeg:
            return DecodeJpeg(bytes, photo, error);
        case FileKind::kPng:
            return DecodePng(bytes, photo, error);
        case FileKind::kMeta:
            *error = "a photo meta, not a photo";
            return false;
        case FileKind::kUnknown:
            break;
    }
    *error = "unsupported format (not JPEG or PNG)";
    return false;
}

std::vector<uint8_t> EncodeJpeg(const uint8_t* rgb, int width, int height, int stride, int quality,
                                const std::vector<uint8_t>& app1) {
    jpeg_compress_struct cinfo;
    jpeg_error_mgr err;
    cinfo.err = jpeg_std_error(&err);
    jpeg_create_compress(&cinfo);
    unsigned char* buffer = nullptr;
    unsigned long size = 0;
    jpeg_mem_dest(&cinfo, &buffer, &size);
    cinfo.image_width = static_cast<JDIMENSION>(width);
    cinfo.image_height = static_cast<JDIMENSION>(height);
    cinfo.input_components = 3;
    cinfo.in_color_space = JCS_RGB;
    jpeg_set_defaults(&cinfo);
    jpeg_set_quality(&cinfo, quality, TRUE);
    jpeg_start_compress(&cinfo, TRUE);
    if (!app1.empty()) jpeg_write_marker(&cinfo, JPEG_APP0 + 1, app1.data(), static_cast<unsigned int>(app1.size()));
    while (cinfo.next_scanline < cinfo.image_height) {
        JSAMPROW row = const_cast<JSAMPROW>(rgb + static_cast<size_t>(cinfo.next_scanline) * static_cast<size_t>(stride));
        jpeg_write_scanlines(&cinfo, &row, 1);
    }
    jpeg_finish_compress(&cinfo);
    std::vector<uint8_t> bytes(buffer, buffer + size);
    jpeg_destroy_compress(&cinfo);
    std::free(buffer);
    return bytes;
}

bool WritePng(const std::string& path, const _zbm_Image* image, std::string* error) {
    if (image == nullptr || (image->order != ZBM_PIXEL_ORDER_RGB && image->order != ZBM_PIXEL_ORDER_GRAY)) {
        *error = "cannot write " + path + ": not an RGB or gray image";
        return false;
    }
    png_image png;
    std::memset(&png, 0, sizeof png);
    png.version = PNG_IMAGE_VERSION;
    png.width = static_cast<png_uint_32>(image->width);
    png.height = static_cast<png_uint_32>(image->height);
    png.format = image->order == ZBM_PIXEL_ORDER_RGB ? PNG_FORMAT_RGB : PNG_FORMAT_GRAY;
    if (!png_image_write_to_file(&png, path.c_str(), 0, image->pData, image->pitch, nullptr)) {
        *error = "cannot write " + path + ": " + png.message;
        return false;
    }
    return true;
}

}  // namespace lumicor_tool
