// C entry points of the colour label meta ("CLBL" frames).
#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/frame/kt_handlers.h"

namespace {

const ktframe::FrameKind kClblFrame = {{'C', 'L', 'B', 'L'}, 1};

}  // namespace

extern "C" {

int KtClblGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine) {
    if (!meta || !engine) return KT_ERR_NULL;
    meta->major = 1;
    meta->minor = 0;
    engine->major = 1;
    engine->minor = 2;
    engine->build = 0x13121700u;
    return KT_OK;
}

int KtClblCloneMeta(const _KtMetaColorLabel* src, _KtMetaColorLabel** out) {
    if (!src || !out) return KT_ERR_NULL;
    if (*out) return KT_ERR_STATE;
    std::unique_ptr<_KtMetaColorLabel> copy = lmk::NewObject<_KtMetaColorLabel>(*src);
    if (!copy) return KT_ERR_NO_MEMORY;
    *out = copy.release();
    return KT_OK;
}

int KtClblDisposeMeta(_KtMetaColorLabel** m) {
    if (m && *m) {
        delete *m;
        *m = nullptr;
    }
    return KT_OK;
}

int KtClblDump(const _KtMetaColorLabel* m, FILE* stream) {
    if (m && stream) ktframe::DumpFramed("[KtMetaColorLabel]---------\n", KtMetaColorLabelHandler(m), stream);
    return KT_OK;
}

int KtClblGetSerializedSize(unsigned int* size) {
    if (!size) return KT_ERR_NULL;
    *size = KtFrameHeaderHandler::kSize + KtMetaColorLabelHandler::kSize;
    return KT_OK;
}

int KtClblSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaColorLabel* m, unsigned char* buffer, unsigned int length) {
    if (!metaVersion || !engineVersion || !m || !buffer) return KT_ERR_NULL;
    return ktframe::WriteFrame(kClblFrame, *metaVersion, *engineVersion, KtMetaColorLabelHandler(m), buffer, length);
}

int KtClblParse(const unsigned char* data, unsigned int length, KtFrameHeader* header, _KtMetaColorLabel** out) {
    // This meta reports a null argument as a state error.
    if (!data || !header || !out || *out) return KT_ERR_STATE;
    const int status = ktframe::ReadFrameHeader(kClblFrame, data, length, header);
    if (status != KT_OK) return status;
    std::unique_ptr<_KtMetaColorLabel> meta = lmk::NewObject<_KtMetaColorLabel>();
    if (!meta) return KT_ERR_NO_MEMORY;
    KtMetaColorLabelHandler handler(meta.get());
    if (ktframe::ReadFramePayload(handler, data, *header) != KT_OK) return KT_ERR_FAILED;
    *out = meta.release();
    return KT_OK;
}

}  // extern "C"
