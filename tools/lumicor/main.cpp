// lumicor: the command-line tool of the Lumicor library (see cli.h).
#include "cli.h"

int main(int argc, char** argv) { return lumicor_tool::RunCommandLine(argc, argv); }
