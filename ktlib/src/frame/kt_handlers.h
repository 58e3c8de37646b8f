// Read/write handlers of the Kt metas and the frame that carries them.
//
// A handler moves one record between memory and its big-endian payload. It
// points at the record (never owns it): Write and Size only read it, Read
// fills it. A handler constructed from a const record cannot Read.
//
// Records handed out through the KtXxx `out` parameters are allocated with
// non-throwing scalar new and released with delete; the arrays a
// representative record owns (fingers, each finger's points, the blur map)
// use non-throwing array new and delete[] (see kt_repm_record.h).
#ifndef LUMICOR_KTLIB_FRAME_KT_HANDLERS_H
#define LUMICOR_KTLIB_FRAME_KT_HANDLERS_H

#include <lumicor/ktlib.h>

#include <cstdint>
#include <cstdio>

class KtRwHandlerInterface {
public:
    virtual ~KtRwHandlerInterface() {}
    // Bytes that Write produces and Read consumes.
    virtual unsigned int Size() const = 0;
    // Bytes written, 0 on failure.
    virtual unsigned int Write(unsigned char* buffer, unsigned int length) const = 0;
    // Bytes consumed, 0 on failure.
    virtual unsigned int Read(const unsigned char* buffer, unsigned int length) = 0;
    virtual void Dump(FILE* stream) const = 0;
};

// Where a record's payload layout and dump text are stated; specialised
// beside each fixed-size record's handler (see kt_fixed_record.h).
template <class Record>
struct KtRecordLayout;

// A record whose payload is always kBytes bytes. Write and Read refuse a
// buffer shorter than that and a payload whose fields do not fill exactly
// kBytes; Read commits to the record only after a complete read.
template <class Record, unsigned int kBytes>
class KtFixedRecordHandler : public KtRwHandlerInterface {
public:
    static constexpr unsigned int kSize = kBytes;
    explicit KtFixedRecordHandler(Record* record) : record_(record), readable_(record) {}
    explicit KtFixedRecordHandler(const Record* record) : record_(nullptr), readable_(record) {}
    unsigned int Size() const override { return kSize; }
    unsigned int Write(unsigned char* buffer, unsigned int length) const override;
    unsigned int Read(const unsigned char* buffer, unsigned int length) override;
    void Dump(FILE* stream) const override;
    const Record* GetData() const { return readable_; }

private:
    Record* record_;
    const Record* readable_;
};

using KtFrameHeaderHandler = KtFixedRecordHandler<KtFrameHeader, 16>;
using KtMetaSimilarityHandler = KtFixedRecordHandler<_KtMetaSimilarity, 660>;
using KtMetaColorLabelHandler = KtFixedRecordHandler<_KtMetaColorLabel, 16>;
extern template class KtFixedRecordHandler<KtFrameHeader, 16>;
extern template class KtFixedRecordHandler<_KtMetaSimilarity, 660>;
extern template class KtFixedRecordHandler<_KtMetaColorLabel, 16>;

// Meta version 2: six scores, analysed size, the finger outlines and the
// blur map. Size is computed from the record; it is 0 when the record
// cannot be written (more than KT_MAX_FINGERS fingers, a count without its
// array, or a size that does not fit a 32-bit frame).
class KtMetaRepresentativeHandler : public KtRwHandlerInterface {
public:
    static const unsigned int kFixedSize = 44;
    explicit KtMetaRepresentativeHandler(_KtMetaRepresentative* meta)
        : meta_(meta), readable_(meta), outOfMemory_(false) {}
    explicit KtMetaRepresentativeHandler(const _KtMetaRepresentative* meta)
        : meta_(nullptr), readable_(meta), outOfMemory_(false) {}
    unsigned int Size() const override;
    unsigned int Write(unsigned char* buffer, unsigned int length) const override;
    // Replaces the record's fields; the record must not own arrays yet. On
    // failure the record is left untouched. More than KT_MAX_FINGERS fingers
    // are refused so that every record read can be written back.
    unsigned int Read(const unsigned char* buffer, unsigned int length) override;
    void Dump(FILE* stream) const override;
    // True when the last Read failed for want of memory rather than on the bytes.
    bool ReadRanOutOfMemory() const { return outOfMemory_; }

private:
    _KtMetaRepresentative* meta_;
    const _KtMetaRepresentative* readable_;
    bool outOfMemory_;
};

// Meta version 1: a 16-byte payload holding two scores as bytes. Read only.
class KtMetaRepresentativeLegacyHandler : public KtRwHandlerInterface {
public:
    static const unsigned int kSize = 16;
    explicit KtMetaRepresentativeLegacyHandler(_KtMetaRepresentative* meta) : meta_(meta) {}
    unsigned int Size() const override { return kSize; }
    // Refuses (prints why to stderr) and returns 0.
    unsigned int Write(unsigned char* buffer, unsigned int length) const override;
    unsigned int Read(const unsigned char* buffer, unsigned int length) override;
    // Prints its refusal to stderr only.
    void Dump(FILE* stream) const override;

private:
    _KtMetaRepresentative* meta_;
};

namespace ktframe {

// What a frame kind is called on the wire and which meta majors it reads.
struct FrameKind {
    char signature[4];
    uint8_t maxMajor;
};

// Writes header and payload; 0, 3 (payload size unknown or buffer too
// short: nothing written), 1 (a handler wrote short).
int WriteFrame(const FrameKind& kind, const _KtMetaVersion& metaVersion, const _KtEngineVersion& engineVersion,
               const KtRwHandlerInterface& payload, unsigned char* buffer, unsigned int length);

// Reads and checks the header of a frame: 3 length <= 16; 1 short read,
// other signature, payload longer than the bytes given, or meta major 0 or
// above kind.maxMajor. *header is filled once it could be read.
int ReadFrameHeader(const FrameKind& kind, const unsigned char* data, unsigned int length, KtFrameHeader* header);

// Reads the payload of a checked frame: 0, or 1 when the handler refuses it
// or its size differs from header.metaBytes (a frame is exactly its header
// and its payload, so the next frame starts right after it).
int ReadFramePayload(KtRwHandlerInterface& payload, const unsigned char* data, const KtFrameHeader& header);

// The banner/handler/rule layout shared by the three KtXxxDump functions.
void DumpFramed(const char* banner, const KtRwHandlerInterface& payload, FILE* stream);

}  // namespace ktframe

#endif
