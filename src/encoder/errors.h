#pragma once

// Writes msg and a line break to standard error and ends the process with status: the engine is in
// a state that it cannot go on from.
[[noreturn]] void exitOnError(const char* msg, int status);
// Reports a failed allocation and ends the process with status 106.
[[noreturn]] void memError(const char* what);
