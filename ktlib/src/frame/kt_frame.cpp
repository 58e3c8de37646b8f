#include "ktlib/src/frame/kt_handlers.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstring>

unsigned int KtFrameHeaderHandler::Write(unsigned char* buffer, unsigned int length) const {
    if (!readable_ || !buffer || length < kSize) return 0;
    lmk::ByteWriter w(buffer, length);
    w.Bytes(readable_->metaSignature, 4);
    w.U32(readable_->metaBytes);
    w.U8(readable_->metaVersion.major);
    w.U8(readable_->metaVersion.minor);
    w.U8(readable_->engineVersion.major);
    w.U8(readable_->engineVersion.minor);
    w.U32(readable_->engineVersion.build);
    return w.ok() ? w.position() : 0;
}

unsigned int KtFrameHeaderHandler::Read(const unsigned char* buffer, unsigned int length) {
    if (!header_ || !buffer || length < kSize) return 0;
    lmk::ByteReader r(buffer, length);
    KtFrameHeader h;
    r.Bytes(h.metaSignature, 4);
    h.metaBytes = r.U32();
    h.metaVersion.major = r.U8();
    h.metaVersion.minor = r.U8();
    h.engineVersion.major = r.U8();
    h.engineVersion.minor = r.U8();
    h.engineVersion.build = r.U32();
    if (!r.ok()) return 0;
    *header_ = h;
    return r.position();
}

void KtFrameHeaderHandler::Dump(FILE* stream) const {
    if (!readable_ || !stream) return;
    std::fputs("MetaSignature = ", stream);
    std::fwrite(readable_->metaSignature, 1, 4, stream);
    std::fputs("\n", stream);
    std::fprintf(stream, "MetaBytes = %d\n", static_cast<int>(readable_->metaBytes));
    std::fprintf(stream, "MetaVersion  = %d.%d\n", readable_->metaVersion.major, readable_->metaVersion.minor);
    std::fprintf(stream, "EngineVersion  = %d.%d.%08x\n", readable_->engineVersion.major,
                 readable_->engineVersion.minor, static_cast<unsigned int>(readable_->engineVersion.build));
}

namespace ktframe {

int WriteFrame(const FrameKind& kind, const _KtMetaVersion& metaVersion, const _KtEngineVersion& engineVersion,
               const KtRwHandlerInterface& payload, unsigned char* buffer, unsigned int length) {
    const unsigned int payloadSize = payload.Size();
    uint32_t total;
    if (payloadSize == 0 || !lmk::CheckedAdd(KtFrameHeaderHandler::kSize, payloadSize, &total)) return KT_ERR_STATE;
    if (length < total) return KT_ERR_STATE;

    KtFrameHeader header;
    std::memcpy(header.metaSignature, kind.signature, 4);
    header.metaBytes = payloadSize;
    header.metaVersion = metaVersion;
    header.engineVersion = engineVersion;
    const unsigned int headerBytes = KtFrameHeaderHandler(&header).Write(buffer, length);
    if (headerBytes == 0) return KT_ERR_FAILED;
    const unsigned int payloadBytes = payload.Write(buffer + headerBytes, length - headerBytes);
    if (payloadBytes == 0 || headerBytes + payloadBytes != total) return KT_ERR_FAILED;
    return KT_OK;
}

int ReadFrameHeader(const FrameKind& kind, const unsigned char* data, unsigned int length, KtFrameHeader* header) {
    if (length <= KtFrameHeaderHandler::kSize) return KT_ERR_STATE;
    if (KtFrameHeaderHandler(header).Read(data, length) != KtFrameHeaderHandler::kSize) return KT_ERR_FAILED;
    if (std::memcmp(header->metaSignature, kind.signature, 4) != 0) return KT_ERR_FAILED;
    if (length - KtFrameHeaderHandler::kSize < header->metaBytes) return KT_ERR_FAILED;
    if (header->metaVersion.major == 0 || header->metaVersion.major > kind.maxMajor) return KT_ERR_FAILED;
    return KT_OK;
}

int ReadFramePayload(KtRwHandlerInterface& payload, const unsigned char* data, const KtFrameHeader& header) {
    // The payload is read from its own frame only, so a frame cannot borrow
    // bytes of the next one.
    const unsigned int consumed = payload.Read(data + KtFrameHeaderHandler::kSize, header.metaBytes);
    if (consumed == 0 || consumed != payload.Size() || consumed != header.metaBytes) return KT_ERR_FAILED;
    return KT_OK;
}

void DumpFramed(const char* banner, const KtRwHandlerInterface& payload, FILE* stream) {
    std::fputs(banner, stream);
    payload.Dump(stream);
    std::fputs("-------------------------------\n\n", stream);
}

}  // namespace ktframe
