#include "analysis.h"

#include <lumicor/lmc.h>

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace lumicor_tool {

MetaRecord::MetaRecord() { std::memset(&meta_, 0, sizeof meta_); }

MetaRecord::~MetaRecord() { VondDisposeMeta(&meta_); }

bool MetaRecord::Parse(const std::vector<uint8_t>& blob, std::string* error) {
    if (blob.empty() || blob.size() > UINT32_MAX) {
        *error = "not a photo meta (empty or too large)";
        return false;
    }
    const _VondResult r = VondParseMeta(static_cast<uint32_t>(blob.size()), blob.data(), &meta_);
    if (r.status == VOND_STATUS_OK) return true;
    *error = std::string("not a valid photo meta (") + (r.function ? r.function : "?") + ": " +
             (r.message ? r.message : "failed") + ")";
    return false;
}

Library::~Library() {
    if (started_) LmcFinalizeLumicor();
}

bool Library::StartLocked(std::string* error) {
    if (started_) return true;
    std::string path = configPath_;
    std::string temporary;
    if (path.empty()) {
        // The library needs a configuration file; this one shows no messages
        // (the tool reports failures itself).
        const char* dir = std::getenv("TMPDIR");
        temporary = std::string(dir != nullptr && *dir != '\0' ? dir : "/tmp") + "/lumicor-XXXXXX";
        const int fd = mkstemp(&temporary[0]);
        if (fd < 0) {
            *error = "cannot create a temporary configuration file in " + temporary.substr(0, temporary.rfind('/'));
            return false;
        }
        static const char kQuiet[] = "{Lumicor}\n[Log]\nUsePrintf=\"false\"\nUseFile=\"false\"\n";
        const bool written = write(fd, kQuiet, sizeof kQuiet - 1) == static_cast<ssize_t>(sizeof kQuiet - 1);
        close(fd);
        if (!written) {
            unlink(temporary.c_str());
            *error = "cannot write a temporary configuration file";
            return false;
        }
        path = temporary;
    }
    const uint32_t status = LmcInitializeLumicor(path.c_str());
    if (!temporary.empty()) unlink(temporary.c_str());  // read completely by now
    if (status != LMC_STATUS_OK) {
        *error = status == LMC_STATUS_FILE_ERROR ? "cannot open the configuration file " + path
                                                 : "the library cannot start (status " + std::to_string(status) + ")";
        return false;
    }
    started_ = true;
    return true;
}

bool Library::Analyze(const _zbm_Image* rgb, bool detectFaces, std::vector<uint8_t>* blob, std::string* error) {
    if (rgb == nullptr || rgb->order != ZBM_PIXEL_ORDER_RGB) {
        *error = "not an RGB photo";
        return false;
    }
    const LmcImage image = {rgb->pData, nullptr, rgb->width, rgb->height, rgb->pitch, LMC_PIXEL_ORDER_RGB};
    LmcPhotoMeta meta = {0, nullptr};
    uint32_t status;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (!StartLocked(error)) return false;
        status = LmcAnalyzePhoto(&image, detectFaces ? -1 : 0, nullptr, &meta);
    }
    if (status != LMC_STATUS_OK) {
        switch (status) {
            case LMC_STATUS_INVALID_PARAMETER:
                *error = "the library refused the photo (status 1)";
                break;
            case LMC_STATUS_OUT_OF_MEMORY:
                *error = "out of memory while analysing (status 2)";
                break;
            default:
                *error = "the analysis failed (status " + std::to_string(status) +
                         "; --config with a log level shows why)";
                break;
        }
        return false;
    }
    blob->assign(meta.pMeta, meta.pMeta + meta.nBufferSize);
    LmcDisposePhotoMeta(&meta);
    return true;
}

}  // namespace lumicor_tool
