#include "tool_test_files.h"

#include "photo_io.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include <gtest/gtest.h>
#include <png.h>

namespace lumicor_tool_test {

Rgb Quadrants(int width, int height) {
    static const uint8_t kColors[4][3] = {{220, 20, 20}, {20, 200, 20}, {20, 20, 220}, {250, 250, 250}};
    Rgb image;
    image.width = width;
    image.height = height;
    image.pixels.resize(static_cast<size_t>(width) * height * 3);
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x) {
            const int q = (y >= height / 2 ? 2 : 0) + (x >= width / 2 ? 1 : 0);
            std::memcpy(&image.pixels[(static_cast<size_t>(y) * width + x) * 3], kColors[q], 3);
        }
    return image;
}

namespace {

// A big-endian TIFF block with one IFD0 entry: Orientation (0x0112), SHORT.
std::vector<uint8_t> ExifOrientation(int orientation) {
    std::vector<uint8_t> b = {'E', 'x', 'i', 'f', 0, 0, 'M', 'M', 0, 42, 0, 0, 0, 8,  // TIFF header, IFD0 at 8
                              0, 1,                                                    // one entry
                              0x01, 0x12, 0, 3, 0, 0, 0, 1,                            // tag, SHORT, count 1
                              0, static_cast<uint8_t>(orientation), 0, 0,              // value
                              0, 0, 0, 0};                                             // no next IFD
    return b;
}

}  // namespace

std::vector<uint8_t> EncodeJpeg(const Rgb& image, int orientation) {
    return lumicor_tool::EncodeJpeg(image.pixels.data(), image.width, image.height, image.width * 3, 95,
                                    orientation != 0 ? ExifOrientation(orientation) : std::vector<uint8_t>());
}

std::vector<uint8_t> EncodePng(const Rgb& image, bool transparentFirst) {
    png_image png;
    std::memset(&png, 0, sizeof png);
    png.version = PNG_IMAGE_VERSION;
    png.width = static_cast<png_uint_32>(image.width);
    png.height = static_cast<png_uint_32>(image.height);
    std::vector<uint8_t> pixels = image.pixels;
    int channels = 3;
    png.format = PNG_FORMAT_RGB;
    if (transparentFirst) {
        channels = 4;
        png.format = PNG_FORMAT_RGBA;
        pixels.clear();
        for (size_t i = 0; i < image.pixels.size(); i += 3) {
            pixels.insert(pixels.end(), &image.pixels[i], &image.pixels[i] + 3);
            pixels.push_back(i == 0 ? 0 : 255);
        }
    }
    png_alloc_size_t size = 0;
    const int stride = image.width * channels;
    if (!png_image_write_to_memory(&png, nullptr, &size, 0, pixels.data(), stride, nullptr)) return {};
    std::vector<uint8_t> bytes(size);
    if (!png_image_write_to_memory(&png, bytes.data(), &size, 0, pixels.data(), stride, nullptr)) return {};
    bytes.resize(size);
    return bytes;
}

void WriteBytes(const std::string& path, const std::vector<uint8_t>& bytes) {
    std::FILE* f = std::fopen(path.c_str(), "wb");
    ASSERT_NE(f, nullptr) << path;
    ASSERT_EQ(std::fwrite(bytes.data(), 1, bytes.size(), f), bytes.size());
    std::fclose(f);
}

}  // namespace lumicor_tool_test
