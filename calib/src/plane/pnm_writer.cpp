#include "calib/src/plane/pnm_writer.h"

#include <sys/stat.h>

#include <cstdio>

#include "common/src/internal/memory.h"

namespace CA {

// TODO(vondmeta): forward to lmk::WritePnm once the common PNM writer has
// landed; this body has the same contract.
PnmResult WriteDebugPnm(const char* path, uint32_t channels, int32_t width, int32_t height,
                        const uint8_t* pixels) {
    if (path == nullptr || pixels == nullptr || (channels != 1 && channels != 3) || width <= 0 || height <= 0) {
        return PnmResult::kInvalidArgument;
    }
    uint32_t bytes;
    if (!lmk::CheckedMul(static_cast<uint32_t>(width), static_cast<uint32_t>(height), channels, &bytes)) {
        return PnmResult::kInvalidArgument;
    }
    std::FILE* fp = std::fopen(path, "wb");
    if (fp == nullptr) return PnmResult::kOpenFailed;
    const bool headerOk = std::fprintf(fp, "P%c\n%d %d\n255\n", channels == 1 ? '5' : '6', width, height) > 0;
    const bool dataOk = headerOk && std::fwrite(pixels, 1, bytes, fp) == bytes;
    const bool closeOk = std::fclose(fp) == 0;
    return headerOk && dataOk && closeOk ? PnmResult::kOk : PnmResult::kWriteFailed;
}

bool IsDirectory(const char* path) {
    struct stat st;
    return path != nullptr && stat(path, &st) == 0 && S_ISDIR(st.st_mode);
}

}  // namespace CA
