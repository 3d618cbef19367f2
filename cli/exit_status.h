#pragma once

namespace sentrova {

// What the program tells its caller; the help text lists the same numbers.
enum ExitStatus : int {
  kExitSuccess = 0,
  kExitAnswerIsNo = 1,          // the question was answered, with no (a wrong password)
  kExitUsage = 2,               // the command line or the input cannot be used
  kExitServiceUnavailable = 3,  // the service was not reached, or died during the call
  kExitServiceFailed = 4,       // the service was asked and could not do it
};

}  // namespace sentrova
