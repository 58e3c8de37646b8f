// Fuzzes the face section reader of the photo meta. What it accepts is
// printed (to /dev/null) and must be written back in a form that reads and
// writes again to the same bytes; every read reports no more bytes consumed
// than it was given.
#include <lumicor/vond.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace {

struct Section {
    _FaceMeta meta;
    Oriel_ClusterSubject subject = 0;
    _VondOrielMetaArray scores = {0, nullptr};
    uint32_t consumed = 0;
    Section() { std::memset(static_cast<void*>(&meta), 0, sizeof meta); }
    ~Section() { VondOrielDisposeMeta(meta, scores); }
    bool Parse(const uint8_t* data, uint32_t size) {
        const bool ok = VondOrielParse(data, size, meta, subject, scores, consumed).status == VOND_STATUS_OK;
        if (consumed > size || (!ok && (meta.pRegions || scores.pScores))) std::abort();
        return ok;
    }
    bool Write(std::vector<uint8_t>& out) const {
        const uint32_t size = VondOrielGetSerializedSize(meta);
        if (size == 0) return false;
        out.assign(size, 0);
        uint32_t written = 0;
        if (VondOrielSerialize(meta, subject, scores, out.data(), size, written).status != VOND_STATUS_OK) return false;
        if (written != size) std::abort();
        return true;
    }
};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    if (!std::freopen("/dev/null", "w", stdout)) std::abort();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > UINT32_MAX) return 0;
    Section first;
    if (!first.Parse(data, static_cast<uint32_t>(size))) return 0;
    VondOrielDump(first.meta, first.subject, first.scores);
    std::vector<uint8_t> once, twice, thrice;
    if (!first.Write(once)) return 0;
    // The first write may still normalise (half a mouth becomes no mouth);
    // after it the form must be stable.
    Section second, third;
    if (!second.Parse(once.data(), static_cast<uint32_t>(once.size())) || second.consumed != once.size()) std::abort();
    if (!second.Write(twice)) std::abort();
    if (!third.Parse(twice.data(), static_cast<uint32_t>(twice.size()))) std::abort();
    if (!third.Write(thrice) || thrice != twice) std::abort();
    return 0;
}
