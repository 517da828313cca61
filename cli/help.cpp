#include "cli/help.hpp"

namespace sm::cli::help {
const char* const kMain = "qxsm";
const char* const kInfo = "info";
const char* const kFactor = "factor";
const char* const kSolve = "solve";
const char* const kGrid = "grid";
const char* const kExitCodes = "codes";
}  // namespace sm::cli::help
