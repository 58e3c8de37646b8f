// C entry points of the representative meta ("REPM" frames). Version 2 is
// read and written; version 1 is only read.
#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/frame/kt_handlers.h"
#include "ktlib/src/frame/kt_repm_record.h"

namespace {

const ktframe::FrameKind kRepmFrame = {{'R', 'E', 'P', 'M'}, 2};

// Frees the record and everything it owns.
void DeleteRepresentative(_KtMetaRepresentative* m) {
    if (!m) return;
    ktrepm::ReleaseArrays(m);
    delete m;
}

struct RepresentativeDeleter {
    void operator()(_KtMetaRepresentative* m) const { DeleteRepresentative(m); }
};
using RepresentativePtr = std::unique_ptr<_KtMetaRepresentative, RepresentativeDeleter>;

}  // namespace

extern "C" {

int KtRepmGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine) {
    if (!meta || !engine) return KT_ERR_NULL;
    meta->major = 2;
    meta->minor = 0;
    engine->major = 2;
    engine->minor = 5;
    engine->build = 0x13121700u;
    return KT_OK;
}

int KtRepmCloneMeta(const _KtMetaRepresentative* src, _KtMetaRepresentative** out) {
    if (!src || !out) return KT_ERR_NULL;
    if (*out) return KT_ERR_STATE;
    RepresentativePtr copy(lmk::NewObject<_KtMetaRepresentative>().release());
    if (!copy) return KT_ERR_NO_MEMORY;
    const int status = ktrepm::DeepCopy(*src, copy.get());
    if (status != KT_OK) return status;
    *out = copy.release();
    return KT_OK;
}

int KtRepmDisposeMeta(_KtMetaRepresentative** m) {
    if (m && *m) {
        DeleteRepresentative(*m);
        *m = nullptr;
    }
    return KT_OK;
}

int KtRepmDump(const _KtMetaRepresentative* m, FILE* stream) {
    if (m && stream) {
        ktframe::DumpFramed("[KtMetaRepresentative]---------\n", KtMetaRepresentativeHandler(m), stream);
    }
    return KT_OK;
}

int KtRepmGetSerializedSize(const _KtMetaRepresentative* m, unsigned int* size) {
    if (!m || !size) return KT_ERR_NULL;
    const unsigned int payload = KtMetaRepresentativeHandler(m).Size();
    if (payload == 0) return KT_ERR_STATE;  // too many fingers or an impossible size
    *size = KtFrameHeaderHandler::kSize + payload;
    return KT_OK;
}

int KtRepmSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaRepresentative* m, unsigned char* buffer, unsigned int length) {
    if (!metaVersion || !engineVersion || !m || !buffer) return KT_ERR_NULL;
    switch (metaVersion->major) {
    case 1:
        // Legacy frames cannot be written; the handler says so on stderr.
        return ktframe::WriteFrame(kRepmFrame, *metaVersion, *engineVersion,
                                   KtMetaRepresentativeLegacyHandler(nullptr), buffer, length);
    case 2:
        return ktframe::WriteFrame(kRepmFrame, *metaVersion, *engineVersion, KtMetaRepresentativeHandler(m), buffer,
                                   length);
    default:
        return KT_ERR_UNSUPPORTED;
    }
}

int KtRepmParse(const unsigned char* data, unsigned int length, KtFrameHeader* header, _KtMetaRepresentative** out) {
    if (!data || !header || !out || *out) return KT_ERR_NULL;
    const int status = ktframe::ReadFrameHeader(kRepmFrame, data, length, header);
    if (status != KT_OK) return status;
    RepresentativePtr meta(lmk::NewObject<_KtMetaRepresentative>().release());
    if (!meta) return KT_ERR_NO_MEMORY;
    if (header->metaVersion.major == 1) {
        KtMetaRepresentativeLegacyHandler legacy(meta.get());
        if (ktframe::ReadFramePayload(legacy, data, *header) != KT_OK) return KT_ERR_FAILED;
    } else {
        KtMetaRepresentativeHandler current(meta.get());
        if (ktframe::ReadFramePayload(current, data, *header) != KT_OK) {
            return current.ReadRanOutOfMemory() ? KT_ERR_NO_MEMORY : KT_ERR_FAILED;
        }
    }
    *out = meta.release();
    return KT_OK;
}

}  // extern "C"
