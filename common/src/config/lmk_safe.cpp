#include <lumicor/lmk.h>

#include <sys/stat.h>

#include <cerrno>
#include <cstdarg>
#include <cstring>

namespace lmk {

int(fopen_s)(FILE** fp, const char* path, const char* mode) {
    if (fp) *fp = nullptr;
    if (!fp || !path || !mode) {
        errno = EINVAL;
        return EINVAL;
    }
    // fopen happily opens a directory for reading on POSIX; reading it then
    // fails with EISDIR on the first byte, which a caller would mistake for
    // an empty file. Refuse it up front.
    struct stat st;
    if (stat(path, &st) == 0 && S_ISDIR(st.st_mode)) {
        errno = EISDIR;
        return EISDIR;
    }
    FILE* f = std::fopen(path, mode);
    if (!f) {
        if (errno == 0) errno = EINVAL;
        return errno;
    }
    *fp = f;
    errno = 0;
    return 0;
}

int(fprintf_s)(FILE* stream, const char* format, ...) {
    if (!stream || !format) {
        errno = EINVAL;
        return -1;
    }
    va_list ap;
    va_start(ap, format);
    const int n = std::vfprintf(stream, format, ap);
    va_end(ap);
    if (n >= 0) errno = 0;
    return n;
}

int(memcpy_s)(void* dst, size_t dstSize, const void* src, size_t count) {
    if (!dst || !src) {
        errno = EINVAL;
        return EINVAL;
    }
    if (dstSize < count) {
        errno = ERANGE;
        return ERANGE;
    }
    // memmove: an overlapping copy is then merely a slower copy instead of
    // undefined behaviour.
    if (count) std::memmove(dst, src, count);
    errno = 0;
    return 0;
}

int(sprintf_s)(char* buf, size_t size, const char* format, ...) {
    if (!buf || !format) {
        errno = EINVAL;
        return -1;
    }
    va_list ap;
    va_start(ap, format);
    const int n = std::vsnprintf(buf, size, format, ap);
    va_end(ap);
    if (n < 0) {
        if (size > 0) buf[0] = '\0';
        errno = EINVAL;
        return -1;
    }
    if (static_cast<size_t>(n) >= size) {
        if (size > 0) buf[0] = '\0';
        errno = ERANGE;
        return -1;
    }
    errno = 0;
    return n;
}

int(localtime_s)(struct tm* result, const time_t* time) {
    if (!result || !time || *time < 0) {
        errno = EINVAL;
        return EINVAL;
    }
    errno = 0;
    if (!localtime_r(time, result)) {
        if (errno == 0) errno = EINVAL;
        return errno;
    }
    errno = 0;
    return 0;
}

}  // namespace lmk
