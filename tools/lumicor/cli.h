// The lumicor command line:
//
//   lumicor analyze PHOTO... [-o DIR] [--faces auto|none] [--annotate] [-j N]
//   lumicor frame META|PHOTO --aspect W:H [--mode N] [--zoom-limit X] [-o crop.png] [--photo PHOTO]
//   lumicor similar PHOTO|META... [-j N] [--threshold X]
//   lumicor dump META
//
// Folders are accepted wherever photos (or metas) are. Results go to standard
// output; each failure is one line "lumicor: ..." on standard error.
// Exit status: 0 success, 1 a file could not be read, analysed or written,
// 2 bad options.
#ifndef LUMICOR_TOOL_CLI_H
#define LUMICOR_TOOL_CLI_H

namespace lumicor_tool {

// Runs one command line; never throws.
int RunCommandLine(int argc, char** argv);

}  // namespace lumicor_tool

#endif
