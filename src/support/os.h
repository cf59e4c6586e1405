#pragma once

#include <cstdio>
#include <string>

// What the support library asks of the operating system beyond dl.h, pdir.h and pthread.h. Names,
// values and texts are UTF-8.
namespace zolt {

// The calling thread's last operating-system error code: errno, on Windows GetLastError().
int os_last_error();
void os_set_last_error(int code);

// Copies the system's message for `code` without the line end into `text`, at most `size` - 1
// characters and a terminating 0; "Unknown WIN32 error" for a code without a message. Nothing is
// written when `size` is below 1.
void os_error_text(int code, char* text, int size);

// The number of this process.
long os_process_id();

// The value of an environment variable; empty too when there is none.
std::string os_environment(const char* name);

// Sets an environment variable of this process, replacing an older value. Not safe beside other
// threads that read or write the environment.
void os_set_environment(const char* name, const char* value);

// Opens a file as std::fopen does.
std::FILE* os_open_file(const char* path, const char* mode);

// Whether there is a file, resp. a directory, of that name.
bool os_is_regular_file(const char* path);
bool os_is_directory(const char* path);

// The size of a file in bytes, or -1.
long long os_file_size(const char* path);

// Sleeps about that long; 0 lets other threads run.
void os_sleep(int msecs);

}  // namespace zolt
