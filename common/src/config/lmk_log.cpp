#include <lumicor/lmk.h>

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "common/src/config/lmk_lock.h"

uint32_t LmkLog::s_nRefCount = 0;
LmkMutex LmkLog::s_mutexLog;
std::map<std::string, LMKLOG_LEVEL> LmkLog::s_mapLogLevel;

namespace {

constexpr size_t kMaxMessageSize = 512;  // including the terminator
constexpr size_t kTimeTextSize = 128;
constexpr char kLevelKeyPrefix[] = "Level.";

bool LevelFromName(const std::string& name, LMKLOG_LEVEL* level) {
    if (name == "PRINT") {
        *level = LMKLOG_PRINT;
    } else if (name == "WARN") {
        *level = LMKLOG_WARN;
    } else if (name == "ERROR") {
        *level = LMKLOG_ERROR;
    } else {
        return false;
    }
    return true;
}

bool IsTrue(const char* module, const char* key) {
    return LmkConfig::GetValueString(module, "Log", key, "false") == "true";
}

char LevelLetter(LMKLOG_LEVEL level) {
    switch (level) {
        case LMKLOG_PRINT: return 'p';
        case LMKLOG_WARN: return 'w';
        case LMKLOG_ERROR: return 'e';
    }
    return '?';
}

// "{l}[module][submodule][name:line]"; the source part names the file after
// its last "/" (or, for Windows-style paths, its last "\").
std::string BuildPrefix(const char* file, int32_t line, const char* module, const char* submodule,
                        LMKLOG_LEVEL level) {
    std::string prefix = "{";
    prefix += LevelLetter(level);
    prefix += '}';
    if (submodule) {
        prefix += '[';
        prefix += module;
        prefix += "][";
        prefix += submodule;
        prefix += ']';
    }
    if (file) {
        const char* separator = std::strrchr(file, '/');
        if (!separator) separator = std::strrchr(file, '\\');
        if (separator) {
            prefix += '[';
            prefix += separator + 1;
            prefix += ':';
            prefix += std::to_string(line);
            prefix += ']';
        }
    }
    return prefix;
}

void AppendToLogFile(const char* module, const std::string& prefix, const char* message) {
    char timeText[kTimeTextSize];
    const time_t now = std::time(nullptr);
    struct tm local;
    if (lmk::localtime_s(&local, &now) != 0 || std::strftime(timeText, sizeof timeText, "%c", &local) == 0) {
        std::snprintf(timeText, sizeof timeText, "%s", "[time error]");
    }
    const std::string path = LmkConfig::GetValueString(module, "Log", "LogFile", "");
    if (path.empty()) return;
    // Opened and closed per message so that every line reaches the file even
    // if the process dies right after; a failure to open only loses the line.
    FILE* fp = nullptr;
    if (lmk::fopen_s(&fp, path.c_str(), "a") != 0 || !fp) return;
    lmk::fprintf_s(fp, "%s %s %s", timeText, prefix.c_str(), message);
    std::fclose(fp);
}

}  // namespace

uint32_t LmkLog::Start(const char* module) {
    if (!module) return LMK_STATUS_INVALID_PARAMETER;
    if (s_nRefCount == 0) {
        const uint32_t status = s_mutexLog.Create();
        if (status != LMK_STATUS_OK) return status;
    }
    ++s_nRefCount;

    try {
        lmk::LmkScopedLock lock(s_mutexLog);
        if (!lock.usable()) {
            Stop();
            return LMK_STATUS_FAILED;
        }
        std::vector<std::string> entries;
        LmkConfig::GetEntryList(module, "Log", entries);
        const size_t prefixLength = sizeof kLevelKeyPrefix - 1;
        for (const std::string& entry : entries) {
            // "Level.<submodule>" with a non-empty submodule; the submodule may
            // itself contain dots.
            if (entry.size() <= prefixLength || entry.compare(0, prefixLength, kLevelKeyPrefix) != 0) continue;
            LMKLOG_LEVEL level;
            if (!LevelFromName(LmkConfig::GetValueString(module, "Log", entry.c_str(), ""), &level)) continue;
            std::string levelKey = module;
            levelKey += '.';
            levelKey.append(entry, prefixLength, std::string::npos);
            s_mapLogLevel.try_emplace(levelKey, level);  // a level already known is kept
        }
    } catch (...) {
        // Undo this call's count; its partial levels go with the last Stop.
        Stop();
        return LMK_STATUS_OUT_OF_MEMORY;
    }
    return LMK_STATUS_OK;
}

uint32_t LmkLog::Stop() {
    if (s_nRefCount == 0) return LMK_STATUS_OK;
    if (--s_nRefCount == 0) {
        {
            lmk::LmkScopedLock lock(s_mutexLog);
            s_mapLogLevel.clear();
        }
        s_mutexLog.Delete();
    }
    return LMK_STATUS_OK;
}

bool LmkLog::isUsePrintf(const char* module) { return IsTrue(module, "UsePrintf"); }

bool LmkLog::isUseFile(const char* module) { return IsTrue(module, "UseFile"); }

bool LmkLog::ShouldDisplay(const char* module, const char* submodule, LMKLOG_LEVEL level) {
    if (!module || !submodule) return false;
    try {
        lmk::LmkScopedLock lock(s_mutexLog);
        if (!lock.usable()) return false;
        if (!isUsePrintf(module) && !isUseFile(module)) return false;
        std::string levelKey = module;
        levelKey += '.';
        levelKey += submodule;
        const auto it = s_mapLogLevel.find(levelKey);
        return it != s_mapLogLevel.end() && it->second <= level;
    } catch (...) {
        return false;
    }
}

void LmkLog::Log(const char* file, int32_t line, const char* module, const char* submodule, LMKLOG_LEVEL level,
                 const char* format, ...) {
    if (!format) return;
    lmk::LmkScopedLock lock(s_mutexLog);
    if (!lock.usable()) return;

    char message[kMaxMessageSize];
    va_list ap;
    va_start(ap, format);
    const int length = std::vsnprintf(message, sizeof message, format, ap);
    va_end(ap);
    if (length < 0) return;

    try {
        const char* moduleName = module ? module : "";
        const std::string prefix = BuildPrefix(file, line, moduleName, submodule, level);
        if (isUsePrintf(module)) {
            if (level == LMKLOG_PRINT) {
                std::printf("%s", message);
            } else {
                std::printf("%s %s", prefix.c_str(), message);
            }
        }
        if (isUseFile(module)) AppendToLogFile(module, prefix, message);
    } catch (...) {
        // Logging never fails the caller; the message is lost.
    }
}
