#pragma once

#include <string>

// File names and texts as the library has them, UTF-8, and as the system has them, UTF-16. Its
// functions for the code page of the process (LoadLibraryA and the like) would not find every file.
namespace zolt {

// False, with the system's last error set, for null and for text that is ill-formed.
bool to_utf16(const char* utf8, std::wstring* utf16);
bool to_utf8(const wchar_t* utf16, std::string* utf8);

// What opendir puts into errno when the system refuses to list a directory with that error.
int errno_of_listing(unsigned long error);

}  // namespace zolt
