#include "inputs.h"

#include <algorithm>
#include <cctype>
#include <filesystem>

namespace lumicor_tool {

namespace fs = std::filesystem;

namespace {

std::string Lower(std::string s) {
    for (char& c : s) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return s;
}

bool Wanted(const fs::path& file, bool withMetas) {
    const std::string ext = Lower(file.extension().string());
    return ext == ".jpg" || ext == ".jpeg" || ext == ".png" || (withMetas && ext == ".lmeta");
}

}  // namespace

std::vector<std::string> ExpandInputs(const std::vector<std::string>& paths, bool withMetas,
                                      std::vector<std::string>* errors) {
    std::vector<std::string> files;
    for (const std::string& path : paths) {
        std::error_code ec;
        const fs::file_status status = fs::status(path, ec);
        if (ec || !fs::exists(status)) {
            errors->push_back(path + ": no such file or folder");
            continue;
        }
        if (!fs::is_directory(status)) {
            files.push_back(path);
            continue;
        }
        std::vector<std::string> found;
        for (fs::directory_iterator it(path, ec), end; !ec && it != end; it.increment(ec)) {
            std::error_code fileEc;
            if (it->is_regular_file(fileEc) && Wanted(it->path(), withMetas)) found.push_back(it->path().string());
        }
        if (ec) {
            errors->push_back(path + ": cannot read the folder: " + ec.message());
            continue;
        }
        if (found.empty()) {
            errors->push_back(path + (withMetas ? ": no photos or metas in this folder" : ": no photos in this folder"));
            continue;
        }
        std::sort(found.begin(), found.end());
        files.insert(files.end(), found.begin(), found.end());
    }
    return files;
}

std::string Stem(const std::string& path) { return fs::path(path).stem().string(); }

}  // namespace lumicor_tool
