// calmorph: looks into, converts and validates CDF calibration files from the command line.

#include "CommandLine.h"

int main(int argc, char** argv) { return kest::tool::RunCommandLine(argc, argv); }
