#include <lumicor/lmk.h>

#include <cstdint>
#include <cstdio>

#include "common/src/config/lmk_config_internal.h"
#include "common/src/config/lmk_lock.h"
#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

uint32_t LmkConfig::s_nRefCount = 0;
LmkMutex LmkConfig::s_mutexValue;
std::map<std::string, std::string> LmkConfig::s_mapValueString;
std::map<std::string, int32_t> LmkConfig::s_mapValueInt;

namespace {

// Longest line kept by ReadLine. Real lines are a key and a path; the bound
// keeps a binary or hostile file from growing one string without limit (and
// the length within int32).
constexpr size_t kMaxLineLength = 65536;

// Reads one line through next() (a byte 0..255, or EOF). Returns the length,
// or -1 when the input ends before "\n". May throw std::bad_alloc.
template <typename NextByte>
int32_t ReadLineFrom(NextByte& next, std::string& line) {
    line.clear();
    bool tooLong = false;
    for (;;) {
        const int c = next();
        if (c == EOF) {
            line.clear();
            return -1;
        }
        if (c == '\n') break;
        if (tooLong) continue;
        if (line.size() >= kMaxLineLength + 1) {  // + 1: room for a "\r" to strip
            tooLong = true;
            line.clear();
            continue;
        }
        line.push_back(static_cast<char>(c));
    }
    if (tooLong) return 0;
    if (!line.empty() && line.back() == '\r') line.pop_back();
    if (line.size() > kMaxLineLength) {
        line.clear();
        return 0;
    }
    return static_cast<int32_t>(line.size());
}

// The module or section line "{name}" / "[name]": name runs up to the last
// closing character; without one after the opener the line is an ordinary
// line. May throw std::bad_alloc.
bool ParseBracketed(const std::string& line, char open, char close, std::string& name) {
    if (line.empty() || line[0] != open) return false;
    const size_t end = line.rfind(close);
    if (end == std::string::npos || end == 0) return false;
    name.assign(line, 1, end - 1);
    return true;
}

void ParseLineOrThrow(const std::string& line, std::string& module, std::string& section, std::string& key,
                      std::string& value) {
    if (line.empty() || line[0] == '#') return;
    if (ParseBracketed(line, '{', '}', module)) return;
    if (ParseBracketed(line, '[', ']', section)) return;
    const size_t eq = line.find('=');
    if (eq == std::string::npos) return;
    key.assign(line, 0, eq);
    value.assign(line, eq + 1, std::string::npos);
}

// The C library's atoi, made total: leading white space, an optional sign and
// decimal digits, stopping at the first other byte. atoi's result for a number
// out of int range is undefined (and differs between 32- and 64-bit long in
// practice); this saturates, as a 32-bit target's atoi does.
int32_t ParseIntValue(const std::string& text) {
    size_t i = 0;
    const size_t n = text.size();
    while (i < n && (text[i] == ' ' || (text[i] >= '\t' && text[i] <= '\r'))) ++i;
    bool negative = false;
    if (i < n && (text[i] == '+' || text[i] == '-')) {
        negative = text[i] == '-';
        ++i;
    }
    // Accumulate towards the limit of the sign so that INT32_MIN is reachable.
    const int64_t limit = negative ? -static_cast<int64_t>(INT32_MIN) : INT32_MAX;
    int64_t magnitude = 0;
    for (; i < n && text[i] >= '0' && text[i] <= '9'; ++i) {
        magnitude = magnitude * 10 + (text[i] - '0');
        if (magnitude > limit) {
            magnitude = limit;
            // Skip the remaining digits; the result stays saturated.
            while (i + 1 < n && text[i + 1] >= '0' && text[i + 1] <= '9') ++i;
        }
    }
    return static_cast<int32_t>(negative ? -magnitude : magnitude);
}

// A string value starts with a double quote and has another one later; its
// text runs up to the last one (no escapes).
bool StringValue(const std::string& value, std::string& text) {
    if (value.empty() || value[0] != '"') return false;
    const size_t last = value.rfind('"');
    if (last == 0) return false;
    text.assign(value, 1, last - 1);
    return true;
}

// module + ":" + section + ":" + key, the key of both maps.
template <typename M, typename S, typename K>
void AssignFullKey(std::string& out, const M& module, const S& section, const K& key) {
    out.assign(module);
    out += ':';
    out += section;
    out += ':';
    out += key;
}

}  // namespace

// ---------------------------------------------------------------- loading

namespace {

// Reads and stores every line of one configuration source into the two maps
// (the caller holds the lock and has cleared them). Returns 0, or 2 when memory
// runs out, in which case the maps are emptied again: a half-loaded
// configuration could miss any setting, including the log levels.
template <typename NextByte>
uint32_t StoreLines(NextByte& next, std::map<std::string, std::string>& strings,
                    std::map<std::string, int32_t>& ints) {
    try {
        std::string line, module, section, key, value, fullKey, text;
        while (ReadLineFrom(next, line) >= 0) {
            key.clear();
            value.clear();
            ParseLineOrThrow(line, module, section, key, value);
            if (module.empty() || section.empty() || key.empty() || value.empty()) continue;
            AssignFullKey(fullKey, module, section, key);
            // try_emplace leaves an existing entry alone: the first occurrence wins.
            if (StringValue(value, text)) {
                strings.try_emplace(fullKey, text);
            } else {
                ints.try_emplace(fullKey, ParseIntValue(value));
            }
        }
        return LMK_STATUS_OK;
    } catch (...) {
        strings.clear();
        ints.clear();
        return LMK_STATUS_OUT_OF_MEMORY;
    }
}

}  // namespace

uint32_t LmkConfig::Initialize() {
    if (s_nRefCount == 0) {
        const uint32_t status = s_mutexValue.Create();
        if (status != LMK_STATUS_OK) return status;
    }
    ++s_nRefCount;
    return LMK_STATUS_OK;
}

uint32_t LmkConfig::Finalize() {
    if (s_nRefCount == 0) return LMK_STATUS_OK;
    if (--s_nRefCount == 0) s_mutexValue.Delete();
    return LMK_STATUS_OK;
}

uint32_t LmkConfig::LoadConfig(const std::string& path) { return LoadConfig(path.c_str()); }

uint32_t LmkConfig::LoadConfig(const char* path) {
    lmk::LmkScopedLock lock(s_mutexValue);
    if (!lock.usable()) return LMK_STATUS_FAILED;
    s_mapValueString.clear();
    s_mapValueInt.clear();

    FILE* fp = nullptr;
    if (lmk::fopen_s(&fp, path, "r") != 0 || !fp) return LMK_STATUS_FILE_ERROR;
    auto closeFile = lmk::MakeScopeGuard([fp] { std::fclose(fp); });
    auto next = [fp] { return std::fgetc(fp); };
    return StoreLines(next, s_mapValueString, s_mapValueInt);
}

uint32_t LmkConfigInternal::LoadConfigFromMemory(const uint8_t* data, size_t size) {
    lmk::LmkScopedLock lock(LmkConfig::s_mutexValue);
    if (!lock.usable()) return LMK_STATUS_FAILED;
    LmkConfig::s_mapValueString.clear();
    LmkConfig::s_mapValueInt.clear();
    if (size > UINT32_MAX) return LMK_STATUS_FAILED;

    lmk::ByteReader reader(data, static_cast<uint32_t>(size));
    auto next = [&reader]() -> int { return reader.Has(1) ? reader.U8() : EOF; };
    return StoreLines(next, LmkConfig::s_mapValueString, LmkConfig::s_mapValueInt);
}

uint32_t LmkConfig::UnloadConfig() {
    lmk::LmkScopedLock lock(s_mutexValue);
    if (!lock.usable()) return LMK_STATUS_FAILED;
    s_mapValueString.clear();
    s_mapValueInt.clear();
    return LMK_STATUS_OK;
}

int32_t LmkConfig::ReadLine(FILE* fp, std::string& line) {
    if (!fp) {
        line.clear();
        return -1;
    }
    try {
        auto next = [fp] { return std::fgetc(fp); };
        return ReadLineFrom(next, line);
    } catch (...) {
        line.clear();
        return -1;
    }
}

void LmkConfig::ParseLine(const std::string& line, std::string& module, std::string& section, std::string& key,
                          std::string& value) {
    try {
        ParseLineOrThrow(line, module, section, key, value);
    } catch (...) {
        // Only the assignment of a new name or key/value can fail, and
        // std::string keeps its old contents then; make sure a half-parsed
        // entry cannot be stored.
        key.clear();
        value.clear();
    }
}

// ---------------------------------------------------------------- lookups

std::string LmkConfig::GetValueString(const char* module, const char* section, const char* key,
                                      const char* defaultValue) {
    try {
        if (module && section && key) {
            std::string fullKey;
            AssignFullKey(fullKey, module, section, key);
            lmk::LmkScopedLock lock(s_mutexValue);
            if (lock.usable()) {
                const auto it = s_mapValueString.find(fullKey);
                if (it != s_mapValueString.end()) return it->second;
            }
        }
        return std::string(defaultValue ? defaultValue : "");
    } catch (...) {
        return std::string();
    }
}

int32_t LmkConfig::GetValueInt(const char* module, const char* section, const char* key, int32_t defaultValue) {
    try {
        if (!module || !section || !key) return defaultValue;
        std::string fullKey;
        AssignFullKey(fullKey, module, section, key);
        lmk::LmkScopedLock lock(s_mutexValue);
        if (!lock.usable()) return defaultValue;
        const auto it = s_mapValueInt.find(fullKey);
        return it != s_mapValueInt.end() ? it->second : defaultValue;
    } catch (...) {
        return defaultValue;
    }
}

namespace {

// Appends the key part of every full key that lies directly in prefix
// (module + ":" + section + ":"): the text after the prefix, when it is
// non-empty and has no further ":". The map is ordered, so those keys form one
// run starting at lower_bound(prefix).
template <typename Map>
void AppendKeysWithPrefix(const Map& map, const std::string& prefix, std::vector<std::string>& list) {
    for (auto it = map.lower_bound(prefix); it != map.end(); ++it) {
        const std::string& fullKey = it->first;
        if (fullKey.compare(0, prefix.size(), prefix) != 0) break;
        if (fullKey.size() == prefix.size() || fullKey.find(':', prefix.size()) != std::string::npos) continue;
        list.push_back(fullKey.substr(prefix.size()));
    }
}

}  // namespace

uint32_t LmkConfig::GetEntryList(const char* module, const char* section, std::vector<std::string>& list) {
    try {
        if (module && section) {
            std::string prefix;
            AssignFullKey(prefix, module, section, "");
            lmk::LmkScopedLock lock(s_mutexValue);
            if (lock.usable()) {
                AppendKeysWithPrefix(s_mapValueString, prefix, list);
                AppendKeysWithPrefix(s_mapValueInt, prefix, list);
            }
        }
    } catch (...) {
        // Out of memory: the entries appended so far stay.
    }
    return static_cast<uint32_t>(list.size());
}
