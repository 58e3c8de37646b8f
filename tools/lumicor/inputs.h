// Command-line inputs of the lumicor tool: files and folders turned into the
// list of files to work on.
#ifndef LUMICOR_TOOL_INPUTS_H
#define LUMICOR_TOOL_INPUTS_H

#include <string>
#include <vector>

namespace lumicor_tool {

// Each path names a file (taken as it is, whatever its name) or a folder
// (its files ending in .jpg, .jpeg or .png, and .lmeta when withMetas is set,
// in any letter case, sorted by name; sub-folders are not entered). Paths
// that do not exist or folders without such files are reported in *errors
// (one line each, without the "lumicor: " prefix).
std::vector<std::string> ExpandInputs(const std::vector<std::string>& paths, bool withMetas,
                                      std::vector<std::string>* errors);

// The file name without folder and without its last extension.
std::string Stem(const std::string& path);

}  // namespace lumicor_tool

#endif
