#pragma once

namespace sentrova {

// Fails as the property "debug.vold.behaviour" says, so that it can be seen what the rescue service
// makes of it: "exit1" ends the program with status 1, "abort" kills it with SIGABRT, "hang" keeps
// it from ever ending. Returns where the property says none of these.
void fail_as_rehearsed();

}  // namespace sentrova
