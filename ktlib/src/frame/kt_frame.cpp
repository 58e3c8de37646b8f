#include "ktlib/src/frame/kt_fixed_record.h"

#include "common/src/internal/memory.h"

#include <cstring>

template <>
struct KtRecordLayout<KtFrameHeader> {
    template <class Io, class Header>
    static void Fields(Io& io, Header& h) {
        io.Bytes(h.metaSignature, 4);
        io.U32(h.metaBytes);
        io.U8(h.metaVersion.major);
        io.U8(h.metaVersion.minor);
        io.U8(h.engineVersion.major);
        io.U8(h.engineVersion.minor);
        io.U32(h.engineVersion.build);
    }

    static void Dump(FILE* stream, const KtFrameHeader& h) {
        std::fputs("MetaSignature = ", stream);
        std::fwrite(h.metaSignature, 1, 4, stream);
        std::fputs("\n", stream);
        std::fprintf(stream, "MetaBytes = %d\n", static_cast<int>(h.metaBytes));
        std::fprintf(stream, "MetaVersion  = %d.%d\n", h.metaVersion.major, h.metaVersion.minor);
        std::fprintf(stream, "EngineVersion  = %d.%d.%08x\n", h.engineVersion.major, h.engineVersion.minor,
                     static_cast<unsigned int>(h.engineVersion.build));
    }
};

template class KtFixedRecordHandler<KtFrameHeader, 16>;

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
