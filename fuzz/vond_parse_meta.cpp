// VondParseMeta on arbitrary bytes. An accepted blob must serialise again,
// and serialising what that serialisation parses back to must give the same
// bytes: parse and serialise agree on every field they carry.
#include <lumicor/vond.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace {

bool IsZero(const _VondMeta& meta) {
    const uint8_t* p = reinterpret_cast<const uint8_t*>(&meta);
    for (size_t i = 0; i < sizeof meta; ++i) {
        if (p[i] != 0) return false;
    }
    return true;
}

void Check(bool ok, const char* what, const _VondResult& r) {
    if (ok) return;
    std::fprintf(stderr, "vond_parse_meta: %s (status %u, %s: %s)\n", what, static_cast<unsigned>(r.status),
                 r.function ? r.function : "-", r.message ? r.message : "-");
    std::abort();
}

// Serialises `meta`; false when the meta cannot be written.
bool Serialize(const _VondMeta& meta, std::vector<uint8_t>* out, _VondResult* r) {
    uint32_t size = 0;
    *r = VondGetSerializedSize(&meta, &size);
    if (r->status != VOND_STATUS_OK) return false;
    out->assign(size, 0xA5);
    *r = VondSerializeMeta(&meta, size, out->data());
    return r->status == VOND_STATUS_OK;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > UINT32_MAX) return 0;
    _VondMeta meta;
    _VondResult r = VondParseMeta(static_cast<uint32_t>(size), data, &meta);
    if (r.status != VOND_STATUS_OK) {
        // A refused blob leaves nothing behind but, for an unknown meta
        // version, the version read.
        if (r.status == VOND_STATUS_UNSUPPORTED_VERSION) std::memset(&meta.version, 0, sizeof meta.version);
        Check(IsZero(meta), "a refused blob left data in the record", r);
        return 0;
    }

    std::vector<uint8_t> first;
    const bool written = Serialize(meta, &first, &r);
    VondDisposeMeta(&meta);
    if (!written) {
        // Some accepted blobs carry values the writer refuses; its buffer must
        // then be all zero.
        for (uint8_t b : first) Check(b == 0, "a failed serialisation left bytes in the buffer", r);
        return 0;
    }

    _VondMeta again;
    r = VondParseMeta(static_cast<uint32_t>(first.size()), first.data(), &again);
    Check(r.status == VOND_STATUS_OK, "a blob written by the library does not parse", r);
    std::vector<uint8_t> second;
    const bool rewritten = Serialize(again, &second, &r);
    VondDisposeMeta(&again);
    Check(rewritten, "a parsed blob of the library does not serialise", r);
    Check(first == second, "the second serialisation differs from the first", r);
    return 0;
}
