// Bounded cursors over untrusted (reader) and caller-sized (writer) byte
// buffers. Every parser reads through ByteReader so that a short buffer is a
// failed read, never an over-read; every serialiser writes through ByteWriter
// so that it cannot run past the size it was given. Multi-byte values go
// through the zbm_Write* family with the cursor's endian type.
#ifndef LUMICOR_COMMON_INTERNAL_BYTE_CURSOR_H
#define LUMICOR_COMMON_INTERNAL_BYTE_CURSOR_H

#include <lumicor/zbm_image.h>

#include <cstdint>
#include <cstring>

namespace lmk {

class ByteReader {
public:
    ByteReader(const uint8_t* data, uint32_t size, _zbm_WriteEndianType endian = ZBM_WRITE_ENDIAN_BIG)
        : data_(data), size_(data ? size : 0), pos_(0), endian_(endian), ok_(true) {}

    // False once any read or skip has run past the end; later reads then
    // fail too and yield zero.
    bool ok() const { return ok_; }
    uint32_t position() const { return pos_; }
    uint32_t remaining() const { return size_ - pos_; }
    const uint8_t* current() const { return data_ ? data_ + pos_ : nullptr; }

    bool Has(uint32_t n) const { return ok_ && n <= size_ - pos_; }

    bool Skip(uint32_t n) {
        if (!Has(n)) return Fail();
        pos_ += n;
        return true;
    }
    bool Seek(uint32_t pos) {
        if (!ok_ || pos > size_) return Fail();
        pos_ = pos;
        return true;
    }

    uint8_t U8() {
        uint8_t v = 0;
        if (Has(1)) { zbm_Write8(&v, data_ + pos_); pos_ += 1; } else Fail();
        return v;
    }
    uint16_t U16() {
        uint16_t v = 0;
        if (Has(2)) { zbm_Write16(&v, data_ + pos_, endian_); pos_ += 2; } else Fail();
        return v;
    }
    uint32_t U32() {
        uint32_t v = 0;
        if (Has(4)) { zbm_Write32(&v, data_ + pos_, endian_); pos_ += 4; } else Fail();
        return v;
    }
    uint64_t U64() {
        uint64_t v = 0;
        if (Has(8)) { zbm_Write64(&v, data_ + pos_, endian_); pos_ += 8; } else Fail();
        return v;
    }
    int32_t I32() { return static_cast<int32_t>(U32()); }
    float F32() {
        const uint32_t bits = U32();
        float f;
        std::memcpy(&f, &bits, 4);
        return f;
    }
    // Copies n raw bytes (no byte swapping); zero-fills dst on a short read.
    bool Bytes(void* dst, uint32_t n) {
        if (!Has(n)) {
            if (n) std::memset(dst, 0, n);
            return Fail();
        }
        if (n) std::memcpy(dst, data_ + pos_, n);
        pos_ += n;
        return true;
    }

private:
    bool Fail() {
        ok_ = false;
        return false;
    }
    const uint8_t* data_;
    uint32_t size_;
    uint32_t pos_;
    _zbm_WriteEndianType endian_;
    bool ok_;
};

class ByteWriter {
public:
    ByteWriter(uint8_t* data, uint32_t size, _zbm_WriteEndianType endian = ZBM_WRITE_ENDIAN_BIG)
        : data_(data), size_(data ? size : 0), pos_(0), endian_(endian), ok_(true) {}

    bool ok() const { return ok_; }
    uint32_t position() const { return pos_; }
    uint32_t remaining() const { return size_ - pos_; }
    uint8_t* current() const { return data_ ? data_ + pos_ : nullptr; }
    bool Has(uint32_t n) const { return ok_ && n <= size_ - pos_; }

    bool U8(uint8_t v) { return Has(1) ? Advance(zbm_Write8(data_ + pos_, &v)) : Fail(); }
    bool U16(uint16_t v) { return Has(2) ? Advance(zbm_Write16(data_ + pos_, &v, endian_)) : Fail(); }
    bool U32(uint32_t v) { return Has(4) ? Advance(zbm_Write32(data_ + pos_, &v, endian_)) : Fail(); }
    bool U64(uint64_t v) { return Has(8) ? Advance(zbm_Write64(data_ + pos_, &v, endian_)) : Fail(); }
    bool I32(int32_t v) { return U32(static_cast<uint32_t>(v)); }
    bool F32(float f) {
        uint32_t bits;
        std::memcpy(&bits, &f, 4);
        return U32(bits);
    }
    bool Bytes(const void* src, uint32_t n) {
        if (!Has(n)) return Fail();
        if (n) std::memcpy(data_ + pos_, src, n);
        pos_ += n;
        return true;
    }
    bool Zeros(uint32_t n) {
        if (!Has(n)) return Fail();
        if (n) std::memset(data_ + pos_, 0, n);
        pos_ += n;
        return true;
    }

private:
    bool Advance(uint32_t n) {
        pos_ += n;
        return true;
    }
    bool Fail() {
        ok_ = false;
        return false;
    }
    uint8_t* data_;
    uint32_t size_;
    uint32_t pos_;
    _zbm_WriteEndianType endian_;
    bool ok_;
};

}  // namespace lmk

#endif
