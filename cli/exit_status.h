#pragma once

namespace sentrova {

// What the program tells its caller.
enum ExitStatus : int {
  kExitSuccess = 0,
  kExitAnswerIsNo = 1,
  kExitUsage = 2,
  kExitServiceUnavailable = 3,
  kExitServiceFailed = 4,
};

// The one list of what they mean, from which the help text is made.
struct ExitStatusMeaning {
  ExitStatus status;
  const char* meaning;
};
inline constexpr ExitStatusMeaning kExitStatusMeanings[] = {
    {kExitSuccess, "done, or yes"},
    {kExitAnswerIsNo, "no: the password is wrong, nothing was found, not ready, not confirmed"},
    {kExitUsage, "the command line or the input cannot be used"},
    {kExitServiceUnavailable, "the service was not reached, or it died during the call"},
    {kExitServiceFailed, "it was tried and could not be done"},
};

}  // namespace sentrova
