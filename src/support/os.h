#pragma once

#include <cstdio>

// What the support library asks of the operating system beyond dl.h, pdir.h and pthread.h.
namespace zolt {

// The calling thread's last operating-system error code.
int os_last_error();

// Copies the system's message for `code` into `text`, at most `size` - 1 characters and a
// terminating 0; "Unknown WIN32 error" for a code without a message. Nothing is written when
// `size` is below 1.
void os_error_text(int code, char* text, int size);

// The number of this process.
long os_process_id();

// Sets an environment variable of this process, replacing an older value. Not safe beside other
// threads that read or write the environment.
void os_set_environment(const char* name, const char* value);

// Opens a file whose name is UTF-8, as std::fopen does.
std::FILE* os_open_file(const char* path, const char* mode);

}  // namespace zolt
