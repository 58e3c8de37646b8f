// Debug image output of the attention engine. Every PGM/PPM file the engine
// writes goes through WriteDebugPnm so that the engine uses the project's one
// PNM writer.
#ifndef LUMICOR_CALIB_PLANE_PNM_WRITER_H
#define LUMICOR_CALIB_PLANE_PNM_WRITER_H

#include <cstdint>

namespace CA {

enum class PnmResult { kOk = 0, kInvalidArgument, kOpenFailed, kWriteFailed };

// Writes "P5" (channels 1) or "P6" (channels 3), "\n<width> <height>\n255\n"
// and width * height * channels bytes of packed rows.
PnmResult WriteDebugPnm(const char* path, uint32_t channels, int32_t width, int32_t height,
                        const uint8_t* pixels);

// True when path names an existing directory.
bool IsDirectory(const char* path);

}  // namespace CA

#endif
