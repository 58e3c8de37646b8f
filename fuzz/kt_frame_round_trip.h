// Shared body of the Kt frame fuzz targets: whatever a parser accepts must
// clone, dump, and serialise back to exactly the frame it was read from.
#ifndef LUMICOR_FUZZ_KT_FRAME_ROUND_TRIP_H
#define LUMICOR_FUZZ_KT_FRAME_ROUND_TRIP_H

#include <lumicor/ktlib.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

namespace fuzz {

template <typename Meta>
struct KtFamily {
    int (*parse)(const unsigned char*, unsigned int, KtFrameHeader*, Meta**);
    int (*clone)(const Meta*, Meta**);
    int (*dispose)(Meta**);
    int (*dump)(const Meta*, FILE*);
    int (*size)(const Meta*, unsigned int*);
    int (*serialize)(const _KtMetaVersion*, const _KtEngineVersion*, const Meta*, unsigned char*, unsigned int);
};

inline void Check(bool ok, const char* what) {
    if (!ok) {
        std::fprintf(stderr, "round trip broken: %s\n", what);
        std::abort();
    }
}

// writable: false for frames of a version that is read but never written.
template <typename Meta>
int RoundTrip(const KtFamily<Meta>& f, const uint8_t* data, size_t size, bool (*writable)(const KtFrameHeader&)) {
    if (size > 0xFFFFFFFFu) return 0;
    KtFrameHeader header;
    Meta* meta = nullptr;
    if (f.parse(data, static_cast<unsigned int>(size), &header, &meta) != KT_OK) {
        Check(meta == nullptr, "a refused frame left a record");
        return 0;
    }
    static FILE* sink = std::fopen("/dev/null", "w");
    f.dump(meta, sink);

    Meta* copy = nullptr;
    Check(f.clone(meta, &copy) == KT_OK, "clone of a parsed record");
    if (writable(header)) {
        unsigned int frameSize = 0;
        Check(f.size(copy, &frameSize) == KT_OK && frameSize == 16u + header.metaBytes, "serialised size");
        std::unique_ptr<unsigned char[]> out(new unsigned char[frameSize]);
        Check(f.serialize(&header.metaVersion, &header.engineVersion, copy, out.get(), frameSize) == KT_OK,
              "serialise");
        Check(std::memcmp(out.get(), data, frameSize) == 0, "bytes differ from the frame read");
    }
    f.dispose(&copy);
    f.dispose(&meta);
    return 0;
}

inline bool AlwaysWritable(const KtFrameHeader&) { return true; }

}  // namespace fuzz

#endif
