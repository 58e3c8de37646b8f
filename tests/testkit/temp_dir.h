// A private temporary directory for tests that read or write files, removed
// with everything in it when the object goes out of scope.
#ifndef LUMICOR_TESTKIT_TEMP_DIR_H
#define LUMICOR_TESTKIT_TEMP_DIR_H

#include <string>

namespace lumicor {
namespace test {

class TempDir {
public:
    // Creates a fresh directory below GoogleTest's temporary directory; the
    // test fails (ADD_FAILURE) when it cannot be created.
    TempDir();
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::string& path() const { return path_; }
    // path() + "/" + name.
    std::string File(const std::string& name) const;
    // Writes bytes to File(name), replacing it; returns the full path.
    std::string Write(const std::string& name, const std::string& bytes) const;

private:
    std::string path_;
};

// Makes `path` the working directory for the object's lifetime and returns to
// the previous one afterwards, also when an assertion ends the test early. The
// test fails (ADD_FAILURE) when either change does not work.
class WorkingDirectory {
public:
    explicit WorkingDirectory(const std::string& path);
    ~WorkingDirectory();
    WorkingDirectory(const WorkingDirectory&) = delete;
    WorkingDirectory& operator=(const WorkingDirectory&) = delete;

private:
    std::string previous_;
};

// The whole contents of a file, or an empty string when it cannot be read.
std::string ReadFileBytes(const std::string& path);
bool FileExists(const std::string& path);

}  // namespace test
}  // namespace lumicor

#endif
