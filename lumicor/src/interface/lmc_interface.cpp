// Start, stop and blob release of the exported interface.
#include <lumicor/lmc.h>
#include <lumicor/lmk.h>
#include <lumicor/vond.h>

#include "lumicor/src/interface/lmc_log.h"
#include "lumicor/src/interface/lmc_state.h"

namespace {

// Plain global: the interface expects one caller at a time.
bool s_initialized = false;

}  // namespace

bool lmc::IsInitialized() { return s_initialized; }

extern "C" uint32_t LmcInitializeLumicor(const char* configPath) {
    if (s_initialized) return LMC_STATUS_FAILED;
    if (configPath == nullptr) return LMC_STATUS_INVALID_PARAMETER;

    // Each step runs only when the previous one succeeded; any failure undoes
    // everything that was set up so far.
    uint32_t status = static_cast<uint32_t>(LmkConfig::Initialize());
    if (status == LMC_STATUS_OK) status = static_cast<uint32_t>(LmkConfig::LoadConfig(configPath));
    if (status == LMC_STATUS_OK) status = static_cast<uint32_t>(LmkLog::Start("Lumicor"));
    if (status != LMC_STATUS_OK) LmcFinalizeLumicor();
    s_initialized = status == LMC_STATUS_OK;

    const _VondVersion* version = VondGetVersion();
    LMC_LOG(LMKLOG_PRINT, "%s(%d): Vond %d.%d.%08x, metaVersion = %d, flags = %d\n", version->major, version->minor,
            version->build, version->metaVersion, version->flags);
    return status;
}

extern "C" uint32_t LmcFinalizeLumicor(void) {
    const uint32_t stop = static_cast<uint32_t>(LmkLog::Stop());
    const uint32_t unload = static_cast<uint32_t>(LmkConfig::UnloadConfig());
    const uint32_t finalize = static_cast<uint32_t>(LmkConfig::Finalize());
    s_initialized = false;
    if (finalize != LMC_STATUS_OK) return finalize;
    if (unload != LMC_STATUS_OK) return unload;
    return stop;
}

extern "C" uint32_t LmcDisposePhotoMeta(LmcPhotoMeta* pPhotoMeta) {
    if (pPhotoMeta == nullptr) {
        LMC_LOG_ERROR("%s(%d): LmcDisposePhotoMeta(): pPhotoMeta == NULL\n");
        return LMC_STATUS_INVALID_PARAMETER;
    }
    delete[] pPhotoMeta->pMeta;
    pPhotoMeta->pMeta = nullptr;
    pPhotoMeta->nBufferSize = 0;
    return LMC_STATUS_OK;
}
