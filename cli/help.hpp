// The words of --help. The examples are real runs on the shipped files; a test repeats them.
#pragma once

namespace sm::cli::help {

extern const char* const kMain;
extern const char* const kInfo;
extern const char* const kFactor;
extern const char* const kSolve;
extern const char* const kInvdiag;
extern const char* const kQuad;
extern const char* const kTrace;
extern const char* const kHermite;
extern const char* const kEstimable;
extern const char* const kConvert;
extern const char* const kPedigree;
extern const char* const kLmm;
extern const char* const kReml;
extern const char* const kBlup;
extern const char* const kGrid;
extern const char* const kExitCodes;

}  // namespace sm::cli::help
