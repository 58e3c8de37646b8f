// Files for tests and tools: a temporary directory for tests that write
// files (configuration files, debug images), removed with its contents when
// the object goes away, and whole-file reads and writes. No gtest here, so
// tools may link it.
#ifndef LUMICOR_TESTKIT_FILES_H
#define LUMICOR_TESTKIT_FILES_H

#include <cstdint>
#include <string>
#include <vector>

namespace lumicor {
namespace test {

class TempDir {
public:
    TempDir();
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::string& path() const { return path_; }
    // path() + "/" + name
    std::string File(const std::string& name) const;
    // Writes `text` to path() + "/" + name and returns the full path.
    std::string Write(const std::string& name, const std::string& text) const;
    // Names of the entries in the directory, sorted.
    std::vector<std::string> List() const;

private:
    std::string path_;
};

// Whole file as bytes; false when it cannot be read.
bool ReadFileBytes(const std::string& path, std::vector<uint8_t>* bytes);
// Replaces the file with `bytes`; false when it cannot be written completely.
bool WriteFileBytes(const std::string& path, const std::vector<uint8_t>& bytes);

}  // namespace test
}  // namespace lumicor

#endif
