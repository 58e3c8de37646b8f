// C entry points of the similarity meta ("SIML" frames).
#include <lumicor/ktlib.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/frame/kt_handlers.h"

namespace {

const ktframe::FrameKind kSimlFrame = {{'S', 'I', 'M', 'L'}, 2};  // 1.x is read with the 2.x layout

}  // namespace

extern "C" {

int KtSimlGetVersion(_KtMetaVersion* meta, _KtEngineVersion* engine) {
    if (!meta || !engine) return KT_ERR_NULL;
    meta->major = 2;
    meta->minor = 0;
    engine->major = 1;
    engine->minor = 4;
    engine->build = 0x13121700u;
    return KT_OK;
}

int KtSimlCloneMeta(const _KtMetaSimilarity* src, _KtMetaSimilarity** out) {
    if (!src || !out || *out) return KT_ERR_NULL;
    std::unique_ptr<_KtMetaSimilarity> copy = lmk::NewObject<_KtMetaSimilarity>(*src);
    if (!copy) return KT_ERR_NO_MEMORY;
    *out = copy.release();
    return KT_OK;
}

int KtSimlDisposeMeta(_KtMetaSimilarity** m) {
    if (m && *m) {
        delete *m;
        *m = nullptr;
    }
    return KT_OK;
}

int KtSimlDump(const _KtMetaSimilarity* m, FILE* stream) {
    if (m && stream) ktframe::DumpFramed("[KtMetaSimilarity]-------------\n", KtMetaSimilarityHandler(m), stream);
    return KT_OK;
}

int KtSimlGetSerializedSize(unsigned int* size) {
    if (!size) return KT_ERR_NULL;
    *size = KtFrameHeaderHandler::kSize + KtMetaSimilarityHandler::kSize;
    return KT_OK;
}

int KtSimlSerialize(const _KtMetaVersion* metaVersion, const _KtEngineVersion* engineVersion,
                    const _KtMetaSimilarity* m, unsigned char* buffer, unsigned int length) {
    if (!metaVersion || !engineVersion || !m || !buffer) return KT_ERR_NULL;
    return ktframe::WriteFrame(kSimlFrame, *metaVersion, *engineVersion, KtMetaSimilarityHandler(m), buffer, length);
}

int KtSimlParse(const unsigned char* data, unsigned int length, KtFrameHeader* header, _KtMetaSimilarity** out) {
    if (!data || !header || !out) return KT_ERR_NULL;
    if (*out) return KT_ERR_STATE;
    const int status = ktframe::ReadFrameHeader(kSimlFrame, data, length, header);
    if (status != KT_OK) return status;
    std::unique_ptr<_KtMetaSimilarity> meta = lmk::NewObject<_KtMetaSimilarity>();
    if (!meta) return KT_ERR_NO_MEMORY;
    KtMetaSimilarityHandler handler(meta.get());
    if (ktframe::ReadFramePayload(handler, data, *header) != KT_OK) return KT_ERR_FAILED;
    *out = meta.release();
    return KT_OK;
}

}  // extern "C"
