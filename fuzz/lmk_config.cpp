// Fuzz target for the lmc.conf reader: loads arbitrary bytes as a
// configuration and checks that every key GetEntryList reports can be looked
// up, that the keys come as at most two ascending runs (string settings, then
// integer settings) and that Start/Stop of the log digest whatever levels the
// input configures.
#include <lumicor/lmk.h>

#include <cstdint>
#include <cstdio>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "common/src/config/lmk_config_internal.h"

namespace {

constexpr size_t kMaxSectionsChecked = 64;

void Check(bool condition) {
    if (!condition) __builtin_trap();
}

// Every (module, section) pair the input selects, found through the public
// line reader and parser.
std::set<std::pair<std::string, std::string>> SectionsOf(const uint8_t* data, size_t size) {
    std::set<std::pair<std::string, std::string>> sections;
    if (size == 0) return sections;
    FILE* fp = fmemopen(const_cast<uint8_t*>(data), size, "r");
    if (!fp) return sections;
    std::string line, module, section, key, value;
    while (LmkConfig::ReadLine(fp, line) >= 0 && sections.size() < kMaxSectionsChecked) {
        LmkConfig::ParseLine(line, module, section, key, value);
        sections.emplace(module, section);
    }
    std::fclose(fp);
    return sections;
}

void CheckSection(const std::string& module, const std::string& section) {
    std::vector<std::string> keys;
    const uint32_t count = LmkConfig::GetEntryList(module.c_str(), section.c_str(), keys);
    Check(count == keys.size());
    size_t descents = 0;
    for (size_t i = 0; i < keys.size(); ++i) {
        const std::string& k = keys[i];
        Check(!k.empty() && k.find(':') == std::string::npos);
        if (i > 0 && !(keys[i - 1] < k)) ++descents;
        if (k.find('\0') != std::string::npos) continue;  // not reachable through a C string
        // Two different defaults, as for integers: a stored value may equal one of them.
        const bool isString =
            LmkConfig::GetValueString(module.c_str(), section.c_str(), k.c_str(), "\x01missing") != "\x01missing" ||
            LmkConfig::GetValueString(module.c_str(), section.c_str(), k.c_str(), "\x02" "absent") != "\x02" "absent";
        const bool isInt = LmkConfig::GetValueInt(module.c_str(), section.c_str(), k.c_str(), -7) != -7 ||
                           LmkConfig::GetValueInt(module.c_str(), section.c_str(), k.c_str(), -8) != -8;
        Check(isString || isInt);
    }
    Check(descents <= 1);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool initialised = LmkConfig::Initialize() == LMK_STATUS_OK;
    if (!initialised) return 0;
    if (LmkConfigInternal::LoadConfigFromMemory(data, size) != LMK_STATUS_OK) return 0;

    for (const auto& s : SectionsOf(data, size)) {
        if (s.first.find('\0') != std::string::npos || s.second.find('\0') != std::string::npos) continue;
        CheckSection(s.first, s.second);
        if (s.second == "Log" && LmkLog::Start(s.first.c_str()) == LMK_STATUS_OK) {
            LmkLog::ShouldDisplay(s.first.c_str(), s.first.c_str(), LMKLOG_ERROR);
            LmkLog::Stop();
        }
    }
    LmkConfig::UnloadConfig();
    return 0;
}
