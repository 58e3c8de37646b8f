// The library as the lumicor tool uses it: one started library for the whole
// run, analyses serialised through one lock (the exported interface expects
// one caller at a time, while decoding and writing run in parallel), and
// parsed metas that release themselves.
#ifndef LUMICOR_TOOL_ANALYSIS_H
#define LUMICOR_TOOL_ANALYSIS_H

#include <lumicor/vond.h>
#include <lumicor/zbm_image.h>

#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

namespace lumicor_tool {

// A parsed photo meta, disposed with its owner.
class MetaRecord {
public:
    MetaRecord();
    ~MetaRecord();
    MetaRecord(const MetaRecord&) = delete;
    MetaRecord& operator=(const MetaRecord&) = delete;

    // Parses a blob; false with a one-line reason.
    bool Parse(const std::vector<uint8_t>& blob, std::string* error);
    const _VondMeta& get() const { return meta_; }

private:
    _VondMeta meta_;
};

class Library {
public:
    // configPath empty: a built-in configuration that logs nothing.
    explicit Library(std::string configPath) : configPath_(std::move(configPath)) {}
    ~Library();
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;

    // Analyses an RGB photo into a blob: detectFaces false analyses without
    // faces. Starts the library on first use. False with a one-line reason.
    // Safe to call from several threads.
    bool Analyze(const _zbm_Image* rgb, bool detectFaces, std::vector<uint8_t>* blob, std::string* error);

private:
    bool StartLocked(std::string* error);

    std::string configPath_;
    std::mutex mutex_;
    bool started_ = false;
};

}  // namespace lumicor_tool

#endif
