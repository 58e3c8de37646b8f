/*
 * lmk.h - configuration file, log and mutex support of the Lumicor front end,
 * and the bounds-aware C helpers (fopen_s, ...) used by it and by the meta code.
 *
 * Usage:
 *   LmkConfig::Initialize();                       // once per user, balanced by Finalize
 *   if (LmkConfig::LoadConfig("/data/lmc.conf") != LMK_STATUS_OK) { ... }
 *   LmkLog::Start("Lumicor");                      // reads Level.<submodule> from [Log]
 *   if (LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_ERROR))
 *       LmkLog::Log(__FILE__, __LINE__, "Lumicor", "Lumicor", LMKLOG_ERROR,
 *                   "%s(%d): something failed\n", __FILE__, __LINE__);
 *   LmkLog::Stop(); LmkConfig::UnloadConfig(); LmkConfig::Finalize();
 *
 * lmc.conf is read line by line with no trimming: "{module}" and "[section]"
 * lines select where the following "key=value" lines go; a value written as
 * "text" in double quotes is a string setting, anything else is read as an
 * integer. The first occurrence of a key wins.
 *
 * Threads: the configuration maps and the log settings are each guarded by a
 * recursive mutex (the log lock is always taken before the configuration
 * lock). Initialize/Finalize and Start/Stop change plain reference counts and
 * must be called from one thread. No function of this header throws.
 */
#ifndef LUMICOR_LMK_H
#define LUMICOR_LMK_H

#ifndef __cplusplus
#error "lmk.h is a C++ header"
#endif

#include <pthread.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <map>
#include <string>
#include <vector>

#if defined(__GNUC__) || defined(__clang__)
#define LMK_PRINTF_FORMAT(fmt, args) __attribute__((format(printf, fmt, args)))
#else
#define LMK_PRINTF_FORMAT(fmt, args)
#endif

/* Status codes of this header. The exported interface returns the same
 * numbers, so a code from here can be passed up unchanged. */
constexpr uint32_t LMK_STATUS_OK = 0;                 /* success */
constexpr uint32_t LMK_STATUS_INVALID_PARAMETER = 1;  /* null argument */
constexpr uint32_t LMK_STATUS_OUT_OF_MEMORY = 2;      /* an allocation failed */
constexpr uint32_t LMK_STATUS_FILE_ERROR = 6;         /* the file cannot be opened */
constexpr uint32_t LMK_STATUS_FAILED = 7;             /* any other failure */

/* Log levels; lmc.conf names them "PRINT", "WARN" and "ERROR". A message is
 * shown when its level is at least the threshold configured for its
 * module and submodule. Other values may be passed to LmkLog::Log ("{?}"). */
enum LMKLOG_LEVEL : int32_t {
    LMKLOG_PRINT = 1, /* plain output, printed without prefix on the console */
    LMKLOG_WARN = 2,  /* warning */
    LMKLOG_ERROR = 3  /* error */
};

/* One recursive POSIX mutex, created on demand. A default-constructed object
 * holds no mutex; it is not copyable. Destroying the object does not destroy
 * the mutex: call Delete. */
class LmkMutex {
public:
    constexpr LmkMutex() : m_pMutex(nullptr) {}
    LmkMutex(const LmkMutex&) = delete;
    LmkMutex& operator=(const LmkMutex&) = delete;

    /* Allocates and initialises a recursive mutex. Returns 0 (also when the
     * mutex already exists, which is then kept), 2 when the allocation fails,
     * 7 when the mutex attributes or the mutex cannot be initialised. */
    uint32_t Create();
    /* Destroys and frees the mutex when it exists; the object is then empty. */
    void Delete();
    /* Locks (recursively). Returns 0, or 7 when there is no mutex or locking
     * fails. */
    uint32_t Lock();
    /* Unlocks; does nothing when there is no mutex. */
    void Unlock();
    /* True between a successful Create and Delete. */
    bool IsCreated() const { return m_pMutex != nullptr; }

private:
    pthread_mutex_t* m_pMutex;
};

/* The configuration loaded from lmc.conf: one map of string settings and one
 * of integer settings, both keyed by module + ":" + section + ":" + key
 * (byte-wise, case-sensitive). All members are static. */
class LmkConfig {
public:
    /* Counts one user; the first one creates the mutex guarding the maps.
     * Returns 0, or the mutex's failure code (2 or 7) with the count
     * unchanged. */
    static uint32_t Initialize();
    /* Releases one user; the last one destroys the mutex. The maps are kept
     * until UnloadConfig. Always returns 0 (also when nothing is counted). */
    static uint32_t Finalize();

    /* Replaces the whole configuration by the contents of the file at path.
     * Returns 0; 6 when the file cannot be opened (null path, missing,
     * unreadable or a directory), leaving both maps empty; 2 when memory runs
     * out while storing, also leaving both maps empty; 7 when the lock cannot
     * be taken. */
    static uint32_t LoadConfig(const char* path);
    static uint32_t LoadConfig(const std::string& path);
    /* Empties both maps. Returns 0, or 7 when the lock cannot be taken. */
    static uint32_t UnloadConfig();

    /* The string setting module:section:key, or defaultValue (an empty string
     * for a null default) when it is missing or an argument is null. Returns
     * an empty string when memory runs out. */
    static std::string GetValueString(const char* module, const char* section, const char* key,
                                      const char* defaultValue);
    /* The integer setting module:section:key, or defaultValue. */
    static int32_t GetValueInt(const char* module, const char* section, const char* key,
                               int32_t defaultValue);
    /* Appends to list the keys of section `section` of module `module`: first
     * those of the string settings, then those of the integer settings, each in
     * byte order. Keys that contain ":" are not listed. Returns list.size()
     * afterwards (when memory runs out, the part appended so far stays). */
    static uint32_t GetEntryList(const char* module, const char* section, std::vector<std::string>& list);

    /* Reads one line from fp byte by byte into line, without its "\n" and
     * without one "\r" directly before it. Returns the line's length, or -1
     * at the end of the file, for a last line not ended by "\n", for a null
     * fp and when memory runs out. A line longer than 65536 bytes is read
     * to its end and returned as an empty line (length 0). */
    static int32_t ReadLine(FILE* fp, std::string& line);
    /* Applies the lmc.conf syntax to one line. A module or section line sets
     * only module or section; a "key=value" line sets only key and value;
     * any other line changes nothing. */
    static void ParseLine(const std::string& line, std::string& module, std::string& section,
                          std::string& key, std::string& value);

private:
    friend struct LmkConfigInternal;

    static uint32_t s_nRefCount;
    static LmkMutex s_mutexValue;
    static std::map<std::string, std::string> s_mapValueString;
    static std::map<std::string, int32_t> s_mapValueInt;
};

/* The log: which messages are shown is decided by the Level.<submodule>
 * settings read at Start; where they go (console, file) by UsePrintf,
 * UseFile and LogFile in section [Log] of the module, read for every message.
 * All members are static. */
class LmkLog {
public:
    /* Counts one user (the first creates the log mutex) and adds the levels
     * configured for module: every string setting Level.<submodule> of
     * section [Log] whose value is "PRINT", "WARN" or "ERROR"; a level
     * already known is kept. Returns 0; 1 for a null module; the mutex's
     * failure code (2 or 7); 2 when memory runs out (the call then has no
     * effect on the count). */
    static uint32_t Start(const char* module);
    /* Releases one user; the last one forgets all levels and destroys the
     * mutex. Always returns 0. */
    static uint32_t Stop();

    /* True when the module's [Log] UsePrintf setting is exactly "true". */
    static bool isUsePrintf(const char* module);
    /* True when the module's [Log] UseFile setting is exactly "true". */
    static bool isUseFile(const char* module);
    /* True when the module has some output switched on and a level of at
     * most `level` is configured for module.submodule. */
    static bool ShouldDisplay(const char* module, const char* submodule, LMKLOG_LEVEL level);

    /* Formats the message (at most 511 bytes are kept) and writes it to the
     * console and/or appends it to LogFile, as the module's [Log] settings
     * say. Does not check the level: call ShouldDisplay first. Console: the
     * bare message for LMKLOG_PRINT, else prefix + " " + message, where the
     * prefix is "{p|w|e|?}", then "[module][submodule]" when submodule is not
     * null, then "[name:line]" with the part of file after its last "/" (or
     * else "\\"). File: local time + " " + prefix + " " + message; the file
     * is opened and closed for each message. Failures lose the message. */
    static void Log(const char* file, int32_t line, const char* module, const char* submodule,
                    LMKLOG_LEVEL level, const char* format, ...) LMK_PRINTF_FORMAT(6, 7);

private:
    static uint32_t s_nRefCount;
    static LmkMutex s_mutexLog;
    static std::map<std::string, LMKLOG_LEVEL> s_mapLogLevel;
};

/* Bounds-aware C helpers. They live in namespace lmk so that they never clash
 * with a C library that provides the Annex K functions of the same names; the
 * names are parenthesised so that function-like macros of such a library do
 * not expand here. Every function sets errno (0 on success). */
namespace lmk {

/* Opens path with mode into *fp (*fp is null on failure). Returns 0;
 * EINVAL (22) for a null argument; EISDIR (21) when path names a directory,
 * which is not opened; otherwise fopen's errno. */
int(fopen_s)(FILE** fp, const char* path, const char* mode);
/* vfprintf to stream. Returns the number of bytes written, or -1 with
 * EINVAL for a null stream or format (or vfprintf's negative result). */
int(fprintf_s)(FILE* stream, const char* format, ...) LMK_PRINTF_FORMAT(2, 3);
/* Copies count bytes from src to dst (overlap allowed). Returns 0; EINVAL for
 * a null dst or src; ERANGE when dstSize < count. Nothing is copied on
 * failure. */
int(memcpy_s)(void* dst, size_t dstSize, const void* src, size_t count);
/* Formats into buf of size bytes. Returns the length written (without the
 * terminator); -1 with EINVAL for a null buf or format or a formatting error;
 * -1 with ERANGE when text and terminator do not fit, buf[0] then being 0
 * (when size > 0). */
int(sprintf_s)(char* buf, size_t size, const char* format, ...) LMK_PRINTF_FORMAT(3, 4);
/* Local broken-down time of *time into *result. Returns 0; EINVAL for a null
 * pointer or a negative time; localtime_r's errno when it fails. */
int(localtime_s)(struct tm* result, const time_t* time);

}  // namespace lmk

#endif
